"""lmx-tunnel, the server's side for people, against the real daemon."""
import os
import subprocess

import pytest
from conftest import ROOT
from harness.agent import DEFAULTS, SERVER_UUID

TOOL = ROOT / "build/release/lmx-tunnel"


def start_tool(agent, *arguments, **streams):
    secret = agent.path(f"/var/lmx/agent/secrets/{SERVER_UUID}.plist")
    user = [] if os.geteuid() == 0 else ["--user", "--preserve-credentials"]
    return subprocess.Popen(["nsenter", "--target", str(agent.sandbox.daemon_pid), *user, "--net", "--", str(TOOL),
                             "--secret", str(secret), *arguments],
                            stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True, **streams)


def test_a_script(running, tmp_path):
    script = tmp_path / "commands"
    script.write_text("# a short recording\n\nSERVER version=1,server_uuid=" + SERVER_UUID + "\n"
                      "START RecordingMetadata_RECORDING_UUID=A,RecordingMetadata_MAX_RECORDING_MINUTES=5,"
                      "RecordingMetadata_UNATTENDED_RECORDING_MINUTES=5\nsleep 1.5\nSTATUS\nSTOP\n")
    with start_tool(running, "--script", str(script)) as tool:
        output, errors = tool.communicate(timeout=30)
    assert (tool.returncode, errors) == (0, "")
    lines = output.splitlines()
    assert lines[:2] == ["listening on 127.0.0.1:8175", f"agent {DEFAULTS['CameraUUID']}, version 100"]
    replies = [line for line in lines if line.startswith("< ")]
    assert replies[0] == replies[2] == "< cmdStatus=0" and replies[1].startswith("< cmdStatus=0,recordStatus=2,")
    running.wait_recorded("A")


def test_typed_lines(running):
    with start_tool(running, stdin=subprocess.PIPE) as tool:
        assert tool.stdout.readline() == "listening on 127.0.0.1:8175\n"
        assert tool.stdout.readline().startswith("agent ")
        tool.stdin.write("STATUS\n")
        tool.stdin.flush()
        while not (line := tool.stdout.readline()).startswith("< "):
            assert line
        assert line.startswith("< cmdStatus=0,recordStatus=0,")
        tool.stdin.close()
        assert tool.wait(10) == 0


def test_lines_from_a_pipe_are_all_answered(running):
    with start_tool(running, stdin=subprocess.PIPE) as tool:
        output, _ = tool.communicate("STATUS\n", timeout=30)
    assert tool.returncode == 0
    assert output.splitlines()[-1].startswith("< cmdStatus=0,recordStatus=0,")


@pytest.mark.parametrize("arguments", [[], ["--secret"], ["--secret", "x", "--listen", "nonsense"], ["--nothing"]])
def test_usage(arguments):
    result = subprocess.run([TOOL, *arguments], capture_output=True, text=True, check=False)
    assert result.returncode == 64 and "usage: lmx-tunnel --secret FILE" in result.stderr


def test_a_missing_secret_is_named():
    result = subprocess.run([TOOL, "--secret", "/nowhere/s.plist"], capture_output=True, text=True, check=False)
    assert result.returncode == 1
    assert result.stderr == "lmx-tunnel: /nowhere/s.plist: No such file or directory\n"
