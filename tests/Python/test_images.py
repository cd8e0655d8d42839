"""EEPROM images and their way into instruments; what the package and the tool say of the same instrument."""

import json
import os
import subprocess
from pathlib import Path

import numpy as np
import pytest

import ostra


@pytest.fixture
def broken():
    content = bytearray(bytes(ostra.Image()))
    content[ostra.Image().table[1000] :] = b"\0" * (8192 - ostra.Image().table[1000])
    content[0x1000:0x1002] = b"\0\0"
    return bytes(content)


def test_values_are_read_and_changed_and_nothing_else(tmp_path):
    image = ostra.Image()
    before = image.copy()
    image.calibration[1211] = 5
    image.calibration.update({1000: np.linspace(0, 1, len(np.atleast_1d(image.calibration[1000])))})
    image.words[10200] = 0x01020304
    image.binary_block = bytes(range(256)) * 7 + bytes(112)
    assert image.calibration[1211] == 5 and image.words[10200] == 0x01020304
    assert image.binary_block[:3] == b"\0\1\2" and len(image.binary_block) == 1904
    difference = before.diff(image)
    assert difference and {value.id for value in difference.values} >= {1000, 1211, 10200}
    assert not before.diff(before.copy()) and before != image
    path = image.save(tmp_path / "a.eeprom")
    with pytest.raises(ostra.FileFailed):
        image.save(path)
    with pytest.raises(OSError):
        before.save(tmp_path / "no" / "such" / "folder")
    assert ostra.Image.load(path) == image == ostra.Image(np.asarray(image)) and len(bytes(image)) == 8192
    image.reset_log()
    assert image.log.used == "main copy" and image.log.main_is_valid and image._repr_svg_().startswith("<svg")


@pytest.mark.parametrize(
    ("change", "kind"),
    [
        (lambda image: image.calibration.__setitem__(1211, [1, 2]), ValueError),
        (lambda image: image.calibration.__setitem__(1211, "five"), ostra.BadArgument),
        (lambda image: image.calibration.__setitem__(7, 1), ostra.BadArgument),
        (lambda image: image.calibration.__delitem__(1211), TypeError),
        (lambda image: image.words.__setitem__(10216, 1), ostra.BadArgument),
        (lambda image: setattr(image, "binary_block", b"short"), ostra.BadData),
        (lambda image: ostra.Image(b"short"), ostra.BadData),
        (lambda image: ostra.Image.load(os.devnull), ostra.BadData),
    ],
)
def test_what_cannot_be_changes_nothing(change, kind):
    image = ostra.Image()
    with pytest.raises(kind):
        change(image)
    assert image == ostra.Image()


def test_writing_keeps_checks_and_verifies(ostra_simulated, transport, tmp_path, monkeypatch, broken):
    monkeypatch.chdir(tmp_path)
    lab = ostra_simulated("lab")
    with ostra.open("lab", transport) as instrument:
        before = instrument.eeprom.read()
        wanted = before.copy()
        wanted.calibration[1211] = 7
        written = instrument.eeprom.write(wanted, backup="before.eeprom")
        assert written == ostra.Written(1, Path("before.eeprom")) and lab.eeprom == wanted
        assert ostra.Image.load("before.eeprom") == before
        assert instrument.eeprom.write(wanted) == ostra.Written(0, None)
        with pytest.raises(ostra.FileFailed):  # nothing is written without its backup
            instrument.eeprom.write(before, backup="before.eeprom")
        assert lab.eeprom == wanted
        with pytest.raises(ostra.BadData, match="not written"):
            instrument.eeprom.write(broken)
        assert lab.eeprom == wanted
        named = instrument.eeprom.write(broken, force=True).backup
        assert ostra.Image.load(named) == wanted and bytes(lab.eeprom) == broken
        assert any(finding.severity == "error" for finding in instrument.eeprom.check())
        instrument.eeprom.restore("before.eeprom")
        assert lab.eeprom == before and len(list(tmp_path.iterdir())) == 2


def test_a_write_that_fails_says_how_it_is_undone(ostra_simulated, transport, tmp_path):
    lab = ostra_simulated("lab", faults="bulk-out 0:stall")
    with ostra.open("lab", transport) as instrument:
        wanted = instrument.eeprom.read()
        wanted.calibration[1211] = 7
        with pytest.raises(ostra.TransferFailed, match="0 of 1 pieces had been sent") as caught:
            instrument.eeprom.write(wanted, backup=tmp_path / "b")
        assert f'restore("{tmp_path / "b"}")' in caught.value.advice
        assert ostra.Image.load(tmp_path / "b") == lab.eeprom


def test_traffic_is_recorded(tmp_path, transport):
    with ostra.simulated("lab"):
        with ostra.capture(tmp_path / "a.pcapng") as path, ostra.open("lab", transport) as instrument:
            instrument.readout()
            with pytest.raises(ostra.BadArgument, match="already"), ostra.capture(tmp_path / "b"):
                pass
        assert path.read_bytes().startswith(b"\x0a\x0d\x0d\x0a") and b"Measure" in path.read_bytes()
        with pytest.raises(ostra.FileFailed), ostra.capture(tmp_path / "no" / "such"):
            pass


def json_of(*arguments):
    tool, simulator = os.environ["OSTRA_TOOL"], os.environ["OSTRA_SIMULATOR"]
    name = f"pytest-{os.getpid()}"
    with subprocess.Popen(
        [simulator, "--name", name, "--seed", "7", "--scan-bytes", "2560", "--for", "60"], stdout=subprocess.PIPE
    ) as process:
        process.stdout.readline()
        try:
            done = subprocess.run(
                [tool, *arguments, "--device", name, "--json"], capture_output=True, text=True, timeout=60, check=True
            )
        finally:
            process.terminate()
    return json.loads(done.stdout)


@pytest.mark.skipif("OSTRA_TOOL" not in os.environ, reason="OSTRA_TOOL and OSTRA_SIMULATOR name the programs")
def test_the_tool_says_the_same(ostra_simulated, transport):
    ostra_simulated("lab", seed=7, scan_bytes=2560)
    way = ("--transport", transport)
    with ostra.open("lab", transport) as instrument:
        identity, tools = instrument.identify(), json_of("identify", *way)
        assert [identity.chip_id, list(identity.misc), list(identity.mode)] == [
            tools["chipId"], tools["misc"], tools["mode"]
        ]  # fmt: skip
    with ostra.open("lab", transport) as instrument:
        readout, tools = instrument.readout(integration_time=0.02), json_of(
            "readout", "--integration-time", "0.02", *way
        )
        # Both begin their series of noise at the simulated instrument's first measurement.
        assert readout.values.tolist() == tools["values"]
        assert list(readout.parameters) == tools["parameters"]
        assert readout.integration_time == pytest.approx(tools["integrationTime"])
        ram, tools = instrument.ram.load(), json_of("ram", "show", *way)["ram"]
        assert {str(id) for id in ram} == set(tools)
        image, tools = instrument.eeprom.read(), json_of("eeprom", "show", *way)
        for id, value in image.calibration.items():
            assert np.allclose(np.asarray(value, float), np.asarray(tools["calibration"][str(id)], float)), id
        assert {str(id): word for id, word in zip(range(10200, 10216), image.words)} == tools["words"]
