"""Devices that fail at awkward moments: while START is being prepared, around SIGHUP, or by what they are called."""
import signal

import pytest
from harness import movie, sounds
from harness.log_reader import Level
from harness.rtsp_camera import RtspCamera
from harness.slow_calls import slow_directories
from harness.waiting import wait_until

CAMERA = "test://video?size=320x180&fps=30"
LOST = r"^The capture device has been disconnected\.$"


@pytest.mark.slow
def test_a_camera_that_fails_while_start_is_prepared(agent):
    """Whenever it fails, START says so or the recording ends; it never stays "recording" with nothing behind it."""
    prefix = slow_directories(agent, 150)
    agent.start(prefix=prefix)
    for attempt in range(12):
        agent.preferences(RecordingVideoInput=f"{CAMERA}&lost-after={attempt % 6 * 0.04:.2f}")
        started = agent.start_recording(f"LOST-{attempt}").text
        assert started in ("cmdStatus=0", "cmdStatus=3")
        if started == "cmdStatus=0":
            assert agent.wait_exit(15) == 1, "as for a camera that is lost later"
            agent.preferences()
            agent.start(prefix=prefix)
        assert agent.command("STATUS").fields["recordStatus"] == "0"
    agent.preferences()
    agent.record("NEXT", 1)
    movie.decodes(agent.movie("NEXT"))


@pytest.mark.slow
def test_sighup_and_a_start_within_ten_seconds(agent):
    """The look for the camera that SIGHUP leads to neither ends the recording nor opens the camera beside it."""
    with RtspCamera(agent.prepare()) as camera:
        agent.preferences(RecordingVideoInput=camera.uri, RecordingType="Video")
        agent.start()
        agent.sandbox.signal(signal.SIGHUP)
        agent.log.wait("^Process cancelCapture$", level=Level.DEBUG)
        assert agent.start_recording("LIVES").text == "cmdStatus=0"
        agent.let_record(13)
        assert agent.command("STOP").text == "cmdStatus=0"
        assert agent.wait_recorded("LIVES") >= 12
        assert agent.alive() and max(camera.viewers()) == 1
        agent.sandbox.signal(signal.SIGHUP)
        mark = agent.log.mark()
        agent.log.wait("^Connecting to lmxserverd tunnel", timeout=20, after=mark)  # the look has found the camera
        agent.record("SHARED", 1)
        assert agent.alive() and max(camera.viewers()) == 1, "with the preview that it has left open"
    movie.decodes(agent.movie("LIVES"))


def test_what_is_no_microphone_is_refused(running):
    running.preferences(RecordingAudioInput="banana")
    assert running.start_recording("NOTHING").text == "cmdStatus=3"
    running.log.wait("Unknown device ID: banana for preference: RecordingAudioInput", level=Level.CRITICAL)
    running.preferences()
    running.record("NEXT", 1)


@pytest.mark.parametrize("microphone", ["alsa:usb-0000:00:14.0-3", "pipewire:alsa_input.usb-nowhere"])
def test_a_microphone_that_is_away_is_silence(agent, microphone):
    agent.preferences(RecordingAudioInput=microphone)
    agent.start()
    mark = agent.log.mark()
    assert agent.start_recording("SILENCE").text == "cmdStatus=0"
    agent.let_record(3)
    assert agent.command("STATUS").fields["lastError"] == "9"
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("SILENCE")
    told = agent.log.lines(microphone.replace(".", r"\."), after=mark, level=Level.ERROR)
    assert len(told) == 1, "told once, however often it is looked for"
    streams = movie.streams(agent.movie("SILENCE"))
    assert abs(streams["audio"].duration - streams["video"].duration) < 0.1
    assert set(sounds.heard(agent.movie("SILENCE"))) == {None}


@pytest.mark.parametrize("fault", ["lost-after", "silent-after", "eos-after"])
def test_a_microphone_lost_while_the_camera_lives(agent, fault):
    agent.preferences(RecordingAudioInput=f"test://audio?{fault}=2")
    agent.start()
    assert agent.start_recording("MUTE").text == "cmdStatus=0"
    agent.log.wait("test://audio", timeout=10, level=Level.ERROR)
    wait_until(lambda: agent.command("STATUS").fields["lastError"] == "9", 5, "the error in STATUS")
    agent.let_record(7)
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("MUTE")
    assert agent.alive() and not agent.log.lines(LOST)
    path = agent.movie("MUTE")
    movie.decodes(path)
    streams = movie.streams(path)
    assert len(movie.runs(movie.counters(path))) == 1 and streams["video"].duration > 6.5
    assert abs(streams["audio"].duration - streams["video"].duration) < 0.1
