"""What sequences of commands have left behind: movies, documents, submissions, log."""
import re
import subprocess
from concurrent.futures import ThreadPoolExecutor

from .agent import REPOSITORY
from .command_model import Left
from .log_reader import Level

FPS = 30
TEMPORARY = re.compile(r"^\.lmx-.*\.xml\.\w{6}$")
ACCEPTED = (  # lines at critical and above that the events explain, by the events; each sequence ends with a STOP
    (r"^Recording canceled, missing RecordingMetadata_RECORDING_UUID\.$", set()),
    (r"^The recording could not be finished: nothing was captured for ", set()),
    (r"^The recording could not be finished: no recording of request ", {"GONE"}),  # lost before START had marked it
    (r"^The capture device has been disconnected\.$", {"END"}),
    (r"^Internal error caused application to stop$", {"END"}),
)


def seconds_of(path):
    """Decodes the whole movie. @return the length of its pictures in seconds, and what is wrong with it"""
    command = ["ffmpeg", "-nostdin", "-v", "warning", "-i", str(path), "-map", "0", "-f", "framecrc", "-"]
    result = subprocess.run(command, capture_output=True, timeout=120, check=False)
    frames = sum(line.startswith(b"0,") for line in result.stdout.splitlines())
    problem = result.stderr.decode(errors="replace").strip()
    if result.returncode != 0 or problem or not frames:
        return frames / FPS, f"its movie does not decode ({frames} frames): {problem}"
    return frames / FPS, ""


def document_problem(document, op):
    """Why the document is not that of the START `op`; empty if it is."""
    wanted = {"RecordingMetadata_RECORDING_UUID": op.title, "RecordingMetadata_TITLE": "Talk " + op.title,
              "n": str(op.number)}
    foreign = {key: document.get(key) for key, value in wanted.items() if document.get(key) != value}
    return f"its document holds {foreign} instead of {wanted}" if foreign else ""


def left_of(agent, op, submitted):
    """What is left of the START `op`. `submitted` are the identifiers in the order of their submissions."""
    path = agent.path(f"{REPOSITORY}/{op.title}.mov")
    places = [i for i, uuid in enumerate(submitted) if uuid == op.title]
    name = re.escape(op.title)
    left = {"submissions": len(places), "place": places[0] if places else -1,
            "empty": bool(agent.log.lines(rf"nothing was captured for .*/{name}\.mov$"
                                          rf'|^The capture of ".*/{name}\.mov" ended early: ')),
            "named": bool(agent.log.lines(rf'^The agent ended while ".*/{name}\.mov" was being submitted'))}
    if not path.exists():
        orphan = path.with_suffix(".xml").exists()
        return Left(**left, problem="a document without its movie" if orphan else "")
    seconds, problem = seconds_of(path)
    try:
        problem = problem or document_problem(agent.document(op.title), op)
    except FileNotFoundError:
        problem = problem or "a movie without its document"
    return Left(**left, movie=True, seconds=seconds, problem=problem)


def collect(agent, operations):
    """What is left of each START in `operations`, by title."""
    submitted = agent.submitted()
    starts = [op for op in operations if op.verb == "START"]
    with ThreadPoolExecutor(2) as readers:
        return dict(zip((op.title for op in starts), readers.map(lambda op: left_of(agent, op, submitted), starts)))


def strays(agent, titles, ended):
    """Files in the repository that belong to none of the recordings. A process that `ended` while it was writing a
    document leaves a temporary beside it."""
    known = {f"{title}.{kind}" for title in titles for kind in ("mov", "xml")} | {".lmxagentd"}
    unknown = [name for name in agent.repository() if name not in known]
    return [name for name in unknown if not (ended and TEMPORARY.match(name))]


def bad_lines(lines, verbs):
    """The lines at critical and above that the events don't explain."""
    def explained(line):
        return any(re.search(pattern, line.text) and causes <= verbs for pattern, causes in ACCEPTED)
    return [line for line in lines if Level.UNKNOWN < line.level <= Level.CRITICAL and not explained(line)]


def sweep(agent):
    """Removes the finished movies, so that the repository does not grow from batch to batch."""
    for name in agent.repository():
        if name.endswith((".mov", ".xml")) or TEMPORARY.match(name):
            agent.path(f"{REPOSITORY}/{name}").unlink()
