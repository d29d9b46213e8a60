"""Virtual cameras and microphones of a PipeWire of the test's own, with its session manager, without hardware or D-Bus.

The agent finds its socket by the environment that PipeWireHall.env holds:

    hall = PipeWireHall(agent).start()
    camera = hall.camera("podium").start()
    agent.preferences(RecordingVideoInput="pipewire:podium")
    agent.start(env=hall.env)
"""
import json
import os
import shutil
import signal
import subprocess
from pathlib import Path

from .guest import Guest
from .sandbox import HARNESS
from .sounds import sine
from .waiting import wait_until

PLACE = "/var/pipewire"
NO_BUS = "unix:path=/nowhere"
# In front of the agent's command: what it does for PipeWire's graph is done in time on a busy machine, too.
REAL_TIME = ("/usr/bin/python3", "-c", "import os, sys; os.sched_setscheduler(0, os.SCHED_FIFO, os.sched_param(10)); "
             "os.execv(sys.argv[1], sys.argv[1:])")
SHARED = Path("/usr/share/wireplumber")
# The scripts of WirePlumber that link streams to devices; none that looks for hardware.
ENABLED = """
load_module("metadata")
default_access.properties["enable-flatpak-portal"] = false  -- asks D-Bus
default_access.enable()
stream_defaults.properties["restore-props"] = false
stream_defaults.properties["restore-target"] = false
stream_defaults.enable()
"""


class PipeWireHall:
    """The server and its session manager."""

    env = {"PIPEWIRE_RUNTIME_DIR": PLACE, "XDG_RUNTIME_DIR": PLACE}

    def __init__(self, agent, real_time=False):
        """Without `real_time` the server loses sound on a busy machine, as one does that has no right to priority."""
        self.agent = agent
        self.real_time = ["chrt", "--fifo", "15"] if real_time else []
        self.place = agent.sandbox.root / PLACE.lstrip("/")  # in the host: the server is no process of the sandbox
        self.place.mkdir(parents=True, exist_ok=True)
        # No bus: nothing of the machine's own session may take part.
        self.host_env = {"PIPEWIRE_RUNTIME_DIR": str(self.place), "XDG_RUNTIME_DIR": str(self.place),
                         "XDG_CONFIG_HOME": str(self.place), "XDG_STATE_HOME": str(self.place),
                         "HOME": str(self.place), "DBUS_SESSION_BUS_ADDRESS": NO_BUS,
                         "DBUS_SYSTEM_BUS_ADDRESS": NO_BUS, "PIPEWIRE_REMOTE": "pipewire-0",
                         "WIREPLUMBER_CONFIG_DIR": str(self.place / "wireplumber")}
        self._guests = []

    def __enter__(self):
        return self.start()

    def __exit__(self, *details):
        self.close()

    def start(self):
        """Returns once both run."""
        self._configure()
        self._run(["pipewire"])
        wait_until((self.place / "pipewire-0").exists, what="PipeWire's socket")
        self._run(["wireplumber"])
        wait_until(lambda: any("WirePlumber" == props.get("application.name") for props in self.objects("Client")),
                   what="the session manager")
        return self

    def _configure(self):
        config = self.place / "wireplumber"
        if config.exists():
            return
        (config / "main.lua.d").mkdir(parents=True)
        for name in ("00-functions", "20-default-access", "40-stream-defaults", "50-default-access-config"):
            shutil.copy(SHARED / f"main.lua.d/{name}.lua", config / "main.lua.d")
        (config / "main.lua.d/90-enable-all.lua").write_text(ENABLED)
        shutil.copytree(SHARED / "policy.lua.d", config / "policy.lua.d")
        text = (SHARED / "wireplumber.conf").read_text()
        (config / "wireplumber.conf").write_text(text.replace("{ name = bluetooth.lua, type = config/lua }", ""))

    def _run(self, command):
        one = Guest(self.agent)
        one.run([*self.real_time, *command], env=self.host_env, stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL)
        self._guests.append(one)
        return one

    def program(self, name):
        """A program of the harness, built once for this hall. @return its path"""
        program = self.place / name
        if not program.exists():
            flags = subprocess.run(["pkg-config", "--cflags", "--libs", "libpipewire-0.3"], check=True, timeout=20,
                                   capture_output=True, text=True).stdout.split()
            subprocess.run(["cc", "-O1", "-Wall", "-o", program, HARNESS / f"{name}.c", *flags, "-lm"], check=True,
                           timeout=60)
        return program

    def camera(self, name, size=(320, 180), rate=30, api="v4l2", ppm=0, numbers="count"):
        """A virtual camera, to be started: pictures of one size and rate with numbers (movie.counters), or with the
        "ms" of CLOCK_MONOTONIC when they were taken. It claims to be hardware, which "Automatic" asks for; without
        `api` it does not. Its clock is `ppm` parts in a million fast."""
        arguments = [name, api or "", *map(str, size), str(rate), str(ppm), numbers]
        return VirtualDevice(self, name, [str(self.program("pipewire_camera")), *arguments])

    def microphone(self, name, frequency=440, api="alsa"):
        """A virtual microphone, to be started: two minutes of a sine of so many hertz. `api` as for the camera."""
        return VirtualMicrophone(self, name, sine(self.place / f"{frequency}.wav", frequency), api)

    def clocked_microphone(self, name, ppm, jitter=0, hertz=0, api="alsa"):
        """A virtual microphone, to be started, which drives its graph as a sound card does, by a clock that is `ppm`
        parts in a million fast; each cycle comes up to `jitter` ms late. What it hears: bursts at the whole seconds of
        CLOCK_MONOTONIC (sounds.bursts), or a sine of so many `hertz`."""
        arguments = [name, api or "", str(ppm), str(jitter), str(hertz)]
        return VirtualDevice(self, name, [str(self.program("pipewire_microphone")), *arguments])

    def fleeting(self, slots):
        """Cameras and microphones that come and go all the time, to be started: up to so many at once."""
        return FleetingDevices(self, slots)

    def watch(self, name, caps, rest):
        """Takes so many pieces from a node as any other program would; `rest` ends the launch line: "15 ! fakesink"."""
        subprocess.run(["gst-launch-1.0", "-q", "pipewiresrc", f"target-object={name}",
                        *f"num-buffers={rest}".replace(" ! ", f" ! {caps} ! ", 1).split()], check=True, timeout=20,
                       env={**os.environ, **self.host_env}, stdout=subprocess.DEVNULL)

    def objects(self, kind):
        """The properties of all objects of a kind, such as "Node" or "Client"."""
        dump = subprocess.run(["pw-dump"], env={**os.environ, **self.host_env}, capture_output=True, timeout=20,
                              check=False).stdout
        try:
            found = json.loads(dump or "[]")
        except json.JSONDecodeError:
            return []
        return [one["info"]["props"] for one in found
                if one["type"].endswith(":" + kind) and one.get("info") and one["info"].get("props")]

    def has(self, name):
        return any(props.get("node.name") == name for props in self.objects("Node"))

    def stall(self):
        """The server stays, and takes connections, but answers nothing."""
        self._guests[0].process.send_signal(signal.SIGSTOP)

    def go_on(self):
        self._guests[0].process.send_signal(signal.SIGCONT)

    def kill(self):
        """Ends server and session manager at once; start() brings them back."""
        while self._guests:
            self._guests.pop().kill()
        for left in self.place.glob("pipewire-0*"):
            left.unlink()

    close = kill


