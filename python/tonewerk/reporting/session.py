# SPDX-License-Identifier: Apache-2.0
"""Sessions, and what their audio does."""

import concurrent.futures
import contextlib
import dataclasses
import math
import threading
import types
from time import monotonic as _monotonic
from typing import TYPE_CHECKING, Any, Dict, Optional, Type as ClassOf, TypeVar

from tonewerk.reporting.payload import Payload, check_integer, check_text, checked_map
from tonewerk.reporting.vocabulary import Category, ClosedError, Type

if TYPE_CHECKING:
    from tonewerk.reporting.client import Client

MOST_TEXT_BYTES = 256

Self = TypeVar("Self", bound="_AudioUse")


@dataclasses.dataclass
class SessionState:
    """What a session is, as its program wants it or as the daemon was told."""

    exists: bool = False
    service: Optional[int] = None
    configuration: Dict[str, Any] = dataclasses.field(default_factory=dict)
    is_started: bool = False


def _text(text: str, what: str) -> str:
    if not check_text(text, what):
        raise ValueError(f"{what} must not be empty")
    if len(text.encode()) > MOST_TEXT_BYTES:
        raise ValueError(f"{what} must have at most {MOST_TEXT_BYTES} bytes")
    return text


def _volume(volume: float) -> float:
    if isinstance(volume, bool) or not isinstance(volume, (int, float)):
        raise TypeError(f"volume must be a number, not {type(volume).__name__}")
    if not 0 <= volume <= 1:
        raise ValueError("volume must be from 0 to 1")
    return float(volume)


