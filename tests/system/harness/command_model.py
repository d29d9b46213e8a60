"""What the daemon may do with commands that meet each other: a sequential model, and a search for an order that
explains all that was observed.

Each operation took effect at one moment between its sending and its end. There must be an order of these moments in
which the model gives the very replies that came, and leaves what was found afterwards.
"""
from dataclasses import dataclass, field, replace

SETTLE = 1.0  # seconds after the reply to STOP or CANCEL in which the status may still show the recording
LENGTH_SLACK = 0.25  # seconds by which a movie may differ from what the times of the commands allow; measured: 0.03
KILL_LOSS = 1.0  # seconds of media that a kill may cost
SHORT_LIFE = 0.2  # seconds; a recording that is no longer may have no picture

ENDS = {"STOP": "stopped", "GUARD": "stopped", "LOSS": "stopped", "CANCEL": "cancelled", "HUP": "kept", "INT": "kept",
        "TERM": "kept", "KILL": "kept"}
POSTED = ("STOP", "CANCEL", "GUARD", "LOSS", "HUP")  # answered, or seen, before the recorder has heard of it
PROCESS_ENDS = ("INT", "TERM", "KILL", "END")
PAUSES = ("PAUSE", "USR1")
RESUMES = ("RESUME", "USR2")
FOREVER = float("inf")


@dataclass(frozen=True)
class Operation:
    """One thing that was done to the daemon. Times are wall-clock seconds."""

    verb: str  # a command, BAD for a malformed START, a signal (HUP, INT, TERM, KILL, USR1, USR2), or RESTART,
    #            SHORTAGE, ROOM, GUARD (the check of the disk ends a recording), GONE (from now on the camera goes as
    #            soon as it is opened), LOSS (a recording loses its camera), END (the daemon ends by itself)
    way: str  # local, tunnel, timed, signal, world
    sent: float
    done: float  # when its effect was certain, FOREVER when nobody knows
    replies: tuple = ()  # the texts of which one is its reply; none: it is not known
    title: str = ""  # of a START; unique
    optional: bool = False  # it may never have reached the daemon
    number: int = 0
    due: int = 0  # of a timed command
    rank: int = 0  # of a timed command, among those that ran, when that is known

    def turn(self):
        """Where it comes among the timed commands: in one second what ends a recording runs before what begins one."""
        return self.rank, self.due, self.verb not in ("STOP", "CANCEL"), self.number

    def __str__(self):
        reply = " or ".join(text.strip() for text in self.replies) or "no reply known"
        name = f"{self.verb} {self.title}".strip() + (f" due {self.due % 1000}" if self.due else "")
        end = "?" if self.done == FOREVER else f"{self.done % 1000:.3f}"
        return f"{self.sent % 1000:8.3f} … {end:>8} {self.way:6} {name}{' (optional)' * self.optional}: {reply}"


@dataclass(frozen=True)
class Left:
    """What was found of one START's recording at the end."""

    submissions: int = 0
    place: int = -1  # among all submissions
    movie: bool = False
    seconds: float = 0.0
    problem: str = ""  # why movie or document are not as they should be
    named: bool = False  # a log line says that its submission was in hand when the process ended
    empty: bool = False  # a log line says that it has not a single picture

    def nothing(self):
        return not self.movie and self.submissions == 0


@dataclass(frozen=True)
class State:
    """The daemon, as far as commands can tell."""

    recording: str = ""  # title of what is recorded
    paused: bool = False
    room: bool = True
    gone: bool = False  # the camera goes as soon as it is opened
    ending: bool = False
    last: int = -1  # place of the latest submission
    least: float = 0.0  # seconds of media it must hold by now
    most: float = 0.0
    since: tuple = (0.0, 0.0)  # bounds of when the present span began


@dataclass
class Explanation:
    """The order that was found, or how far the search came."""

    order: list = field(default_factory=list)
    states: list = field(default_factory=list)  # before each operation of `order`, and at the end
    complaints: list = field(default_factory=list)  # why nothing could follow; empty when all is explained

    def text(self):
        lines = [f"    {op}   [{describe(state)}]" for op, state in zip(self.order, self.states)]
        return "\n".join(["  the longest order that agrees:", *lines, "  no further because:",
                          *(f"    {complaint}" for complaint in self.complaints)])


