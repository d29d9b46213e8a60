"""Submissions that wait when the daemon ends are taken up by the next start: none is lost, none begins twice."""
import signal

import pytest
from harness import movie
from harness.agent import DEFAULTS, REPOSITORY
from harness.log_reader import Level
from harness.power_cut import PowerCut
from harness.waiting import let_pass, wait_until

ENDS = pytest.mark.parametrize("number", [signal.SIGKILL, signal.SIGTERM])
WORKFLOW = {"RecordingMetadata_ADHOC_WORKFLOW_UUID": "W-1", "RecordingMetadata_AGENT_USERNAME": "ada",
            "RecordingMetadata_AGENT_PASSWORD": "a secret"}


def record_behind(agent, first, *others, **parameters):
    """Records all of them, with the tool hanging on the first."""
    agent.set_tool({"when": first, "hang": True})
    agent.record(first, **parameters)
    agent.wait_tool_call(first)
    for uuid in others:
        agent.record(uuid, **parameters)


def restart(agent, number, *rules):
    """Ends the daemon, lets the tool follow other rules, starts the daemon. @return a mark in the log between them"""
    agent.stop(number)
    agent.set_tool(*rules)
    mark = agent.log.mark()
    agent.start()
    return mark


def settle(agent, uuid):
    """Submits one more recording. One job at a time, oldest first: nothing is waiting behind it."""
    agent.record(uuid)
    agent.wait_tool_call(uuid, event="end", timeout=15)


def complaints(agent, uuid, mark):
    """How many warnings and errors since `mark` name the recording."""
    lines = agent.log.lines(rf"(?<![\w-]){uuid}(?![\w-])", after=mark)
    return sum(Level.CRITICAL <= line.level <= Level.WARNING for line in lines)


def calls_so_far(agent):
    """The recordings whose tool has begun, and those whose tool has ended."""
    return agent.submitted(), agent.submitted("end")


def assert_submitted_once(agent, uuid, mark, calls_before):
    """Its tool is started by the daemon that ended, as `calls_before` tell, or by the next one, not by both. One whose
    tool did not end is named. So is one whose tool was killed too early for its call to be seen."""
    begun, ended = (uuid in calls for calls in calls_before)
    wait_until(lambda: uuid in agent.submitted() or complaints(agent, uuid, mark), 15, f"the submission of {uuid}")
    settle(agent, f"BEHIND-{uuid}")
    calls, named = agent.submitted().count(uuid), complaints(agent, uuid, mark) > 0
    if not begun and calls == 0:
        assert agent.log.lines(rf"{uuid}.* was being submitted: it is not submitted again$", after=mark)
    elif not begun:
        assert (calls, named) == (1, False)
    else:
        assert calls == 1 and (named or ended)
    assert agent.document(uuid)["RecordingMetadata_RECORDING_UUID"] == uuid
    movie.decodes(agent.movie(uuid))


@ENDS
def test_jobs_that_wait_are_taken_up(running, number):
    record_behind(running, "FIRST", "SECOND", "THIRD")
    running.start_recording("NOBODY-STOPS-IT")
    running.let_record(1)
    mark = restart(running, number)
    running.wait_tool_call("THIRD", event="end", timeout=15)
    running.log.wait("^Recovered unfinished recording .*/NOBODY-STOPS-IT.mov", after=mark)
    settle(running, "LAST")
    assert running.submitted() == ["FIRST", "SECOND", "THIRD", "LAST"]
    assert complaints(running, "FIRST", mark) == 1, "the one in hand is named, once"
    assert complaints(running, "SECOND", mark) == complaints(running, "THIRD", mark) == 0
    uuids = ("FIRST", "SECOND", "THIRD", "NOBODY-STOPS-IT", "LAST")
    assert running.repository() == sorted(f"{uuid}.{kind}" for uuid in uuids for kind in ("mov", "xml"))
    for uuid in uuids:
        movie.decodes(running.movie(uuid))


def test_restart_after_restart(running):
    record_behind(running, "FIRST", "SECOND", "THIRD")
    mark = restart(running, signal.SIGKILL, {"when": "SECOND", "hang": True})
    running.wait_tool_call("SECOND", timeout=15)
    assert [complaints(running, uuid, mark) for uuid in ("FIRST", "SECOND", "THIRD")] == [1, 0, 0]
    mark = restart(running, signal.SIGKILL)
    running.wait_tool_call("THIRD", event="end", timeout=15)
    assert [complaints(running, uuid, mark) for uuid in ("FIRST", "SECOND", "THIRD")] == [0, 1, 0]
    running.log.wait("^Post-process mechanism completed with success$", after=mark)
    mark = restart(running, signal.SIGKILL)
    settle(running, "LAST")
    assert running.submitted() == ["FIRST", "SECOND", "THIRD", "LAST"]
    assert [complaints(running, uuid, mark) for uuid in ("FIRST", "SECOND", "THIRD")] == [0, 0, 0]


