"""The tree of errors, against fault plans on both transports; instruments that are misused."""

import gc
import os
import signal
import subprocess
import sys
import textwrap
import threading
import time
from concurrent.futures import ThreadPoolExecutor

import pytest

import ostra


@pytest.mark.parametrize(
    ("faults", "kind"),
    [
        ("bulk-in 0:stall", ostra.TransferFailed),
        ("bulk-in 0:silent", ostra.Timeout),
        ("bulk-in 0:short=10", ostra.ShortData),
        ("bulk-in 0:gone-during", ostra.Unplugged),
        ("control 1:gone-before", ostra.Unplugged),
    ],
)
def test_faults_become_errors_that_tell(ostra_simulated, transport, faults, kind):
    lab = ostra_simulated("lab", faults=faults)
    with ostra.open("lab", transport) as instrument:
        with pytest.raises(kind) as caught:
            instrument.readout()
        assert type(caught.value) is kind
        assert caught.value.instrument == instrument.identifier
        assert instrument.identifier in str(caught.value) and caught.value.message in str(caught.value)
        assert caught.value.advice and caught.value.driver_text
        assert lab.faults_hit >= 1
        if kind is not ostra.Unplugged:
            lab.set_faults("")
    if kind is not ostra.Unplugged:
        with ostra.open("lab", transport) as instrument:
            assert instrument.readout().values.any()


def test_names_that_fit_nothing_or_too_much(ostra_simulated, transport):
    with pytest.raises(ostra.NotFound):
        ostra.open("nobody has this name", transport)
    lab = ostra_simulated("lab")
    with pytest.raises(ostra.BadArgument, match="already"):
        ostra.simulated("lab", virtual_time=True)
    with pytest.raises(ostra.BadArgument, match="transport"):
        ostra.open("lab", "serial")
    with pytest.raises(ostra.BadArgument, match="faults|fault"):
        lab.set_faults("nonsense")
    with ostra.open(lab, transport):
        for other in ("native", "usbio"):
            with pytest.raises(ostra.InUse, match="already"):
                ostra.open(lab, other)
        # Asking everybody for the chip does not reset what is open.
        assert "already" in ostra.list_instruments(transport, chip_ids=True)[0].problem


def test_a_closed_instrument_says_so(ostra_simulated):
    instrument = ostra.open(ostra_simulated())
    events = instrument.events()
    instrument.close()
    instrument.close()
    for use in (instrument.readout, instrument.chip_id, instrument.eeprom.read, instrument.scan, instrument.events):
        with pytest.raises(ostra.Error, match="closed"):
            use()
    assert list(events) == []


def test_a_forgotten_instrument_is_closed_with_a_warning(transport):
    with ostra.simulated("lab"):
        for opened in (True, False):
            instrument = ostra.open("lab", transport)
            scan = instrument.scan() if opened else None
            with pytest.warns(ResourceWarning, match="not closed"):
                del instrument, scan
                gc.collect()


def test_threads_take_turns(transport):
    with ostra.simulated("lab"), ostra.open("lab", transport) as instrument, ThreadPoolExecutor(4) as threads:

        def work(times):
            return [(instrument.readout().values.shape, len(instrument.chip_id())) for _ in range(times)]

        assert list(threads.map(work, [20] * 4)) == [[((128,), 16)] * 20] * 4


def test_closing_ends_what_another_thread_does(transport):
    with ostra.simulated("lab", faults="bulk-in 0+:silent"), ostra.open("lab", transport) as instrument:
        with ThreadPoolExecutor() as thread:
            scanning = thread.submit(lambda: list(instrument.scan(timeout=100)))
            time.sleep(1.5)
            begun = time.monotonic()
            instrument.close()
            assert isinstance(scanning.exception(), (ostra.Error, type(None)))
            assert time.monotonic() - begun < 5


@pytest.mark.parametrize("what", ["scan", "readout", "events"])
def test_ctrl_c_ends_it_at_once_and_leaves_a_usable_instrument(transport, what):
    calls = {
        "scan": lambda instrument: [None for _ in instrument.scan(timeout=60)],
        "readout": lambda instrument: instrument.readout(),
        "events": lambda instrument: list(instrument.events()),
    }
    faults = "bulk-in 1:silent" if what == "readout" else ""
    with ostra.simulated("lab", rate=10_000, faults=faults) as lab, ostra.open(lab, transport) as instrument:
        before = instrument.readout().values.mean()
        timer = threading.Timer(0.3, os.kill, (os.getpid(), signal.SIGINT))
        timer.start()
        begun = time.monotonic()
        with pytest.raises(KeyboardInterrupt):
            calls[what](instrument)
        assert time.monotonic() - begun < 3
        assert instrument.readout().values.mean() == pytest.approx(before, rel=0.1)


def run(script):
    return subprocess.run(
        [sys.executable, "-c", textwrap.dedent(script)], capture_output=True, text=True, timeout=60, env=os.environ
    )


@pytest.mark.parametrize("ending", ["instrument.readout()", "scan = instrument.scan()", "watch = instrument.on_event(print)"])
def test_an_interpreter_may_end_with_an_open_instrument(ending):
    done = run(f"""
        import ostra, threading
        lab = ostra.simulated("lab")
        instrument = ostra.open("lab")
        {ending}
        threading.Thread(target=lambda: [None for _ in instrument.events()], daemon=True).start()
        print("end")
    """)
    assert (done.returncode, done.stdout, done.stderr) == (0, "end\n", "")


def test_a_forked_process_is_told_so():
    done = run("""
        import os, ostra
        lab = ostra.simulated("lab")
        instrument = ostra.open("lab")
        scan = instrument.scan()
        child = os.fork()
        if child == 0:
            for use in (instrument.chip_id, lambda: ostra.open("lab"), lambda: next(scan), lab.press_button):
                try:
                    use()
                    print("worked")
                except ostra.Error as error:
                    assert "forked" in str(error), error
            raise SystemExit(7)
        assert os.waitstatus_to_exitcode(os.waitpid(child, 0)[1]) == 7
        scan.close()
        print(len(instrument.readout()))
    """)
    assert (done.returncode, done.stdout, done.stderr) == (0, "128\n", "")


def test_virtual_time_belongs_to_its_thread(ostra_simulated):
    with pytest.raises(ostra.BadArgument, match="whole process"):
        with ostra.simulated("real"):
            ostra.simulated("virtual", virtual_time=True)
    lab = ostra_simulated()
    with ThreadPoolExecutor() as thread, pytest.raises(ostra.Error, match="virtual"):
        thread.submit(ostra.open, lab).result()
    begun = lab.elapsed
    lab.sleep(3600)
    assert lab.elapsed - begun == pytest.approx(3600)
