"""A day in the lecture hall, compressed into a minute: what is left at its end must match a model's prediction."""
import contextlib
import time
from dataclasses import dataclass, field

import pytest
from harness import movie
from harness.commands import start_parameters, timed_line
from harness.tunnel_tool import TunnelTool
from harness.waiting import let_pass, wait_until


@dataclass
class Model:
    """Predicts which recordings are submitted and which are recovered."""

    submitted: list = field(default_factory=list)
    recovered: list = field(default_factory=list)
    open: list = field(default_factory=list)  # the requests of the capture that runs, the last one counts
    disk_is_full: bool = False

    def start(self, uuid):
        if self.open:
            self.open.append(uuid)  # refused, but the request is now this one; the capture goes on
        elif not self.disk_is_full:
            self.open = [uuid]

    def stop(self):
        if self.open:
            self.submitted.append(self.open[-1])
            self.recovered += self.open[:-1]
        self.open = []

    def kill(self):
        self.recovered += self.open
        self.open = []


class Day:
    """Schedules the lectures and keeps the model in step with what happens."""

    def __init__(self, agent):
        self.agent, self.server = agent, TunnelTool(agent.prepare())
        self.agent.start()
        self.server.accept()
        self.begin = int(time.time()) + 3
        self.model = Model()
        self.events = []  # (second, what the model is told)

    def timed(self, command, second, **parameters):
        assert self.server.command(timed_line(command, self.begin + second, **parameters)) == "cmdStatus=0"

    def lecture(self, uuid, start, stop, revoked=False):
        self.timed("START", start, TimerID=f"start {uuid}", **start_parameters(uuid))
        self.timed("STOP", stop, TimerID=f"stop {uuid}")
        if revoked:
            assert self.server.command(f"TIMEDCMD command=TIMERREVOKE,TimerID=start {uuid}") == "cmdStatus=0"
        else:
            self.events.append((start, lambda: self.model.start(uuid)))
        self.events.append((stop, self.model.stop))

    def until(self, second):
        """Waits until `second`, which lies between two events, and tells the model what has happened."""
        let_pass(max(0.0, self.begin + second - time.time()), "the day goes by the wall clock")
        for event in sorted((e for e in self.events if e[0] < second), key=lambda e: e[0]):
            event[1]()
        self.events = [event for event in self.events if event[0] >= second]

    def wait_submitted(self):
        for uuid in self.model.submitted:
            self.agent.wait_tool_call(uuid, event="end")

    def restart(self, end):
        self.wait_submitted()  # a job that still waits is lost with the daemon
        end()
        self.server.close()
        self.server = TunnelTool(self.agent.prepare())
        self.agent.start()
        self.server.accept()

    def close(self):
        self.server.close()


@pytest.mark.slow
@pytest.mark.limit(180)
def test_a_scripted_day(agent):
    agent.preferences(RecordingDiskSpaceCutoffInMB="50")
    with contextlib.closing(Day(agent)) as day:
        live_through(day, agent)
    assert_left_behind(agent, day.model)


def live_through(day, agent):
    day.lecture("L1", 0, 2)
    day.lecture("L2", 4, 6)
    day.lecture("L3", 8, 13)
    day.lecture("L4", 10, 12)  # overlaps with the one before, whose STOP comes to an idle agent
    day.lecture("L5", 14, 16, revoked=True)
    day.lecture("L6", 22, 24)
    day.lecture("L7", 28, 32)
    day.lecture("L8", 36, 38)
    day.lecture("L9", 42, 44)
    day.lecture("L10", 46, 48)
    day.lecture("L11", 50, 52)
    day.timed("STATUS", 7200, TimerID="tomorrow")

    day.until(18.5)
    day.restart(lambda: agent.stop())  # an update, between two lectures
    day.until(30.5)
    day.restart(lambda: agent.kill9())  # a power cut, in the middle of one
    day.model.kill()
    day.until(34.5)
    # A shortage by a moved threshold: a small file system of the sandbox's would not survive its restarts.
    agent.preferences(RecordingDiskSpaceCutoffInMB="2000000000")
    day.model.disk_is_full = True
    day.until(39.5)
    agent.preferences(RecordingDiskSpaceCutoffInMB="50")
    day.model.disk_is_full = False
    day.until(40.5)
    day.server.close()  # the server is away for a while; the lectures go on
    day.until(53.5)
    day.wait_submitted()


def assert_left_behind(agent, model):
    assert model.submitted == ["L1", "L2", "L4", "L6", "L9", "L10", "L11"] and model.recovered == ["L3", "L7"]
    assert agent.submitted("end") == model.submitted
    expected = sorted(f"{uuid}.{kind}" for uuid in model.submitted + model.recovered for kind in ("mov", "xml"))
    wait_until(lambda: agent.repository() == expected, 15, f"{expected}, not {agent.repository()}")
    for uuid in model.submitted + model.recovered:
        movie.decodes(agent.movie(uuid))
        duration = movie.streams(agent.movie(uuid))["video"].duration
        expected_duration = {"L3": 4.0, "L4": 2.0, "L7": 2.5}.get(uuid, 2.0)
        assert abs(duration - expected_duration) < 1.2, (uuid, duration)
        assert agent.document(uuid)["RecordingMetadata_RECORDING_UUID"] == uuid
    assert [entry["TimerID"] for entry in agent.timers()] == ["tomorrow"]
