"""What can go wrong between a station and a phone. Every error is a StationError, and its
text says for a person what failed and, where time was spent, after how long."""


class StationError(Exception):
    """Base of every error of the station tool and its API."""


class LinkError(StationError):
    """The port could not be opened or was lost."""


class Unreachable(LinkError):
    """The phone could not be reached: refused, timed out, no such device, busy."""


class ConnectionLost(LinkError):
    """The phone closed the port, or it failed, while the station was using it."""


class TimedOut(StationError):
    """No complete answer arrived in time; `answer` holds what did arrive."""

    def __init__(self, message, answer=None):
        super().__init__(message)
        self.answer = answer
