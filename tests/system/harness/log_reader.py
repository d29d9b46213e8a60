"""The system log of a sandbox: a datagram socket at its /dev/log, read by a thread of the harness."""
import re
import socket
import threading
import time
from dataclasses import dataclass
from enum import IntEnum

from .log_socket import log_socket

LINE = re.compile(r"^<(\d+)>.*?\blmxagentd\[(\d+)\]: (.*)$", re.DOTALL)
DAEMON = 3  # syslog's facility for daemons
END = b"end"
MARKER = b"read so far"


class Level(IntEnum):
    """Severity of a message, numbered as in syslog. UNKNOWN: the message has no valid header."""

    UNKNOWN = -1
    EMERGENCY = 0
    ALERT = 1
    CRITICAL = 2
    ERROR = 3
    WARNING = 4
    NOTICE = 5
    INFO = 6
    DEBUG = 7


@dataclass(frozen=True)
class LogLine:
    """One message; `at` is the harness's monotonic clock at its arrival."""

    level: Level
    facility: int
    pid: int
    text: str
    at: float
    raw: str


class LogReader:
    """Collects every message sent to the socket at `path` until close()."""

    def __init__(self, path):
        self._lines = []
        self._sent = 0  # markers of _catch_up()
        self._markers = 0  # of these, read again
        self._arrived = threading.Condition()
        self._socket = log_socket()
        self._address = str(path)
        self._socket.bind(self._address)
        self._thread = threading.Thread(target=self._read, daemon=True)
        self._thread.start()

    def _read(self):
        while True:
            data = self._socket.recv(65536)
            if data == END:
                return
            if data == MARKER:
                with self._arrived:
                    self._markers += 1
                    self._arrived.notify_all()
                continue
            line = self._parse(data.decode("utf-8", "replace"))
            with self._arrived:
                self._lines.append(line)
                self._arrived.notify_all()

    @staticmethod
    def _parse(raw):
        match = LINE.match(raw)
        if not match:
            return LogLine(Level.UNKNOWN, -1, 0, raw, time.monotonic(), raw)
        priority = int(match[1])
        return LogLine(Level(priority & 7), priority >> 3, int(match[2]), match[3].rstrip("\n"), time.monotonic(), raw)

    def close(self):
        self._send(END)
        self._thread.join(5)
        self._socket.close()

    def _send(self, text):
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as sender:
            sender.sendto(text, self._address)

    def _catch_up(self):
        """Waits until what has been sent to the socket is in the list: the thread may be behind on a busy machine."""
        with self._arrived:
            if not self._thread.is_alive():
                return
            self._sent += 1
            expected = self._sent
        self._send(MARKER)
        with self._arrived:
            if not self._arrived.wait_for(lambda: self._markers >= expected, 15):
                raise AssertionError("the system log is not read")

    def mark(self):
        """A place in the log, for `after`; what was sent before is in front of it."""
        self._catch_up()
        with self._arrived:
            return len(self._lines)

    def lines(self, pattern=".", after=0, level=None):
        """The messages so far that match `pattern` (and have `level`)."""
        self._catch_up()
        with self._arrived:
            return [l for l in self._lines[after:] if self._fits(l, pattern, level)]

    @staticmethod
    def _fits(line, pattern, level):
        return re.search(pattern, line.text) is not None and level in (None, line.level)

    def wait(self, pattern, timeout=15.0, after=0, level=None, count=1):
        """The `count`th message that matches; AssertionError with the end of the log when it does not come."""
        end = time.monotonic() + timeout
        with self._arrived:
            while True:
                found = [l for l in self._lines[after:] if self._fits(l, pattern, level)]
                if len(found) >= count:
                    return found[count - 1]
                if not self._arrived.wait(max(0.0, end - time.monotonic())) and time.monotonic() >= end:
                    break
            raise AssertionError(f"no {count}. log line {pattern!r} (level {level!r}) in {timeout} s; the log:\n"
                                 + self.tail(60))

    def tail(self, count=1000):
        with self._arrived:
            return "\n".join(f"{l.at:.3f} <{l.level.name}> {l.text}" for l in self._lines[-count:])
