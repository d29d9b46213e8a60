"""The submission tool: failing, hanging, missing, deleting."""
import time

from harness.agent import DEFAULTS
from harness.waiting import wait_until


def record(agent, uuid, seconds=1.0, **parameters):
    assert agent.start_recording(uuid, **parameters).text == "cmdStatus=0"
    time.sleep(seconds)
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_recorded(uuid)


def test_a_failing_tool(running):
    running.set_tool({"when": "--submit", "exit": 3})
    record(running, "A")
    running.log.wait(r"^Error: unable to submit job, /usr/bin/lumex exit code: 3$", level=2)
    running.log.wait(f'^An error occurred completing recording "{DEFAULTS["LumexURL"]}"$', level=3)
    running.log.wait("^An internal error occurred during agent post-processing$", level=2)
    assert running.repository() == ["A.mov", "A.xml"]
    assert not running.log.lines("^Post-process mechanism completed with success$")
    running.set_tool()
    record(running, "B")
    running.wait_tool_call("B")
    assert [call["arguments"][4] for call in running.tool_calls()] == ["A", "B"], "nothing is tried again"


def test_a_hanging_tool_holds_up_only_the_queue(running):
    running.set_tool({"when": "A", "hang": True})
    record(running, "A")
    running.wait_tool_call("A")
    record(running, "B", 2.0)
    reply = running.command("STATUS")
    assert reply.fields["cmdStatus"] == "0" and reply.received - reply.sent < 1
    time.sleep(6)
    assert [call["arguments"][4] for call in running.tool_calls()] == ["A"]
    running.release_tool()
    running.wait_tool_call("B", event="end")
    assert [call["arguments"][4] for call in running.tool_calls("end")] == ["A", "B"]


def test_a_hanging_tool_does_not_hold_up_the_end(running):
    running.set_tool({"when": "A", "hang": True})
    record(running, "A")
    running.wait_tool_call("A")
    assert running.stop() == 0
    assert running.repository() == ["A.mov", "A.xml"]


def test_a_missing_tool(running):
    running.set_tool(present=False)
    record(running, "A")
    running.log.wait("^Error: unable to submit job", level=2)
    running.log.wait("^An internal error occurred during agent post-processing$", level=2)
    assert running.repository() == ["A.mov", "A.xml"]
    running.set_tool()
    record(running, "B")
    running.wait_tool_call("B")


def test_the_tool_deletes_what_it_has(running):
    running.set_tool({"when": "--submit", "delete": "/var/lmx/agent/recordings"})
    record(running, "A")
    running.log.wait("^Post-process mechanism completed with success$")
    assert running.tool_calls("end")[0]["exit"] == 0
    assert running.repository() == []


def test_submission_can_be_switched_off_for_one_recording(running):
    record(running, "A", RecordingMetadata_ADHOC_SUBMIT_DISABLED="1")
    record(running, "B", RecordingMetadata_ADHOC_SUBMIT_DISABLED="0")
    running.wait_tool_call("B")
    assert running.repository() == ["A.mov", "B.mov", "B.xml"]


def test_submission_can_be_switched_off_for_the_daemon(agent):
    agent.start(arguments=["-s"])
    record(agent, "A")
    time.sleep(6)
    assert agent.repository() == ["A.mov"] and agent.tool_calls() == []


def test_a_workflow_needs_user_and_password(running):
    record(running, "A", RecordingMetadata_ADHOC_WORKFLOW_UUID="W-1")
    running.log.wait("^Error: unable to submit job$", level=2)
    record(running, "B", RecordingMetadata_ADHOC_WORKFLOW_UUID="W-1", RecordingMetadata_AGENT_USERNAME="ada",
           RecordingMetadata_AGENT_PASSWORD="secret")
    wait_until(lambda: running.tool_calls(), 20, "the submission")
    assert running.tool_calls()[0]["arguments"] == [
        "--server", DEFAULTS["LumexURL"], "--submit", "--file", "/var/lmx/agent/recordings/B.mov",
        "--workflow_uuid", "W-1", "--user", "ada", "-p", "secret", "--delete"]


def test_a_date_among_the_parameters_cuts_the_document_short(running):
    record(running, "A", RecordingMetadata_START_DATE="5")
    running.log.wait("^Internal error occurred creating recording properties$", level=2)
    running.wait_tool_call("A")
    document = running.document("A")
    assert document["RecordingMetadata_START_DATE"] == "5"
    assert "RecordingMetadata_END_DATE" not in document and "RecordingMetadata_TYPE" not in document


def test_a_duration_among_the_parameters_is_kept(running):
    record(running, "A", RecordingMetadata_DURATION="99")
    running.wait_tool_call("A")
    assert running.document("A")["RecordingMetadata_DURATION"] == "99"


def test_recordings_of_an_input_file(agent):
    agent.preferences(RecordingType="File", RecordingPath="/var/lmx/agent/input.mov", RecordingVideoInput=None,
                      RecordingAudioInput=None, RecordingVideoMaximumFrameRate=None)
    agent.path("/var/lmx/agent/input.mov").write_bytes(b"a movie of its own")
    agent.start()
    assert agent.start_recording("FILE").text == "cmdStatus=0"
    agent.log.wait('^"/var/lmx/agent/input.mov" recording started$', level=5)
    time.sleep(1)
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.log.wait(r'^"/var/lmx/agent/input.mov" recording stopped \(duration: \d+s\)$', level=5)
    call = agent.wait_tool_call("FILE")
    assert call["arguments"] == ["--server", DEFAULTS["LumexURL"], "--submit", "--recording", "FILE", "--delete"]
    assert agent.repository() == ["FILE.mov", "FILE.xml"]
    assert agent.movie("FILE").read_bytes() == b"a movie of its own"
    assert agent.document("FILE")["RecordingMetadata_TYPE"] == "File"
    assert agent.path("/var/lmx/agent/input.mov").exists()
