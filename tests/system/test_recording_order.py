"""START, STOP and CANCEL in orders that a careful operator would not choose."""
from harness import movie
from harness.log_reader import Level
from harness.waiting import wait_until

FPS = 30


def test_stop_at_once_after_start(running):
    for round_ in range(3):
        assert running.start_recording(f"SHORT-{round_}").text == "cmdStatus=0"
        assert running.command("STOP").text == "cmdStatus=0"
    for round_ in range(3):
        running.wait_recorded(f"SHORT-{round_}")
        path = running.movie(f"SHORT-{round_}")
        if path.exists():  # a movie without a single frame is none
            movie.decodes(path)
            assert len(movie.counters(path)) < FPS
    start, stop = running.record("AFTER")
    assert abs(movie.streams(running.movie("AFTER"))["video"].duration - (stop.sent - start.received)) < 0.3


def test_stop_without_start(running):
    assert running.command("STOP").text == "cmdStatus=0"
    running.log.wait(r"^Recording canceled, missing RecordingMetadata_RECORDING_UUID\.$", level=Level.ALERT)
    assert running.command("STATUS").fields["recordStatus"] == "0"
    assert running.repository() == [] and running.tool_calls() == []


def test_pause_resume_and_cancel_without_start(running):
    for command in ("PAUSE", "RESUME", "CANCEL"):
        assert running.command(command).text == "cmdStatus=0"
    running.record("NEXT")
    movie.decodes(running.movie("NEXT"))


def test_start_during_a_recording(running):
    first = running.start_recording("FIRST", RecordingMetadata_TITLE="one")
    running.let_record(2)
    second = running.start_recording("SECOND", RecordingMetadata_TITLE="two")
    assert (first.text, second.text) == ("cmdStatus=0", "cmdStatus=4")
    running.log.wait("^Unable to start, capture not idle$", level=Level.ERROR)
    running.log.wait(r"^An error occurred during recording \(4\)$", level=Level.ERROR)
    assert running.command("STATUS").fields["recordStatus"] == "2"
    running.let_record(4)
    stop = running.command("STOP")
    running.wait_tool_call("FIRST", event="end")

    (span,) = movie.runs(movie.counters(running.movie("FIRST")))
    movie.camera_clock([(span[0], "start", first.sent, first.received + 0.3),
                        (span[1], "stop", stop.sent, stop.received)], FPS)
    document = running.document("FIRST")
    assert document["RecordingMetadata_RECORDING_UUID"] == "FIRST"
    assert document["RecordingMetadata_TITLE"] == "one"
    assert len(running.log.lines(r"FIRST\.mov", level=Level.NOTICE)) == 2, "recording started, and recording stopped"
    assert not running.log.lines(r"SECOND\.mov|^Recovered")
    assert running.submitted() == ["FIRST"] and running.repository() == ["FIRST.mov", "FIRST.xml"]


def test_two_recordings_in_quick_succession(running):
    running.set_tool({"when": "--submit", "delay": 2})
    spans = {}
    for uuid in ("ONE", "TWO"):
        start = running.start_recording(uuid)
        assert start.text == "cmdStatus=0"
        running.let_record(2)
        spans[uuid] = (start, running.command("STOP"))
    for uuid in ("ONE", "TWO"):
        running.wait_tool_call(uuid, event="end")
        start, stop = spans[uuid]
        (span,) = movie.runs(movie.counters(running.movie(uuid)))
        frames = span[1] - span[0] + 1
        assert (stop.sent - start.received) * FPS - 3 <= frames <= (stop.received - start.sent) * FPS + 3
        assert running.document(uuid)["RecordingMetadata_RECORDING_UUID"] == uuid
    begins, ends = running.tool_calls(), running.tool_calls("end")
    assert [call["arguments"][4] for call in begins] == ["ONE", "TWO"]
    assert ends[0]["time"] <= begins[1]["time"], "one submission at a time"


def test_the_same_identifier_twice(running):
    for title in ("First", "Second"):
        running.record("AGAIN", RecordingMetadata_TITLE=title)
    wait_until(lambda: len(running.tool_calls("end")) == 2, 20, "two submissions")
    for uuid, title in (("AGAIN-replaced", "First"), ("AGAIN", "Second")):
        movie.decodes(running.movie(uuid))
        assert running.document(uuid)["RecordingMetadata_TITLE"] == title


def test_commands_that_lack_parameters(running):
    complete = "RecordingMetadata_RECORDING_UUID=A,RecordingMetadata_MAX_RECORDING_MINUTES=1"
    for line in ("START", "START " + complete, "START RecordingMetadata_MAX_RECORDING_MINUTES=1",
                 "SERVER", "SERVER version=2"):
        assert running.command(line).text == "cmdStatus=31", line
    assert running.command("STATUS").fields["recordStatus"] == "0"
    assert running.repository() == []
