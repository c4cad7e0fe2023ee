"""Commands that a definition file describes: `phone.cmd.WLAN.TX_START(channel=6)`."""
from __future__ import annotations

import ctypes
import json
from typing import Any, Dict, Iterator, List, Mapping, Tuple

from kral._connection import Connection, LocalPath, local, octets

_NAME_SIZE = 160


class Reply(Mapping[str, Any]):
    """The fields of a reply, as attributes and as a mapping. Groups are replies, arrays lists, blocks bytes.

    A field takes the place of a method of its name: with a field `keys`, `reply.keys` is its value. Fields whose names
    begin and end with two underscores are in the mapping only.
    """

    def __init__(self, fields: Dict[str, Any]) -> None:
        self.__dict__["_fields"] = fields

    def __getattribute__(self, name: str) -> Any:
        if not (name.startswith("__") and name.endswith("__")):
            fields = _fields_of(self)
            if name in fields:
                return fields[name]
        return super().__getattribute__(name)

    def __getattr__(self, name: str) -> Any:
        raise AttributeError(f"the reply has no field {name}")

    def __getitem__(self, name: str) -> Any:
        return _fields_of(self)[name]

    def __iter__(self) -> Iterator[str]:
        return iter(_fields_of(self))

    def __len__(self) -> int:
        return len(_fields_of(self))

    def __eq__(self, other: object) -> bool:
        if not isinstance(other, Mapping):
            return NotImplemented
        return _fields_of(self) == {name: other[name] for name in other}

    __hash__ = None  # type: ignore[assignment]

    def __repr__(self) -> str:
        return f"Reply({', '.join(f'{name}={value!r}' for name, value in _fields_of(self).items())})"


def _fields_of(reply: Reply) -> Dict[str, Any]:
    """Not by attribute, which may be a field's."""
    fields: Dict[str, Any] = object.__getattribute__(reply, "__dict__").get("_fields", {})
    return fields


def _reply(value: Any, fields: Dict[str, Dict[str, Any]]) -> Any:
    """What the library gave as JSON, with the types of the definition."""
    converted = {}
    for name, content in value.items():
        field = fields[name]

        def one(element: Any, field: Dict[str, Any] = field) -> Any:
            if "fields" in field:
                return _reply(element, {inner["name"]: inner for inner in field["fields"]})
            return bytes.fromhex(element) if field["type"] == "bytes" else element

        converted[name] = [one(element) for element in content] if "count" in field else one(content)
    return Reply(converted)


def _assignments(path: str, value: Any) -> Iterator[Tuple[str, str]]:
    """A value as the library takes it: groups and arrays field by field."""
    if isinstance(value, Mapping):
        for name in value:  # a reply may have a field `items`
            yield from _assignments(f"{path}.{name}", value[name])
    elif isinstance(value, (list, tuple)):
        for index, inner in enumerate(value):
            yield from _assignments(f"{path}[{index}]", inner)
    elif isinstance(value, (bytes, bytearray, memoryview, ctypes.Array)):
        yield path, octets(value).hex()
    elif isinstance(value, bool):
        yield path, str(int(value))
    else:
        yield path, str(value)


def _quoted(text: str) -> str:
    escaped = text.replace("\\", "\\\\").replace('"', '\\"')
    return f'"{escaped}"'


def _field_line(field: Dict[str, Any], indent: str = "    ") -> Iterator[str]:
    limits = field.get("range", "")
    default = f", default {field['default']!r}" if "default" in field else ""
    yield f"{indent}{field['name']}: {field['type']} {limits}{default}  {field.get('doc', '')}".rstrip()
    for inner in field.get("fields", []):
        yield from _field_line(inner, indent + "    ")


class Command:
    """One command of a family; its fields are the keywords of a call."""

    def __init__(self, connection: Connection, name: str) -> None:
        self._connection = connection
        length = connection.number("KRAL_CMD_DescribeLength", ctypes.c_uint32, name.encode())
        text = ctypes.create_string_buffer(length)
        connection.check("KRAL_CMD_Describe", name.encode(), text, length)
        self.name = name
        self.description: Dict[str, Any] = json.loads(text.value)
        self._reply_fields = {field["name"]: field for field in self.description["reply"]}
        self.__doc__ = self._document()

    def _document(self) -> str:
        lines: List[str] = [f"{self.name}  {self.description.get('doc', '')}".rstrip(), ""]
        for part in ("request", "reply"):
            lines.append(f"{part}:")
            for field in self.description[part]:
                lines.extend(_field_line(field))
        return "\n".join(lines)

    def __call__(self, /, **fields: Any) -> Reply:
        parts = [pair for name, value in fields.items() for pair in _assignments(name, value)]
        text = " ".join(f"{path}={_quoted(value)}" for path, value in parts)
        with self._connection.shared.replies:
            self._connection.check("KRAL_CMD_Call", self.name.encode(), text.encode(), None, 0)
            length = self._connection.number("KRAL_CMD_GetReplyLength", ctypes.c_uint32)
            reply = ctypes.create_string_buffer(length)
            self._connection.check("KRAL_CMD_GetReply", reply, length)
        result: Reply = _reply(json.loads(reply.value), self._reply_fields)
        return result

    def __repr__(self) -> str:
        return f"<kral command {self.name}>"


class Family:
    """The commands of one family, as attributes."""

    def __init__(self, commands: "Commands", name: str) -> None:
        self._commands = commands
        self._name = name

    def __getattr__(self, name: str) -> Command:
        with self._commands._definitions:
            if name.startswith("__") or f"{self._name}.{name}" not in self._commands.names():
                raise AttributeError(f"the family {self._name} has no command {name}")
            return self._commands[f"{self._name}.{name}"]

    def __dir__(self) -> List[str]:
        prefix = self._name + "."
        return [name[len(prefix):] for name in self._commands.names() if name.startswith(prefix)]


class Commands:
    """The defined commands of a handset: `phone.cmd.load("wlan.xml")`, then `phone.cmd.WLAN.TX_START(channel=6)`."""

    def __init__(self, connection: Connection) -> None:
        self._connection = connection
        self._definitions = connection.shared.definitions
        self._known: Dict[str, Command] = {}

    def load(self, file: LocalPath) -> int:
        """Loads a definition file, and gives how many commands it has."""
        with self._definitions:
            return self._connection.number("KRAL_CMD_LoadDefinitions", ctypes.c_uint32, local(file))

    def clear(self) -> None:
        """Forgets all definitions."""
        # A reply that somebody is about to read goes with them.
        with self._definitions, self._connection.shared.replies:
            self._connection.check("KRAL_CMD_ClearDefinitions")
            self._known.clear()

    def names(self) -> List[str]:
        """All commands, as FAMILY.NAME."""
        text = ctypes.create_string_buffer(_NAME_SIZE)
        names = []
        with self._definitions:
            for index in range(self._connection.number("KRAL_CMD_GetCount", ctypes.c_uint32)):
                self._connection.check("KRAL_CMD_GetName", index, text, _NAME_SIZE)
                names.append(text.value.decode())
        return names

    def __getitem__(self, name: str) -> Command:
        with self._definitions:
            if name not in self._known:
                self._known[name] = Command(self._connection, name)
            return self._known[name]

    def __getattr__(self, name: str) -> Family:
        if name.startswith("_") or not any(known.startswith(name + ".") for known in self.names()):
            raise AttributeError(f"no family {name} is defined")
        return Family(self, name)

    def __dir__(self) -> List[str]:
        return sorted({name.split(".")[0] for name in self.names()} | set(super().__dir__()))
