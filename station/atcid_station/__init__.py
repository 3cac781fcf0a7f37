"""The station side of atcid: talk to a phone or an emulated phone, run test sequences on one
phone or many at once, push files. `connect` is where to begin."""

from .api import Phone, Pushed, SequenceRun, connect
from .errors import ConnectionLost, LinkError, StationError, TimedOut, Unreachable
from .framing import Answer
from .station import Station

__all__ = ["Answer", "ConnectionLost", "LinkError", "Phone", "Pushed", "SequenceRun",
           "Station", "StationError", "TimedOut", "Unreachable", "connect"]
