"""cpu, cpu-file: CPU seconds per recorded second, whole process, against bare pipelines with the same encoders."""
import subprocess

from ground import movie_streams, recording
from measuring import CpuSpan, median, threads
from peers import Picture, Process, ffmpeg_words, file_sources, gst_launch, synthetic_sources, x264_options
from report import Result, Row

import time

PICTURES = (Picture(640, 360), Picture(1280, 720), Picture(1920, 1080))
WARM_UP = 3.0
DISTURBED = 0.1  # busy cores of others


class Pairs:
    """Samples of one figure, ours and the peers', taken in turns so that what disturbs one disturbs the others."""

    def __init__(self, ground):
        self.count = 1 if ground.quick else 5
        self.seconds = 4.0 if ground.quick else 10.0
        self.spans = {}
        self.thread_seconds = {}

    def run(self, takers):
        """`takers` {name: function that measures once}, "ours" among them."""
        for turn in range(self.count):
            names = list(takers) if turn % 2 == 0 else list(reversed(takers))
            for name in names:
                self.spans.setdefault(name, []).append(takers[name]())

    def measure(self, pid, by_thread=False):
        time.sleep(WARM_UP)
        before = threads(pid) if by_thread else {}
        span = CpuSpan(pid, self.seconds)
        if by_thread:
            for thread, (name, ran, _switches) in threads(pid).items():
                share = (ran - before.get(thread, (name, 0.0, 0))[1]) / span.seconds
                self.thread_seconds.setdefault(name, []).append(share)
        return span

    def row(self, name, peer, peer_name, goal):
        ours = [span.cpu for span in self.spans["ours"]]
        theirs = [span.cpu for span in self.spans[peer]]
        return Row(name, median(ours), "s/s", median(theirs), peer_name,
                   ratio=median([a / b for a, b in zip(ours, theirs)]), ratio_goal=goal,
                   samples={"ours": ours, "peer": theirs, "ratio": [a / b for a, b in zip(ours, theirs)]})

    def disturbed(self):
        spans = [span for spans in self.spans.values() for span in spans]
        return sum(span.others > DISTURBED for span in spans), len(spans), max(span.others for span in spans)

    def note(self, what):
        bad, all_, most = self.disturbed()
        rounding = max(abs(s.cpu - s.stat_cpu) for spans in self.spans.values() for s in spans)
        return (f"{what}: {self.count} pairs of {self.seconds:g} s; load of others above {DISTURBED} cores in {bad} of "
                f"{all_} samples, at most {most:.2f}; process clock and utime + stime differ by at most {rounding:.3f} s/s")

    def thread_note(self):
        """Where the daemon's time goes: the sum over its threads of a name."""
        shares = {name: sum(values) / self.count for name, values in self.thread_seconds.items()}
        top = sorted(shares.items(), key=lambda item: -item[1])[:8]
        return "threads of the daemon: " + ", ".join(f"{name} {share:.4f}" for name, share in top)


class Ours:
    """Takes samples of the daemon's recordings, and knows the last movie."""

    def __init__(self, agent, pairs, prefix):
        self.agent, self.pairs, self.prefix, self.count = agent, pairs, prefix, 0

    def __call__(self):
        self.count += 1
        uuid = f"{self.prefix}-{self.count}"
        with recording(self.agent, uuid):
            span = self.pairs.measure(self.agent.sandbox.daemon_pid, by_thread=True)
        self.movie = self.agent.movie(uuid)
        shortest = min(movie_streams(self.movie).values())
        assert shortest >= self.pairs.seconds + WARM_UP - 0.5, f"only {shortest} s of {uuid} were recorded"
        return span


def peer_taker(pairs, begin, target):
    def take():
        peer = begin()
        try:
            return pairs.measure(peer.pid)
        finally:
            problem = peer.stop()
            assert target.exists() and target.stat().st_size > 0, f"the peer wrote nothing: {problem}"
    return take


