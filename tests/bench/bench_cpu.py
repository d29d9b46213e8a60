"""cpu, cpu-file, cpu-mjpeg, cpu-rtsp: CPU seconds per recorded second, whole process, against bare pipelines with the same encoders."""
import contextlib
import re
import shutil
import time

from ground import movie_streams, recording
from harness import rtsp_camera
from harness.waiting import wait_until
from measuring import cpu_shares, median, threads
from peers import (FROM_FULL_RANGE_601, FULL_RANGE_601, Picture, Process, ffmpeg_file, ffmpeg_rtsp, ffmpeg_words,
                   file_sources, gst_words, make_camera_file, make_mjpeg_camera_file, mjpeg_sources, rtsp_sources,
                   synthetic_sources, x264_options)
from report import Result, Row

PICTURES = (Picture(640, 360), Picture(1280, 720), Picture(1920, 1080))
DISTURBED = 0.1  # busy cores of others
FLOWING = 16 << 10  # bytes of a peer's movie: more than its header, less than a second


class Turns:
    """Samples of one figure. In a turn all sides record at the same time, so that whatever happens on the machine
    happens to each of them; who begins changes from turn to turn."""

    def __init__(self, ground, late=0.5):
        """`late` seconds that a side may lack at its end: what was still under way."""
        self.late = late
        self.count = ground.pick(10, 2, 1)
        self.seconds = ground.pick(10.0, 4.0, 1.0)
        self.warm_up = ground.pick(3.0, 3.0, 1.0)
        self.shares = []
        self.others = []
        self.thread_seconds = {}

    def run(self, sides):
        """`sides` {name: function that gives a context in which a process records, and its process id}, "ours" among
        them."""
        for turn in range(self.count):
            with contextlib.ExitStack() as stack:
                names = list(sides) if turn % 2 == 0 else list(reversed(sides))
                pids = {name: stack.enter_context(sides[name]()) for name in names}
                time.sleep(self.warm_up)
                before = threads(pids["ours"])
                shares, others = cpu_shares(pids, self.seconds)
                self._count_threads(before, threads(pids["ours"]))
            self.shares.append(shares)
            self.others.append(others)

    def _count_threads(self, before, after):
        for thread, (name, ran, _switches) in after.items():
            share = (ran - before.get(thread, (name, 0.0, 0))[1]) / self.seconds
            name = re.sub(r"\d+", "", name)  # elements of later recordings have higher numbers
            self.thread_seconds[name] = self.thread_seconds.get(name, 0.0) + share

    def row(self, name, peer, peer_name, goal):
        ours, theirs = ([turn[side].cpu for turn in self.shares] for side in ("ours", peer))
        ratios = [a / b for a, b in zip(ours, theirs)]
        return Row(name, median(ours), "s/s", median(theirs), peer_name, ratio=median(ratios), ratio_goal=goal,
                   samples={"ours": ours, "peer": theirs, "ratio": ratios})

    def note(self, what):
        rounding = max(abs(share.cpu - share.stat_cpu) for turn in self.shares for share in turn.values())
        calm = sum(others <= DISTURBED for others in self.others)
        return (f"{what}: {self.count} turns of {self.seconds:g} s, all sides at once; in {calm} of them others used "
                f"at most {DISTURBED} cores, in the worst {max(self.others):.2f}; process clock and utime + stime "
                f"differ by at most {rounding:.3f} s/s")

    def thread_note(self):
        """Where the daemon's time goes: the sum over its threads of a name."""
        top = sorted(self.thread_seconds.items(), key=lambda item: -item[1])[:6]
        return "threads of the daemon: " + ", ".join(f"{name} {share / self.count:.4f}" for name, share in top)


class Ours:
    """The daemon's recordings, and the last movie."""

    def __init__(self, agent, turns, prefix):
        self.agent, self.turns, self.prefix, self.count = agent, turns, prefix, 0

    @contextlib.contextmanager
    def __call__(self):
        self.count += 1
        uuid = f"{self.prefix}-{self.count}"
        with recording(self.agent, uuid):
            yield self.agent.sandbox.daemon_pid
        self.movie = self.agent.movie(uuid)
        check_length(self.movie, self.turns)


