# SPDX-License-Identifier: Apache-2.0
"""Reports from Python programs to the audio reporting daemon.

    from tonewerk.reporting import Client, Service

    with Client() as client:
        with client.session(Service.LONG_FORM_AUDIO, "org.example.Player") as session:
            session.device("Speaker")
            session.format(48000, 2, "lpcm")
            with session.playing(0.5) as playing:
                ...
                playing.volume(0.3)
                ...

No call but `Client.connect`, `flush` and `close` and a future's `result` waits for the daemon, and these take a
time limit. Without a daemon everything is kept up to a limit, counted above it, and sent when one comes. All
methods may be called on any thread, but not in an audio callback with a deadline: Python's own locks may make it
late. Use the C library there.
"""

from tonewerk.reporting.client import Client
from tonewerk.reporting.payload import Payload, Value
from tonewerk.reporting.session import Playing, RecordingInput, Session
from tonewerk.reporting.vocabulary import (
    Category,
    ClientInfo,
    ClosedError,
    Domain,
    ForkedError,
    NotConnectedError,
    QueueFullError,
    RefusedError,
    ReportingError,
    Service,
    State,
    Type,
    WouldWaitError,
)

__all__ = [
    "Category",
    "Client",
    "ClientInfo",
    "ClosedError",
    "Domain",
    "ForkedError",
    "NotConnectedError",
    "Payload",
    "Playing",
    "QueueFullError",
    "RecordingInput",
    "RefusedError",
    "ReportingError",
    "Service",
    "Session",
    "State",
    "Type",
    "Value",
    "WouldWaitError",
]
