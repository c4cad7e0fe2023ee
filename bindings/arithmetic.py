"""The numbers of a header's constants, calculated as C does on 32 bits: int, or unsigned int with its wrap-around."""
import ast
import operator
import re
import typing

LIMIT = 1 << 31

BINARY = {
    ast.Add: operator.add, ast.Sub: operator.sub, ast.Mult: operator.mul, ast.BitOr: operator.or_,
    ast.BitAnd: operator.and_, ast.BitXor: operator.xor, ast.LShift: operator.lshift, ast.RShift: operator.rshift,
}
UNARY = {ast.UAdd: operator.pos, ast.USub: operator.neg, ast.Invert: operator.invert}


class Number(typing.NamedTuple):
    value: int
    unsigned: bool


def _fitting(value: int, unsigned: bool) -> Number:
    if unsigned:
        return Number(value % (2 * LIMIT), True)
    if not -LIMIT <= value < LIMIT:
        raise ValueError(f"{value} is more than an int")
    return Number(value, False)


def _divided(left: int, right: int) -> int:
    """Towards zero."""
    quotient = abs(left) // abs(right)
    return quotient if (left < 0) == (right < 0) else -quotient


def _binary(kind: type, left: Number, right: Number) -> Number:
    shift = kind in (ast.LShift, ast.RShift)
    if shift and not 0 <= right.value < 32:
        raise ValueError(f"a shift by {right.value}")
    unsigned = left.unsigned or right.unsigned and not shift
    if unsigned and not shift:
        left, right = _fitting(left.value, True), _fitting(right.value, True)
    if kind is ast.Div:
        return _fitting(_divided(left.value, right.value), unsigned)
    if kind is ast.Mod:
        return _fitting(left.value - _divided(left.value, right.value) * right.value, unsigned)
    return _fitting(BINARY[kind](left.value, right.value), unsigned)


def _literal(text: str) -> Number:
    value, unsigned = int(text.rstrip("uU"), 0), text[-1] in "uU"
    if value >= 2 * LIMIT:
        raise ValueError(f"{value} has more than 32 bits")
    # A hexadecimal number becomes unsigned where an int is too small for it; a decimal one would become a long.
    return _fitting(value, unsigned or value >= LIMIT and text[:2] in ("0x", "0X"))


def evaluate(expression: str, known: typing.Mapping[str, Number]) -> Number:
    """Raises ValueError, SyntaxError or ArithmeticError for what is no such number."""
    literals: typing.List[str] = []

    def name_of(match: typing.Match) -> str:
        literals.append(match.group(0))
        return f"literal({len(literals) - 1})"

    def number(node: ast.AST) -> Number:
        if isinstance(node, ast.Call) and isinstance(node.func, ast.Name):
            return _literal(literals[node.args[0].value])  # type: ignore[attr-defined]
        if isinstance(node, ast.Name) and node.id in known:
            return known[node.id]
        if isinstance(node, ast.BinOp) and type(node.op) in (*BINARY, ast.Div, ast.Mod):
            return _binary(type(node.op), number(node.left), number(node.right))
        if isinstance(node, ast.UnaryOp) and type(node.op) in UNARY:
            inner = number(node.operand)
            return _fitting(UNARY[type(node.op)](inner.value), inner.unsigned)
        raise ValueError("not calculated from numbers")

    if re.search(r"\w\s*\(|//|\*\*", expression):
        raise ValueError("not calculated from numbers")
    text = re.sub(r"\b(?:0[xX][0-9A-Fa-f]+|0|[1-9][0-9]*)[uU]?\b", name_of, expression.strip())
    return number(ast.parse(text, mode="eval").body)
