"""The preferences: each failure's message and level, and changes while the daemon runs."""
import base64
import errno
import os
import plistlib
import re
import resource

import pytest
from harness.agent import DEFAULTS, PREFERENCES, SECRET, SERVER_UUID
from harness.commands import exchange
from harness.log_reader import Level
from harness.tunnel_server import TunnelServer
from harness.waiting import let_pass, wait_until

UNBOUND = (Level.ERROR, "lmxagentd cannot run in agent mode without being bound to a Lumex server.")
INVALID_CONTINUOUS = (Level.CRITICAL, "Continuous capture is enabled, but the preferences are invalid.")
NO_INPUT_FILE = (Level.CRITICAL, '"RecordingPath" tag was not found or value is empty, this field is required for the '
                                 '"File" recording type')
NO_SECRET = (Level.ERROR, f"Failed to read shared secret from plist: /var/lmx/agent/secrets/{SERVER_UUID}.plist")


def required(name):
    return (Level.CRITICAL, f'"{name}" tag was not found or value is empty, this field is required')


def no_context(reason):
    return (Level.CRITICAL, f"Unable to load the recording context, exception = {reason}")


BROKEN = {
    "no CameraName": ({"CameraName": None}, [UNBOUND]),
    "no CameraUUID": ({"CameraUUID": None}, [UNBOUND]),
    "no ServerUUID": ({"ServerUUID": None}, [UNBOUND]),
    "no LumexURL": ({"LumexURL": None}, [required("ServerURL")]),
    "empty LumexURL": ({"LumexURL": ""}, [required("ServerURL")]),
    "no TunnelHost": ({"TunnelHost": None}, [required("TunnelHost")]),
    "empty TunnelHost": ({"TunnelHost": ""}, [required("TunnelHost")]),
    "no TunnelPort": ({"TunnelPort": None}, [required("TunnelPort")]),
    "empty TunnelPort": ({"TunnelPort": ""}, [required("TunnelPort")]),
    "no repository": ({"RecordingRepositoryPath": None},
                      [no_context("Missing required preference: RecordingRepositoryPath")]),
    "empty repository": ({"RecordingRepositoryPath": ""}, [required("RecordingRepositoryPath")]),
    "no type": ({"RecordingType": None}, [no_context("Missing required preference: RecordingType")]),
    "type in lower case": ({"RecordingType": "audio"},
                           [no_context("Invalid value: audio for preference: RecordingType")]),
    "what no microphone can be called": ({"RecordingAudioInput": "nowhere"},
                                         [no_context("Unknown device ID: nowhere for preference: RecordingAudioInput")]),
    "a password in it": ({"RecordingAudioInput": "rtsp://user:p@ss/word@"},
                         [no_context("Unknown device ID: rtsp://***@ for preference: RecordingAudioInput")]),
    "File without a path": ({"RecordingType": "File"}, [NO_INPUT_FILE]),
    "no cutoff": ({"RecordingDiskSpaceCutoffInMB": None}, [required("RecordingDiskSpaceCutoffInMB")]),
    "empty cutoff": ({"RecordingDiskSpaceCutoffInMB": ""}, [required("RecordingDiskSpaceCutoffInMB")]),
    "no frame rate": ({"RecordingVideoMaximumFrameRate": None}, [required("RecordingVideoMaximumFrameRate")]),
    "no frame rate, video only": ({"RecordingType": "Video", "RecordingVideoMaximumFrameRate": ""},
                                  [required("RecordingVideoMaximumFrameRate")]),
    "continuous without length": ({"ContinuousRecording": {
        "Enabled": True, "RecordingSegmentLength": 0, "ContinuousUpload": False,
        "RecordingDiskSpaceCutoffPercentLeft": 5.0}}, [INVALID_CONTINUOUS]),
    "continuous without floor": ({"ContinuousRecording": {
        "Enabled": True, "RecordingSegmentLength": 60, "ContinuousUpload": False,
        "RecordingDiskSpaceCutoffPercentLeft": 0.0}}, [INVALID_CONTINUOUS]),
}


def disabled(agent):
    """The daemon disables its own service, which it can't in here, and ends."""
    status = agent.wait_exit()
    agent.log.wait(r"^Disabling lmxagentd with keeperd\.\.\.$", level=Level.NOTICE)
    assert status in (78, 71)
    if status == 71:
        agent.log.wait(r"^Removing job from keeperd\.$", level=Level.CRITICAL)
    assert not agent.path("/var/run/lmxagentd.pid").exists()


