"""What lies between the library and a handset: a pseudo-terminal, or the functions of a caller's transport.

Both hand the requests to a behaviour, which decides what the handset does with them, and carry what is sent back, each
piece at its time. A line belongs to one handset and to one connect.
"""
from __future__ import annotations

import ctypes
import fcntl
import heapq
import os
import pathlib
import select
import struct
import termios
import threading
import time
import tty
from typing import Any, Callable, List, Optional, Tuple

import kral
from kral import _api
from torture.peer.codec import Deframer, frame
from torture.peer.phone import Phone

Behaviour = Callable[[bytes, "Line"], None]
WORKS: Behaviour = lambda request, line: line.reply(request)  # noqa: E731
# So often in turn a full driver takes nothing.
_REFUSALS = 6


class Line:
    """The side of the handset. Pieces reach the library as they were sent, not joined, if possible."""

    def __init__(self, phone: Phone, behaviour: Behaviour = WORKS) -> None:
        self.phone = phone
        self.behaviour = behaviour
        self.handle = 0
        self.requests: List[bytes] = []
        self.came = threading.Event()
        # Gives what comes in front of every piece, and when there is none; or nothing.
        self.source: Optional[Callable[[], bytes]] = None
        # What the line makes of bytes, in both directions.
        self.spoil: Callable[[bytes], bytes] = lambda data: data
        self._deframer = Deframer()
        self._lock = threading.Lock()
        self._pieces: List[Tuple[float, int, bytes]] = []
        self._count = 0
        self._rest = b""

    def send(self, data: bytes, after: float = 0) -> None:
        with self._lock:
            self._count += 1
            heapq.heappush(self._pieces, (time.monotonic() + after, self._count, data))
        self._wake()

    def reply(self, request: bytes, after: float = 0) -> None:
        answer = self.phone.answer(request)
        if answer is not None:
            self.send(frame(answer), after)

    def drop_pieces(self) -> None:
        """What has not been given to the library yet is lost."""
        with self._lock:
            self._pieces.clear()
            self._rest = b""
            self.source = None

    def _receive(self, data: bytes) -> None:
        for request in self._deframer.feed(self.spoil(data)):
            self.requests.append(request)
            self.behaviour(request, self)
            self.came.set()

    def _due(self, room: int) -> bytes:
        """The next piece, behind what the source has; what is beyond the room comes first the next time."""
        with self._lock:
            data = self._rest
            if not data:
                data = self.source() if self.source else b""
                if self._pieces and self._pieces[0][0] <= time.monotonic():
                    data += heapq.heappop(self._pieces)[2]
            self._rest = data[room:]
            return self.spoil(data[:room])

    def _wake(self) -> None:
        """There may be something to send."""

    def connect(self, mode: int) -> int:
        raise NotImplementedError

    def close(self) -> None:
        raise NotImplementedError


class CallerLine(Line):
    """A caller's transport: each call of the receive function gets one piece."""

    def __init__(self, phone: Phone, port: int, behaviour: Behaviour = WORKS) -> None:
        super().__init__(phone, behaviour)
        self.port = port
        self.failure = 0
        self._notifies = False
        self.functions: Tuple[Any, Any, Any] = (_api.KRAL_SEND_FUNCTION(self._on_send),
                                                _api.KRAL_RECEIVE_FUNCTION(self._on_receive),
                                                _api.KRAL_FLUSH_FUNCTION(lambda context, transport: 0))

    def connect(self, mode: int) -> int:
        self.handle = kral.api().KRAL_ConnectServer_UserDefinedTransport(self.port, 1, 2, *self.functions)
        kral.api().KRAL_SetReceiveMode(self.handle, mode)
        self._notifies = mode == _api.KRAL_RECEIVE_MODE_WAKE
        return self.handle

    def close(self) -> None:
        self._notifies = False
        if self.handle:
            kral.api().KRAL_DisconnectServer(self.handle)
        self.handle = 0

    def _on_send(self, context: int, transport: int, count: int, data: Any, written: Any) -> int:
        if self.failure:
            return self.failure
        self._receive(ctypes.string_at(data, count))
        return 0

    def _on_receive(self, context: int, transport: int, count: Any, buffer: Any) -> int:
        data = self._due(count[0])
        ctypes.memmove(buffer, data, len(data))
        count[0] = len(data)
        return self.failure

    def _wake(self) -> None:
        if self._notifies:
            kral.api().KRAL_NotifyReceived(self.handle)


