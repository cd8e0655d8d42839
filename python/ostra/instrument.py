"""Instruments: found, opened, measured with."""

from __future__ import annotations

import atexit
import contextlib
import math
import os
import sys
import threading
import time
import warnings
import weakref
from collections.abc import Callable, Generator, Iterable, Iterator, Mapping
from dataclasses import dataclass
from datetime import datetime, timezone
from pathlib import Path
from typing import TYPE_CHECKING, Any, Literal

import numpy as np
import numpy.typing as npt

from . import _core
from .errors import BadArgument, BadData, Error
from .image import Image, PathLike, Value, values_of

if TYPE_CHECKING:
    from types import TracebackType

    from matplotlib.axes import Axes

    from .simulation import Simulation

Transport = Literal["native", "usbio"]
"""The way to an instrument: the instrument's own driver, or the USBIO driver. None: what this machine prefers."""


@dataclass(frozen=True)
class Listed:
    """An instrument that is connected.

    Attributes:
        identifier: what the driver calls it; names it for good as long as it stays plugged in there.
        name: short, for people; :func:`open` takes either.
        transport: "native" or "usbio".
        chip_id: 16 hexadecimal digits, the instrument's own; None where it was not asked.
        problem: why it could not be asked; empty where it was, or need not be.
    """

    identifier: str
    name: str
    transport: str
    chip_id: str | None
    problem: str


def list_instruments(transport: Transport | None = None, chip_ids: bool = False) -> list[Listed]:
    """The instruments that are connected; none is no error.

    With ``chip_ids`` those that are free are opened, and thereby reset, to ask for their chip's id.
    """
    way = transport or _core.default_transport()
    return [
        Listed(identifier, name, way, chip_id or None, problem)
        for identifier, name, chip_id, problem in _core.list_instruments(way, chip_ids)
    ]


@dataclass(frozen=True)
class Parameters:
    """The four measurement parameters as they are sent.

    Attributes:
        p1: integration time, 0 to 65535 time units of the measurement mode.
        p2: a second time, 0 to 65535.
        p3: a count, 0 to 65535.
        p4: four flags, bits 0 to 3.
    """

    p1: int = 294
    p2: int = 0
    p3: int = 1
    p4: int = 6

    def __iter__(self) -> Iterator[int]:
        return iter((self.p1, self.p2, self.p3, self.p4))


@dataclass(frozen=True)
class Identity:
    """What an instrument says of itself.

    Attributes:
        chip_id: 16 hexadecimal digits.
        misc: m1 to m5; m2 is the firmware's version, of which 301 and later have measurement modes.
        mode: m1 to m6: the number of modes, the current one, a number, time units in a unit of the second time,
            the time unit in microseconds, flags.
        cpld: the first register of the programmable logic.
        parameters: p1 to p5, as they are set.
    """

    chip_id: str
    misc: tuple[int, int, int, int, int]
    mode: tuple[int, int, int, int, int, int]
    cpld: int
    parameters: tuple[int, int, int, int, int]


class Readout:
    """One readout of the sensor.

    Attributes:
        values: int32, shape (128,), in sensor order. The first and the last element have no reading of their
            own and repeat their neighbour's.
        taken_at: when it was begun, with the local time zone, to a millisecond.
        parameters: the :class:`Parameters` that were sent.
        integration_time: effective, in seconds.
        instrument: the instrument's identifier.
    """

    __slots__ = ("values", "parameters", "integration_time", "instrument", "_seconds", "_milliseconds")

    def __init__(
        self,
        values: npt.NDArray[np.int32],
        seconds: int,
        milliseconds: int,
        parameters: Parameters,
        integration_time: float,
        instrument: str,
    ) -> None:
        self.values = values
        self.parameters = parameters
        self.integration_time = integration_time
        self.instrument = instrument
        self._seconds = seconds
        self._milliseconds = milliseconds

    @property
    def taken_at(self) -> datetime:
        moment = datetime.fromtimestamp(self._seconds, timezone.utc).astimezone()
        return moment.replace(microsecond=self._milliseconds * 1000)

    def plot(self, ax: Axes | None = None) -> Axes:
        """Draws the values with matplotlib. Answers the axes."""
        from .plots import plot_readout

        return plot_readout(self, ax)

    def _repr_svg_(self) -> str:
        from .plots import svg_of_readout

        return svg_of_readout(self)

    def __array__(self, dtype: npt.DTypeLike = None) -> npt.NDArray[Any]:
        return self.values.astype(dtype or np.int32)

    def __len__(self) -> int:
        return len(self.values)

    def __repr__(self) -> str:
        return (
            f"<readout of {self.taken_at:%Y-%m-%d %H:%M:%S}, {self.integration_time:g} s: "
            f"{self.values.min()} to {self.values.max()}>"
        )


