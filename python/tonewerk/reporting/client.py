# SPDX-License-Identifier: Apache-2.0
"""The connection to the daemon, and the thread that sends."""

import atexit
import collections
import concurrent.futures
import copy
import dataclasses
import errno
import logging
import os
import random
import secrets
import select
import socket
import threading
import time
import types
import weakref
from typing import Any, Callable, Deque, Dict, List, Optional, Sequence, Tuple, Type as ClassOf

import msgpack

from tonewerk.reporting.payload import MOST_FRAME_BYTES, Payload, check_integer, checked, checked_map, frame
from tonewerk.reporting.session import Session, SessionState
from tonewerk.reporting.vocabulary import (
    Category,
    ClientInfo,
    ClosedError,
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

Future = concurrent.futures.Future

_LOG = logging.getLogger("tonewerk.reporting")

_MOST_SESSIONS = 4096
_BATCH_BYTES = 65536
_COMMAND_BYTES = 256  # what a waiting request takes besides its frame
_FIRST_DELAY = 0.25  # between attempts to connect, in seconds
_MOST_DELAY = 30.0
_SETTLED_SECONDS = 5.0  # a connection that lasted so long was a good one
_CONNECT_SECONDS = 5.0  # the most for one attempt


@dataclasses.dataclass(eq=False)
class _Command:
    """A frame that waits to be sent."""

    method: str
    parameters: List[Any]
    packed: bytes = b""  # of a message, which needs no identifier
    size: int = 0  # counts for the limit of the queue
    is_message: bool = False
    future: Optional["Future[Any]"] = None
    may_be_held: bool = False  # the daemon may answer late or never
    session: Optional[Session] = None
    change: Optional[Callable[[SessionState], None]] = None  # of what the daemon knows of the session


@dataclasses.dataclass
class _Pending:
    future: "Future[Any]"
    may_be_held: bool


def _socket_paths() -> List[str]:
    """Returns where the daemon may listen, in the order in which to try."""
    chosen = os.environ.get("TONEWERK_REPORTING_SOCKET")
    if chosen:
        return [chosen]
    user = os.geteuid()
    system = "/run/tonewerk"
    own = system if user == 0 else f"/run/user/{user}/tonewerk"
    base = os.environ.get("XDG_RUNTIME_DIR", "")
    if base.startswith("/"):
        own = f"{base}/tonewerk"
    own = os.environ.get("RUNTIME_DIRECTORY", "").split(":")[0] or own
    return [f"{directory}/reporting.sock" for directory in dict.fromkeys([own, system])]


class Client:
    """A connection to the daemon, opened when it is first needed, and again whenever it breaks.

    `socket_path`: the daemon's socket; by default $TONEWERK_REPORTING_SOCKET, or else the user's own daemon's and
    then the system's. `queue_bytes`: the most bytes that wait for the daemon. `once`: tries to connect only once,
    which suits tools. `state_changed` is called on the client's thread with each new state; it must not wait.

    As a context manager it is closed at the end. A program that ends without closing it waits for up to a second
    for what is queued.
    """

    def __init__(
        self,
        socket_path: Optional[str] = None,
        queue_bytes: int = 256 * 1024,
        once: bool = False,
        state_changed: Optional[Callable[[State], None]] = None,
    ) -> None:
        self._paths = [os.fspath(socket_path)] if socket_path else _socket_paths()
        self._most_bytes = check_integer(queue_bytes, "queue_bytes", 1, 2**40)
        self._is_once = once
        self._state_changed = state_changed
        self._process = os.getpid()
        self._changed = threading.Condition()
        self._thread: Optional[threading.Thread] = None
        self._wake_reader, self._wake_writer = socket.socketpair()
        self._wake_reader.setblocking(False)
        self._wake_writer.setblocking(False)

        # The condition's lock guards the following.
        self._state = State.IDLE
        self._states: Deque[State] = collections.deque()  # to be told
        self._queue: Deque[_Command] = collections.deque()
        self._sending: Deque[Tuple[_Command, int]] = collections.deque()  # and where in the connection's bytes it ends
        self._bytes = 0
        self._sessions: Dict[int, Session] = {}
        self._told_sessions: Dict[int, Session] = {}  # that the daemon was told of
        self._behind: Dict[int, Session] = {}  # had no room for a change: it is made when the queue is empty
        self._pending: Dict[int, _Pending] = {}
        self._identifier = 0
        self._queued_commands = 0
        self._sent_commands = 0
        self._failures = 0  # attempts to connect
        self._next_attempt = 0.0
        self._is_closing = False
        self._end_by = 0.0
        self._last_error = 0
        self._path = ""
        self._connections = 0
        self._messages_sent = 0
        self._messages_dropped = 0

        # Only the thread uses these.
        self._socket: Optional[socket.socket] = None
        self._out = bytearray()
        self._packed_bytes = 0  # of this connection
        self._handed_bytes = 0
        self._unpacker = self._new_unpacker()
        self._delay = _FIRST_DELAY
        self._connected_at = 0.0
        self._has_answered = False
        self._has_ended_sending = False

        reference = weakref.ref(self)

        def close_at_exit() -> None:
            client = reference()
            if client is not None and not client.is_forked:
                client.close(1.0)

        self._close_at_exit = close_at_exit
        atexit.register(close_at_exit)

    # ---- sessions ----

    def session(
        self,
        service: int = Service.GENERIC,
        application: Optional[str] = None,
        reporter_id: Optional[int] = None,
    ) -> Session:
        """Makes a session. `application` is its name in the reports, as "org.example.Player".

        No other session may have the same `reporter_id`; by default it is random.
        """
        check_integer(service, "service", 0, 65535)
        if reporter_id is None:
            reporter_id = secrets.randbelow(2**62) | 2**62
        session = Session(self, check_integer(reporter_id, "reporter_id", -(2**63), 2**63 - 1))
        configuration = checked_map({} if application is None else {"HostApplicationDisplayID": application}, "configuration")
        with self._lock():
            self._begin()
            if reporter_id in self._sessions:
                raise ValueError(f"reporter_id {reporter_id} is used by another session of this client")
            if len(self._sessions) >= _MOST_SESSIONS:
                raise ReportingError(f"a client has at most {_MOST_SESSIONS} sessions")
            self._sessions[session.id] = session
            session.wanted = SessionState(True, int(service), configuration)
            self._tell(session)
        return session

    def set_service(self, session: Session, service: int) -> None:
        with self._lock():
            self._begin()
            if session.wanted.is_started and session.wanted.service != service:
                session.wanted.is_started = False
                self._tell(session)
            session.wanted.service = service
            self._tell(session)

    def configure(self, session: Session, configuration: Dict[str, Any]) -> None:
        with self._lock():
            self._begin()
            merged = {**session.wanted.configuration, **configuration}
            frame("setConfiguration", [merged, session.id])  # raises when it is too large
            session.wanted.configuration = merged
            self._tell(session)

    def start(self, session: Session) -> "Future[None]":
        with self._lock():
            self._begin()
            if session.run is None or session.run.done() or not session.wanted.is_started:
                session.run = self._new_future()
                if self._state == State.ENDED:
                    session.run.set_exception(NotConnectedError("not connected to the daemon"))
            session.wanted.is_started = True
            self._tell(session)
            return session.run

    def stop(self, session: Session) -> None:
        with self._lock():
            self._begin()
            session.wanted.is_started = False
            self._tell(session)

    def destroy(self, session: Session) -> None:
        if self.is_forked:
            return
        with self._lock():
            if self._is_closing:
                return
            session.wanted.is_started = False
            session.wanted.exists = False
            self._tell(session)

    def send_to(self, session: Session, category: int, type: int, payload: Payload) -> bool:
        message = self._message(payload)
        parameters = [message, *self._kind(category, type), [session.id]]
        with self._lock():
            self._begin()
            if session.lost:
                message["twreporting_dropped"] = session.lost
            if session.id in self._behind or not self._put_message(parameters, session):
                session.lost += 1
                self._messages_dropped += 1
                return False
            session.lost = 0
            return True

    # ---- requests about any session ----

    def send(self, category: int, type: int, payload: Payload, reporter_ids: Sequence[int] = ()) -> bool:
        """Sends a message to these sessions; without any, to all that are started or, if there is none, to the
        daemon's own session for single messages. Returns whether there was room."""
        identifiers = [check_integer(number, "reporter_id", -(2**63), 2**63 - 1) for number in reporter_ids]
        parameters = [self._message(payload), *self._kind(category, type), identifiers or None]
        with self._lock():
            self._begin()
            has_room = self._put_message(parameters)
            self._messages_dropped += 0 if has_room else 1
            return has_room

    def get_service(self, reporter_id: int) -> "Future[int]":
        """Asks for a session's service; 65535 when there is no such session."""
        return self._ask("getServiceNameForReporterID", [check_integer(reporter_id, "reporter_id", -(2**63), 2**63 - 1)])

    def validate(self, reporter_id: int) -> "Future[Dict[str, int]]":
        """Asks whether there is a session: its "reporterID", 0 when there is none, and its "serviceType"."""
        return self._ask("reporterIDValid", [check_integer(reporter_id, "reporter_id", -(2**63), 2**63 - 1)])

    def get_all_reporters(self) -> "Future[List[int]]":
        """Asks for the identifiers of all sessions."""
        return self._ask("getAllReporters", [])

    def request(self, method: str, parameters: Sequence[Any] = ()) -> "Future[Any]":
        """Calls any method of the protocol. None stands for a parameter that is left out."""
        given = [None if value is None else checked(value, f"parameter {place}") for place, value in enumerate(parameters, 1)]
        return self._ask(method, given, may_be_held=True)

    # ---- the connection ----

    def connect(self, timeout: float) -> bool:
        """Connects now. Returns whether it did within `timeout` seconds; False as soon as an attempt fails."""
        return self._await(timeout, lambda: self._state == State.CONNECTED)

    def flush(self, timeout: float) -> bool:
        """Waits until everything from before the call is sent. Returns whether it was within `timeout` seconds;
        False as soon as an attempt to connect fails."""
        with self._lock():
            wanted = self._queued_commands
        return self._await(timeout, lambda: self._sent_commands >= wanted and not self._behind)

    def close(self, timeout: float = 1.0) -> None:
        """Waits for up to `timeout` seconds until everything is sent and answered, and drops the rest.

        Without a daemon it does not wait. The daemon stops started sessions and reports them.
        """
        self.check_process()
        self._check_may_wait()
        with self._lock():
            if not self._is_closing:
                self._is_closing = True
                self._end_by = time.monotonic() + max(0.0, timeout)
            thread = self._thread
            if thread is None:
                self._set_state(State.ENDED)
        atexit.unregister(self._close_at_exit)
        if thread is not None:
            self._wake()
            thread.join()
        self._wake_reader.close()
        self._wake_writer.close()

    def info(self) -> ClientInfo:
        """The state and the counters."""
        with self._lock():
            return ClientInfo(
                self._state,
                self._last_error,
                self._path,
                self._connections,
                self._messages_sent,
                self._messages_dropped,
                self._bytes,
            )

    def __enter__(self) -> "Client":
        return self

    def __exit__(
        self,
        kind: Optional[ClassOf[BaseException]],
        problem: Optional[BaseException],
        trace: Optional[types.TracebackType],
    ) -> None:
        if not self.is_forked:  # a child that leaves the block may have another error, or an exit status
            self.close()

    # ---- inside, on the caller's thread ----

    @property
    def is_forked(self) -> bool:
        """Whether this is a copy in a forked child, which is of no use."""
        return self._process != os.getpid()

    def check_process(self) -> None:
        """Raises ForkedError in a forked child."""
        if self.is_forked:
            raise ForkedError("the client belongs to the parent process")

    def _lock(self) -> threading.Condition:
        """The lock; not for a forked child, where another thread's copy may hold it for ever."""
        self.check_process()
        return self._changed

    def _check_may_wait(self) -> None:
        if threading.current_thread() is self._thread:
            raise WouldWaitError("a callback must not wait")

    def _begin(self) -> None:
        """Prepares a request, with the lock held."""
        if self._is_closing:
            raise ClosedError("the client is closed")
        if self._thread is None:
            thread = threading.Thread(target=self._run, name="tonewerk-report", daemon=True)
            thread.start()
            self._thread = thread

    def _await(self, timeout: float, is_there: Callable[[], bool]) -> bool:
        self._check_may_wait()
        with self._lock():
            self._begin()
            failures = self._failures
            if self._state == State.WAITING:
                self._next_attempt = 0.0
            self._wake()
            self._changed.wait_for(
                lambda: is_there() or self._failures != failures or self._state == State.ENDED, max(0.0, timeout)
            )
            return is_there()

    def _ask(self, method: str, parameters: List[Any], may_be_held: bool = False) -> "Future[Any]":
        size = len(frame(method, parameters, 0)) + _COMMAND_BYTES
        future: "Future[Any]" = self._new_future()
        with self._lock():
            self._begin()
            if self._state == State.ENDED:
                raise NotConnectedError("not connected to the daemon")
            if self._bytes + size > self._most_bytes:
                raise QueueFullError("no room for the request")
            self._put(_Command(method, parameters, size=size, future=future, may_be_held=may_be_held))
        return future

    @staticmethod
    def _new_future() -> "Future[Any]":
        future: "Future[Any]" = Future()
        future.set_running_or_notify_cancel()  # it cannot be taken back
        return future

    @staticmethod
    def _kind(category: int, type: int) -> List[int]:
        return [check_integer(category, "category", 0, 2**32 - 1), check_integer(type, "type", 0, 65535)]

    @staticmethod
    def _message(payload: Payload) -> Dict[str, Any]:
        message = checked_map(payload, "payload")
        message.setdefault("twreporting_timestamp", time.time())
        return message

    def _put_message(self, parameters: List[Any], session: Optional[Session] = None) -> bool:
        packed = frame("sendMessage", parameters)
        size = len(packed) + _COMMAND_BYTES
        if self._state == State.ENDED or self._bytes + size > self._most_bytes:
            return False
        self._put(_Command("sendMessage", [], packed, size, is_message=True, session=session))
        return True

    def _put(self, command: _Command) -> None:
        if not self._queue:
            self._wake()
        self._queue.append(command)
        self._queued_commands += 1
        self._bytes += command.size

    def _put_loss(self, session: Session) -> None:
        """Says how many messages were lost, when no message follows."""
        message = self._message({"twreporting_dropped": session.lost})
        session.lost = 0
        packed = frame("sendMessage", [message, Category.GENERIC, Type.GENERIC, [session.id]])
        self._put(_Command("sendMessage", [], packed, len(packed) + _COMMAND_BYTES, is_message=True, session=session))

    def _tell(self, session: Session) -> None:
        """Queues what the daemon must be told of a session. Without room, it is told later, and only the result."""
        if session.id not in self._behind and self._bytes < self._most_bytes and self._state != State.ENDED:
            self._catch_up(session)
        elif session.wanted.exists or session.told.exists:
            self._behind[session.id] = session
        else:  # the daemon need not know that it was there
            self._behind.pop(session.id, None)
            self._sessions.pop(session.id, None)
            if session.run is not None and not session.run.done():
                session.run.set_exception(ClosedError("the session was closed before the daemon was told of it"))

    def _catch_up(self, session: Session) -> None:
        if session.lost and session.told.is_started and not session.wanted.is_started:
            self._put_loss(session)
        for command in self._changes(session):
            self._put(command)
        session.told = copy.deepcopy(session.wanted)
        if not session.wanted.exists:
            self._sessions.pop(session.id, None)

    def _changes(self, session: Session) -> List[_Command]:
        """Returns the requests that lead from what the daemon was or will be told to what the session is."""
        told, wanted = session.told, session.wanted
        if not wanted.exists:
            if not told.exists:
                return []
            stop = [self._stop_of(session)] if told.is_started else []
            return [*stop, self._change_of(session, "destroyReportingSession", [], exists=False)]
        commands = []
        is_started = told.is_started
        if not told.exists:
            commands.append(self._change_of(session, "createReportingSession", [], exists=True))
        if is_started and (not wanted.is_started or wanted.service != told.service):
            commands.append(self._stop_of(session))
            is_started = False
        if wanted.service != told.service:
            commands.append(self._change_of(session, "setServiceType", [wanted.service], service=wanted.service))
        if wanted.configuration != told.configuration:
            whole = dict(wanted.configuration)
            commands.append(self._change_of(session, "setConfiguration", [whole], configuration=whole))
        if wanted.is_started and not is_started:
            commands.append(self._start_of(session))
        return commands

    def _change_of(self, session: Session, method: str, parameters: List[Any], **change: Any) -> _Command:
        command = _Command(method, [*parameters, session.id], session=session, size=_COMMAND_BYTES)

        def apply(state: SessionState) -> None:
            for name, value in change.items():
                setattr(state, name, value)

        command.change = apply
        return command

    def _stop_of(self, session: Session) -> _Command:
        return self._change_of(session, "stopReportingSessionForID", [], is_started=False)

    def _start_of(self, session: Session) -> _Command:
        command = self._change_of(session, "startReportingSessionForID", [], is_started=True)
        command.future = session.run
        command.may_be_held = True
        return command

    def _wake(self) -> None:
        try:
            self._wake_writer.send(b"x")
        except (BlockingIOError, OSError):
            pass  # it is woken already, or has ended

    # ---- inside, on the client's thread ----

    def _run(self) -> None:
        try:
            while not self._is_done():
                self._tell_states()
                if self._socket is None:
                    self._attempt()
                else:
                    self._exchange(self._socket)
        except Exception:  # a defect; the program goes on without reports
            _LOG.exception("reporting has ended")
        finally:
            self._finish()

    def _is_done(self) -> bool:
        with self._changed:
            if self._state == State.ENDED:
                return True
            if not self._is_closing:
                return False
            has_nothing = not (self._queue or self._behind or self._sending)
            is_vain = self._socket is None and (has_nothing or self._state == State.WAITING)
            return is_vain or time.monotonic() >= self._end_by

    def _seconds_left(self, most: float) -> float:
        """At most `most`, and not longer than the client's end may take. With the lock held."""
        return max(0.0, min(most, self._end_by - time.monotonic())) if self._is_closing else most

    def _attempt(self) -> None:
        with self._changed:
            delay = self._next_attempt - time.monotonic()
            if delay <= 0:
                self._set_state(State.CONNECTING)
            pause = self._seconds_left(max(0.0, delay))
            patience = max(0.01, self._seconds_left(_CONNECT_SECONDS))
        self._tell_states()
        if delay > 0:
            self._sleep(pause, None, False)
            return
        error = errno.ENOENT
        for path in self._paths:
            connection = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
            try:
                connection.settimeout(patience)
                connection.connect(path)
                connection.setblocking(False)
            except OSError as problem:
                connection.close()
                error = problem.errno or errno.ETIMEDOUT
                continue
            self._connected(connection, path)
            return
        with self._changed:
            self._wait_before_next(error)
            self._failures += 1

    def _connected(self, connection: socket.socket, path: str) -> None:
        self._socket = connection
        self._out = bytearray()
        self._packed_bytes = self._handed_bytes = 0
        self._unpacker = self._new_unpacker()
        self._connected_at = time.monotonic()
        self._has_answered = self._has_ended_sending = False
        with self._changed:
            self._connections += 1
            self._path = path
            for session in [*self._told_sessions.values()]:
                self._make_again(session)
            self._set_state(State.CONNECTED)

    def _make_again(self, session: Session) -> None:
        """Makes a session that the previous connection had."""
        known = session.sent
        self._pack("createReportingSession", [session.id])
        if known.service is not None:
            self._pack("setServiceType", [known.service, session.id])
        if known.configuration:
            self._pack("setConfiguration", [known.configuration, session.id])
        if known.is_started:
            self._pack("startReportingSessionForID", [session.id], session.sent_run, True)

    def _pack(
        self,
        method: str,
        parameters: List[Any],
        future: Optional["Future[Any]"] = None,
        may_be_held: bool = False,
        packed: bytes = b"",
    ) -> None:
        identifier = None
        if future is not None:
            self._identifier = identifier = (self._identifier + 1) % 2**32
            self._pending[identifier] = _Pending(future, may_be_held)
        packed = packed or frame(method, parameters, identifier)
        self._out += packed
        self._packed_bytes += len(packed)

    def _exchange(self, connection: socket.socket) -> None:
        with self._changed:
            while self._queue and len(self._out) < _BATCH_BYTES:
                command = self._queue.popleft()
                self._pack(command.method, command.parameters, command.future, command.may_be_held, command.packed)
                self._sending.append((command, self._packed_bytes))
            if not self._queue:
                for session in [*self._behind.values()]:
                    del self._behind[session.id]
                    self._tell(session)
            awaited = any(not pending.may_be_held for pending in self._pending.values())
            if self._is_closing and not (self._queue or self._out or awaited or self._has_ended_sending):
                self._has_ended_sending = True
                connection.shutdown(socket.SHUT_WR)
            pause = self._seconds_left(3600.0)
            wants_to_send = bool(self._out)
            if self._queue and not self._out:
                pause = 0.0
        if not self._sleep(pause, connection, wants_to_send):
            return
        try:
            if self._out:
                self._sent(connection.send(self._out))
        except BlockingIOError:
            pass
        except OSError as problem:
            self._lost_connection(problem.errno or errno.EPIPE)
            return
        self._receive(connection)

    def _sleep(self, seconds: float, connection: Optional[socket.socket], wants_to_send: bool) -> bool:
        """Waits for the daemon or a caller. Returns whether the connection may be ready."""
        poll = select.poll()
        poll.register(self._wake_reader, select.POLLIN)
        if connection is not None:
            poll.register(connection, select.POLLIN | (select.POLLOUT if wants_to_send else 0))
        ready = {descriptor for descriptor, _ in poll.poll(min(seconds, 3600.0) * 1000)}
        if self._wake_reader.fileno() in ready:
            try:
                self._wake_reader.recv(4096)
            except BlockingIOError:
                pass
        return connection is not None and connection.fileno() in ready

    def _sent(self, count: int) -> None:
        del self._out[:count]
        self._handed_bytes += count
        with self._changed:
            while self._sending and self._sending[0][1] <= self._handed_bytes:
                command, _ = self._sending.popleft()
                self._bytes -= command.size
                self._sent_commands += 1
                self._messages_sent += 1 if command.is_message else 0
                self._apply(command)
            self._changed.notify_all()

    def _apply(self, command: _Command) -> None:
        session = command.session
        if session is None or command.change is None:
            return
        command.change(session.sent)
        if command.future is not None:
            session.sent_run = command.future
        if session.sent.exists:
            self._told_sessions[session.id] = session
        elif self._told_sessions.get(session.id) is session:
            del self._told_sessions[session.id]

    def _receive(self, connection: socket.socket) -> None:
        try:
            received = connection.recv(65536)
        except BlockingIOError:
            return
        except OSError as problem:
            self._lost_connection(problem.errno or errno.ECONNRESET)
            return
        if not received:
            self._lost_connection(errno.ECONNRESET)
            return
        try:
            self._unpacker.feed(received)
            answers = [answer for answer in self._unpacker]
            for kind, identifier, error, result in answers:
                if kind != 1:
                    raise ValueError("not a response")
                self._answer(identifier, error, result)
        except (ValueError, TypeError, msgpack.exceptions.UnpackException) as problem:
            _LOG.error("the daemon's answer is not of the protocol: %s", problem)
            self._lost_connection(errno.EPROTO)

    def _answer(self, identifier: int, error: Any, result: Any) -> None:
        with self._changed:
            self._has_answered = True
            pending = self._pending.pop(identifier, None)
        if pending is None or pending.future.done():
            return
        if error is None:
            pending.future.set_result(result)
        elif isinstance(error, dict):
            domain, code = str(error.get("domain", "")), error.get("code", 0)
            message = str(error.get("message", ""))
            pending.future.set_exception(RefusedError(domain, code if isinstance(code, int) else 0, message))
        else:
            pending.future.set_exception(RefusedError("", 0, str(error)))

    def _lost_connection(self, error: int) -> None:
        if self._socket is not None:
            self._socket.close()
            self._socket = None
        if self._has_answered or time.monotonic() - self._connected_at >= _SETTLED_SECONDS:
            self._delay = _FIRST_DELAY
        unanswered = []
        with self._changed:
            # Frames of which the daemon cannot have everything are sent again.
            again = [command for command, _ in self._sending]
            self._queue.extendleft(reversed(again))
            self._sending.clear()
            kept = {id(command.future) for command in again if command.future is not None}
            kept |= {id(session.sent_run) for session in self._told_sessions.values() if session.sent.is_started}
            for pending in self._pending.values():
                if id(pending.future) not in kept:
                    unanswered.append(pending.future)
            self._pending.clear()
            if self._is_closing:
                self._set_state(State.ENDED)
            else:
                self._wait_before_next(error)
        for future in unanswered:
            if not future.done():
                future.set_exception(NotConnectedError("the connection ended before the answer came"))

    def _wait_before_next(self, error: int) -> None:
        self._last_error = error
        if self._is_once:
            self._set_state(State.ENDED)
            return
        self._next_attempt = time.monotonic() + self._delay * random.uniform(0.75, 1.25)
        self._delay = min(_MOST_DELAY, self._delay * 2)
        self._set_state(State.WAITING)

    def _set_state(self, state: State) -> None:
        if state != self._state:
            self._state = state
            self._states.append(state)
        self._changed.notify_all()

    def _tell_states(self) -> None:
        while True:
            with self._changed:
                if not self._states:
                    return
                state = self._states.popleft()
            if self._state_changed is None:
                continue
            try:
                self._state_changed(state)
            except Exception:  # the caller's; the client goes on
                _LOG.exception("state_changed has failed")

    def _finish(self) -> None:
        if self._socket is not None:
            self._socket.close()
            self._socket = None
        with self._changed:
            self._set_state(State.ENDED)
            sessions = {*self._sessions.values(), *self._told_sessions.values()}
            futures = [command.future for command in self._queue] + [command.future for command, _ in self._sending]
            futures += [pending.future for pending in self._pending.values()]
            futures += [run for session in sessions for run in (session.run, session.sent_run)]
            self._queue.clear()
            self._sending.clear()
            self._pending.clear()
            self._bytes = 0
            problem = ClosedError if self._is_closing else NotConnectedError
        self._tell_states()
        for future in futures:
            if future is not None and not future.done():
                future.set_exception(problem("the client has ended before the answer came"))

    @staticmethod
    def _new_unpacker() -> Any:
        return msgpack.Unpacker(raw=False, timestamp=3, strict_map_key=False, max_buffer_size=2 * MOST_FRAME_BYTES)
