"""Lectures back to back: the STOP of one and the START of the next are due in the same second."""
import time

import pytest
from harness import movie
from harness.commands import start_parameters, timed_line
from harness.one_thread import main_thread_held
from harness.tunnel_tool import TunnelTool
from harness.waiting import let_pass

FPS = 30


@pytest.fixture(params=["local socket", "tunnel"])
def say(agent, request):
    """Sends a line to a running agent and returns the reply's text."""
    if request.param == "local socket":
        agent.start()
        yield lambda line: agent.command(line).text
        return
    with TunnelTool(agent.prepare()) as server:
        agent.start()
        server.accept()
        yield server.command


def title(uuid):
    return f"Lecture {uuid}"


def lecture(uuid):
    return {**start_parameters(uuid), "RecordingMetadata_TITLE": title(uuid)}


def schedule(say, uuids, begin, length, start_first=lambda boundary: False):
    """Gives each lecture `length` seconds, the first from `begin` on. At each boundary one STOP and one START are due,
    sent in the order that `start_first` asks for."""
    for boundary in range(len(uuids) + 1):
        second = begin + boundary * length
        commands = [timed_line("STOP", second)] if boundary else []
        if boundary < len(uuids):
            commands.append(timed_line("START", second, **lecture(uuids[boundary])))
        if start_first(boundary):
            commands.reverse()
        for command in commands:
            assert say(command) == "cmdStatus=0"


def until(moment):
    let_pass(max(0.0, moment - time.time()), "timed commands go by the wall clock")


def assert_submitted(agent, uuids):
    agent.wait_tool_call(uuids[-1], event="end")
    assert agent.submitted() == list(uuids)
    assert sorted(agent.repository()) == sorted(f"{uuid}.{kind}" for uuid in uuids for kind in ("mov", "xml"))
    for uuid in uuids:
        document = agent.document(uuid)
        assert (document["RecordingMetadata_RECORDING_UUID"], document["RecordingMetadata_TITLE"]) == (uuid,
                                                                                                      title(uuid))
        movie.decodes(agent.movie(uuid))


def assert_whole(agent, uuids, length):
    """Each movie is one stretch of frames without a gap, as long as its lecture but for the time a camera takes to
    open and a busy machine to act."""
    for uuid in uuids:
        (span,) = movie.runs(movie.counters(agent.movie(uuid)))
        assert abs((span[1] - span[0] + 1) / FPS - length) < 0.8, (uuid, span)


def test_stop_and_start_in_one_second(agent, say):
    """In whatever order they were sent: the STOP belongs to the lecture that runs."""
    uuids, length = ("A", "B", "C"), 2
    begin = int(time.time()) + 2
    schedule(say, uuids, begin, length, start_first=lambda boundary: boundary == 2)
    until(begin + length * len(uuids))
    assert_submitted(agent, uuids)
    assert_whole(agent, uuids, length)


@pytest.mark.slow
def test_twenty_lectures_in_a_row(agent):
    uuids = [f"L{number:02}" for number in range(20)]
    with TunnelTool(agent.prepare()) as server:
        agent.start()
        server.accept()
        begin = int(time.time()) + 3
        schedule(server.command, uuids, begin, 1, start_first=lambda boundary: boundary % 2)
        until(begin + len(uuids))
        assert_submitted(agent, uuids)
    assert_whole(agent, uuids, 1)


def test_a_machine_that_stood_still_over_all(agent, say):
    uuids, length = ("A", "B", "C", "D", "E"), 2
    begin = int(time.time()) + 2
    schedule(say, uuids, begin, length, start_first=lambda boundary: boundary % 2)
    agent.log.wait('A.mov" recording started$')
    agent.let_record(1)
    agent.sandbox.freeze()
    until(begin + length * len(uuids) + 0.2)
    agent.sandbox.thaw()
    assert_submitted(agent, uuids)
    pictures = set(movie.counters(agent.movie("A")))
    assert len(pictures) >= FPS and pictures.issuperset(range(min(pictures), min(pictures) + FPS))


def test_a_stop_that_waits_when_the_next_start_is_due(agent):
    with TunnelTool(agent.prepare()) as server:
        agent.start()
        server.accept()
        assert agent.start_recording("A", RecordingMetadata_TITLE=title("A")).text == "cmdStatus=0"
        for uuid, say in (("B", server.command), ("C", lambda line: agent.command(line).text)):
            agent.let_record(1)
            due = int(time.time()) + 2
            assert say(timed_line("START", due, **lecture(uuid))) == "cmdStatus=0"
            with main_thread_held(agent):
                for _ in range(3):  # each wakes the main thread, ahead of the STOP
                    assert say(timed_line("STATUS", due + 3600)) == "cmdStatus=0"
                assert say("STOP") == "cmdStatus=0"
                until(due + 0.2)
            agent.log.wait(f'{uuid}.mov" recording started$', timeout=5)
        agent.let_record(1)
        assert agent.command("STOP").text == "cmdStatus=0"
        assert_submitted(agent, ("A", "B", "C"))
