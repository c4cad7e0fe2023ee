"""No call outlives its time-out by more than 250 ms, whatever the handset does."""
from __future__ import annotations

from typing import List

from torture.bench import LINUX, MODES, TIME_OUT_MS, WINDOWS, Bench, check, connected, last_error, timed
from torture.calls import CALLS, SERIAL, prepare
from torture.peer.line import PtyLine
from torture.peer.misbehaviours import begin, misbehaviours
from torture.peer.phone import Phone

NUMBER = 1
TITLE = "No call outlives its time-out by more than 250 ms"
SHORT = 70
PLATFORMS = (LINUX, WINDOWS)
AT_ONCE = 6
_ALLOWED_MS = 250


def cases(bench: Bench) -> List[str]:
    names = misbehaviours(bench.random(""), 0)
    return [f"{call}/{name}/{mode}" for call in CALLS for name in names for mode in MODES]


def run(bench: Bench, case: str) -> None:
    call_name, name, mode = case.split("/")
    call = CALLS[call_name]
    limit = call.time_outs * TIME_OUT_MS + call.fixed_ms
    # A late answer comes when the call has ended, with every try of it, even on a machine that is late itself.
    behaviour = misbehaviours(bench.random(case), (2 * limit + 1000) / 1000)[name]
    with bench.com_port() as port:
        line = PtyLine(prepare(Phone(SERIAL)), bench.ports, port)
        with connected(line, MODES[mode]) as handle:
            result, value = call.run(handle)
            check(result == 1 and value == call.expected, f"a handset that works gave {result}, {value!r}")
            begin(name, behaviour, line)
            (result, _), start, end = timed(lambda: call.run(handle))
            over = (end - start) * 1000 - limit
            late = bench.lateness.between(start, end) * 1000
            error = last_error(handle)
            line.drop_pieces()
            bench.note("longest beyond it, ms", over)
            bench.note("of which the machine may have been late, at most", late)
            check(over - late <= _ALLOWED_MS,
                  f"{over:.0f} ms longer than its {limit} ms; the machine was {late:.0f} ms late")
            # A second try of a transfer is behind a closing, which empties the driver's buffer.
            is_refused = name == "blocked" and call.time_outs <= 1 and bench.driver is None
            check(not is_refused or "written" in error[1], f"a line that takes nothing took the request: {error}")
            # Nothing that was sent is the answer to this request, but where an answer repeats nothing of it.
            check(result == 0 or name in ("other-answer", "head", "logs") or call_name == "send-raw",
                  f"{call_name} gave {result} without an answer")
