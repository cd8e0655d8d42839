"""Makes the pictures of docs/python.md: python3 docs/pictures/make.py FOLDER"""

import sys
from pathlib import Path

import matplotlib
import numpy as np

import ostra

matplotlib.use("Agg")
folder = Path(sys.argv[1])
folder.mkdir(parents=True, exist_ok=True)


def save(axes, name):
    axes.figure.set_size_inches(6, 3)
    axes.figure.tight_layout()
    axes.figure.savefig(folder / name, dpi=80, metadata={"Software": None})


with ostra.simulated("gallery", seed=4, virtual_time=True), ostra.open("gallery") as instrument:
    save(instrument.readout(integration_time=0.02).plot(), "readout.png")
    save(instrument.scan(records=200).plot(), "scan.png")
    image = instrument.eeprom.read()
    for id, value in image.calibration.items():
        if isinstance(value, np.ndarray) and value.dtype == np.float32:
            image.calibration[id] = np.round(np.exp(-np.arange(len(value)) / (1 + id % 7)), 4)
    save(image.plot(), "image.png")
