"""The ad-hoc client against the real daemon."""
import os
import re
import signal

import pytest
from harness import movie
from harness.agent import REPOSITORY
from harness.sandbox import children_of
from harness.waiting import wait_until

START = ("START RecordingMetadata_RECORDING_UUID=90201534-37B5-482F-AD57-C3762F5020E1,"
         "RecordingMetadata_MAX_RECORDING_MINUTES=240,RecordingMetadata_UNATTENDED_RECORDING_MINUTES=60,"
         "RecordingMetadata_ADHOC_WORKFLOW_UUID=DEFA1587-A650-426E-92DA-01C5EB811705")
OUTPUT = "/var/lmx/lecture 1.mov"


def test_without_a_daemon(agent):
    for arguments in (("--status",), ("--timerlist",), ("--timerrevoke", "T"), ("-f", OUTPUT, "-s")):
        result = agent.run(*arguments)
        assert (result.returncode, result.stdout, result.stderr) == (0, "", ""), arguments


def without_free_space(text):
    """The free space changes from one reply to the next: others use the disk too."""
    return re.sub(r"availDiskInMB=\d+", "availDiskInMB=", text)


def test_status(running):
    result = running.run("--status")
    assert (result.returncode, result.stderr) == (0, "")
    reply = running.command("STATUS include_preview=true").text
    assert without_free_space(result.stdout) == without_free_space(
        f"Connected.\nsending: STATUS include_preview=true\n\nreceived: {reply}\n")


def test_an_interrupt_ends_a_client_that_gets_no_answer(running):
    with running.connect(), running.popen("--status") as client:  # behind a peer that holds the socket
        lines = [client.stdout.readline() for _ in range(3)]
        assert lines == [b"Connected.\n", b"sending: STATUS include_preview=true\n", b"\n"]
        interrupt(client, signal.SIGINT)
        assert client.stdout.read() == b"received: <empty>\n"
        assert client.wait(10) == 0


def let_it_record(agent, mark):
    """Waits for some media on the disk. STATUS can't be asked for: the client occupies the local socket."""
    agent.log.wait("recording started$", after=mark)
    wait_until(lambda: sum(p.stat().st_size for p in agent.path(REPOSITORY).rglob("media.mov")) > 60_000, 20, "media")


def interrupt(client, number):
    """Sends a signal to the program, which is the child of the command that entered the sandbox."""
    (program,) = wait_until(lambda: children_of(client.pid), 5, "the client's process")
    os.kill(program, number)


def test_a_recording_until_an_interrupt(running):
    mark = running.log.mark()
    with running.popen("-f", OUTPUT, "-s") as client:
        let_it_record(running, mark)
        interrupt(client, signal.SIGINT)
        output, errors = client.communicate(timeout=30)
    assert (client.returncode, errors) == (0, b"")
    command = f"{START},RecordingMetadata_ADHOC_SUBMIT_DISABLED=1,RecordingMetadata_ADHOC_FILE_PATH={OUTPUT}\n"
    assert output.decode() == (f"Connected.\nsending: {command}\nreceived: cmdStatus=0\n"
                               "sent STOP, received: cmdStatus=0\n")
    running.log.wait(f'^"{re.escape(OUTPUT)}" recording stopped', after=mark)
    movie.decodes(running.path(OUTPUT))
    assert not running.tool_calls(), "the submission was disabled"


@pytest.mark.slow
def test_a_stop_that_nobody_answers_is_reported(running):
    mark = running.log.mark()
    with running.popen("-f", OUTPUT, "-s") as client:
        let_it_record(running, mark)
        running.sandbox.freeze()
        interrupt(client, signal.SIGINT)
        output, errors = client.communicate(timeout=60)
        running.sandbox.thaw()
    assert output.endswith(b"sent STOP, received: <empty>\n")
    assert b"has not answered the STOP" in errors and client.returncode == 0


def test_a_recording_that_is_submitted(running):
    mark = running.log.mark()
    with running.popen("-f", OUTPUT, "-u", "jane", "--password", "geheim", "-d", "5", "-Z", "7") as client:
        let_it_record(running, mark)
        interrupt(client, signal.SIGTERM)
        output, _ = client.communicate(timeout=30)
    assert client.returncode == 0
    assert "MAX_RECORDING_MINUTES=5,RecordingMetadata_UNATTENDED_RECORDING_MINUTES=7," in output.decode()
    call = wait_until(running.tool_calls, 30, "the submission")[0]["arguments"]
    assert call[call.index("--workflow_uuid") + 1] == "DEFA1587-A650-426E-92DA-01C5EB811705"
    assert call[call.index("--file") + 1] == OUTPUT
    assert call[call.index("--user") + 1] == "jane"
    assert not [l for l in running.log.lines("Command is") if "geheim" in l.text]
