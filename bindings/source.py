"""The text of a header as its declarations lie in it: what pycparser reads of it, and what it cannot see there."""
import re
import typing

from pycparser import c_ast, c_parser

import comments

# Types that others would know. Named, so that what is wrong with a declaration is the type and not its grammar.
FOREIGN = ("size_t", "ssize_t", "ptrdiff_t", "intptr_t", "intmax_t", "uintmax_t", "wchar_t", "bool", "va_list", "FILE")


class Unreadable(Exception):
    """No C that can be read; where is in `line`."""

    def __init__(self, line: int, reason: str) -> None:
        super().__init__(reason)
        self.line = line


def blank(match: typing.Match) -> str:
    return re.sub(r"[^\n]", " ", match.group(0))


class Source:
    """One header without comments and macros, each line in its place."""

    def __init__(self, raw: str, name: str) -> None:
        self.name = name
        code = comments.COMMENT.sub(blank, raw)
        code = re.sub(r"#ifdef __cplusplus\n.*?#endif", blank, code, flags=re.DOTALL)
        self.code = re.sub(r"^#(?:[^\n\\]|\\\n|\\.)*", blank, code, flags=re.MULTILINE)
        self.lines = self.code.split("\n")
        self.conditional = self.conditional_lines(comments.COMMENT.sub(blank, raw).split("\n"))

    def conditional_lines(self, raw: typing.Sequence[str]) -> typing.List[int]:
        """Where something stands that is not always there, or not to the end. A header's guard is around all of it."""
        found: typing.List[int] = []
        conditions: typing.List[bool] = []
        for number, (line, code) in enumerate(zip(raw, self.lines), 1):
            directive, word = re.match(r"#?\s*(\w*)\s*(\w*)", line).groups() if line.startswith("#") else ("", "")
            if directive in ("if", "ifdef", "ifndef"):
                conditions.append(not re.fullmatch(r"#ifndef KRAL_\w+_H\s*", line))
            elif directive == "endif" and conditions:
                conditions.pop()
            elif directive == "undef" or any(conditions) and (
                    directive == "define" and word not in ("KRAL_API", "KRAL_CALL") or code.strip()):
                found.append(number)
        return found

    def nodes(self, known: typing.Sequence[str]) -> typing.List[c_ast.Node]:
        """The declarations; `known` are the types that other headers have declared."""
        code = re.sub(r"\bKRAL_(API|CALL)\b", blank, self.code)
        known = (*known, *(name for name in FOREIGN if name not in known))
        prelude = "".join(f"typedef int {name};" for name in known)
        try:
            tree = c_parser.CParser().parse(f"{prelude}\n#line 1\n{code}", self.name)
        except c_parser.ParseError as error:
            where = re.match(r"[^:]*:(\d+):(?:\d+:)? *(.*)", str(error))
            line, reason = (int(where.group(1)), where.group(2)) if where else (len(self.lines), "it ends too early")
            raise Unreadable(line, f"no C that can be read ({reason})") from error
        return tree.ext[len(known):]

    def first_line(self, line: int) -> int:
        """A declaration may reach over several lines, and its name may be in a later one."""
        while line > 1 and self.lines[line - 2].strip() and not re.search(r"[;{}]\s*$", self.lines[line - 2]):
            line -= 1
        return line

    def is_exported(self, name: str) -> bool:
        return bool(re.search(rf"\bKRAL_API\s[^;]*\b{name}\s*\(", self.code))

    def is_called_alike(self, name: str) -> bool:
        """Whether a function, or the type of one, has the calling convention that all share."""
        return bool(re.search(rf"\bKRAL_CALL\s+{name}\s*\(|\(\s*KRAL_CALL\s*\*\s*{name}\s*\)", self.code))
