"""The station side of atcid: decode a phone's answers, run test sequences, push files."""

from .framing import Answer
from .link import LinkError
from .station import Station

__all__ = ["Answer", "LinkError", "Station"]
