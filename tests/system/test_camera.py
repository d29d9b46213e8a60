"""Cameras that are missing, late, or lost in the middle; a movie file as a camera."""
import signal
import subprocess

import numpy
import pytest
from harness import movie
from harness.log_reader import Level
from harness.waiting import let_pass

OFFLINE = ("^Unable to acquire the specified video device. "
           "The agent will remain offline until the device becomes available.$")
SPEECH = ("Good morning, and welcome to the second lecture on waves. Today we look at water, at light and at sound, "
          "and at what the three of them have in common. Seven boxes of yellow chalk are on the desk.")


@pytest.fixture(scope="session")
def lecture(tmp_path_factory):
    """A movie with moving pictures and speech."""
    place = tmp_path_factory.mktemp("lecture")
    subprocess.run(["espeak-ng", "-w", str(place / "speech.wav"), SPEECH], check=True, timeout=60)
    subprocess.run(["ffmpeg", "-v", "error", "-f", "lavfi", "-i", "testsrc2=size=640x360:rate=30", "-i",
                    str(place / "speech.wav"), "-shortest", "-c:v", "libx264", "-preset", "superfast", "-pix_fmt",
                    "yuv420p", "-c:a", "aac", "-ar", "48000", "-ac", "2", str(place / "lecture.mov")],
                   check=True, timeout=120)
    return place / "lecture.mov"


def test_without_a_camera_the_daemon_waits_and_gives_up(agent):
    agent.preferences(RecordingVideoInput="file:///nowhere.mov")
    agent.start()
    missed = agent.log.wait(OFFLINE, level=Level.ALERT)
    assert agent.command("STATUS").fields["recordStatus"] == "0"
    assert agent.wait_exit(40) == 0
    gave_up = agent.log.wait("^lmxagentd is stopping...$", level=Level.INFO)
    assert 9.5 < gave_up.at - missed.at < 20, "the camera is looked for once more after more than ten seconds"
    assert not agent.log.lines("Internal error")
    assert not agent.path("/var/run/lmxagentd.pid").exists()


def test_a_camera_that_comes_in_time(agent, lecture):
    agent.preferences(RecordingVideoInput="file:///var/lmx/lecture.mov")
    agent.start()
    agent.log.wait(OFFLINE, level=Level.ALERT)
    late = agent.path("/var/lmx/lecture.tmp")
    late.write_bytes(lecture.read_bytes())
    late.rename(late.with_suffix(".mov"))
    agent.log.wait("^Connecting to lmxserverd tunnel", timeout=30)
    agent.record("LATE")
    assert agent.alive(), agent.report()
    movie.decodes(agent.movie("LATE"))


@pytest.mark.parametrize("fault", ["lost-after", "silent-after", "eos-after"])
def test_a_camera_lost_in_the_middle(agent, fault):
    agent.preferences(RecordingVideoInput=f"test://video?size=640x360&fps=30&{fault}=2")
    agent.start()
    start = agent.start_recording("LOST")
    assert start.text == "cmdStatus=0"
    agent.log.wait(r"^The capture device has been disconnected\.$", timeout=30, level=Level.CRITICAL)
    assert agent.wait_exit(30) == 1
    agent.log.wait("^Internal error caused application to stop$", level=Level.CRITICAL)
    assert agent.submitted("end") == ["LOST"]
    movie.decodes(agent.movie("LOST"))
    (span,) = movie.runs(movie.counters(agent.movie("LOST")))
    assert 1.0 < (span[1] - span[0] + 1) / 30 < 2.2
    assert agent.document("LOST")["RecordingMetadata_RECORDING_UUID"] == "LOST"


def test_a_microphone_that_is_all_there_is_lost_in_the_middle(agent):
    agent.preferences(RecordingType="Audio", RecordingAudioInput="test://audio?silent-after=2")
    agent.start()
    assert agent.start_recording("MUTE").text == "cmdStatus=0"
    agent.log.wait(r"^The capture device has been disconnected\.$", timeout=30, level=Level.CRITICAL)
    assert agent.wait_exit(30) == 1
    assert agent.submitted("end") == ["MUTE"]
    movie.decodes(agent.movie("MUTE"))


def test_a_lost_camera_waits_for_the_submission(agent):
    agent.preferences(RecordingVideoInput="test://video?size=640x360&fps=30&lost-after=3")
    agent.set_tool({"when": "--submit", "hang": True})
    agent.start()
    agent.record("FIRST")
    agent.wait_tool_call("FIRST")
    agent.start_recording("LOST")
    agent.wait_recorded("LOST")
    let_pass(1, "the daemon looks four times a second whether it may end")
    assert not agent.log.lines("has been disconnected"), "a job is still queued"
    agent.release_tool()
    assert agent.wait_exit(30) == 1
    assert agent.submitted("end") == ["FIRST", "LOST"]


def test_no_camera_is_looked_for_during_a_recording(agent):
    """After SIGHUP the camera is looked for again ten seconds later; not finding it would end the daemon."""
    agent.start()
    agent.sandbox.signal(signal.SIGHUP)
    agent.log.wait("^Process cancelCapture$", level=Level.DEBUG)
    assert agent.start_recording("LECTURE").text == "cmdStatus=0"
    agent.preferences(RecordingVideoInput="file:///nowhere.mov")
    mark = agent.log.mark()
    agent.log.wait("^Connecting to lmxserverd tunnel", timeout=20, after=mark)  # what records proves the camera
    assert agent.command("STATUS").fields["recordStatus"] == "2"
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("LECTURE", event="end")
    assert agent.alive() and agent.submitted("end") == ["LECTURE"]


def test_a_movie_file_as_the_camera_with_its_sound(agent, lecture):
    agent.path("/var/lmx/lecture.mov").write_bytes(lecture.read_bytes())
    agent.preferences(RecordingVideoInput="file:///var/lmx/lecture.mov",
                      RecordingAudioInput="file:///var/lmx/lecture.mov")
    agent.start()
    start, stop = agent.record("SPEECH", 6)
    path = agent.movie("SPEECH")
    streams = movie.streams(path)
    wanted = stop.sent - start.received
    assert all(abs(stream.duration - wanted) < 0.15 for stream in streams.values()), (streams, wanted)
    movie.decodes(path)

    heard, source = movie.sound(path), movie.sound(lecture)
    assert len(source) > len(heard), "two rounds of the file contain it, wherever it begins"
    looped = numpy.tile(source, 4)
    offset, likeness = movie.best_match(heard[800:-800], looped[:2 * len(source)])
    assert likeness > 0.9, f"at {offset / 8000:.2f} s only {likeness:.2f} alike"
    offset += len(source)
    audible = 0
    for second in range(5):  # no drift and no gap: each second fits at the same place
        piece = heard[800 + second * 8000: 800 + (second + 1) * 8000]
        if numpy.sqrt(numpy.mean(piece**2)) < 0.01:
            continue
        audible += 1
        around = looped[offset + second * 8000 - 400: offset + (second + 1) * 8000 + 400]
        shift, alike = movie.best_match(piece, around)
        assert abs(shift - 400) <= 24 and alike > 0.85, (second, (shift - 400) / 8000, alike)
    assert audible >= 3
