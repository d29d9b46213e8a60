"""A microphone as a card is one: open once at a time, with a driver that may be slow, and with a clock of its own."""
import re

import numpy
import pytest
from harness import movie, sounds
from harness.alsa_hall import BURST, HUM, AlsaHall
from harness.log_reader import Level
from harness.waiting import let_pass

PIECE = 0.05  # seconds
RATE = 48000  # for exact times


@pytest.fixture
def alsa(agent):
    return AlsaHall(agent)


def loud(path):
    """Whether the hum is heard, for each piece of the sound."""
    sound = movie.sound(path, channel=1)
    size = int(PIECE * sounds.RATE)
    return [sounds.loudness(sound[at: at + size]) > 0.1 for at in range(0, len(sound) - size + 1, size)]


def silence_before(path):
    """Seconds before the sound begins."""
    return (loud(path) + [True]).index(True) * PIECE


def troubles(agent, after=0):
    """The error lines about the microphone."""
    return [line.text for line in agent.log.lines("alsa:", after=after, level=Level.ERROR)]


def record_each(agent, uuids, names=("desk",), seconds=1):
    """One after the other, each START right behind the STOP before it, with the microphones in turn."""
    for number, uuid in enumerate(uuids):
        agent.preferences(RecordingAudioInput=AlsaHall.id(names[number % len(names)]))
        assert agent.start_recording(uuid).text == "cmdStatus=0"
        agent.let_record(seconds)
        assert agent.command("STOP").text == "cmdStatus=0"
    for uuid in uuids:
        agent.wait_tool_call(uuid)
        movie.decodes(agent.movie(uuid))


def numbered(count):
    return [f"R{number}" for number in range(count)]


@pytest.mark.parametrize("close_takes", [0, 1000])
def test_stop_then_start_at_once(agent, alsa, close_takes):
    alsa.device("desk", close_takes=close_takes)
    agent.start(env=alsa.env)
    record_each(agent, numbered(10))
    assert not troubles(agent)
    silences = [silence_before(agent.movie(uuid)) for uuid in numbered(10)]
    assert max(silences) <= 0.2, silences


@pytest.mark.parametrize("close_takes", [0, 1000])
def test_one_device_by_two_names_in_turn(agent, alsa, close_takes):
    alsa.device("desk", close_takes=close_takes)
    alsa.device("lectern", lock="desk", close_takes=close_takes)
    agent.start(env=alsa.env)
    record_each(agent, numbered(6), names=("desk", "lectern"))
    silences = [silence_before(agent.movie(uuid)) for uuid in numbered(6)]
    assert not troubles(agent), silences
    assert max(silences) <= 0.2, silences


def test_another_program_has_the_device(agent, alsa):
    """The recording is silent and says why; the sound comes once the device is free."""
    alsa.device("desk")
    agent.preferences(RecordingAudioInput=alsa.id("desk"))
    with alsa.other_program("desk") as other:
        agent.start(env=alsa.env)
        mark = agent.log.mark()
        assert agent.start_recording("SHARED").text == "cmdStatus=0"
        agent.let_record(4)
        assert agent.command("STATUS").fields["lastError"] == "9"
        (told,) = troubles(agent, after=mark)
        assert "alsa:device=desk" in told and "another application" in told
        other.kill()
    agent.log.wait("^The microphone is back after .*: alsa:device=desk", after=mark, level=Level.NOTICE)
    agent.let_record(10)
    assert agent.command("STATUS").fields["lastError"] == "0"
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("SHARED")
    heard = loud(agent.movie("SHARED"))
    silent = heard.index(True)
    assert silent * PIECE > 3.5 and all(heard[silent:-1]), heard
    assert len(movie.runs(movie.counters(agent.movie("SHARED")))) == 1


