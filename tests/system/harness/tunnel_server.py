"""Plays the server's side of the tunnel: takes the hello, sends encrypted commands, reads encrypted replies.

The cipher is that of the openssl command, so that these tests share no code with the agent.
"""
import base64
import os
import re
import socket
import subprocess

from .agent import SECRET

HELLO = re.compile(r"^AGENT protocol=1,agent_uuid=(?P<uuid>[^,]*),iv=(?P<iv>[^,]*),version=100"
                   r"(?P<offline>,agent_recording_status=offline)?\n$")


def cipher(direction, secret, vector, data):
    """AES-128-CBC with PKCS#7 padding; direction "-e" or "-d"."""
    return subprocess.run(["openssl", "enc", direction, "-aes-128-cbc", "-K", secret.hex(), "-iv", vector.hex()],
                          input=data, capture_output=True, check=True).stdout


class TunnelServer:
    """Listens inside the agent's network; one agent at a time. It knows the agent's secret."""

    def __init__(self, agent, host="127.0.0.1", port=8175):
        self.secret = SECRET
        self.hello = None
        self.vector = None
        self.peer = None
        self._buffer = b""
        self._listener = in_network_of(agent, host, port)

    def __enter__(self):
        return self

    def __exit__(self, *details):
        self.close()

    def accept(self, timeout=15.0):
        """The next connection, with its hello. @return the match of the hello"""
        self._listener.settimeout(timeout)
        self.peer, _ = self._listener.accept()
        self.peer.settimeout(timeout)
        self._buffer = b""
        self.hello = HELLO.match(self.read_line().decode())
        assert self.hello, "no proper hello"
        self.vector = base64.b64decode(self.hello["iv"])
        return self.hello

    def read_line(self):
        while b"\n" not in self._buffer:
            data = self.peer.recv(65536)
            if not data:
                raise EOFError("the agent has closed the tunnel")
            self._buffer += data
        line, _, self._buffer = self._buffer.partition(b"\n")
        return line + b"\n"

    def encrypted(self, text):
        """The line on the wire for a command."""
        plain = os.urandom(32) + text.encode()
        return base64.b64encode(cipher("-e", self.secret, self.vector, plain)) + b"\n"

    def send(self, text):
        self.peer.sendall(self.encrypted(text))

    def reply(self):
        """The next reply, decrypted; its random prefix is checked for its length only."""
        line = self.read_line()
        plain = cipher("-d", self.secret, self.vector, base64.b64decode(line.rstrip(b"\n"), validate=True))
        return plain[32:].decode()

    def command(self, text):
        self.send(text)
        return self.reply()

    def deaf(self):
        """Refuses new connections; the current one stays."""
        self._listener.close()

    def hang_up(self):
        self.peer.close()

    def close(self):
        if self.peer:
            self.peer.close()
        self._listener.close()


def in_network_of(agent, host, port):
    """A socket that listens in the network namespace of the agent's sandbox. A helper process enters it and hands the
    descriptor back: a process with threads can't enter a user namespace."""
    ours, theirs = socket.socketpair(socket.AF_UNIX, socket.SOCK_STREAM)
    script = ("import socket, sys\n"
              "family = socket.AF_INET6 if ':' in sys.argv[1] else socket.AF_INET\n"
              "listener = socket.socket(family, socket.SOCK_STREAM)\n"
              "listener.setsockopt(socket.SOL_SOCKET, socket.SO_REUSEADDR, 1)\n"
              "listener.bind((sys.argv[1], int(sys.argv[2])))\n"
              "listener.listen(64)\n"
              "socket.send_fds(socket.socket(fileno=int(sys.argv[3])), [b'x'], [listener.fileno()])\n")
    with ours, theirs:
        subprocess.run([*agent.sandbox.entering("net"), "/usr/bin/python3", "-c", script, host, str(port),
                        str(theirs.fileno())],
                       pass_fds=[theirs.fileno()], check=True, timeout=20)
        _, descriptors, _, _ = socket.recv_fds(ours, 1, 1)
    return socket.socket(fileno=descriptors[0])
