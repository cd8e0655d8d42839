"""Pictures: with matplotlib where it is installed, as SVG for notebooks without it."""

from __future__ import annotations

from collections.abc import Sequence
from typing import TYPE_CHECKING, Any

import numpy as np
import numpy.typing as npt

if TYPE_CHECKING:
    from matplotlib.axes import Axes

    from .image import Image
    from .instrument import Readout

_WIDTH, _HEIGHT, _MARGIN = 480, 200, 40
_COLORS = ("#1f77b4", "#d62728", "#2ca02c", "#9467bd", "#ff7f0e", "#17becf")


def _axes(ax: Axes | None) -> Axes:
    if ax is not None:
        return ax
    import matplotlib.pyplot as pyplot

    return pyplot.subplots()[1]


def _title_of(readout: Readout) -> str:
    return f"{readout.taken_at:%Y-%m-%d %H:%M:%S}, {readout.integration_time:g} s"


def _vectors_of(image: Image) -> dict[str, npt.NDArray[Any]]:
    return {str(id): value for id, value in image.calibration.items() if isinstance(value, np.ndarray)}


def plot_readout(readout: Readout, ax: Axes | None = None) -> Axes:
    """A line of the 128 values."""
    axes = _axes(ax)
    axes.plot(readout.values)
    axes.set(xlabel="sensor element", ylabel="reading", title=_title_of(readout), xlim=(0, len(readout.values) - 1))
    return axes


def plot_scan(records: npt.NDArray[Any], ax: Axes | None = None) -> Axes:
    """A picture of a scan, a record a line, brightness for the reading."""
    axes = _axes(ax)
    picture = axes.imshow(records, aspect="auto", interpolation="nearest", cmap="viridis")
    axes.set(xlabel="value in the record", ylabel="record", title=f"scan of {len(records)} records")
    axes.figure.colorbar(picture, ax=axes, label="reading")
    return axes


def plot_image(image: Image, ax: Axes | None = None) -> Axes:
    """The calibration values that are arrays, a line each."""
    axes = _axes(ax)
    for id, values in _vectors_of(image).items():
        axes.plot(values, label=id, marker=".")
    axes.set(xlabel="element", ylabel="value", title="calibration")
    axes.legend(title="identifier", fontsize="small")
    return axes


def _svg(lines: Sequence[npt.NDArray[Any]], names: Sequence[str], title: str, x: str, y: str) -> str:
    finite = [line[np.isfinite(line)].astype(float) for line in lines]
    low = min((line.min() for line in finite if line.size), default=0.0)
    high = max((line.max() for line in finite if line.size), default=1.0)
    longest = max((len(line) for line in finite), default=1)
    wide, tall = _WIDTH - 2 * _MARGIN, _HEIGHT - 2 * _MARGIN
    across, up = wide / max(longest - 1, 1), tall / ((high - low) or 1.0)
    parts = [
        f'<svg xmlns="http://www.w3.org/2000/svg" width="{_WIDTH}" height="{_HEIGHT}" '
        f'viewBox="0 0 {_WIDTH} {_HEIGHT}" font-family="sans-serif" font-size="11">',
        f'<rect x="{_MARGIN}" y="{_MARGIN}" width="{wide}" height="{tall}" fill="none" stroke="#888"/>',
        f'<text x="{_WIDTH / 2}" y="{_MARGIN - 12}" text-anchor="middle">{title}</text>',
        f'<text x="{_WIDTH / 2}" y="{_HEIGHT - 6}" text-anchor="middle">{x}</text>',
        f'<text x="12" y="{_HEIGHT / 2}" text-anchor="middle" '
        f'transform="rotate(-90 12 {_HEIGHT / 2})">{y}</text>',
        f'<text x="{_MARGIN}" y="{_HEIGHT - _MARGIN + 14}">0</text>',
        f'<text x="{_WIDTH - _MARGIN}" y="{_HEIGHT - _MARGIN + 14}" text-anchor="end">{longest - 1}</text>',
        f'<text x="{_MARGIN - 3}" y="{_HEIGHT - _MARGIN}" text-anchor="end" font-size="9">{low:g}</text>',
        f'<text x="{_MARGIN - 3}" y="{_MARGIN + 8}" text-anchor="end" font-size="9">{high:g}</text>',
    ]
    for index, (line, name) in enumerate(zip(finite, names)):
        color = _COLORS[index % len(_COLORS)]
        points = " ".join(
            f"{_MARGIN + i * across:.1f},{_HEIGHT - _MARGIN - (value - low) * up:.1f}" for i, value in enumerate(line)
        )
        parts.append(f'<polyline points="{points}" fill="none" stroke="{color}"><title>{name}</title></polyline>')
    return "".join([*parts, "</svg>"])


def svg_of_readout(readout: Readout) -> str:
    """The 128 values as a picture that needs no library."""
    return _svg([readout.values], ["readout"], _title_of(readout), "sensor element", "reading")


def svg_of_image(image: Image) -> str:
    """The calibration values that are arrays, likewise."""
    vectors = _vectors_of(image)
    return _svg(list(vectors.values()), list(vectors), "calibration", "element", "value")
