"""A program that a test runs beside the agent: in its network if need be, ended with the test, its words kept."""
import contextlib
import os
import select
import subprocess
import time


class Guest:
    """One process at a time. close() ends it, whatever state it is in."""

    def __init__(self, agent):
        self.agent = agent
        self.process = None
        self._errors = None

    def __enter__(self):
        return self.start()

    def __exit__(self, *details):
        self.close()

    def start(self):
        raise NotImplementedError

    def run(self, command, network=False, ready=None, env=None, **options):
        """Starts the program; dies with the harness. `network` puts it into the agent's network (prepared or running),
        `ready` is the line on its standard output that is waited for."""
        assert self.process is None, "it runs already"
        entering = self.agent.sandbox.entering("net") if network else []
        registry = {"GST_REGISTRY": str(self.agent.registry), "GST_REGISTRY_UPDATE": "no"} if self.agent.registry else {}
        self._errors = self.agent.sandbox.base / f"guest-{id(self):x}.txt"
        with open(self._errors, "ab") as errors:
            self.process = subprocess.Popen(["setpriv", "--pdeathsig", "KILL", "--", *entering, *command],
                                            stderr=errors, env={**os.environ, **registry, **(env or {})}, **options)
        if ready:
            self._wait_for(ready)

    def _wait_for(self, line, timeout=20.0):
        end = time.monotonic() + timeout
        while select.select([self.process.stdout], [], [], max(0.0, end - time.monotonic()))[0]:
            said = self.process.stdout.readline().decode()
            assert said, f"it has ended:\n{self.errors()}"
            if said.rstrip("\n") == line:
                return
        raise AssertionError(f"not ready within {timeout} s:\n{self.errors()}")

    def errors(self):
        return self._errors.read_text(errors="replace") if self._errors and self._errors.exists() else ""

    def alive(self):
        return self.process is not None and self.process.poll() is None

    def kill(self):
        """Ends the program at once, as a pulled plug does."""
        if self.process is None:
            return
        self.process.kill()
        self.process.wait(10)
        for stream in (self.process.stdin, self.process.stdout):
            if stream:
                with contextlib.suppress(BrokenPipeError):
                    stream.close()
        self.process = None

    close = kill
