"""status: round trips of STATUS over the local socket."""
import subprocess

from ground import recording
from harness.waiting import wait_until
from measuring import median, percentile
from peers import compile_roundtrip
from report import Result, Row

BLOCK = 100


def microseconds(program, mode, path, count):
    out = subprocess.run([str(program), mode, str(path), str(count), "STATUS"], capture_output=True, text=True,
                         timeout=60, check=False)
    assert out.returncode == 0, out.stderr
    return [int(line) / 1000 for line in out.stdout.split()]


class Trips:
    """Round trips to the daemon and to the echo server, in turns of a hundred through the same client."""

    def __init__(self, ground, agent, echo_path, program):
        self.blocks = 2 if ground.quick else 10
        self.program = program
        self.paths = {"ours": agent.sandbox.root / "var/run/lmxagentd.comm", "peer": echo_path}

    def take(self, mode):
        taken = {"ours": [], "peer": []}
        for turn in range(self.blocks):
            for name in ("ours", "peer") if turn % 2 == 0 else ("peer", "ours"):
                taken[name] += microseconds(self.program, mode, self.paths[name], BLOCK)
        return taken

    def rows(self, mode, state):
        taken = self.take(mode)
        what = {"ask": "STATUS", "connect": "connect + STATUS"}[mode]
        goal = 2 if mode == "ask" else None
        peer = "echo server in C"
        middle = {name: median(values) for name, values in taken.items()}
        late = {name: percentile(values, 0.99) for name, values in taken.items()}
        return [Row(f"{what}, {state}: median", middle["ours"], "µs", middle["peer"], peer, ratio_goal=goal),
                Row(f"{what}, {state}: 99 %", late["ours"], "µs", late["peer"], peer, limit=1000 if goal else None)]


def status(ground):
    """STATUS round trip on the local socket, idle and while recording, against an echo server with the same client."""
    program = compile_roundtrip(ground.folder)
    echo_path = ground.folder / "echo.socket"
    with subprocess.Popen([str(program), "serve", str(echo_path)]) as echo:
        try:
            wait_until(echo_path.exists, 5, "the echo server")
            with ground.agent(RecordingVideoInput="test://video?size=1280x720") as agent:
                trips = Trips(ground, agent, echo_path, program)
                rows = trips.rows("ask", "idle") + trips.rows("connect", "idle")
                with recording(agent, "STATUS"):
                    rows += trips.rows("ask", "recording") + trips.rows("connect", "recording")
                lost = agent.log.lines("messages lost")
        finally:
            echo.terminate()
    count = trips.blocks * BLOCK
    return Result(rows, [
        f"{count} requests each, back to back, in turns of {BLOCK} with the peer; client and echo server are one C "
        "program, compiled for this run. STATUS: all requests of a turn on one connection. connect + STATUS: a "
        "connection each.",
        "recording: 1280x720 with sound; the echo server is measured beside the same recording.",
        f"the daemon writes two messages a request to the system log (three more a connection), read by the benchmark; "
        f"{len(lost)} notices of lost messages."])
