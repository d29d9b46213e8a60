"""The harness's readers against known material: a reader that finds nothing would prove nothing."""
import socket
import subprocess
import time

import numpy
import pytest
from harness import movie, sounds
from harness.agent import REPOSITORY
from harness.numbered import make_movie
from harness.one_thread import main_thread_held
from harness.pipewire_hall import PipeWireHall
from harness.power_cut import PowerCut
from harness.rtsp_camera import RtspCamera, mode
from harness.slow_calls import slow_directories
from harness.unread import all_read, wait_read
from harness.waiting import let_pass, wait_until


def test_counters_are_read_back(tmp_path):
    numbers = [0, 1, 2, 30, 31, 32, 65535, 65536, 2**31 + 5]
    make_movie(tmp_path / "a.mov", numbers)
    assert movie.counters(tmp_path / "a.mov") == numbers


@pytest.mark.parametrize("doubled", [[4, 5, 5, 6], [4, 5, 4]])
def test_a_doubled_or_reversed_frame_is_a_failure(doubled):
    with pytest.raises(AssertionError, match="frame"):
        movie.runs(doubled)


def test_a_missing_frame_splits_a_run():
    assert movie.runs([3, 4, 5, 7, 8]) == [(3, 5), (7, 8)]


def test_boundaries_must_fit_one_camera_clock():
    # Camera opened at 100 s, 30 frames a second: recorded from 101 to 102 and from 103 to 104.
    marks = [(30, "start", 101.0, 101.001), (59, "stop", 102.0, 102.001),
             (90, "start", 103.0, 103.001), (119, "stop", 104.0, 104.001)]
    low, high = movie.camera_clock(marks, 30)
    assert low < 100 < high
    late = [*marks[:3], (119 + 5, "stop", 104.0, 104.001)]
    with pytest.raises(AssertionError, match="camera opened"):
        movie.camera_clock(late, 30)


def test_sound_is_found_where_it_is():
    noise = numpy.random.default_rng(7).normal(size=20000)
    offset, likeness = movie.best_match(noise[5000:9000] * 0.3, noise)
    assert offset == 5000 and likeness > 0.999
    _, stranger = movie.best_match(numpy.random.default_rng(8).normal(size=4000), noise)
    assert stranger < 0.3


