"""Movies at a path that START names: nothing that exists there is moved, replaced or changed."""
import os
import re
import stat

from harness import movie
from harness.agent import PREFERENCES, REPOSITORY, SERVER_UUID
from harness.document import read_document
from harness.log_reader import Level
from harness.waiting import wait_until

SECRET_FILE = f"/var/lmx/agent/secrets/{SERVER_UUID}.plist"


def snapshot(path):
    """All that tells an entry from another: inode, mode, times, and content, target or names."""
    status = path.lstat()
    if stat.S_ISLNK(status.st_mode):
        content = os.readlink(path)
    elif stat.S_ISDIR(status.st_mode):
        content = sorted(entry.name for entry in path.iterdir())
    else:
        content = path.read_bytes()
    return status.st_ino, stat.filemode(status.st_mode), status.st_mtime_ns, content


def record_at(agent, uuid, path):
    """Makes a recording that names `path` for its movie. @return the path that it got"""
    mark = agent.log.mark()
    reply = agent.start_recording(uuid, RecordingMetadata_TITLE=f"Title of {uuid}",
                                  RecordingMetadata_ADHOC_FILE_PATH=path)
    assert reply.text == "cmdStatus=0"
    agent.let_record(1)
    assert agent.command("STOP").text == "cmdStatus=0"
    line = agent.log.wait(r'^".*" recording stopped \(duration: \d+s\)$', after=mark, level=Level.NOTICE)
    agent.wait_idle()
    return line.text.split('"')[1]


def assert_beside(agent, got, path, uuid, mark):
    """The movie bears a number behind its name, its document stands beside it, and one warning names both paths."""
    stem, dot, ending = path.rpartition(".") if "." in path.rsplit("/", 1)[1] else (path, "", "")
    assert re.fullmatch(rf"{re.escape(stem)}-\d+{re.escape(dot + ending)}", got), got
    if ending == "mov":
        assert got == f"{stem}-1.mov"
    movie.decodes(agent.path(got))
    document = agent.path(got.removesuffix(".mov") + ".xml")
    wait_until(document.exists, 10, f"the document {document}")
    assert read_document(document)["RecordingMetadata_TITLE"] == f"Title of {uuid}"
    lines = agent.log.lines(re.escape(path) + r"(?![\w.-])", after=mark, level=Level.WARNING)
    assert [line for line in lines if got in line.text], f"no warning names {path} and {got}"


def test_whatever_is_there_stays_as_it_is(running):
    running.record("OTHER")
    running.wait_tool_call("OTHER")
    running.path("/var/lmx/a directory.mov").mkdir()
    (running.path("/var/lmx/a directory.mov") / "inside").write_text("something")
    running.path("/var/lmx/a link.mov").symlink_to("/var/lmx/nowhere")
    targets = [PREFERENCES, SECRET_FILE, f"{REPOSITORY}/OTHER.mov", f"{REPOSITORY}/OTHER.xml",
               "/var/lmx/a directory.mov", "/var/lmx/a link.mov"]
    before = {path: snapshot(running.path(path)) for path in targets}
    for number, path in enumerate(targets):
        mark = running.log.mark()
        got = record_at(running, f"R{number}", path)
        assert {path: snapshot(running.path(path)) for path in targets} == before, f"after a movie at {path}"
        assert_beside(running, got, path, f"R{number}", mark)
    assert not running.path("/var/lmx/nowhere").exists()
    assert running.command("STATUS").fields["cmdStatus"] == "0" and not running.log.lines("Disabling")


def test_a_document_that_is_there_stays_as_it_is(running):
    """The movie's own name is free, but its document would lie where another's is."""
    paper = running.path("/var/lmx/lecture.xml")
    paper.write_text("somebody's")
    paper.chmod(0o640)
    before, mark = snapshot(paper), running.log.mark()
    got = record_at(running, "A", "/var/lmx/lecture.mov")
    assert_beside(running, got, "/var/lmx/lecture.mov", "A", mark)
    running.wait_tool_call("A")
    assert snapshot(paper) == before


def test_one_path_for_three_recordings(running):
    path = "/var/lmx/lecture.mov"
    assert [record_at(running, uuid, path) for uuid in "ABC"] == [path, "/var/lmx/lecture-1.mov",
                                                                "/var/lmx/lecture-2.mov"]
    running.wait_tool_call("C")
    for uuid, stem in zip("ABC", ("lecture", "lecture-1", "lecture-2")):
        movie.decodes(running.path(f"/var/lmx/{stem}.mov"))
        assert read_document(running.path(f"/var/lmx/{stem}.xml"))["RecordingMetadata_TITLE"] == f"Title of {uuid}"
    assert running.submitted() == ["A", "B", "C"]


def test_the_tool_is_told_the_name_that_the_movie_got(running):
    running.path("/var/lmx/lecture.mov").write_text("somebody's")
    reply = running.start_recording("A", RecordingMetadata_ADHOC_FILE_PATH="/var/lmx/lecture.mov",
                                    RecordingMetadata_ADHOC_WORKFLOW_UUID="W-1",
                                    RecordingMetadata_AGENT_USERNAME="ada", RecordingMetadata_AGENT_PASSWORD="secret")
    assert reply.text == "cmdStatus=0"
    running.let_record(1)
    running.command("STOP")
    call = running.wait_tool_call("/var/lmx/lecture-1.mov")
    assert call["arguments"][3:5] == ["--file", "/var/lmx/lecture-1.mov"]
    assert running.path("/var/lmx/lecture.mov").read_text() == "somebody's"
