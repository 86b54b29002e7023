"""Calibration data (CDF) files as a tree of views, with values as numpy arrays.

    import kestcalmorph as k
    data = k.read("examples/sample.cdf")
    item = data.lists["EngineControl"].items["IdleSpeedTarget"]
    item.values            # numpy array shaped by the item's axes
    data.write("out.cdf")
"""

import warnings as _warnings

from . import _extras
from ._core import CalData, CalList, CalItem, Axis, Change, CalLists, CalItems, Axes, History
from ._core import check, diff, from_json, merge, validate
from ._core import read as _read
from ._errors import (Error, LoadError, ValidationError, ConversionError, WriteError, JsonError,
                      TokenWarning, Problem)

__all__ = ["read", "validate", "from_json", "diff", "merge", "check", "CalData", "CalList", "CalItem", "Axis", "Change",
           "Error", "LoadError", "ValidationError", "ConversionError", "WriteError", "JsonError",
           "TokenWarning", "Problem"]


def read(path, *, schema=None, validate=True, offline=False):
    """Reads a CDF file. Validates against `schema` (an XSD path) or the schema the file names
    (the built-in cdf.xsd when that is not at hand); `offline` fetches nothing over http.
    Numbers not taken whole are in `CalData.warnings` and issued as TokenWarning."""
    data = _read(path, schema, validate, offline)
    for warning in data.warnings:
        _warnings.warn(warning, stacklevel=2)
    return data


CalItem.plot = _extras.plot
CalData.to_dataframe = _extras.to_dataframe
