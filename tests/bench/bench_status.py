"""status: round trips of STATUS over the local socket."""
import os
import subprocess

from ground import recording
from harness.waiting import wait_until
from measuring import median, percentile, threads
from peers import built
from report import Result, Row

BLOCK = 100
PEER = "echo server in C"


def placements():
    """{name: (core of the client, core of the server)}. The scheduler puts both on one core in one run and on two in
    the next, which alone makes a factor of several: so they are put where they shall be."""
    cores = sorted(os.sched_getaffinity(0))
    found = {"same core": (cores[0], cores[0])}
    if len(cores) > 1:
        found["two cores"] = (cores[1], cores[0])
    return found


class Trips:
    """Round trips to the daemon and to the echo server, in turns of a hundred through the same client."""

    def __init__(self, ground, agent, echo, echo_path, program):
        self.blocks = ground.pick(10, 2, 1)
        self.program = program
        self.paths = {"ours": agent.sandbox.root / "var/run/lmxagentd.comm", "peer": echo_path}
        self.servers = {"ours": self._answering_thread(agent.sandbox.daemon_pid), "peer": echo.pid}

    def _answering_thread(self, pid):
        """The daemon's thread that answers on the local socket: the one that requests wake up."""
        before = threads(pid)
        self.microseconds("ask", "ours", BLOCK)
        woken = {thread: switches - before[thread][2] for thread, (_, _, switches) in threads(pid).items()
                 if thread in before}
        return max(woken, key=woken.get)

    def microseconds(self, mode, server, count, core=None):
        place = ["taskset", "-c", str(core)] if core is not None else []
        out = subprocess.run([*place, str(self.program), mode, str(self.paths[server]), str(count), "STATUS"],
                             capture_output=True, text=True, timeout=60, check=False)
        assert out.returncode == 0, out.stderr
        return [int(line) / 1000 for line in out.stdout.split()]

    def take(self, mode, client, server):
        for thread in self.servers.values():
            os.sched_setaffinity(thread, {server})
        taken = {"ours": [], "peer": []}
        for turn in range(self.blocks):
            for name in ("ours", "peer") if turn % 2 == 0 else ("peer", "ours"):
                taken[name] += self.microseconds(mode, name, BLOCK, client)
        return taken

    def rows(self, mode, state, place):
        taken = self.take(mode, *placements()[place])
        what = {"ask": "STATUS", "connect": "connect + STATUS"}[mode] + f", {state}, {place}"
        goal = 2 if mode == "ask" else None
        middle = {name: median(values) for name, values in taken.items()}
        late = {name: percentile(values, 0.99) for name, values in taken.items()}
        return [Row(f"{what}: median", middle["ours"], "µs", middle["peer"], PEER, ratio_goal=goal),
                Row(f"{what}: 99 %", late["ours"], "µs", late["peer"], PEER, limit=1000 if goal else None)]


def status(ground):
    """STATUS round trip on the local socket, idle and while recording, against an echo server with the same client."""
    program = built("roundtrip")
    echo_path = ground.folder / "echo.socket"
    with subprocess.Popen([str(program), "serve", str(echo_path)]) as echo:
        try:
            wait_until(echo_path.exists, 5, "the echo server")
            with ground.agent(RecordingVideoInput="test://video?size=1280x720") as agent:
                trips = Trips(ground, agent, echo, echo_path, program)
                rows = [row for place in placements() for row in trips.rows("ask", "idle", place)]
                rows += trips.rows("connect", "idle", list(placements())[-1])
                with recording(agent, "STATUS"):
                    rows += [row for place in placements() for row in trips.rows("ask", "recording", place)]
                lost = agent.log.lines("messages lost")
        finally:
            echo.terminate()
    count = trips.blocks * BLOCK
    return Result(rows, [
        f"{count} requests each, back to back, in turns of {BLOCK} with the peer; client and echo server are one C "
        "program, built with the tests. STATUS: all requests of a turn on one connection. connect + STATUS: a "
        "connection each.",
        "same core, two cores: where the client and the thread that answers are put; everything else runs where it "
        "likes. With two, how fast an idle core wakes up is in every figure.",
        "recording: 1280x720 with sound; the echo server is measured beside the same recording.",
        "the daemon writes two messages a request to the system log (three while it records, two more a connection), "
        f"read by the benchmark; {len(lost)} notices of lost messages."])
