"""The exceptions, warnings and problem records of kestcalmorph."""

from typing import NamedTuple


class Error(Exception):
    """A failure of the library: `reason` is its code (a parse or validation code for loads, the
    converter's reason code for conversions), with the item, file, line and column where known
    (empty or 0 otherwise)."""

    def __init__(self, message, *, reason=0, item="", file="", line=0, column=0, hint="",
                 path=""):
        super().__init__(message)
        self.reason = reason
        self.item = item
        self.file = file
        self.line = line
        self.column = column
        self.hint = hint
        self.path = path


class LoadError(Error):
    """The file does not load: missing, unreadable, not well-formed, no CAL-DATA."""


class ValidationError(LoadError):
    """The file loads but is not valid against its schema."""


class ConversionError(Error):
    """The converter refused the tree or the file's content (see `reason`)."""


class WriteError(Error):
    """The file could not be saved; an existing file is left as it was."""


class JsonError(Error):
    """JSON text that is not a calibration document; `path` says where (lists[0].items[3])."""


class TokenWarning(UserWarning):
    """A number the reader did not take whole (`kind`: partial, empty or overflow)."""

    def __init__(self, file, line, column, item, token, value_read, kind):
        super().__init__(f"{file}:{line}:{column}: {item}: '{token}' read as {value_read} "
                         f"({kind})")
        self.file, self.line, self.column = file, line, column
        self.item, self.token, self.value_read, self.kind = item, token, value_read, kind


class Problem(NamedTuple):
    """What keeps a file from loading or from being valid, with its position."""

    file: str
    line: int
    column: int
    reason: int
    message: str
    hint: str
