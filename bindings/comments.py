"""Doc comments of the public headers: their text, and what they say about parameters and results.

The notation that headers use, beside what a C declaration says itself:

    @param[out] name  [SIZE] text      direction of a pointer, and the elements behind it
    @return [answer] text              0 is an answer here (no, none), not a failure

SIZE is a number, a constant, or the name of the parameter that holds it (by value, or behind an in-out pointer).
"""
import dataclasses
import re
import typing

COMMENT = re.compile(r"/\*.*?\*/", re.DOTALL)
PARAMETER = re.compile(r"@param(?:\[([a-z, ]+)\])?\s+(\w+(?:\s*,\s*\w+)*)\s*((?:(?!@param|@return).)*)", re.DOTALL)
SIZE = re.compile(r"\[([^\]]+)\]\s*")
NAMED = re.compile(r"\bas(?: for| in)? (KRAL_\w+)", re.IGNORECASE)


@dataclasses.dataclass(frozen=True)
class Parameter:
    direction: str  # "", "in", "out", "in,out"
    size: str  # "" for one
    text: str


@dataclasses.dataclass(frozen=True)
class Comment:
    text: str  # without stars; blank lines part paragraphs
    parameters: typing.Dict[str, Parameter]
    result: str
    answer: bool  # whether a result of 0 is an answer
    named: typing.Tuple[str, ...]  # functions that this one is "as for"

    @property
    def summary(self) -> str:
        """The text in front of the first tag."""
        return re.split(r"@param|@return", self.text)[0].strip()


def plain(comment: str) -> str:
    """The text of a comment, without its stars."""
    inner = re.sub(r"^/\*+<?", "", comment)
    inner = re.sub(r"\*+/$", "", inner)
    lines = [re.sub(r"^\s*\*? ?", "", line).rstrip() for line in inner.split("\n")]
    return "\n".join(lines).strip()


def one_line(text: str) -> str:
    return re.sub(r"\s+", " ", text).strip()


def until_paragraph(text: str) -> str:
    """What stands before the next paragraph, or the next row of a list."""
    return one_line(re.split(r"\n\n|\n- ", text)[0])


def parse(comment: str) -> Comment:
    text = plain(comment)
    parameters = {}
    for direction, names, words in PARAMETER.findall(text):
        words = until_paragraph(words)
        size = SIZE.match(words)
        if size:
            words = words[size.end():]
        for name in re.split(r"\s*,\s*", names):
            parameters[name] = Parameter(direction.replace(" ", ""), size.group(1) if size else "", words)
    returned = re.search(r"@return\s+((?:(?!@param).)*)", text, re.DOTALL)
    result = until_paragraph(returned.group(1)) if returned else ""
    answer = result.startswith("[answer]")
    return Comment(text, parameters, result[len("[answer]"):].strip() if answer else result, answer,
                   tuple(NAMED.findall(text)))
