"""Network cameras: with and without sound, slow to begin, absent, lost and back."""
import contextlib
import re
import time
from pathlib import Path

import pytest
from harness import movie, sounds
from harness.agent import REPOSITORY
from harness.log_reader import Level
from harness.numbered import make_movie
from harness.rtsp_camera import SOUND, RtspCamera, mode, picture, showing
from harness.waiting import let_pass, wait_until

OFFLINE = "^Unable to acquire the specified video device. The agent will remain offline"
LOST = r"^The capture device has been disconnected\.$"
WITH_SOUND = picture() + " " + SOUND


def watch(agent, camera, **preferences):
    """Names the camera, and its own sound, in the preferences."""
    agent.preferences(**{"RecordingVideoInput": camera.uri, "RecordingAudioInput": "Automatic", **preferences})


def stop(agent, uuid):
    """@return how long STOP took, and the duration that the log tells"""
    reply = agent.command("STOP")
    assert reply.text == "cmdStatus=0"
    return reply.received - reply.sent, agent.wait_recorded(uuid)


@pytest.mark.parametrize("transport", ["tcp", "udp"])
def test_picture_and_sound(agent, transport):
    with RtspCamera(agent.prepare(), WITH_SOUND, transport=transport) as camera:
        watch(agent, camera)
        agent.start()
        start, end = agent.record("NET", 3)
    path = agent.movie("NET")
    movie.decodes(path)
    for stream in movie.streams(path).values():
        assert abs(stream.duration - (end.sent - start.received)) < 0.4
    heard = sounds.heard(path)
    assert heard[1:] == [440] * (len(heard) - 1), heard


def test_a_camera_without_sound_is_recorded_with_silence(agent):
    with RtspCamera(agent.prepare()) as camera:
        watch(agent, camera)
        agent.start()
        assert agent.start_recording("MUTE").text == "cmdStatus=0"
        agent.let_record(4)
        took, _ = stop(agent, "MUTE")
        assert took < 2
    path = agent.movie("MUTE")
    movie.decodes(path)
    streams = movie.streams(path)
    assert abs(streams["audio"].duration - streams["video"].duration) < 0.1 and streams["video"].duration > 3.5
    assert set(sounds.heard(path)) == {None}


@pytest.mark.slow
def test_a_camera_without_sound_is_recovered_after_a_kill(agent):
    with RtspCamera(agent.prepare()) as camera:
        watch(agent, camera)
        agent.start()
        start = agent.start_recording("CRASH")
        let_pass(start.received + 10 - time.time(), "ten seconds of lecture")
        agent.kill9()
    agent.preferences()
    agent.start()
    agent.log.wait(re.escape("CRASH.mov"), timeout=20)
    wait_until(lambda: agent.movie("CRASH").with_suffix(".xml").exists(), what="the document")
    movie.decodes(agent.movie("CRASH"))
    streams = movie.streams(agent.movie("CRASH"))
    assert streams["video"].duration >= 9 and streams["audio"].duration >= 8, streams  # silence follows a second later


def test_the_first_key_frame_after_four_seconds(agent):
    with RtspCamera(agent.prepare(), key_frame_after=4) as camera:
        watch(agent, camera)
        agent.start()
        agent.record("LATE", 2)
    movie.decodes(agent.movie("LATE"))
    assert 1.5 < movie.streams(agent.movie("LATE"))["video"].duration < 4
    assert not agent.log.lines(level=Level.ALERT)


@pytest.mark.slow
@pytest.mark.parametrize("trouble", ["no key frame", "no answer", "nobody listens"])
def test_start_is_refused_while_nothing_comes(agent, trouble):
    """The camera is there at the start of the daemon, so that it is not offline."""
    with RtspCamera(agent.prepare()) as camera, contextlib.ExitStack() as instead:
        watch(agent, camera)
        agent.start()
        if trouble == "no answer":
            camera.stall()
        else:
            camera.kill()
        if trouble == "no key frame":
            instead.enter_context(RtspCamera(agent, key_frame_after=3600))
        mark = agent.log.mark()
        refused = agent.start_recording("NOTHING", timeout=40)
        assert refused.text == "cmdStatus=3" and refused.received - refused.sent < 15
        agent.log.wait("The capture could not be prepared", after=mark)
        assert agent.command("STATUS").fields["recordStatus"] == "0"
        assert agent.alive() and agent.repository() == []


def test_start_works_again_when_the_camera_is_back(agent):
    with RtspCamera(agent.prepare()) as camera:
        watch(agent, camera)
        agent.start()
        camera.kill()
        assert agent.start_recording("NOTHING", timeout=40).text == "cmdStatus=3"
        camera.start()
        agent.record("NEXT", 1)
    movie.decodes(agent.movie("NEXT"))


