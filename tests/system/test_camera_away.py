"""Commands while a network camera is away: answered in time, and the sound goes on."""
import signal
import time

import pytest
from harness import movie
from harness.rtsp_camera import RtspCamera
from harness.waiting import let_pass

MICROPHONE = "test://audio"


@pytest.fixture
def camera(agent):
    """A recording with a network camera, which has just died, and the synthetic microphone, which lives."""
    with RtspCamera(agent.prepare()) as one:
        agent.preferences(RecordingVideoInput=one.uri, RecordingAudioInput=MICROPHONE)
        agent.start()
        one.begun = agent.start_recording("AWAY")
        assert one.begun.text == "cmdStatus=0"
        agent.let_record(3)
        one.kill()
        agent.log.wait("^The camera is away: ", 10)
        let_pass(3, "the camera stays away")
        yield one


def check(path, wanted):
    """Picture and sound last so long, and the sound's ticks, one a second, are there to its end."""
    movie.decodes(path, "-fps_mode", "vfr")  # pictures that are there to be decoded only come in one moment
    for stream in movie.streams(path).values():
        assert abs(stream.duration - wanted) < 1.5, (stream, wanted)
    sound = movie.sound(path)
    ticks = [max(abs(sound[at: at + 8000])) > 0.3 for at in range(0, len(sound) - 8000, 8000)]
    assert all(ticks[1:]), ticks


def finish(agent, begun, pause=0):
    """STOP, in time; then the movie. `pause`: seconds that are left out."""
    stop = agent.command("STOP")
    assert stop.text == "cmdStatus=0" and stop.received - stop.sent < 2
    agent.wait_recorded("AWAY", timeout=5)
    check(agent.movie("AWAY"), stop.sent - begun.received - pause)


def test_stop(agent, camera):
    finish(agent, camera.begun)
    agent.wait_idle()


def test_pause_and_resume(agent, camera):
    """No picture comes behind the pause: what was said in it is not in the movie all the same."""
    paused = agent.command("PAUSE")
    let_pass(2, "the pause")
    resumed = agent.command("RESUME")
    for reply in (paused, resumed):
        assert reply.text == "cmdStatus=0" and reply.received - reply.sent < 1
    let_pass(2, "the lecture goes on")
    finish(agent, camera.begun, resumed.sent - paused.sent)


def test_cancel(agent, camera):
    reply = agent.command("CANCEL")
    assert reply.text == "cmdStatus=0" and reply.received - reply.sent < 2
    agent.wait_idle()
    assert not agent.movie("AWAY").exists()
    camera.start()
    agent.record("NEXT", 1)


def test_sigterm(agent, camera):
    ended = time.time()
    assert agent.stop(signal.SIGTERM, timeout=8) == 0
    agent.preferences()
    agent.start()
    agent.log.wait("AWAY.mov", timeout=20)
    agent.wait_idle()
    check(agent.movie("AWAY"), ended - camera.begun.received)


@pytest.mark.slow
def test_a_camera_that_is_back_after_eight_seconds(agent, camera):
    let_pass(camera.begun.received + 11 - time.time(), "the camera is away")
    camera.start()
    agent.log.wait("^The camera is back after ", 10)
    agent.let_record(int(time.time() - camera.begun.received) + 3)
    finish(agent, camera.begun)
    assert len(agent.log.lines("^Not real in this recording: .*camera away from 0:00:0")) == 1
    times = movie.frame_times(agent.movie("AWAY"))
    assert times[-1] - times[-31] < 2.5, "pictures to the end"
