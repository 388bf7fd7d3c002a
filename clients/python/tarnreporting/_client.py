# SPDX-License-Identifier: Apache-2.0
"""Client, Session and Shape: the objects that a program works with."""

import asyncio
import atexit
import ctypes
import datetime
import enum
import logging
import os
import threading
import time
from dataclasses import dataclass
from types import TracebackType
from typing import Any, Dict, Mapping, Optional, Set, Tuple, Type, Union

from . import _library as c
from .messages import ServiceType
from .reports import REPORTS, Reports

PlainValue = Union[bool, int, float, str, datetime.datetime]

_log = logging.getLogger("tarnreporting")
_open: "Set[Client]" = set()
_MOST_INTEGER = 2**63 - 1
_LONGEST_WAIT = 0.05  # of a flush at a time, so that a close needn't wait for it for long


class Result(enum.IntEnum):
    """What a call of the library answers."""

    OK = c.OK
    DROPPED = c.DROPPED
    ARGUMENT = c.ARGUMENT
    KIND = c.KIND
    TEXT = c.TEXT_RESULT
    TOO_LARGE = c.TOO_LARGE
    CLOSED = c.CLOSED
    FORKED = c.FORKED
    BUSY = c.BUSY
    MEMORY = c.MEMORY
    SYSTEM = c.SYSTEM
    TIMEOUT = c.TIMEOUT


class Error(Exception):
    """What the library refuses at the call; `result` says why."""

    def __init__(self, result: Result, what: str = "") -> None:
        super().__init__(what or c.library().text_of(result))
        self.result = result


@dataclass(frozen=True)
class Stats:
    """A client's state and its counts so far. `taken`: by the service; `committed`: safe on its disk."""

    connected: bool
    connections: int
    posted: int
    taken: int
    committed: int
    dropped: int
    refused: int
    unlocked: int
    last_error: str


def _check(code: int) -> None:
    if code != c.OK:
        raise Error(Result(code))


def _posted(code: int) -> bool:
    """Whether the message was posted; raises Error for what is wrong with it."""
    if code not in (c.OK, c.DROPPED):
        raise Error(Result(code))
    return code == c.OK


def _milliseconds(seconds: float) -> int:
    return max(0, min(int(seconds * 1000), 2**32 - 1))


def _kind_of(value: object) -> int:
    if isinstance(value, bool):
        return c.BOOLEAN
    if isinstance(value, int):
        return c.INTEGER if -_MOST_INTEGER - 1 <= value <= _MOST_INTEGER else c.UNSIGNED
    if isinstance(value, float):
        return c.DOUBLE
    if isinstance(value, str):
        return c.TEXT
    if isinstance(value, datetime.datetime):
        return c.DATE
    raise Error(Result.KIND, f"{type(value).__name__} is no kind of value")


def _encoded(text: str) -> bytes:
    try:
        return text.encode()
    except UnicodeEncodeError as error:
        raise Error(Result.TEXT) from error


def _name(text: str) -> bytes:
    """A text that ends at its first zero, so that it may hold none."""
    if "\0" in text:
        raise Error(Result.TEXT, "a name with a zero in it")
    return _encoded(text)


def _put(place: c.Value, kind: int, value: Any) -> None:
    """Sets the value; raises Error where it isn't of the kind."""
    place.kind = kind
    if kind == c.TEXT and isinstance(value, str):
        text = _encoded(value)
        place.length, place.value.text = min(len(text), 2**32 - 1), text
    elif kind == c.BOOLEAN and isinstance(value, bool):
        place.value.boolean = value
    elif kind == c.DOUBLE and isinstance(value, (int, float)) and not isinstance(value, bool):
        place.value.number = value
    elif kind == c.INTEGER and _kind_of(value) == c.INTEGER:
        place.value.integer = value
    elif kind == c.UNSIGNED and isinstance(value, int) and not isinstance(value, bool) and 0 <= value < 2**64:
        place.value.unsigned_integer = value
    elif kind == c.DATE and isinstance(value, datetime.datetime):
        place.value.number = value.timestamp()
    else:
        raise Error(Result.KIND)


def _fields(values: Mapping[str, PlainValue]) -> "ctypes.Array[c.Field]":
    fields = (c.Field * len(values))()
    for field, (key, value) in zip(fields, values.items()):
        field.key = _name(key)
        _put(field.value, _kind_of(value), value)
    return fields


