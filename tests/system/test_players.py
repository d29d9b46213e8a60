"""Sound and picture stay together in players that share no code with the writer."""
import json
import re
import subprocess

import pytest
from harness import movie, players
from harness.agent import REPOSITORY
from harness.waiting import wait_until

LIMIT = 0.005  # seconds
SECONDS = 6


def whole(agent):
    agent.record("PLAY", SECONDS)
    agent.wait_tool_call("PLAY")


def recovered(agent):
    agent.start_recording("PLAY")
    agent.let_record(SECONDS)
    agent.kill9()
    agent.start()
    wait_until(lambda: agent.path(f"{REPOSITORY}/PLAY.xml").exists(), 20, "the recovered movie")


def cut(agent):
    """As if START had come 1.37 s later, so that the movie is a copy that begins between key frames and packets."""
    agent.start_recording("PLAY")
    agent.let_record(SECONDS)
    agent.kill9()
    (journal,) = agent.path(f"{REPOSITORY}/.lmxagentd").glob("*/journal")
    text = re.sub(r"(?m)^(start PLAY )([\d.]+)", lambda m: f"{m[1]}{float(m[2]) + 1.37}", journal.read_text())
    journal.write_text(text)
    agent.start()
    wait_until(lambda: agent.path(f"{REPOSITORY}/PLAY.xml").exists(), 20, "the recovered movie")


@pytest.fixture(params=[whole, recovered, cut], ids=lambda how: how.__name__)
def played(request, running):
    request.param(running)
    return running.movie("PLAY")


@pytest.mark.limit(240)
def test_the_tick_is_heard_with_its_frame(played):
    views = {"FFmpeg": players.ffmpeg(played), "GStreamer": players.gstreamer(played)}
    if players.has_browser():
        views["browser, media element"], views["browser, decoder"] = players.browser(played)
    late = {player: view.lateness() for player, view in views.items()}
    print({player: f"{min(times) * 1000:.1f} … {max(times) * 1000:.1f} ms" for player, times in late.items()})
    for player, times in late.items():
        assert len(times) >= SECONDS - 2, (player, times)
        assert all(abs(time) < LIMIT for time in times), (player, times)
    assert players.has_browser(), "what has been measured is right, but there is no browser to measure"


@pytest.mark.limit(240)
def test_without_the_edit_list_the_measurement_finds_the_sound_late(running, tmp_path):
    whole(running)
    path = tmp_path / "bare.mov"
    path.write_bytes(running.movie("PLAY").read_bytes().replace(b"edts", b"free"))
    expected = 1024 / players.RATE
    views = [players.ffmpeg(path), players.gstreamer(path)]
    if players.has_browser():
        views += players.browser(path)
    for view in views:
        assert all(abs(time - expected) < 2 * LIMIT for time in view.lateness()), view.lateness()


def test_what_players_say_of_the_tracks(running):
    whole(running)
    path = running.movie("PLAY")
    movie.discover(path)
    text = subprocess.run(["ffprobe", "-v", "error", "-show_streams", "-show_format", "-of", "json", path], check=True,
                          capture_output=True, timeout=60).stdout
    probed = json.loads(text)
    video, audio = probed["streams"]
    assert [video[f"color_{what}"] for what in ("primaries", "transfer", "space", "range")] == ["bt709"] * 3 + ["tv"]
    for part in (video, audio, probed["format"]):
        assert part["tags"]["creation_time"].startswith("20"), part["tags"]
    assert float(video["start_time"]) == float(audio["start_time"]) == 0
    packet = json.loads(subprocess.run(
        ["ffprobe", "-v", "error", "-select_streams", "a", "-show_packets", "-read_intervals", "%+#1", "-of", "json",
         path], check=True, capture_output=True, timeout=60).stdout)["packets"][0]
    boxes = subprocess.run(["ffprobe", "-v", "trace", path], check=True, capture_output=True, timeout=60).stderr.decode()
    assert "nclc: pri 1 trc 1 matrix 1" in boxes
    assert "edit list 0 - media time: 1024" in boxes
    for box in ("sgpd", "sbgp"):
        assert f"type:'{box}' parent:'stbl'" in boxes
    assert packet["pts"] == -1024 and packet["side_data_list"][0]["skip_samples"] == 1024
