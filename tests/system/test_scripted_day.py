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
    running: str = ""
    disk_is_full: bool = False

    def start(self, uuid):
        if not self.running and not self.disk_is_full:  # else it is refused, and changes nothing
            self.running = uuid

    def stop(self):
        if self.running:
            self.submitted.append(self.running)
        self.running = ""

    def kill(self):
        if self.running:
            self.recovered.append(self.running)
        self.running = ""


class Day:
    """Schedules the lectures and keeps the model in step with what happens."""

    STOPS, STARTS = range(2)  # of one second, in this order

    def __init__(self, agent):
        self.agent, self.server = agent, TunnelTool(agent.prepare())
        self.agent.start()
        self.server.accept()
        self.begin = int(time.time()) + 3
        self.model = Model()
        self.events = []  # (second, STOPS or STARTS, what the model is told)

    def timed(self, command, second, **parameters):
        assert self.server.command(timed_line(command, self.begin + second, **parameters)) == "cmdStatus=0"

    def lecture(self, uuid, start, stop, revoked=False):
        self.timed("START", start, TimerID=f"start {uuid}", **start_parameters(uuid))
        self.timed("STOP", stop, TimerID=f"stop {uuid}")
        if revoked:
            assert self.server.command(f"TIMEDCMD command=TIMERREVOKE,TimerID=start {uuid}") == "cmdStatus=0"
        else:
            self.events.append((start, self.STARTS, lambda: self.model.start(uuid)))
        self.events.append((stop, self.STOPS, self.model.stop))

    def until(self, second):
        """Waits until `second`, which lies between two events, and tells the model what has happened."""
        let_pass(max(0.0, self.begin + second - time.time()), "the day goes by the wall clock")
        for event in sorted((e for e in self.events if e[0] < second), key=lambda e: e[:2]):
            event[2]()
        self.events = [event for event in self.events if event[0] >= second]

    def restart(self, end):
        """@return the second at which the daemon was told to end"""
        second = time.time() - self.begin
        end()
        self.server.close()
        self.agent.set_tool()
        self.server = TunnelTool(self.agent.prepare())
        self.agent.start()
        self.server.accept()
        return second

    def close(self):
        self.server.close()


@pytest.mark.slow
@pytest.mark.limit(180)
def test_a_scripted_day(agent):
    agent.preferences(RecordingDiskSpaceCutoffInMB="50")
    with contextlib.closing(Day(agent)) as day:
        lengths = live_through(day, agent)
    assert_left_behind(agent, day.model, lengths)


def plan(day):
    day.lecture("L1", 0, 2)
    day.lecture("L3", 4, 9)  # its START is sent before the STOP of L2, which is due in the same second
    day.lecture("L2", 2, 4)
    day.lecture("L4", 6, 8)  # within the one before: refused, but its STOP ends that one
    day.lecture("L5", 10, 12, revoked=True)
    day.lecture("L6", 10, 12)
    day.lecture("L7", 12, 14)
    day.lecture("L8", 24, 26)
    day.lecture("L9", 26, 34)
    day.lecture("L10", 38, 40)
    day.lecture("L11", 44, 46)
    day.lecture("L12", 46, 48)
    day.lecture("L13", 48, 50)
    day.timed("STATUS", 7200, TimerID="tomorrow")


def live_through(day, agent):
    """@return how long the recordings must be that don't have two seconds"""
    agent.set_tool({"when": "L6", "hang": True})
    plan(day)
    day.until(14.5)
    agent.wait_tool_call("L6")
    day.until(18.5)
    assert day.restart(agent.stop) < 22  # an update, while one submission hangs and another waits
    day.until(27.5)
    agent.wait_tool_call("L8", event="end")
    killed = day.restart(agent.kill9)  # a power cut, in the middle of L9
    day.model.kill()
    day.until(36.5)
    # A shortage by a moved threshold: a small file system of the sandbox's would not survive its restarts.
    agent.preferences(RecordingDiskSpaceCutoffInMB="2000000000")
    day.model.disk_is_full = True
    day.until(41.5)
    agent.preferences(RecordingDiskSpaceCutoffInMB="50")
    day.model.disk_is_full = False
    day.until(42.5)
    day.server.close()  # the server is away for a while; the lectures go on
    day.until(50.5)
    agent.wait_tool_call("L13", event="end")
    return {"L3": 4.0, "L9": killed - 26}


def assert_left_behind(agent, model, lengths):
    assert model.submitted == ["L1", "L2", "L3", "L6", "L7", "L8", "L11", "L12", "L13"] and model.recovered == ["L9"]
    assert agent.submitted() == model.submitted
    expected = sorted(f"{uuid}.{kind}" for uuid in model.submitted + model.recovered for kind in ("mov", "xml"))
    wait_until(lambda: agent.repository() == expected, 15, f"{expected}, not {agent.repository()}")
    for uuid in model.submitted + model.recovered:
        movie.decodes(agent.movie(uuid))
        assert len(movie.runs(movie.counters(agent.movie(uuid)))) == 1
        duration = movie.streams(agent.movie(uuid))["video"].duration
        assert abs(duration - lengths.get(uuid, 2.0)) < 1.2, (uuid, duration)
        assert agent.document(uuid)["RecordingMetadata_RECORDING_UUID"] == uuid
    assert [entry["TimerID"] for entry in agent.timers()] == ["tomorrow"]
