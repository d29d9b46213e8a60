"""Microphones of ALSA by name: user-space devices with and without a pace of their own."""
import pytest
from harness import movie, sounds
from harness.alsa_hall import AlsaHall
from harness.log_reader import Level
from harness.pipewire_hall import PipeWireHall


@pytest.fixture
def alsa(agent):
    return AlsaHall(agent)


@pytest.fixture
def desk(agent, alsa):
    """The environment for an ALSA microphone "desk" at real-time pace: a sine of 440 Hz."""
    with PipeWireHall(agent) as hall, hall.microphone("lectern", frequency=440) as microphone:
        alsa.of_pipewire("desk", microphone)
        yield {**hall.env, **alsa.env}


def test_a_microphone_by_name(agent, alsa, desk):
    agent.preferences(RecordingAudioInput=alsa.id("desk"))
    agent.start(env=desk)
    start, stop = agent.record("DESK", 4)
    path = agent.movie("DESK")
    movie.decodes(path)
    assert abs(movie.streams(path)["audio"].duration - (stop.sent - start.received)) < 0.2
    heard = sounds.heard(path)
    assert sounds.is_tone(heard[1:], 440), heard


def test_stop_then_start_at_once(agent, alsa, desk):
    agent.preferences(RecordingAudioInput=alsa.id("desk"))
    agent.start(env=desk)
    for uuid in ("A", "B", "C", "D"):
        assert agent.start_recording(uuid).text == "cmdStatus=0"
        agent.let_record(1)
        assert agent.command("STOP").text == "cmdStatus=0"
    for uuid in ("A", "B", "C", "D"):
        agent.wait_tool_call(uuid)
        assert 440 in sounds.heard(agent.movie(uuid)), uuid
    assert not agent.log.lines("(?i)busy")


def test_one_device_by_two_names(agent, alsa, desk):
    """The second recording finds the device free, or shares it; in no case is it silent."""
    alsa.pcm("lectern", alsa.definition("desk"))
    agent.start(env=desk)
    for uuid, name in (("A", "desk"), ("B", "lectern"), ("C", "desk")):
        agent.preferences(RecordingAudioInput=alsa.id(name))
        assert agent.start_recording(uuid).text == "cmdStatus=0"
        agent.let_record(2)
        assert agent.command("STOP").text == "cmdStatus=0"
    for uuid in ("A", "B", "C"):
        agent.wait_tool_call(uuid)
        heard = sounds.heard(agent.movie(uuid))
        assert heard.count(440) >= len(heard) / 2, (uuid, heard)


def test_sound_alone(agent, alsa, desk):
    agent.preferences(RecordingType="Audio", RecordingAudioInput=alsa.id("desk"))
    agent.start(env=desk)
    agent.record("ALONE", 3)
    heard = sounds.heard(agent.movie("ALONE"))
    assert set(movie.streams(agent.movie("ALONE"))) == {"audio"}
    assert sounds.is_tone(heard[1:-1], 440), heard


@pytest.mark.parametrize("kind", ["silent", "playing"])
def test_a_device_without_a_pace(agent, alsa, kind):
    """It gives sound as fast as it is read; the recording keeps to the clock, and the picture does not suffer."""
    getattr(alsa, kind)("tape")
    agent.preferences(RecordingAudioInput=alsa.id("tape"))
    agent.start(env=alsa.env)
    start, stop = agent.record("TAPE", 3)
    path = agent.movie("TAPE")
    movie.decodes(path)
    for stream in movie.streams(path).values():
        assert abs(stream.duration - (stop.sent - start.received)) < 0.3
    assert len(movie.runs(movie.counters(path))) == 1
    assert (sounds.loudness(movie.sound(path)) > 0.05) == (kind == "playing")


def test_a_name_that_is_not_there_is_silence(agent, alsa):
    agent.preferences(RecordingAudioInput=alsa.id("nowhere"))
    agent.start(env=alsa.env)
    mark = agent.log.mark()
    start, stop = agent.record("SILENCE", 3)
    assert len(agent.log.lines("alsa:device=nowhere", after=mark, level=Level.ERROR)) == 1
    path = agent.movie("SILENCE")
    movie.decodes(path)
    assert abs(movie.streams(path)["audio"].duration - (stop.sent - start.received)) < 0.3
    assert set(sounds.heard(path)) == {None}
    assert len(movie.runs(movie.counters(path))) == 1


def test_a_device_that_is_plugged_in_later(agent, alsa, desk):
    definition = alsa.definition("desk")
    alsa.remove("desk")
    agent.preferences(RecordingAudioInput=alsa.id("desk"))
    agent.start(env=desk)
    assert agent.start_recording("LATER").text == "cmdStatus=0"
    agent.let_record(2)
    assert agent.command("STATUS").fields["lastError"] == "9"
    alsa.pcm("desk", definition)
    agent.let_record(10)
    assert agent.command("STATUS").fields["lastError"] == "0"
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("LATER")
    heard = sounds.heard(agent.movie("LATER"))
    assert heard[:3] == [None] * 3 and heard[-2] == 440, heard
