# SPDX-License-Identifier: Apache-2.0
"""The C library: its structs and functions, as tarnreporting.h has them."""

import ctypes
import os
import threading
from ctypes import POINTER, c_char, c_char_p, c_double, c_int, c_int64, c_size_t, c_uint32, c_uint64, c_void_p
from typing import Any, Dict, Optional

NAME = "libtarnreporting.so.1"

INTEGER, UNSIGNED, DOUBLE, DATE, BOOLEAN, TEXT = range(1, 7)
OK, DROPPED, ARGUMENT, KIND, TEXT_RESULT, TOO_LARGE, CLOSED, FORKED, BUSY, MEMORY, SYSTEM, TIMEOUT = range(12)

RefusalFunction = ctypes.CFUNCTYPE(None, c_void_p, c_char_p)


class _As(ctypes.Union):
    _fields_ = [("integer", c_int64), ("unsigned_integer", c_uint64), ("number", c_double), ("boolean", c_int64),
                ("text", c_char_p)]


class Value(ctypes.Structure):
    _fields_ = [("kind", c_uint32), ("length", c_uint32), ("value", _As)]


class Key(ctypes.Structure):
    _fields_ = [("name", c_char_p), ("kind", c_uint32)]


class Field(ctypes.Structure):
    _fields_ = [("key", c_char_p), ("value", Value)]


class _Sized(ctypes.Structure):
    """A struct that begins with its size."""

    def __init__(self, **members: Any) -> None:
        super().__init__(size=ctypes.sizeof(type(self)), **members)


class ClientOptions(_Sized):
    _fields_ = [("size", c_size_t), ("socket_path", c_char_p), ("on_refusal", RefusalFunction), ("context", c_void_p)]


class SessionOptions(_Sized):
    _fields_ = [("size", c_size_t), ("service_type", c_uint32), ("application", c_char_p),
                ("configuration", POINTER(Field)), ("configuration_count", c_size_t)]


class ShapeOptions(_Sized):
    _fields_ = [("size", c_size_t), ("category", c_uint32), ("type", c_uint32), ("keys", POINTER(Key)),
                ("key_count", c_size_t)]


class MessageOptions(_Sized):
    _fields_ = [("size", c_size_t), ("category", c_uint32), ("type", c_uint32), ("fields", POINTER(Field)),
                ("field_count", c_size_t), ("stamp_ns", c_uint64)]


class WriterOptions(_Sized):
    _fields_ = [("size", c_size_t), ("ring_bytes", c_uint32), ("flags", c_uint32)]


class State(_Sized):
    _fields_ = [("size", c_size_t), ("connection", c_uint32), ("connections", c_uint32), ("posted", c_uint64),
                ("taken", c_uint64), ("committed", c_uint64), ("dropped", c_uint64), ("refused", c_uint64),
                ("unlocked", c_uint32), ("last_error", c_char * 160)]


class LibraryNotFound(OSError):
    """There is no libtarnreporting.so.1, or it is older than this package."""


# What may wait lets other threads run meanwhile.
_WAITING: Dict[str, Any] = {
    "client_open": [POINTER(ClientOptions), POINTER(c_void_p)],
    "client_close": [c_void_p, c_uint32, POINTER(c_uint64)],
    "client_flush": [c_void_p, c_uint32],
    "client_state": [c_void_p, POINTER(State)],
    "session_begin": [c_void_p, POINTER(SessionOptions), POINTER(c_void_p)],
    "session_end": [c_void_p],
    "shape_declare": [c_void_p, POINTER(ShapeOptions), POINTER(c_void_p)],
    "writer_open": [c_void_p, POINTER(WriterOptions), POINTER(c_void_p)],
    "writer_close": [c_void_p],
}
# What takes less time than to let them run.
_QUICK: Dict[str, Any] = {
    "post": [c_void_p, c_void_p, POINTER(Value), c_size_t],
    "post_at": [c_void_p, c_void_p, c_uint64, POINTER(Value), c_size_t],
    "post_fields": [c_void_p, c_void_p, POINTER(MessageOptions)],
}


class Library:
    """The functions, by their names without what they all begin with."""

    client_open: Any
    client_close: Any
    client_flush: Any
    client_state: Any
    session_begin: Any
    session_end: Any
    shape_declare: Any
    writer_open: Any
    writer_close: Any
    post: Any
    post_at: Any
    post_fields: Any

    def __init__(self, path: str) -> None:
        waiting, quick = ctypes.CDLL(path), ctypes.PyDLL(path)
        for library, functions in ((waiting, _WAITING), (quick, _QUICK)):
            for name, arguments in functions.items():
                function = getattr(library, "tarnreporting_" + name)
                function.argtypes, function.restype = arguments, c_int
                setattr(self, name, function)
        self._text = quick.tarnreporting_result_text
        self._text.argtypes, self._text.restype = [c_int], c_char_p

    def text_of(self, result: int) -> str:
        return str(self._text(result).decode())


_library: Optional[Library] = None
_loading = threading.Lock()


def library() -> Library:
    """The library, which is looked for once; raises LibraryNotFound."""
    global _library
    with _loading:
        if _library is None:
            path = os.environ.get("TARNREPORTING_LIBRARY") or NAME
            try:
                _library = Library(path)
            except (OSError, AttributeError) as error:
                raise LibraryNotFound(f"{path}: {error}") from error
        return _library
