"""cpu, cpu-file: CPU seconds per recorded second, whole process, against bare pipelines with the same encoders."""
import time

from ground import movie_streams, recording
from measuring import CpuSpan, median, threads
from peers import (Picture, Process, ffmpeg_words, file_sources, gst_launch, make_camera_file, synthetic_sources,
                   x264_options)
from report import Result, Row

PICTURES = (Picture(640, 360), Picture(1280, 720), Picture(1920, 1080))
WARM_UP = 3.0
DISTURBED = 0.1  # busy cores of others


class Pairs:
    """Samples of one figure, ours and the peers', taken in turns so that what disturbs one disturbs the others. A turn
    that others disturbed is taken again, as long as there is hope for better ones."""

    def __init__(self, ground):
        self.wanted, self.most = (1, 1) if ground.quick else (5, 10)
        self.seconds = 4.0 if ground.quick else 10.0
        self.turns = []
        self.thread_seconds = {}

    def run(self, takers):
        """`takers` {name: function that measures once}, "ours" among them."""
        while len(self.turns) < self.most and len(self.calm()) < self.wanted:
            names = list(takers) if len(self.turns) % 2 == 0 else list(reversed(takers))
            self.turns.append({name: takers[name]() for name in names})

    def calm(self):
        return [turn for turn in self.turns if all(span.others <= DISTURBED for span in turn.values())]

    def chosen(self):
        """The calm turns when there are enough of them for a median, else all."""
        calm = self.calm()
        return calm if len(calm) >= min(3, self.wanted) else self.turns

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
        ours = [turn["ours"].cpu for turn in self.chosen()]
        theirs = [turn[peer].cpu for turn in self.chosen()]
        return Row(name, median(ours), "s/s", median(theirs), peer_name,
                   ratio=median([a / b for a, b in zip(ours, theirs)]), ratio_goal=goal,
                   samples={"ours": ours, "peer": theirs, "ratio": [a / b for a, b in zip(ours, theirs)]})

    def note(self, what):
        spans = [span for turn in self.chosen() for span in turn.values()]
        rounding = max(abs(span.cpu - span.stat_cpu) for span in spans)
        others = max(span.others for span in spans)
        return (f"{what}: {len(self.chosen())} turns of {self.seconds:g} s out of {len(self.turns)}, of which "
                f"{len(self.calm())} were undisturbed; load of others meanwhile at most {others:.2f} cores; "
                f"process clock and utime + stime differ by at most {rounding:.3f} s/s")

    def thread_note(self):
        """Where the daemon's time goes: the sum over its threads of a name."""
        shares = {name: sum(values) / len(self.turns) for name, values in self.thread_seconds.items()}
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
            sources = synthetic_sources(picture)
            pairs.run({"ours": ours, "gst": peer_taker(
                pairs, lambda: gst_launch(picture, sources, target, ground.environment), target)})
            settings = same_settings(x264_options(ours.movie), x264_options(target))
        target.unlink()
        result.rows.append(pairs.row(f"cpu {picture}", "gst", "gst-launch-1.0", 1.02))
        result.notes += [pairs.note(str(picture)) + "; " + settings, f"{picture}: {pairs.thread_note()}"]
    result.notes.append(
        "The peer records the same pictures and sound: the daemon's own synthetic camera is built into a plug-in for "
        "it. It writes the same fragments of 0.5 s with GStreamer's muxer. It differs in that it has no queue and no "
        "change of threads between camera and encoder, cuts nothing along marks, keeps no journal, and never syncs its file.")
    return result


def cpu_file(ground):
    """The same with a movie file as the camera: every side gets the same pictures, and ffmpeg can take part."""
    picture = Picture(1280, 720)
    pairs = Pairs(ground)
    movie = make_camera_file(picture, WARM_UP + pairs.seconds + 10, ground.folder, ground.environment)
    gst, ffmpeg = ground.folder / "gst.mov", ground.folder / "ffmpeg.mov"
    with ground.agent(start=False) as agent:
        inside = agent.sandbox.root / "var/lmx/camera.mov"
        inside.write_bytes(movie.read_bytes())
        camera = "file:///var/lmx/camera.mov"
        agent.preferences(RecordingCapturePreset="Video:Better", RecordingVideoInput=camera,
                          RecordingAudioInput=camera)
        agent.start()
        ours = Ours(agent, pairs, "FILE")
        sources, words = file_sources(movie), ffmpeg_words(picture, movie, ffmpeg)
        pairs.run({
            "ours": ours,
            "gst": peer_taker(pairs, lambda: gst_launch(picture, sources, gst, ground.environment), gst),
            "ffmpeg": peer_taker(pairs, lambda: Process(words, ground.environment), ffmpeg)})
        settings = {name: same_settings(x264_options(ours.movie), x264_options(path))
                    for name, path in (("gst-launch-1.0", gst), ("ffmpeg", ffmpeg))}
    result = Result([pairs.row(f"cpu-file {picture}", "gst", "gst-launch-1.0", 1.02),
                     pairs.row(f"cpu-file {picture}", "ffmpeg", "ffmpeg", 1.05)])
    result.notes += [pairs.note(str(picture)), *(f"{name}: {text}" for name, text in settings.items()),
                     pairs.thread_note(),
                     "A movie of the same size plays as the camera on all sides, so decoding is part of every figure. "
                     "ffmpeg paces its reading (-re) and converts nothing; the others convert, scale and rate as the "
                     "daemon's file camera does."]
    return result
