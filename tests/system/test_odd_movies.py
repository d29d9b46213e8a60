"""Movies as cameras, with every oddity that people's files have: recorded, or refused with a reason."""
import fractions

import pytest
from harness import movie, sounds
from harness.log_reader import Level
from harness.numbered import make_movie

# What is recorded of each: width, height, frames a second (None: as they come), whether its sound is heard.
RECORDED = {
    "plain.mp4": (320, 180, 30, True),
    "plain.ts": (320, 180, 30, True),
    "plain.mkv": (320, 180, 30, True),
    "plain.webm": (160, 90, 30, True),
    "plain.avi": (320, 180, 30, True),
    "4k-mjpeg.mov": (1920, 1080, 10, False),
    "silent.mp4": (320, 180, 30, False),
    "25fps.mp4": (320, 180, 25, True),
    "ntsc.mp4": (320, 180, 30000 / 1001, True),
    "variable-rate.mkv": (320, 180, None, True),
    "interlaced.ts": (720, 576, 25, True),
    "wide-pixels.mp4": (524, 288, 25, True),
    "odd-size.mkv": (853, 479, 30, True),
    "gray.mkv": (320, 180, 30, True),
    "gray-only.mkv": (320, 180, 30, True),
    "ten-bits.mkv": (320, 180, 30, True),
    "mono.mp4": (320, 180, 30, True),
    "44100.mp4": (320, 180, 30, True),
    "surround.mkv": (320, 180, 30, True),
}


def show(agent, path, **preferences):
    """Makes a movie of the host the camera, and its sound the microphone."""
    inside = f"/var/lmx/{path.name}"
    agent.path(inside).write_bytes(path.read_bytes())
    agent.preferences(**{"RecordingVideoInput": f"file://{inside}", "RecordingAudioInput": "Automatic", **preferences})


def check_times(path, wanted, between=0.0):
    """Picture and sound are as long as what was asked for, and whole. `between` seconds lie between two pictures of a
    slow camera: its movie begins with the first one."""
    movie.decodes(path)
    streams = movie.streams(path)
    for stream in streams.values():
        assert -0.4 - between < stream.duration - wanted < 0.4, (stream, wanted)
    if len(streams) == 2:
        assert abs(streams["audio"].duration - streams["video"].duration) < 0.2, streams


def longest_still(path):
    """Seconds for which the longest-standing picture is shown."""
    times = [*movie.frame_times(path), movie.streams(path)["video"].duration]
    return max(b - a for a, b in zip(times, times[1:]))


@pytest.mark.parametrize("name", RECORDED)
def test_is_recorded(agent, odd_movie, name):
    width, height, rate, has_sound = RECORDED[name]
    show(agent, odd_movie(name))
    agent.start()
    start, stop = agent.record("ODD", 2)
    path = agent.movie("ODD")
    check_times(path, stop.sent - start.received)
    stream = movie.streams(path)["video"]
    assert abs(stream.width - width) <= 2 and abs(stream.height - height) <= 2, stream
    assert stream.width % 2 == 0 and stream.height % 2 == 0
    if rate:
        frames, seconds = map(int, stream.rate.split("/"))
        assert abs(frames / seconds / rate - 1) < 0.06, stream
    heard = sounds.heard(path)[1:]  # the first piece may begin before the file plays
    assert heard.count(440 if has_sound else None) >= len(heard) - 1, heard


@pytest.mark.parametrize("name, between", [("rotated.mp4", 0), ("one-frame.mp4", 0.46)])
def test_is_recorded_somehow(agent, odd_movie, name, between):
    show(agent, odd_movie(name))
    agent.start()
    start, stop = agent.record("ODD", 3)
    check_times(agent.movie("ODD"), stop.sent - start.received, between)


@pytest.mark.parametrize("name, silence", [("short-sound.mp4", 3), ("long-sound.mp4", 0)])
def test_sound_that_is_shorter_or_longer_than_the_picture(agent, odd_movie, name, silence):
    """Sound of two seconds under a picture of four, and the other way round: silence, or a still picture."""
    show(agent, odd_movie(name))
    agent.start()
    start, stop = agent.record("UNEVEN", 5)
    check_times(agent.movie("UNEVEN"), stop.sent - start.received)
    heard = sounds.heard(agent.movie("UNEVEN"))
    assert heard.count(440) >= 5 and heard.count(None) >= silence, heard
    assert silence or None not in heard, heard