class Ports:
    """The folder in which the library finds its COM ports: links to pseudo-terminals."""

    def __init__(self, folder: pathlib.Path) -> None:
        self.folder = folder
        os.environ["KRAL_PORT_DIR"] = str(folder)

    def path(self, port: int) -> pathlib.Path:
        return self.folder / f"com{port}"

    def link(self, port: int, device: str) -> None:
        link = self.path(port)
        fresh = self.folder / f".com{port}.new"
        fresh.symlink_to(device)
        fresh.replace(link)

    def unlink(self, port: int) -> None:
        self.path(port).unlink(missing_ok=True)


class PtyLine(Line):
    """A pseudo-terminal under a COM number."""

    def __init__(self, phone: Phone, ports: Ports, port: int, behaviour: Behaviour = WORKS) -> None:
        super().__init__(phone, behaviour)
        self.port = port
        self.ports = ports
        self.reads = True
        self._alarm, self._bell = os.pipe()
        os.set_blocking(self._bell, False)
        self._thread: Optional[threading.Thread] = None
        self._master = self._slave = -1
        self.device = ""
        self.plug()

    def plug(self, pair: Optional[Tuple[int, int]] = None) -> None:
        """A new pseudo-terminal under the COM number, or the one given."""
        self._master, self._slave = pair or os.openpty()
        tty.setraw(self._slave)
        os.set_blocking(self._master, False)
        self.device = os.ttyname(self._slave)
        self._deframer = Deframer()
        self._stop = False
        self.ports.link(self.port, self.device)
        self._thread = threading.Thread(target=self._run, daemon=True)
        self._thread.start()

    def unplug(self) -> None:
        # The link first: the device's name is free for the next pseudo-terminal as soon as this one is closed.
        self.ports.unlink(self.port)
        self._end()

    def block(self) -> None:
        """Nothing that the library writes is taken any more, and the driver's buffer is full."""
        self.reads = False
        self._wake()
        other = os.open(self.device, os.O_RDWR | os.O_NOCTTY | os.O_NONBLOCK)
        try:
            # Where it has no room for much it may have some for a little, and goes on moving what it took: full is
            # what takes not even a byte, and stays so.
            refused = 0
            while refused < _REFUSALS:
                try:
                    os.write(other, bytes(1 if refused else 4096))
                    refused = min(refused, 1)
                except BlockingIOError:
                    refused += 1
                    if refused > 1:
                        time.sleep(0.005)
        finally:
            os.close(other)

    def unblock(self) -> None:
        fcntl.ioctl(self._master, termios.TCFLSH, termios.TCIFLUSH)
        self.reads = True
        self._wake()

    def connect(self, mode: int) -> int:
        self.handle = kral.api().KRAL_ConnectServer(self.port)
        kral.api().KRAL_SetReceiveMode(self.handle, mode)
        return self.handle

    def close(self) -> None:
        if self.handle:
            kral.api().KRAL_DisconnectServer(self.handle)
        self.handle = 0
        self.unplug()
        for end in (self._alarm, self._bell):
            os.close(end)

    def waiting(self) -> int:
        """Bytes that the driver has for the library."""
        return int(struct.unpack("i", fcntl.ioctl(self._slave, termios.FIONREAD, bytes(4)))[0])

    def _end(self) -> None:
        if self._thread is None:
            return
        self._stop = True
        self._wake()
        if threading.current_thread() is not self._thread:
            self._thread.join()
        self._thread = None
        os.close(self._master)
        os.close(self._slave)

    def _wake(self) -> None:
        try:
            os.write(self._bell, b".")
        except BlockingIOError:
            pass

    def _run(self) -> None:
        rest = b""
        while not self._stop:
            rest = rest or self._due(4096)
            reads = [self._alarm] + ([self._master] if self.reads else [])
            ready, writable, _ = select.select(reads, [self._master] if rest else [], [], self._pause())
            if self._alarm in ready:
                os.read(self._alarm, 4096)
            if self._master in ready:
                self._take()
            if writable:
                rest = rest[self._put(rest):]

    def _pause(self) -> float:
        with self._lock:
            if self._rest or self.source:
                return 0.001
            if not self._pieces:
                return 0.5
            return max(0.0, min(0.5, self._pieces[0][0] - time.monotonic()))

    def _take(self) -> None:
        try:
            data = os.read(self._master, 65536)
        except OSError:
            return
        self._receive(data)

    def _put(self, data: bytes) -> int:
        try:
            return os.write(self._master, data)
        except OSError:
            return 0
