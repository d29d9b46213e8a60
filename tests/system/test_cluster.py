"""Cluster members: queried with the tool, read from the cache, tried in turn."""
import plistlib
import time

import pytest
from harness.log_reader import Level
from harness.tunnel_server import in_network_of
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
