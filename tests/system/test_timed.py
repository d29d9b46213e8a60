"""Timed commands and deadlines: what happens with nobody connected."""
import contextlib
import plistlib
import time

import pytest

from harness import movie
from harness.agent import REPOSITORY, TIMERS
from harness.commands import start_parameters, timed_line
from harness.log_reader import Level
from harness.waiting import let_pass, wait_until


def timed(agent, command, seconds, **parameters):
    """Schedules `command` so many seconds ahead, rounded down. @return the reply"""
    return agent.command(timed_line(command, int(time.time()) + seconds, **parameters)).text


def test_a_recording_with_nobody_connected(running):
    assert timed(running, "START", 3, **start_parameters("A")) == "cmdStatus=0"
    assert timed(running, "STOP", 6) == "cmdStatus=0"
    assert [entry["command"] for entry in running.timers()] == ["START", "STOP"]
    running.wait_recorded("A")
    running.wait_tool_call("A")
    assert movie.streams(running.movie("A"))["video"].duration > 2.0
    assert running.timers() == []


def test_a_command_right_behind_a_restart_keeps_the_schedule(agent):
    agent.start()
    for _ in range(3):
        assert timed(agent, "STATUS", 3600) == "cmdStatus=0"
        known = len(agent.timers())
        agent.stop()
        agent.start(wait=False)

        def scheduled():
            with contextlib.suppress(FileNotFoundError, ConnectionRefusedError):
                return timed(agent, "PAUSE", 3600)
        assert wait_until(scheduled, 20, "the local socket", interval=0.001) == "cmdStatus=0"
        assert len(agent.timers()) == known + 1


def test_a_restart_keeps_the_schedule(agent):
    agent.start()
    timed(agent, "START", 8, **start_parameters("A"))
    timed(agent, "STOP", 10, TimerID="stop")
    timed(agent, "STATUS", 3600, TimerID="far")
    timed(agent, "START", 2, **start_parameters("MISSED"))
    agent.kill9()
    let_pass(2.1, "the time of MISSED goes by")
    agent.start()
    agent.log.wait("^Not scheduling START command. The timer has expired: ")
    agent.log.wait("^Scheduling STATUS command to run at: ", count=2)
    assert {entry.get("TimerID") for entry in agent.timers()} >= {"stop", "far"}
    agent.wait_tool_call("A", 30)
    assert not agent.movie("MISSED").exists()
    assert [entry["TimerID"] for entry in agent.timers()] == ["far"]


def test_revoked_ones_do_not_run(running):
    timed(running, "START", 3, TimerID="T", **start_parameters("A"))
    assert running.command("TIMEDCMD command=TIMERREVOKE,TimerID=T").text == "cmdStatus=0"
    assert running.command("TIMEDCMD command=TIMERREVOKE,TimerID=T").text == "cmdStatus=37"
    running.log.wait("^Not running deferred command$", level=Level.INFO)
    assert running.command("STATUS").fields["recordStatus"] == "0"


def test_the_list_at_a_shell(running):
    timed(running, "STOP", 3600, TimerID="T-1")
    result = running.run("--timerlist")
    reply = result.stdout.split("received: ")[1]
    assert reply.startswith("cmdStatus=0,timerlist=<?xml")
    (entry,) = plistlib.loads(reply[len("cmdStatus=0,timerlist="):].rstrip("\n").encode())
    assert (entry["TimerID"], entry["command"]) == ("T-1", "STOP")
    assert "received: cmdStatus=0\n" in running.run("--timerrevoke", "T-1").stdout
    assert running.timers() == []


def test_an_ad_hoc_start_at_a_time(running):
    output = "/var/lmx/later.mov"
    with running.popen("-f", output, "-s", "--timerdelay", "2"):
        running.log.wait('later.mov|"/var/lmx/agent/recordings/.*" recording started$', timeout=15)
        assert "command=START,RecordingMetadata_RECORDING_UUID=" in running.log.lines("^Command is")[-1].text