class Scan:
    """A scan that runs: an iterator over what has come, and a context manager that ends it.

    Each step answers the next records that have come, at least one and at most 256 KiB of them: int32, shape (n,
    record_size / 2), in the order and with the signs of the wire (unlike in a readout, the first and the last
    value are as they came); with ``raw`` uint8, shape (n, record_size). The scan runs on a thread of its own; when
    1 MiB waits, the instrument does. Records that came before a failure are handed out before it is raised.

    Until it is at its end, the instrument can do nothing else. Ctrl-C, :meth:`close`, leaving the ``with``
    block and the end of the object's life end the scan and reset the instrument.
    """

    def __init__(self, stream: _core.ScanStream, record_size: int, raw: bool, instrument: str) -> None:
        self._stream = stream
        self._raw = raw
        self.record_size = record_size
        self.instrument = instrument
        self.records = 0
        """Records handed out so far."""

    def __iter__(self) -> Scan:
        return self

    def __next__(self) -> npt.NDArray[Any]:
        block = self._stream.next()
        if block is None:
            raise StopIteration
        self.records += len(block)
        return block

    def read(self) -> npt.NDArray[Any]:
        """All records that are still to come, in one array of shape (n, record_size / 2)."""
        blocks = list(self)
        if blocks:
            return np.concatenate(blocks)
        columns = self.record_size if self._raw else self.record_size // 2
        return np.zeros((0, columns), np.uint8 if self._raw else np.int32)

    @property
    def seconds(self) -> float:
        """From the scan's start until the transfer came in which the last block ended."""
        return self._stream.seconds()

    @property
    def left_over(self) -> bytes:
        """Bytes behind the last whole record, once the scan is at its end."""
        return b"" if self._stream.is_running() else self._stream.left_over()

    def close(self) -> None:
        """Ends the scan. Harmless at its end."""
        self._stream.close()

    def plot(self, ax: Axes | None = None) -> Axes:
        """Takes the records that are still to come and draws them as a picture, one a line, with matplotlib."""
        from .plots import plot_scan

        return plot_scan(self.read(), ax)

    def __enter__(self) -> Scan:
        return self

    def __exit__(self, *exception: object) -> None:
        self.close()

    def __repr__(self) -> str:
        state = "running" if self._stream.is_running() else "ended"
        return f"<scan of {self.instrument}, {state}, {self.records} records taken>"


@dataclass(frozen=True)
class Event:
    """What an instrument reported of its own accord.

    Attributes:
        kind: "button", "removed" or "unknown".
        code: the driver's number of it.
        seconds: since somebody began to listen.
    """

    kind: str
    code: int
    seconds: float


@dataclass(frozen=True)
class Written:
    """What writing an EEPROM did.

    Attributes:
        pieces: written, of at most 256 bytes; 0 where it held the image already.
        backup: the file with the earlier content; None where none was made.
    """

    pieces: int
    backup: Path | None


class Eeprom:
    """The memory of an instrument, 8192 bytes. ``instrument.eeprom``."""

    def __init__(self, core: _core.Instrument) -> None:
        self._core = core

    def read(self) -> Image:
        """The image, read twice and compared; :class:`TransferFailed` where the readings differ."""
        return Image(self._core.read_eeprom())

    def write(
        self,
        image: Image | bytes,
        backup: PathLike | Literal[False] | None = None,
        force: bool = False,
        whole_pieces: bool = False,
    ) -> Written:
        """Makes the EEPROM hold the image, the safe way.

        The image is checked (:class:`BadData` where the driver could not use it, unless ``force`` is set), the
        present content is read and saved in the file ``backup``, only what differs is written, and everything is
        read back and compared. A failure says how far the writing came; its advice says how it is undone.

        Args:
            backup: a file that must not exist; None: one in the current folder, named after instrument, chip
                and time; False: no backup.
            whole_pieces: write pieces of 256 bytes where one byte differs, instead of elements of 4.
        """
        wanted = image if isinstance(image, Image) else Image(image)
        errors = "" if force else _core.errors_of_image(bytes(wanted))
        if errors:
            raise BadData(f"the image is not written: {errors}", "force=True writes it all the same")
        file = "" if backup in (None, False) else os.fspath(backup)  # type: ignore[arg-type]
        pieces, kept = self._core.write_eeprom(bytes(wanted), whole_pieces, backup is not False, file)
        return Written(pieces, Path(kept) if kept else None)

    def restore(self, source: PathLike | Image, force: bool = False) -> Written:
        """Writes a backup back: a file, or an image. As :meth:`write`, without a new backup."""
        image = source if isinstance(source, Image) else Image.load(source)
        return self.write(image, backup=False, force=force, whole_pieces=True)

    def check(self) -> list[Any]:
        """As :meth:`Image.check`, of what is in the instrument."""
        return self.read().check()

    def __repr__(self) -> str:
        return f"<EEPROM of {self._core.identifier}>"


