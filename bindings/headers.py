"""Reads the public headers of kral into one description: functions, callbacks, records, constants, their documentation.

read(folder) gives a Description and a list of complaints: whatever a header leaves open that a binding needs to know.
"""
import dataclasses
import pathlib
import re
import typing

from pycparser import c_ast

import arithmetic
import comments
import source

# What <stdint.h> gives, as sizes and names.
SCALARS = {
    "uint8_t": 1, "int8_t": 1, "uint16_t": 2, "int16_t": 2, "uint32_t": 4, "int32_t": 4, "uint64_t": 8, "int64_t": 8,
    "char": 1, "double": 8,
}
# A pointer to one of these without a size would be ambiguous: one byte, or many?
BYTES = ("uint8_t", "char", "void")
# What a size may be.
COUNTS = ("uint8_t", "uint16_t", "uint32_t", "uint64_t", "uintptr_t")
STANDARD = tuple(name for name in (*SCALARS, "uintptr_t") if name.endswith("_t"))


@dataclasses.dataclass
class Type:
    name: str  # uint16_t, char, void, KRAL_EFS_ENTRY, a callback
    pointers: int = 0
    const: bool = False  # what the first pointer leads to

    def spelled(self) -> str:
        """As in C, with every const but that of the argument itself."""
        return ("const " if self.const else "") + self.name + {0: "", 1: "*", 2: "*const*" if self.const else "**"}[
            self.pointers]


@dataclasses.dataclass
class Argument:
    name: str
    type: Type
    direction: str = "in"  # in, out, inout
    size: str = ""  # of a buffer: a number, a constant or another argument; "" for one value; "text": terminated
    text: str = ""


@dataclasses.dataclass
class Function:
    name: str
    result: Type
    arguments: typing.List[Argument]
    header: str
    text: str
    result_text: str
    # handle, flag (1 or 0), answer (0 is one), code (0 is success), value, none
    result_kind: str

    def signature(self) -> str:
        inner = ", ".join(argument.type.spelled() for argument in self.arguments) or "void"
        return f"{self.result.spelled()} {self.name}({inner})"


@dataclasses.dataclass
class Field:
    name: str
    type: str
    count: int  # elements of an array; 0 for none
    offset: typing.Dict[str, int]
    text: str


@dataclasses.dataclass
class Record:
    name: str
    fields: typing.List[Field]
    size: typing.Dict[str, int]  # "32" and "64"
    header: str
    text: str


@dataclasses.dataclass
class Constant:
    name: str
    value: int
    unsigned: bool
    header: str
    text: str


@dataclasses.dataclass
class Description:
    version: str
    handles: typing.Dict[str, str]  # types of handles, and the numbers that they are
    constants: typing.List[Constant]
    records: typing.List[Record]
    callbacks: typing.List[Function]
    functions: typing.List[Function]


