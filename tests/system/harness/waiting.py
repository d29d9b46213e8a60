"""Waiting for events under a time limit, and the few waits that are about wall-clock time itself."""
import time


def wait_until(condition, timeout=10.0, what="the condition", interval=0.02):
    """The first true value of `condition`; AssertionError that names `what` after `timeout` seconds."""
    end = time.monotonic() + timeout
    while True:
        value = condition()
        if value:
            return value
        assert time.monotonic() < end, f"{what}: not within {timeout} s"
        time.sleep(interval)


def let_pass(seconds, why):
    """Lets wall-clock time pass where there is no event to wait for; `why` says what the time is for."""
    assert why
    time.sleep(seconds)
