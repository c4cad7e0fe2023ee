#!/usr/bin/env python3
"""filter.py KRAL_JSON EXAMPLE_FOLDER FILE: a file of the reference as Doxygen shall read it.

A header gets what the description of the interface (bindings/describe.py) knows beside its comments: parameters that
are told elsewhere, constants of a list that is told at its first, sections, and for each function an example: the first
snippet of the example folder that calls it. Classes keep what is public. A page gets links that lead to pages of the
reference, not to files. A function without an example names a file that is not there, of which Doxygen complains.
"""
import json
import pathlib
import re
import sys
import typing

FUNCTION = re.compile(r"^KRAL_API [^;(]*?\bKRAL_CALL (KRAL_\w+)\(", re.MULTILINE)
DEFINE = re.compile(r"^#define (KRAL_\w+) ", re.MULTILINE)
SECTION = re.compile(r"^/\* --- (.*?) -+ \*/$", re.MULTILINE)
END = "#ifdef __cplusplus\n}"
SNIPPET = re.compile(r"^ *//! \[(.*?)\]\n(.*?)^ *//! \[\1\]$", re.MULTILINE | re.DOTALL)
LINK = re.compile(r"\[([^\]]+)\]\((?!https?:|@ref )((?![\w-]+\.html)[^)\s]+)\)")
DIRECTIONS = {"in": "in", "out": "out", "inout": "in,out"}
# A hundred functions of one shape, which differ in their command only.
OF_ONE_SHAPE = {"ftm_commands.h": "KRAL_FTM_SendCommand"}


def snippets(folder: pathlib.Path) -> typing.Dict[str, str]:
    """For each function the first snippet that calls it, as Doxygen is told of it."""
    found: typing.Dict[str, str] = {}
    for path in sorted(folder.rglob("*.c")):
        for name, code in SNIPPET.findall(path.read_text(encoding="utf-8")):
            for function in re.findall(r"\b(KRAL_\w+)\(", code):
                found.setdefault(function, f"@snippet{{trimleft}} {path.relative_to(folder)} {name}")
    return found


def comment_in_front(text: str, start: int) -> typing.Optional[typing.Tuple[int, int]]:
    """Of what begins at start: where its own doc comment is."""
    before = text[:start].rstrip(" ")
    if not before.endswith("*/\n") or before.endswith("/**@{*/\n"):
        return None
    begin = before.rindex("/*")
    return (begin, len(before) - 3) if before.startswith("/**", begin) else None


def with_function(text: str, start: int, function: typing.Dict[str, typing.Any], example: str) -> str:
    own = comment_in_front(text, start)
    comment = text[own[0]:own[1]] if own else f"/** {re.split(' @', function['text'])[0]}"
    told = set(re.findall(r"@param\S*\s+(\w+(?:\s*,\s*\w+)*)", comment))
    told = {name for names in told for name in re.split(r"\s*,\s*", names)}
    more = "".join(f"\n@param[{DIRECTIONS[argument['direction']]}] {argument['name']} {argument['text']}"
                   for argument in function["arguments"] if argument["name"] not in told and argument["text"])
    comment = comment.replace("[answer] ", "").rstrip().rstrip("*").rstrip()
    whole = f"{comment}{more}\n@par Example\n{example}\n*/\n"
    return text[:own[0] if own else start] + whole + text[start:]


def with_constants(text: str, description: typing.Dict[str, typing.Any]) -> str:
    """Each constant with a comment of its own: where it has none, that of the first of its list."""
    told = {constant["name"]: constant["text"] for constant in description["constants"]}
    lines = text.split("\n")
    first = before = title = ""
    for number, line in enumerate(lines):
        define = DEFINE.match(line)
        above, before = before, line
        title = line[len("/** @name "):-len(" */")] if line.startswith("/** @name ") else title
        if not define:
            first = first if line.startswith(" ") else ""
            continue
        has_comment = "/**<" in line or line.endswith("\\") or (
            above.endswith("*/") and above != "/**@{*/" and not DEFINE.match(above))
        if not has_comment:
            meaning = told.get(define.group(1), "").lstrip("@{ ") or (f"See #{first}." if first else title)
            lines[number] = re.sub(r"\s*/\*.*?\*/", "", line) + (f" /**< {meaning} */" if meaning else "")
        first = first or define.group(1)
    return "\n".join(lines)


