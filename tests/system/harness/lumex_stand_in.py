#!/usr/bin/python3
"""Stands in for /usr/bin/lumex: records its arguments and does what /var/tool/script.json says."""
import json
import os
import sys
import time

PLACE = os.environ.get("LMXAGENTD_ROOT", "") + "/var/tool"


def script_for(arguments):
    """The last rule whose `when` is among the arguments; queries of the cluster fail unless a rule says otherwise.

    A rule with `after` applies after that many earlier calls with its `when`.
    """
    try:
        with open(PLACE + "/script.json", encoding="utf-8") as file:
            rules = json.load(file)
    except FileNotFoundError:
        rules = []
    chosen = {"exit": 1} if "--listinfo" in arguments else {}
    for rule in rules:
        if rule["when"] in arguments and earlier_calls(rule["when"]) >= rule.get("after", 0):
            chosen = rule
    return chosen


def earlier_calls(word):
    try:
        with open(PLACE + "/calls.jsonl", encoding="utf-8") as file:
            calls = [json.loads(line) for line in file]
    except FileNotFoundError:
        return 0
    return sum(call["event"] == "begin" and word in call["arguments"] for call in calls)


def note(entry):
    line = json.dumps(entry) + "\n"
    descriptor = os.open(PLACE + "/calls.jsonl", os.O_WRONLY | os.O_APPEND | os.O_CREAT, 0o644)
    os.write(descriptor, line.encode())
    os.close(descriptor)


def delete_submitted(arguments, repository):
    if "--recording" in arguments:
        base = os.path.join(repository, arguments[arguments.index("--recording") + 1])
        victims = [base + ".mov", base + ".xml"]
    else:
        movie = arguments[arguments.index("--file") + 1]
        victims = [movie, movie.replace(".mov", ".xml")]
    for victim in victims:
        os.unlink(victim)


def main():
    arguments = sys.argv[1:]
    rule = script_for(arguments)
    note({"event": "begin", "arguments": arguments, "time": time.time(), "pid": os.getpid()})
    sys.stdout.write(rule.get("print", ""))
    sys.stdout.flush()
    sys.stdout.buffer.write(bytes.fromhex(rule.get("print_hex", "")))
    sys.stdout.flush()
    time.sleep(rule.get("delay", 0))
    while rule.get("hang") and not os.path.exists(PLACE + "/release"):
        time.sleep(0.05)
    if rule.get("delete") and "--delete" in arguments:
        delete_submitted(arguments, rule["delete"])
    status = rule.get("exit", 0)
    note({"event": "end", "arguments": arguments, "time": time.time(), "exit": status})
    return status


if __name__ == "__main__":
    sys.exit(main())
