"""NV items: by number as bytes, and by name as numbers, where definitions are loaded."""
from __future__ import annotations

import ctypes
import dataclasses
import operator
import xml.etree.ElementTree as ElementTree
from typing import Any, Dict, Iterable, Iterator, List, Mapping, Optional, Sequence, Tuple, Union

from kral import _api
from kral._connection import Connection, Data, LocalPath, local, octets
from kral.errors import BadArgument, ErrorRecord, KralError, Refused, exception, last_error

Numbers = Union[int, Sequence[int], Mapping[str, int], str]


def _text(value: Union[int, Iterable[int], str]) -> str:
    """Numbers as the library takes them; a truth value is one, too."""
    if isinstance(value, str):
        return value
    try:
        return str(operator.index(value))  # type: ignore[arg-type]
    except TypeError:
        return ",".join(str(operator.index(number)) for number in value)  # type: ignore[union-attr]


class NvError(KralError):
    """A call of the NV tool failed; `tool_code` is its error code (KRAL_NV_ERROR_...)."""


@dataclasses.dataclass(frozen=True)
class NvDefinition:
    """What is known about an item. `fields` are the names of its numbers, of its first form."""

    index: int
    id: Optional[int]
    path: Optional[str]
    name: str
    max_index: int
    fields: Tuple[str, ...]


class NvValue(Tuple[int, ...]):
    """The numbers of an item in order, and by the names of its fields: `value["level"]`. int() of a single one."""

    fields: Tuple[str, ...]

    def __new__(cls, numbers: Sequence[int], fields: Tuple[str, ...]) -> "NvValue":
        value = super().__new__(cls, tuple(numbers))  # type: ignore[arg-type]
        value.fields = fields
        return value

    def __getnewargs__(self) -> Tuple[Tuple[int, ...], Tuple[str, ...]]:
        return tuple(self), self.fields

    def __getitem__(self, key):  # type: ignore[no-untyped-def]
        if isinstance(key, str):
            if key not in self.fields:
                raise KeyError(f"{key}: not among the fields {', '.join(self.fields)}")
            key = self.fields.index(key)
        return super().__getitem__(key)

    def __int__(self) -> int:
        if len(self) != 1:
            raise TypeError(f"the item has {len(self)} numbers: {', '.join(self.fields)}")
        return int(super().__getitem__(0))

    def asdict(self) -> Dict[str, int]:
        return dict(zip(self.fields, self))

    def __repr__(self) -> str:
        return f"NvValue({', '.join(f'{name}={number}' for name, number in zip(self.fields, self))})" \
            if len(self.fields) == len(self) else f"NvValue{tuple(self)}"