def with_sections(text: str) -> str:
    if not SECTION.search(text):
        return text
    opened = SECTION.sub(r"/**@}*/\n/** @name \1 */\n/**@{*/", text).replace("/**@}*/\n", "", 1)
    at = opened.rindex(END)
    return f"{opened[:at]}/**@}}*/\n\n{opened[at:]}"


def header(path: pathlib.Path, description: typing.Dict[str, typing.Any], examples: typing.Dict[str, str]) -> str:
    functions = {function["name"]: function for function in description["functions"]}
    text = with_constants(path.read_text(encoding="utf-8"), description)
    for found in reversed(list(FUNCTION.finditer(text))):
        name = found.group(1)
        example = examples.get(name) or examples.get(OF_ONE_SHAPE.get(path.name, ""))
        # Doxygen passes over the end of a filter, but not over a file that is missing.
        example = example or f"@snippet no_example_calls_{name}.c here"
        text = with_function(text, found.start(), functions[name], example)
    # What the comment of the file says of parameters is for several functions.
    front, rest = with_sections(text).replace("\\x", "\\\\x").split("*/", 1)
    return re.sub(r"@param\S*\s+(\w+)\s+", r"`\1`: ", front) + "*/" + rest


def slug(title: str) -> str:
    return re.sub(r"[^\w-]", "", re.sub(r"\s+", "-", title.strip().lower().replace("`", "")))


def page_of(target: str, anchor: str) -> str:
    """Where a link to a file, or to a heading in it, leads in the reference; empty: nowhere."""
    path = pathlib.PurePosixPath(target)
    if path.name in ("HACKING.md", "SECURITY.md", "CHANGELOG.md"):
        return ""
    if path.name == "README.md":
        return "@ref python_package" if path.parent.name == "python" else "index.html"
    if path.suffix == ".md":
        return f"@ref {path.stem}-{anchor}" if anchor else f"@ref {path.stem}_page"
    if path.suffix in (".h", ".hpp"):
        return path.name.replace("_", "__").replace(".", "_8") + ".html"
    if "examples" in path.parts and path.suffix in (".c", ".cpp", ".cs"):
        inner = "/".join(path.parts[path.parts.index("examples") + 1:])
        return inner.replace("/", "_2").replace(".", "_8") + "-example.html"
    return ""


def page(path: pathlib.Path) -> str:
    text = path.read_text(encoding="utf-8")
    name = "python_package" if path.parent.name == "python" else path.stem

    def link(found: typing.Match[str]) -> str:
        target, _, anchor = found.group(2).partition("#")
        leads_to = page_of(target or path.name, anchor) if target or anchor else ""
        return f"[{found.group(1)}]({leads_to})" if leads_to else found.group(1)

    def heading(found: typing.Match[str]) -> str:
        label = f"{name}-{slug(found.group(2))}" if len(found.group(1)) > 1 else (
            name if name == "python_package" else f"{name}_page")
        return f"{found.group(1)} {found.group(2)} {{#{label}}}"

    # What stands between fences is no heading, and no link.
    parts = re.split(r"(^```.*?^```$)", text, flags=re.MULTILINE | re.DOTALL)
    for number in range(0, len(parts), 2):
        parts[number] = re.sub(r"^(#+) ([^{\n]+)$", heading, LINK.sub(link, parts[number]), flags=re.MULTILINE)
    return "".join(parts)


def main() -> int:
    description_file, folder, name = (pathlib.Path(word) for word in sys.argv[1:])
    if name.suffix == ".h":
        print(header(name, json.loads(description_file.read_text(encoding="utf-8")), snippets(folder)))
    elif name.suffix == ".hpp":
        # What is private Doxygen leaves out, but not its heading.
        print(re.sub(r"^ private:\n.*?(?=^};)", "", name.read_text(encoding="utf-8"), flags=re.MULTILINE | re.DOTALL))
    elif name.suffix == ".md":
        print(page(name))
    else:
        print(name.read_text(encoding="utf-8"))
    return 0


if __name__ == "__main__":
    sys.exit(main())
