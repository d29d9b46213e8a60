"""lmx-tunnel as the server of a test, driven as a person would."""
import queue
import re
import subprocess
import threading
from pathlib import Path

from .agent import SERVER_UUID
from .sandbox import Program

TOOL = Path(__file__).resolve().parents[3] / "build/release/lmx-tunnel"
HELLO = re.compile(r"agent (?P<uuid>[^,]*), version (?P<version>\d+)(?P<offline>, going offline)?$")


def start_tool(agent, *arguments, **streams):
    """The program, inside the agent's network and with its secret."""
    secret = agent.path(f"/var/lmx/agent/secrets/{SERVER_UUID}.plist")
    return Program([*agent.sandbox.entering("net"), str(TOOL), "--secret", str(secret), *arguments],
                   stdout=subprocess.PIPE, stderr=subprocess.PIPE, text=True, **streams)


class TunnelTool:
    """A running lmx-tunnel: what it prints and what a person types. Replies are as the program decrypted them."""

    def __init__(self, agent, *arguments):
        self._tool = start_tool(agent, *arguments, stdin=subprocess.PIPE)
        self._lines = queue.Queue()
        self._reader = threading.Thread(target=self._read, daemon=True)
        self._reader.start()
        assert self.line().startswith("listening on ")

    def __enter__(self):
        return self

    def __exit__(self, *details):
        self.close()

    def _read(self):
        for line in self._tool.stdout:
            self._lines.put(line.rstrip("\n"))
        self._lines.put(None)

    def line(self, timeout=15.0):
        """The next line that it prints."""
        try:
            line = self._lines.get(timeout=timeout)
        except queue.Empty:
            raise AssertionError(f"lmx-tunnel has said nothing for {timeout} s") from None
        if line is None:
            raise EOFError(f"lmx-tunnel has ended: {self._tool.stderr.read()}")
        return line

    def accept(self, timeout=15.0):
        """The next agent's hello."""
        line = self.line(timeout)
        if line == "the agent has gone":
            line = self.line(timeout)
        hello = HELLO.match(line)
        assert hello, line
        return hello

    def send(self, text):
        self._tool.stdin.write(text + "\n")
        self._tool.stdin.flush()

    def reply(self, timeout=15.0):
        line = self.line(timeout)
        assert line.startswith("< "), line
        return line[2:]

    def command(self, text):
        self.send(text)
        return self.reply()

    def close(self):
        self._tool.kill()  # the connection goes with it, as when a server dies
        self._tool.wait()
        self._reader.join()
        for stream in (self._tool.stdin, self._tool.stdout, self._tool.stderr):
            try:
                stream.close()
            except BrokenPipeError:  # something typed that it has not read
                pass