class Ram(Mapping[int, Value]):
    """The volatile parameters of an instrument by identifier. ``instrument.ram``.

    2009 is the integration time in seconds. Each access asks the instrument.
    """

    def __init__(self, core: _core.Instrument) -> None:
        self._core = core

    def __getitem__(self, id: int) -> Value:
        return self.load()[id]

    def __iter__(self) -> Iterator[int]:
        return iter(self._core.load_ram())

    def __len__(self) -> int:
        return len(self._core.load_ram())

    def load(self) -> dict[int, Value]:
        """All of them, asked for once."""
        return self._core.load_ram()

    def set(self, changes: Mapping[int, Any] | Iterable[tuple[int, Any]]) -> dict[int, Value]:
        """Sets some of them; an integration time chooses the measurement mode that can count it.

        Answers all as the instrument then has them: times are rounded to what the mode can count.
        """
        return self._core.store_ram(values_of(changes))

    def __setitem__(self, id: int, value: Any) -> None:
        self.set({id: value})

    @staticmethod
    def meaning(id: int) -> str:
        """What a parameter means, in a few words."""
        return _core.parameter_meaning(id)

    def __repr__(self) -> str:
        return f"<RAM of {self._core.identifier}>"


_open: weakref.WeakSet[Instrument] = weakref.WeakSet()


@atexit.register
def _close_all() -> None:
    for instrument in list(_open):
        with contextlib.suppress(Error):
            instrument.close()
    _core.wait_for_threads(10.0)  # what they did for others has ended, but those must have noticed