def describe(state):
    return (f"{'paused ' * state.paused}{state.recording or 'idle'}{', no room' * (not state.room)}"
            f"{', ending' * state.ending}")


def must_precede(first, second):
    """Whether `first` has certainly taken effect before `second`."""
    if first.due and second.due and first.turn() < second.turn():
        return True
    end = first.done
    if second.verb == "STATUS" and (first.verb in POSTED or first.due):
        end += SETTLE
    return end < second.sent


class Refused(Exception):
    """The model does not allow this here."""


class Model:
    """The transitions. `left` holds what was found of each recording, by title."""

    def __init__(self, left, kills=()):
        self.left = left
        self.kills = kills  # when

    def after(self, state, op):
        """The state that follows. Raises Refused with the reason if the reply, or what was left, contradicts."""
        if op.verb == "START":
            return self._start(state, op)
        self._expect(op, {"BAD": "31"}.get(op.verb, "0"))
        if op.verb == "STATUS":
            return self._status(state, op)
        if op.verb in ENDS:
            return replace(self._end(state, op), ending=state.ending or op.verb in PROCESS_ENDS)
        if op.verb in PAUSES:
            return self._pause(state, op)
        if op.verb in RESUMES:
            return self._resume(state, op)
        changes = {"RESTART": {"ending": False}, "END": {"ending": True}, "SHORTAGE": {"room": False},
                   "ROOM": {"room": True}, "GONE": {"gone": True}}
        return replace(state, **changes.get(op.verb, {}))

    def without(self, state, op):
        """The state if `op` has never reached the daemon. Raises Refused if it has left something."""
        if op.title and not self.left[op.title].nothing():
            raise Refused(f"START {op.title} has had no effect, but left {self.left[op.title]}")
        return state

    @staticmethod
    def _expect(op, *codes):
        if op.replies and not any(status_of(text) in codes for text in op.replies):
            raise Refused(f"{op.verb} was answered {op.replies}, not {' or '.join(codes)}")

    def _start(self, state, op):
        refusals = ["1"] * state.ending + ["30"] * (not state.room) + ["4"] * bool(state.recording)
        if refusals:
            self._expect(op, *refusals)
            if not self.left[op.title].nothing():
                raise Refused(f"START {op.title} was to be refused, but left {self.left[op.title]}")
            return state
        self._expect(op, "0", *["3"] * state.gone)
        if op.replies and all(status_of(text) == "3" for text in op.replies):
            return self.without(state, op)
        return replace(state, recording=op.title, paused=False, least=0.0, most=0.0, since=(op.sent, op.done))

    @staticmethod
    def _status(state, op):
        shown = "0" if not state.recording else "1" if state.paused else "2"
        if not any(f"recordStatus={shown}," in text for text in op.replies):
            raise Refused(f"STATUS says {op.replies}, but the recorder is {describe(state)}")
        return state

    def _pause(self, state, op):
        if not state.recording or state.paused:
            return state
        return replace(self._close_span(state, op), paused=True)

    @staticmethod
    def _resume(state, op):
        if not state.paused:
            return state
        return replace(state, paused=False, since=(op.sent, op.done))

    @staticmethod
    def _close_span(state, op):
        certain = max(0.0, op.sent - state.since[1])
        possible = max(0.0, op.done - state.since[0])
        return replace(state, least=state.least + certain, most=state.most + possible)

    def _end(self, state, op):
        if not state.recording:
            return state
        if not state.paused:
            state = self._close_span(state, op)
        found = self.left[state.recording]
        ending = ENDS[op.verb]
        brief = state.least < (KILL_LOSS if self._cut(op) else SHORT_LIFE)
        reason = contradiction(ending, found, brief)
        if reason:
            raise Refused(f"{op.verb} {state.recording}: {reason}")
        last = state.last
        if ending == "stopped" and found.submissions:
            if found.place < last:
                raise Refused(f"{state.recording} was submitted before a recording that was stopped earlier")
            last = found.place
        if found.movie:
            self._check_length(state, op, found)
        return replace(state, recording="", paused=False, last=last)

    def _cut(self, op):
        """Whether a kill may have come before what ended the recording had done its work."""
        return op.verb == "KILL" or any(op.sent <= kill <= op.done + SETTLE for kill in self.kills)

    def _check_length(self, state, op, found):
        loss = KILL_LOSS if self._cut(op) else FOREVER if op.verb in ("GUARD", "LOSS") else 0.0
        if not state.least - LENGTH_SLACK - loss <= found.seconds <= state.most + LENGTH_SLACK:
            raise Refused(f"{op.verb} {state.recording}: its movie has {found.seconds:.2f} s, the commands allow "
                          f"{state.least:.2f} to {state.most:.2f}")