class Session:
    """One use of audio. `Client.session` makes it. As a context manager it starts, and stops at the end.

    After a restart of the daemon the client makes the session again, with its service and configuration, and starts
    it if it was started. What `device`, `format` and the others have said is not said again.

    Methods that send a message return whether there was room for it. A message without room is dropped; the next
    one has the number of those dropped before it.
    """

    def __init__(self, client: "Client", reporter_id: int) -> None:
        self._client = client
        self._id = reporter_id
        self._is_closed = False
        # The client's lock guards the following.
        self.wanted = SessionState()
        self.told = SessionState()  # what is in the queue included
        self.sent = SessionState()
        self.run: Optional["concurrent.futures.Future[None]"] = None  # of the present or last start
        self.sent_run: Optional["concurrent.futures.Future[None]"] = None
        self.lost = 0  # messages since the last one that had room
        # What runs, and since when: the time of the first of the two.
        self._activity = threading.Lock()
        self._running: Dict[str, bool] = {}
        self._since = 0.0

    @property
    def id(self) -> int:
        """The session's identifier."""
        return self._id

    # ---- its life ----

    def set_service(self, service: int) -> None:
        """Changes the service. A session that is started stops."""
        self._client.set_service(self._open(), check_integer(service, "service", 0, 65535))

    def configure(self, configuration: Payload) -> None:
        """Merges this into the configuration. `HostApplicationDisplayID` names the application in the reports."""
        self._client.configure(self._open(), checked_map(configuration, "configuration"))

    def start(self) -> "concurrent.futures.Future[None]":
        """Starts the session. The result is there when it has stopped, so do not wait for it before."""
        return self._client.start(self._open())

    def stop(self) -> None:
        """Stops what plays and records, and the session. The daemon then makes its summaries."""
        self._open()
        self._end_activity()
        self._client.stop(self)

    def close(self) -> None:
        """Stops the session and destroys it. May be called again."""
        if self._is_closed or self._client.is_forked:
            return
        self._end_activity()
        self._is_closed = True
        self._client.destroy(self)

    def send(self, category: int, type: int, payload: Payload) -> bool:
        """Sends a message. It gets the present time, unless it has a "twreporting_timestamp"."""
        return self._client.send_to(self._open(), category, type, payload)

    def __enter__(self) -> "Session":
        self.start()
        return self

    def __exit__(
        self,
        kind: Optional[ClassOf[BaseException]],
        problem: Optional[BaseException],
        trace: Optional[types.TracebackType],
    ) -> None:
        self.close()

    # ---- what its audio does ----

    def playing(self, volume: float) -> "Playing":
        """The session begins to play, at this volume from 0 to 1; 1 for a program without a volume of its own."""
        self.volume(volume)
        return Playing(self)

    def recording(self) -> "RecordingInput":
        """The session begins to record. It may play at the same time."""
        return RecordingInput(self)

    def volume(self, volume: float) -> bool:
        """The volume is now this, from 0 to 1. While it plays, another volume begins another summary."""
        return self.send(Category.VOLUME, Type.STATE, {"QMSessionVolume": _volume(volume)})

    def device(self, device: str) -> bool:
        """The devices are now these, in one text, as "Speaker"."""
        return self.send(Category.ROUTE_CHANGE, Type.STATE, {"active_devices": _text(device, "device")})

    def route(self, device: str, reason: str) -> bool:
        """The same with the reason for the change, as "headphones unplugged"."""
        payload = {"active_devices": _text(device, "device"), "reason": _text(reason, "reason")}
        return self.send(Category.ROUTE_CHANGE, Type.STATE, payload)

    def format(self, sample_rate: int, channels: int, coding: str) -> bool:
        """The format is now this: sample rate in Hz, number of channels, and coding, as "lpcm"."""
        check_integer(sample_rate, "sample_rate", 1, 2**32 - 1)
        check_integer(channels, "channels", 1, 2**32 - 1)
        payload: Dict[str, Any] = {
            "session_selected_format": f"{sample_rate} Hz, {channels} ch, {_text(coding, 'coding')}",
            "mFormatID": coding,
            "mChannelsPerFrame": channels,
        }
        return self.send(Category.SETUP, Type.STATE, payload)

    def overload(
        self,
        node: Optional[str] = None,
        silence_seconds: float = 0.0,
        buffer_frames: int = 0,
        io_cycle: int = 0,
    ) -> bool:
        """Data was not ready in time. The session's summary counts the calls. What is left out is not known."""
        payload: Dict[str, Any] = {"issue_type": "overload"}
        if node is not None:
            payload["node"] = _text(node, "node")
        if not 0 <= silence_seconds < math.inf:
            raise ValueError("silence_seconds must be at least 0")
        if silence_seconds > 0:
            payload["any_channel_silence_seconds"] = float(silence_seconds)
        if check_integer(buffer_frames, "buffer_frames", 0, 2**32 - 1):
            payload["smallest_buffer_frame_size"] = buffer_frames
        if check_integer(io_cycle, "io_cycle", 0, 2**64 - 1):
            payload["io_cycle"] = io_cycle
        return self.send(Category.IO, Type.ERROR, payload)

    # ---- inside ----

    def _open(self) -> "Session":
        self._client.check_process()
        if self._is_closed:
            raise ClosedError("the session is closed")
        return self

    def begin_use(self, key: str, category: int) -> bool:
        """Begins to play or record. Returns whether the message had room."""
        self._open()
        with self._activity:
            if not self.send(category, Type.STATE, {key: True}):
                return False
            if not self._running:
                self._since = _monotonic()
            self._running[key] = True
            return True

    def end_use(self, key: str, category: int) -> bool:
        """Ends it. Does nothing when it does not run. Returns whether the message had room."""
        self._open()
        with self._activity:
            if key not in self._running:
                return True
            payload: Dict[str, Any] = {key: False}
            # This key ends playing and recording alike, so it comes with the last end only.
            if len(self._running) == 1:
                payload["session_duration"] = _monotonic() - self._since
            if not self.send(category, Type.STATE, payload):
                return False
            del self._running[key]
            return True

    def _end_activity(self) -> None:
        with contextlib.suppress(ClosedError):  # the end of the client has ended it
            self.end_use(Playing.KEY, Playing.CATEGORY)
            self.end_use(RecordingInput.KEY, RecordingInput.CATEGORY)


class _AudioUse:
    """As a context manager, it stops at the end."""

    KEY = ""
    CATEGORY = 0

    def __init__(self, session: Session) -> None:
        self._session = session
        self._has_begun = session.begin_use(self.KEY, self.CATEGORY)

    def stop(self) -> bool:
        """Ends it. Returns whether there was room to say so; if not, the session's end tries again.

        Does nothing when its session or client is closed already.
        """
        if self._has_begun:
            with contextlib.suppress(ClosedError):
                self._has_begun = not self._session.end_use(self.KEY, self.CATEGORY)
        return not self._has_begun

    def __bool__(self) -> bool:
        """Whether it has begun: false when the message had no room, and after stop()."""
        return self._has_begun

    def __enter__(self: Self) -> Self:
        return self

    def __exit__(
        self,
        kind: Optional[ClassOf[BaseException]],
        problem: Optional[BaseException],
        trace: Optional[types.TracebackType],
    ) -> None:
        if not self._session._client.is_forked:  # as the ends of sessions and clients
            self.stop()


class Playing(_AudioUse):
    """A session plays. `Session.playing` makes it."""

    KEY = "session_output_running"
    CATEGORY = Category.PLAYBACK

    def volume(self, volume: float) -> bool:
        """As `Session.volume`."""
        return self._session.volume(volume)


class RecordingInput(_AudioUse):
    """A session records. `Session.recording` makes it."""

    KEY = "session_input_running"
    CATEGORY = Category.RECORD
