"""Microphones and cameras of PipeWire whose clocks are not the machine's: the sound stays where it belongs.

All that takes part in PipeWire's graph has real-time priority here, as in a session: without it the graph loses cycles
of 21 ms on a busy machine, for all its programs alike, and nothing could be said about the clocks.
"""
import os
import subprocess

import numpy
import pytest
from harness import movie, sounds
from harness.pipewire_hall import REAL_TIME, PipeWireHall
from harness.waiting import let_pass

RATE = 48000


@pytest.fixture
def hall(agent):
    """A running PipeWire whose sockets the agent finds."""
    with PipeWireHall(agent, real_time=True) as one:
        yield one


def record(agent, hall, uuid, camera, microphone, seconds):
    """Records both. @return the movie"""
    agent.preferences(RecordingVideoInput=camera.id, RecordingAudioInput=microphone.id)
    agent.start(env=hall.env, prefix=REAL_TIME)
    agent.record(uuid, seconds)
    return agent.movie(uuid)


def burst_times(path):
    """Where each burst is in the movie."""
    return numpy.array(sounds.bursts(movie.sound(path, RATE), RATE)) + movie.streams(path)["audio"].start


def picture_offsets(path):
    """The movie's time of each picture, less the time when it was taken."""
    return numpy.array(movie.frame_times(path)) - numpy.array(movie.counters(path)) / 1000


def misplaced(bursts, offset):
    """By how much each burst is later than the whole second at which it sounded."""
    seconds = bursts - offset
    return seconds - numpy.round(seconds)


@pytest.mark.limit(60)
@pytest.mark.parametrize("ppm", [-1000, 1000])
def test_the_clock_reaches_those_who_listen(agent, hall, ppm, tmp_path):
    """No test of the agent: the server passes the microphone's samples on as they come. Without this the tests below
    could not fail."""
    path = tmp_path / "heard.wav"
    with hall.clocked_microphone("lectern", ppm) as microphone:
        with subprocess.Popen([*hall.real_time, "pw-record", "--target", microphone.name, "--rate", str(RATE),
                               "--channels", "1", str(path)], env={**os.environ, **hall.host_env}) as recorder:
            let_pass(12, "pw-record listens")
            recorder.terminate()
    apart = numpy.diff(sounds.bursts(movie.sound(path, RATE), RATE)) * RATE
    assert abs(numpy.median(apart) - RATE * (1 + ppm * 1e-6)) < 2, apart


@pytest.mark.slow
@pytest.mark.parametrize("ppm, jitter, most", [(-50, 0, 0.0015), (-200, 3, 0.005), (200, 0, 0.005), (1000, 0, 0.010),
                                               (-1000, 0, 0.010)])
def test_sound_stays_with_the_picture(agent, hall, ppm, jitter, most):
    """Uncorrected, the last burst would be misplaced by 45 s times `ppm`. For a clock that no sound card has there is a
    little more room: its speed is known after some seconds only."""
    with hall.camera("podium", numbers="ms") as camera, hall.clocked_microphone("lectern", ppm, jitter) as microphone:
        path = record(agent, hall, "BOTH", camera, microphone, 45)
    late = misplaced(burst_times(path), numpy.median(picture_offsets(path)))
    assert len(late) > 40, late
    assert numpy.abs(late).max() < most, late


@pytest.mark.slow
@pytest.mark.parametrize("camera_ppm, ppm", [(300, -200), (-300, 200)])
def test_three_clocks(agent, hall, camera_ppm, ppm):
    """Camera and microphone go wrong in opposite directions. The movie shows the pictures at its own rate, so each is
    shown up to half a picture's time too early or too late."""
    with hall.camera("podium", numbers="ms", ppm=camera_ppm) as camera, \
            hall.clocked_microphone("lectern", ppm) as microphone:
        path = record(agent, hall, "BOTH", camera, microphone, 45)
    bursts, offsets = burst_times(path), picture_offsets(path)
    assert len(bursts) > 40, bursts
    late = misplaced(bursts, numpy.median(offsets))
    assert numpy.ptp(late) < 0.005, late
    assert numpy.ptp(offsets) < 1 / 30 + 0.005, offsets
    shown = numpy.interp(bursts, movie.frame_times(path), offsets)  # at each burst
    assert numpy.abs(misplaced(bursts, shown)).max() < 0.5 / 30 + 0.005


@pytest.mark.slow
@pytest.mark.parametrize("ppm", [-200, 200])
def test_a_tone_has_no_steps(agent, hall, ppm):
    """The pitch glides while the clock becomes known, but nothing is cut out or put in."""
    with hall.camera("podium") as camera, hall.clocked_microphone("lectern", ppm, hertz=440) as microphone:
        path = record(agent, hall, "TONE", camera, microphone, 15)
    leap, weakest = sounds.breaks(movie.sound(path, RATE)[RATE // 2:-RATE // 10], 440, RATE)
    assert leap < sounds.UNBROKEN
    assert weakest > 0.5
