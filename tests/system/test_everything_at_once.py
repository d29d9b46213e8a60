"""Everything at once, for a while: recordings, pauses, cancels, status, preference changes, the tunnel, timed
commands, a slow tool.

With the daemon built for ThreadSanitizer where there is one; a complaint of the sanitizer fails the test.
"""
import itertools
import random
import threading
import time
from pathlib import Path

import pytest
from conftest import BINARY, ROOT
from harness import movie
from harness.agent import SERVER_UUID
from harness.commands import timed_line
from harness.tunnel_server import TunnelServer
from harness.waiting import let_pass

TSAN_BINARY = ROOT / "build/tsan/lmxagentd"
PATIENCE = 60  # seconds that the threads may take to finish


@pytest.fixture(params=["plain", "tsan"])
def binary(request):
    if request.param == "tsan" and not TSAN_BINARY.exists():
        pytest.skip("no daemon built with ThreadSanitizer")
    return BINARY if request.param == "plain" else TSAN_BINARY


def operator(agent, end, outcome):
    """Makes recordings, one after another, until `end`."""
    dice = random.Random(4)
    for number in itertools.count():
        if time.monotonic() > end:
            return
        uuid = f"R{number}"
        assert agent.start_recording(uuid).text == "cmdStatus=0"
        let_pass(dice.uniform(0.5, 2.0), "an operator takes his time")
        for command in ("PAUSE", "RESUME") if dice.random() < 0.5 else ():
            assert agent.command(command).text == "cmdStatus=0"
            let_pass(dice.uniform(0.1, 0.5), "an operator takes his time")
        last = "CANCEL" if dice.random() < 0.25 else "STOP"
        assert agent.command(last).text == "cmdStatus=0"
        outcome.append((uuid, last))
        agent.wait_idle()


def watcher(agent, end, replies):
    """Asks for the status all the time, on a fresh connection each."""
    while time.monotonic() < end:
        replies.append(agent.command("STATUS include_profile=true", timeout=30).fields["cmdStatus"])
        let_pass(0.02, "fifty questions a second are enough")


def administrator(agent, end):
    """Replaces the preferences every second."""
    for number in itertools.count():
        if time.monotonic() > end:
            return
        agent.preferences(CameraName=f"Hall {number}")
        let_pass(1, "one change a second")


def headquarters(agent, end, server):
    """Drives the tunnel: status, timed commands, and now and then a new connection."""
    for number in itertools.count():
        if time.monotonic() > end:
            return
        if number % 20 == 0:
            if server.peer:
                server.hang_up()
            server.accept(40)
        status = server.command("STATUS include_profile=true")
        assert status.startswith("cmdStatus=0,recordStatus="), status
        later = timed_line("SERVER", time.time() + 2, version=2, server_uuid=SERVER_UUID)
        assert server.command(later) == "cmdStatus=0"
        let_pass(0.1, "ten rounds a second are enough")


@pytest.mark.slow
@pytest.mark.limit(240)
def test_everything_at_once(agent, binary, request):
    seconds = 60 if binary == TSAN_BINARY else 20
    suppressions = agent.path("/var/tsan.supp")
    suppressions.write_bytes(Path(ROOT / "tests/tsan.supp").read_bytes())
    agent.set_tool({"when": "--submit", "delay": 0.5})
    agent.start(env={"TSAN_OPTIONS": "suppressions=/var/tsan.supp history_size=4"})
    end, outcome, replies, failures = time.monotonic() + seconds, [], [], []

    def guarded(work, *arguments):
        try:
            work(agent, end, *arguments)
        except BaseException as failure:  # the main thread reports it
            failures.append(failure)

    server = TunnelServer(agent)
    request.addfinalizer(server.close)
    threads = [threading.Thread(target=guarded, args=arguments)
               for arguments in ((operator, outcome), (watcher, replies), (administrator,), (headquarters, server))]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join(seconds + PATIENCE)
    assert not failures, failures
    assert not any(thread.is_alive() for thread in threads), "somebody still waits for the agent"
    assert set(replies) == {"0"} and len(replies) > seconds, "a reply a second, whatever else happens"
    stopped = [uuid for uuid, last in outcome if last == "STOP"]
    for uuid in stopped:
        agent.wait_tool_call(uuid, 90, "end")
        movie.decodes(agent.movie(uuid))
    assert agent.submitted() == stopped
    cancelled = [uuid for uuid, last in outcome if last == "CANCEL"]
    assert not [name for name in agent.repository() if name.split(".")[0] in cancelled]
    assert agent.stop(timeout=40) == 0
