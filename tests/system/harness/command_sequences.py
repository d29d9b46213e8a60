"""Random sequences of commands, signals and mishaps, each made from its seed alone."""
import random
from dataclasses import dataclass, field

COMMANDS = {"START": 28, "STOP": 20, "PAUSE": 10, "RESUME": 10, "CANCEL": 6, "STATUS": 18, "BAD": 3, "USR1": 2,
            "USR2": 3}
TIMED = {"START": 10, "STOP": 10, "CANCEL": 2, "PAUSE": 1, "RESUME": 1}
THEMES = {"serial": 22, "parallel": 24, "timed": 14, "restart": 8, "timed restart": 6, "offline": 3, "shortage": 3,
          "loss": 2}
AIMED_EVERY = 3  # the others have the themes above by their weights
WAYS = ("local", "tunnel")
ENDING = ("HUP", "INT", "TERM", "KILL")
SIGNALS = (*ENDING, "USR1", "USR2")
PASSING = ("preparing", "stopping", "finishing")  # states that last for milliseconds
TARGETS = ("idle", "recording", "paused", *PASSING)
AIMED = ("START", "STOP", "PAUSE", "RESUME", "CANCEL", "STATUS", *SIGNALS, "SHORTAGE", "TIMED START", "TIMED STOP",
         "TIMED PAUSE", "TIMED RESUME", "TIMED CANCEL")
CELLS = [*((verb, state) for verb in AIMED for state in TARGETS), *(("LOSS", state) for state in
         ("preparing", "recording", "paused", "stopping"))]
THEME_NAMES = (*THEMES, "aimed")


@dataclass(frozen=True)
class Event:
    """One step: what (a verb, "TIMED verb", or a mishap), by which way, how long after the step before. WAIT: until so
    long before the timed command is due. FREEZE: the daemon stands still in the state `way` for `delay`, or until the
    timed command is due."""

    verb: str
    way: str
    delay: float
    ahead: int = 0  # of a timed command: seconds from now, rounded down; FREEZE: 1 if it lasts until one is due
    frozen: bool = False  # waits for the daemon to stand still

    def __str__(self):
        return (f"{self.delay * 1000:4.0f} ms {self.way:6} {self.verb}" + (f" in {self.ahead} s" if self.ahead else "")
                + " to a daemon that stands still" * self.frozen)


@dataclass
class Sequence:
    """Lanes run at the same time; the steps of one lane one after the other."""

    seed: int
    theme: str
    lanes: list = field(default_factory=list)
    last: str = "STOP"
    tool_delay: float = 0.0

    def __str__(self):
        lines = [f"seed {self.seed}, {self.theme}, the tool takes {self.tool_delay} s, {self.last} at the end"]
        for number, lane in enumerate(self.lanes):
            lines += [f"  lane {number}"] + [f"    {event}" for event in lane]
        return "\n".join(lines)

    def prefix(self, count):
        """The same with the first `count` steps, counted lane by lane in turn."""
        longest = max(len(lane) for lane in self.lanes)
        order = [(i, lane) for i in range(longest) for lane in range(len(self.lanes)) if i < len(self.lanes[lane])]
        kept = order[:count]
        lanes = [[self.lanes[l][i] for i, l in kept if l == lane] for lane in range(len(self.lanes))]
        return Sequence(self.seed, self.theme, lanes, self.last, self.tool_delay)

    def kills(self):
        return any(event.verb == "KILL" for lane in self.lanes for event in lane)

    def loses_camera(self):
        return any(event.verb in ("LOSS", "GONE") for lane in self.lanes for event in lane)

    def length(self):
        return sum(len(lane) for lane in self.lanes)


def chosen(dice, weights):
    return dice.choices(list(weights), list(weights.values()))[0]


def delay(dice):
    """Often nothing at all, so that commands meet; at most 0.4 s."""
    return dice.choice((0.0, 0.0, dice.uniform(0, 0.05), dice.uniform(0, 0.4), dice.uniform(0.2, 0.4)))


def step(dice, way=None):
    verb = chosen(dice, COMMANDS)
    return Event(verb, "signal" if verb.startswith("USR") else way or dice.choice(WAYS), delay(dice))


def sequence(seed, theme=None):
    """The sequence of a seed."""
    dice = random.Random(seed)
    drawn = chosen(dice, THEMES)
    theme = theme or (drawn if seed % AIMED_EVERY else "aimed")
    made = Sequence(seed, theme, last="CANCEL" if dice.random() < 0.15 else "STOP",
                    tool_delay=dice.choice((0.0, 0.0, 0.2, 0.6)))
    if theme == "aimed":
        made.lanes = aimed(dice, *CELLS[seed % len(CELLS)])
    elif theme == "offline":
        made.lanes = [offline(dice)]
    elif theme == "loss":
        made.lanes = [loss(dice)]
    elif theme == "parallel":
        made.lanes = [[step(dice, way) for _ in range(dice.randint(2, 6))] for way in WAYS]
        if dice.random() < 0.4:
            made.lanes.append([Event(dice.choice(("USR1", "USR2")), "signal", delay(dice)) for _ in range(2)])
    else:
        made.lanes = [[step(dice) for _ in range(dice.randint(4, 10))]]
    if theme.startswith("timed"):
        made.lanes.append([timed(dice) for _ in range(dice.randint(1, 5))])
    made.lanes += mishap(dice, theme)
    return made


