"""lmx-tunnel, the server's side for people, against the real daemon."""
import signal
import subprocess

import pytest
from harness.agent import DEFAULTS, SERVER_UUID
from harness.commands import start_line
from harness.tunnel_tool import TOOL, TunnelTool, start_tool


def listening_tool(agent, *arguments, **streams):
    """Starts the program and waits until it listens. An agent that starts later finds it at once."""
    tool = start_tool(agent, *arguments, **streams)
    assert tool.stdout.readline() == "listening on 127.0.0.1:8175\n"
    return tool


def test_a_script(agent, tmp_path):
    script = tmp_path / "commands"
    script.write_text(f"# a short recording\n\nSERVER version=1,server_uuid={SERVER_UUID}\n{start_line('A')}\n"
                      "sleep 1.5\nSTATUS\nSTOP\n")
    with listening_tool(agent.prepare(), "--script", str(script)) as tool:
        agent.start()
        output, errors = tool.communicate(timeout=30)
    assert (tool.returncode, errors) == (0, "")
    lines = output.splitlines()
    assert lines[0] == f"agent {DEFAULTS['CameraUUID']}, version 100"
    replies = [line for line in lines if line.startswith("< ")]
    assert replies[0] == replies[2] == "< cmdStatus=0" and replies[1].startswith("< cmdStatus=0,recordStatus=2,")
    agent.wait_recorded("A")


def test_typed_lines(agent):
    with listening_tool(agent.prepare(), stdin=subprocess.PIPE) as tool:
        agent.start()
        assert tool.stdout.readline().startswith("agent ")
        tool.stdin.write("STATUS\n")
        tool.stdin.flush()
        while not (line := tool.stdout.readline()).startswith("< "):
            assert line
        assert line.startswith("< cmdStatus=0,recordStatus=0,")
        tool.stdin.close()
        assert tool.wait(10) == 0


def test_lines_from_a_pipe_are_all_answered(agent):
    with listening_tool(agent.prepare(), stdin=subprocess.PIPE) as tool:
        agent.start()
        output, _ = tool.communicate("STATUS\n", timeout=30)
    assert tool.returncode == 0
    assert output.splitlines()[-1].startswith("< cmdStatus=0,recordStatus=0,")


def still(path):
    """Makes a JPEG picture."""
    subprocess.run(["ffmpeg", "-v", "error", "-f", "lavfi", "-i", "testsrc=size=320x180", "-frames:v", "1", str(path)],
                   check=True)


@pytest.fixture
def with_preview(agent):
    """An agent that has a picture to show."""
    agent.preferences(PreviewPath="/var/preview.jpg")
    still(agent.path("/var/preview.jpg"))
    return agent.prepare()


def test_a_preview_is_saved(with_preview, tmp_path):
    sent = with_preview.path("/var/preview.jpg").read_bytes()
    characters = (len(sent) + 2) // 3 * 4
    with TunnelTool(with_preview, "--preview", str(tmp_path / "seen.jpg")) as tool:
        with_preview.start()
        tool.accept()
        reply = tool.command("STATUS include_preview=true")
        assert reply.endswith(f",preview-size={characters},preview=({characters} characters)")
        assert tool.line() == f"preview of {len(sent)} bytes saved to {tmp_path / 'seen.jpg'}"
    assert (tmp_path / "seen.jpg").read_bytes() == sent


def test_a_preview_that_cannot_be_saved_is_reported(with_preview, tmp_path):
    (tmp_path / "commands").write_text("STATUS include_preview=true\n")
    script = str(tmp_path / "commands")
    with listening_tool(with_preview, "--script", script, "--preview", "/nowhere/seen.jpg") as tool:
        with_preview.start()
        _, errors = tool.communicate(timeout=30)
    assert errors == "lmx-tunnel: /nowhere/seen.jpg: No such file or directory\n"


def test_an_agent_that_takes_leave(agent):
    with TunnelTool(agent.prepare()) as tool:
        agent.start()
        tool.accept()
        tool.send("SERVER version=2,server_uuid=" + SERVER_UUID)
        agent.log.wait("^Command: SERVER took")
        agent.sandbox.signal(signal.SIGTERM)
        assert tool.accept()["offline"]


def test_listening_on_v6(agent):
    agent.preferences(TunnelHost="::1")
    with TunnelTool(agent.prepare(), "--listen", "[::1]:8175") as tool:
        agent.start()
        tool.accept()
        assert tool.command("STATUS").startswith("cmdStatus=0,recordStatus=0,")


def test_an_address_that_is_none_is_named(agent):
    with start_tool(agent.prepare(), "--listen", "hall:8175") as tool:
        _, errors = tool.communicate(timeout=30)
    assert (tool.returncode, errors) == (1, "lmx-tunnel: can't listen on hall:8175: Name or service not known\n")


@pytest.mark.parametrize("arguments", [[], ["--secret"], ["--secret", "x", "--listen", "nonsense"], ["--nothing"]])
def test_usage(arguments):
    result = subprocess.run([TOOL, *arguments], capture_output=True, text=True, check=False)
    assert result.returncode == 64 and "usage: lmx-tunnel --secret FILE" in result.stderr


def test_a_missing_secret_is_named():
    result = subprocess.run([TOOL, "--secret", "/nowhere/s.plist"], capture_output=True, text=True, check=False)
    assert result.returncode == 1
    assert result.stderr == "lmx-tunnel: /nowhere/s.plist: No such file or directory\n"
