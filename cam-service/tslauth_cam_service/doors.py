# SPDX-License-Identifier: Apache-2.0
"""Who may be connected, and for how long: connections are bounded before TLS and HTTP begin.

A connection that has not asked anything yet is *waiting*. It is ended when it has waited for too
long; and where there is no room, the one that has waited longest gives its place to who comes new.
So clients that are slow on purpose take places from each other, and from nobody who asks.
"""
import asyncio
import ipaddress
import socket
import struct
import time

from .log import WARNING, log

# What a client may take from its first byte to the last of its request, and between two.
REQUEST_SECONDS = 5
# Who has waited for less than this gives its place to nobody: a handshake takes its time.
YIELD_SECONDS = 0.5

# A load balancer's PROXY header of version 2: what it begins with, and its fixed part.
SIGNATURE = b"\r\n\r\n\0\r\nQUIT\n"
HEADER = 16
MAXIMUM_HEADER = 536


def proxied_address(header):
    """The client's address that a whole PROXY header tells; None where it is the proxy's own
    connection, such as a look at whether anybody listens. ValueError where it is no such header."""
    if header[:12] != SIGNATURE or header[12] >> 4 != 2:
        raise ValueError("no PROXY header of version 2")
    command, family, body = header[12] & 15, header[13] >> 4, header[HEADER:]
    if command == 0:
        return None
    if command == 1 and family == 1 and len(body) >= 12:
        return str(ipaddress.IPv4Address(body[:4]))
    if command == 1 and family == 2 and len(body) >= 36:
        return str(ipaddress.IPv6Address(body[:16]))
    raise ValueError("a PROXY header of an unknown kind")


class Doors:
    """All connections of the hosts' port."""

    def __init__(self, handler, context, limits, proxies=()):
        self._handler = handler  # makes the protocol that speaks HTTP
        self._limits = limits
        self.context = context  # may be replaced: for who comes next
        self.proxies = frozenset(proxies)
        self._connections = {}  # by the peer's address and port
        self._next_complaint = 0
        self.turned_away = 0

    def __call__(self):
        return Connection(self)

    def of(self, transport):
        """The connection on which a request came; None where it has gone."""
        return self._connections.get(transport.get_extra_info("peername"))

    @property
    def number(self):
        return len(self._connections)

    @property
    def asking(self):
        return sum(not one.is_waiting for one in self._connections.values())

    def end_waiting(self):
        for one in [one for one in self._connections.values() if one.is_waiting]:
            one.end()

    def end_all(self):
        for one in list(self._connections.values()):
            one.end()

    def make_protocol(self):
        return self._handler()

    def add(self, connection):
        self._connections[connection.peer] = connection

    def remove(self, connection):
        self._connections.pop(connection.peer, None)

    def admits(self, connection):
        """Makes room where there is none. Whether there is."""
        for limit, among in (
                (self._limits["connections_of_an_address"],
                 [one for one in self._connections.values()
                  if one is not connection and one.address == connection.address]),
                (self._limits["connections"],
                 [one for one in self._connections.values() if one is not connection])):
            if len(among) < limit:
                continue
            self.turned_away += 1
            self._complain(connection.address)
            oldest = min((one for one in among if one.is_waiting), default=None,
                         key=lambda one: one.since)
            if oldest is None or time.monotonic() - oldest.since < YIELD_SECONDS:
                return False
            oldest.end()
        return True

    def _complain(self, address):
        if time.monotonic() >= self._next_complaint:  # a flood must not flood the log, too
            self._next_complaint = time.monotonic() + 1
            log(WARNING, f"{address}: too many connections", address=address)


class Connection(asyncio.BufferedProtocol):
    """From the first byte to the last; TLS and HTTP are other objects' work."""

    def __init__(self, doors):
        self._doors = doors
        self._transport = self._timer = self._task = None
        self._header = bytearray()
        self._wanted = 0
        self.peer = self.address = None
        self.is_waiting = True
        self.since = time.monotonic()

    # --- what the server tells ---

    def heard(self):
        """The request has come whole: its answer may take its time."""
        self.is_waiting = False
        self._timer.cancel()

    def answered(self):
        self.is_waiting = True
        self.since = time.monotonic()
        self._timer = asyncio.get_running_loop().call_later(REQUEST_SECONDS, self.end)

    def end(self):
        self._transport.abort()
        self.gone()

    def gone(self):
        self._timer.cancel()
        self._doors.remove(self)

    # --- before TLS ---

    def connection_made(self, transport):
        self._transport = transport
        self.peer = transport.get_extra_info("peername")
        self.address = self.peer[0]
        transport.get_extra_info("socket").setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, 1)
        self._timer = asyncio.get_running_loop().call_later(REQUEST_SECONDS, self.end)
        self._doors.add(self)
        if self.address in self._doors.proxies:
            self._wanted = HEADER
        else:
            self._admit()

    def get_buffer(self, sizehint):
        # Never more than the header: what follows is for TLS.
        self._part = memoryview(bytearray(self._wanted - len(self._header)))
        return self._part

    def buffer_updated(self, nbytes):
        self._header += self._part[:nbytes]
        try:
            if len(self._header) == HEADER:
                self._wanted = HEADER + struct.unpack("!H", self._header[14:16])[0]
                if self._wanted > MAXIMUM_HEADER:
                    raise ValueError("a PROXY header that is too long")
            if len(self._header) == self._wanted:
                self.address = proxied_address(bytes(self._header)) or self.address
                self._admit()
        except ValueError as error:
            log(WARNING, f"{self.address}: {error}", address=self.address)
            self.end()

    def eof_received(self):
        return False

    def connection_lost(self, exc):
        self.gone()

    def _admit(self):
        self._transport.pause_reading()
        if self._doors.admits(self):
            self._task = asyncio.get_running_loop().create_task(self._secure())
        else:
            self.end()

    async def _secure(self):
        relay = Relay(self, self._doors.make_protocol())
        try:
            tls = await asyncio.get_running_loop().start_tls(
                self._transport, relay, self._doors.context, server_side=True,
                ssl_handshake_timeout=REQUEST_SECONDS, ssl_shutdown_timeout=1)
        except (OSError, EOFError):  # a broken connection, or none of ours
            self.end()
            return
        if tls is None or tls.is_closing():
            self.gone()
        else:
            relay.begin(tls)


class Relay(asyncio.Protocol):
    """Hands on what comes through TLS: what comes with the handshake's end, when HTTP is ready."""

    def __init__(self, connection, protocol):
        self._connection = connection
        self._protocol = protocol
        self._early = []
        self._is_begun = False

    def begin(self, transport):
        self._is_begun = True
        self._protocol.connection_made(transport)
        for data in self._early:
            self._protocol.data_received(data)
        self._early.clear()

    def data_received(self, data):
        if self._is_begun:
            self._protocol.data_received(data)
        else:
            self._early.append(data)

    def eof_received(self):
        return self._protocol.eof_received() if self._is_begun else None

    def pause_writing(self):
        self._protocol.pause_writing()

    def resume_writing(self):
        self._protocol.resume_writing()

    def connection_lost(self, exc):
        self._connection.gone()
        if self._is_begun:
            self._protocol.connection_lost(exc)