def same_settings(ours, theirs):
    if ours == theirs:
        return "encoder settings as noted in the movies are the same"
    differing = sorted(set(ours.split()) ^ set(theirs.split()))
    return "ENCODER SETTINGS DIFFER: " + " ".join(differing)


def cpu(ground):
    """CPU per recorded second with the synthetic camera at three sizes, against the bare pipeline in gst-launch-1.0."""
    result = Result()
    for picture in PICTURES:
        pairs = Pairs(ground)
        target = ground.folder / "peer.mov"
        with ground.agent(RecordingVideoInput=f"test://video?size={picture}") as agent:
            ours = Ours(agent, pairs, "CPU")
            pairs.run({"ours": ours, "gst": peer_taker(
                pairs, lambda: gst_launch(picture, synthetic_sources(picture), target, ground.environment), target)})
            settings = same_settings(x264_options(ours.movie), x264_options(target))
        target.unlink()
        result.rows.append(pairs.row(f"cpu {picture}", "gst", "gst-launch-1.0", 1.02))
        result.notes += [pairs.note(str(picture)) + "; " + settings, f"{picture}: {pairs.thread_note()}"]
    result.notes.append(
        "The peer draws neither frame number nor clock into its pictures (the daemon's synthetic camera does, in every "
        "frame: its cost is ours alone, and the pictures differ there), has no queue between camera and encoder, counts "
        "no frames, and never syncs its file; it writes the same fragments of 0.5 s.")
    return result


def make_camera_file(ground, picture, seconds):
    """A movie to play as a camera, of decent quality."""
    path = ground.folder / f"camera-{picture}.mov"
    frames = int(seconds * 30)
    video, audio = (source.replace("is-live=true", f"num-buffers={count}") for source, count in
                    zip(synthetic_sources(picture), (frames, int(seconds * 100))))
    line = (f"{video} ! timeoverlay ! x264enc speed-preset=veryfast bitrate={2 * picture.kilobits} key-int-max=60 ! "
            f"qtmux name=mux ! filesink location={path} {audio} ! avenc_aac ! mux.")
    subprocess.run(["gst-launch-1.0", "-q", *line.split()], env=ground.environment, check=True, timeout=120)
    return path


def cpu_file(ground):
    """The same with a movie file as the camera: every side gets the same pictures, and ffmpeg can take part."""
    picture = Picture(1280, 720)
    pairs = Pairs(ground)
    movie = make_camera_file(ground, picture, WARM_UP + pairs.seconds + 10)
    gst, ffmpeg = ground.folder / "gst.mov", ground.folder / "ffmpeg.mov"
    with ground.agent(start=False) as agent:
        inside = agent.sandbox.root / "var/lmx/camera.mov"
        inside.write_bytes(movie.read_bytes())
        camera = "file:///var/lmx/camera.mov"
        agent.preferences(RecordingCapturePreset="Video:Better", RecordingVideoInput=camera, RecordingAudioInput=camera)
        agent.start()
        ours = Ours(agent, pairs, "FILE")
        pairs.run({
            "ours": ours,
            "gst": peer_taker(pairs, lambda: gst_launch(picture, file_sources(movie), gst, ground.environment), gst),
            "ffmpeg": peer_taker(pairs, lambda: Process(ffmpeg_words(picture, movie, ffmpeg), ground.environment), ffmpeg)})
        settings = {name: same_settings(x264_options(ours.movie), x264_options(path))
                    for name, path in (("gst-launch-1.0", gst), ("ffmpeg", ffmpeg))}
    result = Result([pairs.row(f"cpu-file {picture}", "gst", "gst-launch-1.0", 1.02),
                     pairs.row(f"cpu-file {picture}", "ffmpeg", "ffmpeg", 1.05)])
    result.notes += [pairs.note(str(picture)), *(f"{name}: {text}" for name, text in settings.items()), pairs.thread_note(),
                     "A movie of the same size plays as the camera on all sides, so decoding is part of every figure. "
                     "ffmpeg paces its reading (-re) and converts nothing; the others convert, scale and rate as the "
                     "daemon's file camera does."]
    return result