class Instrument:
    """An instrument that is open, and this process's alone. :func:`open` makes one; ``with`` closes it.

    Several threads may use it: they take turns, one call at a time. While it works the interpreter's lock is
    free for others. Ctrl-C ends a call at once, resets the instrument and raises KeyboardInterrupt, after which
    the instrument can be used as before (on the main thread; with a handler of your own for the signal, that
    one runs when the call has ended).

    An instrument that is not closed is closed with a ResourceWarning when nothing refers to it any more, and
    without one when the interpreter ends. A process forked from one that has used instruments cannot use any:
    every call raises :class:`Error` there.
    """

    def __init__(self, name: str = "", transport: Transport | None = None) -> None:
        way = transport or _core.default_transport()
        self._core = _core.Instrument(name, way)
        self._identifier = self._core.identifier
        self._transport = way
        self._wanted: tuple[float, Parameters | None] = (0.0, None)
        self._prepared_after = -1  # resets; what was set before one is gone
        self._parameters = Parameters()
        self._integration_time = 0.0
        _open.add(self)

    @property
    def identifier(self) -> str:
        """What the driver calls it."""
        return self._identifier

    @property
    def name(self) -> str:
        """Short, for people."""
        return self.identifier.rpartition("/")[2]

    @property
    def transport(self) -> str:
        """"native" or "usbio"."""
        return self._transport

    @property
    def is_open(self) -> bool:
        """Whether it can be used."""
        return self._core.is_open()

    def close(self) -> None:
        """Ends what other threads do with it, and closes it. Harmless twice."""
        self._core.close()
        _open.discard(self)

    def chip_id(self) -> str:
        """What the chip calls itself: 16 hexadecimal digits, the same at whatever port."""
        return self._core.chip_id()

    def identify(self) -> Identity:
        """All that the instrument says of itself."""
        return Identity(**self._core.identify())

    def reset(self, code: int = 31) -> None:
        """Resets the instrument; the low byte of ``code`` is sent. Opening sends 31."""
        self._core.reset(code)
        self._prepared_after = -1

    @property
    def mode(self) -> int:
        """The measurement mode, from 1. Can be set; an integration time chooses one as well."""
        return self.identify().mode[1]

    @mode.setter
    def mode(self, mode: int) -> None:
        self._core.set_mode(mode)
        self._prepared_after = -1

    @property
    def eeprom(self) -> Eeprom:
        """The memory."""
        return Eeprom(self._core)

    @property
    def ram(self) -> Ram:
        """The volatile parameters."""
        return Ram(self._core)

    def _prepare(self, integration_time: float | None, parameters: Parameters | Iterable[int] | None) -> None:
        if integration_time is not None or parameters is not None:
            self.set_measurement(integration_time, parameters)
        if self._prepared_after != self._core.resets():
            seconds, chosen = self._wanted
            sent, self._integration_time = self._core.prepare(seconds, tuple(chosen) if chosen else None)
            self._parameters = Parameters(*sent)
            self._prepared_after = self._core.resets()

    def set_measurement(
        self, integration_time: float | None = None, parameters: Parameters | Iterable[int] | None = None
    ) -> None:
        """What readouts and scans are taken with from now on; they set it up when they begin.

        Args:
            integration_time: in seconds; chooses the measurement mode that can count it.
            parameters: as they are sent, instead.

        With neither, the fixed parameters 294, 0, 1, 6, as at first.
        """
        if integration_time is not None and parameters is not None:
            raise BadArgument("either an integration time or parameters, not both")
        if integration_time is not None and not (math.isfinite(integration_time) and integration_time > 0):
            raise BadArgument(f"{integration_time} s is no integration time", "a number above 0")
        chosen = None
        if parameters is not None:
            chosen = parameters if isinstance(parameters, Parameters) else Parameters(*parameters)
            for value, limit in zip(chosen, (0xFFFF, 0xFFFF, 0xFFFF, 0xFF)):
                if not 0 <= value <= limit:
                    raise BadArgument(f"{tuple(chosen)}: three numbers up to 65535 and one up to 255 are wanted")
        wanted = (integration_time or 0.0, chosen)
        if wanted != self._wanted:
            self._wanted = wanted
            self._prepared_after = -1

    def readout(
        self,
        integration_time: float | None = None,
        parameters: Parameters | Iterable[int] | None = None,
    ) -> Readout:
        """Takes one readout.

        The arguments are those of :meth:`set_measurement`, and stay for the next ones. The first readout waits
        for what is left of the second that the instrument needs after its opening.

        Raises:
            Timeout: the instrument did not answer in time.
            ShortData: fewer than 256 bytes came.
            Unplugged: it is not there any more.
        """
        self._prepare(integration_time, parameters)
        seconds, milliseconds, values = self._core.readout()
        return Readout(values, seconds, milliseconds, self._parameters, self._integration_time, self._identifier)

    def readouts(
        self,
        count: int | None = None,
        interval: float = 0.0,
        integration_time: float | None = None,
        parameters: Parameters | Iterable[int] | None = None,
    ) -> Generator[Readout, None, None]:
        """A series of readouts, as fast as the instrument gives them, or one each ``interval`` seconds.

        ``count`` of them; None: until nobody asks for more.
        """
        self._prepare(integration_time, parameters)
        start = _now()
        taken = 0
        while count is None or taken < count:
            wait = start + taken * interval - _now()
            if interval > 0 and wait > 0:
                _sleep(wait)
            yield self.readout()
            taken += 1

    def scan(
        self,
        records: int | None = None,
        total: int | None = None,
        record_size: int = 256,
        timeout: int = 5,
        raw: bool = False,
        integration_time: float | None = None,
        parameters: Parameters | Iterable[int] | None = None,
    ) -> Scan:
        """Begins a scan, which is then iterated over.

        Args:
            records: how many; with neither this nor ``total``, until the instrument stops.
            total: bytes (below 4 GiB) instead; over the transport native a multiple of ``record_size``.
            record_size: bytes of a record, 1 to 6553; an even number unless ``raw`` is set.
            timeout: seconds that a transfer may take, and 3 s more.
            raw: blocks of bytes instead of values.
        """
        if records is not None and total is not None:
            raise BadArgument("either records or total, not both")
        if not 1 <= record_size <= _core.longest_record:
            raise BadArgument(f"a record has 1 to {_core.longest_record} bytes, not {record_size}")
        if record_size % 2 != 0 and not raw:
            raise BadArgument("records of an odd number of bytes hold no 16-bit values", "raw=True")
        wanted = records * record_size if records is not None else total
        if wanted is not None and not 0 < wanted <= 0xFFFFFFFF:
            raise BadArgument("a scan holds at least one record and less than 4 GiB")
        if wanted is not None and wanted % record_size != 0 and self._transport == "native":
            raise BadArgument(f"over the transport native total is a multiple of record_size: {wanted} is none")
        self._prepare(integration_time, parameters)
        return Scan(self._core.scan(record_size, wanted or 0, timeout, raw), record_size, raw, self._core.identifier)

    def stop_scan(self) -> None:
        """Ends a scan that runs, whoever has it. Harmless without one."""
        self._core.stop_scan()

    def events(self, timeout: float | None = None) -> Iterator[Event]:
        """The button's presses and the removal from now on, as they come.

        Ends after the removal, when the instrument is closed, or when nothing came for ``timeout`` seconds (None:
        however long it takes). Readouts may be taken meanwhile.
        """
        stream = self._core.events()

        def iterate() -> Iterator[Event]:
            while True:
                event = stream.next(-1.0 if timeout is None else timeout)
                if event is None:
                    return
                yield Event(*event)
                if event[0] == "removed":
                    return

        return iterate()

    def on_event(self, callback: Callable[[Event], object]) -> Callable[[], None]:
        """Calls ``callback`` with each event from now on, on a thread of its own. Answers what ends that.

        What the callback raises is reported as Python does for threads, and the next event comes all the same.
        The callback may use the instrument, and close it. Real time only; under virtual time use :meth:`events`.
        """
        if _core.is_time_virtual():
            raise BadArgument("under virtual time there is no second thread", "iterate over events()")
        stream = self._core.events()
        ended = threading.Event()

        def watch() -> None:
            while not ended.is_set():
                event = None
                with contextlib.suppress(Error):
                    event = stream.next(0.1)
                if event is None:
                    if not stream.is_open():
                        return
                    continue
                try:
                    callback(Event(*event))
                except Exception:
                    arguments = (*sys.exc_info(), threading.current_thread())
                    threading.excepthook(threading.ExceptHookArgs(arguments))
                if event[0] == "removed":
                    return

        threading.Thread(target=watch, name=f"events of {self.name}", daemon=True).start()
        return ended.set

    def __enter__(self) -> Instrument:
        return self

    def __exit__(
        self,
        kind: type[BaseException] | None,
        exception: BaseException | None,
        trace: TracebackType | None,
    ) -> None:
        self.close()

    def __del__(self) -> None:
        core = getattr(self, "_core", None)
        if core is not None and core.is_open():
            warnings.warn(f"{self!r} was not closed", ResourceWarning, source=self, stacklevel=2)
            core.close()

    def __repr__(self) -> str:
        return f"<instrument {self.identifier}{'' if self.is_open else ', closed'}>"


