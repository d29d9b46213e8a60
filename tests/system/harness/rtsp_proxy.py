#!/usr/bin/python3
"""The program behind BadNetwork: a line between a viewer and a network camera that delays, damages and breaks.

Says "ready" once it listens. Each line on its standard input is an order, a JSON object with new settings (see Line)
and with "do": "cut" resets all connections, "refuse" also stops to listen, "listen" listens again.
"""
import argparse
import asyncio
import json
import random
import re
import signal
import socket
import struct
import sys
import time
from dataclasses import dataclass, field

HEADERS = 16  # bytes of a packet that are never damaged: those of the transport
SOUND = 2  # the channel of the second stream
REPORTS = 200  # the RTCP packet that tells which time of day a time stamp stands for


@dataclass
class Line:
    """What the way from the camera to the viewer is like at the moment. All connections share it."""

    upstream: int = 8554  # the camera's port
    delay: float = 0.0  # seconds
    jitter: float = 0.0  # up to so many seconds more, by chance for each packet; the order stays
    rate: float = 0.0  # bytes a second at most; 0: no limit
    stalled: bool = False  # nothing passes; it is kept
    damage: float = 0.0  # share of the packets with some bytes changed
    broken: bool = False  # what begins a packet is lost as well, until a connection has suffered from it once
    begin: str = ""  # hexadecimal: what the sound's packets carry begins with that
    describe: float = 0.0  # seconds before the question what the camera has is passed on; below 0: never
    garbage: str = ""  # said instead of anything else to who connects
    ppm: float = 0.0  # how much faster the camera's time stamps run
    jump: float = 0.0  # seconds added to the camera's time stamps
    chance: random.Random = field(default_factory=lambda: random.Random(1))
    changed: asyncio.Event = field(default_factory=asyncio.Event)

    def order(self, settings):
        for name, value in settings.items():
            setattr(self, name, value)
        self.changed.set()
        self.changed.clear()

    async def goes(self):
        while self.stalled:
            await self.changed.wait()


class Stamps:
    """Gives the packets of one connection the time stamps of another clock."""

    def __init__(self, line):
        self.line = line
        self.rates = {}  # payload type: ticks a second
        self.clocks = {}  # channel: (first time stamp, ticks a second)

    def describe(self, text):
        for number, rate in re.findall(rb"a=rtpmap:(\d+) [^/]+/(\d+)", text):
            self.rates[int(number)] = int(rate)

    def edit(self, packet):
        channel, kind = packet[1], packet[5]
        place = 8
        if channel % 2:
            if kind != REPORTS:
                return
            channel, place = channel - 1, 20
        stamp, = struct.unpack_from(">I", packet, place)
        if channel not in self.clocks:
            if place != 8:
                return
            self.clocks[channel] = (stamp, self.rates.get(kind & 127, 90000))
        first, rate = self.clocks[channel]
        passed = (stamp - first + 2**31) % 2**32 - 2**31
        stamp += round(passed * self.line.ppm * 1e-6 + self.line.jump * rate)
        struct.pack_into(">I", packet, place, stamp % 2**32)


