"""The optical instrument in Python: readouts and scans as arrays, EEPROM images, simulated instruments.

A readout of the first instrument that is connected::

    import ostra
    with ostra.open() as instrument:
        readout = instrument.readout(integration_time=0.02)
        print(readout.values, readout.taken_at)          # numpy int32[128]

The same without hardware, a scan as it arrives, and a change of the calibration with a backup:

>>> import ostra
>>> with ostra.simulated("lab", seed=1), ostra.open("lab") as instrument:
...     readout = instrument.readout(integration_time=0.02)
...     records = sum(len(block) for block in instrument.scan(records=1000))
...     image = instrument.eeprom.read()
...     image.calibration[1211] = 5
...     written = instrument.eeprom.write(image, backup=False)
>>> readout.values.shape, readout.values.dtype, records, written.pieces
((128,), dtype('int32'), 1000, 1)

What fails raises :class:`ostra.Error` or a class below it, which tells the instrument and what can be done. Times are
seconds, sizes bytes. ``help(ostra.Instrument)`` and the other classes say the rest.
"""

from __future__ import annotations

from ._core import __version__
from .errors import (
    BadArgument,
    BadData,
    Error,
    FileFailed,
    InUse,
    NoPermission,
    NotFound,
    ShortData,
    Timeout,
    TransferFailed,
    Unplugged,
)
from .image import (
    AreaDifference,
    Calibration,
    Difference,
    Finding,
    Image,
    Log,
    ValueDifference,
    Words,
)
from .instrument import (
    Eeprom,
    Event,
    Identity,
    Instrument,
    Listed,
    Parameters,
    Ram,
    Readout,
    Scan,
    Written,
    capture,
    list_instruments,
    open,
)
from .simulation import Simulation, simulated

__all__ = [
    "AreaDifference",
    "BadArgument",
    "BadData",
    "Calibration",
    "Difference",
    "Eeprom",
    "Error",
    "Event",
    "FileFailed",
    "Finding",
    "Identity",
    "Image",
    "InUse",
    "Instrument",
    "Listed",
    "Log",
    "NoPermission",
    "NotFound",
    "Parameters",
    "Ram",
    "Readout",
    "Scan",
    "ShortData",
    "Simulation",
    "Timeout",
    "TransferFailed",
    "Unplugged",
    "ValueDifference",
    "Words",
    "Written",
    "__version__",
    "capture",
    "list_instruments",
    "open",
    "simulated",
]
