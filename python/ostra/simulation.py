"""Simulated instruments inside this process, for tests and for work without hardware."""

from __future__ import annotations

import weakref
from typing import Any, Literal

from . import _core, instrument
from .image import Image

_simulations: weakref.WeakValueDictionary[str, Simulation] = weakref.WeakValueDictionary()


class Simulation:
    """A simulated instrument, plugged in until it is closed. :func:`simulated` makes one.

    It behaves as the real one does over USB, on both transports. What its EEPROM holds is forgotten at the end:
    take it with :attr:`eeprom` before.
    """

    def __init__(self, name: str, core: _core.Simulation, virtual_time: bool) -> None:
        self.name = name
        self.virtual_time = virtual_time
        self._core = core
        self._closed = False
        _simulations[name] = self

    @property
    def eeprom(self) -> Image:
        """What is in its EEPROM, without opening it; can be set."""
        return Image(self._core.eeprom())

    @eeprom.setter
    def eeprom(self, image: Image) -> None:
        self._core.set_eeprom(bytes(image))

    def press_button(self) -> None:
        """One press of the button."""
        self._core.press_button()

    def unplug(self) -> None:
        """Takes it off the bus; what has it open finds it gone."""
        self._core.unplug()

    def plug_in(self) -> None:
        """Puts it back; it has to be opened anew."""
        self._core.plug_in()

    @property
    def is_plugged_in(self) -> bool:
        """Whether it is on the bus."""
        return self._core.is_plugged_in()

    def set_faults(self, plan: str) -> None:
        """What goes wrong from the next opening on, as a fault plan: ``"bulk-in 2:short=10; 7+:silent"``.

        Empty: nothing. The plan counts transfers from its setting on.
        """
        self._core.set_faults(plan)

    @property
    def faults_hit(self) -> int:
        """Transfers that suffered a fault of the plan."""
        return self._core.faults_hit()

    def sleep(self, seconds: float) -> None:
        """Lets time pass, which costs none where time is virtual."""
        _core.sleep(seconds)

    @property
    def elapsed(self) -> float:
        """Seconds of virtual time since it began; 0 where time is real."""
        return _core.virtual_seconds()

    def close(self) -> None:
        """Takes it away for good. Where time is virtual, closes the instruments first. Harmless twice."""
        if not self._closed:
            self._closed = True
            if self.virtual_time:
                for opened in list(instrument._open):
                    opened.close()
            self._core.close()
            _simulations.pop(self.name, None)

    def __enter__(self) -> Simulation:
        return self

    def __exit__(self, *exception: object) -> None:
        self.close()

    def __repr__(self) -> str:
        return f"<simulation {self.name}{', closed' if self._closed else ''}>"


def simulated(
    name: str = "simulated",
    *,
    seed: int = 1,
    light: float = 1.0,
    gain: float = 1.0,
    firmware: Literal["old", "new"] = "new",
    integrate: bool = False,
    scan_bytes: int | None = None,
    rate: int = 0,
    eeprom: Image | bytes | None = None,
    faults: str = "",
    virtual_time: bool = False,
) -> Simulation:
    """Plugs in a simulated instrument. Several may be there at once, each with a name of its own.

    Args:
        seed: of its sensor's noise: the same seed, the same values.
        light: brightness of the lamp; 0 is dark.
        gain: of its amplifier.
        firmware: "old" has no measurement modes.
        integrate: measurements take their integration time.
        scan_bytes: bytes that a request to measure streams in all; None: as long a scan as is asked for.
        rate: bytes a second that it sends; 0: as fast as memory.
        eeprom: what it holds; None: the image of a fresh instrument.
        faults: a fault plan, see :meth:`Simulation.set_faults`.
        virtual_time: time passes only while everything waits, so that a time-out of seconds is over at once, and
            what happens in which order is the same each time. For the whole process, as long as such a
            simulation is there: no other instruments are seen, and only this thread can use them.

    >>> with simulated("lab", seed=1) as lab:
    ...     lab.is_plugged_in
    True
    """
    core = _core.Simulation(
        name,
        seed,
        light,
        gain,
        firmware == "old",
        integrate,
        _ENDLESS if scan_bytes is None else scan_bytes,
        rate,
        None if eeprom is None else bytes(eeprom),
        faults,
        virtual_time,
    )
    return Simulation(name, core, virtual_time)


_ENDLESS = 1 << 62


def bus_name_of(name: Any) -> str:
    """What the driver calls the simulation with that name, where there is one; else the name itself."""
    if isinstance(name, Simulation):
        return name._core.bus_name
    if name in _simulations:
        return _simulations[name]._core.bus_name
    return name or ""
