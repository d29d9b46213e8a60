"""The tunnel's connection: losing it, being refused, reconnecting, taking leave."""
import contextlib
import os
import signal
import socket
import time

import pytest
from harness.agent import SERVER_UUID
from harness.commands import exchange, start_line
from harness.log_reader import Level
from harness.tunnel_server import TunnelServer
from harness.unread import all_read, small_buffers, wait_read
from harness.waiting import let_pass, wait_until


def descriptors(agent):
    return len(os.listdir(f"/proc/{agent.sandbox.daemon_pid}/fd"))


def test_a_server_killed_in_mid_command(agent, server):
    server.send(start_line("A"))
    server.hang_up()
    server.accept()
    assert server.command("STATUS").startswith("cmdStatus=0,recordStatus=2,"), "the recording goes on"
    assert server.command("STOP") == "cmdStatus=0"
    agent.wait_recorded("A")


def ask_until_given_up(agent, server):
    """Asks for the status, each time in a packet of its own, until the agent no longer tries to answer."""
    def given_up():
        return agent.log.lines("^Could not answer to tunnel")
    question = server.encrypted("STATUS include_profile=true")
    with contextlib.suppress(ConnectionError):  # it may close the connection at any moment
        while not given_up():
            server.peer.sendall(question)
            wait_until(lambda: all_read(agent, server.peer) or given_up(), 40, "the agent reading, or giving up")


@pytest.mark.slow
@pytest.mark.limit(180)
def test_a_server_that_never_reads(agent):
    agent.prepare()
    small_buffers(agent)
    with TunnelServer(agent) as server:
        agent.start()
        server.accept()
        ask_until_given_up(agent, server)
        assert agent.command("STATUS").fields["cmdStatus"] == "0", "others are served"
        server.accept(30)


def refuse(agent, server):
    """Only a refusal that comes in two pieces is understood as one."""
    server.peer.setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, 1)
    server.peer.sendall(b"ERR Unb")
    wait_read(agent, server.peer)
    server.peer.sendall(b"ound agent\n")


@pytest.mark.slow
def test_the_refusal_in_two_pieces_ends_the_agent_after_a_minute(agent, server):
    refuse(agent, server)
    refused = agent.log.wait("^Server rejected agent connection, sleeping for one minute\\.$", level=Level.WARNING)
    assert agent.wait_exit(100) == 0
    assert 58 < time.monotonic() - refused.at < 90
    agent.log.wait("^Server rejected agent connection, restarting for retry\\.$", level=Level.CRITICAL)


@pytest.mark.slow
def test_a_refusal_waits_for_the_recording_and_its_submission(agent, server):
    agent.set_tool({"when": "--submit", "hang": True})
    agent.start_recording("A")
    refuse(agent, server)
    agent.log.wait("^Server rejected agent connection; the restart waits until the recording is submitted$", timeout=90,
                   level=Level.NOTICE)
    assert agent.command("STATUS").fields["recordStatus"] == "2"
    assert agent.command("STOP").text == "cmdStatus=0"
    agent.wait_tool_call("A")
    let_pass(1, "the daemon looks four times a second whether it may end")
    assert agent.alive() and not agent.log.lines("restarting for retry"), "the submission is still running"
    agent.release_tool()
    assert agent.wait_exit() == 0
    agent.log.wait("^Server rejected agent connection, restarting for retry\\.$", level=Level.CRITICAL)
    assert agent.submitted("end") == ["A"]
    assert len(agent.log.lines("the restart waits")) == 1


def test_back_off(agent):
    agent.start()
    for seconds in (5, 15):
        agent.log.wait(f"^Failed to connect to server, retrying in {seconds} seconds\\.$", level=Level.INFO)
    begin = time.monotonic()
    assert agent.stop() == 0
    assert time.monotonic() - begin < 10, "nobody waits for the fifteen seconds to go by"


def test_sighup_closes_the_tunnel_and_it_returns(agent, server):
    agent.sandbox.signal(signal.SIGHUP)
    with pytest.raises(EOFError):
        server.read_line()
    begin = time.monotonic()
    server.accept(40)
    assert 8 < time.monotonic() - begin < 30
    assert server.command("STOP") == "cmdStatus=0"


@pytest.mark.parametrize("version", [1, 2])
def test_taking_leave(agent, server, version):
    server.send(f"SERVER version={version},server_uuid={SERVER_UUID}")
    agent.log.wait("^Command: SERVER took")
    vector = server.vector
    agent.sandbox.signal(signal.SIGTERM)
    if version == 2:
        hello = server.accept()
        assert hello["offline"] and server.vector != vector
        agent.log.wait("^Notifying the server that the agent is going offline$", level=Level.INFO)
    else:
        with pytest.raises(EOFError):
            server.read_line()
    assert agent.wait_exit() == 0
    assert len(agent.log.lines("going offline")) == version - 1


def test_a_server_that_hears_no_leave_taking_holds_nobody_up(agent, server):
    server.send(f"SERVER version=2,server_uuid={SERVER_UUID}")
    agent.log.wait("^Command: SERVER took")
    server.deaf()
    begin = time.monotonic()
    agent.sandbox.signal(signal.SIGTERM)
    assert agent.wait_exit(40) == 0
    assert time.monotonic() - begin < 25, "ten seconds are spent on it at most"
    agent.log.wait("^Notifying the server that the agent is going offline$", level=Level.INFO)


def test_a_network_change_reconnects(agent, server):
    before = agent.log.mark()
    agent.in_network("ip", "addr", "add", "192.0.2.7/24", "dev", "lo")
    old = server.peer
    server.accept()
    agent.log.wait("^A network transition was received\\.$", after=before, level=Level.INFO)
    assert old.recv(1) == b"", "the old connection is closed behind the new one"
    assert server.command("STOP") == "cmdStatus=0"
    before = agent.log.mark()
    agent.in_network("ip", "addr", "del", "192.0.2.7/24", "dev", "lo")
    server.accept()
    agent.log.wait("network transition", after=before, count=2)
    assert len(agent.log.lines("network transition", after=before)) == 2, "one line a channel"


def test_a_local_client_keeps_its_stop_across_a_network_change(agent, server):
    with agent.connect() as local:
        assert exchange(local, start_line("R1")).text == "cmdStatus=0"
        before = agent.log.mark()
        agent.in_network("ip", "addr", "add", "192.0.2.7/24", "dev", "lo")
        server.accept()
        agent.log.wait("made anew after a network change", after=before, count=2)  # the tunnel's and this one
        assert exchange(local, "STOP").text == "cmdStatus=0"
    agent.wait_tool_call("R1")


def test_a_server_that_hangs_up_at_once_is_not_stormed(agent):
    times = []
    with TunnelServer(agent.prepare()) as server:
        agent.start()
        for _ in range(3):
            server.accept()
            times.append(time.monotonic())
            server.hang_up()
    assert all(later - earlier > 4.5 for earlier, later in zip(times, times[1:])), times


def test_reconnects_leak_nothing(agent, server):
    server.command("STOP")
    before = descriptors(agent)
    for turn in range(8):
        agent.in_network("ip", "addr", ("add", "del")[turn % 2], "192.0.2.7/24", "dev", "lo")
        server.accept()
        server.command("STOP")
    assert descriptors(agent) <= before + 1