class Client:
    """A connection to the service, which comes and goes without the program's doing.

    `socket_path`: that of the service; where it isn't given, the library finds one. `ring_bytes`: how much waits in
    memory while the service is slow or away, a power of two from 4096 to 1048576.
    """

    def __init__(self, socket_path: Optional[str] = None, *, ring_bytes: int = 262144) -> None:
        self._handle: Optional[ctypes.c_void_p] = None
        self._library = c.library()
        self._refusal = c.RefusalFunction(_log_refusal)  # kept as long as the library may call it
        self._renew_lock()
        if not 0 < ring_bytes < 2**32:
            raise Error(Result.ARGUMENT)
        options = c.ClientOptions(socket_path=_name(socket_path) if socket_path else None, on_refusal=self._refusal)
        handle, writer = ctypes.c_void_p(), ctypes.c_void_p()
        _check(self._library.client_open(options, handle))
        code = self._library.writer_open(handle, c.WriterOptions(ring_bytes=ring_bytes), writer)
        if code != c.OK:
            self._library.client_close(handle, 0, None)
            raise Error(Result(code))
        self._handle, self._writer = handle, writer
        _open.add(self)

    def session(self, service_type: int = ServiceType.GENERIC, application: Optional[str] = None,
                configuration: Optional[Mapping[str, PlainValue]] = None) -> "Session":
        """Begins a session. The service sees it as soon as there is one."""
        return Session(self, service_type, application, configuration or {})

    def flush(self, timeout: float = 2.0) -> bool:
        """Waits until the service has taken all that was posted, at most so many seconds; whether it has."""
        deadline = time.monotonic() + timeout
        while True:
            left = deadline - time.monotonic()
            with self._lock:
                handle = self._required()
                self._flushes += 1
            code = self._library.client_flush(handle, _milliseconds(min(left, _LONGEST_WAIT)))
            with self._lock:
                self._flushes -= 1
                self._lock.notify_all()
            if code not in (c.OK, c.TIMEOUT):
                raise Error(Result(code))
            if code == c.OK or left <= 0:
                return bool(code == c.OK)

    async def flush_async(self, timeout: float = 2.0) -> bool:
        """As flush(), while other tasks run."""
        return await asyncio.get_running_loop().run_in_executor(None, self.flush, timeout)

    def stats(self) -> Stats:
        state = c.State()
        with self._lock:
            _check(self._library.client_state(self._required(), state))
        return Stats(state.connection == 1, state.connections, state.posted, state.taken, state.committed,
                     state.dropped, state.refused, state.unlocked, state.last_error.decode(errors="replace"))

    def close(self, timeout: float = 2.0) -> int:
        """Ends all sessions and waits at most so many seconds until the service has taken everything. How many messages
        it had not taken. To close again does nothing."""
        with self._lock:
            handle, self._handle = self._handle, None
            while self._flushes != 0:
                self._lock.wait()
        _open.discard(self)
        if handle is None:
            return 0
        left = ctypes.c_uint64()
        code = self._library.client_close(handle, _milliseconds(timeout), left)
        if code not in (c.OK, c.TIMEOUT, c.FORKED):
            raise Error(Result(code))
        return left.value

    async def close_async(self, timeout: float = 2.0) -> int:
        """As close(), while other tasks run."""
        return await asyncio.get_running_loop().run_in_executor(None, self.close, timeout)

    @property
    def closed(self) -> bool:
        return self._handle is None

    def __enter__(self) -> "Client":
        return self

    def __exit__(self, kind: Optional[Type[BaseException]], value: Optional[BaseException],
                 trace: Optional[TracebackType]) -> None:
        self.close()

    async def __aenter__(self) -> "Client":
        return self

    async def __aexit__(self, kind: Optional[Type[BaseException]], value: Optional[BaseException],
                        trace: Optional[TracebackType]) -> None:
        await self.close_async()

    def _renew_lock(self) -> None:
        # Held while a handle is used, so that no other thread ends it meanwhile.
        self._lock = threading.Condition(threading.RLock())
        self._flushes = 0  # that are in progress, without the lock

    def _required(self) -> ctypes.c_void_p:
        if self._handle is None:
            raise Error(Result.CLOSED)
        return self._handle