@pytest.mark.slow
def test_nobody_listens_at_the_start(agent):
    agent.preferences(RecordingVideoInput="rtsp://127.0.0.1:8554/hall", RecordingAudioInput="Automatic")
    agent.start()
    missed = agent.log.wait(OFFLINE, level=Level.ALERT)
    assert not agent.log.lines("^Using Video Device Named")
    assert agent.start_recording("NOTHING", timeout=40).text == "cmdStatus=3"
    assert agent.wait_exit(60) == 0
    gave_up = agent.log.wait("^lmxagentd is stopping...$", level=Level.INFO)
    assert gave_up.at - missed.at > 9.5, "the camera is looked for once more after more than ten seconds"


def test_a_camera_that_comes_in_time(agent):
    camera = RtspCamera(agent.prepare())
    watch(agent, camera)
    agent.start()
    agent.log.wait(OFFLINE, level=Level.ALERT)
    with camera:
        agent.log.wait("^Connecting to lmxserverd tunnel", timeout=30)
        agent.record("LATE", 1)
    movie.decodes(agent.movie("LATE"))


@pytest.mark.slow
@pytest.mark.parametrize("end", ["killed", "stalled"])
def test_a_camera_lost_for_good(agent, end):
    with RtspCamera(agent.prepare(), WITH_SOUND) as camera:
        watch(agent, camera)
        agent.start()
        assert agent.start_recording("LOST").text == "cmdStatus=0"
        agent.let_record(3)
        camera.kill() if end == "killed" else camera.stall()
        lost = time.monotonic()
        told = agent.log.wait(LOST, timeout=40, level=Level.CRITICAL)
        assert 5 < told.at - lost < 20, "three tries in ten seconds"
        assert agent.wait_exit(30) == 1
    assert agent.submitted("end") == ["LOST"]
    movie.decodes(agent.movie("LOST"))
    assert movie.streams(agent.movie("LOST"))["video"].duration > 2.5

    with RtspCamera(agent.prepare(), WITH_SOUND):
        agent.start()
        agent.record("NEXT", 1)
    movie.decodes(agent.movie("NEXT"))


@pytest.mark.slow
@pytest.mark.parametrize("trouble", ["restarted", "stalled"])
def test_a_camera_that_comes_back(agent, trouble):
    with RtspCamera(agent.prepare(), WITH_SOUND) as camera:
        watch(agent, camera)
        agent.start()
        start = agent.start_recording("BACK")
        agent.let_record(3)
        mark = agent.log.mark()
        camera.kill() if trouble == "restarted" else camera.stall()
        let_pass(4, "the camera is away")
        camera.start() if trouble == "restarted" else camera.go_on()
        agent.let_record(13)
        _, told = stop(agent, "BACK")
        wanted = time.time() - start.received
        assert agent.alive() and not agent.log.lines(LOST)
    path = agent.movie("BACK")
    movie.decodes(path)
    assert abs(told - wanted) < 2
    streams = movie.streams(path)
    assert all(abs(stream.duration - wanted) < 1 for stream in streams.values()), (streams, wanted)
    heard = sounds.heard(path)
    assert heard[1:5] == [440] * 4 and heard[-2] == 440 and heard.count(None) >= 2, heard
    assert len(agent.log.lines(re.escape(camera.uri), after=mark, level=Level.ERROR)) <= 1


@pytest.mark.slow
def test_what_is_said_while_the_camera_is_away_is_kept_to_the_stop(agent):
    with RtspCamera(agent.prepare()) as camera:
        watch(agent, camera, RecordingAudioInput="test://audio")
        agent.start()
        start = agent.start_recording("SAID")
        agent.let_record(3)
        camera.kill()
        let_pass(4, "the camera is away")
        wanted = time.time() - start.received
        took, told = stop(agent, "SAID")
        assert took < 3
    path = agent.movie("SAID")
    movie.decodes(path)
    assert abs(told - wanted) < 0.5
    streams = movie.streams(path)
    assert all(abs(stream.duration - wanted) < 0.5 for stream in streams.values()), (streams, wanted)
    sound = abs(movie.sound(path))
    ticks = sum(sound[at: at + 8000].max() > 0.1 for at in range(0, len(sound) - 8000, 8000))
    assert ticks >= int(wanted) - 1, "the synthetic microphone ticks each second"


@pytest.mark.slow
def test_sound_that_ends_while_the_picture_goes_on(agent):
    """The rest is silence; the camera counts as there."""
    launch = picture() + " " + SOUND.replace("rtpmp4gpay", "valve name=cable ! rtpmp4gpay")
    with RtspCamera(agent.prepare(), launch) as camera:
        watch(agent, camera)
        agent.start()
        start = agent.start_recording("HALF")
        agent.let_record(3)
        camera.change("cable", "drop", "true")
        agent.let_record(9)
        _, told = stop(agent, "HALF")
        wanted = time.time() - start.received
        assert agent.alive() and not agent.log.lines("^The camera is away")
    path = agent.movie("HALF")
    movie.decodes(path)
    streams = movie.streams(path)
    assert abs(told - wanted) < 2 and all(abs(stream.duration - wanted) < 1 for stream in streams.values())
    heard = sounds.heard(path)
    assert heard[1:5] == [440] * 4 and heard[-8:] == [None] * 8, heard
    assert max(b - a for a, b in zip(movie.frame_times(path), movie.frame_times(path)[1:])) < 0.5


