"""The sandbox itself, with a small stand-in for the daemon."""
import os
import signal
import subprocess
import threading
from pathlib import Path

import pytest
from harness.agent import Agent
from harness.waiting import wait_until

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


@pytest.fixture
def stand_in(tmp_path):
    path = tmp_path / "lmxagentd"
    path.write_text(STAND_IN)
    path.chmod(0o755)
    return path


@pytest.fixture
def box(stand_in):
    one = Agent(stand_in)
    yield one
    one.close()


def mounts_below(path):
    return [line for line in Path("/proc/mounts").read_text().splitlines() if str(path) in line]


def test_commands_log_and_tool_go_through(box):
    box.start()
    assert box.command("STATUS").fields["pid"] == str(box.sandbox.pid_inside())
    line = box.log.wait("stand-in started", level=5)
    assert line.facility == 3
    assert box.command("TOOL --submit --recording A --delete").text == "cmdStatus=0"
    assert box.tool_calls()[0]["arguments"] == ["--submit", "--recording", "A", "--delete"]


def test_the_tool_obeys_its_script(box):
    box.start()
    box.movie("A").write_text("movie")
    box.path("/var/lmx/agent/recordings/A.xml").write_text("document")
    box.set_tool({"when": "--submit", "delete": "/var/lmx/agent/recordings", "exit": 3})
    assert box.command("TOOL --submit --recording A --delete").text == "cmdStatus=3"
    assert box.repository() == []
    assert box.command("TOOL --listinfo --server x").text == "cmdStatus=1"
    box.set_tool({"when": "--submit", "hang": True})
    box.path("/var/tool/release").touch()
    assert box.command("TOOL --submit").text == "cmdStatus=0"


def test_a_tool_that_hangs_can_be_released(box):
    box.set_tool({"when": "--submit", "hang": True})
    box.start()
    threading.Timer(0.3, box.release_tool).start()
    reply = box.command("TOOL --submit")
    assert reply.received - reply.sent > 0.2


def test_loopback_is_up(box):
    box.start()
    assert box.command("LOOPBACK").text == "cmdStatus=0"


def test_a_small_file_system_and_a_read_only_one(box):
    box.start(mounts=["tmpfs 4m /var/lmx/agent/recordings", "ro /var/cache"])
    assert box.command("FILL /var/lmx/agent/recordings/x").text == "cmdStatus=28"
    assert box.command("FILL /var/cache/x").text == "cmdStatus=30"
    assert box.repository() == ["x"]


def test_files_survive_a_kill_and_a_restart(box):
    box.start()
    box.movie("A").write_text("movie")
    assert box.kill9() == 128 + signal.SIGKILL
    assert box.repository() == ["A.mov"]
    box.start()
    assert box.stop() == 7


def test_several_at_once_and_nothing_is_left(stand_in):
    boxes = [Agent(stand_in) for _ in range(6)]
    pids = []
    for one in boxes:
        one.start()
        pids.append(one.sandbox.daemon_pid)
    assert len({one.command("STATUS").text for one in boxes}) <= len(boxes)
    bases = [one.sandbox.base for one in boxes]
    for one in boxes:
        one.close()
    wait_until(lambda: not any(Path(f"/proc/{pid}").exists() for pid in pids), what="the end of all processes")
    assert not any(base.exists() or mounts_below(base) for base in bases)


@pytest.mark.skipif(os.geteuid() != 0, reason="is an ordinary user already")
def test_an_ordinary_user_can_run_one(tmp_path):
    home = Path(__file__).resolve().parent
    readable = subprocess.run(["setpriv", "--reuid=65534", "--regid=65534", "--clear-groups", "test", "-r", str(home)])
    if readable.returncode != 0:
        pytest.skip("the tree is not readable for others")
    result = subprocess.run(
        ["setpriv", "--reuid=65534", "--regid=65534", "--clear-groups", "/usr/bin/python3", "-m", "pytest", "-q", "-p",
         "no:cacheprovider", "--basetemp", f"/tmp/lmx-nobody-{os.getpid()}",
         f"{__file__}::test_commands_log_and_tool_go_through"],
        env={"HOME": "/nonexistent", "PATH": os.environ["PATH"], "PYTHONDONTWRITEBYTECODE": "1"}, cwd=home,
        capture_output=True, text=True, timeout=60)
    subprocess.run(["rm", "-rf", f"/tmp/lmx-nobody-{os.getpid()}"])
    assert result.returncode == 0, result.stdout + result.stderr
