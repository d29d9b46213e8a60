"""The daemon's life: start, status, signals, PID file, and several peers on the local socket."""
import re
import signal
import socket
import time

import pytest
from harness.commands import exchange
from harness.log_reader import Level
from harness.unread import wait_read

STATUS = re.compile(
    r"cmdStatus=0,recordStatus=(\d),start=(\d+),elapsedTime=(\d+),stop=(\d+),hard_stop=(\d+),lastError=(\d+),"
    r"availDiskInMB=(\d+),totalDiskInMB=(\d+)")


def test_start_and_orderly_end(agent):
    agent.start()
    agent.log.wait(r"^lmxagentd \(version 100\) starting\.\.\.$", level=Level.INFO)
    pid_file = agent.path("/var/run/lmxagentd.pid")
    assert pid_file.read_text() == f"{agent.sandbox.pid_inside()}\n"
    assert pid_file.stat().st_mode & 0o777 == 0o644
    assert agent.stop() == 0
    texts = [line.text for line in agent.log.lines()]
    assert "lmxagentd is stopping..." in texts and texts[-1] == "lmxagentd stopped"
    assert "Internal error caused application to stop" not in texts
    assert not agent.path("/var/run/lmxagentd.pid").exists()


def notified(agent):
    """The notifications that the agent tried to send, in order. Without a bus each attempt leaves a debug line."""
    lines = agent.log.lines(r"^Notification com\.zandor\.lmxagentd\.\w+ was not sent on the \w+ bus", level=Level.DEBUG)
    return re.findall(r"lmxagentd\.(\w+) was not sent on the (\w+) bus", "\n".join(line.text for line in lines))


def test_start_and_end_are_announced_on_the_buses(running):
    running.log.wait("started was not sent on the session bus", level=Level.DEBUG)
    assert notified(running) == [("started", "system"), ("started", "session")]
    assert running.stop() == 0
    running.log.wait("^lmxagentd stopped$", level=Level.INFO)
    assert notified(running)[2:] == [("stopped", "system"), ("stopped", "session")]


@pytest.mark.parametrize("arguments, status, printed", [
    (["-v"], 0, "\nLumex lmxagentd (version 100)\n\n"), (["-i", "nonsense"], 0, ""), (["-Q"], 64, None)])
def test_the_tool_modes_log_their_end_too(agent, arguments, status, printed):
    agent.start(wait=False, arguments=arguments)
    assert agent.wait_exit() == status
    agent.log.wait("^lmxagentd stopped$", level=Level.INFO)
    assert notified(agent) == [("stopped", "system"), ("stopped", "session")]
    assert not agent.log.lines("starting")
    assert printed is None or agent.errors() == printed


@pytest.mark.parametrize("number, text", [(signal.SIGINT, r"^Got Stop Signal \(SIGINT\)$"),
                                          (signal.SIGTERM, r"^Got Termination Signal \(SIGTERM\)$")])
def test_stop_signals(running, number, text):
    began = time.monotonic()
    assert running.stop(number) == 0
    assert time.monotonic() - began < 8, "an idle daemon has nothing to wait for"
    running.log.wait(text, level=Level.DEBUG)


def test_a_broken_pipe_does_not_end_the_daemon(running):
    running.sandbox.signal(signal.SIGPIPE)
    with running.connect() as peer:
        peer.sendall(b"STATUS\n")  # closed before the reply is read
    assert STATUS.fullmatch(running.command("STATUS").text)


def test_pause_and_resume_by_signals(running):
    running.start_recording("SIG")
    running.sandbox.signal(signal.SIGUSR1)
    running.log.wait("^Got Pause Signal$", level=Level.DEBUG)
    running.log.wait("recording paused", level=Level.NOTICE)
    assert running.command("STATUS").fields["recordStatus"] == "1"
    running.sandbox.signal(signal.SIGUSR2)
    running.log.wait("^Got Resume Signal$", level=Level.DEBUG)
    running.log.wait("recording resumed", level=Level.NOTICE)
    assert running.command("STATUS").fields["recordStatus"] == "2"


def test_a_hang_up_cancels_and_opens_the_camera_again(running):
    """What was recorded is kept as a recovered movie: nobody asked to discard it."""
    running.start_recording("HUP")
    running.let_record(1)
    mark = running.log.mark()
    running.sandbox.signal(signal.SIGHUP)
    running.log.wait(r"^Got Signal \(SIGHUP\)$", level=Level.DEBUG)
    running.log.wait("^Process shutDownControl$", after=mark, level=Level.DEBUG)
    running.log.wait("^Process cancelCapture$", after=mark, level=Level.DEBUG)
    running.log.wait(r'^Recovered unfinished recording "/var/lmx/agent/recordings/HUP\.mov"', after=mark,
                     level=Level.NOTICE)
    assert running.command("STATUS").fields["recordStatus"] == "0"
    running.log.wait("^Using Video Device Named: ", after=mark, level=Level.DEBUG)
    running.record("NEXT")
    running.wait_tool_call("NEXT")
    assert running.submitted() == ["NEXT"]
    assert running.alive(), "the camera is back: the daemon goes on"


