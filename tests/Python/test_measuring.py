"""Readouts, scans and what an instrument tells, on both transports, in virtual time."""

import threading
from datetime import datetime, timedelta, timezone

import numpy as np
import pytest

import ostra


def test_readouts_are_arrays_with_what_they_were_taken_with(ostra_simulated, transport):
    ostra_simulated("lab", seed=3)
    with ostra.open("lab", transport) as instrument:
        first = instrument.readout()
        assert (first.values.shape, first.values.dtype) == ((128,), np.int32)
        assert first.values[0] == first.values[1] and first.values[127] == first.values[126]
        assert tuple(first.parameters) == (294, 0, 1, 6)
        assert first.integration_time == pytest.approx(294 * 68e-6)
        longer = instrument.readout(integration_time=0.05)
        assert longer.integration_time == pytest.approx(0.05, abs=68e-6)
        assert longer.values.mean() > 2 * first.values.mean()
        assert instrument.readout().parameters == longer.parameters  # they stay
        given = instrument.readout(parameters=(100, 0, 1, 6))
        assert tuple(given.parameters) == (100, 0, 1, 6)
        with pytest.raises(ValueError, match="either"):
            instrument.readout(integration_time=1, parameters=(1, 2, 3, 4))
        with pytest.raises(ostra.BadData, match="fits none"):
            instrument.readout(integration_time=1000)
        for wrong in ({"integration_time": 0}, {"parameters": (65536, 0, 1, 6)}, {"parameters": (1, 1, 1, 256)}):
            with pytest.raises(ostra.BadArgument):
                instrument.readout(**wrong)


def test_a_readout_says_when_it_was_begun():
    with ostra.simulated("lab"), ostra.open("lab") as instrument:
        readout = instrument.readout()
    assert abs(readout.taken_at - datetime.now(timezone.utc)) < timedelta(minutes=1)
    assert "_svg_" in "".join(dir(readout)) and readout._repr_svg_().startswith("<svg")


def test_series_keep_their_interval(ostra_simulated):
    lab = ostra_simulated()
    with ostra.open(lab) as instrument:
        instrument.readout()
        before = lab.elapsed
        readouts = list(instrument.readouts(count=5, interval=2.0))
        assert len(readouts) == 5
        assert lab.elapsed - before == pytest.approx(8, abs=0.2)


@pytest.mark.parametrize("records", [1, 1000])
def test_scans_arrive_whole(ostra_simulated, transport, records):
    ostra_simulated("lab")
    with ostra.open("lab", transport) as instrument:
        scan = instrument.scan(records=records)
        values = scan.read()
        assert values.shape == (records, 128) and values.dtype == np.int32
        # The last value of a record counts them, up to 250.
        assert np.array_equal(values[:, 127], np.arange(records) % 251)
        assert list(scan) == [] and instrument.chip_id()
        raw = instrument.scan(total=6 * 512, record_size=512, raw=True).read()
        assert raw.shape == (6, 512) and raw.dtype == np.uint8


def test_open_ended_scans_end_when_the_instrument_stops(ostra_simulated, transport):
    ostra_simulated("lab", scan_bytes=256 * 77)
    with ostra.open("lab", transport) as instrument:
        assert len(instrument.scan().read()) == 77
        scan = instrument.scan(records=100)
        blocks = []
        with pytest.raises(ostra.ShortData, match="19712 of 25600"):
            for block in scan:
                blocks.append(block)
        assert sum(map(len, blocks)) == 77
        assert list(scan) == [] and instrument.readout().values.any()


def test_a_scan_that_is_left_leaves_a_usable_instrument(ostra_simulated, transport):
    ostra_simulated("lab", rate=1_000_000)
    with ostra.open("lab", transport) as instrument:
        before = instrument.readout().values.mean()
        for _ in instrument.scan():
            break
        assert instrument.readout().values.mean() == pytest.approx(before, rel=0.1)
        with instrument.scan() as scan:
            next(scan)
            with pytest.raises(ostra.InUse, match="a scan is running"):
                instrument.chip_id()
            instrument.stop_scan()
        assert instrument.readout().values.mean() == pytest.approx(before, rel=0.1)


@pytest.mark.parametrize(
    ("arguments", "text"),
    [
        ({"records": 1, "total": 256}, "either"),
        ({"record_size": 6554}, "6553"),
        ({"record_size": 255}, "odd"),
        ({"records": 1 << 24}, "4 GiB"),
        ({"records": 0}, "at least one"),
    ],
)
def test_scans_that_cannot_be_are_refused(ostra_instrument, arguments, text):
    with pytest.raises(ostra.BadArgument, match=text):
        ostra_instrument.scan(**arguments)
    assert ostra_instrument.readout() is not None


def test_what_an_instrument_says_of_itself(ostra_simulated, transport):
    ostra_simulated("lab")
    ostra_simulated("other", firmware="old")
    assert [listed.name.rpartition("-")[2] for listed in ostra.list_instruments(transport)] == ["lab", "other"]
    listed = ostra.list_instruments(transport, chip_ids=True)[0]
    with ostra.open(f"chip:{listed.chip_id}", transport) as instrument:
        identity = instrument.identify()
        assert identity.chip_id == instrument.chip_id() == listed.chip_id
        assert list(identity.misc) == [0x21, 301, 0x43, 0x0506, 0x0708] and instrument.mode == 1
        assert list(identity.mode) == [3, 1, 0, 130, 68, 1]
        instrument.mode = 2
        assert instrument.mode == 2
        assert instrument.ram.set({2009: 0.02})[2009] == pytest.approx(0.02, abs=68e-6)
        assert instrument.ram[2009] == pytest.approx(0.02, abs=68e-6) and 2009 in instrument.ram
        assert "integration time" in instrument.ram.meaning(2009)
        instrument.reset()
    with ostra.open("other", transport) as instrument:
        assert instrument.identify().misc[1] == 300


def test_events_come_while_readouts_are_taken(ostra_simulated, transport):
    lab = ostra_simulated()
    with ostra.open(lab, transport) as instrument:
        events = instrument.events(timeout=5)
        lab.sleep(0.1)  # a press from before the opening is none
        lab.press_button()
        assert instrument.readout() and next(events).kind == "button"
        next(iter(instrument.scan()))  # is given up, which ends transfers but not the listening
        lab.press_button()
        assert next(events).kind == "button"
        assert list(instrument.events(timeout=1)) == []
        lab.unplug()
        assert [event.kind for event in events] == ["removed"]
        with pytest.raises(ostra.Unplugged):
            instrument.readout()


def test_callbacks_run_beside_and_may_raise_and_close(transport, monkeypatch):
    seen, reported, called, ended = [], [], threading.Semaphore(0), threading.Event()
    monkeypatch.setattr(threading, "excepthook", lambda args: reported.append(args.exc_value))
    with ostra.simulated("lab") as lab, ostra.open("lab", transport) as instrument:

        def callback(event):
            seen.append(event.kind)
            called.release()
            if len(seen) == 1:
                raise RuntimeError("of the callback")
            instrument.close()
            ended.set()

        instrument.on_event(callback)
        lab.sleep(0.1)
        for _ in range(2):
            lab.press_button()
            assert called.acquire(timeout=10)
        assert ended.wait(10) and seen == ["button", "button"]
        assert [str(error) for error in reported] == ["of the callback"]
        assert not instrument.is_open
