"""Cameras and microphones of PipeWire: found, shared, unplugged, silent, swapped and back."""
import time

import pytest
from harness import movie, sounds
from harness.log_reader import Level
from harness.pipewire_hall import PipeWireHall
from harness.waiting import let_pass, wait_until

LOST = r"^The capture device has been disconnected\.$"


@pytest.fixture
def hall(agent):
    """A running PipeWire whose sockets the agent finds; what a test starts in it ends with it."""
    with PipeWireHall(agent) as one:
        yield one


@pytest.fixture
def camera(hall):
    with hall.camera("podium") as one:
        yield one


@pytest.fixture
def microphone(hall):
    with hall.microphone("lectern", frequency=440) as one:
        yield one


def last_error(agent):
    return agent.command("STATUS").fields["lastError"]


def test_picture_and_sound(agent, hall, camera, microphone):
    agent.preferences(RecordingVideoInput=camera.id, RecordingAudioInput=microphone.id)
    agent.start(env=hall.env)
    start, stop = agent.record("BOTH", 3)
    path = agent.movie("BOTH")
    movie.decodes(path)
    for stream in movie.streams(path).values():
        assert abs(stream.duration - (stop.sent - start.received)) < 0.4
    heard = sounds.heard(path)
    assert sounds.is_tone(heard[1:], 440), heard
    shown = movie.counters(path)
    assert shown == sorted(set(shown)), "no picture twice, none out of order"
    assert len(shown) > 0.9 * (shown[-1] - shown[0] + 1), shown


def test_automatic_finds_them_and_the_list_names_them(agent, hall, camera, microphone):
    agent.preferences(RecordingVideoInput="Automatic", RecordingAudioInput="Automatic")
    agent.start(env=hall.env)
    listed = agent.run("-i", "zq-device-list", env=hall.env).stdout
    assert camera.id in listed and microphone.id in listed, listed
    agent.record("AUTO", 1)
    assert sounds.heard(agent.movie("AUTO"))[-1] == 440
    assert agent.alive()


def test_automatic_takes_nothing_that_a_program_makes_up(agent, hall):
    with hall.camera("screen", api=None):
        agent.preferences(RecordingVideoInput="Automatic")
        agent.start(env=hall.env)
        assert agent.start_recording("NOTHING").text == "cmdStatus=3"
        assert "pipewire:screen" in agent.run("-i", "zq-device-list", env=hall.env).stdout


def test_stop_then_start_at_once(agent, hall, camera, microphone):
    agent.preferences(RecordingVideoInput=camera.id, RecordingAudioInput=microphone.id)
    agent.start(env=hall.env)
    for uuid in ("A", "B", "C"):
        assert agent.start_recording(uuid).text == "cmdStatus=0"
        agent.let_record(1)
        assert agent.command("STOP").text == "cmdStatus=0"
    for uuid in ("A", "B", "C"):
        agent.wait_tool_call(uuid)
        assert movie.streams(agent.movie(uuid))["video"].duration > 0.5
        assert 440 in sounds.heard(agent.movie(uuid))


@pytest.mark.parametrize("first, second", [(None, "pipewire:lectern"), ("pipewire:lectern", None),
                                           ("Automatic", "pipewire:lectern")])
def test_one_microphone_by_two_names(agent, hall, camera, microphone, first, second):
    """STOP and START at once, with another name for the same microphone: the second recording hears it, too."""
    agent.preferences(RecordingVideoInput=camera.id, RecordingAudioInput=first)
    agent.start(env=hall.env)
    for uuid, name in (("A", first), ("B", second), ("C", first)):
        agent.preferences(RecordingVideoInput=camera.id, RecordingAudioInput=name)
        assert agent.start_recording(uuid).text == "cmdStatus=0"
        agent.let_record(2)
        assert agent.command("STATUS").fields["lastError"] == "0"
        assert agent.command("STOP").text == "cmdStatus=0"
    for uuid in ("A", "B", "C"):
        agent.wait_tool_call(uuid)
        heard = sounds.heard(agent.movie(uuid))
        assert heard.count(440) >= len(heard) / 2, (uuid, heard)


