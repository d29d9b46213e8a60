"""A repository that can't take a recording: missing, read-only, full, or full in the middle."""
import contextlib
import os
import time

from harness import movie
from harness.agent import REPOSITORY
from harness.log_reader import Level
from harness.waiting import wait_until


def fill(agent, leave=0):
    """Fills the repository's file system except for `leave` bytes."""
    path = agent.path(f"{REPOSITORY}/filler")
    stat = os.statvfs(path.parent)
    size = stat.f_bavail * stat.f_frsize - leave
    with path.open("wb", buffering=0) as file, contextlib.suppress(OSError):  # the recorder takes its share meanwhile
        while size > 0:
            size -= file.write(bytes(min(size, 65536)))
    return path


def works(agent, uuid):
    agent.record(uuid)
    movie.decodes(agent.movie(uuid))


def test_a_missing_repository_is_made(agent):
    agent.preferences(RecordingRepositoryPath="/var/lmx/elsewhere/recordings")
    agent.start()
    agent.log.wait("^Recording Repository does not exist, creating /var/lmx/elsewhere/recordings\\.$", level=Level.INFO)
    made = agent.path("/var/lmx/elsewhere/recordings")
    assert made.is_dir() and made.stat().st_mode & 0o777 == 0o755


def test_a_repository_that_cannot_be_made_ends_the_daemon(agent):
    agent.path("/var/lmx/blocked").write_text("a file")
    agent.preferences(RecordingRepositoryPath="/var/lmx/blocked/recordings")
    agent.start(wait=False)
    assert agent.wait_exit() == 1
    agent.log.wait("^Internal error caused application to stop$", level=Level.CRITICAL)
    assert not agent.log.lines("Disabling"), "a full disk is no reason to stay away after the next boot"


def test_a_read_only_repository(agent):
    agent.start(mounts=[f"ro {REPOSITORY}"])
    assert agent.start_recording("A").text == "cmdStatus=3"
    assert agent.command("STATUS").fields["recordStatus"] == "0"
    assert agent.command("STATUS").fields["lastError"] == "3"
    assert agent.command("STOP").text == "cmdStatus=0"
    assert agent.start_recording("B").text == "cmdStatus=3"
    assert agent.alive() and agent.repository() == []


def test_a_full_repository(agent):
    agent.start(mounts=[f"tmpfs 16m {REPOSITORY}"])
    filler = fill(agent, leave=500_000)
    assert agent.start_recording("A").text == "cmdStatus=30"
    agent.log.wait(r"^\d+ MB is below threshold 1 MB$", level=Level.WARNING)
    assert agent.command("STATUS").fields["recordStatus"] == "0"
    filler.unlink()
    works(agent, "B")


def test_a_repository_that_fills_up_in_the_middle(agent):
    agent.preferences(RecordingDiskSpaceCutoffInMB="0")
    agent.start(mounts=[f"tmpfs 24m {REPOSITORY}"])
    assert agent.start_recording("A").text == "cmdStatus=0"
    agent.let_record(3)
    mark = agent.log.mark()
    filler = fill(agent)
    line = agent.log.wait(r"(?i)space", timeout=30, after=mark)
    assert line.level <= Level.WARNING
    assert agent.command("STATUS").fields["cmdStatus"] == "0"
    wait_until(lambda: agent.command("STATUS").fields["lastError"] == "8", 10, "the error in the status")
    filler.unlink()
    agent.command("STOP")
    agent.wait_idle()
    works(agent, "B")
    recorded = agent.movie("A")
    assert recorded.exists(), "what was recorded before the disk was full"
    movie.decodes(recorded)
    assert movie.streams(recorded)["video"].duration > 2


def test_a_document_that_finds_no_room_is_written_by_the_next_start(agent):
    agent.preferences(RecordingDiskSpaceCutoffInMB="0")
    agent.start()
    started = time.time()
    assert agent.start_recording("A", RecordingMetadata_TITLE="A talk").text == "cmdStatus=0"
    agent.let_record(2)
    blocked = agent.path(f"{REPOSITORY}/A.xml")
    blocked.mkdir()  # the document can't be renamed over it
    (blocked / "x").touch()
    stopped = agent.command("STOP").received
    agent.wait_recorded("A")
    agent.log.wait('^The properties document ".*A.xml" could not be written: ')
    agent.wait_tool_call("A", event="end")
    (blocked / "x").unlink()
    blocked.rmdir()
    assert agent.stop() == 0
    mark = agent.log.mark()
    agent.start()
    agent.log.wait("^Recovered unfinished recording", after=mark)
    document = agent.document("A")
    assert document["RecordingMetadata_TITLE"] == "A talk"
    assert 1 <= int(document["RecordingMetadata_DURATION"]) <= stopped - started + 1
    assert abs(int(document["RecordingMetadata_START_DATE"]) - started) < 3
    movie.decodes(agent.movie("A"))
