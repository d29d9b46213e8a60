"""Recordings that end without a STOP: the daemon is killed or told to end in the middle of one."""
import re
import signal
import time

import pytest
from harness import movie
from harness.agent import REPOSITORY
from harness.log_reader import Level
from harness.waiting import let_pass, wait_until

FPS = 30
RECOVERY = "a start looks for unfinished recordings in the background, and is silent when there are none"


def recovered(agent, uuid, mark):
    """Waits for the recovered recording. @return its document"""
    wait_until(lambda: agent.path(f"{REPOSITORY}/{uuid}.xml").exists(), 20, f"the document of {uuid}")
    agent.log.wait(re.escape(f"{REPOSITORY}/{uuid}.mov"), after=mark)
    captures = agent.path(f"{REPOSITORY}/.lmxagentd")
    wait_until(lambda: not captures.exists() or not list(captures.iterdir()), 20, "the end of the capture's folder")
    assert len(agent.log.lines(re.escape(f"{uuid}.mov"), after=mark)) == 1
    return agent.document(uuid)


def test_a_killed_daemon_loses_at_most_a_second(running):
    start = running.start_recording("CRASH", RecordingMetadata_TITLE="Half a talk")
    running.let_record(5)
    killed = time.time()
    running.kill9()
    left = running.repository()
    assert "CRASH.mov" not in left, "what bears its final name must be whole"
    mark = running.log.mark()
    running.start()
    document = recovered(running, "CRASH", mark)

    path = running.movie("CRASH")
    streams = movie.streams(path)
    assert set(streams) == {"video", "audio"}
    movie.decodes(path)
    movie.discover(path)
    (span,) = movie.runs(movie.counters(path))
    assert (span[1] - span[0] + 1) / FPS > killed - start.received - 1.0
    assert abs(streams["audio"].duration - streams["video"].duration) < 0.2
    assert document["RecordingMetadata_RECORDING_UUID"] == "CRASH"
    assert document["RecordingMetadata_TITLE"] == "Half a talk"
    assert document["RecordingMetadata_TYPE"] == "Audio+Video"
    assert abs(int(document["RecordingMetadata_START_DATE"]) - start.received) <= 2
    assert abs(int(document["RecordingMetadata_DURATION"]) - (killed - start.received)) <= 2
    assert running.repository() == ["CRASH.mov", "CRASH.xml"], "nothing else stays"
    running.record("NEXT")
    running.wait_tool_call("NEXT")
    assert running.submitted() == ["NEXT"]


@pytest.mark.parametrize("damage, uuid", [(lambda text: bytes(len(text)), None), (lambda text: b"", None),
                                          (lambda text: re.sub(rb"run .*\n", b"", text), "CRASH")],
                         ids=["zeros", "empty", "a line gone"])
def test_a_damaged_journal_loses_nothing(running, damage, uuid):
    running.start_recording("CRASH", RecordingMetadata_TITLE="Half a talk")
    running.let_record(3)
    running.kill9()
    (journal,) = running.path(f"{REPOSITORY}/.lmxagentd").glob("*/journal")
    journal.write_bytes(damage(journal.read_bytes()))
    mark = running.log.mark()
    running.start()
    running.log.wait("^The journal of .* is damaged: all that was captured is kept as one recording$",
                     level=Level.ERROR, after=mark)
    document = recovered(running, uuid or journal.parent.name, mark)
    assert document.get("RecordingMetadata_TITLE") == ("Half a talk" if uuid else None)
    path = running.movie(uuid or journal.parent.name)
    movie.decodes(path)
    assert movie.streams(path)["video"].duration > 1.5


def test_a_recovered_recording_is_left_alone_by_the_next_start(running):
    running.start_recording("CRASH")
    running.let_record(1)
    running.kill9()
    mark = running.log.mark()
    running.start()
    recovered(running, "CRASH", mark)
    before = running.movie("CRASH").stat()
    running.kill9()
    mark = running.log.mark()
    running.start()
    running.log.wait("Post-Process Scheduler starts", after=mark)
    let_pass(1, RECOVERY)
    after = running.movie("CRASH").stat()
    assert (before.st_ino, before.st_mtime_ns) == (after.st_ino, after.st_mtime_ns)
    assert not running.log.lines("CRASH", after=mark)


def test_a_kill_keeps_the_pauses_out(running):
    running.start_recording("CRASH")
    running.let_record(1)
    paused = running.command("PAUSE")
    let_pass(1, "a pause of a second")
    resumed = running.command("RESUME")
    running.let_record(3)
    running.kill9()
    mark = running.log.mark()
    running.start()
    recovered(running, "CRASH", mark)
    spans = movie.runs(movie.counters(running.movie("CRASH")))
    assert len(spans) == 2
    missing = (spans[1][0] - spans[0][1]) / FPS
    assert resumed.sent - paused.received - 0.1 < missing < resumed.received - paused.sent + 0.1


def test_a_cancelled_recording_does_not_come_back(running):
    running.start_recording("GONE")
    running.let_record(1)
    running.command("CANCEL")
    running.log.wait("Process cancelCapture", level=Level.DEBUG)
    assert running.command("STATUS").fields["recordStatus"] == "0"
    running.kill9()
    running.start()
    let_pass(1, RECOVERY)
    assert running.repository() == []


@pytest.mark.parametrize("number", [signal.SIGTERM, signal.SIGINT])
def test_an_orderly_end_in_the_middle_of_a_recording(running, number):
    running.start_recording("TERM")
    running.let_record(2)
    ended = time.monotonic()
    assert running.stop(number) == 0
    assert time.monotonic() - ended < 10
    mark = running.log.mark()
    running.start()
    recovered(running, "TERM", mark)
    (span,) = movie.runs(movie.counters(running.movie("TERM")))
    assert span[1] - span[0] + 1 >= 2 * FPS
    assert running.tool_calls() == []


def test_two_kills_in_one_recording_each(running):
    for uuid in ("A", "B"):
        assert running.start_recording(uuid).text == "cmdStatus=0"
        running.let_record(1)
        running.kill9()
        mark = running.log.mark()
        running.start()
        recovered(running, uuid, mark)
    assert running.repository() == ["A.mov", "A.xml", "B.mov", "B.xml"]
    for uuid in ("A", "B"):
        movie.decodes(running.movie(uuid))
