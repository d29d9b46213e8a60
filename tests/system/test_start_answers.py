"""START answers for itself: its own result, whoever else sends commands, and only to names that can be borne."""
import threading
from collections import Counter
from concurrent.futures import ThreadPoolExecutor

import pytest
from harness import movie
from harness.commands import exchange, start_line
from harness.log_reader import Level
from harness.tunnel_tool import TunnelTool

UUID = "RecordingMetadata_RECORDING_UUID"


@pytest.fixture
def server(agent):
    """A server that the running agent has said hello to. Its replies come faster than those of the harness's own."""
    with TunnelTool(agent.prepare()) as one:
        agent.start()
        one.accept()
        yield one


def test_no_start_answers_for_another_command(agent, server):
    agent.preferences(RecordingDiskSpaceCutoffInMB="2000000000")
    agent.log.wait("^Reading preferences", count=2)
    end, stops = threading.Event(), Counter()

    def send_stops():
        while not end.is_set():
            stops[server.command("STOP")] += 1

    with ThreadPoolExecutor() as pool, agent.connect() as peer:
        other = pool.submit(send_stops)
        try:
            starts = Counter(exchange(peer, start_line(f"S{number}")).text for number in range(2000))
        finally:
            end.set()
        other.result()
    assert starts == {"cmdStatus=30": 2000}
    assert set(stops) == {"cmdStatus=0"} and stops.total() > 500, stops
    assert agent.repository() == [] and agent.submitted() == []


def test_of_two_starts_at_once_one_wins(agent, server):
    winners = []
    with ThreadPoolExecutor() as pool:
        for number in range(8):
            together = threading.Barrier(2)

            def start(say, uuid, together=together):
                line = start_line(uuid, RecordingMetadata_TITLE=f"Title of {uuid}")
                together.wait(5)
                return say(line)

            ways = {f"LOCAL-{number}": lambda line: agent.command(line).text, f"TUNNEL-{number}": server.command}
            asked = {uuid: pool.submit(start, say, uuid) for uuid, say in ways.items()}
            replies = {reply.result(): uuid for uuid, reply in asked.items()}
            assert sorted(replies) == ["cmdStatus=0", "cmdStatus=4"]
            winners.append(replies["cmdStatus=0"])
            agent.let_record(1)
            assert agent.command("STOP").text == "cmdStatus=0"
            agent.wait_recorded(winners[-1])
    agent.wait_tool_call(winners[-1], event="end")
    assert agent.submitted() == winners
    assert agent.repository() == sorted(f"{uuid}.{kind}" for uuid in winners for kind in ("mov", "xml"))
    for uuid in winners:
        document = agent.document(uuid)
        assert (document[UUID], document["RecordingMetadata_TITLE"]) == (uuid, f"Title of {uuid}")


@pytest.mark.parametrize("uuid", ["x" * 300, "x" * 252, "ö" * 130, "", ".", "..", "a/b"],
                         ids=["300", "252", "260 bytes", "empty", "dot", "two dots", "slash"])
def test_a_name_that_no_file_can_bear(running, uuid):
    mark = running.log.mark()
    assert running.start_recording(uuid).text == "cmdStatus=31"
    running.log.wait(UUID, after=mark, level=Level.ERROR, timeout=5)
    assert running.command("STATUS").fields["recordStatus"] == "0"
    assert running.repository() == []


def test_names_that_are_unusual(running):
    uuids = ["x" * 200, "Größe und Länge – 講義 №7 🎓", ".hidden", "...", "100% of it", "-f", "Ä" * 100]
    for uuid in uuids:
        running.record(uuid)
        movie.decodes(running.movie(uuid))
        assert running.document(uuid)[UUID] == uuid
    running.wait_tool_call(uuids[-1], event="end")
    assert running.submitted() == uuids
    assert running.repository() == sorted(f"{uuid}.{kind}" for uuid in uuids for kind in ("mov", "xml"))
