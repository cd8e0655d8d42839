"""EEPROM images and their way into instruments."""

import os
from pathlib import Path

import numpy as np
import pytest

import ostra


def test_values_are_read_and_changed_and_nothing_else(tmp_path):
    image = ostra.Image()
    before = image.copy()
    image.calibration[1211] = 5
    image.calibration.update({1000: np.linspace(0, 1, len(np.atleast_1d(image.calibration[1000])))})
    image.words[10200] = 0x01020304
    image.binary_block = bytes(range(256)) * 7 + bytes(112)
    assert image.calibration[1211] == 5 and image.words[10200] == 0x01020304 == list(image.words)[0]
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


def test_writing_keeps_checks_and_verifies(ostra_simulated, transport, tmp_path, monkeypatch):
    monkeypatch.chdir(tmp_path)
    broken = bytearray(bytes(ostra.Image()))
    broken[0x1000:0x1002] = b"\0\0"
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
