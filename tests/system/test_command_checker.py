"""The checker of the command model, fed with histories that no honest daemon leaves."""
import datetime
import re

import pytest
from harness.command_cells import cells_hit, cells_missed
from harness.command_model import FOREVER, Left, Operation, direct_complaints, explain
from harness.command_sequences import THEME_NAMES, sequence
from harness.command_timed import TimedList, follow
from harness.log_reader import Level, LogLine


def said(verb, sent, done=None, reply="cmdStatus=0", title="", **more):
    done = sent + 0.01 if done is None else done
    return Operation(verb, "local", sent, done, (reply,) if reply else (), title, **more)


def showing(number, sent, elapsed=0):
    return said("STATUS", sent, reply=f"cmdStatus=0,recordStatus={number},start=100,elapsedTime={elapsed},stop=0")


def two_lectures():
    """A recorded from 100 to 103 with a second's pause, B from 104 to 106."""
    return [said("START", 100.0, title="A"), showing(2, 100.5), said("PAUSE", 101.0), showing(1, 101.5, 1),
            said("RESUME", 102.0), said("START", 102.5, reply="cmdStatus=4", title="X"), said("STOP", 103.0),
            said("START", 104.0, title="B"), said("STOP", 106.0), showing(0, 108.0, 2)]


def kept(seconds, place, **more):
    return Left(**{"submissions": 1, "place": place, "movie": True, "seconds": seconds, **more})


HONEST = {"A": kept(2.0, 0), "B": kept(2.0, 1), "X": Left()}


def complaints(operations, left):
    return direct_complaints(operations, left) + explain(operations, left).complaints


def test_an_honest_history_is_explained():
    assert complaints(two_lectures(), HONEST) == []


@pytest.mark.parametrize("left, complaint", [
    ({"A": Left()}, "A is lost|lost: Left"),
    ({"A": kept(2.0, 0, submissions=2)}, "A was submitted 2 times"),
    ({"A": kept(2.0, -1, submissions=0)}, "stopped, but not submitted"),
    ({"A": kept(2.0, 1), "B": kept(2.0, 0)}, "before a recording that was stopped earlier"),
    ({"A": kept(0.5, 0)}, "its movie has 0.50 s"),
    ({"A": kept(3.5, 0)}, "its movie has 3.50 s"),
    ({"A": kept(2.0, 0, problem="its document holds another title")}, "another title"),
    ({"X": kept(0.5, 0, submissions=0)}, "START X was to be refused, but left"),
], ids=["lost", "submitted twice", "not submitted", "wrong order", "too short", "too long", "foreign document",
        "refused but recorded"])
def test_doctored_remains_are_a_failure(left, complaint):
    found = complaints(two_lectures(), {**HONEST, **left})
    assert any(re.search(complaint, text) for text in found), found


@pytest.mark.parametrize("place, lie, complaint", [
    (0, said("START", 100.0, reply="cmdStatus=4", title="A"), "was answered"),
    (0, said("START", 100.0, reply="cmdStatus=30", title="A"), "was answered"),
    (5, said("START", 102.5, title="X"), "was answered"),
    (6, said("STOP", 103.0, reply="cmdStatus=1"), "STOP was answered"),
    (1, showing(0, 100.5), "STATUS says"),
    (3, showing(2, 101.5), "STATUS says"),
    (9, showing(2, 108.0), "STATUS says"),
    (9, showing(0, 108.0, 20), "STATUS counts 20 s"),
    (6, said("BAD", 103.0), "BAD was answered"),
], ids=["refused while idle", "no room though there is", "accepted while recording", "STOP refused",
        "idle while recording", "recording while paused", "recording after the end", "more media than time",
        "malformed but accepted"])
def test_a_lying_reply_is_a_failure(place, lie, complaint):
    history = two_lectures()
    history[place] = lie
    found = complaints(history, HONEST)
    assert any(re.search(complaint, text) for text in found), found


