"""A START that is refused because a recording runs changes nothing of what runs."""
import re
import time

import pytest
from harness import movie
from harness.agent import DEFAULTS, REPOSITORY
from harness.commands import start_line
from harness.log_reader import Level
from harness.waiting import let_pass, wait_until

FIRST = {"RecordingMetadata_TITLE": "one", "RecordingMetadata_ADHOC_WORKFLOW_UUID": "W-1",
         "RecordingMetadata_AGENT_USERNAME": "ada", "RecordingMetadata_AGENT_PASSWORD": "first secret"}
SECOND = {"RecordingMetadata_TITLE": "two", "RecordingMetadata_ADHOC_WORKFLOW_UUID": "W-2",
          "RecordingMetadata_AGENT_USERNAME": "bob", "RecordingMetadata_AGENT_PASSWORD": "second secret",
          "RecordingMetadata_AUDIO_ONLY": "true", "RecordingMetadata_ADHOC_FILE_PATH": "/var/lmx/two.mov"}


def refuse(agent, *arguments, **parameters):
    reply = agent.start_recording(*arguments, **parameters)
    assert reply.text == "cmdStatus=4"
    return reply


def test_all_that_it_carries_is_forgotten(running):
    start = running.start_recording("FIRST", **FIRST)
    assert start.text == "cmdStatus=0"
    running.let_record(1)
    before = running.command("STATUS").fields
    refuse(running, "SECOND", minutes="0.01", unattended="1", **SECOND)
    after = running.command("STATUS").fields
    for field in ("recordStatus", "start", "hard_stop"):
        assert after[field] == before[field], field
    limit = running.log.lines("^unattended stop time set to: ")[-1].text.split(": ", 1)[1]
    assert abs(time.mktime(time.strptime(limit)) - time.time() - 3600) < 30, limit
    running.let_record(2)
    stop = running.command("STOP")
    call = running.wait_tool_call(f"{REPOSITORY}/FIRST.mov", event="end")
    assert call["arguments"] == ["--server", DEFAULTS["LumexURL"], "--submit", "--file", f"{REPOSITORY}/FIRST.mov",
                                 "--workflow_uuid", "W-1", "--user", "ada", "-p", "first secret", "--delete"]
    assert len(running.tool_calls()) == 1
    assert set(movie.streams(running.movie("FIRST"))) == {"audio", "video"}
    (span,) = movie.runs(movie.counters(running.movie("FIRST")))
    movie.camera_clock([(span[0], "start", start.sent, start.received + 0.3),
                        (span[1], "stop", stop.sent, stop.received)], 30)
    document = running.document("FIRST")
    assert {key: document.get(key) for key in FIRST} == FIRST
    assert document["RecordingMetadata_RECORDING_UUID"] == "FIRST"
    assert document["RecordingMetadata_TYPE"] == "Audio+Video"
    assert running.repository() == ["FIRST.mov", "FIRST.xml"] and not running.path("/var/lmx/two.mov").exists()
    assert not running.log.lines("^Recovered")
    running.record("NEXT")
    assert set(movie.streams(running.movie("NEXT"))) == {"audio", "video"}


def test_the_same_start_again(running):
    """As a server sends it that has not heard the answer."""
    assert running.start_recording("A").text == "cmdStatus=0"
    for seconds in (1, 2):
        running.let_record(seconds)
        refuse(running, "A")
    running.command("STOP")
    running.wait_tool_call("A", event="end")
    assert len(movie.runs(movie.counters(running.movie("A")))) == 1
    assert movie.streams(running.movie("A"))["video"].duration > 1.7
    assert running.repository() == ["A.mov", "A.xml"] and running.submitted() == ["A"]


def test_in_a_pause(running):
    assert running.start_recording("A").text == "cmdStatus=0"
    running.let_record(1)
    running.command("PAUSE")
    refuse(running, "B")
    assert running.command("STATUS").fields["recordStatus"] == "1"
    let_pass(0.3, "the pause must be longer than a frame")
    running.command("RESUME")
    running.let_record(2)
    running.command("STOP")
    running.wait_tool_call("A", event="end")
    assert len(movie.runs(movie.counters(running.movie("A")))) == 2
    assert running.repository() == ["A.mov", "A.xml"] and running.submitted() == ["A"]


def test_before_a_cancel(running):
    assert running.start_recording("A").text == "cmdStatus=0"
    running.let_record(1)
    refuse(running, "B")
    assert running.command("CANCEL").text == "cmdStatus=0"
    running.wait_idle()
    wait_until(lambda: running.repository() == [], 10, f"an empty repository, not {running.repository()}")
    running.record("C")
    running.wait_tool_call("C", event="end")
    assert running.submitted() == ["C"] and running.repository() == ["C.mov", "C.xml"]


def test_over_a_kill(running):
    """What is recovered is the recording that ran."""
    assert running.start_recording("A", RecordingMetadata_TITLE="one").text == "cmdStatus=0"
    running.let_record(1)
    refuse(running, "B", RecordingMetadata_TITLE="two")
    running.kill9()
    running.start()
    running.log.wait(re.escape(f"{REPOSITORY}/A.mov"), level=Level.NOTICE, count=2)
    wait_until(lambda: running.repository() == ["A.mov", "A.xml"], 10, f"{running.repository()}")
    assert running.document("A")["RecordingMetadata_TITLE"] == "one"


@pytest.mark.parametrize("wrong", ["x" * 300, "a/b"], ids=["long", "slash"])
def test_one_that_is_wrong_in_itself(running, wrong):
    assert running.start_recording("A", RecordingMetadata_TITLE="one").text == "cmdStatus=0"
    running.let_record(1)
    for line in (start_line(wrong, minutes="0.01", **SECOND), "START RecordingMetadata_RECORDING_UUID=B"):
        assert running.command(line).text == "cmdStatus=31"
    running.command("STOP")
    running.wait_tool_call("A", event="end")
    assert running.document("A")["RecordingMetadata_TITLE"] == "one"
    assert running.repository() == ["A.mov", "A.xml"] and running.submitted() == ["A"]