def test_a_machine_that_stands_still_loses_no_sound(agent, alsa):
    """For half a second: as long the device's buffer holds what nobody reads."""
    alsa.device("desk")
    agent.preferences(RecordingAudioInput=alsa.id("desk"))
    agent.start(env=alsa.env)
    assert agent.start_recording("STILL").text == "cmdStatus=0"
    for second in (3, 6):
        agent.let_record(second)
        agent.sandbox.freeze()
        let_pass(0.5, "the device goes on meanwhile")
        agent.sandbox.thaw()
    agent.let_record(9)
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("STILL")
    assert not agent.log.lines("silence put in")
    left, right = (movie.sound(agent.movie("STILL"), RATE, channel) for channel in (0, 1))
    strength = numpy.abs(sounds.demodulated(right, HUM, 0.02, RATE)[RATE // 5: -RATE // 5])
    assert strength.min() > 0.8 * numpy.median(strength), "no hole"
    distances = numpy.diff(sounds.burst_middles(left, BURST, RATE))
    assert len(distances) >= 7 and numpy.abs(distances - 1).max() < 0.005, distances


@pytest.fixture(params=["open", "close"])
def stuck(request, agent, alsa):
    """A running daemon with a microphone whose driver does not return from this, and the file that holds it."""
    file = alsa.place / "stuck"
    file.touch()
    alsa.device("desk", **{request.param + "_waits": file.name})
    agent.preferences(RecordingAudioInput=alsa.id("desk"))
    agent.start(env=alsa.env)
    return request.param, file


def test_a_driver_that_never_returns(agent, alsa, stuck):
    where, _ = stuck
    for uuid in ("A", "B"):
        mark = agent.log.mark()
        start, stop = agent.record(uuid, 8)
        agent.wait_tool_call(uuid)
        movie.decodes(agent.movie(uuid))
        for stream in movie.streams(agent.movie(uuid)).values():
            assert abs(stream.duration - (stop.sent - start.received)) < 0.5
        assert len(movie.runs(movie.counters(agent.movie(uuid)))) == 1
        silent = (where, uuid) != ("close", "A")
        assert any(loud(agent.movie(uuid))) != silent
        assert len(troubles(agent, after=mark)) == silent, troubles(agent)
    assert agent.stop(timeout=10) == 0


def test_a_driver_that_returns_late(agent, alsa, stuck):
    """The sound comes in the recording that runs."""
    where, file = stuck
    if where == "close":
        agent.record("BEFORE")
    mark = agent.log.mark()
    assert agent.start_recording("LATE").text == "cmdStatus=0"
    agent.let_record(8)
    assert len(troubles(agent, after=mark)) == 1, troubles(agent)
    file.unlink()
    agent.log.wait("^The microphone is back after", after=mark, timeout=10)
    agent.let_record(16)
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("LATE")
    heard = loud(agent.movie("LATE"))
    assert not any(heard[:int(7.5 / PIECE)]) and all(heard[-10:-1]), heard
    assert agent.stop(timeout=10) == 0


def picture_clock(path):
    """The movie's time of the camera's frame 0; the frames keep their distances."""
    zero = numpy.array(movie.frame_times(path)) - numpy.array(movie.counters(path)) / 30
    assert numpy.ptp(zero) < 1e-4
    return zero[0]


@pytest.fixture(params=[(-500, 8), (-200, 16), (-50, 8), (50, 16), (200, 8), (500, 16)], ids="{0[0]}ppm".format)
def long_recording(request, agent, alsa):
    """A movie of 42 s with a microphone whose clock is so much (parts in a million) off. @return that and the movie"""
    ppm, jitter = request.param
    alsa.device("desk", ppm=ppm, jitter=jitter)
    agent.preferences(RecordingAudioInput=alsa.id("desk"), RecordingVideoInput="test://video?size=320x180&fps=30")
    agent.start(env=alsa.env)
    agent.record("CLOCK", 42)
    return ppm, agent.movie("CLOCK")


@pytest.mark.slow
def test_a_clock_of_its_own(agent, alsa, long_recording):
    """What it hears at each whole second stays in its place beside the picture, and unbroken."""
    ppm, path = long_recording
    overruns = alsa.overruns("desk")
    assert overruns <= 6, "the machine is too busy, or the device is not read"
    left, right = (movie.sound(path, RATE, channel) for channel in (0, 1))
    places = numpy.array(sounds.burst_middles(left, BURST, RATE)) + movie.streams(path)["audio"].start - picture_clock(path)
    assert len(places) >= 41 - overruns
    off = places - places[len(places) // 2]
    off -= numpy.round(off)
    late = (off - numpy.median(off)) * 1000
    assert numpy.abs(late).max() < 25, "it begins with what a quarter of a second shows"
    assert overruns or numpy.abs(late[3:]).max() < 5, late.round(1).tolist()
    assert overruns or numpy.abs(late[20:]).max() < 2, late.round(1).tolist()
    leap, weakest = sounds.breaks(right[RATE: -RATE], HUM, RATE)
    assert overruns or leap < sounds.UNBROKEN, "what the device gave is whole"
    assert overruns or weakest > 0.5
    assert numpy.abs(sounds.demodulated(left, HUM, 0.02, RATE)[RATE // 5: -RATE // 5]).max() < 0.01, "left is left"
    told = agent.log.lines(r"sound made (slower|faster) by \d+ ppm", level=Level.NOTICE)
    (way, correction), = (re.search(r"(slower|faster) by (\d+) ppm", line.text).groups() for line in told)
    assert abs(int(correction) * (1 if way == "slower" else -1) - ppm) <= 20
