"""Peers that are slow, silent, impolite or far from ASCII: nobody else has to wait for them."""
import contextlib
import os
import plistlib
import time

import pytest

from harness.commands import exchange, start_parameters, timed_line
from harness.log_reader import Level
from harness.tunnel_server import TunnelServer
from harness.unread import all_read, small_buffers, wait_read
from harness.waiting import let_pass, wait_until


def ask_until_stuck(agent, server):
    """Asks for the status, each time in a packet of its own, until the agent no longer gets rid of its reply."""
    question = server.encrypted("STATUS include_profile=true")
    with contextlib.suppress(AssertionError):
        while True:
            server.peer.sendall(question)
            wait_until(lambda: all_read(agent, server.peer), 1, "the agent reading")


def receive(peer, end):
    """Everything up to `end`."""
    received = b""
    while not received.endswith(end):
        data = peer.recv(1 << 20)
        assert data, "closed"
        received += data
    return received


def test_a_server_that_never_reads_does_not_hold_up_the_schedule(agent):
    agent.prepare()
    small_buffers(agent)
    with TunnelServer(agent) as server:
        agent.start()
        server.accept()
        due = int(time.time()) + 7
        assert server.command(timed_line("STATUS", due)) == "cmdStatus=0"  # its reply will find no room
        assert agent.command(timed_line("START", due, **start_parameters("A"))).text == "cmdStatus=0"
        ask_until_stuck(agent, server)
        assert time.time() < due, "the buffers are full too late for this test"
        agent.log.wait("^Running deferred command: START$")
        assert time.time() < due + 2
        agent.log.wait("recording started$")
        assert agent.command("STOP").text == "cmdStatus=0"
        agent.wait_recorded("A")
        assert len(agent.log.lines("^Connecting to lmxserverd tunnel")) == 1, "the tunnel has been stuck all the time"


def test_a_slow_reader_gets_its_reply(agent):
    """It frees less of the buffer than the system would report to a writer, for longer than five seconds."""
    agent.path("/var/lmx/preview.jpg").write_bytes(bytes(range(256)) * 4096)
    agent.preferences(PreviewPath="/var/lmx/preview.jpg")
    agent.start()
    with agent.connect() as peer:
        peer.sendall(b"STATUS include_preview=true\n")
        slowly = b""
        for _ in range(14):
            slowly += peer.recv(100)
            let_pass(0.5, "a peer that reads slowly")
        reply = slowly + receive(peer, b"/w==")
        assert int(reply.split(b"preview-size=")[1].split(b",")[0]) == len(reply.split(b"preview=")[1])
        assert not agent.log.lines("^Could not answer")


def test_a_server_that_speaks_and_hangs_up_is_not_stormed(agent):
    times = []
    with TunnelServer(agent.prepare()) as server:
        agent.start()
        for _ in range(3):
            server.accept()
            times.append(time.monotonic())
            assert server.command("PAUSE") == "cmdStatus=0"
            server.hang_up()
    assert all(later - earlier > 4.5 for earlier, later in zip(times, times[1:])), times


def test_a_silent_peer_keeps_nobody_out(agent, running):
    with agent.connect() as silent:
        assert exchange(silent, "PAUSE").text == "cmdStatus=0"
        silent.sendall(b"PAU")
        wait_read(agent, silent)
        begin = time.monotonic()
        with agent.connect() as other:
            assert exchange(other, "STOP").text == "cmdStatus=0"
            assert 9 < time.monotonic() - begin < 13
            begin = time.monotonic()
            assert exchange(silent, "SE").text == "cmdStatus=0", "the end of the line that it had begun"
            assert exchange(other, "STATUS").text.startswith("cmdStatus=0,recordStatus=0,")
            assert exchange(silent, "RESUME").text == "cmdStatus=0"
            assert time.monotonic() - begin < 2, "both are heard at once"
    agent.log.wait("^Command: RESUME took")
    commands = [line.text.split("[")[1] for line in agent.log.lines(r"^Command is \[")]
    assert commands[-5:] == ["PAUSE]", "STOP]", "PAUSE]", "STATUS]", "RESUME]"]


def test_a_queue_of_silent_peers_is_drained_at_once(agent, running):
    with contextlib.ExitStack() as peers:
        silent = [peers.enter_context(agent.connect()) for _ in range(200)]
        begin = time.monotonic()
        assert agent.command("STOP").text == "cmdStatus=0"
        assert time.monotonic() - begin < 13
        assert exchange(silent[-1], "PAUSE").text == "cmdStatus=0"
        assert silent[0].recv(1) == b"", "there is no place for all"
        assert len(agent.log.lines("^More than 64 silent peers", level=Level.INFO)) == 136
        used = processor_time(agent)
        let_pass(2, "nobody says anything")
        assert processor_time(agent) - used <= 0.1, "nothing spins"


def processor_time(agent):
    """The seconds of processor time that the daemon has used."""
    with open(f"/proc/{agent.sandbox.daemon_pid}/stat", encoding="ascii") as stat:
        words = stat.read().rpartition(") ")[2].split()
    return (int(words[11]) + int(words[12])) / os.sysconf("SC_CLK_TCK")


def timer_titles(reply):
    return [entry["TITLE"] for entry in plistlib.loads(reply.partition("timerlist=")[2].encode())]


@pytest.fixture
def hall_server(agent):
    """A server that an agent in a hall with a German name has said hello to."""
    agent.path("/var/lmx/preview.jpg").write_bytes(b"abcdef")
    agent.preferences(CameraName="Hörsaal Süd", PreviewPath="/var/lmx/preview.jpg")
    with TunnelServer(agent.prepare()) as server:
        agent.start()
        server.accept()
        yield server


def test_replies_beyond_ascii_are_whole(agent, hall_server):
    end = "preview-size=8,preview=YWJjZGVm"
    titled = timed_line("STOP", time.time() + 3600, TITLE="Größe – ein Maß")
    with agent.connect() as local:
        for ask in (hall_server.command, lambda line: exchange(local, line).text):
            reply = ask("STATUS include_profile=true,include_preview=true")
            assert ",CameraName=Hörsaal Süd,TunnelHost=127.0.0.1,RecordingCapturePreset=Video:Good," in reply
            assert reply.endswith(end)
            assert ask(titled) == "cmdStatus=0"
            reply = ask("TIMEDCMD command=TIMERLIST")
            assert reply.endswith("</plist>\n")
            assert set(timer_titles(reply)) == {"Größe – ein Maß"}


@pytest.mark.slow
def test_a_local_peer_that_never_reads_loses_its_connection(agent):
    agent.path("/var/lmx/agent/big.jpg").write_bytes(bytes(1 << 20))
    agent.preferences(PreviewPath="/var/lmx/agent/big.jpg")
    agent.start()
    with agent.connect(timeout=60) as mute:
        begin = time.monotonic()
        mute.sendall(b"STATUS include_preview=true\n")
        agent.log.wait(r"^Command is \[STATUS include_preview=true\]$")
        assert agent.command("STATUS", timeout=60).fields["cmdStatus"] == "0"
        assert 25 < time.monotonic() - begin < 45
        received = 0
        while data := mute.recv(1 << 20):
            received += len(data)
        assert 0 < received < 1 << 20, "the rest of the reply is lost"
