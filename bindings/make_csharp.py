"""Kral.cs: constants, records, delegates, a P/Invoke declaration and a checked method of Phone for every function."""
import pathlib
import typing

import headers

SCALARS = {
    "uint8_t": "byte", "int8_t": "sbyte", "uint16_t": "ushort", "int16_t": "short", "uint32_t": "uint",
    "int32_t": "int", "uint64_t": "ulong", "int64_t": "long", "uintptr_t": "UIntPtr", "double": "double",
    "char": "byte", "void": "void",
}
UTF8 = "[MarshalAs((UnmanagedType)48 /* LPUTF8Str */)] string"
WORDS = {"in", "out", "ref", "event", "params", "object", "string", "base", "lock", "fixed", "checked", "override"}
HEAD = """// kral {version} for C#. Made from the headers of the library.
//
// Phone has a method for each function that takes a handle: results are checked, and a failure is a KralException.
// Native has the functions as they are. Texts are UTF-8; a byte[] that receives one is read with Kral.Text.
using System;
using System.Collections.Generic;
using System.Runtime.InteropServices;
using System.Text;

namespace KralLibrary {{
"""


def summary(text: str, indent: str) -> typing.Iterator[str]:
    escaped = text.replace("&", "&amp;").replace("<", "&lt;").replace(">", "&gt;")
    lines = [line for line in escaped.split("\n")]
    yield f"{indent}/// <summary>"
    for line in lines:
        yield f"{indent}/// {line}".rstrip()
    yield f"{indent}/// </summary>"


def plain(name: str) -> str:
    return f"@{name}" if name in WORDS else name


def value_type(name: str) -> str:
    return SCALARS.get(name, name)


def declared(argument: headers.Argument) -> str:
    """The argument's type in a P/Invoke declaration."""
    kind = argument.type
    if not kind.pointers:
        return value_type(kind.name)
    if kind.pointers == 2:
        return "IntPtr[]"
    if argument.size == "text":
        return UTF8
    element = "byte" if kind.name == "void" else value_type(kind.name)
    if argument.size:
        mark = {"in": "[In]", "out": "[Out]", "inout": "[In, Out]"}[argument.direction]
        return f"{mark} {element}[]"
    return {"in": f"[In] ref {element}", "out": f"out {element}", "inout": f"ref {element}"}[argument.direction]


def in_callback(argument: headers.Argument) -> str:
    return "IntPtr" if argument.type.pointers else value_type(argument.type.name)


def method_type(argument: headers.Argument) -> str:
    """The same without what only the marshaller needs."""
    text = declared(argument)
    return "string" if text == UTF8 else text.replace("[In, Out] ", "").replace("[In] ", "").replace("[Out] ", "")


def passed(argument: headers.Argument) -> str:
    first = method_type(argument).split()[0]
    return f"{first} {plain(argument.name)}" if first in ("out", "ref") else plain(argument.name)


def constants(description: headers.Description) -> typing.Iterator[str]:
    yield "  /// <summary>The functions and constants as they are.</summary>"
    yield "  public static class Native {"
    yield '    public const string Library = "kral";'
    for constant in description.constants:
        kind = "uint" if constant.unsigned else "int"
        if constant.text:
            yield from summary(constant.text, "    ")
        yield f"    public const {kind} {constant.name} = {constant.value};"


def functions(description: headers.Description) -> typing.Iterator[str]:
    for function in description.functions:
        arguments = ", ".join(f"{declared(item)} {plain(item.name)}" for item in function.arguments)
        yield ""
        yield from summary(function.text, "    ")
        yield "    [DllImport(Library, CallingConvention = CallingConvention.Cdecl)]"
        yield f"    public static extern {value_type(function.result.name)} {function.name}({arguments});"
    yield "  }"


def records(description: headers.Description) -> typing.Iterator[str]:
    for record in description.records:
        yield ""
        yield from summary(record.text, "  ")
        yield "  [StructLayout(LayoutKind.Sequential, Pack = 1)]"
        yield f"  public struct {record.name} {{"
        for field in record.fields:
            if field.text:
                yield from summary(field.text, "    ")
            if field.count:
                yield f"    [MarshalAs(UnmanagedType.ByValArray, SizeConst = {field.count})]"
            kind = value_type(field.type) + ("[]" if field.count else "")
            yield f"    public {kind} {plain(field.name)};"
        yield "  }"


def delegates(description: headers.Description) -> typing.Iterator[str]:
    for callback in description.callbacks:
        arguments = ", ".join(f"{in_callback(item)} {plain(item.name)}" for item in callback.arguments)
        yield ""
        yield from summary(callback.text, "  ")
        yield "  [UnmanagedFunctionPointer(CallingConvention.Cdecl)]"
        yield f"  public delegate {value_type(callback.result.name)} {callback.name}({arguments});"


def checked(function: headers.Function) -> typing.Iterator[str]:
    """What a method looks at before its call: what C would overrun, or cut."""
    by_name = {argument.name: argument for argument in function.arguments}
    for argument in function.arguments:
        name = plain(argument.name)
        if declared(argument) == UTF8:
            yield f'Kral.Whole({name}, "{argument.name}"); '
        elif argument.size and argument.type.pointers:
            size = by_name.get(argument.size)
            if size is None:
                needed = argument.size if argument.size.isdigit() else f"Native.{argument.size}"
            elif size.type.pointers and size.direction == "out":
                continue  # told by the function, about room that it knows otherwise
            else:
                needed = plain(size.name)
            yield f'Kral.Fits({name}, {needed}, "{argument.name}"); '


def methods(description: headers.Description) -> typing.Iterator[str]:
    """What Phone has beside its hand-written part."""
    kept = {callback.name for callback in description.callbacks}
    yield "\n  public sealed partial class Phone {"
    for function in description.functions:
        takes_handle = function.arguments and function.arguments[0].type.name == "KRAL_HANDLE"
        if not takes_handle or function.name in ("KRAL_DisconnectServer", "KRAL_GetLastError"):
            continue
        arguments = ", ".join(f"{method_type(item)} {plain(item.name)}" for item in function.arguments[1:])
        call = f"Native.{function.name}({', '.join(['Handle', *(passed(item) for item in function.arguments[1:])])})"
        result, body = {
            "flag": ("void", f"Check({call}, \"{function.name}\");"),
            "code": ("void", f"CheckCode({call}, \"{function.name}\");"),
            "answer": ("bool", f"return Answer({call});"),
            "none": ("void", f"{call}; GC.KeepAlive(this);"),
        }.get(function.result_kind, (value_type(function.result.name), f"return Value({call});"))
        keep = "".join(f"Keep({plain(item.name)}); " for item in function.arguments if item.type.name in kept)
        looks = "".join(checked(function))
        yield ""
        yield from summary(function.text, "    ")
        yield f"    public {result} {function.name[len('KRAL_'):]}({arguments}) {{ {looks}{keep}{body} }}"
    yield "  }"


def make(description: headers.Description) -> str:
    SCALARS.update({name: SCALARS[number] for name, number in description.handles.items()})
    lines = [HEAD.format(version=description.version)]
    for part in (constants, functions, records, delegates, methods):
        lines += part(description)
    written = pathlib.Path(__file__).with_name("Phone.cs").read_text(encoding="utf-8")
    return "\n".join(lines) + "\n\n" + written + "}\n"
