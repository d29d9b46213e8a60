"""Unattended limits that are too long for arithmetic in 32 bits."""
import time

import pytest
from harness.waiting import let_pass

SIXTY_YEARS = 60 * 365 * 86400


def deadline(agent, mark):
    """The stop time that the daemon has last set since `mark`, seconds since 1970."""
    text = agent.log.wait("^unattended stop time set to: ", after=mark).text.split(": ", 1)[1]
    return time.mktime(time.strptime(text))


@pytest.mark.parametrize("minutes", ["2147483647", "4294967297", "35791395", "35791394", "99999999999999999999"])
def test_a_limit_of_decades(running, minutes):
    mark = running.log.mark()
    assert running.start_recording("A", unattended=minutes).text == "cmdStatus=0"
    assert deadline(running, mark) > time.time() + SIXTY_YEARS
    mark = running.log.mark()
    status = running.command("STATUS").fields
    assert (status["cmdStatus"], status["recordStatus"], status["lastError"]) == ("0", "2", "0")
    assert 0 < int(status["hard_stop"]) - time.time() <= 3600
    assert deadline(running, mark) > time.time() + SIXTY_YEARS


@pytest.mark.slow
def test_no_limit_of_decades_ends_a_recording(running):
    assert running.start_recording("A", unattended="2147483647").text == "cmdStatus=0"
    let_pass(17, "deadlines are looked at every 15 seconds")
    assert running.command("STATUS").fields["recordStatus"] == "2"
    assert not running.log.lines("Auto-Shutoff")


@pytest.mark.parametrize("minutes", ["0", "-1", "-2147483649", "-4294967295"])
def test_no_limit_at_all(running, minutes):
    mark = running.log.mark()
    assert running.start_recording("A", unattended=minutes).text == "cmdStatus=0"
    assert running.command("STATUS").fields["recordStatus"] == "2"
    assert not running.log.lines("^unattended stop time", after=mark)
