#!/usr/bin/env python3
"""A host program in Python, without any package: takes a readout and shows it.

    readout.py LIBRARY [INSTRUMENT]

On Windows it needs a 32-bit Python, because ostra.dll is a 32-bit library."""
import ctypes
import sys

READOUT_VALUES = 128


def main() -> int:
    if len(sys.argv) < 2:
        print(__doc__, file=sys.stderr)
        return 2
    library = ctypes.CDLL(sys.argv[1])
    library.b5ae189db26b2a1b.restype = ctypes.c_char_p
    instrument = sys.argv[2] if len(sys.argv) > 2 else ""
    values = (ctypes.c_int32 * READOUT_VALUES)()
    if library.d4fb86cecc88582a(values, instrument.encode()) != 0:
        reason = library.b5ae189db26b2a1b(b"LastError").decode("ascii", "replace")
        print("no readout:", reason or "no such instrument is connected", file=sys.stderr)
        return 1
    for start in range(0, READOUT_VALUES, 8):
        print(" ".join(f"{value:6d}" for value in values[start : start + 8]))
    return 0


sys.exit(main())
