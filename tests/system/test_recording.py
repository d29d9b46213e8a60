"""A recording from START to the submitted movie, with the synthetic camera and microphone."""
import re

import pytest
from harness import movie
from harness.agent import DEFAULTS, REPOSITORY
from harness.log_reader import Level
from harness.waiting import let_pass

FPS = 30


def test_a_recording_of_ten_seconds(running):
    start = running.start_recording("TALK-1", RecordingMetadata_TITLE="My Talk & <more>")
    assert start.text == "cmdStatus=0"
    running.let_record(10)
    stop = running.command("STOP")
    assert stop.text == "cmdStatus=0"
    wanted = stop.sent - start.received

    seconds = running.wait_recorded("TALK-1")
    assert abs(seconds - wanted) <= 1
    call = running.wait_tool_call("TALK-1")
    assert call["arguments"] == ["--server", DEFAULTS["LumexURL"], "--submit", "--recording", "TALK-1", "--delete"]
    running.log.wait("^Post-process mechanism completed with success$", level=Level.INFO)

    path = running.movie("TALK-1")
    streams = movie.streams(path)
    assert (streams["video"].codec, streams["audio"].codec) == ("h264", "aac")
    assert (streams["video"].width, streams["video"].height) == (640, 360)
    assert streams["video"].rate == "30/1"
    for stream in streams.values():
        assert abs(stream.duration - wanted) < 0.1, (stream, wanted)
    assert abs(streams["video"].start - streams["audio"].start) < 0.04
    movie.decodes(path)
    assert "H.264" in movie.discover(path)
    assert len(movie.runs(movie.counters(path))) == 1
    times = movie.frame_times(path)
    assert all(abs(b - a - 1 / FPS) < 0.002 for a, b in zip(times, times[1:]))
    check_document(running.document("TALK-1"), start, stop, seconds)
    assert path.with_suffix(".xml").stat().st_mode & 0o777 == 0o600, "documents may hold a password"


def check_document(document, start, stop, seconds):
    assert abs(int(document.pop("RecordingMetadata_START_DATE")) - start.received) <= 2
    assert abs(int(document.pop("RecordingMetadata_END_DATE")) - stop.received) <= 3
    assert document == {
        "RecordingMetadata_RECORDING_UUID": "TALK-1",
        "RecordingMetadata_MAX_RECORDING_MINUTES": "60",
        "RecordingMetadata_UNATTENDED_RECORDING_MINUTES": "60",
        "RecordingMetadata_TITLE": "My Talk & <more>",
        "RecordingMetadata_MACHINE_UUID": DEFAULTS["CameraUUID"],
        "RecordingMetadata_DURATION": str(seconds),
        "RecordingMetadata_TYPE": "Audio+Video",
        "RecordingMetadata_VIDEO_MAXIMUM_FRAME_RATE": "30",
        "RecordingMetadata_DATA_MEDIA_EXTENSION": ".mov",
    }


def test_log_lines_of_a_recording(running):
    running.start_recording("TALK-2")
    path = re.escape(f"{REPOSITORY}/TALK-2.mov")
    running.log.wait(rf'^"{path}" recording started$', level=Level.NOTICE)
    running.let_record(1)
    running.command("PAUSE")
    running.log.wait(rf'^"{path}" recording paused \(current duration: [12]s\)$', level=Level.NOTICE)
    running.command("RESUME")
    running.log.wait(rf'^"{path}" recording resumed$', level=Level.NOTICE)
    running.command("STOP")
    running.wait_recorded("TALK-2")
    running.wait_tool_call("TALK-2")
    for text in ("Post-process mechanism is starting...", "Completion in progress...",
                 "Recording completed with success", "Post-process mechanism completed with success"):
        running.log.wait("^" + re.escape(text) + "$", level=Level.INFO)
    running.log.wait("^/usr/bin/lumex --server lumex.example.test --submit --recording TALK-2 --delete $",
                     level=Level.DEBUG)
    assert not running.log.lines(level=Level.CRITICAL) and not running.log.lines(level=Level.ALERT)


