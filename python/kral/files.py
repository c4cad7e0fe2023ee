"""The handset's file system."""
from __future__ import annotations

import ctypes
import dataclasses
import os
import stat as _stat
from typing import Any, Callable, Iterator, List, Optional, Tuple, Union

from kral import _api
from kral._connection import Connection, Data, LocalPath, local, octets
from kral._work import Work
from kral.errors import ErrorRecord, FileError, fail, last_error

RemotePath = Union[str, "os.PathLike[str]"]  # a pathlib.PurePosixPath, say
Progress = Callable[[int, int], Any]

_NOT_A_DIRECTORY = 20  # a part of the path is a file

_KINDS = {_api.KRAL_EFS_ENTRY_DIRECTORY: "directory", _api.KRAL_EFS_ENTRY_FILE: "file",
          _api.KRAL_EFS_ENTRY_LINK: "link"}


def _bytes(path: RemotePath) -> bytes:
    """What goes over the wire: names that are no text come from listings with their bytes escaped."""
    return os.fspath(path).encode("utf-8", "surrogateescape")


@dataclasses.dataclass(frozen=True)
class Entry:
    """An entry of a directory. Times are the handset's, in seconds."""

    path: str
    kind: str  # "file", "directory" or "link"
    mode: int
    size: int
    access_time: int
    modify_time: int
    change_time: int

    @property
    def name(self) -> str:
        return self.path.rstrip("/").rpartition("/")[2]

    @property
    def is_item(self) -> bool:
        """Whether it is an item file, which is read and written as a whole."""
        return self.mode & _api.KRAL_EFS_MODE_KIND == _api.KRAL_EFS_MODE_ITEM_FILE


@dataclasses.dataclass(frozen=True)
class Status:
    """The status of a file or directory. Times are the handset's, in seconds."""

    mode: int
    size: int
    link_count: int
    access_time: int
    modify_time: int
    change_time: int

    @property
    def is_directory(self) -> bool:
        return _stat.S_ISDIR(self.mode)


