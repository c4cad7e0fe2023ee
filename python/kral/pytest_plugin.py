"""Fixtures for pytest: `handset`, a simulated handset in a process of its own, and `phone`, connected to it.

    @pytest.mark.handset("--esn", "1", faults=["refuse=20,of=26"], files={"/nv/a": b"data"})
    def test_something(phone): ...

The faults are those of `kral sim --help`. Files are put before the test; a fault without `of=` meets that as well.
"""
from __future__ import annotations

import itertools
from typing import Any, Iterator

import pytest

from kral.phone import Phone, connect
from kral.sim import SimulatedHandset

# COM numbers that serial ports of the machine hardly reach.
_numbers = itertools.cycle(range(200, 250))
# A busy machine may leave a new process without a processor for a moment.
_START_S = 5.0


def pytest_configure(config: Any) -> None:
    config.addinivalue_line("markers", "handset(*options, faults=[], files={}): the simulated handset of a test")


@pytest.fixture
def handset(request: Any) -> Iterator[SimulatedHandset]:
    """A simulated handset of this test's own."""
    marker = request.node.get_closest_marker("handset")
    options = [str(option) for option in marker.args] if marker else []
    named = dict(marker.kwargs) if marker else {}
    for fault in named.pop("faults", []):
        options += ["--fault", fault]
    files = named.pop("files", {})
    if named:
        raise pytest.UsageError(f"the marker handset does not know {', '.join(named)}")
    with SimulatedHandset(next(_numbers), *options) as simulated:
        if files:
            with connect(simulated.port, _START_S) as phone:
                for path, data in files.items():
                    if "/" in path.strip("/"):
                        phone.files.mkdir(path.rpartition("/")[0], parents=True)
                    phone.files.put(data, path)
        yield simulated


@pytest.fixture
def phone(handset: SimulatedHandset) -> Iterator[Phone]:  # pylint: disable=redefined-outer-name
    """A connection to the simulated handset."""
    with connect(handset.port, _START_S) as connected:
        yield connected
