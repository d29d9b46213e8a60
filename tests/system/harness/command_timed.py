"""What becomes of timed commands, as the log tells it."""
import datetime
import re
from dataclasses import dataclass, field, replace

from .command_model import FOREVER, Operation

LATE = 0.1  # seconds; what is scheduled so shortly before a timed command runs may have come too late for its turn
RAN_WITHIN = 0.3  # seconds after its line within which a timed command has taken effect
SCHEDULING = re.compile(r"^(Scheduling|Not scheduling) (\w+) command.*: (\d{4}-\d\d-\d\d \d\d:\d\d:\d\d [+-]\d{4})$")
RUNNING = re.compile(r"^Running deferred command: (\w+)$")
STARTING = re.compile(r"^lmxagentd \(version")


@dataclass
class Fate:
    """Of all timed commands of one sequence."""

    ran: list = field(default_factory=list)  # (operation, when on the log's clock)
    waiting: list = field(default_factory=list)
    expired: list = field(default_factory=list)  # their time had come while there was no daemon
    scheduled: dict = field(default_factory=dict)  # when, by number
    lost: list = field(default_factory=list)  # waited when the daemon ended and were not heard of again
    complaints: list = field(default_factory=list)


def follow(sent, lines):
    """Follows the timed commands `sent`, in the order of their sending, through the log's lines. @return their Fate"""
    coming, fate = list(sent), Fate()
    for line in lines:
        scheduling, running = SCHEDULING.match(line.text), RUNNING.match(line.text)
        if STARTING.match(line.text):
            fate.lost += fate.waiting
            fate.waiting = []
        elif scheduling:
            _schedule(fate, coming, line.at, *scheduling.groups())
        elif running:
            _run(fate, running[1], line.at)
    return fate


def _schedule(fate, coming, at, what, verb, date):
    due = int(datetime.datetime.strptime(date, "%Y-%m-%d %H:%M:%S %z").timestamp())
    for source in (fate.lost, coming):
        found = next((op for op in source if (op.verb, op.due) == (verb, due)), None)
        if found:
            source.remove(found)
            fate.scheduled[found.number] = at
            (fate.waiting if what == "Scheduling" else fate.expired).append(found)
            return
    if what == "Scheduling":
        fate.complaints.append(f"a timed {verb} that nobody has sent is scheduled for {date}")


def _run(fate, verb, at):
    """In one second what ends a recording comes first, then the order of sending counts."""
    in_time = [op for op in fate.waiting if op.verb == verb or fate.scheduled[op.number] < at - LATE]
    first = min(in_time, key=Operation.turn, default=None)
    if first is None or first.verb != verb:
        fate.complaints.append(f"this timed command was due: {first}, but a {verb} ran")
        return
    fate.waiting.remove(first)
    fate.ran.append((first, at))


class TimedList:
    """The timed commands of one sequence. One at a time is sent."""

    def __init__(self):
        self._sent = []  # (the operation, when its scheduling was answered)

    def __bool__(self):
        return bool(self._sent)

    def add(self, verb, due, number, title):
        self._sent.append([Operation(verb, "timed", float(due), FOREVER, (), title, number=number, due=due), FOREVER])

    def answered(self, when):
        self._sent[-1][1] = when

    def latest(self):
        """When the last one is due."""
        return max(op.due for op, _ in self._sent)

    def waiting(self, lines):
        """Those that have been scheduled but have not run, or may still be scheduled."""
        fate = follow([op for op, _ in self._sent], lines)
        return fate.waiting

    def outcome(self, lines, clock, ends):
        """What ran as operations, and complaints. `ends` are the operations that ended the process; `clock` leads from
        the log's clock to the wall clock."""
        fate = follow([op for op, _ in self._sent], lines)
        operations = []
        for rank, (op, at) in enumerate(fate.ran, 1):
            done = at + clock + RAN_WITHIN
            cut = any(end.sent <= done and at + clock <= end.done for end in ends)
            operations.append(replace(op, done=done, optional=cut, rank=rank))
        answers = {op.number: answered for op, answered in self._sent}
        lost = [op for op in fate.lost if not any(end.sent <= answers[op.number] for end in ends)]
        complaints = [f"the timed {op.verb} {op.title} was scheduled and is lost" for op in lost]
        complaints += [f"the timed {op.verb} {op.title} has not run" for op in fate.waiting]
        return operations, fate.complaints + complaints
