# SPDX-License-Identifier: Apache-2.0
"""Checks payloads and packs frames."""

import datetime
import re
from typing import Any, Dict, List, Mapping, Optional, Sequence, Union

import msgpack

# Values that a payload may hold: also lists, tuples and mappings of them, whose keys are texts.
Value = Union[bool, int, float, str, datetime.datetime, Sequence[Any], Mapping[str, Any]]
Payload = Mapping[str, Value]

MOST_FRAME_BYTES = 1024 * 1024
MOST_DEPTH = 28

_REFUSED_CHARACTERS = re.compile(
    "[\ud800-\udfff\ufdd0-\ufdef" + "".join(chr(plane << 16 | low) for plane in range(17) for low in (0xFFFE, 0xFFFF)) + "]"
)


def check_text(text: str, what: str) -> str:
    """Returns `text` when the daemon accepts it."""
    if not isinstance(text, str):
        raise TypeError(f"{what} must be a str, not {type(text).__name__}")
    if _REFUSED_CHARACTERS.search(text):
        raise ValueError(f"{what} must not contain surrogates or noncharacters of Unicode")
    return text


def check_integer(number: int, what: str, least: int, most: int) -> int:
    """Returns `number` as an int when it is in its range."""
    if isinstance(number, bool) or not isinstance(number, int):
        raise TypeError(f"{what} must be an int, not {type(number).__name__}")
    if not least <= number <= most:
        raise ValueError(f"{what} must be from {least} to {most}")
    return int(number)


def checked(value: Any, what: str, depth: int = 0) -> Any:
    """Returns a copy of `value` that msgpack packs as the daemon expects it."""
    if isinstance(value, (bool, float)):
        return value
    if isinstance(value, int):
        return check_integer(value, what, -(2**63), 2**64 - 1)
    if isinstance(value, str):
        return check_text(value, what)
    if isinstance(value, datetime.datetime):
        if value.tzinfo is None:
            raise ValueError(f"{what} must be a time with a time zone")
        return value
    if depth > MOST_DEPTH:
        raise ValueError(f"{what} is nested deeper than {MOST_DEPTH} levels")
    if isinstance(value, Mapping):
        return checked_map(value, what, depth)
    if isinstance(value, (list, tuple)):
        return [checked(element, f"{what}[{place}]", depth + 1) for place, element in enumerate(value)]
    raise TypeError(f"{what} must not be a {type(value).__name__}")


def checked_map(payload: Payload, what: str, depth: int = 0) -> Dict[str, Any]:
    """Returns a checked copy of a payload."""
    if not isinstance(payload, Mapping):
        raise TypeError(f"{what} must be a mapping, not {type(payload).__name__}")
    return {check_text(key, f"a key of {what}"): checked(value, f"{what}[{key!r}]", depth + 1) for key, value in payload.items()}


def frame(method: str, parameters: List[Any], identifier: Optional[int] = None) -> bytes:
    """Packs a notification, or with an identifier a request."""
    head: List[Any] = [2] if identifier is None else [0, identifier]
    packed = msgpack.packb([*head, method, parameters], datetime=True)
    if len(packed) > MOST_FRAME_BYTES:
        raise ValueError(f"{method} has {len(packed)} bytes, more than the protocol's {MOST_FRAME_BYTES}")
    return bytes(packed)