@pytest.mark.parametrize("case", BROKEN)
def test_broken_preferences(agent, case):
    changes, lines = BROKEN[case]
    agent.preferences(**changes)
    agent.start(wait=False)
    disabled(agent)
    agent.log.wait("^Internal error caused application to stop$", level=Level.CRITICAL)
    for level, text in lines:
        assert [l for l in agent.log.lines(level=level) if text in l.text], (text, agent.report())


UNUSABLE = {
    **{f"{size} bytes": (base64.b64encode(bytes(size)).decode(), f'"lmx_secret" has {size} bytes instead of 16')
       for size in (15, 17, 0)},
    "no Base64": ("*** no base64 ***", '"lmx_secret" is not Base64 text'),
}


@pytest.mark.parametrize("case", UNUSABLE)
def test_a_secret_that_cannot_be_used_is_named(agent, case):
    text, reason = UNUSABLE[case]
    agent.secret(text)
    agent.start(wait=False)
    disabled(agent)
    lines = [line.text for line in agent.log.lines("secret|bound", level=Level.ERROR)]
    assert lines == [f'The shared secret in "/var/lmx/agent/secrets/{SERVER_UUID}.plist" can\'t be used: {reason}']
    assert not text or not agent.log.lines(re.escape(text)), "it is never quoted"


def test_a_pasted_secret_may_have_white_space_around_it(agent):
    agent.secret(f"  {base64.b64encode(SECRET).decode()}\n")
    with TunnelServer(agent.prepare()) as server:
        agent.start()
        server.accept()
        assert server.command("STOP") == "cmdStatus=0"


def test_a_missing_secret(agent):
    agent.secret(None)
    agent.start(wait=False)
    disabled(agent)
    for level, text in (NO_SECRET, UNBOUND):
        assert [l for l in agent.log.lines(level=level) if l.text == text], agent.report()


def test_the_secret_is_never_logged(running):
    secret = base64.b64encode(bytes(range(16))).decode()
    assert not [l for l in running.log.lines() if secret in l.text]


def test_no_preferences_at_all(agent):
    agent.path(PREFERENCES).unlink()
    agent.start(wait=False)
    disabled(agent)


@pytest.mark.parametrize("data", [b"", b"no property list", plistlib.dumps(DEFAULTS)[:-60], b"bplist00" + bytes(40),
                                  plistlib.dumps(["a", "list"])], ids=["empty", "text", "cut", "binary", "list"])
def test_a_malformed_property_list_is_named(agent, data):
    agent.preferences_bytes(data)
    agent.start(wait=False)
    disabled(agent)
    assert [l for l in agent.log.lines(PREFERENCES) if l.level <= Level.ERROR], agent.report()


def test_a_binary_property_list_is_read(agent):
    agent.preferences_bytes(plistlib.dumps(DEFAULTS, fmt=plistlib.FMT_BINARY))
    agent.start()
    assert "CameraName=Hall 3," in agent.command("STATUS include_profile=true").text


def profile(agent):
    return agent.command("STATUS include_profile=true").fields["CameraName"]


def test_a_replaced_file_is_noticed(running):
    running.preferences(CameraName="Hall 4")
    wait_until(lambda: profile(running) == "Hall 4", what="the new name")
    running.preferences(CameraName="Hall 5")
    wait_until(lambda: profile(running) == "Hall 5", what="the next name")


def test_an_edit_in_place_is_noticed_but_not_read(running):
    before = running.log.mark()
    path = running.path(PREFERENCES)
    path.write_bytes(path.read_bytes().replace(b"Hall 3", b"Hall 9"))
    running.log.wait(r"^Reading preferences\.\.\.$", after=before, level=Level.INFO)
    assert profile(running) == "Hall 3"


def test_a_file_replaced_by_a_broken_one_disables_the_service(running):
    running.preferences(TunnelHost=None)
    disabled_after_change(running)
    assert [l for l in running.log.lines(level=Level.CRITICAL) if l.text == required("TunnelHost")[1]]


def test_a_file_replaced_by_a_malformed_one_is_named_and_disables_the_service(running):
    mark = running.log.mark()
    running.preferences_bytes(b"no property list")
    disabled_after_change(running)
    assert [l for l in running.log.lines(PREFERENCES, after=mark) if l.level <= Level.ERROR], running.report()


def test_a_deleted_file_disables_the_service(running):
    running.path(PREFERENCES).unlink()
    disabled_after_change(running)
    assert len(running.log.lines("^The agent preferences file has been deleted$", level=Level.CRITICAL)) == 1
    assert [l for l in running.log.lines(level=Level.ERROR) if l.text == UNBOUND[1]]


