"""Readouts and scans from Python against the C++ core, in turns: python_rates.py CORE_RATES"""

import statistics
import subprocess
import sys
import time

import ostra

READOUTS, ROUNDS, USB_SPEED = 500, 5, 53_000_000


def core(transport, records, rate):
    command = [sys.argv[1], transport, str(READOUTS), str(records), str(rate)]
    done = subprocess.run(command, capture_output=True, text=True, check=True)
    return map(float, done.stdout.split())


def package(transport, records, rate):
    with ostra.simulated(scan_bytes=records * 256, rate=rate) as lab, ostra.open(lab, transport) as instrument:
        instrument.readout()
        begun, worked = time.perf_counter(), time.process_time()
        total = sum(int(readout.values[64]) for readout in instrument.readouts(READOUTS))
        readout = (time.perf_counter() - begun) / READOUTS
        work = (time.process_time() - worked) / READOUTS
        begun = time.perf_counter()
        total += sum(int(block.sum()) for block in instrument.scan(records=records))
        assert total != 0
        return readout, work, records * 256 / (time.perf_counter() - begun)


for transport in ("native", "usbio"):
    for rate, records in ((USB_SPEED, 200_000), (0, 1_000_000)):
        figures = {core: [], package: []}
        for _ in range(ROUNDS):
            for side in (core, package):
                figures[side].append(tuple(side(transport, records, rate)))
        (core_readout, core_work, core_rate), (readout, work, speed) = (
            map(statistics.median, zip(*figures[side])) for side in (core, package)
        )
        print(
            f"{transport:6} {'at USB speed' if rate else 'unlimited':12}  readouts/s of the core's: "
            f"{core_readout / readout:.2f}  us beyond it: {(readout - core_readout) * 1e6:.1f}, "
            f"{(work - core_work) * 1e6:.1f} of processor time  "
            f"scan of the core's: {speed / core_rate:.2f} ({speed / 1e6:.0f} MB/s)"
        )