@pytest.mark.parametrize("name", ["size-changes.ts", "rate-changes.ts", "format-changes.ts"])
def test_what_changes_midway(agent, odd_movie, name):
    show(agent, odd_movie(name))
    agent.start()
    start, stop = agent.record("CHANGES", 6)
    path = agent.movie("CHANGES")
    check_times(path, stop.sent - start.received)
    stream = movie.streams(path)["video"]
    assert (stream.width, stream.height) == (320, 180)
    assert longest_still(path) < 1.2, "the picture goes on"
    told = agent.log.lines("become 640x480", level=Level.NOTICE)
    if name == "size-changes.ts":
        assert len(told) == 1, "one notice for the change to that size"
        left = movie.brightness(path, "crop=16:180:0:0")
        assert left[15] > 40 and min(left) < 24, "bars beside the narrower pictures"
    else:
        assert not told


def test_a_silent_movie_is_recovered_after_a_kill(agent, odd_movie):
    show(agent, odd_movie("silent.mp4"))
    agent.start()
    assert agent.start_recording("CRASH").text == "cmdStatus=0"
    agent.let_record(5)
    agent.kill9()
    agent.start()
    agent.log.wait("CRASH.mov", timeout=20)
    agent.stop()
    movie.decodes(agent.movie("CRASH"))
    streams = movie.streams(agent.movie("CRASH"))
    assert streams["video"].duration >= 4 and streams["audio"].duration >= 3, streams  # silence follows a second later


@pytest.mark.parametrize("rate", ["25", "30000/1001", "12"])
def test_a_movie_keeps_its_own_rate(agent, tmp_path, rate):
    show(agent, make_movie(tmp_path / "numbered.mp4", range(200), rate=rate), RecordingType="Video")
    agent.start()
    agent.record("RATE", 3)
    path = agent.movie("RATE")
    assert len(movie.runs(movie.counters(path))) == 1, "no frame doubled, none lost"
    length = 1 / float(fractions.Fraction(rate))
    times = movie.frame_times(path)
    assert all(abs(b - a - length) < 0.001 for a, b in zip(times, times[1:]))


def test_a_camera_that_halves_its_rate(agent, tmp_path):
    """As webcams do in the dark: each picture lasts twice as long, nothing is encoded twice."""
    numbers = [*range(60), *range(60, 120, 2)]
    path = make_movie(tmp_path / "dark.mkv", numbers, filters="setpts='if(lt(N,60),N,2*N-60)/30/TB'", keep_times=True)
    show(agent, path, RecordingType="Video", RecordingVideoMaximumFrameRate="30")
    agent.start()
    agent.record("DARK", 3)
    shown = movie.counters(agent.movie("DARK"))
    assert len(set(shown)) == len(shown), "no picture is there twice"
    times = movie.frame_times(agent.movie("DARK"))
    steps = {after - before: later - earlier
             for before, after, earlier, later in zip(shown, shown[1:], times, times[1:])}
    assert abs(steps[1] - 1 / 30) < 0.002 and abs(steps[2] - 2 / 30) < 0.002, steps


def test_a_movie_with_another_microphone_loops_on(agent, tmp_path):
    show(agent, make_movie(tmp_path / "two-seconds.mp4", range(60)), RecordingAudioInput="test://audio")
    agent.start()
    start, stop = agent.record("LOOPS", 6)
    path = agent.movie("LOOPS")
    check_times(path, stop.sent - start.received)
    shown = movie.counters(path)
    assert sum(a > b for a, b in zip(shown, shown[1:])) >= 2, "the movie has begun again"
    assert longest_still(path) < 0.5
    assert max(abs(movie.sound(path))) > 0.1, "the ticks of the synthetic microphone"


@pytest.mark.parametrize("name", ["empty.mp4", "text.mp4", "truncated.mp4", "sound-only.m4a"])
def test_is_refused_with_a_reason(agent, odd_movie, name):
    show(agent, odd_movie(name))
    agent.start()
    agent.log.wait("^Unable to acquire the specified video device", level=Level.ALERT)
    refused = agent.start_recording("NOTHING", timeout=40)
    assert refused.text == "cmdStatus=3" and refused.received - refused.sent < 15
    assert agent.log.lines(name, level=Level.ERROR), "a line says which file and why"
    assert agent.alive() and agent.repository() == []
