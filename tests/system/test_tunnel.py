"""The server tunnel: hello, cipher, commands, reconnects, and servers that misbehave."""
import base64
import os
import plistlib
import re
import socket
import subprocess
import time

import pytest
from harness import movie
from harness.agent import DEFAULTS, SECRET, exchange
from harness.tunnel_server import TunnelServer, cipher, in_network_of
from harness.tunnel_tool import TunnelTool
from harness.waiting import wait_until

# One line in 256 has a valid padding by chance; what comes out of it is hardly ever text, and never a command.
NO_COMMAND = (r"^Internal error occurred during decryption$|^Command ignored because it is not UTF-8 text$"
              r"|^Unknown command \[")
START = ("START RecordingMetadata_RECORDING_UUID={},RecordingMetadata_MAX_RECORDING_MINUTES=60,"
         "RecordingMetadata_UNATTENDED_RECORDING_MINUTES=60")


@pytest.fixture
def server(agent):
    """A server that the agent has said hello to."""
    agent.start()
    one = TunnelServer(agent, SECRET)
    one.accept()
    yield one
    one.close()


@pytest.fixture
def tool_server(agent):
    """The same, played by lmx-tunnel."""
    agent.start()
    one = TunnelTool(agent)
    one.accept()
    yield one
    one.close()


def descriptors(agent):
    return len(os.listdir(f"/proc/{agent.sandbox.daemon_pid}/fd"))


def test_the_hello(agent, server):
    assert server.hello["uuid"] == DEFAULTS["CameraUUID"]
    assert len(server.vector) == 16 and not server.hello["offline"]
    line = agent.log.wait("^Sent: AGENT", level=6).text
    assert line.rstrip("\\n") == f"Sent: AGENT protocol=1,agent_uuid={DEFAULTS['CameraUUID']},iv=*,version=100"
    secrets = [server.hello["iv"], base64.b64encode(SECRET).decode()]
    assert not [l for l in agent.log.lines() if any(secret in l.text for secret in secrets)]
    agent.log.wait("^Connecting to lmxserverd tunnel at 127.0.0.1:8175$", level=6)
    agent.log.wait("^Connected to 127.0.0.1:8175$", level=6)


@pytest.mark.parametrize("kind", ["server", "tool_server"])
def test_a_recording_over_the_tunnel(agent, kind, request):
    server = request.getfixturevalue(kind)
    assert server.command(START.format("A")) == "cmdStatus=0"
    time.sleep(2)
    assert server.command("PAUSE") == "cmdStatus=0"
    time.sleep(0.5)
    assert server.command("RESUME") == "cmdStatus=0"
    time.sleep(1)
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


def test_server_and_x_commands_get_no_reply(server):
    server.send("SERVER version=2,server_uuid=5E1F0A52-6B1D-4E8C-9A52-0F6C4C1B7E11")
    server.send("X-PREVIEW refresh_milliseconds=500")
    time.sleep(0.3)
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
    server.send(START.format("A"))
    agent.log.wait(NO_COMMAND)
    assert agent.command("STATUS").fields["recordStatus"] == "0"


def test_a_short_plaintext_is_an_empty_command(agent, server):
    server.peer.sendall(base64.b64encode(cipher("-e", server.secret, server.vector, b"short")) + b"\n")
    agent.log.wait(r"^Unknown command \[\]$", level=3)


def test_a_replayed_line_is_only_the_same_command_again(agent, server):
    line = server.encrypted("STOP")
    for _ in range(3):
        server.peer.sendall(line)
        assert server.reply() == "cmdStatus=0"


def test_a_byte_at_a_time(server):
    server.peer.setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, 1)
    for byte in server.encrypted("STOP"):
        server.peer.sendall(bytes([byte]))
        time.sleep(0.002)
    assert server.reply() == "cmdStatus=0"


def test_ten_megabytes_without_an_end(agent, server):
    for _ in range(160):
        server.peer.sendall(b"x" * 65536)
    server.peer.sendall(b"\n")
    agent.log.wait("^Command of more than 1048576 bytes without an end dropped$", level=3)
    with open(f"/proc/{agent.sandbox.daemon_pid}/status", encoding="ascii") as status:
        peak = int(re.search(r"VmHWM:\s+(\d+)", status.read())[1])
    assert peak < 400_000, f"{peak} kB"
    time.sleep(0.5)
    assert server.command("STOP") == "cmdStatus=0"


def test_half_a_line_and_silence(agent, server):
    server.peer.sendall(server.encrypted("STOP")[:20])
    time.sleep(1)
    assert agent.command("STATUS").fields["cmdStatus"] == "0"
    server.hang_up()
    server.accept()
    server.send("STOP")  # joins what was left over, as it would on the same connection
    agent.log.wait(NO_COMMAND)
    assert server.command("STOP") == "cmdStatus=0"


