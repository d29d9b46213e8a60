"""The submission tool: failing, hanging, missing, deleting."""
from harness.agent import DEFAULTS
from harness.log_reader import Level
from harness.waiting import let_pass, wait_until

SCHEDULER = "the scheduler looks for jobs every five seconds"


def test_a_failing_tool(running):
    running.set_tool({"when": "A", "exit": 3})
    running.record("A")
    running.record("B")
    running.log.wait(r"^Error: unable to submit job, /usr/bin/lumex exit code: 3$", level=Level.CRITICAL)
    running.log.wait(f'^An error occurred completing recording "{DEFAULTS["LumexURL"]}"$', level=Level.ERROR)
    running.log.wait("^An internal error occurred during agent post-processing$", level=Level.CRITICAL)
    running.log.wait("^Post-process mechanism completed with success$")
    assert running.submitted("end") == ["A", "B"], "nothing is tried again"
    assert len(running.log.lines("^Post-process mechanism completed with success$")) == 1
    assert running.repository() == ["A.mov", "A.xml", "B.mov", "B.xml"]


def test_a_hanging_tool_holds_up_only_the_queue(running):
    running.set_tool({"when": "A", "hang": True})
    running.record("A")
    running.wait_tool_call("A")
    running.record("B")
    reply = running.command("STATUS")
    assert reply.fields["cmdStatus"] == "0" and reply.received - reply.sent < 5
    let_pass(6, SCHEDULER)
    assert running.submitted() == ["A"]
    running.release_tool()
    running.wait_tool_call("B", event="end")
    assert running.submitted("end") == ["A", "B"]


def test_a_hanging_tool_does_not_hold_up_the_end(running):
    running.set_tool({"when": "A", "hang": True})
    running.record("A")
    running.wait_tool_call("A")
    assert running.stop() == 0
    assert running.repository() == ["A.mov", "A.xml"]


def test_a_missing_tool(running):
    running.set_tool(present=False)
    running.record("A")
    running.log.wait("^Error: unable to submit job", level=Level.CRITICAL)
    running.log.wait("^An internal error occurred during agent post-processing$", level=Level.CRITICAL)
    assert running.repository() == ["A.mov", "A.xml"]
    running.set_tool()
    running.record("B")
    running.wait_tool_call("B")


def test_the_tool_deletes_what_it_has(running):
    running.set_tool({"when": "--submit", "delete": "/var/lmx/agent/recordings"})
    running.record("A")
    running.log.wait("^Post-process mechanism completed with success$")
    assert running.tool_calls("end")[0]["exit"] == 0
    assert running.repository() == []


def test_submission_can_be_switched_off_for_one_recording(running):
    running.record("A", RecordingMetadata_ADHOC_SUBMIT_DISABLED="1")
    running.record("B", RecordingMetadata_ADHOC_SUBMIT_DISABLED="0")
    running.wait_tool_call("B")
    assert running.repository() == ["A.mov", "B.mov", "B.xml"]


def test_submission_can_be_switched_off_for_the_daemon(agent):
    agent.start(arguments=["-s"])
    agent.record("A")
    let_pass(6, SCHEDULER)
    assert agent.repository() == ["A.mov"] and agent.tool_calls() == []


def test_a_workflow_needs_user_and_password(running):
    running.record("A", RecordingMetadata_ADHOC_WORKFLOW_UUID="W-1")
    running.log.wait("^Error: unable to submit job$", level=Level.CRITICAL)
    running.record("B", RecordingMetadata_ADHOC_WORKFLOW_UUID="W-1", RecordingMetadata_AGENT_USERNAME="ada",
                   RecordingMetadata_AGENT_PASSWORD="secret")
    wait_until(lambda: running.tool_calls(), 20, "the submission")
    assert running.tool_calls()[0]["arguments"] == [
        "--server", DEFAULTS["LumexURL"], "--submit", "--file", "/var/lmx/agent/recordings/B.mov",
        "--workflow_uuid", "W-1", "--user", "ada", "-p", "secret", "--delete"]


def test_a_date_among_the_parameters_cuts_the_document_short(running):
    running.record("A", RecordingMetadata_START_DATE="5")
    running.log.wait("^Internal error occurred creating recording properties$", level=Level.CRITICAL)
    running.wait_tool_call("A")
    document = running.document("A")
    assert document["RecordingMetadata_START_DATE"] == "5"
    assert "RecordingMetadata_END_DATE" not in document and "RecordingMetadata_TYPE" not in document


def test_a_duration_among_the_parameters_is_kept(running):
    running.record("A", RecordingMetadata_DURATION="99")
    running.wait_tool_call("A")
    assert running.document("A")["RecordingMetadata_DURATION"] == "99"


def test_recordings_of_an_input_file(agent):
    agent.preferences(RecordingType="File", RecordingPath="/var/lmx/agent/input.mov", RecordingVideoInput=None,
                      RecordingAudioInput=None, RecordingVideoMaximumFrameRate=None)
    agent.path("/var/lmx/agent/input.mov").write_bytes(b"a movie of its own")
    agent.start()
    assert agent.start_recording("FILE").text == "cmdStatus=0"
    agent.log.wait('^"/var/lmx/agent/input.mov" recording started$', level=Level.NOTICE)
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.log.wait(r'^"/var/lmx/agent/input.mov" recording stopped \(duration: \d+s\)$', level=Level.NOTICE)
    call = agent.wait_tool_call("FILE")
    assert call["arguments"] == ["--server", DEFAULTS["LumexURL"], "--submit", "--recording", "FILE", "--delete"]
    assert agent.repository() == ["FILE.mov", "FILE.xml"]
    assert agent.movie("FILE").read_bytes() == b"a movie of its own"
    assert agent.document("FILE")["RecordingMetadata_TYPE"] == "File"
    for document in (agent.movie("FILE").with_suffix(".xml"), agent.path("/var/lmx/agent/input.xml")):
        assert document.stat().st_mode & 0o777 == 0o600, f"{document} may hold a password"
    assert agent.path("/var/lmx/agent/input.mov").exists()