class Connection:
    """One viewer's."""

    def __init__(self, line, viewer, camera):
        self.line = line
        self.viewer = viewer  # reader, writer
        self.camera = camera
        self.stamps = Stamps(line)
        self.waiting = asyncio.Queue()  # (due, bytes)
        self.due = 0.0
        self.ended = False

    async def serve(self):
        tasks = [asyncio.create_task(work) for work in (self.questions(), self.answers(), self.deliver())]
        await asyncio.wait(tasks, return_when=asyncio.FIRST_COMPLETED)
        for task in tasks:
            task.cancel()
        await asyncio.gather(*tasks, return_exceptions=True)
        for _, writer in (self.viewer, self.camera):
            writer.transport.abort() if self.ended else writer.close()

    def cut(self):
        """Resets the connections."""
        self.ended = True
        for _, writer in (self.viewer, self.camera):
            writer.get_extra_info("socket").setsockopt(socket.SOL_SOCKET, socket.SO_LINGER, struct.pack("ii", 1, 0))
            writer.transport.abort()

    async def questions(self):
        """From the viewer to the camera."""
        while data := await self.viewer[0].read(65536):
            if data.startswith(b"DESCRIBE ") and self.line.describe:
                await asyncio.sleep(self.line.describe if self.line.describe > 0 else 1e6)
            await self.line.goes()
            self.camera[1].write(data)
            await self.camera[1].drain()

    async def answers(self):
        """From the camera: all that it says is taken at once, so that the camera notices nothing."""
        while True:
            unit = bytearray(await self.camera[0].readexactly(1))
            if unit == b"$":
                unit += await self.camera[0].readexactly(3)
                unit += await self.camera[0].readexactly(struct.unpack_from(">H", unit, 2)[0])
                self.edit(unit)
            else:
                unit += await self.camera[0].readuntil(b"\r\n\r\n")
                size = re.search(rb"(?i)content-length: *(\d+)", unit)
                unit += await self.camera[0].readexactly(int(size[1]) if size else 0)
                self.stamps.describe(unit)
            now = time.monotonic()
            self.due = max(self.due, now + self.line.delay + self.line.chance.uniform(0, self.line.jitter))
            self.waiting.put_nowait((self.due, bytes(unit)))

    def edit(self, packet):
        if self.line.ppm or self.line.jump or self.stamps.clocks or self.stamps.rates:
            self.stamps.edit(packet)
        if self.line.chance.random() < self.line.damage and len(packet) > HEADERS and not packet[1] % 2:
            for _ in range(3):
                packet[self.line.chance.randrange(HEADERS, len(packet))] = self.line.chance.randrange(256)
            if self.line.broken:
                packet[0] = 0
        if self.line.begin and packet[1] == SOUND:
            begin = bytes.fromhex(self.line.begin)
            packet[HEADERS: HEADERS + len(begin)] = begin

    async def deliver(self):
        """To the viewer, when it is time."""
        while True:
            due, unit = await self.waiting.get()
            await asyncio.sleep(max(0.0, due - time.monotonic()))
            await self.line.goes()
            if self.line.rate:
                await asyncio.sleep(len(unit) / self.line.rate)
            self.viewer[1].write(unit)
            await self.viewer[1].drain()


class Proxy:
    def __init__(self, port, line):
        self.port = port
        self.line = line
        self.server = None
        self.connections = set()

    async def listen(self):
        self.server = await asyncio.start_server(self.connected, "127.0.0.1", self.port)

    async def connected(self, reader, writer):
        if self.line.garbage:
            writer.write(self.line.garbage.encode("latin-1"))
            await reader.read()
            return writer.close()
        try:
            camera = await asyncio.open_connection("127.0.0.1", self.line.upstream)
        except OSError:
            return writer.transport.abort()
        connection = Connection(self.line, (reader, writer), camera)
        self.connections.add(connection)
        await connection.serve()
        self.connections.discard(connection)

    async def orders(self):
        reader = asyncio.StreamReader()
        await asyncio.get_running_loop().connect_read_pipe(lambda: asyncio.StreamReaderProtocol(reader), sys.stdin)
        print("ready", flush=True)
        while text := await reader.readline():
            settings = json.loads(text)
            deed = settings.pop("do", "")
            self.line.order(settings)
            if deed == "refuse":
                self.server.close()
            elif deed == "listen":
                await self.listen()
            if deed in ("cut", "refuse"):
                for connection in set(self.connections):
                    connection.cut()
            print("done", flush=True)


async def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("port", type=int)
    parser.add_argument("upstream", type=int)
    options = parser.parse_args()
    proxy = Proxy(options.port, Line(upstream=options.upstream))
    await proxy.listen()
    await proxy.orders()


if __name__ == "__main__":
    signal.signal(signal.SIGPIPE, signal.SIG_IGN)
    asyncio.run(main())