def check_length(movie, turns):
    """A side that lost media has not done the work."""
    try:
        shortest = min(movie_streams(movie).values())
    except AssertionError as problem:
        raise AssertionError(f"{movie.name}: {problem}") from problem
    assert shortest >= turns.seconds + turns.warm_up - turns.late, f"only {shortest} s of {movie.name} were recorded"


def flowing_peer(words, target, environment, tries=3):
    """A peer whose movie grows. gst-launch-1.0 now and then never begins with a network camera: it is begun again."""
    for left in reversed(range(tries)):
        target.unlink(missing_ok=True)
        peer = Process(words, environment)
        try:
            wait_until(lambda peer=peer: peer.ended() or (target.exists() and target.stat().st_size > FLOWING), 10,
                       f"media in {target.name}")
            return peer
        except BaseException as problem:
            peer.kill()
            if not left or not isinstance(problem, AssertionError):
                raise


def peer_side(turns, words, target, environment):
    @contextlib.contextmanager
    def side():
        peer = flowing_peer(words, target, environment)
        try:
            yield peer.pid
        finally:
            problem = peer.stop()
        assert target.exists(), f"the peer wrote nothing: {problem}"
        check_length(target, turns)
    return side


def same_settings(ours, theirs):
    if ours == theirs:
        return "encoder settings as noted in the movies are the same"
    differing = sorted(set(ours.split()) ^ set(theirs.split()))
    return "ENCODER SETTINGS DIFFER: " + " ".join(differing)


def cpu(ground):
    """CPU per recorded second with the synthetic camera at three sizes, against the bare pipeline in gst-launch-1.0."""
    result = Result()
    for picture in ground.pick(PICTURES, PICTURES, PICTURES[:1]):
        turns, target, sources = Turns(ground), ground.folder / "peer.mov", synthetic_sources(picture)
        with ground.agent(RecordingVideoInput=f"test://video?size={picture}") as agent:
            ours = Ours(agent, turns, "CPU")
            turns.run({"ours": ours,
                       "gst": peer_side(turns, gst_words(picture, sources, target), target, ground.environment)})
            settings = same_settings(x264_options(ours.movie), x264_options(target))
        target.unlink()
        result.rows.append(turns.row(f"cpu {picture}", "gst", "gst-launch-1.0", 1.02))
        result.notes += [turns.note(str(picture)) + "; " + settings, f"{picture}: {turns.thread_note()}"]
    result.notes.append(
        "The peer records the same pictures and sound: the daemon's own synthetic camera is built into a plug-in for "
        "it. It writes the same fragments of 0.5 s with GStreamer's muxer. It differs in that it has no queue and no "
        "change of threads between camera and encoder, cuts nothing along marks, keeps no journal, and never syncs.")
    return result


class AgainstBoth:
    """The daemon, gst-launch-1.0 and ffmpeg record the same camera."""

    def __init__(self, ground, name, turns, picture):
        self.ground, self.name, self.turns, self.picture = ground, name, turns, picture
        self.gst, self.ffmpeg = ground.folder / f"{name}-gst.mov", ground.folder / f"{name}-ffmpeg.mov"

    def run(self, agent, sources, ffmpeg_source, conversion="null", prefix=(), camera=None):
        """`sources` launch lines, `ffmpeg_source` and `conversion` of ffmpeg_words(); `prefix` in front of the peers'
        commands; `camera` a process whose load is known."""
        ours = Ours(agent, self.turns, self.name.upper())
        words = {"gst": gst_words(self.picture, sources, self.gst),
                 "ffmpeg": ffmpeg_words(self.picture, ffmpeg_source, self.ffmpeg, conversion)}
        sides = {name: peer_side(self.turns, [*prefix, *command], getattr(self, name), self.ground.environment)
                 for name, command in words.items()}
        if camera:
            sides["camera"] = lambda: contextlib.nullcontext(camera)
        self.turns.run({"ours": ours, **sides})
        return self._result(ours.movie)

    def _result(self, movie):
        settings = [f"{name}: {same_settings(x264_options(movie), x264_options(path))}"
                    for name, path in (("gst-launch-1.0", self.gst), ("ffmpeg", self.ffmpeg))]
        what = f"{self.name} {self.picture}"
        result = Result([self.turns.row(what, "gst", "gst-launch-1.0", 1.02),
                         self.turns.row(what, "ffmpeg", "ffmpeg", 1.05)],
                        [self.turns.note(str(self.picture)), *settings, self.turns.thread_note()])
        for path in (self.gst, self.ffmpeg):
            path.unlink()
        return result