class Files:
    """Files of a handset: `phone.files`. Paths, of the handset and of the PC, are texts or of pathlib."""

    def __init__(self, connection: Connection) -> None:
        self._connection = connection

    # --- Whole files

    def get(self, path: RemotePath, to: Optional[LocalPath] = None, progress: Optional[Progress] = None) -> bytes:
        """Reads a file: gives its bytes, or copies it into a file of the PC and gives b""."""
        if to is not None:
            self._transfer("KRAL_EfsRead", progress, local(to), _bytes(path))
            return b""
        size = max(self.stat(path).size, _api.KRAL_EFS_ITEM_SIZE) + 4096
        buffer = ctypes.create_string_buffer(size)
        count = ctypes.c_uint32(size)
        self._transfer("KRAL_EfsReadMem", progress, _bytes(path), buffer, ctypes.byref(count))
        return buffer.raw[:count.value]

    def put(self, source: Union[Data, LocalPath], path: RemotePath, progress: Optional[Progress] = None) -> None:
        """Writes bytes, or a file of the PC, to a file of the handset, replacing what is there."""
        if isinstance(source, (str, os.PathLike)):
            self._transfer("KRAL_EfsWrite", progress, local(source), _bytes(path))
        else:
            data = octets(source)
            self._transfer("KRAL_EfsWriteMem", progress, data, len(data), _bytes(path))

    def put_item(self, data: Data, path: RemotePath) -> None:
        """Writes an item file: at most 1,024 bytes, in one request."""
        content = octets(data)
        self._connection.check("KRAL_EfsPutItemFromMem", _bytes(path), content, len(content))

    def _transfer(self, name: str, progress: Optional[Progress], *arguments: Any) -> None:
        def moved(work: "Work[None]", _source: int, _target: int, _operation: int, _zero: int, done: int, total: int,
                  _handle: int) -> None:
            work.report(done, total)

        self._connection.long(lambda: self._connection.check(name, *arguments), progress, "transfer",
                              None if progress is None else moved)

    # --- Directories

    def listdir(self, path: RemotePath = "/") -> List[Entry]:
        """The entries of a directory, in the handset's order."""
        connection = self._connection
        room = 64
        while True:
            entries = (_api.KRAL_EFS_ENTRY * room)()
            count = ctypes.c_uint32(room)
            connection.long(lambda: connection.check("KRAL_EfsDirectory", _bytes(path), _api.KRAL_EFS_FILTER_ALL,
                                                     entries, ctypes.byref(count)))
            if count.value <= room:
                return [self._entry(entry) for entry in entries[:count.value]]
            room = count.value + 16

    @staticmethod
    def _entry(raw: Any) -> Entry:
        return Entry(raw.name.decode("utf-8", "surrogateescape"), _KINDS.get(raw.type, "file"), raw.mode, raw.size,
                     raw.access_time, raw.modify_time, raw.change_time)

    def walk(self, path: RemotePath = "/") -> Iterator[Tuple[str, List[Entry], List[Entry]]]:
        """Like os.walk: a directory, its directories and its other entries, top down. Links are not followed."""
        path = os.fspath(path)
        entries = self.listdir(path)
        folders = [entry for entry in entries if entry.kind == "directory"]
        yield path, folders, [entry for entry in entries if entry.kind != "directory"]
        for folder in folders:
            yield from self.walk(folder.path)

    def mkdir(self, path: RemotePath, parents: bool = False) -> None:
        """Makes a directory; one that is there already is none the worse for it."""
        path = os.fspath(path)
        parts = path.strip("/").split("/")
        first = 1 if parents else len(parts)
        for count in range(first, len(parts) + 1):
            folder = ("/" if path.startswith("/") else "") + "/".join(parts[:count])
            try:
                self._numbered("KRAL_EfsMkDir", folder)
            except FileError as error:
                if error.status != _api.KRAL_EFS_ERROR_EXISTS or not self.stat(folder).is_directory:
                    raise

    def rmdir(self, path: RemotePath) -> None:
        """Removes an empty directory."""
        self._numbered("KRAL_EfsRmDir", path)

    # --- Names and status

    def remove(self, path: RemotePath) -> None:
        """Removes a file, an item file or a link."""
        self._numbered("KRAL_EfsDelete", path)

    def rename(self, old: RemotePath, new: RemotePath) -> None:
        """Renames or moves."""
        self._numbered("KRAL_EFS2_DIAG_RENAME", old, _bytes(new))

    def link(self, target: RemotePath, path: RemotePath) -> None:
        """Makes a symbolic link at `path` that leads to `target`."""
        self._numbered("KRAL_EfsCreateLink", target, _bytes(path))

    def exists(self, path: RemotePath) -> bool:
        """Whether a path leads to something, links followed."""
        try:
            self.stat(path)
        except FileError as error:
            if error.status in (_api.KRAL_EFS_ERROR_NO_SUCH_FILE, _NOT_A_DIRECTORY):
                return False
            raise
        return True

    def stat(self, path: RemotePath) -> Status:
        """The status of what a path names, links followed."""
        values = [ctypes.c_uint32() for _ in range(6)]
        self._numbered("KRAL_EFS2_DIAG_STAT", path, after=[ctypes.byref(value) for value in values])
        return Status(*(value.value for value in values))

    def _numbered(self, name: str, path: RemotePath, *more: Any, after: Any = ()) -> None:
        """A call that returns 1 whenever the handset answered, and its answer as an error number."""
        number = ctypes.c_uint32()
        handle = self._connection.handle
        answered = self._connection.call(name, _bytes(path), *more, ctypes.byref(number), *after)
        if not answered and not number.value:
            fail(handle, name)
        if not number.value:
            return
        record = last_error(handle) if not answered else None
        text = f"{path}: the handset answered with error {number.value}"
        if record is None or record.function != name:
            record = ErrorRecord(_api.KRAL_ERROR_REFUSED, text, name, _api.KRAL_ERROR_STATUS_EFS, number.value, 0, None,
                                 None, None)
        raise FileError(record.text, record)
