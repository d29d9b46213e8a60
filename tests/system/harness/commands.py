"""The lines that a server or a local client sends to the daemon, and its replies."""
import datetime
import time
from dataclasses import dataclass, field


@dataclass
class Reply:
    """One reply, with the harness's clocks around it: a mark set by the command lies between the two."""

    text: str
    sent: float
    received: float
    fields: dict = field(default_factory=dict)

    def __post_init__(self):
        self.fields = dict(pair.split("=", 1) for pair in self.text.split(",") if "=" in pair)


def exchange(peer, line):
    """Sends a line to a connected socket. @return the reply"""
    sent = time.time()
    peer.sendall(line.encode() + b"\n")
    data = peer.recv(1 << 20)
    return Reply(data.decode(), sent, time.time())


def command_line(command, parameters):
    return f"{command} " + ",".join(f"{key}={value}" for key, value in parameters.items())


def start_parameters(uuid, minutes="60", unattended="60"):
    return {"RecordingMetadata_RECORDING_UUID": uuid,
            "RecordingMetadata_MAX_RECORDING_MINUTES": minutes,
            "RecordingMetadata_UNATTENDED_RECORDING_MINUTES": unattended}


def start_line(uuid, minutes="60", unattended="60", **more):
    return command_line("START", {**start_parameters(uuid, minutes, unattended), **more})


def timed_line(command, at, **parameters):
    """The line that schedules `command` for the Unix time `at`. Its date has an offset that is not ours."""
    zone = datetime.timezone(datetime.timedelta(hours=5, minutes=30))
    date = datetime.datetime.fromtimestamp(at, zone).strftime("%Y-%m-%d %H:%M:%S %z")
    return command_line("TIMEDCMD", {"command": command, "time": date, **parameters})
