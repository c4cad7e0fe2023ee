"""What the library calls back, and whom that tells: targets by handle.

Connects to one port share their handle and with it the library's callbacks, so these are configured once for all
connections of a handle, and taken back with the last of them.
"""
from __future__ import annotations

import functools
import operator
import threading
import weakref
from typing import Any, Callable, Dict, MutableMapping, NamedTuple, Optional, Set, Tuple

from kral import _api
from kral._library import load

Target = Callable[..., Any]


class _Kind(NamedTuple):
    type: Any
    handle_at: int  # which argument has the handle
    configure: Callable[[Any, int, Any], Any]
    result: Any = None  # when no target has one


def null(kind: Any) -> Any:
    """The null pointer of a callback's type."""
    return kind()


_KINDS = {
    "text_log": _Kind(_api.KRAL_TEXT_LOG_CALLBACK, 2,
                      lambda api, handle, function: api.KRAL_ConfigureLibraryTextLogCallBack(handle, function)),
    "download": _Kind(_api.KRAL_DOWNLOAD_PROGRESS_CALLBACK, 0,
                      lambda api, handle, function: api.KRAL_ConfigureDownloadCallBack(handle, function, 0)),
    "transfer": _Kind(_api.KRAL_EFS_TRANSFER_CALLBACK, 6,
                      lambda api, handle, function: api.KRAL_ConfigureEfs2CallBacks(
                          handle, function, null(_api.KRAL_EFS_DIRECTORY_CALLBACK))),
    "pkv": _Kind(_api.KRAL_PKV_CALLBACK, 4,
                 lambda api, handle, function: api.KRAL_PKV_ConfigureCallBack(handle, function), 1),
}


class Shared:
    """What the connections of one handle have in common."""

    def __init__(self) -> None:
        self.connections = 0
        self.port = 0
        self.ended = 0  # connects to release with the last one: a disconnect closes the port and the text log of all
        # Their connections hold them: a target may lead to its connection, which must be free to be collected.
        self.targets: MutableMapping[Tuple[str, object], Target] = weakref.WeakValueDictionary()
        self.file_owner: Optional[object] = None  # whose file the text log goes to
        self.log_flags: Dict[object, int] = {}  # the categories of the text log that each owner asks for
        self.configured: Set[str] = set()
        self.long = threading.Lock()  # one work that takes long at a time; it has the callbacks of its progress
        self.replies = threading.Lock()  # the library keeps one reply of a defined command, until the next one
        self.definitions = threading.RLock()  # of commands: they are looked up in several steps
        self.told: Optional[int] = None  # the thread that is inside a progress function


# A finalizer may run on a thread that is in here already.
_lock = threading.RLock()
_shared: Dict[int, Shared] = {}


def _function(name: str, kind: _Kind) -> Any:
    def call(*arguments: Any) -> Any:
        shared = _shared.get(arguments[kind.handle_at])
        result, failure = kind.result, None
        for (told, _), target in list(shared.targets.items()) if shared is not None else []:
            if told == name:
                try:
                    result = target(*arguments)
                except BaseException as error:  # pylint: disable=broad-except
                    failure = error
        if failure is not None:
            # It ends here: ctypes reports it, because nothing can be raised through the library.
            raise failure
        return kind.result if result is None else result

    return kind.type(call)


# The library may still be inside one that has been taken back, so none is ever thrown away.
_FUNCTIONS = {name: _function(name, kind) for name, kind in _KINDS.items()}


def is_told(port: int) -> bool:
    """Whether this thread is inside a progress function of the port."""
    with _lock:
        return any(shared.port == port and shared.told == threading.get_ident() for shared in _shared.values())


def join(handle: int, port: int) -> Shared:
    """Another connection of a handle."""
    with _lock:
        shared = _shared.setdefault(handle, Shared())
        shared.port = port
        shared.connections += 1
        return shared


def leave(handle: int, owner: object) -> int:
    """The end of a connection: its targets are not told any more. Gives how many connects are to be released."""
    end_log(handle, owner)
    with _lock:
        shared = _shared[handle]
        for key in [key for key in list(shared.targets) if key[1] is owner]:
            shared.targets.pop(key, None)
        shared.connections -= 1
        shared.ended += 1
        if shared.connections:
            return 0
        del _shared[handle]
        # A connect of the C interface may keep the handle alive, and would call into what ends here.
        for name in shared.configured:
            kind = _KINDS[name]
            kind.configure(load(), handle, null(kind.type))
        return shared.ended


def listen(name: str, handle: int, owner: object, target: Target) -> None:
    """Tells a target from now on, beside those of other owners."""
    with _lock:
        shared = _shared[handle]
        shared.targets[name, owner] = target
        shared.configured.add(name)
    kind = _KINDS[name]
    kind.configure(load(), handle, _FUNCTIONS[name])


def unlisten(name: str, handle: int, owner: object) -> None:
    with _lock:
        if handle in _shared:
            _shared[handle].targets.pop((name, owner), None)


# --- The text log: a handle has one file, and one set of categories. The library is called without the lock: a thread
# that it calls back may be here.


def _set_log_flags(handle: int, shared: Shared) -> None:
    """Switches on what any owner asks for."""
    def wanted() -> int:
        with _lock:
            return functools.reduce(operator.or_, shared.log_flags.values(), 0)

    flags = wanted()
    while True:
        load().KRAL_SetLogFlags(handle, flags)
        before, flags = flags, wanted()
        if flags == before:
            return


def begin_log(handle: int, owner: object, flags: int) -> None:
    """The categories that an owner asks for, beside those of others."""
    with _lock:
        shared = _shared[handle]
        shared.log_flags[owner] = flags
    _set_log_flags(handle, shared)


def take_log_file(handle: int, owner: object) -> bool:
    """Whether the file is this owner's from now on; it may be another's already."""
    with _lock:
        shared = _shared[handle]
        if shared.file_owner not in (None, owner):
            return False
        shared.file_owner = owner
        return True


def end_log_file(handle: int, owner: object) -> None:
    """Closes the file, if it is this owner's."""
    with _lock:
        shared = _shared[handle]
        if shared.file_owner is not owner:
            return
        shared.file_owner = None
    load().KRAL_StopLogging(handle)


def end_log(handle: int, owner: object) -> None:
    """An owner wants no text log any more."""
    end_log_file(handle, owner)
    with _lock:
        shared = _shared[handle]
        asked = shared.log_flags.pop(owner, None) is not None and bool(shared.log_flags)
    if asked:
        _set_log_flags(handle, shared)