def timed(dice):
    return Event("TIMED " + chosen(dice, TIMED), dice.choice(WAYS), dice.uniform(0, 0.1), dice.choice((1, 1, 2, 3)))


def offline(dice):
    """Everything that may come while there is no tunnel."""
    commands = [verb for verb in (*COMMANDS, "START", "START", "STOP") if not verb.startswith("USR")]
    events = [*(Event(verb, "local", delay(dice)) for verb in commands),
              *(Event(verb, "signal", delay(dice)) for verb in ("USR1", "USR2", "HUP")),
              *(Event("TIMED " + verb, "local", delay(dice), 1) for verb in dice.sample(tuple(TIMED), 2))]
    dice.shuffle(events)
    room = dice.randrange(len(events) + 1)
    events[room:room] = [Event("SHORTAGE", "world", 0.0), Event("START", "local", 0.0), Event("ROOM", "world", 0.0)]
    end = [Event(dice.choice(ENDING[1:]), "signal", dice.uniform(0, 0.4))] if dice.random() < 0.7 else []
    return [Event("HUP", "signal", 0.0), *events, *end]


def aimed(dice, verb, target):
    """One event that is to find the recorder in a certain state."""
    lead = [] if target == "idle" else [Event("START", "tunnel", 0.0)]
    if target == "paused" or (target in ("stopping", "finishing") and verb != "LOSS" and dice.random() < 0.2):
        lead.append(Event("PAUSE", "tunnel", dice.uniform(0.1, 0.3)))
    if target in ("stopping", "finishing") and verb not in ("SHORTAGE", "LOSS"):
        lead.append(Event("STOP", "tunnel", dice.uniform(0.15, 0.4)))
    if verb == "LOSS":
        return losing(dice, lead, target)
    if verb == "SHORTAGE":
        return short_of_room(lead, target)
    if verb.startswith("TIMED"):
        before = 0.3 + sum(event.delay + 0.06 for event in lead)
        lanes = [[Event(verb, dice.choice(WAYS), 0.0, 2), Event("WAIT", "world", before), *lead]]
        return lanes + [[Event("FREEZE", target, 0.0, 1)]] * (target in PASSING)
    event = Event(verb, "signal" if verb in SIGNALS else "local", dice.uniform(0.0, 0.02), frozen=target in PASSING)
    if target in PASSING:
        return [lead, [Event("FREEZE", target, dice.uniform(0.03, 0.08))], [event]]
    return [[*lead, event]]


def short_of_room(lead, target):
    """A START that is refused because there is no room. The preferences are read between two of the main thread's
    tasks, so that the START before is not concerned."""
    short, start = Event("SHORTAGE", "world", 0.0), Event("START", "local", 0.0)
    if target == "preparing":
        return [lead, [Event("FREEZE", target, 0.1)], [Event("SHORTAGE", "world", 0.0, frozen=True)],
                [Event("START", "local", 0.04, frozen=True)]]
    if target in PASSING:
        return [[*lead, short, Event("STOP", "tunnel", 0.2)], [Event("FREEZE", target, 0.05)],
                [Event("START", "local", 0.0, frozen=True)]]
    return [[*lead, short, start]]


def loss(dice):
    """Recordings of less and of more than the second that the camera lasts, half of them without a tunnel."""
    events = [Event("HUP", "signal", 0.0)] if dice.random() < 0.5 else []
    events += [Event("LOSS", "world", 0.0), Event("START", "local", 0.0)]
    verbs = ("START", "PAUSE", "RESUME", "STATUS", "USR1", "USR2", "STOP", "CANCEL")
    for verb in dice.choices(verbs, (2, 3, 3, 2, 1, 1, 1, 0.5), k=dice.randint(1, 6)):
        events.append(Event(verb, "signal" if verb.startswith("USR") else "local", delay(dice)))
    return events


def losing(dice, lead, target):
    """A camera that goes at once, or a second after its recording has begun."""
    if target == "preparing":
        return [[Event("GONE", "world", 0.0), *lead]]
    lost = [Event("LOSS", "world", 0.0), *lead]
    if target == "stopping":
        lost.append(Event("STOP", "local", dice.uniform(0.945, 0.985)))  # its last frame is the one that does not come
    return [lost]


def mishap(dice, theme):
    """The lane of what goes wrong."""
    if theme.endswith("restart"):
        return [[Event(dice.choice(("TERM", "INT", "KILL", "KILL")), "signal", dice.uniform(0, 1.5))]]
    if theme == "shortage":
        return [[Event("SHORTAGE", "world", dice.uniform(0, 0.5)), Event("ROOM", "world", dice.uniform(0.3, 1.0))]]
    return []
