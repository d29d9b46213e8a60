"""Waiting for a condition, with an end."""
import time


def wait_until(condition, timeout=10.0, what="the condition", interval=0.02):
    """The first true value of `condition`; AssertionError after `timeout` seconds."""
    end = time.monotonic() + timeout
    while True:
        value = condition()
        if value:
            return value
        assert time.monotonic() < end, f"{what}: not within {timeout} s"
        time.sleep(interval)
