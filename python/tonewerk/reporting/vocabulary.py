# SPDX-License-Identifier: Apache-2.0
"""The numbers of the protocol, and what this module raises and returns."""

import dataclasses
import enum


class Category(enum.IntEnum):
    """What a message is about. A number with a part of the audio stack: ``Category.IO | Domain.HAL``."""

    GENERIC = 1
    RECORD = 2
    INPUT = 3
    PLAYBACK = 4
    OUTPUT = 5
    PLAYBACK_AND_RECORD = 6
    IO = 7
    SETUP = 8
    CLIENT_REQUEST = 9
    ROUTE_CHANGE = 10
    ERROR = 11
    CHANMETERING = 12
    PERFORMANCE = 13
    VOLUME = 14
    GATHER = 15
    HEARING_HEALTH = 16
    UNKNOWN = 0xFFFFFFFF


class Domain(enum.IntEnum):
    """The part of the audio stack that a message is from."""

    MIDI = 0x04000000
    SESSION = 0x08000000
    DSP = 0x10000000
    HAL = 0x20000000
    ROUTING = 0x40000000
    TOOLBOX = 0x80000000


class Type(enum.IntEnum):
    """What happened."""

    GENERIC = 0
    START = 1
    STOP = 2
    ACTIVATE = 3
    DEACTIVATE = 4
    SETUP = 5
    ERROR = 6
    ISSUE_DETECTOR = 7
    ENERGYBOOK = 8
    MODULON_USAGE = 9
    MIDI_DRIVER = 10
    SUMMARY = 11
    HEADPHONE_AUDIO_EXPOSURE = 12
    AUDIO_EXPOSURE = 13
    LISTENING_ENHANCEMENT = 14
    PELLIX = 15
    SIMPLE = 16
    HISTOGRAM = 17
    STATE = 18
    MEMORY_LOG = 19
    UNKNOWN = 65535


class Service(enum.IntEnum):
    """What a session reports for."""

    GENERIC = 0
    VOCIA = 1
    TELEPHONY = 2
    HAPTICS = 3
    ALARMS = 4
    STANDALONE = 5
    SOUND_AUTO_CONFIG = 6
    LONG_FORM_AUDIO = 7
    NON_LONG_FORM_AUDIO = 8
    AUDIO_DEVICE_USAGE = 9
    ALERTS = 10
    TEST = 11
    API_USAGE = 12
    SYSTEM_SOUNDS = 13
    UNKNOWN = 65535


class State(enum.Enum):
    """The state of a client's connection."""

    IDLE = "idle"  # there was no request yet
    CONNECTING = "connecting"
    CONNECTED = "connected"
    WAITING = "waiting"  # no daemon; the client tries again by itself after 0.25 s to 30 s
    ENDED = "ended"  # closed, or made with once=True and the connection has ended


@dataclasses.dataclass(frozen=True)
class ClientInfo:
    """A client's state and counters."""

    state: State
    last_error: int  # errno of the last attempt that failed or connection that broke; 0 for none
    socket_path: str  # of the present or else the last connection; "" before the first one
    connections: int  # how many were made so far
    messages_sent: int
    messages_dropped: int
    queued_bytes: int  # of messages and requests that wait for the daemon


class ReportingError(Exception):
    """What this module raises, except for arguments that are wrong (TypeError, ValueError)."""


class NotConnectedError(ReportingError):
    """There was no daemon, or the connection ended before the answer. It is not known whether it was done."""


class ClosedError(ReportingError):
    """The client or the session was closed."""


class ForkedError(ReportingError):
    """The object belongs to the parent process. A child makes a client of its own."""


class WouldWaitError(ReportingError):
    """A method that waits was called on the client's own thread, in a callback."""


class QueueFullError(ReportingError):
    """There is no room for the request. Nothing was sent."""


class RefusedError(ReportingError):
    """The daemon has refused the request."""

    def __init__(self, domain: str, code: int, message: str) -> None:
        super().__init__(message or f"{domain} {code}")
        self.domain = domain
        self.code = code
        self.message = message
