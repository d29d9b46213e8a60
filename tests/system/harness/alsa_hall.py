"""Microphones of ALSA without hardware: PCMs of its user-space plug-ins, named by a configuration of the test's own.

    hall = AlsaHall(agent)
    hall.pcm("desk", 'type file slave.pcm "null" file "/dev/null" infile "/var/alsa/desk.raw" format "raw"')
    hall.device("lectern", ppm=200, close_takes=1000)
    agent.preferences(RecordingAudioInput=hall.id("desk"))
    agent.start(env=hall.env)
"""
import subprocess

from .guest import Guest
from .sandbox import HARNESS
from .sounds import sine

PLACE = "/var/alsa"
HUM, BURST = 440, 2000  # Hz, of device()
PLUGIN = "alsa_device.so"
# The system's own plug-ins, but none of its devices becomes the default.
BEGIN = "</usr/share/alsa/alsa.conf>\n"


class AlsaHall:
    """A configuration in the sandbox; nothing runs."""

    env = {"ALSA_CONFIG_PATH": f"{PLACE}/asound.conf"}

    def __init__(self, agent):
        self.place = agent.sandbox.root / PLACE.lstrip("/")
        self.place.mkdir(parents=True, exist_ok=True)
        self._agent = agent
        self._pcms = {}
        self._write()

    def pcm(self, name, definition):
        """Adds or replaces a PCM; `definition` is what stands between its braces."""
        self._pcms[name] = definition
        self._write()

    def definition(self, name):
        """What stands between the braces of a PCM."""
        return self._pcms[name]

    def remove(self, name):
        """Takes a PCM away: opening it fails as with a microphone that is unplugged."""
        del self._pcms[name]
        self._write()

    def silent(self, name):
        """A microphone that gives silence as fast as it is read: nothing sets its pace."""
        self.pcm(name, "type null")

    def playing(self, name, frequency=440):
        """A microphone that gives a sine from a file as fast as it is read, 16 bits a sample."""
        path = sine(self.place / f"{name}.wav", frequency, rate=48000, channels=2)
        raw = path.with_suffix(".raw")
        raw.write_bytes(path.read_bytes()[44:])
        file = f'type file slave.pcm "null" file "/dev/null" infile "{PLACE}/{raw.name}" format "raw"'
        self.pcm(name, f"type plug slave {{ pcm {{ {file} }} format S16_LE rate 48000 channels 2 }}")

    def of_pipewire(self, name, device):
        """A virtual microphone of a PipeWireHall as an ALSA device, at its pace. The agent needs both halls' `env`."""
        self.pcm(name, f'type pipewire capture_node "{device.name}"')

    def device(self, name, lock=None, **keys):
        """A microphone that has a clock of its own and is open once at a time, with the `keys` that alsa_device.c knows
        (files by their names in the hall's place). Devices with the same `lock` are one by two names."""
        if not (self.place / PLUGIN).exists():
            subprocess.run(["cc", "-shared", "-fPIC", "-DPIC", "-O1", "-Wall", "-Werror", "-o", self.place / PLUGIN,
                            HARNESS / "alsa_device.c", "-lasound", "-lm"], check=True, timeout=60)
        keys["lock"] = f"{lock or name}.lock"
        told = " ".join(f'{key} "{PLACE}/{value}"' if isinstance(value, str) else f"{key} {value}"
                        for key, value in keys.items())
        self.pcm(name, f"type lecture_hall {told}")

    def overruns(self, lock):
        """How often a device's buffer ran over since it was named: nobody read it in time."""
        return (self.place / f"{lock}.lock").stat().st_size

    def other_program(self, name):
        """A program that records from a PCM, to be started and killed."""
        return OtherProgram(self._agent, self.place, name)

    @staticmethod
    def id(name):
        """What the preferences name."""
        return "alsa:device=" + name

    def _write(self):
        text = BEGIN + f'pcm_type.lecture_hall {{ lib "{PLACE}/{PLUGIN}" }}\n'
        text += "".join(f"pcm.{name} {{ {definition} }}\n" for name, definition in self._pcms.items())
        path = self.place / "asound.conf"
        path.with_suffix(".new").write_text(text)
        path.with_suffix(".new").rename(path)
        (self.place / "host.conf").write_text(text.replace(PLACE, str(self.place)))


class OtherProgram(Guest):
    """Outside of the sandbox, with the same devices."""

    def __init__(self, agent, place, name):
        super().__init__(agent)
        self._place = place
        self._name = name

    def start(self):
        """Returns once it has the device."""
        self.run(["gst-launch-1.0", "alsasrc", f"device={self._name}", "!", "fakesink"], stdin=subprocess.DEVNULL,
                 stdout=subprocess.PIPE, ready="Pipeline is live and does not need PREROLL ...",
                 env={"ALSA_CONFIG_PATH": str(self._place / "host.conf")})
        return self