@pytest.mark.parametrize("end", ["unplugged", "stalled"])
def test_a_camera_lost_in_the_middle(agent, hall, camera, end):
    agent.preferences(RecordingVideoInput=camera.id)
    agent.start(env=hall.env)
    assert agent.start_recording("LOST").text == "cmdStatus=0"
    agent.let_record(2)
    camera.kill() if end == "unplugged" else camera.stall()
    lost = time.monotonic()
    agent.wait_recorded("LOST")
    assert time.monotonic() - lost < 4, "two seconds of silence, and a little for the file"
    agent.log.wait(LOST, timeout=20, level=Level.CRITICAL)  # once the recording is submitted
    assert agent.wait_exit(30) == 1
    assert agent.submitted("end") == ["LOST"]
    movie.decodes(agent.movie("LOST"))
    assert movie.streams(agent.movie("LOST"))["video"].duration > 1.5
    camera.kill()
    camera.start()
    agent.start(env=hall.env)
    agent.record("NEXT", 1)
    movie.decodes(agent.movie("NEXT"))


@pytest.mark.parametrize("trouble", ["unplugged", "stalled"])
def test_a_microphone_that_goes_and_comes_back(agent, hall, microphone, trouble):
    """Another microphone stands beside it: it must not be heard in its place."""
    with hall.microphone("neighbour", frequency=720):
        agent.preferences(RecordingAudioInput=microphone.id)
        agent.start(env=hall.env)
        assert agent.start_recording("AWAY").text == "cmdStatus=0"
        agent.let_record(2)
        mark = agent.log.mark()
        microphone.unplug() if trouble == "unplugged" else microphone.stall()
        agent.log.wait("lectern", timeout=10, after=mark, level=Level.ERROR)
        wait_until(lambda: last_error(agent) == "9", 5, "the error in STATUS")
        let_pass(2, "the microphone is away")
        microphone.start() if trouble == "unplugged" else microphone.go_on()
        wait_until(lambda: last_error(agent) == "0", 15, "the microphone's return in STATUS")
        let_pass(2, "it is heard again")
        assert agent.command("STOP").text == "cmdStatus=0"
        agent.wait_tool_call("AWAY")
    path = agent.movie("AWAY")
    movie.decodes(path)
    heard = sounds.heard(path)
    assert heard[1] == 440 and heard.count(None) >= 3 and heard[-2] == 440 and 720 not in heard, heard
    (span,) = movie.runs(movie.counters(path))  # the picture has lost nothing
    assert abs(movie.streams(path)["audio"].duration - (span[1] - span[0] + 1) / 30) < 0.1
    assert len(agent.log.lines("lectern", after=mark, level=Level.ERROR)) == 1, "told once"
    assert not agent.log.lines(LOST)


@pytest.mark.parametrize("wanted", ["pipewire:lectern", "Automatic"])
def test_a_microphone_that_comes_late(agent, hall, camera, wanted):
    agent.preferences(RecordingVideoInput=camera.id, RecordingAudioInput=wanted)
    agent.start(env=hall.env)
    assert agent.start_recording("LATE").text == "cmdStatus=0"
    agent.let_record(2)
    assert agent.log.lines(level=Level.ERROR), "it is told that there is no microphone"
    with hall.microphone("lectern", frequency=440):
        wait_until(lambda: last_error(agent) == "0", 15, "the microphone in STATUS")
        let_pass(2, "it is heard")
        assert agent.command("STOP").text == "cmdStatus=0"
        agent.wait_tool_call("LATE")
    heard = sounds.heard(agent.movie("LATE"))
    assert heard[:3] == [None] * 3 and heard[-2] == 440, heard


def test_pipewire_itself_ends(agent, hall, camera, microphone):
    agent.preferences(RecordingVideoInput=camera.id, RecordingAudioInput=microphone.id)
    agent.start(env=hall.env)
    assert agent.start_recording("LOST").text == "cmdStatus=0"
    agent.let_record(2)
    hall.kill()
    agent.log.wait(LOST, timeout=20, level=Level.CRITICAL)
    assert agent.wait_exit(30) == 1
    assert agent.submitted("end") == ["LOST"]
    movie.decodes(agent.movie("LOST"))


def test_pipewire_begins_again_with_other_devices(agent, hall):
    """The list of devices is that of the server that runs."""
    agent.start(env=hall.env)
    for uuid, frequency in (("BEFORE", 440), ("AFTER", 720)):
        with hall.microphone("lectern-" + uuid, frequency=frequency) as microphone:
            agent.preferences(RecordingAudioInput=microphone.id)
            agent.record(uuid, 2)
        assert sounds.heard(agent.movie(uuid))[-1] == frequency
        hall.kill()
        hall.start()
