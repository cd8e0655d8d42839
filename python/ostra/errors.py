"""What can go wrong, as exceptions.

Everything that fails in this package raises :class:`Error` or a class below it. ``str(error)`` names the instrument and
says what happened; the attributes tell the rest.
"""

from __future__ import annotations

__all__ = [
    "Error",
    "BadArgument",
    "BadData",
    "FileFailed",
    "InUse",
    "NoPermission",
    "NotFound",
    "ShortData",
    "Timeout",
    "TransferFailed",
    "Unplugged",
]


class Error(Exception):
    """Something could not be done.

    Attributes:
        message: what happened, without the instrument.
        advice: what can be done about it; empty where nothing is known.
        instrument: the identifier of the instrument; empty where it is none's.
        driver_text: the text of the driver library's own exception; empty where it is none of its.
    """

    def __init__(self, message: str = "", advice: str = "", instrument: str = "", driver_text: str = "") -> None:
        super().__init__(message, advice, instrument, driver_text)
        self.message = message
        self.advice = advice
        self.instrument = instrument
        self.driver_text = driver_text
        if advice and hasattr(self, "add_note"):
            self.add_note(advice)

    def __str__(self) -> str:
        return f"{self.instrument}: {self.message}" if self.instrument else self.message


class BadArgument(Error, ValueError):
    """What was asked for cannot be understood, or not be done so."""


class NotFound(Error):
    """No instrument is connected, or not the one that was named."""


class InUse(Error):
    """Another process has the instrument, or a scan of this one runs."""


class NoPermission(Error):
    """The system does not let this user open the instrument."""


class TransferFailed(Error):
    """The instrument or the system ended a transfer, or what was written reads back differently."""


class ShortData(TransferFailed):
    """Fewer bytes came than belong to a command."""


class Timeout(Error, TimeoutError):
    """The instrument did not answer in time."""


class Unplugged(Error):
    """The instrument is not there any more."""


class BadData(Error, ValueError):
    """Data or values that cannot be used: an image, a table, an integration time."""


class FileFailed(Error, OSError):
    """A file cannot be read or written."""

    def __init__(self, message: str = "", advice: str = "", instrument: str = "", driver_text: str = "") -> None:
        OSError.__init__(self)
        Error.__init__(self, message, advice, instrument, driver_text)


_CLASSES: dict[str, type[Error]] = {
    "BadArgument": BadArgument,
    "NotFound": NotFound,
    "Unplugged": Unplugged,
    "InUse": InUse,
    "NoPermission": NoPermission,
    "TransferFailed": TransferFailed,
    "ShortData": ShortData,
    "Timeout": Timeout,
    "BadData": BadData,
    "File": FileFailed,
}


def _from_failure(kind: str, message: str, advice: str, instrument: str, driver_text: str) -> Error:
    return _CLASSES.get(kind, Error)(message, advice, instrument, driver_text)