def test_starts_that_are_cut_short(running):
    """The next start ends while it is taking the jobs up."""
    record_behind(running, "FIRST", "SECOND", "THIRD")
    running.kill9()
    running.set_tool()
    mark = running.log.mark()
    for milliseconds in (30, 100, 300):
        begun = running.log.mark()
        running.start(wait=False)
        running.log.wait(r"^lmxagentd .* starting\.\.\.$", after=begun)
        let_pass(milliseconds / 1000, "the moment of the kill")
        running.kill9()
    before = calls_so_far(running)
    running.start()
    for uuid in ("SECOND", "THIRD"):
        assert_submitted_once(running, uuid, mark, before)
    assert running.submitted().count("FIRST") == 1
    assert complaints(running, "FIRST", mark) >= 1, "once, unless a kill came between the line and the note of it"


@ENDS
@pytest.mark.parametrize("milliseconds", [0, 5, 50, 300])
def test_an_end_right_behind_the_answer_to_stop(running, number, milliseconds):
    running.start_recording("TALK")
    running.let_record(1)
    assert running.command("STOP").text == "cmdStatus=0"
    if milliseconds:
        let_pass(milliseconds / 1000, "the moment of the end")
    running.stop(number)
    before, mark = calls_so_far(running), running.log.mark()
    running.start()
    assert_submitted_once(running, "TALK", mark, before)


def test_the_tool_is_told_the_same_after_a_restart(running):
    def told(file, user):
        return ["--server", DEFAULTS["LumexURL"], "--submit", "--file", file, "--workflow_uuid", "W-1", "--user", user,
                "-p", "a secret", "--delete"]

    first, second, chosen = f"{REPOSITORY}/FIRST.mov", f"{REPOSITORY}/SECOND.mov", "/var/lmx/a lecture.mov"
    bobs = {**WORKFLOW, "RecordingMetadata_AGENT_USERNAME": "bob"}
    running.set_tool({"when": first, "hang": True})
    running.record("FIRST", **WORKFLOW)
    running.wait_tool_call(first)
    running.record("SECOND", **WORKFLOW)
    stop_at(running, chosen, "THIRD", RecordingMetadata_ADHOC_FILE_PATH=chosen, **bobs)
    running.record("NOT-THIS", RecordingMetadata_ADHOC_SUBMIT_DISABLED="1", **bobs)
    mark = restart(running, signal.SIGKILL)
    running.wait_tool_call(chosen, event="end", timeout=15)
    settle(running, "LAST")
    assert [call["arguments"] for call in running.tool_calls()][:-1] == [
        told(first, "ada"), told(second, "ada"), told(chosen, "bob")]
    assert complaints(running, "FIRST", mark) == 1
    assert movie.streams(running.movie("NOT-THIS"))["video"].duration > 0.5
    telling = [line.text for line in running.log.lines("a secret")]
    assert not [text for text in telling if not text.startswith("/usr/bin/lumex ")], telling


def stop_at(agent, path, uuid, **parameters):
    """Makes a recording whose movie is `path`."""
    assert agent.start_recording(uuid, **parameters).text == "cmdStatus=0"
    agent.let_record(1)
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.log.wait(f'^"{path}" recording stopped')


@pytest.mark.parametrize("names, syncs", [("together", 0), ("together", 1), ("together", 3), ("together", 5),
                                          ("apart", 0), ("apart", 4)])
def test_a_power_cut_behind_the_answer_to_stop(agent, names, syncs):
    power = PowerCut(agent, names)
    power.start()
    agent.start_recording("TALK", RecordingMetadata_TITLE="A talk")
    agent.let_record(2)
    power.arm(syncs)
    assert agent.command("STOP").text == "cmdStatus=0"
    assert agent.wait_exit() == 128 + signal.SIGKILL
    power.restore()
    before, mark = calls_so_far(agent), agent.log.mark()
    agent.start()
    assert_submitted_once(agent, "TALK", mark, before)
    assert agent.document("TALK")["RecordingMetadata_TITLE"] == "A talk"
    assert movie.streams(agent.movie("TALK"))["video"].duration > 0.5


def test_a_power_cut_while_the_tool_runs(agent):
    power = PowerCut(agent)
    power.start()
    record_behind(agent, "FIRST", "SECOND")
    agent.kill9()
    agent.set_tool()
    power.restore()
    mark = agent.log.mark()
    agent.start()
    agent.wait_tool_call("SECOND", event="end", timeout=15)
    settle(agent, "LAST")
    assert agent.submitted() == ["FIRST", "SECOND", "LAST"]
    assert complaints(agent, "FIRST", mark) == 1
    for uuid in ("FIRST", "SECOND"):
        movie.decodes(agent.movie(uuid))