def test_a_server_killed_in_mid_command(agent, server):
    server.send(START.format("A"))
    server.hang_up()
    server.accept()
    assert server.command("STATUS").startswith("cmdStatus=0,recordStatus=2,"), "the recording goes on"
    assert server.command("STOP") == "cmdStatus=0"
    agent.wait_recorded("A")


@pytest.mark.limit(180)
def test_a_server_that_never_reads(agent):
    agent.start()
    small = "echo 4096 4096 16384 > /proc/sys/net/ipv4/tcp_wmem; echo 4096 4096 16384 > /proc/sys/net/ipv4/tcp_rmem"
    in_network(agent, "sh", "-c", small)  # so that a few replies fill the way to the server
    server = TunnelServer(agent, SECRET)
    server.accept()
    line = server.encrypted("STATUS include_profile=true")
    for _ in range(1000):
        try:
            server.peer.sendall(line)
        except OSError:
            break
        time.sleep(0.01)  # a line a packet
        if agent.log.lines("^Could not answer to tunnel"):
            break
    agent.log.wait("^Could not answer to tunnel", timeout=30)
    assert agent.command("STATUS").fields["cmdStatus"] == "0", "others are served"
    server.accept(30)
    server.close()


def test_the_refusal_in_two_pieces_ends_the_agent_after_a_minute(agent, server):
    server.peer.setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, 1)
    server.peer.sendall(b"ERR Unb")
    time.sleep(0.3)
    server.peer.sendall(b"ound agent\n")
    refused = agent.log.wait("^Server rejected agent connection, sleeping for one minute\\.$", level=4)
    assert agent.wait_exit(75) == 0
    assert 58 < time.monotonic() - refused.at < 70
    agent.log.wait("^Server rejected agent connection, restarting for retry\\.$", level=2)


def test_back_off(agent):
    agent.start()
    for seconds in (5, 15):
        agent.log.wait(f"^Failed to connect to server, retrying in {seconds} seconds\\.$", level=6, timeout=12)
    begin = time.monotonic()
    assert agent.stop() == 0
    assert time.monotonic() - begin < 2


def test_sighup_closes_the_tunnel_and_it_returns(agent, server):
    agent.sandbox.signal(1)
    with pytest.raises(EOFError):
        server.read_line()
    begin = time.monotonic()
    server.accept(20)
    assert 8 < time.monotonic() - begin < 16
    assert server.command("STOP") == "cmdStatus=0"


@pytest.mark.parametrize("version", [1, 2])
def test_taking_leave(agent, server, version):
    server.send(f"SERVER version={version},server_uuid=5E1F0A52-6B1D-4E8C-9A52-0F6C4C1B7E11")
    agent.log.wait("^Command: SERVER took")
    vector = server.vector
    agent.sandbox.signal(15)
    if version == 2:
        hello = server.accept()
        assert hello["offline"] and server.vector != vector
        agent.log.wait("^Notifying the server that the agent is going offline$", level=6)
    else:
        with pytest.raises(EOFError):
            server.read_line()
    assert agent.wait_exit() == 0
    assert len(agent.log.lines("going offline")) == version - 1


def test_a_server_that_hears_no_leave_taking_holds_nobody_up(agent, server):
    server.send("SERVER version=2,server_uuid=5E1F0A52-6B1D-4E8C-9A52-0F6C4C1B7E11")
    agent.log.wait("^Command: SERVER took")
    server.deaf()
    begin = time.monotonic()
    agent.sandbox.signal(15)
    assert agent.wait_exit(30) == 0
    assert time.monotonic() - begin < 15
    agent.log.wait("^Notifying the server that the agent is going offline$", level=6)


def in_network(agent, *command):
    """Runs a command in the agent's network namespace."""
    user = [] if os.geteuid() == 0 else ["--user", "--preserve-credentials"]
    subprocess.run(["nsenter", "--target", str(agent.sandbox.daemon_pid), *user, "--net", "--", *command], check=True)


def test_a_network_change_reconnects(agent, server):
    before = agent.log.mark()
    in_network(agent, "ip", "addr", "add", "192.0.2.7/24", "dev", "lo")
    changed = time.monotonic()
    old = server.peer
    server.accept(8)
    assert 0.0 < time.monotonic() - changed < 4
    agent.log.wait("^A network transition was received\\.$", after=before, level=6)
    assert old.recv(1) == b"", "the old connection is closed behind the new one"
    assert server.command("STOP") == "cmdStatus=0"
    before = agent.log.mark()
    in_network(agent, "ip", "addr", "del", "192.0.2.7/24", "dev", "lo")
    server.accept(8)
    assert len(agent.log.lines("network transition", after=before)) == 2, "one line a channel"


