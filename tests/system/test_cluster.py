"""Cluster members: queried with the tool, read from the cache, tried in turn."""
import plistlib
import signal
import time

import pytest
from harness.log_reader import Level
from harness.tunnel_server import TunnelServer, in_network_of
from harness.waiting import wait_until

CACHE = "/var/lmx/agent/com.zandor.lmxserverinfo.plist"


def members(*hosts):
    return {str(i): {"tunnel_agent_host": host, "tunnel_agent_port": port} for i, (host, port) in enumerate(hosts)}


def greeting(agent, host, port):
    """Starts the agent. @return what it says first to a member that listens there"""
    with in_network_of(agent.prepare(), host, port) as listener:
        agent.start()
        listener.settimeout(20)
        peer, _ = listener.accept()
        with peer:
            peer.settimeout(20)
            return peer.recv(4096)


def test_cluster_members_are_tried_in_turn(agent):
    answer = plistlib.dumps({"cluster_members": members(("127.0.0.1", 9), ("127.0.0.1", "9001"))}).decode()
    agent.set_tool({"when": "--listinfo", "print": answer})
    agent.preferences(TunnelHost="unreachable.invalid")
    assert greeting(agent, "127.0.0.1", 9001).startswith(b"AGENT protocol=1,")
    agent.log.wait("^Hosts: 127.0.0.1:9, 127.0.0.1:9001$", level=Level.DEBUG)


@pytest.mark.parametrize("form", [plistlib.FMT_XML, plistlib.FMT_BINARY])
def test_long_answers_in_both_forms(agent, form):
    information = {"cluster_members": members(("127.0.0.1", "9001")), "notes": [f"{i:080}" for i in range(2500)]}
    answer = plistlib.dumps(information, fmt=form)
    assert len(answer) > 3 * 65536, "more than a pipe holds"
    agent.set_tool({"when": "--listinfo", "print_hex": answer.hex()})
    agent.start()
    agent.log.wait("^Hosts: 127.0.0.1:9001$", level=Level.DEBUG)


@pytest.mark.slow
def test_the_start_waits_half_a_minute_for_the_tool_at_most(agent):
    cache = agent.path(CACHE)
    cache.write_bytes(plistlib.dumps({"cluster_members": members(("127.0.0.1", "1"), ("127.0.0.1", "2"))}))
    agent.set_tool({"when": "--listinfo", "hang": True})
    begin = time.monotonic()
    agent.start(wait=False)
    agent.log.wait("^/usr/bin/lumex --listinfo has not answered for 20 seconds and was ended$", timeout=40)
    agent.wait_started(40)
    assert 28 < time.monotonic() - begin < 45
    agent.log.wait("^Hosts: 127.0.0.1:1, 127.0.0.1:2$", level=Level.DEBUG)


@pytest.mark.parametrize("number, text", [(signal.SIGTERM, r"^Got Termination Signal \(SIGTERM\)$"),
                                          (signal.SIGINT, r"^Got Stop Signal \(SIGINT\)$")])
def test_the_question_at_the_start_does_not_hold_up_the_end(agent, number, text):
    agent.set_tool({"when": "--listinfo", "hang": True})
    agent.start(wait=False)
    wait_until(lambda: agent.tool_calls(having="--listinfo"), 20, "the question")
    begin = time.monotonic()
    assert agent.stop(number) == 0
    assert time.monotonic() - begin < 8, "nobody waits for the tool"
    agent.log.wait(text, level=Level.DEBUG)
    lines = [line.text for line in agent.log.lines()]
    assert lines.index("lmxagentd is stopping...") < lines.index("lmxagentd stopped")
    assert not agent.log.lines("cluster|Internal error|No cluster members")
    assert not agent.path("/var/run/lmxagentd.pid").exists()
    assert not agent.tool_calls("end")


def test_a_hang_up_during_the_question_at_the_start_does_no_harm(agent):
    agent.set_tool({"when": "--listinfo", "hang": True})
    with TunnelServer(agent.prepare()) as server:
        agent.start(wait=False)
        wait_until(lambda: agent.tool_calls(having="--listinfo"), 20, "the question")
        agent.sandbox.signal(signal.SIGHUP)
        agent.log.wait("^Process shutDownControl$", level=Level.DEBUG)
        agent.release_tool()
        server.accept()
        mark = agent.log.mark()
        agent.log.wait("^Using Video Device Named: ", timeout=30, after=mark, level=Level.DEBUG)  # the camera retry
        assert server.command("STATUS").startswith("cmdStatus=0,recordStatus=0,"), "the tunnel is the same one"
        assert len(agent.log.lines("^Sent: AGENT")) == 1


def test_a_v6_member(agent):
    answer = plistlib.dumps({"cluster_members": members(("::1", "9001"))}, fmt=plistlib.FMT_XML).decode()
    agent.set_tool({"when": "--listinfo", "print": answer})
    assert greeting(agent, "::1", 9001).startswith(b"AGENT ")


def test_a_tool_that_hangs_holds_up_nothing_after_the_start(agent):
    agent.set_tool({"when": "--listinfo", "after": 1, "hang": True})
    agent.start()
    wait_until(lambda: len(agent.tool_calls(having="--listinfo")) == 2, 10, "the second question to the cluster")
    agent.record("A")
    assert len(agent.tool_calls("end", having="--listinfo")) == 1


def test_the_cache_is_used_when_the_tool_fails(agent):
    cache = agent.path(CACHE)
    cache.write_bytes(plistlib.dumps({"cluster_members": members(("127.0.0.1", "9001"))}))
    agent.set_tool({"when": "--listinfo", "exit": 3})
    agent.start()
    agent.log.wait(r"^Unable to retrieve cluster information \(/usr/bin/lumex exit code = 3\)\.$", level=Level.ERROR)
    agent.log.wait("^Unable to retrieve cluster information$", level=Level.CRITICAL)
    agent.log.wait("^Unable to contact any member of the cluster\\.$", level=Level.DEBUG)
    agent.log.wait("^Hosts: 127.0.0.1:9001$", level=Level.DEBUG)
