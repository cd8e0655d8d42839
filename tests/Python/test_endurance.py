"""What is opened, scanned and thrown away very often leaves nothing behind."""

import gc
import os
from pathlib import Path

import pytest

import ostra

CYCLES = int(os.environ.get("OSTRA_CYCLES", "10000"))


def used():
    """Descriptors, threads, and resident memory in KiB."""
    gc.collect()
    status = dict(line.split(":", 1) for line in Path("/proc/self/status").read_text().splitlines())
    return len(os.listdir("/proc/self/fd")), int(status["Threads"]), int(status["VmRSS"].split()[0])


@pytest.mark.parametrize("what", ["openings", "records"])
def test_nothing_grows(ostra_simulated, transport, what):
    ostra_simulated("lab")

    def openings(count):
        for _ in range(count):
            ostra.open("lab", transport).close()

    def records(count):
        with ostra.open("lab", transport) as instrument:
            taken = sum(len(block) for block in instrument.scan(records=count))
        assert taken == count

    work, count = (openings, CYCLES) if what == "openings" else (records, 100 * CYCLES)
    work(count // 10)
    descriptors, threads, memory = used()
    work(count)
    assert used()[:2] == (descriptors, threads)
    assert used()[2] - memory < 4096