def test_an_unreadable_timers_file_is_kept(agent):
    agent.path(TIMERS).write_bytes(b"<plist version='1.0'><array><dict>")
    agent.start()
    agent.log.wait(f"^The timers file {TIMERS} can't be used: ", level=Level.ERROR)
    assert agent.path(TIMERS + ".unreadable-1").read_bytes() == b"<plist version='1.0'><array><dict>"
    assert timed(agent, "STOP", 3600) == "cmdStatus=0"


def test_a_timers_file_that_cannot_be_written(agent):
    agent.path("/var/lmx/agent/secrets").mkdir(exist_ok=True)
    agent.start(mounts=["ro /var/lmx/agent", f"tmpfs 64m {REPOSITORY}"])
    assert timed(agent, "START", 1, **start_parameters("A")) == "cmdStatus=0"
    agent.log.wait("^Unable to write timer file\\.$", level=Level.WARNING)
    agent.log.wait("recording started$")


def test_a_hard_stop_ends_and_submits(running):
    assert running.start_recording("A", minutes="0.05").text == "cmdStatus=0"
    running.log.wait("^hardStopTime set to: ", level=Level.INFO)
    running.log.wait("^Agent recording hit hard stop time$", level=Level.NOTICE, timeout=25)
    running.log.wait("^Doing Auto-Shutoff: Video$", level=Level.NOTICE)
    running.wait_tool_call("A")
    assert 3 <= movie.streams(running.movie("A"))["video"].duration < 20
    assert running.command("STATUS").fields["recordStatus"] == "0"


@pytest.mark.slow
@pytest.mark.limit(150)
def test_a_minute_without_a_command_ends_and_submits(running):
    assert running.start_recording("A", minutes="60", unattended="1").text == "cmdStatus=0"
    running.log.wait("^Agent recording hit soft stop time: ", level=Level.NOTICE, timeout=90)
    running.log.wait("^Doing Auto-Shutoff: Video$", level=Level.NOTICE)
    running.wait_tool_call("A")
    duration = movie.streams(running.movie("A"))["video"].duration
    assert 58 < duration < 80, "it ends at the first check behind the minute; one comes every 15 seconds"


def test_no_limits_never_end_it(running):
    assert running.start_recording("A", minutes="0", unattended="0").text == "cmdStatus=0"
    let_pass(17, "deadlines are looked at every 15 seconds")
    assert running.command("STATUS").fields["recordStatus"] == "2"
    assert not running.log.lines("Auto-Shutoff|hardStopTime|unattended stop")
    assert running.command("STOP").text == "cmdStatus=0"
    running.wait_recorded("A")


def test_a_shortage_ends_the_recording_and_submits_it(agent):
    agent.preferences(RecordingDiskSpaceCutoffInMB="8")
    agent.start(mounts=[f"tmpfs 40m {REPOSITORY}"])
    assert agent.start_recording("A").text == "cmdStatus=0"
    agent.let_record(2)
    agent.path(f"{REPOSITORY}/filler").write_bytes(bytes(34 << 20))
    agent.log.wait(r"^\d MB is below threshold 8 MB, unable to free space, recording disabled$", level=Level.WARNING,
                   timeout=25)
    agent.wait_tool_call("A")
    movie.decodes(agent.movie("A"))
    assert agent.start_recording("B").text == "cmdStatus=30"
    agent.path(f"{REPOSITORY}/filler").unlink()
    assert agent.start_recording("C").text == "cmdStatus=0"
    assert len(agent.log.lines("recording disabled$")) == 1


def test_a_vanished_repository_is_made_again(agent):
    agent.preferences(RecordingRepositoryPath="/var/lmx/elsewhere")
    agent.start()
    top = agent.path("/var/lmx/elsewhere")
    wait_until(top.is_dir, 5, "the repository")
    top.rmdir()
    agent.log.wait("^Recording Repository does not exist, creating /var/lmx/elsewhere\\.$", timeout=20, count=2)
    wait_until(top.is_dir, 5, "the repository again")
    assert agent.start_recording("A").text == "cmdStatus=0"