def _now() -> float:
    return _core.virtual_seconds() if _core.is_time_virtual() else time.monotonic()


def _sleep(seconds: float) -> None:
    if _core.is_time_virtual():
        _core.sleep(seconds)
    else:
        time.sleep(seconds)


def open(name: str | Listed | Simulation | None = None, transport: Transport | None = None) -> Instrument:
    """Opens, and thereby resets, an instrument.

    Args:
        name: its identifier, its short name or the end of either, ``"chip:"`` and the chip's id, or what
            :func:`list_instruments` or :func:`simulated` answered; None: the first.
        transport: "native" or "usbio"; None: what this machine prefers.

    Raises:
        NotFound: none is connected, or not that one.
        InUse: another process has it.
        NoPermission: this user may not open it.
    """
    from .simulation import bus_name_of

    if isinstance(name, Listed):
        return Instrument(name.identifier, transport or name.transport)  # type: ignore[arg-type]
    return Instrument(bus_name_of(name), transport)


@contextlib.contextmanager
def capture(path: PathLike) -> Generator[Path, None, None]:
    """Records the USB traffic of every instrument that is opened in the ``with`` block, as a pcapng file.

    Protocol analysers read it. What was opened before is not in it. Raises :class:`FileFailed` at the end when
    something could not be written.
    """
    _core.start_capture(os.fspath(path))
    try:
        yield Path(path)
    finally:
        _core.end_capture()