def test_a_broken_movie_is_a_failure(tmp_path):
    make_movie(tmp_path / "a.mov", range(30))
    whole = (tmp_path / "a.mov").read_bytes()
    (tmp_path / "a.mov").write_bytes(whole[: len(whole) // 2])
    with pytest.raises(AssertionError):
        movie.streams(tmp_path / "a.mov")
    with pytest.raises(AssertionError):
        movie.discover(tmp_path / "a.mov")


@pytest.mark.parametrize("way", ["local socket", "tunnel"])
def test_what_the_daemon_has_not_read_is_seen(agent, server, way):
    with agent.connect() if way == "local socket" else server.peer as peer:
        agent.sandbox.freeze()
        peer.sendall(b"STATUS")
        assert not all_read(agent, peer)
        agent.sandbox.thaw()
        wait_read(agent, peer)
        assert all_read(agent, peer)


WRITER = """
import os
os.chdir("REPOSITORY")
def write(path, text, mode="w", sync=True):
    with open(path, mode) as file:
        file.write(text)
        file.flush()
        if sync:
            os.fdatasync(file)
def sync_names(path):
    descriptor = os.open(path, os.O_RDONLY)
    os.fsync(descriptor)
write("whole", "one")
write("whole", " and two", mode="a", sync=False)
write("empty", "lost", sync=False)
write("old name", "renamed")
os.mkdir("folder")
sync_names(".")
write("folder/inner", "text")
os.rename("old name", "new name")
write("elsewhere", "synced, its name not")
LAST
write("late", "lost", sync=False)
"""


@pytest.mark.parametrize("names, last, left", [
    ("apart", "", {"whole": "one", "empty": "", "old name": "renamed"}),
    ("apart", "sync_names('.')", {"whole": "one", "empty": "", "new name": "renamed",
                                  "elsewhere": "synced, its name not"}),
    ("apart", "sync_names('folder')", {"whole": "one", "empty": "", "old name": "renamed", "folder/inner": "text"}),
    ("together", "", {"whole": "one", "empty": "", "new name": "renamed", "elsewhere": "synced, its name not",
                      "folder/inner": "text"})])
def test_a_power_cut_leaves_what_was_synced(agent, names, last, left):
    power = PowerCut(agent, names)
    script = WRITER.replace("REPOSITORY", REPOSITORY).replace("LAST", last)
    result = agent.run(prefix=(*power.prefix, "/usr/bin/python3", "-c", script))
    assert (result.returncode, result.stderr) == (0, "")
    power.restore()
    top = agent.path(REPOSITORY)
    assert {str(path.relative_to(top)): path.read_text() for path in top.rglob("*") if path.is_file()} == left


def test_what_was_logged_is_read_before_it_is_asked_for(agent):
    with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as sender:
        sender.connect(str(agent.path("/dev/log")))
        for number in range(1, 2001):
            sender.send(b"<31>lmxagentd[1]: line %d" % number)
            if number % 100 == 0:
                assert agent.log.mark() == number
    assert agent.log.lines()[-1].text == "line 2000"


def test_the_main_thread_is_held_and_no_other(agent, server):
    with main_thread_held(agent):
        assert server.command("STATUS").startswith("cmdStatus=0")
        mark = agent.log.mark()
        server.send("PAUSE")  # waits for the main thread
        let_pass(0.5, "nothing happens")
        assert not agent.log.lines("Process pauseCapture", after=mark)
    assert server.reply() == "cmdStatus=0"
    assert agent.log.lines("Process pauseCapture", after=mark)


def test_sounds_are_told_apart(tmp_path):
    subprocess.run(["ffmpeg", "-v", "error", "-f", "lavfi", "-i", "sine=frequency=440:duration=1", "-f", "lavfi", "-i",
                    "sine=frequency=720:duration=1", "-filter_complex", "[0]apad=pad_dur=1[a];[a][1]concat=v=0:a=1",
                    "-c:a", "aac", str(tmp_path / "a.mov")], check=True, timeout=60)
    assert sounds.heard(tmp_path / "a.mov") == [440, 440, None, None, 720, 720]


def test_steps_and_bursts_are_found():
    time = numpy.arange(48000 * 3) / 48000
    sine = 0.3 * numpy.sin(2 * numpy.pi * 1000 * time)
    assert sounds.breaks(sine, 1000, 48000) == pytest.approx((0, 1), abs=1e-9)
    leap, _ = sounds.breaks(numpy.delete(sine, 70000), 1000, 48000)
    assert leap == pytest.approx(1 / 48000, rel=0.1), "one sample is missing"
    hum = numpy.sin(2 * numpy.pi * 440 * time)
    assert all(sounds.breaks(numpy.delete(hum, range(70000, 70000 + lost)), 440, 48000)[0] > 1.5 * sounds.UNBROKEN
               for lost in (256, 480, 512, 1024)), "what sound servers and drivers lose at once"
    glide = numpy.sin(2 * numpy.pi * 440 * (time + 0.005 * numpy.maximum(time - 1, 0)))
    assert sounds.breaks(glide, 440, 48000)[0] < sounds.UNBROKEN
    assert sounds.breaks(numpy.where(abs(time - 1.5) < 0.01, 0, sine), 1000, 48000)[1] < 0.01, "a hole"
    since = time % 1.001
    world = sine * numpy.where(since < 0.02, numpy.sin(numpy.pi * since / 0.02) ** 2, 0)
    assert sounds.bursts(world, 48000) == pytest.approx([0, 1.001, 2.002], abs=1e-4)
    assert not sounds.bursts(0 * world, 48000)


def test_brightness_is_that_of_the_part(tmp_path):
    make_movie(tmp_path / "a.mov", [0, 2**32 - 1])
    top, rest = (movie.brightness(tmp_path / "a.mov", f"crop=320:{height}:0:{y}") for height, y in ((8, 0), (160, 20)))
    assert top == pytest.approx([0, 255], abs=3) and rest == pytest.approx([90, 90], abs=3)


def packets_seen(agent, camera, seconds):
    """What a viewer gets: (time since the first packet, whether it is a key frame) for each picture."""
    seen = subprocess.run([*agent.sandbox.entering("net"), "timeout", str(seconds), "ffprobe", "-v", "quiet",
                           "-rtsp_transport", "tcp", "-select_streams", "v", "-show_entries", "packet=pts_time,flags",
                           "-of", "csv=p=0", camera.uri], capture_output=True, timeout=60, check=False).stdout.decode()
    pairs = [line.split(",")[:2] for line in seen.splitlines() if "," in line]
    times = [(float(time), "K" in flags) for time, flags in pairs if time != "N/A"]
    return [(time - times[0][0], key) for time, key in times]


def test_a_network_camera_withholds_its_key_frames(agent):
    with RtspCamera(agent.prepare(), key_frame_after=2, user="hall", password="secret") as camera:
        seen = packets_seen(agent, camera, 6)
        wait_until(lambda: camera.viewers() == [1, 0], what="the viewer's end")
    assert len(seen) > 60
    assert min(time for time, key in seen if key) == pytest.approx(2, abs=1.1), seen


def test_a_network_camera_changes_its_mode(agent):
    with RtspCamera(agent.prepare()) as camera:
        command = ["ffmpeg", "-v", "error", "-rtsp_transport", "tcp", "-t", "3", "-i", camera.uri, "-c", "copy"]
        with subprocess.Popen([*agent.sandbox.entering("net"), *command, agent.path("/tmp/seen.ts")]):
            wait_until(lambda: camera.viewers() == [1], what="a viewer")
            camera.change("mode", "caps", mode((640, 480)))
        sizes = subprocess.run(["ffprobe", "-v", "quiet", "-select_streams", "v", "-show_entries",
                                "frame=width,height", "-of", "csv=p=0", agent.path("/tmp/seen.ts")],
                               capture_output=True, check=True, timeout=60)
    assert {b"320,180", b"640,480"} <= {line[:7] for line in sizes.stdout.splitlines()}


def test_virtual_devices_deliver_again_and_again(agent):
    with PipeWireHall(agent) as hall, hall.microphone("lectern", frequency=440), hall.camera("podium") as camera:
        for _ in range(3):
            hall.watch("podium", "video/x-raw", "15 ! fakesink")
        hall.watch("lectern", "audio/x-raw", "30 ! fakesink")
        camera.unplug()
        assert not hall.has("podium") and hall.has("lectern")


def test_a_slow_disk_is_slow(agent, tmp_path):
    prefix = [word.replace("/var/slow", str(agent.path("/var/slow"))) for word in slow_directories(agent, 300)]
    before = time.monotonic()
    subprocess.run([*prefix, "mkdir", str(tmp_path / "a")], check=True, timeout=20)
    assert time.monotonic() - before > 0.3 and (tmp_path / "a").is_dir()