def test_a_stale_socket_and_pid_file_do_not_matter(running):
    running.kill9()
    assert running.path("/var/run/lmxagentd.comm").exists()
    assert running.path("/var/run/lmxagentd.pid").exists()
    running.start()
    assert STATUS.fullmatch(running.command("STATUS").text)


def test_a_pid_file_that_may_not_be_written(agent):
    """Runs without the capability that would let root write it all the same."""
    path = agent.path("/var/run/lmxagentd.pid")
    path.write_text("old\n")
    path.chmod(0o444)
    agent.start(prefix=["setpriv", "--bounding-set=-dac_override", "--inh-caps=-dac_override", "--"])
    agent.log.wait(r"^unable to write pid file \(EACCES\)$", level=Level.ERROR)
    assert STATUS.fullmatch(agent.command("STATUS").text)


def test_a_pid_file_that_cannot_be_written_ends_the_daemon(agent):
    agent.path("/var/run/lmxagentd.pid").mkdir()
    agent.start(wait=False)
    assert agent.wait_exit() == 1
    agent.log.wait("^Internal error caused application to stop$", level=Level.CRITICAL)
    assert not agent.log.lines("EACCES")


def test_status_of_an_idle_agent(running):
    fields = STATUS.fullmatch(running.command("STATUS").text)
    assert fields and fields.groups()[:6] == ("0", "0", "0", "0", "0", "0")
    assert 0 < int(fields[7]) <= int(fields[8])


def test_status_with_profile(running):
    text = running.command("STATUS include_profile=true").text
    status, profile = text.rsplit(",CameraName=", 1)
    assert STATUS.fullmatch(status)
    assert profile == "Hall 3,TunnelHost=127.0.0.1,RecordingCapturePreset=Video:Good"
    assert STATUS.fullmatch(running.command("STATUS include_profile=TRUE").text)


def test_ten_clients_one_after_another_while_recording(running):
    start = running.start_recording("TALK", minutes="90.5")
    running.let_record(2)
    peers = [running.connect() for _ in range(10)]
    try:
        for peer in peers:  # all are connected; each waits until those before it have gone
            reply = exchange(peer, "STATUS")
            fields = STATUS.fullmatch(reply.text)
            assert fields, reply.text
            record, begun, elapsed, stop, hard_stop, error, _, _ = (int(value) for value in fields.groups())
            assert (record, stop, error) == (2, 0, 0)
            assert abs(begun - start.received) <= 1.5
            assert abs(hard_stop - (start.received + 5430)) <= 1.5
            assert 2 <= elapsed <= reply.received - start.sent + 1
            peer.close()
    finally:
        for peer in peers:
            peer.close()
    running.command("STOP")
    running.wait_recorded("TALK")


def test_the_second_peer_waits_for_the_first(running):
    with running.connect() as first:
        assert exchange(first, "STATUS").text
        with running.connect(timeout=1.0) as second:
            second.sendall(b"STATUS\n")
            with pytest.raises(socket.timeout):
                second.recv(1)
            first.close()
            second.settimeout(5)
            assert STATUS.fullmatch(second.recv(4096).decode())


def test_one_line_a_chunk(running):
    with running.connect(timeout=1.0) as peer:
        peer.sendall(b"STATUS\nSTATUS include_profile=true\n")
        assert STATUS.fullmatch(peer.recv(4096).decode())
        with pytest.raises(socket.timeout):
            peer.recv(1)
        peer.settimeout(5)
        peer.sendall(b"\n")  # the kept line, with its own line feed, in front of this one
        assert ",CameraName=" in peer.recv(4096).decode()


def test_a_line_in_two_pieces(running):
    before = running.log.mark()
    with running.connect() as peer:
        peer.sendall(b"STATUS include_")
        wait_read(running, peer)
        peer.sendall(b"profile=true\n")
        assert ",CameraName=" in peer.recv(4096).decode()
    running.log.wait(r"^Command is \[STATUS include_profile=true\]$", after=before, level=Level.DEBUG)


def test_a_line_kept_from_one_peer_goes_before_the_next_ones(running):
    with running.connect() as first:
        first.sendall(b"STATUS include_")
        wait_read(running, first)
    assert ",CameraName=" in running.command("profile=true").text


@pytest.mark.parametrize("line, text", [("foo", r"^Unknown command \[foo\]$"),
                                        ("status", r"^Unknown command \[status\]$"),
                                        ("XCMD", r"^Unknown command \[XCMD\]$"),
                                        ("ERR something bad", r"^Received error from tunnel \[ERR something bad\]$")])
def test_lines_without_a_reply(running, line, text):
    before = running.log.mark()
    assert STATUS.fullmatch(running.send(line))
    running.log.wait(text, after=before, level=Level.ERROR)


@pytest.mark.parametrize("line", ["X-FOO", "X-PREVIEW refresh_milliseconds=500", "SERVER version=2,server_uuid=X"])
def test_accepted_without_a_reply(running, line):
    running.log.wait(r"^Unable to update cluster information\.$")  # the last error of the start
    before = running.log.mark()
    assert STATUS.fullmatch(running.send(line))
    assert not running.log.lines(after=before, level=Level.ERROR)
    if line.startswith("SERVER"):
        running.log.wait("^Server UUID does not match$", after=before, level=Level.INFO)