class Session(Reports):
    """Something that plays or records. Ends with its `with`, with end() or with the client."""

    def __init__(self, client: Client, service_type: int, application: Optional[str],
                 configuration: Mapping[str, PlainValue]) -> None:
        self._client = client
        self._handle: Optional[ctypes.c_void_p] = None
        self._reports: Dict[str, Shape] = {}
        if not 0 <= service_type <= 65535:
            raise Error(Result.ARGUMENT)
        fields = _fields(configuration)
        options = c.SessionOptions(service_type=service_type, configuration=fields, configuration_count=len(fields),
                                   application=_name(application) if application is not None else None)
        handle = ctypes.c_void_p()
        with client._lock:
            _check(client._library.session_begin(client._required(), options, handle))
        self._handle = handle

    def post(self, category: int, type: int, fields: Mapping[str, PlainValue], *,
             stamp: Optional[float] = None) -> bool:
        """Posts a message of any keys, with the time of the call or `stamp`, in seconds since 1970 UTC. Whether it was
        posted: False where there was no room for it. Raises Error for what is wrong with it."""
        if not 0 <= category < 2**32 or not 0 <= type <= 65535:
            raise Error(Result.ARGUMENT)
        listed = _fields(fields)
        options = c.MessageOptions(category=category, type=type, fields=listed, field_count=len(listed),
                                   stamp_ns=_nanoseconds(stamp))
        client = self._client
        with client._lock:
            return _posted(client._library.post_fields(client._writer, self._required(), options))

    def shape(self, category: int, type: int, keys: Mapping[str, Type[Any]]) -> "Shape":
        """What messages of one kind look like, for those that come often: {"volume": float, "route": str}."""
        return Shape(self, category, type, keys)

    def end(self) -> None:
        """Ends it once the service has taken what was posted; doesn't wait for that. To end again does nothing."""
        with self._client._lock:
            handle, self._handle = self._handle, None
            if handle is None or self._client.closed:
                return
            code = self._client._library.session_end(handle)
        if code not in (c.OK, c.FORKED):
            raise Error(Result(code))

    def __enter__(self) -> "Session":
        return self

    def __exit__(self, kind: Optional[Type[BaseException]], value: Optional[BaseException],
                 trace: Optional[TracebackType]) -> None:
        self.end()

    def _required(self) -> ctypes.c_void_p:
        self._client._required()
        if self._handle is None:
            raise Error(Result.CLOSED)
        return self._handle

    def _report(self, name: str, stamp: Optional[float], *values: object) -> bool:
        with self._client._lock:
            shape = self._reports.get(name)
            if shape is None:
                shape = self._reports[name] = Shape(self, *REPORTS[name])
        return shape.post(*values, stamp=stamp)


_KINDS: Dict[Type[Any], int] = {bool: c.BOOLEAN, int: c.INTEGER, float: c.DOUBLE, str: c.TEXT,
                                datetime.datetime: c.DATE}


class Shape:
    """Messages of a session that have the same keys: their values are given in the order of the keys."""

    def __init__(self, session: Session, category: int, type: int, keys: Mapping[str, Type[Any]]) -> None:
        self._session = session
        if not 0 <= category < 2**32 or not 0 <= type <= 65535:
            raise Error(Result.ARGUMENT)
        try:
            self._kinds: Tuple[int, ...] = tuple(_KINDS[kind] for kind in keys.values())
        except KeyError as error:
            raise Error(Result.KIND, f"{error.args[0]!r} is no kind of value") from error
        listed = (c.Key * len(keys))(*(c.Key(_name(key), kind) for key, kind in zip(keys, self._kinds)))
        options = c.ShapeOptions(category=category, type=type, keys=listed, key_count=len(keys))
        self._handle = ctypes.c_void_p()
        with session._client._lock:
            _check(session._client._library.shape_declare(session._required(), options, self._handle))
        self._values = c.Value * len(keys)

    def post(self, *values: object, stamp: Optional[float] = None) -> bool:
        """As Session.post() does."""
        if len(values) != len(self._kinds):
            raise Error(Result.KIND)
        listed = self._values()
        for place, kind, value in zip(listed, self._kinds, values):
            _put(place, kind, value)
        at = _nanoseconds(stamp)
        client, count = self._session._client, len(values)
        with client._lock:
            self._session._required()
            if stamp is None:
                return _posted(client._library.post(client._writer, self._handle, listed, count))
            return _posted(client._library.post_at(client._writer, self._handle, at, listed, count))


def _nanoseconds(stamp: Optional[float]) -> int:
    if stamp is None:
        return 0
    if not 0 < stamp < 1.8e10:
        raise Error(Result.ARGUMENT)
    return int(stamp * 1e9)


def _log_refusal(context: object, text: bytes) -> None:
    _log.warning("%s", text.decode(errors="replace"))


@atexit.register
def _close_all() -> None:
    for client in list(_open):
        left = client.close(1.0)
        if left != 0:
            _log.warning("%d messages were not taken", left)


def _in_child() -> None:
    for client in _open:
        client._renew_lock()
    _open.clear()


os.register_at_fork(after_in_child=_in_child)
