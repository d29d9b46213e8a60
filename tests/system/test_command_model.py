"""Random sequences of commands from several channels at once, with signals and mishaps, against a model.

Each failure prints its seed; LMX_SEED=<seed> LMX_SEQUENCES=1 plays that sequence again, LMX_SHRINK=1 looks for its
shortest beginning that fails. LMX_SEQUENCES says how many sequences there are in all, LMX_SHARDS in how many tests,
LMX_ENOUGH after how many failures to stop, LMX_THEME that all are of one kind (see harness/command_sequences.py).
"""
import contextlib
import os
import random
import re
import threading
import time
import traceback

import pytest
from harness import command_outcome
from harness.agent import Agent
from harness.command_cells import arrivals, cells_hit, cells_impossible, cells_missed, refused_for_room
from harness.command_hall import CLOCK, Hall
from harness.command_model import PROCESS_ENDS, State, direct_complaints, explain
from harness.command_sequences import sequence

COUNT = int(os.environ.get("LMX_SEQUENCES", "24"))
SHARDS = min(int(os.environ.get("LMX_SHARDS", "2")), COUNT)
RUN = os.environ.get("PYTEST_XDIST_TESTRUNUID", str(os.getpid()) + str(time.time()))  # the same in all workers
SEED = int(os.environ.get("LMX_SEED") or random.Random(RUN).randrange(10**6))
THEME = os.environ.get("LMX_THEME")
BATCH = 20  # sequences between two looks at what is left
ENOUGH = int(os.environ.get("LMX_ENOUGH", "5"))  # failures, and no more sequences are played


def play(hall, script):
    """Plays one sequence. @return its record"""
    if script.theme == "aimed" or script.kills():  # a kill is not to meet what the sequence before has stopped
        hall.wait_still()
    hall.begin_sequence(str(script.seed))
    hall.agent.set_tool({"when": "--submit", "delay": script.tool_delay})
    begun, failures = time.time(), []

    def run(lane):
        try:
            for event in lane:
                hall.step(event)
        except BaseException as failure:  # the main thread reports it
            traceback.print_exception(failure)
            failures.append(failure)

    lanes = [threading.Thread(target=run, args=(lane,)) for lane in script.lanes]
    for lane in lanes:
        lane.start()
    for lane in lanes:
        lane.join()
    with contextlib.suppress(AssertionError if failures else ()):
        hall.wait_timed()
    hall.make_room()
    if script.loses_camera():
        hall.end_of_loss(begun)
    hall.command(script.last, "local")
    hall.expect_alive()
    complaints = [*hall.complaints, *(f"{type(failure).__name__}: {failure}" for failure in failures)]
    return Record(script, list(hall.operations), complaints, (begun, time.time()))


class Record:
    """What was done in one sequence, and what is wrong with it."""

    def __init__(self, script, operations, complaints, times):
        self.script, self.operations, self.complaints = script, operations, complaints
        self.begun, self.ended = times
        self.explanation = None

    def owns(self, line):
        """Whether the log line is about this sequence: it names its recording, or no recording, in its time."""
        named = re.search(r"/(\d+)-\d+\.", line.text)
        return int(named[1]) == self.script.seed if named else self.begun <= line.at + CLOCK <= self.ended

    def check(self, agent, left, state):
        """Compares with the model. @return the state in which the next sequence begins"""
        lines = [line for line in agent.log.lines() if self.owns(line)]
        verbs = {op.verb for op in self.operations}
        self.complaints += [f"in the log: {line.text}" for line in command_outcome.bad_lines(lines, verbs)]
        self.complaints += direct_complaints(self.operations, left)
        self.explanation = explain(self.operations, left, state)
        if not self.explanation.complaints:
            return State(last=self.explanation.states[-1].last)
        return State(last=max([state.last, *(found.place for found in left.values())]))

    def wrong(self):
        return bool(self.complaints or (self.explanation and self.explanation.complaints))

    def report(self, agent, left):
        lines = [f"=== FAILED: LMX_SEED={self.script.seed} LMX_THEME={self.script.theme} LMX_SEQUENCES=1",
                 str(self.script), "  what was done:"]
        lines += [f"    {op}" for op in sorted(self.operations, key=lambda op: op.sent)]
        lines += ["  what was left:"] + [f"    {title}: {found}" for title, found in left.items()]
        lines += [f"  {complaint}" for complaint in self.complaints]
        if self.explanation and self.explanation.complaints:
            lines.append(self.explanation.text())
        lines += ["  the log:"] + [f"    {(line.at + CLOCK) % 1000:8.3f} <{line.level.name}> {line.text}"
                                   for line in agent.log.lines()
                                   if self.owns(line) or self.begun <= line.at + CLOCK <= self.ended + 1]
        return "\n".join(lines)


def check_batch(hall, records, state):
    """Waits for quiet, restarts, and compares all with the model. @return (failures, the next state)"""
    hall.begin_sequence("end")
    quiet = hall.wait_quiet(15)
    hall.restart(hall.agent.stop, "TERM")
    hall.wait_main()
    hall.wait_quiet(5)
    failures, titles = [], []
    for record in records:
        left = command_outcome.collect(hall.agent, record.operations)
        titles += left
        state = record.check(hall.agent, left, state)
        if record.wrong():
            failures.append(record.report(hall.agent, left))
    ended = any(op.verb in PROCESS_ENDS for record in records for op in record.operations)
    found = command_outcome.strays(hall.agent, titles, ended)
    if found:
        failures.append(f"files that belong to no recording: {found}")
    if not quiet and not failures:
        failures.append(f"after the last sequence there was no quiet: {hall.unrest()}\n{hall.agent.log.tail(40)}")
    if hall.complaints:
        failures.append(f"at the end of a batch: {hall.complaints}")
    command_outcome.sweep(hall.agent)
    return failures, state


def play_all(agent, scripts):
    """Plays the sequences in batches. @return the failures"""
    failures, operations, state = [], [], State()
    with contextlib.closing(Hall(agent)) as hall:
        for begin in range(0, len(scripts), BATCH):
            records = [play(hall, script) for script in scripts[begin:begin + BATCH]]
            wrong, state = check_batch(hall, records, state)
            failures += wrong
            operations += [op for record in records for op in record.operations]
            if len(failures) >= ENOUGH:
                break
    hit = cells_hit(agent.log.lines(), arrivals(operations, CLOCK), refused_for_room(operations))
    print(f"{len(hit)} cells of the table had an event, these had not:", *cells_missed(hit), sep="\n  ")
    print("these can have none:", *cells_impossible(), sep="\n  ")
    return failures


def shortest_failure(binary, registry, script):
    """The shortest beginning of `script` that fails too."""
    for count in range(1, script.length()):
        with contextlib.closing(Agent(binary, registry)) as agent:
            failures = play_all(agent, [script.prefix(count)])
        if failures:
            return failures
    return []


@pytest.mark.slow
@pytest.mark.limit(120 + 12 * COUNT // max(SHARDS, 1))
@pytest.mark.parametrize("shard", range(SHARDS))
def test_random_sequences(agent, binary, registry, shard):
    scripts = [sequence(SEED + i, THEME) for i in range(shard, COUNT, SHARDS)]
    print(f"seeds {SEED} to {SEED + COUNT - 1}")
    failures = play_all(agent, scripts)
    if failures and os.environ.get("LMX_SHRINK") and len(scripts) == 1:
        failures += shortest_failure(binary, registry, scripts[0])
    if failures:
        pytest.fail("\n".join(failures), pytrace=False)
