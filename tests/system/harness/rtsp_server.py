#!/usr/bin/python3
"""The program behind RtspCamera: serves one launch line on a loopback port, for all viewers together.

Says "ready" once it listens. Each line on its standard input is an order: "set ELEMENT PROPERTY VALUE" changes an
element of the running picture, as gst-launch-1.0 would set it. Standard error tells "viewers N" at each change.
"""
import argparse
import sys

import gi

gi.require_version("Gst", "1.0")
gi.require_version("GstRtsp", "1.0")
gi.require_version("GstRtspServer", "1.0")
from gi.repository import GLib, Gst, GstRtsp, GstRtspServer  # noqa: E402

TRANSPORTS = {"tcp": GstRtsp.RTSPLowerTrans.TCP, "udp": GstRtsp.RTSPLowerTrans.UDP,
              "both": GstRtsp.RTSPLowerTrans.TCP | GstRtsp.RTSPLowerTrans.UDP}


class Camera:
    """One mount point and what it shows."""

    def __init__(self, options):
        self.options = options
        self.media = None
        self.server = GstRtspServer.RTSPServer(address="127.0.0.1", service=str(options.port))
        if options.user:
            self._demand_password()
        self.viewers = set()
        self.server.connect("client-connected", self._greet)
        self.server.get_mount_points().add_factory("/" + options.mount, self._factory())

    def _factory(self):
        factory = GstRtspServer.RTSPMediaFactory()
        factory.set_launch("( " + self.options.launch + " )")
        factory.set_shared(True)
        factory.set_protocols(TRANSPORTS[self.options.transport])
        if self.options.user:
            self._only_for_the_user(factory)
        factory.connect("media-configure", self._configure)
        return factory

    def _greet(self, _server, client):
        client.connect("play-request", lambda *_: self._count(self.viewers.add, client))
        client.connect("teardown-request", lambda *_: self._count(self.viewers.discard, client))
        client.connect("closed", lambda *_: self._count(self.viewers.discard, client))

    def _count(self, change, client):
        before = len(self.viewers)
        change(client)
        if len(self.viewers) != before:
            print("viewers", len(self.viewers), file=sys.stderr, flush=True)

    @staticmethod
    def _only_for_the_user(factory):
        rights = (GstRtspServer.RTSP_PERM_MEDIA_FACTORY_ACCESS, GstRtspServer.RTSP_PERM_MEDIA_FACTORY_CONSTRUCT)
        granted = ", ".join(f"{right}=(boolean)true" for right in rights)
        factory.add_role_from_structure(Gst.Structure.new_from_string("viewer, " + granted))

    def _demand_password(self):
        auth = GstRtspServer.RTSPAuth()
        token = GstRtspServer.RTSPToken.new()
        token.set_string(GstRtspServer.RTSP_TOKEN_MEDIA_FACTORY_ROLE, "viewer")
        basic = GstRtspServer.RTSPAuth.make_basic(self.options.user, self.options.password)
        auth.add_basic(basic, token)
        self.server.set_auth(auth)

    def _configure(self, _factory, media):
        self.media = media
        if self.options.key_frame_after:
            pay = media.get_element().get_by_name("pay0")
            pay.get_static_pad("sink").add_probe(Gst.PadProbeType.BUFFER, self._withhold_key_frames, {})

    def _withhold_key_frames(self, _pad, info, begin):
        """Lets the pictures between the key frames pass, as a viewer sees them who comes amid a long group."""
        buffer = info.get_buffer()
        first = begin.setdefault("time", buffer.pts)
        early = buffer.pts - first < self.options.key_frame_after * Gst.SECOND
        delta = buffer.has_flags(Gst.BufferFlags.DELTA_UNIT)
        return Gst.PadProbeReturn.DROP if early and not delta else Gst.PadProbeReturn.OK

    def order(self, _channel, _condition):
        line = sys.stdin.readline()
        if not line:
            return False
        _, element, name, value = line.rstrip("\n").split(" ", 3)
        Gst.util_set_object_arg(self.media.get_element().get_by_name(element), name, value)
        return True


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("launch")
    parser.add_argument("--port", type=int, default=8554)
    parser.add_argument("--mount", default="hall")
    parser.add_argument("--user")
    parser.add_argument("--password")
    parser.add_argument("--transport", choices=TRANSPORTS, default="both")
    parser.add_argument("--key-frame-after", type=float, default=0.0, help="seconds without a key frame at first")
    options = parser.parse_args()
    Gst.init(None)
    camera = Camera(options)
    assert camera.server.attach(None), f"port {options.port} can't be had"
    GLib.io_add_watch(sys.stdin.fileno(), GLib.IO_IN | GLib.IO_HUP, camera.order)
    print("ready", flush=True)
    GLib.MainLoop().run()


if __name__ == "__main__":
    main()