@contextlib.contextmanager
def agent_with_file(ground, movie):
    """A daemon whose camera and microphone are a movie."""
    with ground.agent(start=False) as agent:
        shutil.copyfile(movie, agent.sandbox.root / "var/lmx/camera.mov")
        camera = "file:///var/lmx/camera.mov"
        agent.preferences(RecordingCapturePreset="Video:Better", RecordingVideoInput=camera,
                          RecordingAudioInput=camera)
        yield agent.start()


def cpu_file(ground):
    """The same with a movie file as the camera: every side gets the same pictures, and ffmpeg can take part."""
    picture, turns = Picture(1280, 720), Turns(ground)
    movie = make_camera_file(picture, turns.warm_up + turns.seconds + 15, ground.folder, ground.environment)
    with agent_with_file(ground, movie) as agent:
        result = AgainstBoth(ground, "cpu-file", turns, picture).run(agent, file_sources(movie), ffmpeg_file(movie))
    result.notes.append("A movie of the same size plays as the camera on all sides, so decoding is part of every "
                        "figure. ffmpeg paces its reading (-re). No side has colours or sizes to convert.")
    return result


def cpu_mjpeg(ground):
    """The same with a movie of JPEG pictures in full-range BT.601 4:2:2, which all sides convert to BT.709."""
    picture, turns = Picture(1280, 720), Turns(ground)
    movie = make_mjpeg_camera_file(picture, turns.warm_up + turns.seconds + 15, ground.folder)
    with agent_with_file(ground, movie) as agent:
        result = AgainstBoth(ground, "cpu-mjpeg", turns, picture).run(
            agent, mjpeg_sources(movie), ffmpeg_file(movie), FROM_FULL_RANGE_601)
    result.notes.append("Decoding JPEG and converting colours is part of every figure: gst-launch-1.0 converts with "
                        "videoconvert, ffmpeg with its filter colorspace, the daemon with its own matrix.")
    return result


def cpu_rtsp(ground):
    """The same with a network camera, H.264 in full-range BT.601 with sound, which all sides watch and convert."""
    picture, turns = Picture(1280, 720), Turns(ground, late=1.0)
    launch = (f"videotestsrc is-live=true pattern=smpte horizontal-speed=2 ! "
              f"{rtsp_camera.mode((picture.width, picture.height))},colorimetry={FULL_RANGE_601} ! "
              f"x264enc tune=zerolatency speed-preset=ultrafast key-int-max=30 ! {rtsp_camera.H264} {rtsp_camera.SOUND}")
    with ground.agent(start=False) as agent, rtsp_camera.RtspCamera(agent.prepare(), launch, transport="tcp") as camera:
        agent.preferences(RecordingCapturePreset="Video:Better", RecordingVideoInput=camera.uri,
                          RecordingAudioInput=camera.uri)
        agent.start()
        result = AgainstBoth(ground, "cpu-rtsp", turns, picture).run(
            agent, rtsp_sources(camera.uri), ffmpeg_rtsp(camera.uri), FROM_FULL_RANGE_601,
            agent.sandbox.entering("net"), camera.process.pid)
    result.notes.append("One camera in the daemon's network, over TCP. Its own cost is in no figure; that of receiving "
                        "and decoding is in each.")
    return result
