"""What passes through the server tunnel: the hello, commands, replies, and lines that are no commands."""
import base64
import os
import re
import socket

import pytest
from harness import movie
from harness.agent import DEFAULTS, SECRET, SERVER_UUID
from harness.commands import start_line
from harness.log_reader import Level
from harness.tunnel_server import cipher
from harness.tunnel_tool import TunnelTool
from harness.unread import wait_read
from harness.waiting import let_pass

# One line in 256 has a valid padding by chance; what comes out of it is hardly ever text, and never a command.
NO_COMMAND = (r"^Internal error occurred during decryption$|^Command ignored because it is not UTF-8 text$"
              r"|^Unknown command \[")


@pytest.fixture
def tool_server(agent):
    """A server that the running agent has said hello to, played by lmx-tunnel."""
    with TunnelTool(agent.prepare()) as one:
        agent.start()
        one.accept()
        yield one


def test_the_hello(agent, server):
    assert server.hello["uuid"] == DEFAULTS["CameraUUID"]
    assert len(server.vector) == 16 and not server.hello["offline"]
    line = agent.log.wait("^Sent: AGENT", level=Level.INFO).text
    assert line.rstrip("\\n") == f"Sent: AGENT protocol=1,agent_uuid={DEFAULTS['CameraUUID']},iv=*,version=100"
    secrets = [server.hello["iv"], base64.b64encode(SECRET).decode()]
    assert not [l for l in agent.log.lines() if any(secret in l.text for secret in secrets)]
    agent.log.wait("^Connecting to lmxserverd tunnel at 127.0.0.1:8175$", level=Level.INFO)
    agent.log.wait("^Connected to 127.0.0.1:8175$", level=Level.INFO)


@pytest.mark.parametrize("kind", ["server", "tool_server"])
def test_a_recording_over_the_tunnel(agent, kind, request):
    server = request.getfixturevalue(kind)
    assert server.command(start_line("A")) == "cmdStatus=0"
    agent.let_record(1)
    assert server.command("PAUSE") == "cmdStatus=0"
    let_pass(0.5, "a pause of half a second")
    assert server.command("RESUME") == "cmdStatus=0"
    agent.let_record(2)
    status = server.command("STATUS include_profile=true")
    assert status.startswith("cmdStatus=0,recordStatus=2,") and ",CameraName=Hall 3," in status
    assert server.command("STOP") == "cmdStatus=0"
    agent.wait_recorded("A")
    agent.wait_tool_call("A")
    movie.decodes(agent.movie("A"))


def test_equal_replies_differ_on_the_wire(server):
    server.send("STOP")
    first = server.read_line()
    server.send("STOP")
    second = server.read_line()
    assert first != second
    for line in (first, second):
        ciphertext = base64.b64decode(line.rstrip(b"\n"), validate=True)
        assert len(ciphertext) == (32 + len("cmdStatus=0")) // 16 * 16 + 16
        assert cipher("-d", server.secret, server.vector, ciphertext)[32:] == b"cmdStatus=0"


def test_server_and_x_commands_get_no_reply(agent, server):
    for line in (f"SERVER version=2,server_uuid={SERVER_UUID}", "X-PREVIEW refresh_milliseconds=500"):
        server.send(line)
        agent.log.wait(f"^Command: {line.split()[0]} took")
    assert server.command("PAUSE") == "cmdStatus=0"


@pytest.mark.parametrize("line", [b"not base64 at all\n", b"QUJD\n", base64.b64encode(os.urandom(64)) + b"\n", b"\n",
                                  b"ERR Unbound agent\n"], ids=["text", "3 bytes", "noise", "empty", "ERR whole"])
def test_lines_that_do_not_decrypt_are_ignored(agent, server, line):
    server.peer.sendall(line)
    agent.log.wait(NO_COMMAND)
    assert server.command("STOP") == "cmdStatus=0"
    assert not agent.log.lines("Server rejected")


def test_a_wrong_secret_is_not_served(agent, server):
    server.secret = bytes(16)
    server.send(start_line("A"))
    agent.log.wait(NO_COMMAND)
    assert agent.command("STATUS").fields["recordStatus"] == "0"


def test_a_short_plaintext_is_an_empty_command(agent, server):
    server.peer.sendall(base64.b64encode(cipher("-e", server.secret, server.vector, b"short")) + b"\n")
    agent.log.wait(r"^Unknown command \[\]$", level=Level.ERROR)


def test_a_replayed_line_is_only_the_same_command_again(agent, server):
    line = server.encrypted("STOP")
    for _ in range(3):
        server.peer.sendall(line)
        assert server.reply() == "cmdStatus=0"


def test_a_byte_at_a_time(agent, server):
    server.peer.setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, 1)
    for byte in server.encrypted("STOP"):
        server.peer.sendall(bytes([byte]))
        wait_read(agent, server.peer)
    assert server.reply() == "cmdStatus=0"


def test_ten_megabytes_without_an_end(agent, server):
    for _ in range(160):
        server.peer.sendall(b"x" * 65536)
    server.peer.sendall(b"\n")
    agent.log.wait("^Command of more than 1048576 bytes without an end dropped$", level=Level.ERROR)
    with open(f"/proc/{agent.sandbox.daemon_pid}/status", encoding="ascii") as status:
        peak = int(re.search(r"VmHWM:\s+(\d+)", status.read())[1])
    assert peak < 400_000, f"{peak} kB"
    wait_read(agent, server.peer)
    assert server.command("STOP") == "cmdStatus=0"


def test_half_a_line_and_silence(agent, server):
    server.peer.sendall(server.encrypted("STOP")[:20])
    wait_read(agent, server.peer)
    assert agent.command("STATUS").fields["cmdStatus"] == "0"
    server.hang_up()
    server.accept()
    server.send("STOP")  # joins what was left over, as it would on the same connection
    agent.log.wait(NO_COMMAND)
    assert server.command("STOP") == "cmdStatus=0"