def test_commands_that_overlap_may_have_come_in_either_order():
    refused = said("START", 100.0, 101.0, reply="cmdStatus=4", title="X")
    granted = said("START", 100.5, 100.6, title="A")
    left = {"A": kept(2.0, 0), "X": Left()}
    assert complaints([refused, granted, said("STOP", 102.5)], left) == []
    apart = [said("START", 100.0, 100.4, reply="cmdStatus=4", title="X"), granted, said("STOP", 102.5)]
    assert complaints(apart, left)


def test_after_a_kill_a_recording_is_kept_and_not_submitted():
    killed = [said("START", 100.0, title="A"), Operation("KILL", "signal", 103.0, 103.1),
              Operation("RESTART", "world", 103.2, 103.5), showing(0, 104.0)]
    assert complaints(killed, {"A": kept(2.5, -1, submissions=0)}) == []
    assert complaints(killed, {"A": kept(2.5, 0)}), "nobody had stopped it"
    assert complaints(killed, {"A": Left()}), "it is lost"
    stopped = [killed[0], said("STOP", 102.0), *killed[1:]]
    assert complaints(stopped, {"A": kept(2.0, 0)}) == []
    assert complaints(stopped, {"A": kept(2.0, -1, submissions=0)}), "its STOP was answered"
    assert complaints(stopped, {"A": kept(2.0, -1, submissions=0, named=True)}) == []


def test_a_kill_right_behind_a_stop_may_cost_a_second():
    def history(kill):
        return [said("START", 100.0, title="A"), said("STOP", 100.6), Operation("KILL", "signal", kill, kill + 0.1),
                Operation("RESTART", "world", kill + 0.2, kill + 0.5)]
    assert complaints(history(100.7), {"A": Left(empty=True)}) == []
    assert complaints(history(103.0), {"A": Left(empty=True)})
    assert complaints(history(100.7), {"A": Left()})


def test_only_a_brief_recording_may_be_empty_and_the_log_must_say_so():
    for stop, empty, good in ((100.1, True, True), (100.1, False, False), (102.0, True, False)):
        history = [said("START", 100.0, title="A"), said("STOP", stop)]
        assert (complaints(history, {"A": Left(empty=empty)}) == []) == good, (stop, empty)


def test_a_start_may_fail_only_if_its_camera_goes():
    refused = said("START", 100.0, reply="cmdStatus=3", title="A")
    gone = Operation("GONE", "world", 99.0, 99.1)
    assert complaints([gone, refused], {"A": Left()}) == []
    assert complaints([refused], {"A": Left()})
    assert complaints([gone, refused], {"A": kept(0.5, 0)})


def test_a_start_that_may_not_have_come_leaves_nothing_or_a_recording_of_its_own():
    history = [said("START", 100.0, reply="", title="A", optional=True), said("STOP", 102.0)]
    assert complaints(history, {"A": Left()}) == []
    assert complaints(history, {"A": kept(2.0, 0)}) == []
    assert complaints([history[0], said("CANCEL", 102.0)], {"A": kept(2.0, 0)})


def test_a_cancelled_recording_leaves_nothing():
    history = [said("START", 100.0, title="A"), said("CANCEL", 102.0)]
    assert complaints(history, {"A": Left()}) == []
    assert complaints(history, {"A": kept(2.0, 0)})
    assert complaints(history, {"A": kept(2.0, -1, submissions=0)})


def test_timed_commands_run_in_the_order_of_their_dates():
    def timed(verb, due, number, title=""):
        return Operation(verb, "timed", due, due + 1.0, (), title, number=number, due=due)

    history = [said("START", 100.0, title="A"), timed("START", 103, 3, "B"), timed("STOP", 103, 2), said("STOP", 106.0)]
    assert complaints(history, {"A": kept(3.0, 0), "B": kept(3.0, 1)}) == []
    assert complaints(history, {"A": kept(6.0, 0), "B": Left()}), "the STOP was scheduled before the START"
    late_stop = [history[0], timed("START", 103, 2, "B"), timed("STOP", 103, 3), history[3]]
    assert complaints(late_stop, {"A": kept(3.0, 0), "B": kept(3.0, 1)}) == [], "in one second STOP comes first"
    assert complaints(late_stop, {"A": kept(3.0, 0), "B": Left()}), "B was to begin when A had ended"


