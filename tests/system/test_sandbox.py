"""The sandbox itself, with a small stand-in for the daemon."""
import contextlib
import os
import signal
import socket
import subprocess
from pathlib import Path

import pytest
from harness.agent import Agent
from harness.log_reader import DAEMON, Level
from harness.log_socket import log_socket
from harness.temporary import short_directory
from harness.waiting import wait_until

NOBODY = 65534
STAND_IN = '''#!/usr/bin/python3
import os, signal, socket, subprocess, sys
log = socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM)
log.connect("/dev/log")
def say(level, text):
    log.send(f"<{24 + level}>Jan  1 00:00:00 lmxagentd[{os.getpid()}]: {text}".encode())
signal.signal(signal.SIGTERM, lambda *_: sys.exit(7))
path = "/var/run/lmxagentd.comm"
if os.path.exists(path):
    os.unlink(path)
listener = socket.socket(socket.AF_UNIX)
listener.bind(path)
listener.listen(9)
say(5, "stand-in started")
while True:
    peer, _ = listener.accept()
    while data := peer.recv(1024):
        words = data.decode().split()
        if words[0] == "TOOL":
            peer.send(b"cmdStatus=%d" % subprocess.run(["/usr/bin/lumex", *words[1:]]).returncode)
        elif words[0] == "LOOPBACK":
            server = socket.create_server(("127.0.0.1", 8175))
            client = socket.create_connection(("127.0.0.1", 8175))
            peer.send(b"cmdStatus=0")
        elif words[0] == "FILL":
            try:
                open(words[1], "wb").write(bytes(8 << 20))
                peer.send(b"cmdStatus=0")
            except OSError as error:
                peer.send(b"cmdStatus=%d" % error.errno)
        else:
            peer.send(b"cmdStatus=0,pid=%d" % os.getpid())
'''


@pytest.fixture(scope="session")
def registry():
    """The stand-in needs no plugins."""
    return None


@pytest.fixture
def binary(tmp_path):
    path = tmp_path / "lmxagentd"
    path.write_text(STAND_IN)
    path.chmod(0o755)
    return path


def mounts_below(path):
    return [line for line in Path("/proc/mounts").read_text().splitlines() if str(path) in line]


def test_commands_log_and_tool_go_through(agent):
    agent.start()
    assert agent.command("STATUS").fields["pid"] == str(agent.sandbox.pid_inside())
    line = agent.log.wait("stand-in started", level=Level.NOTICE)
    assert line.facility == DAEMON
    assert agent.command("TOOL --submit --recording A --delete").text == "cmdStatus=0"
    assert agent.tool_calls()[0]["arguments"] == ["--submit", "--recording", "A", "--delete"]


@pytest.mark.skipif(os.geteuid() != 0, reason="an ordinary user can not ask for more room")
def test_the_log_keeps_what_its_reader_is_late_for(agent):
    with contextlib.closing(log_socket()) as late, socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as sender:
        late.bind(str(agent.sandbox.root / "dev/log2"))
        sender.connect(late.getsockname())
        sender.setblocking(False)
        for number in range(100):
            sender.send(b"%d" % number)
        assert [late.recv(9) for _ in range(100)] == [b"%d" % number for number in range(100)]


def test_the_tool_obeys_its_script(agent):
    agent.start()
    agent.movie("A").write_text("movie")
    agent.path("/var/lmx/agent/recordings/A.xml").write_text("document")
    agent.set_tool({"when": "--submit", "delete": "/var/lmx/agent/recordings", "exit": 3})
    assert agent.command("TOOL --submit --recording A --delete").text == "cmdStatus=3"
    assert agent.repository() == []
    assert agent.command("TOOL --listinfo --server x").text == "cmdStatus=1"
    agent.set_tool({"when": "--submit", "hang": True})
    agent.path("/var/tool/release").touch()
    assert agent.command("TOOL --submit").text == "cmdStatus=0"


def test_a_tool_that_hangs_can_be_released(agent):
    agent.set_tool({"when": "--submit", "hang": True})
    agent.start()
    with agent.connect() as peer:
        peer.sendall(b"TOOL --submit")
        wait_until(agent.tool_calls, what="the call of the tool")
        assert not agent.tool_calls("end")
        agent.release_tool()
        assert peer.recv(100) == b"cmdStatus=0"


def test_loopback_is_up(agent):
    agent.start()
    assert agent.command("LOOPBACK").text == "cmdStatus=0"


def test_a_small_file_system_and_a_read_only_one(agent):
    agent.start(mounts=["tmpfs 4m /var/lmx/agent/recordings", "ro /var/cache"])
    assert agent.command("FILL /var/lmx/agent/recordings/x").text == "cmdStatus=28"
    assert agent.command("FILL /var/cache/x").text == "cmdStatus=30"
    assert agent.repository() == ["x"]


def test_files_survive_a_kill_and_a_restart(agent):
    agent.start()
    agent.movie("A").write_text("movie")
    assert agent.kill9() == 128 + signal.SIGKILL
    assert agent.repository() == ["A.mov"]
    agent.start()
    assert agent.stop() == 7


def test_several_at_once_and_nothing_is_left(binary):
    with contextlib.ExitStack() as stack:
        boxes = [stack.enter_context(contextlib.closing(Agent(binary))).start() for _ in range(6)]
        pids = [one.sandbox.daemon_pid for one in boxes]
        bases = [one.sandbox.base for one in boxes]
        assert len(set(pids)) == len(boxes) and all(one.command("STATUS").text for one in boxes)
    wait_until(lambda: not any(Path(f"/proc/{pid}").exists() for pid in pids), what="the end of all processes")
    assert not any(base.exists() or mounts_below(base) for base in bases)


@pytest.mark.skipif(os.geteuid() != 0, reason="is an ordinary user already")
def test_an_ordinary_user_can_run_one():
    home = Path(__file__).resolve().parent
    as_nobody = ["setpriv", f"--reuid={NOBODY}", f"--regid={NOBODY}", "--clear-groups"]
    if subprocess.run([*as_nobody, "test", "-r", str(home)]).returncode != 0:
        pytest.skip("the tree is not readable for others")
    with short_directory() as place:
        os.chown(place, NOBODY, NOBODY)
        result = subprocess.run(
            [*as_nobody, "/usr/bin/python3", "-m", "pytest", "-q", "-p", "no:cacheprovider", "--basetemp",
             f"{place}/pytest", f"{__file__}::test_commands_log_and_tool_go_through"],
            env={"HOME": "/nonexistent", "PATH": os.environ["PATH"], "PYTHONDONTWRITEBYTECODE": "1"}, cwd=home,
            capture_output=True, text=True, timeout=60)
    assert result.returncode == 0, result.stdout + result.stderr