def test_start_at_reference_settings(agent):
    """The default size of the synthetic camera, another frame rate."""
    agent.preferences(RecordingVideoInput="test://video", RecordingVideoMaximumFrameRate="25")
    agent.start()
    agent.record("HD")
    stream = movie.streams(agent.movie("HD"))["video"]
    assert (stream.width, stream.height, stream.rate) == (1280, 720, "25/1")


@pytest.mark.parametrize("kind, kinds", [("Audio", {"audio"}), ("Video", {"video"})])
def test_one_medium_only(agent, kind, kinds):
    agent.preferences(RecordingType=kind)
    agent.start()
    start, stop = agent.record("ONE", 2)
    agent.wait_tool_call("ONE")
    streams = movie.streams(agent.movie("ONE"))
    assert set(streams) == kinds
    wanted = stop.sent - start.received
    assert all(abs(stream.duration - wanted) < 0.3 for stream in streams.values()), (streams, wanted)
    assert agent.document("ONE")["RecordingMetadata_TYPE"] == kind


def test_audio_only_lasts_one_recording(running):
    running.record("A", RecordingMetadata_AUDIO_ONLY="true")
    running.record("B")
    assert set(movie.streams(running.movie("A"))) == {"audio"}
    assert set(movie.streams(running.movie("B"))) == {"audio", "video"}
    assert running.document("A")["RecordingMetadata_TYPE"] == "Audio"
    assert running.document("B")["RecordingMetadata_TYPE"] == "Audio+Video"


def test_pause_and_resume_twice(running):
    replies = {"start0": running.start_recording("PAUSES")}
    for part in (0, 1, 2):
        running.let_record(2 * (part + 1))
        replies[f"stop{part}"] = running.command("PAUSE" if part < 2 else "STOP")
        if part < 2:
            let_pass(1, "a pause of a second")
            replies[f"start{part + 1}"] = running.command("RESUME")
    assert {reply.text for reply in replies.values()} == {"cmdStatus=0"}
    running.wait_recorded("PAUSES")

    path = running.movie("PAUSES")
    movie.decodes(path)
    spans = movie.runs(movie.counters(path))
    assert len(spans) == 3, spans
    marks = []
    for part, (first, last) in enumerate(spans):
        begin, end = replies[f"start{part}"], replies[f"stop{part}"]
        marks += [(first, "start", begin.sent, begin.received), (last, "stop", end.sent, end.received)]
    # The first START opens the camera: its first picture may come a little after the mark.
    marks[0] = (*marks[0][:3], marks[0][3] + 0.3)
    movie.camera_clock(marks, FPS)
    frames = sum(last - first + 1 for first, last in spans)
    streams = movie.streams(path)
    assert abs(streams["video"].duration - frames / FPS) < 0.02
    assert abs(streams["audio"].duration - frames / FPS) < 0.05


def test_status_in_a_pause(running):
    running.start_recording("P")
    assert running.command("STATUS").fields["recordStatus"] == "2"
    running.command("PAUSE")
    assert running.command("STATUS").fields["recordStatus"] == "1"
    running.command("RESUME")
    assert running.command("STATUS").fields["recordStatus"] == "2"
    running.command("STOP")
    running.wait_recorded("P")
    assert running.command("STATUS").fields["recordStatus"] == "0"


def test_cancel_leaves_nothing_behind(running):
    before = running.repository()
    running.start_recording("GONE")
    running.let_record(1)
    assert running.command("CANCEL").text == "cmdStatus=0"
    running.log.wait("Process cancelCapture", level=Level.DEBUG)
    running.record("KEPT")
    running.wait_tool_call("KEPT")
    running.log.wait("^Post-process mechanism completed with success$")
    assert sorted(set(running.repository()) - set(before)) == ["KEPT.mov", "KEPT.xml"]
    assert running.submitted() == ["KEPT"]
