"""A minute of everything at once: recordings, pauses, cancels, status, preference changes, the tunnel, timed
commands, a slow tool.

With the daemon built for ThreadSanitizer where there is one; a complaint of the sanitizer fails the test.
"""
import itertools
import random
import threading
import time
from pathlib import Path

import pytest
from conftest import BINARY, ROOT, SANITIZER
from harness import movie
from harness.agent import SECRET, Agent
from harness.tunnel_server import TunnelServer

TSAN_BINARY = ROOT / "build/tsan/lmxagentd"
SECONDS = 60


def operator(agent, end, outcome):
    """Makes recordings, one after another, until `end`."""
    dice = random.Random(4)
    for number in itertools.count():
        if time.monotonic() > end:
            return
        uuid = f"R{number}"
        assert agent.start_recording(uuid).text == "cmdStatus=0"
        time.sleep(dice.uniform(0.5, 2.0))
        for command in ("PAUSE", "RESUME") if dice.random() < 0.5 else ():
            assert agent.command(command).text == "cmdStatus=0"
            time.sleep(dice.uniform(0.1, 0.5))
        last = "CANCEL" if dice.random() < 0.25 else "STOP"
        assert agent.command(last).text == "cmdStatus=0"
        outcome.append((uuid, last))
        while agent.command("STATUS").fields["recordStatus"] != "0":
            assert time.monotonic() < end + 30
            time.sleep(0.1)


def watcher(agent, end, replies):
    """Asks for the status all the time, on a fresh connection each."""
    while time.monotonic() < end:
        replies.append(agent.command("STATUS include_profile=true", timeout=30).fields["cmdStatus"])
        time.sleep(0.02)


def administrator(agent, end):
    """Replaces the preferences every second."""
    for number in itertools.count():
        if time.monotonic() > end:
            return
        agent.preferences(CameraName=f"Hall {number}")
        time.sleep(1)


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
        when = time.strftime("%Y-%m-%d %H:%M:%S +0000", time.gmtime(time.time() + 2))
        server.send(f"TIMEDCMD command=SERVER,version=2,server_uuid=5E1F0A52-6B1D-4E8C-9A52-0F6C4C1B7E11,time={when}")
        assert server.reply() == "cmdStatus=0"
        time.sleep(0.1)


@pytest.mark.limit(240)
@pytest.mark.parametrize("kind", ["plain", "tsan"])
def test_everything_at_once(registry, kind):
    binary = BINARY if kind == "plain" else TSAN_BINARY
    if not binary.exists() and kind == "tsan":
        pytest.skip("no daemon built with ThreadSanitizer")
    agent = Agent(binary, registry)
    try:
        run_everything(agent, SECONDS if kind == "tsan" else SECONDS / 3)
    except BaseException:
        print(agent.report())
        raise
    finally:
        errors = agent.errors()
        agent.close()
    assert not SANITIZER.search(errors), errors


def run_everything(agent, seconds):
    suppressions = agent.path("/var/tsan.supp")
    suppressions.write_bytes(Path(ROOT / "tests/tsan.supp").read_bytes())
    agent.set_tool({"when": "--submit", "delay": 0.5})
    agent.start(env={"TSAN_OPTIONS": "suppressions=/var/tsan.supp history_size=4"})
    end, outcome, replies, failures = time.monotonic() + seconds, [], [], []

    def guarded(work, *arguments):
        try:
            work(agent, end, *arguments)
        except BaseException as failure:  # told by the main thread
            failures.append(failure)

    server = TunnelServer(agent, SECRET)
    threads = [threading.Thread(target=guarded, args=arguments)
               for arguments in ((operator, outcome), (watcher, replies), (administrator,), (headquarters, server))]
    for thread in threads:
        thread.start()
    for thread in threads:
        thread.join(seconds + 60)
    assert not failures, failures
    assert set(replies) == {"0"} and len(replies) > seconds
    stopped = [uuid for uuid, last in outcome if last == "STOP"]
    for uuid in stopped:
        agent.wait_tool_call(uuid, 90, "end")
        movie.decodes(agent.movie(uuid))
    assert [call["arguments"][4] for call in agent.tool_calls()] == stopped
    assert not [name for name in agent.repository() if any(name.startswith(u + ".") for u, l in outcome if l == "CANCEL")]
    assert agent.stop(timeout=40) == 0
    server.close()