class Reader:
    """One header after the other, in the order in which they include each other."""

    def __init__(self) -> None:
        self.complaints: typing.List[str] = []
        self.handles: typing.Dict[str, str] = {}
        self.constants: typing.Dict[str, Constant] = {}
        self.numbers: typing.Dict[str, arithmetic.Number] = {}  # the constants, as C calculates with them
        self.records: typing.Dict[str, Record] = {}
        self.callbacks: typing.Dict[str, Function] = {}
        self.functions: typing.Dict[str, Function] = {}
        self.seen: typing.Set[str] = set()
        self.header = ""
        self.source = source.Source("", "")
        self.file_comment = comments.parse("/** */")
        self.previous: typing.Optional[Function] = None

    def complain(self, line: int, what: str) -> None:
        self.complaints.append(f"{self.header}:{line}: {what}")

    # --- One header

    def read(self, path: pathlib.Path) -> None:
        if path.name in self.seen:
            return
        self.seen.add(path.name)
        raw = path.read_text(encoding="utf-8")
        for found in re.finditer(r'^#include "kral/(\w+\.h)"', raw, re.MULTILINE):
            included = path.with_name(found.group(1))
            if included.is_file():
                self.read(included)
            else:
                self.header = path.name
                self.complain(raw.count("\n", 0, found.start()) + 1, f"there is no {included.name}")
        self.header, self.source = path.name, source.Source(raw, path.name)
        self.previous = None
        first = comments.COMMENT.search(raw)
        if not first or "@file" not in first.group(0):
            self.complain(1, "does not begin with a comment that has @file")
        else:
            self.file_comment = comments.parse(first.group(0))
        # Comments by the line after their last one, and by the line they begin in where code stands before them.
        self.above, self.beside = {}, {}
        for match in comments.COMMENT.finditer(raw):
            begin = raw.count("\n", 0, match.start()) + 1
            end = raw.count("\n", 0, match.end()) + 1
            if raw[:match.start()].rpartition("\n")[2].strip():
                self.beside[begin] = match.group(0)
            elif not match.group(0).startswith("/* ---"):
                self.above[end + 1] = match.group(0)
        for line in self.source.conditional:
            self.complain(line, "what only some platforms have cannot be described")
        self.read_constants(raw)
        self.read_code()

    def comment_above(self, line: int) -> typing.Optional[comments.Comment]:
        return comments.parse(self.above[line]) if line in self.above else None

    def check_name(self, name: str, table: typing.Container[str], line: int) -> None:
        if not name.startswith("KRAL_"):
            self.complain(line, f"{name} does not begin with KRAL_")
        if name in table:
            self.complain(line, f"{name} is declared twice")

    # --- Constants

    def read_constants(self, raw: str) -> None:
        group = ""
        for number, line in enumerate(raw.split("\n"), 1):
            if line.endswith(";"):
                group = ""  # a list ends where something else is declared
            if number in self.above:
                group = comments.until_paragraph(comments.plain(self.above[number]))
            joined = re.sub(r"\\$", "", line)
            match = re.match(r"#\s*define\s+(\w+)(\(|.*)", joined)
            # What has no value guards its header.
            if not match or match.group(1) in ("KRAL_API", "KRAL_CALL") or not match.group(2) and joined == line:
                continue
            if match.group(2) == "(":
                self.complain(number, f"{match.group(1)} is a macro with parameters")
                continue
            words = match.group(2)
            if line.endswith("\\"):
                words += raw.split("\n")[number]
            text = comments.COMMENT.search(words)
            self.add_constant(match.group(1), comments.COMMENT.sub("", re.sub(r"/\*.*", "", words)), number,
                              comments.one_line(comments.plain(text.group(0))) if text else group)

    def add_constant(self, name: str, expression: str, line: int, text: str) -> None:
        self.check_name(name, self.constants, line)
        try:
            number = arithmetic.evaluate(expression, self.numbers)
        except (ArithmeticError, SyntaxError, ValueError) as error:
            self.complain(line, f"{name} is no number that can be described: {error}")
            return
        if not text and not name.startswith("KRAL_VERSION_"):
            self.complain(line, f"{name} has no comment")
        self.numbers[name] = number
        self.constants[name] = Constant(name, number.value, number.value > 0x7FFFFFFF, self.header, text)

    # --- Declarations

    def read_code(self) -> None:
        try:
            nodes = self.source.nodes((*STANDARD, *self.handles, *self.records, *self.callbacks))
        except source.Unreadable as error:
            self.complain(error.line, str(error))
            return
        for node in nodes:
            self.read_declaration(node)

    def read_declaration(self, node: c_ast.Node) -> None:
        line = node.coord.line
        if isinstance(node, c_ast.Typedef):
            if isinstance(node.type, c_ast.PtrDecl) and isinstance(node.type.type, c_ast.FuncDecl):
                self.read_function(node.name, node.type.type, line, self.callbacks)
            elif isinstance(node.type, c_ast.TypeDecl) and isinstance(node.type.type, c_ast.Struct) and \
                    node.type.type.decls:
                self.read_record(node.name, node.type.type, node.type.type.coord.line)
            else:
                self.read_handle(node, line)
        elif isinstance(node, c_ast.Decl) and isinstance(node.type, c_ast.FuncDecl):
            self.read_function(node.name, node.type, line, self.functions)
        elif isinstance(node, c_ast.Decl) and isinstance(node.type, c_ast.Enum):
            group = self.above.get(node.type.coord.line, "")
            for row in node.type.values.enumerators:
                trailing = self.beside.get(row.coord.line, "")
                if not isinstance(row.value, c_ast.Constant):
                    self.complain(row.coord.line, f"{row.name} has no number beside it")
                    continue
                text = comments.one_line(comments.plain(trailing)) or comments.until_paragraph(comments.plain(group))
                self.add_constant(row.name, row.value.value, row.coord.line, text)
        else:
            self.complain(line, "a declaration that cannot be described")

    def read_handle(self, node: c_ast.Typedef, line: int) -> None:
        kind = node.type
        number = kind.type.names[0] if isinstance(kind, c_ast.TypeDecl) and isinstance(
            kind.type, c_ast.IdentifierType) else ""
        if number not in SCALARS or number == "char":
            self.complain(line, f"{node.name} is no handle, no record and no callback")
        else:
            self.handles[node.name] = number

    def type_of(self, node: c_ast.Node, line: int) -> Type:
        pointers, const = 0, False
        while isinstance(node, c_ast.PtrDecl):
            pointers += 1
            node = node.type
        if not isinstance(node, c_ast.TypeDecl) or not isinstance(node.type, c_ast.IdentifierType):
            self.complain(line, "a type that cannot be described")
            return Type("void", 1)
        const = pointers > 0 and "const" in node.quals
        if set(node.quals) - {"const"}:
            self.complain(line, f"{' '.join(node.quals)} cannot be described")
        name = " ".join(node.type.names)
        known = name in (*SCALARS, "void", "uintptr_t", *self.handles, *self.records, *self.callbacks)
        if not known or pointers > 2:
            self.complain(line, f"the type {name} cannot be described")
        return Type(name, pointers, const)

    def read_function(self, name: str, node: c_ast.FuncDecl, line: int, table: typing.Dict[str, Function]) -> None:
        line = self.source.first_line(line)
        own = self.comment_above(line)
        # One comment may stand above several functions, one right below the other.
        if own is None and not (self.previous and line > 1 and self.source.lines[line - 2].strip()):
            self.complain(line, f"{name} has no comment")
        self.check_form(name, node, own, line, table is self.functions)
        result = self.type_of(node.type, line)
        if result.pointers:
            self.complain(line, f"{name}: a pointer as a result")
        arguments = []
        for parameter in node.args.params if node.args else []:
            if isinstance(parameter, c_ast.EllipsisParam):
                continue
            kind = self.type_of(parameter.type, line)
            if kind.name == "void" and kind.pointers == 0:
                continue
            if any(parameter.name == other.name for other in arguments):
                self.complain(line, f"{name} has two parameters {parameter.name}")
            arguments.append(Argument(parameter.name or "", kind))
        used = own or comments.Comment(self.previous.text if self.previous else "", {}, "", False, ())
        function = Function(name, result, arguments, self.header, used.text, used.result, "none")
        function.result_kind = self.kind_of_result(function, used)
        for argument in arguments:
            self.describe_argument(function, argument, own, line)
        self.check_sizes(function, line)
        self.check_name(name, table, line)
        table[name] = function
        self.previous = function

    def check_form(self, name: str, node: c_ast.FuncDecl, own: typing.Optional[comments.Comment], line: int,
                   exported: bool) -> None:
        """What no binding is made from, and all rely on."""
        if exported and not self.source.is_exported(name):
            self.complain(line, f"{name} is not exported: KRAL_API")
        if not self.source.is_called_alike(name):
            self.complain(line, f"{name} has no calling convention: KRAL_CALL")
        parameters = node.args.params if node.args else []
        if not parameters:
            self.complain(line, f"{name} leaves its parameters open; (void) has none")
        if any(isinstance(parameter, c_ast.EllipsisParam) for parameter in parameters):
            self.complain(line, f"{name} takes ..., which cannot be described")
        names = [getattr(parameter, "name", None) for parameter in parameters]
        for parameter, said in (own.parameters if own else {}).items():
            if parameter not in names:
                self.complain(line, f"{name} has no parameter {parameter}, which @param names")
            if said.direction not in ("", "in", "out", "in,out"):
                self.complain(line, f"{name}, {parameter}: {said.direction} is no direction")

    def kind_of_result(self, function: Function, comment: comments.Comment) -> str:
        result = function.result.name
        if result == "void":
            return "none"
        if result in self.handles:
            return "handle"
        if comment.answer:
            return "answer"
        if result == "uint8_t":
            return "flag"
        return "code" if result == "uint32_t" and function.name.startswith("KRAL_NV_") else "value"

    # --- Arguments

    def said_of(self, name: str, own: typing.Optional[comments.Comment]) -> typing.Optional[comments.Parameter]:
        """What is said about a parameter: here, or in the text of the function that this one is like."""
        if own and name in own.parameters:
            return own.parameters[name]
        candidates = [self.functions[other] for other in (own.named if own else ()) if other in self.functions]
        if self.previous and (own is None or own.text.startswith("The same")):
            candidates.append(self.previous)
        for candidate in candidates:
            for argument in candidate.arguments:
                if argument.name == name and argument.type.pointers:
                    direction = {"inout": "in,out"}.get(argument.direction, argument.direction)
                    return comments.Parameter(direction, argument.size or "1", argument.text)
                if argument.name == name:
                    return comments.Parameter("", "", argument.text)
        return None

    def describe_argument(self, function: Function, argument: Argument, own: typing.Optional[comments.Comment],
                          line: int) -> None:
        where = f"{function.name}, {argument.name}"
        kind = argument.type
        if not argument.name:
            self.complain(line, f"{function.name} has a parameter without a name")
        said = self.said_of(argument.name, own)
        general = self.file_comment.parameters.get(argument.name)
        if not said and general and not (kind.const and "out" in general.direction):
            said = general
        if said:
            argument.text = said.text
        if not kind.pointers:
            return
        argument.size = said.size if said else ""
        if kind.const:
            if said and said.direction not in ("", "in"):
                self.complain(line, f"{where}: a pointer to const is an input")
        elif not said or not said.direction:
            self.complain(line, f"{where}: a pointer without a direction: @param[in], [out] or [in,out]")
        else:
            argument.direction = said.direction.replace(",", "")
        if not argument.size and kind.const and kind.name == "char" and kind.pointers == 1:
            argument.size = "text"
        elif not argument.size and (kind.pointers == 2 or kind.name in BYTES or
                                    kind.const and kind.name in SCALARS):
            self.complain(line, f"{where}: a buffer without its size: [SIZE] in front of the text of its @param")
        self.check_size_name(function, argument, where, line)
        if argument.size == "1":
            argument.size = ""

    def check_size_name(self, function: Function, argument: Argument, where: str, line: int) -> None:
        names = [other.name for other in function.arguments if other.type.name in COUNTS]
        size = argument.size
        if size and size != "text" and not size.isdigit() and size not in names and size not in self.constants:
            self.complain(line, f"{where}: its size {size} is no number, no constant and no parameter that counts")

    def check_sizes(self, function: Function, line: int) -> None:
        """A parameter that is named like a size and is nobody's, beside a pointer that seems to be one value."""
        names = {argument.name for argument in function.arguments}
        used = {argument.size for argument in function.arguments}
        sizes = [argument.name for argument in function.arguments if argument.direction != "out" and (
            argument.name in ("count", "size", "length") or
            argument.name.endswith(("_size", "_count")) and argument.name.rpartition("_")[0] in names)]
        single = [argument.name for argument in function.arguments
                  if argument.type.pointers and not argument.size and argument.name not in used]
        for size in sizes:
            if size not in used and single:
                self.complain(line, f"{function.name}: no buffer has the size {size}; {', '.join(single)}?")

    # --- Records

    def read_record(self, name: str, node: c_ast.Struct, line: int) -> None:
        self.check_name(name, self.records, line)
        comment = self.comment_above(line)
        if comment is None:
            self.complain(line, f"{name} has no comment")
        fields: typing.List[Field] = []
        ends = {"32": 0, "64": 0}
        widest = {"32": 1, "64": 1}
        for declaration in node.decls:
            if getattr(declaration, "bitsize", None) is not None:
                self.complain(declaration.coord.line, f"{name}: fields of bits cannot be described")
            kind, count = declaration.type, 0
            if isinstance(kind, c_ast.ArrayDecl):
                count = self.length_of(kind.dim, declaration.coord.line)
                kind = kind.type
            element = self.type_of(kind, declaration.coord.line)
            if element.pointers and isinstance(kind, c_ast.PtrDecl):
                self.complain(declaration.coord.line, f"{name}: a pointer in a record; uintptr_t carries them")
            text = self.beside.get(declaration.coord.line) or self.above.get(declaration.coord.line) or ""
            if not text:
                self.complain(declaration.coord.line, f"{name}, {declaration.name} has no comment")
            field = Field(declaration.name, element.name, count, {}, comments.one_line(comments.plain(text)))
            for bits, end in ends.items():
                size, alignment = self.measure(element.name, bits)
                field.offset[bits] = -(-end // alignment) * alignment
                if field.offset[bits] != end:
                    self.complain(declaration.coord.line, f"{name}: padding before {field.name} ({bits} bits)")
                ends[bits] = field.offset[bits] + size * max(count, 1)
                widest[bits] = max(widest[bits], alignment)
            fields.append(field)
        for bits, end in ends.items():
            if end % widest[bits]:
                self.complain(line, f"{name}: padding at its end ({bits} bits)")
        self.records[name] = Record(name, fields, ends, self.header, comment.text if comment else "")

    def measure(self, name: str, bits: str) -> typing.Tuple[int, int]:
        """Size and alignment; on 32 bits those of Windows."""
        if name in self.records:
            record = self.records[name]
            return record.size[bits], max(self.measure(field.type, bits)[1] for field in record.fields)
        size = int(bits) // 8 if name == "uintptr_t" or name in self.callbacks else \
            SCALARS.get(self.handles.get(name, name), 1)
        return size, size

    def length_of(self, node: c_ast.Node, line: int) -> int:
        # Constants were put in by name, so that an array keeps the one that it names.
        if isinstance(node, c_ast.Constant):
            return int(node.value.rstrip("uU"), 0)
        if isinstance(node, c_ast.ID) and node.name in self.constants:
            return self.constants[node.name].value
        self.complain(line, "an array whose length cannot be described")
        return 1


def read(folder: pathlib.Path) -> typing.Tuple[Description, typing.List[str]]:
    reader = Reader()
    reader.read(folder / "kral.h")
    for path in sorted(folder.glob("*.h")):
        if path.name not in reader.seen:
            reader.complaints.append(f"{path.name}: not included by kral.h")
    parts = [reader.constants.get(f"KRAL_VERSION_{part}") for part in ("MAJOR", "MINOR", "PATCH")]
    if None in parts:
        reader.complaints.append("kral.h: not all of KRAL_VERSION_MAJOR, _MINOR and _PATCH are there")
    version = ".".join(str(part.value) for part in parts if part)
    return Description(version, reader.handles, list(reader.constants.values()), list(reader.records.values()),
                       list(reader.callbacks.values()), list(reader.functions.values())), reader.complaints