def contradiction(ending, found, brief):
    """Why what was found does not fit a recording that has so ended; empty if it does. A `brief` one may have no
    picture: it was ended before the camera had to deliver one, or killed before one had to be on the disk. The log must
    say so."""
    if brief and found.empty and found.nothing():
        return ""
    if ending == "cancelled":
        return "" if found.nothing() else f"cancelled, but {found}"
    if not found.movie:
        return f"lost: {found}"
    if ending == "kept":
        return "" if found.submissions == 0 else f"submitted though nobody had stopped it: {found}"
    return "" if found.submissions == 1 or found.named else f"stopped, but not submitted: {found}"


def status_of(text):
    return text.strip().removeprefix("cmdStatus=").split(",")[0]


def explain(operations, left, initial=State()):
    """Searches for an order in which the model agrees with all replies and all that was left.

    `left` holds a Left for each START's title. @return the Explanation; its last state is where the next one begins
    """
    operations = sorted(operations, key=lambda op: op.sent)
    kills = [op.done for op in operations if op.verb == "KILL"]
    return _Search(operations, Model(left, kills)).run(initial)


class _Search:
    """Depth first; what has been tried once from the same place is not tried again."""

    def __init__(self, operations, model):
        self.operations, self.model = operations, model
        self.earlier = [{j for j, other in enumerate(operations) if j != i and must_precede(other, op)}
                        for i, op in enumerate(operations)]
        self.tried = set()
        self.best = Explanation()

    def run(self, initial):
        if self._go_on(frozenset(), [], [initial]):
            return self.best
        self.best.complaints = self.best.complaints or ["no operation is left that could come next"]
        return self.best

    def _go_on(self, placed, order, states):
        if len(placed) == len(self.operations):
            self.best = Explanation(list(order), list(states))
            return self._finished(states[-1])
        if (placed, states[-1]) in self.tried:
            return False
        self.tried.add((placed, states[-1]))
        complaints = []
        for i, op in enumerate(self.operations):
            if i in placed or not self.earlier[i] <= placed:
                continue
            for skip in (False, True) if op.optional else (False,):
                try:
                    state = self.model.without(states[-1], op) if skip else self.model.after(states[-1], op)
                except Refused as reason:
                    complaints.append(str(reason))
                    continue
                if self._go_on(placed | {i}, [*order, op], [*states, state]):
                    return True
        if complaints and len(order) >= len(self.best.order):
            self.best = Explanation(list(order), list(states), complaints)
        return False

    def _finished(self, state):
        if state.recording:
            self.best.complaints = [f"at the end {state.recording} is still being recorded"]
        return not state.recording


def direct_complaints(operations, left):
    """What is wrong whatever the order was."""
    complaints = []
    for title, found in left.items():
        if found.submissions > 1:
            complaints.append(f"{title} was submitted {found.submissions} times")
        if found.problem:
            complaints.append(f"{title}: {found.problem}")
    for op in operations:
        if op.verb == "STATUS":
            complaints += _status_complaints(op)
        if op.verb == "START" and {status_of(text) for text in op.replies} == {"0"}:
            cancelled = any(other.verb == "CANCEL" and not must_precede(other, op) for other in operations)
            disturbed = any(other.verb in ENDS or other.verb in PAUSES for other in operations
                            if op.sent <= other.done and other.sent <= op.done + KILL_LOSS)
            if left[op.title].nothing() and not cancelled and not disturbed:
                complaints.append(f"{op.title} is lost: its START was answered 0, nobody cancelled it")
    return complaints


def _status_complaints(op):
    for text in op.replies:
        fields = dict(pair.split("=", 1) for pair in text.strip().split(",") if "=" in pair)
        if "recordStatus" not in fields:
            continue
        elapsed, begun = int(fields["elapsedTime"]), int(fields["start"])
        if elapsed < 0 or (begun and elapsed > op.done - begun + 1):
            return [f"STATUS counts {elapsed} s of media {op.done - begun:.1f} s after the start"]
    return []