class Nv:
    """NV items of a handset: `phone.nv`."""

    def __init__(self, connection: Connection) -> None:
        self._connection = connection
        self._definitions: Dict[str, NvDefinition] = {}

    # --- Bytes by number

    def read(self, item: int, length: int = _api.KRAL_NV_DATA_SIZE) -> bytes:
        """The data field of an item. Refused, with the NV status, when it has none."""
        data = ctypes.create_string_buffer(length)
        status = ctypes.c_uint16()
        self._connection.check("KRAL_DIAG_NV_READ_F", item, data, length, ctypes.byref(status))
        self._judge("KRAL_DIAG_NV_READ_F", item, status.value)
        return data.raw

    def write(self, item: int, data: Data) -> None:
        """Writes what the data field of an item begins with; the rest of it becomes 0."""
        status = ctypes.c_uint16()
        content = octets(data)
        self._connection.check("KRAL_DIAG_NV_WRITE_F", item, content, len(content), ctypes.byref(status))
        self._judge("KRAL_DIAG_NV_WRITE_F", item, status.value)

    @staticmethod
    def _judge(function: str, item: int, status: int) -> None:
        if status:
            text = f"NV item {item}: the handset answered with status {status}"
            raise Refused(text, ErrorRecord(_api.KRAL_ERROR_REFUSED, text, function, _api.KRAL_ERROR_STATUS_NV, status,
                                            0, None, None, None))

    # --- The NV tool

    def _tool(self, name: str, *arguments: object, allowed: Tuple[int, ...] = (0,)) -> int:
        """A call whose result is an error code."""
        handle = self._connection.handle
        code = self._connection.call(name, *arguments)
        if code in allowed:
            return code
        record = last_error(handle)
        if record is not None and record.function == name:
            failure = exception(record)
        else:
            text = ctypes.create_string_buffer(128)
            self._connection.api.KRAL_NV_GetErrorText(0, code, text, len(text))
            failure = NvError(f"{name}: {text.value.decode()}")
        failure.tool_code = code
        raise failure

    def _text(self, name: str, *arguments: object) -> str:
        length = ctypes.c_uint32()
        self._tool(f"{name}StringLength", *arguments, ctypes.byref(length))
        text = ctypes.create_string_buffer(length.value)
        self._tool(name, *arguments, text, length.value)
        return text.value.decode("utf-8", "replace")

    def load_definitions(self, path: LocalPath, dictionary: Optional[LocalPath] = None) -> None:
        """Loads a file of definitions, and before it a dictionary of data types if there is one."""
        if dictionary is not None:
            self._tool("KRAL_NV_LoadNVDataTypeDictinary", local(dictionary))
        self._tool("KRAL_NV_LoadNVDefinitionFile", local(path), allowed=(0, _api.KRAL_NV_ERROR_REDEFINED))
        self._definitions = {definition.name or definition.path or str(definition.id): definition
                             for definition in self._read_definitions()}

    def _read_definitions(self) -> Iterator[NvDefinition]:
        counts = []
        for name in ("KRAL_NV_GetNumOfNVDefinition", "KRAL_NV_GetNumOfNVEfsDefinition"):
            count = ctypes.c_uint32()
            self._tool(name, ctypes.byref(count))
            counts.append(count.value)
        for index in range(sum(counts)):
            element = ElementTree.fromstring(self._text("KRAL_NV_GetNVDefinitionByIndex", index))
            path = element.get("fullpathname")
            yield NvDefinition(index, int(element.get("id", "0")) if path is None else None, path,
                               element.get("name", ""), int(element.get("maxIndex", "0")),
                               tuple(self._text("KRAL_NV_GetNVDefinitionFieldNames", index).split(",")))

    @property
    def definitions(self) -> List[NvDefinition]:
        return list(self._definitions.values())

    def definition(self, key: Union[str, int]) -> NvDefinition:
        """By name, path or number. KeyError for one that no definition file has."""
        if isinstance(key, str) and key in self._definitions:
            return self._definitions[key]
        for definition in self._definitions.values():
            if key in (definition.id, definition.path):
                return definition
        raise KeyError(f"{key}: not among the {len(self._definitions)} definitions that are loaded")

    def __contains__(self, key: object) -> bool:
        """Whether `nv[key]` has a definition; nothing is asked of the handset."""
        try:
            self._find(key)
        except (KeyError, TypeError, BadArgument):
            return False
        return True

    def __iter__(self) -> Iterator[str]:
        """The names of the items that are defined."""
        return iter(list(self._definitions))

    # --- Values by definition

    def _find(self, key: Any) -> Tuple[NvDefinition, int]:
        """The definition that a key names, and the element."""
        name, element = key if isinstance(key, tuple) else (key, 0)
        definition = self.definition(name)
        if not 0 <= element <= definition.max_index:
            raise BadArgument(f"{name}: element {element} is not one of 0 to {definition.max_index}")
        return definition, element

    def __getitem__(self, key: Union[str, int, Tuple[Union[str, int], int]]) -> NvValue:
        """Reads an item from the handset: `nv["FTM_MODE"]`, `nv[453]`, and an array's element `nv["SPEED_DIAL", 2]`."""
        definition, element = self._find(key)
        if definition.path is not None:
            path = definition.path.encode()
            self._tool("KRAL_NV_ReadNVItemFromMobileByEfsFilename", path)
            text = self._text("KRAL_NV_GetNVValueStringByEfsFilename", path)
        else:
            status = ctypes.c_uint16()
            self._tool("KRAL_NV_ReadNVItemFromMobileByNVID", definition.id, ctypes.byref(status))
            text = self._text("KRAL_NV_GetNVValueStringByNVID", definition.id, element)
        return NvValue([int(number) for number in text.split(",") if number.strip()], definition.fields)

    def __setitem__(self, key: Union[str, int, Tuple[Union[str, int], int]], value: Numbers) -> None:
        """Writes an item to the handset: one number, all of them, or a mapping of fields to change in what is there."""
        definition, element = self._find(key)
        if isinstance(value, Mapping):
            there = self[key].asdict()
            for field in value:
                if field not in there:
                    raise KeyError(f"{field}: not among the fields {', '.join(there)}")
            value = [*{**there, **value}.values()]
        text = _text(value)
        if definition.path is not None:
            path = definition.path.encode()
            self._tool("KRAL_NV_SetNVValueStringByEfsFilename", path, text.encode())
            self._tool("KRAL_NV_WriteNVItemToMobileByEfsFilename", path)
        else:
            status = ctypes.c_uint16()
            self._tool("KRAL_NV_SetNVValueStringByNVID", definition.id, element, text.encode())
            self._tool("KRAL_NV_WriteNVItemToMobileByNVID", definition.id, ctypes.byref(status))
