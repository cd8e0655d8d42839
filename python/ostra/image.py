"""EEPROM images: 8192 bytes that hold calibration, usage log, a binary block and raw words."""

from __future__ import annotations

import os
from collections.abc import Iterable, Iterator, Mapping, MutableMapping, Sequence
from dataclasses import dataclass
from pathlib import Path
from typing import TYPE_CHECKING, Any, Union

import numpy as np
import numpy.typing as npt

from . import _core
from .errors import BadData

if TYPE_CHECKING:
    from matplotlib.axes import Axes

Value = Union[int, float, "npt.NDArray[np.int32]", "npt.NDArray[np.float32]"]
"""A value of an image or of the RAM: an int, a float, or an array of int32 or float32."""
PathLike = Union[str, "os.PathLike[str]"]

SIZE = 8192
"""Bytes of an image."""


def text_of(value: Any) -> str:
    """A number or a sequence of numbers as the driver reads them, every digit of it."""
    if isinstance(value, str):
        return value
    if np.ndim(value) == 0:
        number = np.asarray(value).item()
        return str(int(number)) if isinstance(number, (bool, int)) else repr(float(number))
    return ",".join(text_of(element) for element in value)


@dataclass(frozen=True)
class Finding:
    """One thing that :meth:`Image.check` found.

    Attributes:
        severity: "ok", "note", "warning" (the driver can use the image all the same) or "error".
        area: the part of the image.
        text: what is to be said of it.
    """

    severity: str
    area: str
    text: str

    def __str__(self) -> str:
        return f"{self.severity}: {self.area}: {self.text}"


@dataclass(frozen=True)
class ValueDifference:
    """A value that two images have differently: ``a`` or ``b`` is None where an image lacks it."""

    kind: str
    id: int
    a: Value | None
    b: Value | None


@dataclass(frozen=True)
class AreaDifference:
    """An area in which the bytes of two images differ: addresses, and how many bytes."""

    area: str
    first: int
    last: int
    different_bytes: int
    first_difference: int


@dataclass(frozen=True)
class Difference:
    """How two images differ; false where they do not.

    Attributes:
        values: what the values mean, as far as both images can be read.
        areas: where the bytes are.
        unreadable: why the values of an image cannot be read; empty where they can.
    """

    values: list[ValueDifference]
    areas: list[AreaDifference]
    unreadable: str

    def __bool__(self) -> bool:
        return bool(self.areas)


class Calibration(MutableMapping[int, Value]):
    """The calibration values of an image by identifier (1000 and up).

    Reading answers an int, a float or an array; a new value must have as many elements as the old one. Every
    change is proven: the result is read back, and no other value may have changed. Values cannot be deleted.
    """

    def __init__(self, image: Image) -> None:
        self._image = image

    def _values(self) -> dict[int, Value]:
        return _core.image_calibration(bytes(self._image))

    def __getitem__(self, id: int) -> Value:
        return self._values()[id]

    def __setitem__(self, id: int, value: Any) -> None:
        self.update({id: value})

    def update(self, *args: Any, **kwargs: Any) -> None:
        """Sets several values at once, all or none of them."""
        pairs = [(id, text_of(value)) for id, value in dict(*args, **kwargs).items()]
        self._image._data = _core.with_calibration(bytes(self._image), pairs)

    def __delitem__(self, id: int) -> None:
        raise TypeError("a calibration value can be changed, not deleted")

    def __iter__(self) -> Iterator[int]:
        return iter(self._values())

    def __len__(self) -> int:
        return len(self._values())

    def __repr__(self) -> str:
        return f"<calibration of {len(self)} values>"


@dataclass(frozen=True)
class Log(Mapping[int, Value]):
    """The usage log of an image, by identifier.

    Attributes:
        used: which copy the driver uses: "main copy", "second copy" or "an empty log".
        main_is_valid, second_is_valid: whether the copies' checksums are right.
    """

    values_by_id: dict[int, Value]
    used: str
    main_is_valid: bool
    second_is_valid: bool

    def __getitem__(self, id: int) -> Value:
        return self.values_by_id[id]

    def __iter__(self) -> Iterator[int]:
        return iter(self.values_by_id)

    def __len__(self) -> int:
        return len(self.values_by_id)

    def __repr__(self) -> str:
        return f"<log of {len(self)} values from the {self.used}>"


class Words(Sequence[int]):
    """The raw words of an image by identifier: 10200 to 10239 can be read, 10200 to 10215 be set; 32 bits each."""

    FIRST, LAST = 10200, 10239

    def __init__(self, image: Image) -> None:
        self._image = image

    def __getitem__(self, id: Any) -> Any:
        return _core.raw_word(bytes(self._image), id)

    def __setitem__(self, id: int, word: int) -> None:
        self._image._data = _core.with_raw_word(bytes(self._image), id, word)

    def __iter__(self) -> Iterator[int]:
        return (self[id] for id in range(self.FIRST, self.LAST + 1))

    def __len__(self) -> int:
        return self.LAST - self.FIRST + 1

    def __repr__(self) -> str:
        return f"<raw words {self.FIRST} to {self.LAST}>"


