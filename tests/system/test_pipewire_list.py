"""The list of PipeWire's devices while they come and go, and of a PipeWire that hangs."""
import time

import pytest
from harness.log_reader import Level
from harness.pipewire_hall import PipeWireHall

SILENT = r"^PipeWire does not answer: its devices are left out$"
PATIENCE = 2.0  # seconds that a server may take
ALLOWANCE = 2.0  # for a busy machine


@pytest.fixture
def hall(agent):
    with PipeWireHall(agent) as one:
        yield one


def listing(agent, hall):
    """@return what is listed, and how long it took"""
    begin = time.monotonic()
    result = agent.run("-i", "zq-device-list", env=hall.env)
    assert result.returncode == 0 and result.stderr == "", result
    return result.stdout, time.monotonic() - begin


def test_devices_that_come_and_go_do_no_harm(agent, hall):
    """Nodes that have gone before they could be asked what they are, and the others are listed all the same."""
    with hall.camera("podium") as camera, hall.fleeting(8) as one, hall.fleeting(3) as other:
        seen = 0
        for _ in range(25):
            listed, _ = listing(agent, hall)
            assert camera.id in listed, listed
            seen += "pipewire:fleeting-" in listed
        assert one.alive() and other.alive() and seen > 5, (seen, one.errors(), other.errors())


def test_the_daemon_survives_devices_that_come_and_go(agent, hall):
    """It looks for camera and microphone at each START, and now and then for a microphone that is away."""
    with hall.camera("podium") as camera:
        agent.preferences(RecordingVideoInput=camera.id, RecordingAudioInput="pipewire:nobody")
        agent.start(env=hall.env)
        with hall.fleeting(8), hall.fleeting(3):
            for number in range(8):
                assert agent.start_recording(f"R{number}").text == "cmdStatus=0"
                agent.let_record(0.5)
                assert agent.command("STOP").text == "cmdStatus=0"
        assert agent.alive()


def test_a_server_that_hangs_is_not_waited_for(agent, hall):
    with hall.camera("podium") as camera:
        agent.start(env=hall.env)
        assert camera.id in listing(agent, hall)[0]
        hall.stall()
        listed, took = listing(agent, hall)
        assert camera.id not in listed and PATIENCE - 0.5 < took < PATIENCE + ALLOWANCE, (took, listed)
        mark = agent.log.mark()
        begin = time.monotonic()
        assert agent.start_recording("SYNTHETIC").text == "cmdStatus=0"  # which needs no list
        assert time.monotonic() - begin < PATIENCE
        assert agent.command("STOP").text == "cmdStatus=0"
        assert not agent.log.lines(SILENT, after=mark)
        hall.go_on()
        assert camera.id in listing(agent, hall)[0]


def test_a_server_that_hangs_is_told_of_once(agent, hall):
    agent.start(env=hall.env)
    agent.preferences(RecordingVideoInput="pipewire:nobody")
    for stalls in (1, 2):
        hall.stall()
        for _ in range(2):
            assert agent.start_recording("REFUSED", timeout=30).text == "cmdStatus=3"
        assert len(agent.log.lines(SILENT, level=Level.WARNING)) == stalls
        hall.go_on()
        assert agent.start_recording("REFUSED", timeout=30).text == "cmdStatus=3"
        assert len(agent.log.lines(SILENT)) == stalls
