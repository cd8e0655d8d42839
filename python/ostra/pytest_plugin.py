"""Fixtures for pytest: simulated instruments in virtual time. Loaded by itself where the package is installed.

>>> def test_takes_a_readout(ostra_instrument):            # opened, on a simulated instrument
...     assert ostra_instrument.readout().values.shape == (128,)
>>> def test_survives_a_silent_instrument(ostra_simulated):
...     ostra_simulated("lab", faults="bulk-in 0+:silent")
...     with ostra.open("lab") as instrument, pytest.raises(ostra.Timeout):
...         instrument.readout()                           # takes no time
"""

from __future__ import annotations

import contextlib
from collections.abc import Callable, Iterator
from typing import Any

import pytest

import ostra


@pytest.fixture
def ostra_simulated() -> Iterator[Callable[..., ostra.Simulation]]:
    """:func:`ostra.simulated`, in virtual time unless it is told otherwise; taken away at the test's end."""
    with contextlib.ExitStack() as stack:

        def make(name: str = "simulated", **settings: Any) -> ostra.Simulation:
            settings.setdefault("virtual_time", True)
            return stack.enter_context(ostra.simulated(name, **settings))

        yield make


@pytest.fixture
def ostra_instrument(ostra_simulated: Callable[..., ostra.Simulation]) -> Iterator[ostra.Instrument]:
    """An opened simulated instrument in virtual time."""
    with ostra.open(ostra_simulated()) as instrument:
        yield instrument