def test_a_stream_that_ends(agent, tmp_path):
    """The camera ends its stream after five seconds and shows it again to who asks again."""
    path = make_movie(tmp_path / "five.mp4", range(150))
    with RtspCamera(agent.prepare(), showing(path)) as camera:
        watch(agent, camera, RecordingType="Video")
        agent.start()
        start = agent.start_recording("ENDS")
        agent.let_record(9)
        _, told = stop(agent, "ENDS")
        assert abs(told - (time.time() - start.received)) < 2
        assert agent.alive()
    movie.decodes(agent.movie("ENDS"))
    shown = movie.counters(agent.movie("ENDS"))
    assert shown.count(30) == 2 or shown.index(max(shown)) < len(shown) - 1, "it begins again"


def test_a_size_that_changes(agent):
    with RtspCamera(agent.prepare()) as camera:
        watch(agent, camera, RecordingType="Video")
        agent.start()
        assert agent.start_recording("SIZES").text == "cmdStatus=0"
        agent.let_record(2)
        mark = agent.log.mark()
        camera.change("mode", "caps", mode((640, 480)))
        agent.log.wait("become 640x480", after=mark, level=Level.NOTICE)
        agent.let_record(5)
        stop(agent, "SIZES")
        assert len(agent.log.lines("become 640x480", after=mark)) == 1
    path = agent.movie("SIZES")
    movie.decodes(path)
    stream = movie.streams(path)["video"]
    assert (stream.width, stream.height) == (320, 180) and stream.duration > 4.5
    left, middle = movie.brightness(path, "crop=16:180:0:0"), movie.brightness(path, "crop=160:100:80:0")
    assert left[15] > 60 and max(left[-30:]) < 24, "black bars beside the narrower picture"
    assert min(middle[-30:]) > 60, "and the picture between them"


def test_25_frames_a_second_stay_25(agent, tmp_path):
    path = make_movie(tmp_path / "25.mp4", range(250), rate=25)
    with RtspCamera(agent.prepare(), showing(path)) as camera:
        watch(agent, camera, RecordingType="Video")
        agent.start()
        agent.record("PAL", 3)
    recorded = agent.movie("PAL")
    assert movie.streams(recorded)["video"].rate == "25/1"
    assert len(movie.runs(movie.counters(recorded))) == 1, "no frame is doubled or lost"
    times = movie.frame_times(recorded)
    assert all(abs(b - a - 0.04) < 0.001 for a, b in zip(times, times[1:]))


def test_one_viewer_at_a_time(agent):
    """The probe, the preview's look and the recordings share the camera or follow each other."""
    with RtspCamera(agent.prepare(), WITH_SOUND) as camera:
        watch(agent, camera)
        agent.start()
        agent.record("A", 1)
        agent.record("B", 1)
        assert max(camera.viewers()) == 1, camera.viewers()
        wait_until(lambda: camera.viewers()[-1] == 0, what="the idle agent to close the camera")


@pytest.mark.parametrize("password", ["geheim42", "wrong-geheim42"])
def test_a_password_is_nowhere_to_be_read(agent, password):
    with RtspCamera(agent.prepare(), user="hall", password="geheim42") as camera:
        watch(agent, camera, RecordingVideoInput=camera.uri.replace("geheim42", password))
        agent.start()
        replies = [agent.start_recording("SECRET", timeout=40)]
        assert replies[0].text == ("cmdStatus=0" if password == "geheim42" else "cmdStatus=3")
        left = ""
        if password == "geheim42":
            agent.let_record(1)
            (journal,) = agent.path(f"{REPOSITORY}/.lmxagentd").glob("*/journal")
            left = journal.read_text()
            camera.kill()
            let_pass(3, "the camera is away, and that is told")
        replies += [agent.command("STATUS"), agent.command("STOP")]
        if password == "geheim42":
            agent.wait_tool_call("SECRET")
            left += agent.movie("SECRET").with_suffix(".xml").read_text()
            left += agent.movie("SECRET").read_bytes().decode("latin-1")
        title = Path(f"/proc/{agent.sandbox.daemon_pid}/cmdline").read_text()
        listed = agent.run("-i", "zq-device-list")
    told = [line.raw for line in agent.log.lines()] + [reply.text for reply in replies]
    assert "geheim42" not in "\n".join([*told, left, title, listed.stdout, listed.stderr, agent.errors()])
