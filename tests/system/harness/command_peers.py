"""Both ends that a hall's commands go to: the tunnel's server and the local socket."""
import contextlib
import queue
import socket
import threading
import time

from .tunnel_server import TunnelServer

PATIENCE = 20.0  # seconds for any single answer


class Gone(Exception):
    """The daemon, or the connection to it, has gone before it answered."""


def replies_in(text):
    return tuple("cmdStatus=" + piece for piece in text.split("cmdStatus=")[1:])


class TunnelPeer:
    """The server's end of the tunnel. Takes every connection; replies are read as they come."""

    def __init__(self, agent):
        self._server = TunnelServer(agent)
        self._replies = queue.Queue()
        self.open = threading.Event()
        self._connections = self._sent_on = 0
        self._closed = False
        self._thread = threading.Thread(target=self._serve, daemon=True)
        self._thread.start()

    def _serve(self):
        while not self._closed:
            try:
                self._server.accept(0.2)
                self._server.peer.settimeout(None)
                self._connections += 1
                self.open.set()
                while True:
                    self._replies.put((self._server.reply().rstrip("\n"), time.time()))
            except TimeoutError:
                continue
            except (EOFError, OSError, ValueError, AssertionError):
                self.open.clear()

    def send(self, line):
        """What has come unasked before is not an answer."""
        while not self._replies.empty():
            self._replies.get_nowait()
        self._sent_on = self._connections
        try:
            self._server.send(line)
        except OSError as error:
            raise Gone from error

    def next(self):
        """The next reply and when it came; Gone when the connection that was asked has ended without one."""
        end = time.monotonic() + PATIENCE
        while time.monotonic() < end:
            asked = self.open.is_set() and self._sent_on == self._connections
            with contextlib.suppress(queue.Empty):
                return self._replies.get(timeout=0.2 if asked else 0.0)
            if not asked:
                raise Gone
        raise AssertionError("no reply on the tunnel")

    def close(self):
        self._closed = True
        with contextlib.suppress(OSError):  # closing alone would not wake the thread
            self._server.peer.shutdown(socket.SHUT_RDWR)
        self._thread.join(5)
        self._server.close()


class LocalPeer:
    """One connection to the local socket."""

    def __init__(self, agent):
        self._peer = agent.connect(PATIENCE)

    def send(self, line):
        try:
            self._peer.sendall(line.encode() + b"\n")
        except OSError as error:
            raise Gone from error

    def next(self):
        try:
            data = self._peer.recv(1 << 20)
        except TimeoutError:
            raise AssertionError("no reply on the local socket") from None
        except OSError as error:
            raise Gone from error
        if not data:
            raise Gone
        return data.decode(), time.time()

    def close(self):
        self._peer.close()
