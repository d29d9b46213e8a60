"""Network cameras behind a network that delays, stalls, breaks and damages what it carries."""
import contextlib
import re
import time

import pytest
from harness import movie
from harness.bad_network import BadNetwork, beeps, lecture, lip_errors
from harness.log_reader import Level
from harness.numbered import make_movie
from harness.rtsp_camera import H264, H265, JPEG, RtspCamera, showing
from harness.waiting import let_pass

RATE = 25
AWAY = "^The camera is away: "
BACK = "^The camera is back after "
IN_STEP = 0.06  # seconds


@pytest.fixture(scope="module")
def film(tmp_path_factory):
    return lecture(tmp_path_factory.mktemp("lecture") / "lecture.mp4", seconds=30)


class Recording:
    """One recording of a lecture that comes through a bad network."""

    def __init__(self, agent, net):
        self.agent = agent
        self.net = net
        self.seconds = 0  # from START to STOP
        self.mark = 0

    @property
    def path(self):
        return self.agent.movie("NET")

    @contextlib.contextmanager
    def running(self, until):
        """START, the block, and STOP when so many seconds are recorded."""
        self.mark = self.agent.log.mark()
        start = self.agent.start_recording("NET")
        assert start.text == "cmdStatus=0"
        yield
        self.agent.let_record(until)
        stop = self.agent.command("STOP")
        assert stop.text == "cmdStatus=0"
        self.agent.wait_recorded("NET")
        self.seconds = stop.sent - start.received

    def trouble(self, *settings, at, seconds=0.0):
        """Makes the network bad at that second of the recording, for so long."""
        self.agent.let_record(at)
        self.net.set(**settings[0])
        if seconds:
            let_pass(seconds, "the network is bad")
            self.net.set(**settings[1])

    def check_length(self):
        movie.decodes(self.path, "-fps_mode", "vfr")
        for stream in movie.streams(self.path).values():
            assert abs(stream.duration - self.seconds) < 0.4, (stream, self.seconds)

    def parts(self):
        """The pictures' numbers in order, [(first, last), …] for each time that the camera was called; a picture that
        is missing within one, or shown twice, is a failure."""
        parts = []
        for number in movie.counters(self.path):
            if parts and number == parts[-1][1] + 1:
                parts[-1] = (parts[-1][0], number)
            else:
                assert not parts or number < RATE, f"{number} after {parts}"
                parts.append((number, number))
        return parts

    def check_step(self, least, after=0.0, limit=IN_STEP):
        """So many beeps are heard at least, beside their pictures."""
        errors = [one for one in lip_errors(self.path, RATE) if one[0] >= after]
        assert len(errors) >= least, errors
        assert all(error is not None and abs(error) < limit for _, error in errors), errors

    def log(self, worst=Level.NOTICE):
        """What has been said since START, but for the tool's not knowing a cluster."""
        return [line for line in self.agent.log.lines("^(?!.*cluster)", after=self.mark) if line.level <= worst]

    def check_quiet(self):
        """Nobody is told of anything, but that the clocks differ."""
        told = [line.text for line in self.log()]
        assert all("recording started" in text or "recording stopped" in text
                   or re.fullmatch(r"Not real in this recording: sound made \w+ by \d+ ppm", text)
                   for text in told), told


@pytest.fixture
def recording(agent, film):
    """Of a daemon that runs, and has found the camera through a network that was good."""
    with RtspCamera(agent.prepare(), showing(film, sound=True)) as camera, BadNetwork(agent, camera) as net:
        agent.preferences(RecordingVideoInput=net.uri, RecordingAudioInput="Automatic")
        agent.start()
        yield Recording(agent, net)


def test_a_good_network(recording):
    with recording.running(until=6):
        pass
    recording.check_length()
    assert len(recording.parts()) == 1
    recording.check_step(5)
    recording.check_quiet()


def test_half_the_rate_for_a_while(recording, film):
    half = film.stat().st_size / 30 / 2
    with recording.running(until=15):
        recording.trouble({"rate": half}, {"rate": 0}, at=3, seconds=5)
    recording.check_length()
    assert len(recording.parts()) == 1
    recording.check_step(13)
    recording.check_quiet()