class VirtualDevice(Guest):
    """A node of the hall's PipeWire. Killed it is unplugged; it may be started again."""

    def __init__(self, hall, name, command):
        super().__init__(hall.agent)
        self.hall = hall
        self.name = name
        self._command = command

    @property
    def id(self):
        """What the preferences name."""
        return "pipewire:" + self.name

    def start(self):
        """Returns once the node is there."""
        self.run(self._command, env=self.hall.host_env, stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL)
        wait_until(lambda: self.hall.has(self.name), what=f"{self.name} in PipeWire", interval=0.1)
        return self

    def unplug(self):
        """The node goes; returns once PipeWire no longer has it."""
        self.kill()
        wait_until(lambda: not self.hall.has(self.name), what=f"PipeWire without {self.name}", interval=0.1)

    def stall(self):
        """The node stays, but nothing comes from it."""
        self.process.send_signal(signal.SIGSTOP)

    def go_on(self):
        self.process.send_signal(signal.SIGCONT)


class VirtualMicrophone(VirtualDevice):
    """Played by pw-cat: the graph's own clock drives it. (pipewiresink does not deliver sound reliably.)"""

    def __init__(self, hall, name, sound, api):
        claim = f"device.api={api}" if api else ""
        node = f"{{ media.class=Audio/Source node.name={name} node.description={name} {claim} }}"
        super().__init__(hall, name, ["pw-cat", "--playback", "--properties", node, str(sound)])


class FleetingDevices(Guest):
    """A program of whose nodes none lasts. Ended with the test."""

    def __init__(self, hall, slots):
        super().__init__(hall.agent)
        self.hall = hall
        self._slots = slots

    def start(self):
        """Returns once the first has come."""
        self.run([str(self.hall.program("pipewire_fleeting")), "fleeting", str(self._slots)], env=self.hall.host_env,
                 ready="coming", stdin=subprocess.DEVNULL, stdout=subprocess.PIPE)
        return self