def test_a_sequence_comes_from_its_seed_alone():
    assert [str(sequence(seed)) for seed in range(50)] == [str(sequence(seed)) for seed in range(50)]
    assert {sequence(seed).theme for seed in range(300)} == set(THEME_NAMES)


def log_of(story):
    return [LogLine(Level.DEBUG, 3, 1, text, float(at), text) for at, text in enumerate(story)]


def test_cells_are_read_from_the_log():
    lines = log_of(["lmxagentd (version 100) starting...", "Command is [STOP n=1]", "Command is [START n=2]",
                    "Process prepareCapture", "Command is [PAUSE n=3]", '"/A.mov" recording started',
                    '"/A.mov" recording paused (current duration: 0s)', "Command is [STATUS]", "Process stopCapture",
                    "Command is [START n=4]", "Submitting Stopped Recording",
                    '"/A.mov" recording stopped (duration: 0s)',
                    "Got Signal (SIGHUP)", "Command is [CANCEL n=5]"])
    hit = {("STOP", "idle"), ("START", "idle"), ("PAUSE", "preparing"), ("USR1", "recording"), ("STATUS", "paused"),
           ("START", "stopping"), ("shortage", "stopping"), ("timed CANCEL", "finishing"), ("KILL", "finishing"),
           ("CANCEL", "idle"), ("CANCEL", "offline")}
    arrived = [("USR1", 5.5), ("timed CANCEL", 10.3), ("KILL", 10.5)]
    assert cells_hit(lines, arrived, [4]) == hit
    assert "STOP: preparing, recording, paused, stopping, finishing, offline" in cells_missed(hit)


def scheduled(verb, number):
    return Operation(verb, "timed", 100.0, FOREVER, (), number=number, due=100)


def story_of(*story):
    date = datetime.datetime.fromtimestamp(100, datetime.timezone.utc).strftime("%Y-%m-%d %H:%M:%S %z")
    return log_of([text.replace("DATE", date) for text in story])


STOP_AND_START = ("Scheduling START command to run at: DATE", "Scheduling STOP command to run at: DATE")
SENT = (scheduled("START", 1), scheduled("STOP", 2))


def test_timed_commands_are_followed_through_the_log():
    ran = follow(SENT, story_of(*STOP_AND_START, "Running deferred command: STOP", "Running deferred command: START"))
    assert [op.verb for op, _ in ran.ran] == ["STOP", "START"] and not ran.complaints
    swapped = follow(SENT, story_of(*STOP_AND_START, "Running deferred command: START"))
    assert "but a START ran" in swapped.complaints[0] and swapped.waiting


def test_what_is_scheduled_at_its_date_may_come_too_late_for_its_turn():
    lines = story_of(*STOP_AND_START, "Running deferred command: START", "Running deferred command: STOP")
    lines[1], lines[2] = (LogLine(Level.DEBUG, 3, 1, line.text, at, "") for line, at in zip(lines[1:3], (2.0, 2.004)))
    assert [op.verb for op, _ in follow(SENT, lines).ran] == ["START", "STOP"]


def test_timed_commands_are_followed_over_a_restart():
    start = "lmxagentd (version 100) starting..."
    again = follow(SENT, story_of(*STOP_AND_START, start, *STOP_AND_START, "Running deferred command: STOP"))
    assert [op.verb for op in again.waiting] == ["START"] and not again.lost
    gone = follow(SENT, story_of(*STOP_AND_START, start,
                                 "Not scheduling STOP command. The timer has expired: DATE"))
    assert [op.verb for op in gone.expired] == ["STOP"] and [op.verb for op in gone.lost] == ["START"]


def test_a_scheduled_command_may_be_lost_only_if_nobody_was_told_of_it():
    for answered, complaints_expected in ((99.0, 1), (FOREVER, 0)):
        commands = TimedList()
        commands.add("STOP", 100, 1, "")
        commands.answered(answered)
        kill = Operation("KILL", "signal", 99.5, 99.6)
        found = commands.outcome(story_of(STOP_AND_START[1], "lmxagentd (version 100) starting..."), 0.0, [kill])
        assert len(found[1]) == complaints_expected, found