def test_a_local_client_keeps_its_stop_across_a_network_change(agent, server):
    with agent.connect() as local:
        assert exchange(local, START.format("R1")).text == "cmdStatus=0"
        before = agent.log.mark()
        in_network(agent, "ip", "addr", "add", "192.0.2.7/24", "dev", "lo")
        server.accept(8)
        agent.log.wait("made anew after a network change", after=before, count=2)  # the tunnel's and this one
        assert exchange(local, "STOP").text == "cmdStatus=0"
    agent.wait_tool_call("R1")


def members(*hosts):
    return {str(i): {"tunnel_agent_host": host, "tunnel_agent_port": port} for i, (host, port) in enumerate(hosts)}


def test_cluster_members_are_tried_in_turn(agent):
    answer = plistlib.dumps({"cluster_members": members(("127.0.0.1", 9), ("127.0.0.1", "9001"))}).decode()
    agent.set_tool({"when": "--listinfo", "print": answer})
    agent.preferences(TunnelHost="unreachable.invalid")
    agent.start()
    listener = in_network_of(agent, "127.0.0.1", 9001)
    listener.settimeout(20)
    peer, _ = listener.accept()
    assert peer.recv(4096).startswith(b"AGENT protocol=1,")
    agent.log.wait("^Hosts: 127.0.0.1:9, 127.0.0.1:9001$", level=7)
    peer.close()
    listener.close()


@pytest.mark.parametrize("form", [plistlib.FMT_XML, plistlib.FMT_BINARY])
def test_long_answers_in_both_forms(agent, form):
    information = {"cluster_members": members(("127.0.0.1", "9001")), "notes": [f"{i:080}" for i in range(2500)]}
    answer = plistlib.dumps(information, fmt=form)
    assert len(answer) > 3 * 65536, "more than a pipe holds"
    agent.set_tool({"when": "--listinfo", "print_hex": answer.hex()})
    agent.start()
    agent.log.wait("^Hosts: 127.0.0.1:9001$", level=7)


@pytest.mark.limit(60)
def test_the_start_waits_half_a_minute_for_the_tool_at_most(agent):
    cache = agent.path("/var/lmx/agent/com.zandor.lmxserverinfo.plist")
    cache.write_bytes(plistlib.dumps({"cluster_members": members(("127.0.0.1", "1"), ("127.0.0.1", "2"))}))
    agent.set_tool({"when": "--listinfo", "hang": True})
    begin = time.monotonic()
    agent.start(wait=False)
    agent.log.wait("^/usr/bin/lumex --listinfo has not answered for 20 seconds and was ended$", timeout=25)
    agent.wait_started(20)
    assert 28 < time.monotonic() - begin < 34
    agent.log.wait("^Hosts: 127.0.0.1:1, 127.0.0.1:2$", level=7)


def test_a_v6_member(agent):
    answer = plistlib.dumps({"cluster_members": members(("::1", "9001"))}, fmt=plistlib.FMT_XML).decode()
    agent.set_tool({"when": "--listinfo", "print": answer})
    agent.start()
    listener = in_network_of(agent, "::1", 9001)
    listener.settimeout(20)
    peer, _ = listener.accept()
    assert peer.recv(4096).startswith(b"AGENT ")
    peer.close()
    listener.close()


def test_a_tool_that_hangs_holds_up_nothing_after_the_start(agent):
    agent.start()
    agent.set_tool({"when": "--listinfo", "hang": True})
    agent.log.wait("^No cluster members known$", level=3)
    assert agent.command("STATUS").fields["cmdStatus"] == "0"


def test_the_cache_is_used_when_the_tool_fails(agent):
    cache = agent.path("/var/lmx/agent/com.zandor.lmxserverinfo.plist")
    cache.write_bytes(plistlib.dumps({"cluster_members": members(("127.0.0.1", "9001"))}))
    agent.set_tool({"when": "--listinfo", "exit": 3})
    agent.start()
    agent.log.wait(r"^Unable to retrieve cluster information \(/usr/bin/lumex exit code = 3\)\.$", level=3)
    agent.log.wait("^Unable to retrieve cluster information$", level=2)
    agent.log.wait("^Unable to contact any member of the cluster\\.$", level=7)
    agent.log.wait("^Hosts: 127.0.0.1:9001$", level=7)


def test_a_server_that_hangs_up_at_once_is_not_stormed(agent):
    agent.start()
    server = TunnelServer(agent, SECRET)
    times = []
    for _ in range(3):
        server.accept(10)
        times.append(time.monotonic())
        server.hang_up()
    server.close()
    assert all(4.5 < later - earlier < 8 for earlier, later in zip(times, times[1:])), times


def test_a_hundred_reconnects_leak_nothing(agent, server):
    server.command("STOP")
    wait_until(lambda: server.command("STATUS"), 5)
    before = descriptors(agent)
    for _ in range(100):
        server.hang_up()
        server.accept()
        server.command("STOP")
    assert descriptors(agent) <= before + 1