class Image:
    """The content of an EEPROM: 8192 bytes, and what they mean.

    ``Image()`` is that of an instrument that was never used; ``Image(data)`` takes bytes, another image or an
    array of uint8.

    >>> image = Image()
    >>> image.calibration[1211] = 5
    >>> image.calibration[1211]
    5
    >>> image.is_sane()
    True
    """

    def __init__(self, data: bytes | bytearray | memoryview | Image | npt.NDArray[np.uint8] | None = None) -> None:
        self._data = _core.fresh_image() if data is None else bytes(data)
        if len(self._data) != SIZE:
            raise BadData(f"an image has {SIZE} bytes, not {len(self._data)}")

    @classmethod
    def load(cls, path: PathLike) -> Image:
        """The image in a file; :class:`BadData` where that has not 8192 bytes."""
        with open(path, "rb") as file:
            data = file.read(SIZE + 1)
        if len(data) != SIZE:
            more = "more than " if len(data) > SIZE else ""
            raise BadData(f"{os.fspath(path)}: an image has {SIZE} bytes, not {more}{min(len(data), SIZE)}")
        return cls(data)

    def save(self, path: PathLike, replace: bool = False) -> Path:
        """Writes the image to a file, which has its name only when it is complete.

        A file that exists is refused (:class:`FileFailed`) unless ``replace`` is set. Answers the path.
        """
        _core.save_file(os.fspath(path), self._data, replace)
        return Path(path)

    def copy(self) -> Image:
        """An image of its own with the same bytes."""
        return Image(self._data)

    @property
    def calibration(self) -> Calibration:
        """The calibration values, which can be changed. :class:`BadData` of an image that the driver cannot use."""
        return Calibration(self)

    @property
    def log(self) -> Log:
        """The usage log."""
        return Log(*_core.image_log(self._data))

    def reset_log(self) -> None:
        """Empties both copies of the usage log."""
        self._data = _core.with_empty_log(self._data)

    @property
    def table(self) -> dict[int, int]:
        """The allocation table: addresses by identifier."""
        return _core.image_table(self._data)

    @property
    def binary_block(self) -> bytes:
        """The binary block, 1904 bytes; can be set."""
        return _core.binary_block(self._data)

    @binary_block.setter
    def binary_block(self, block: bytes) -> None:
        self._data = _core.with_binary_block(self._data, bytes(block))

    @property
    def words(self) -> Words:
        """The raw words: ``image.words[10200] = 0x01020304``."""
        return Words(self)

    def check(self) -> list[Finding]:
        """Looks at every part of the image, whatever it holds."""
        return [Finding(*row) for row in _core.check_image(self._data)]

    def is_sane(self) -> bool:
        """Whether :meth:`check` finds no error."""
        return _core.errors_of_image(self._data) == ""

    def diff(self, other: Image) -> Difference:
        """How this image (``a``) and another one (``b``) differ, by value and by area."""
        values, areas, unreadable_a, unreadable_b = _core.diff_images(self._data, other._data)
        return Difference(
            [ValueDifference(*row) for row in values],
            [AreaDifference(*row) for row in areas],
            unreadable_a or unreadable_b,
        )

    def plot(self, ax: Axes | None = None) -> Axes:
        """Draws the calibration values that are arrays, with matplotlib. Answers the axes."""
        from .plots import plot_image

        return plot_image(self, ax)

    def _repr_svg_(self) -> str:
        from .plots import svg_of_image

        return svg_of_image(self)

    def __array__(self, dtype: npt.DTypeLike = None) -> npt.NDArray[Any]:
        return np.frombuffer(self._data, dtype=np.uint8).astype(dtype or np.uint8)

    def __bytes__(self) -> bytes:
        return self._data

    def __len__(self) -> int:
        return SIZE

    def __eq__(self, other: object) -> bool:
        return isinstance(other, Image) and self._data == other._data

    __hash__ = None  # type: ignore[assignment]

    def __repr__(self) -> str:
        errors = sum(finding.severity == "error" for finding in self.check())
        return f"<image of 8192 bytes, {'sane' if errors == 0 else f'{errors} errors'}>"


def values_of(changes: Mapping[int, Any] | Iterable[tuple[int, Any]]) -> list[tuple[int, str]]:
    """Pairs of identifier and text for the driver."""
    return [(id, text_of(value)) for id, value in dict(changes).items()]