def unreadable(path, number):
    return (f'^The settings file "{re.escape(path)}" can\'t be read at present: {os.strerror(number)} '
            rf"\(errno {number}\)$")


WITHOUT_OVERRIDE = ["setpriv", "--bounding-set=-dac_override,-dac_read_search",
                    "--inh-caps=-dac_override,-dac_read_search", "--"]


def test_preferences_that_may_not_be_read_leave_the_settings_as_they_are(agent):
    """Runs without the capabilities that would let root read them all the same."""
    agent.start(prefix=WITHOUT_OVERRIDE)
    path = agent.path(PREFERENCES)
    new = path.with_suffix(".tmp")
    new.write_bytes(plistlib.dumps({**DEFAULTS, "CameraName": "Hall 4"}))
    new.chmod(0)
    new.rename(path)
    agent.log.wait(unreadable(PREFERENCES, errno.EACCES), level=Level.ERROR)
    assert profile(agent) == "Hall 3"
    agent.record("A", seconds=2)
    agent.wait_tool_call("A")
    assert len(agent.log.lines("can't be read at present")) == 1, "not once for each look at the file"
    path.chmod(0o644)
    wait_until(lambda: profile(agent) == "Hall 4", what="the new name")
    agent.log.wait(f'^The settings file "{PREFERENCES}" can be read again$', level=Level.NOTICE)
    assert not agent.log.lines("Disabling")


def test_no_free_descriptor_leaves_the_settings_as_they_are(running):
    running.record("A")
    running.wait_tool_call("A", event="end")
    running.log.wait(r"^Unable to update cluster information\.$")  # now the start and the libraries are done
    pid = running.sandbox.daemon_pid
    with running.connect() as peer:  # made while there are descriptors
        assert ",CameraName=Hall 3," in exchange(peer, "STATUS include_profile=true").text
        limits = resource.prlimit(pid, resource.RLIMIT_NOFILE)
        resource.prlimit(pid, resource.RLIMIT_NOFILE, (3, limits[1]))
        running.preferences(CameraName="Hall 4")
        running.log.wait(unreadable(PREFERENCES, errno.EMFILE), level=Level.ERROR)
        mark = running.log.mark()
        let_pass(1, "the daemon looks four times a second")
        assert not running.log.lines("read", after=mark), running.report()
        resource.prlimit(pid, resource.RLIMIT_NOFILE, limits)
        wait_until(lambda: ",CameraName=Hall 4," in exchange(peer, "STATUS include_profile=true").text,
                   what="the new name")
    running.log.wait("can be read again", level=Level.NOTICE)
    assert len(running.log.lines("can be read again", level=Level.NOTICE)) == 1
    assert not running.log.lines("Disabling")


@pytest.mark.parametrize("path", [PREFERENCES, f"/var/lmx/agent/secrets/{SERVER_UUID}.plist"])
def test_a_start_that_may_not_read_its_settings_ends_without_disabling_the_service(agent, path):
    agent.path(path).chmod(0)
    agent.start(wait=False, prefix=WITHOUT_OVERRIDE)
    assert agent.wait_exit() == 1
    agent.log.wait(unreadable(path, errno.EACCES), level=Level.ERROR)
    agent.log.wait("^Internal error caused application to stop$", level=Level.CRITICAL)
    assert not agent.log.lines("Disabling|Removing|bound")


def test_a_directory_in_place_of_the_preferences_disables_the_service(agent):
    agent.path(PREFERENCES).unlink()
    agent.path(PREFERENCES).mkdir()
    agent.start(wait=False)
    disabled(agent)
    assert [l for l in agent.log.lines("not a regular file") if l.level <= Level.ERROR], agent.report()


def disabled_after_change(agent):
    assert agent.wait_exit() in (78, 71)
    agent.log.wait(r"^Disabling lmxagentd with keeperd\.\.\.$", level=Level.NOTICE)


def test_an_old_preview_interval_is_converted(agent):
    agent.preferences(RecordingPreviewIntervalInSeconds="2", PreviewIntervalInMilliseconds=None)
    agent.start()
    content = plistlib.loads(agent.path(PREFERENCES).read_bytes())
    assert content["PreviewIntervalInMilliseconds"] == "2000"
    assert "RecordingPreviewIntervalInSeconds" not in content


def test_the_listener_port_is_logged(agent):
    agent.preferences(TCPListenerPort="8170")
    agent.start()
    agent.log.wait("^TCP listener port: 8170$", level=Level.NOTICE)
