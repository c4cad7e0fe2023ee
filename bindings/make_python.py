"""The low-level Python module: constants, records, callbacks and the prototype of every function, for ctypes."""
import re
import typing

import headers

SCALARS = {
    "uint8_t": "c_uint8", "int8_t": "c_int8", "uint16_t": "c_uint16", "int16_t": "c_int16", "uint32_t": "c_uint32",
    "int32_t": "c_int32", "uint64_t": "c_uint64", "int64_t": "c_int64", "uintptr_t": "c_size_t", "double": "c_double",
    "char": "c_char",
}
# Constants that become members of an enumeration, by what their names begin with.
ENUMERATIONS = {"KRAL_FTM_RF_MODE_": "RfMode", "KRAL_FTM_MODE_ID_": "FtmModeId", "KRAL_TIME_OUT_": "TimeOut"}

HEAD = '''"""The C interface of kral {version}: constants, records, callbacks and prototypes. Made from its headers."""
# flake8: noqa: E501
from __future__ import annotations

import ctypes
import enum
import operator
from typing import Any, Callable, Dict, List, Tuple

VERSION = "{version}"


class Number:
    """An argument of an integer type: ctypes itself would cut a number that does not fit."""

    def __init__(self, kind: Any) -> None:
        half = 1 << 8 * ctypes.sizeof(kind) - 1
        self._kind = kind
        self._range = range(-half, half) if kind(-1).value < 0 else range(2 * half)

    def from_param(self, value: Any) -> Any:
        number = operator.index(getattr(value, "value", value))
        if number not in self._range:
            raise OverflowError(f"{{number}} is not within {{self._range[0]}} to {{self._range[-1]}}")
        return self._kind(number)


class Text:
    """Bytes that end with a zero, or room for some: what follows a zero would be left out without a word."""

    @staticmethod
    def from_param(value: Any) -> Any:
        if isinstance(value, bytes) and b"\\0" in value:
            raise ValueError("embedded null byte")
        return ctypes.c_char_p.from_param(value)


class Data:
    """Bytes, or room for some: ctypes itself would take a text for wide characters."""

    @staticmethod
    def from_param(value: Any) -> Any:
        if isinstance(value, str):
            raise TypeError("bytes are needed, not str")
        if isinstance(value, (bytearray, memoryview)):
            view = memoryview(value).cast("B")
            kind = ctypes.c_char * len(view)
            return kind.from_buffer_copy(view) if view.readonly else kind.from_buffer(view)
        return ctypes.c_void_p.from_param(value)


# What converts an argument in place of its type.
CHECKED: Dict[Any, Any] = {{ctypes.c_char_p: Text, ctypes.c_void_p: Data}}
for _kind in (ctypes.c_uint8, ctypes.c_int8, ctypes.c_uint16, ctypes.c_int16, ctypes.c_uint32, ctypes.c_int32,
              ctypes.c_uint64, ctypes.c_int64):
    CHECKED[_kind] = Number(_kind)
'''

API = '''

class Api:
    """Every function of the library under its own name, with its prototype.

    A function that the loaded library does not have is missing here, too.
    """

    def __init__(self, library: ctypes.CDLL) -> None:
        for name, (result, arguments) in PROTOTYPES.items():
            function = getattr(library, name, None)
            if function is None:
                continue
            function.restype = result
            function.argtypes = [CHECKED.get(kind, kind) for kind in arguments]
            setattr(self, name, function)
'''


def prose(text: str) -> str:
    """Fit for a docstring."""
    return text.replace("\\", "\\\\").replace('"""', "'''").strip()


def docstring(text: str, indent: str) -> str:
    lines = prose(text).split("\n")
    body = ("\n" + indent).join(lines).replace("\n" + indent + "\n", "\n\n")
    closing = "\n" + indent if len(lines) > 1 or body.endswith('"') else ""
    return f'{indent}"""{body}{closing}"""'


def type_name(kind: headers.Type, size: str) -> str:
    """What ctypes calls the type of an argument. Bytes are taken from whatever holds bytes."""
    if kind.pointers == 0:
        return kind.name if kind.name.startswith("KRAL_") and kind.name not in SCALARS else \
            f"ctypes.{SCALARS[kind.name]}"
    if kind.pointers == 2:
        return "ctypes.POINTER(ctypes.c_char_p)"
    if kind.name == "char":
        return "ctypes.c_char_p"
    if kind.name == "void" or kind.name == "uint8_t" and size:
        return "ctypes.c_void_p"
    return f"ctypes.POINTER({type_name(headers.Type(kind.name), '')})"


def callback_type(argument: headers.Argument) -> str:
    # In a callback the bytes are to be read, so there the pointer keeps its type.
    if argument.type.pointers and argument.type.name == "uint8_t":
        return "ctypes.POINTER(ctypes.c_uint8)"
    return type_name(argument.type, argument.size)


def result_type(kind: headers.Type) -> str:
    return "None" if kind.name == "void" else type_name(kind, "")


def constants(description: headers.Description) -> typing.Iterator[str]:
    for constant in description.constants:
        number = f"0x{constant.value:X}" if constant.value > 0xFFFF else str(constant.value)
        yield f"{constant.name} = {number}"


def enumerations(description: headers.Description) -> typing.Iterator[str]:
    for prefix, name in ENUMERATIONS.items():
        yield f"\n\nclass {name}(enum.IntEnum):"
        yield f'    """{prefix}..."""\n'
        for constant in description.constants:
            if constant.name.startswith(prefix):
                member = constant.name[len(prefix):]
                yield f"    {'M_' + member if re.match('[0-9]', member) else member} = {constant.value}"


def records(description: headers.Description) -> typing.Iterator[str]:
    for record in description.records:
        yield f"\n\nclass {record.name}(ctypes.Structure):"
        yield docstring(record.text, "    ") + "\n"
        yield "    _fields_ = ["
        for field in record.fields:
            kind = type_name(headers.Type(field.type), "")
            yield f'        ("{field.name}", {kind}{f" * {field.count}" if field.count else ""}),'
        yield "    ]"


def callbacks(description: headers.Description) -> typing.Iterator[str]:
    yield ""
    for callback in description.callbacks:
        types = ", ".join([result_type(callback.result), *(callback_type(item) for item in callback.arguments)])
        yield f"\n{callback.name} = ctypes.CFUNCTYPE({types})"
        yield docstring(callback.text, "")


def functions(description: headers.Description) -> typing.Iterator[str]:
    yield "\nPROTOTYPES: Dict[str, Tuple[Any, List[Any]]] = {"
    for function in description.functions:
        types = ", ".join(type_name(item.type, item.size) for item in function.arguments)
        yield f'    "{function.name}": ({result_type(function.result)}, [{types}]),'
    yield "}" + API
    for function in description.functions:
        python = {"void": "None", "double": "float"}.get(function.result.name, "int")
        arguments = ", ".join(item.name for item in function.arguments)
        yield f"    {function.name}: Callable[..., {python}]"
        yield docstring(f"{function.name}({arguments})\n\n{function.text}", "    ") + "\n"


def make(description: headers.Description) -> str:
    SCALARS.update({name: SCALARS[number] for name, number in description.handles.items()})
    lines = [HEAD.format(version=description.version)]
    for part in (constants, enumerations, records, callbacks, functions):
        lines += part(description)
    return "\n".join(lines).rstrip() + "\n"