@pytest.mark.parametrize("trouble", [{"jitter": 0.3}, {"delay": 0.5}], ids=["jitter", "delay"])
def test_slow_all_the_time(recording, trouble):
    recording.net.set(**trouble)
    with recording.running(until=10):
        pass
    recording.check_length()
    parts = recording.parts()
    assert len(parts) == 1
    recording.check_step(8)
    recording.check_quiet()


def test_two_short_stalls(recording):
    with recording.running(until=11):
        for at in (3, 7):
            recording.trouble({"stalled": True}, {"stalled": False}, at=at, seconds=1)
    recording.check_length()
    assert len(recording.parts()) == 1
    recording.check_step(9)
    recording.check_quiet()


@pytest.mark.slow
def test_two_long_stalls(recording):
    with recording.running(until=19):
        for at in (3, 11):
            recording.trouble({"stalled": True}, {"stalled": False}, at=at, seconds=5)
    recording.check_length()
    assert len(recording.parts()) == 3
    recording.check_step(7)
    told = [line.text for line in recording.log()]
    assert len([text for text in told if re.search(AWAY, text)]) == 2
    assert len([text for text in told if re.search(BACK, text)]) == 2
    assert len(told) <= 2 + 4 + 1, told


@pytest.mark.slow
def test_a_reset_and_a_door_that_stays_shut(recording):
    with recording.running(until=15):
        recording.trouble({"do": "refuse"}, {"do": "listen"}, at=3, seconds=6)
    recording.check_length()
    assert len(recording.parts()) == 2
    recording.check_step(5)
    told = [line.text for line in recording.log()]
    assert len([text for text in told if re.search(AWAY, text)]) == 1 and len(told) <= 2 + 2 + 1, told


def test_a_reset(recording):
    with recording.running(until=9):
        recording.trouble({"do": "cut"}, at=3)
    recording.check_length()
    assert len(recording.parts()) == 2
    recording.check_step(5)
    (back,) = recording.agent.log.lines(BACK)
    assert float(re.search(r"after ([\d.]+) s", back.text)[1]) < 3


CAMERAS = {
    "larger": ({"size": (640, 360)}, H264),
    "15 a second": ({"rate": "15"}, H264),
    "H.265": ({"codec": ("libx265", "-x265-params", "log-level=error:bframes=0", "-preset", "superfast")}, H265),
    "JPEG, smaller": ({"size": (256, 144), "codec": ("mjpeg", "-q:v", "3", "-huffman", "default")}, JPEG),
}


@pytest.mark.parametrize("kind", CAMERAS)
def test_another_camera_at_the_same_address(recording, tmp_path, kind):
    """It has no sound; that of the recording is silence from then on."""
    options, payloader = CAMERAS[kind]
    rate = int(options.get("rate", RATE))
    path = make_movie(tmp_path / "other.mp4", range(20 * rate), group=rate, **{"rate": RATE, **options})
    with RtspCamera(recording.agent, showing(path, payloader), port=8555), recording.running(until=10):
        recording.trouble({"upstream": 8555, "do": "cut"}, at=3)
    recording.check_length()
    assert {(stream.width, stream.height) for stream in movie.streams(recording.path).values()
            if stream.kind == "video"} == {(320, 180)}
    shown = list(zip(movie.frame_times(recording.path), movie.counters(recording.path)))
    again = next(place for place in range(1, len(shown)) if shown[place][1] < shown[place - 1][1])
    other = shown[again:]
    assert other[0][1] < rate and other[-1][0] > 9
    begin = other[0][0] - other[0][1] / rate
    assert all(abs(at - begin - number / rate) < 0.07 for at, number in other), other
    assert len(movie.runs([number for _, number in other])) == 1, "none is left out or doubled"
    assert not [at for at, _ in beeps(recording.path) if at > 5]
    log = recording.agent.log
    changed = log.lines("^The camera's picture has changed: (.*) has become (?!\\1;)", after=recording.mark)
    assert len(changed) == len(log.lines("^The camera's picture has changed")) <= 1 and (changed or "size" not in options)
    assert len(log.lines("picture scaled from")) == (1 if "size" in options else 0)


