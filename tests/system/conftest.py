"""Fixtures of the system tests: an agent in a sandbox, a server for it, and a watchdog over each test."""
import faulthandler
import os
import re
import signal
import subprocess
import sys
from pathlib import Path

import pytest

sys.path.insert(0, str(Path(__file__).resolve().parent))

from harness.agent import Agent  # noqa: E402
from harness.odd_movies import movie_file  # noqa: E402
from harness.tunnel_server import TunnelServer  # noqa: E402

ROOT = Path(__file__).resolve().parents[2]
BINARY = Path(os.environ.get("LMX_BINARY", ROOT / "build/release/lmxagentd"))
SANITIZER = re.compile(r"ERROR: (Address|Leak)Sanitizer|WARNING: ThreadSanitizer|runtime error:")
LIMIT = 120  # seconds a test may take; a test says otherwise with @pytest.mark.limit(seconds)


def pytest_configure(config):
    config.addinivalue_line("markers", "limit(seconds): how long the test may take")
    config.addinivalue_line("markers", "slow: waits for half a minute or more of wall-clock time")


@pytest.hookimpl(trylast=True)
def pytest_collection_modifyitems(items):
    """Puts the slow tests first, in turn for each worker: started last, one would be all that is still running."""
    workers = int(os.environ.get("PYTEST_XDIST_WORKER_COUNT", 1))
    share = max(len(items) // (4 * workers), 2)  # how many tests in a row xdist hands each worker at first
    slow = [item for item in items if item.get_closest_marker("slow")]
    items[:] = [item for item in items if item not in slow]
    places = ((i % workers) * share + i // workers for i in range(len(slow)))
    for place, item in sorted(zip(places, slow), key=lambda pair: pair[0]):
        items.insert(place, item)


@pytest.hookimpl(hookwrapper=True)
def pytest_runtest_makereport(item, call):
    outcome = yield
    setattr(item, "result_of_" + call.when, outcome.get_result())


class Hung(Exception):
    """A test has exceeded its limit."""


@pytest.fixture(autouse=True)
def watchdog(request):
    """Ends a test that hangs with an exception, and if that does not help the whole run."""
    mark = request.node.get_closest_marker("limit")
    limit = mark.args[0] if mark else LIMIT

    def hung(_number, _frame):
        raise Hung(f"no end after {limit} s")

    previous = signal.signal(signal.SIGALRM, hung)
    signal.alarm(limit)
    faulthandler.dump_traceback_later(limit + 60, exit=True, file=sys.__stderr__)
    yield
    faulthandler.cancel_dump_traceback_later()
    signal.alarm(0)
    signal.signal(signal.SIGALRM, previous)


@pytest.fixture(scope="session")
def registry(tmp_path_factory):
    """GStreamer's catalogue of plugins, made once: without it every daemon would search for them again."""
    path = tmp_path_factory.mktemp("gstreamer") / "registry.bin"
    subprocess.run(["gst-inspect-1.0", "fakesink"], env={**os.environ, "GST_REGISTRY": str(path)}, check=True,
                   stdout=subprocess.DEVNULL, timeout=120)
    return path


@pytest.fixture(scope="session")
def odd_movie(tmp_path_factory):
    """Makes a movie of harness/odd_movies.py by its name, once for all workers. @return a function name → path"""
    base = tmp_path_factory.getbasetemp()
    directory = (base.parent if "PYTEST_XDIST_WORKER" in os.environ else base) / "odd-movies"
    directory.mkdir(exist_ok=True)
    return lambda name: movie_file(directory, name)


@pytest.fixture
def binary():
    """The program under test. Modules that test another one override this."""
    return BINARY


@pytest.fixture
def agent(request, binary, registry):
    """A daemon's sandbox, not yet started."""
    assert binary.exists(), f"{binary} is not built"
    one = Agent(binary, registry)
    yield one
    report, errors = one.report(), one.errors()
    one.close()
    failed = any(getattr(request.node, "result_of_" + when, None) is not None
                 and getattr(request.node, "result_of_" + when).failed for when in ("setup", "call"))
    if failed:
        print(report)
    assert not SANITIZER.search(errors), errors


@pytest.fixture
def running(agent):
    """A daemon that answers on its local socket, with the synthetic camera and microphone."""
    return agent.start()


@pytest.fixture
def server(agent):
    """A server that the running agent has said hello to."""
    with TunnelServer(agent.prepare()) as one:
        agent.start()
        one.accept()
        yield one
