"""What is told of a recording in which something is not real, in the log at its end and in the journal meanwhile."""
import re

import pytest
from harness import movie
from harness.agent import REPOSITORY
from harness.log_reader import Level
from harness.one_thread import held, threads_named
from harness.pipewire_hall import PipeWireHall
from harness.waiting import let_pass, wait_until

TOLD = "^Not real in this recording: "


def journal(agent):
    """The lines of the running recording's journal."""
    (path,) = agent.path(f"{REPOSITORY}/.lmxagentd").glob("*/journal")
    return path.read_text().splitlines()


def last_error(agent):
    return agent.command("STATUS").fields["lastError"]


def seconds(clock):
    hours, minutes, rest = map(int, clock.split(":"))
    return 3600 * hours + 60 * minutes + rest


def test_nothing_is_told_of_an_undisturbed_recording(running):
    assert running.start_recording("REAL").text == "cmdStatus=0"
    running.let_record(5)
    assert not [line for line in journal(running) if line.startswith("gap ")]
    assert running.command("STOP").text == "cmdStatus=0"
    running.wait_tool_call("REAL")
    assert not running.log.lines("Not real|were lost|keep up")


@pytest.mark.slow
def test_a_microphone_that_was_away(agent):
    with PipeWireHall(agent) as hall, hall.microphone("lectern") as microphone:
        agent.preferences(RecordingAudioInput=microphone.id)
        agent.start(env=hall.env)
        assert agent.start_recording("AWAY").text == "cmdStatus=0"
        agent.let_record(3)
        microphone.unplug()
        wait_until(lambda: last_error(agent) == "9", 10, "the error in STATUS")
        away = int(agent.command("STATUS").fields["elapsedTime"])
        let_pass(3, "the microphone is away")
        microphone.start()
        wait_until(lambda: last_error(agent) == "0", 15, "the microphone's return in STATUS")
        back = int(agent.command("STATUS").fields["elapsedTime"])
        (line,) = wait_until(lambda: [words for words in map(str.split, journal(agent)) if words[1] == "microphone"], 5,
                             "the gap in the journal, before the end")
        assert line[0] == "gap" and abs(float(line[3]) - float(line[2]) - (back - away)) < 3, line
        assert agent.command("STOP").text == "cmdStatus=0"
        agent.wait_tool_call("AWAY")
    (told,) = agent.log.lines(TOLD, level=Level.NOTICE)
    spell = re.search(r"microphone away from (0:00:\d\d) to (0:00:\d\d)", told.text)
    assert spell, told.text
    assert abs(seconds(spell[1]) - away) <= 2 and abs(seconds(spell[2]) - back) <= 2, (told.text, away, back)
    assert "frames lost" not in told.text and "camera" not in told.text


@pytest.mark.slow
def test_pictures_that_the_encoder_had_no_time_for(agent):
    """It stands still until seconds of pictures wait for it; the movie keeps its length, and what lacks is counted."""
    agent.start()
    begun = agent.start_recording("SLOW")
    agent.let_record(2)
    with held(*threads_named(agent, "vsrc:src")):
        agent.log.wait("^The encoder can't keep up: 1 frames dropped", 30, level=Level.ERROR)
        let_pass(1, "more are dropped")
    agent.let_record(int(agent.command("STATUS").fields["elapsedTime"]) + 3)
    stop = agent.command("STOP")
    assert stop.text == "cmdStatus=0"
    agent.wait_tool_call("SLOW")
    (told,) = agent.log.lines(TOLD, level=Level.NOTICE)
    lost = int(re.search(r"(\d+) frames lost, from 0:00:\d\d on", told.text)[1])
    assert lost >= 20, told.text
    path = agent.movie("SLOW")
    movie.decodes(path)
    shown = movie.counters(path)
    (before, after) = movie.runs(shown)
    assert after[0] - before[1] - 1 == lost
    for stream in movie.streams(path).values():
        assert abs(stream.duration - (stop.sent - begun.received)) < 0.4
