"""A flat header for the import wizard of LabVIEW: one file of plain C without includes, macros or callbacks."""
import typing

import headers

SCALARS = {
    "uint8_t": "unsigned char", "int8_t": "signed char", "uint16_t": "unsigned short", "int16_t": "short",
    "uint32_t": "unsigned int", "int32_t": "int", "uint64_t": "unsigned long long", "int64_t": "long long",
    "uintptr_t": "void*", "double": "double", "char": "char", "void": "void",
}
HEAD = """/*
 * kral {version} for the import wizard of LabVIEW: no includes, no macros. Made from the headers of the library, which
 * have the documentation. Calling convention: C (cdecl). Callbacks and the values for them are void*: pass 0; the text
 * of the library tells which calls poll instead.
 */
"""


def spelled(kind: headers.Type) -> str:
    name = SCALARS.get(kind.name)
    if name is None:
        # A callback is a pointer that LabVIEW leaves 0.
        name = kind.name if kind.pointers else "void*"
    stars = {0: "", 1: "*", 2: "* const*" if kind.const else "**"}[kind.pointers]
    return ("const " if kind.const else "") + name + stars


def constants(description: headers.Description) -> typing.Iterator[str]:
    yield "enum {"
    small = [constant for constant in description.constants if not constant.unsigned]
    for constant in small:
        yield f"  {constant.name} = {constant.value}{',' if constant is not small[-1] else ''}"
    yield "};\n"
    for constant in description.constants:
        if constant.unsigned:
            yield f"static const unsigned int {constant.name} = {constant.value:#x}u;"


def records(description: headers.Description) -> typing.Iterator[str]:
    for record in description.records:
        yield f"\ntypedef struct {record.name} {{"
        for field in record.fields:
            length = f"[{field.count}]" if field.count else ""
            yield f"  {spelled(headers.Type(field.type))} {field.name}{length};"
        yield f"}} {record.name};"


def functions(description: headers.Description) -> typing.Iterator[str]:
    yield ""
    for function in description.functions:
        arguments = ", ".join(f"{spelled(item.type)} {item.name}" for item in function.arguments) or "void"
        yield f"{spelled(function.result)} {function.name}({arguments});"


def make(description: headers.Description) -> str:
    SCALARS.update({name: SCALARS[number] for name, number in description.handles.items()})
    lines = [HEAD.format(version=description.version)]
    for part in (constants, records, functions):
        lines += part(description)
    return "\n".join(lines) + "\n"