@pytest.mark.slow
def test_a_camera_with_another_password(recording, film):
    """It is tried for ten seconds; the recording ends in a movie, and nobody reads the password."""
    agent = recording.agent
    with RtspCamera(agent, showing(film, sound=True), port=8555, user="hall", password="geheim42"):
        agent.preferences(RecordingVideoInput=recording.net.uri.replace("//", "//hall:falsch77@"),
                          RecordingAudioInput="Automatic")
        assert agent.start_recording("NET").text == "cmdStatus=0"
        recording.trouble({"upstream": 8555, "do": "cut"}, at=3)
        away = agent.log.wait(AWAY, level=Level.ERROR)
        lost = agent.log.wait("^Capture device lost: ", timeout=20, level=Level.ERROR)
        assert 8 < lost.at - away.at < 12
        assert agent.wait_exit(30) == 1
    assert agent.submitted("end") == ["NET"]
    movie.decodes(recording.path)
    assert movie.streams(recording.path)["video"].duration > 2.5
    assert not re.search("falsch77|geheim42", agent.report())


def test_a_clock_that_is_fast(recording):
    recording.net.set(ppm=500)
    with recording.running(until=15):
        pass
    recording.check_length()
    assert len(recording.parts()) == 1
    recording.check_step(13)
    recording.check_quiet()


@pytest.mark.parametrize("jump", [10, -10])
def test_a_clock_that_is_set(recording, jump):
    with recording.running(until=11):
        recording.trouble({"jump": jump}, at=4)
    recording.check_length()
    shown = movie.counters(recording.path)
    spans = movie.runs(shown)
    assert sum(after[0] - before[1] - 1 for before, after in zip(spans, spans[1:])) <= 2, spans
    recording.check_step(9)
    assert not recording.log(Level.WARNING)


def test_damaged_packets(recording):
    with recording.running(until=10):
        recording.trouble({"damage": 0.3}, {"damage": 0}, at=3, seconds=1)
    recording.check_length()
    shown = [number for at, number in zip(movie.frame_times(recording.path), movie.counters(recording.path, True))
             if at > 6]
    assert None not in shown and len(movie.runs(shown)) == 1
    recording.check_step(3, after=6)
    assert len(recording.log()) <= 2 + 3, recording.log()


def test_packets_of_sound_with_nothing_in_them(recording):
    """They say that a unit of no bytes follows, for which a depayloader has no memory."""
    with recording.running(until=8):
        recording.trouble({"begin": "00100000"}, {"begin": ""}, at=3, seconds=1)
    recording.check_length()
    assert len(recording.parts()) == 1
    recording.check_step(3, after=4.5)  # the silence may end within a beep
    told = [line.text for line in recording.log(Level.WARNING)]
    assert not told, told
    assert recording.agent.log.lines("^The camera sends damaged packets; rtpmp4gdepay is not given them$")


def test_a_stream_that_makes_no_sense_any_more(recording):
    with recording.running(until=10):
        recording.trouble({"damage": 0.2, "broken": True}, {"damage": 0}, at=3, seconds=0.5)
    recording.check_length()
    assert len(recording.parts()) == 2
    recording.check_step(6)
    assert len(recording.agent.log.lines(AWAY)) == 1


def test_an_answer_that_comes_late(recording):
    recording.net.set(describe=3)
    with recording.running(until=3):
        pass
    recording.check_length()
    assert len(recording.parts()) == 1


@pytest.mark.slow
@pytest.mark.parametrize("trouble", [{"describe": -1}, {"garbage": "HTTP/1.1 418 I'm a teapot\r\n\r\n"},
                                     {"garbage": "\x00\xff$\x01\xff\xff" * 200}], ids=["none", "HTTP", "noise"])
def test_no_answer_that_makes_sense(recording, trouble):
    agent = recording.agent
    agent.preferences(RecordingVideoInput=recording.net.uri.replace("//", "//hall:geheim42@"),
                      RecordingAudioInput="Automatic")
    recording.net.set(**trouble)
    mark = agent.log.mark()
    refused = agent.start_recording("NET", timeout=40)
    assert refused.text == "cmdStatus=3" and refused.received - refused.sent < 15
    told = agent.log.wait("The capture could not be prepared", after=mark)
    assert "rtsp://***@127.0.0.1:8550/hall" in told.text
    assert "geheim42" not in agent.report()
    recording.net.set(describe=0, garbage="")
    agent.preferences(RecordingVideoInput=recording.net.uri, RecordingAudioInput="Automatic")
    with recording.running(until=2):
        pass
    recording.check_length()
