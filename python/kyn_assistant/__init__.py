"""Kyn location sharing for voice assistants written in Python.

A thin layer over the C interface of the kyn-assistant plug-in (libkyn-assistant.so), with ctypes
and the standard library only. Every command is answered exactly once, with the plug-in's reply
dictionary::

    from kyn_assistant import Plugin

    with Plugin(language="en-US") as kyn:
        reply = kyn.search(friends=["Ada"], here=(45.5231, -122.6765))
        for location in reply.get("kynLocations", []):
            print(kyn.describe(location)["name"])

Each command has a blocking form (``search``) and an ``asyncio`` form (``search_async``). The
plug-in's log goes to the ``logging`` logger "kyn_assistant".
"""

from __future__ import annotations

import asyncio
import ctypes
import itertools
import json
import logging
import os
import threading
from typing import Any, Iterable, Mapping, Optional, Sequence, Tuple, Union

__all__ = ["Plugin", "KynError", "ON_ARRIVAL", "ON_DEPARTURE", "IMMEDIATE", "NOTIFY_ME", "NOTIFY_OTHERS"]

# The assistant's geofence values.
ON_ARRIVAL = "OnArrival"
ON_DEPARTURE = "OnDeparture"
IMMEDIATE = "Immediate"
NOTIFY_ME = "Me"
NOTIFY_OTHERS = "Others"

_LOG = logging.getLogger("kyn_assistant")
_LEVELS = {0: logging.DEBUG, 1: logging.INFO, 2: logging.INFO, 3: logging.ERROR}

_REPLY = ctypes.CFUNCTYPE(None, ctypes.c_char_p, ctypes.c_void_p)
_LOGLINE = ctypes.CFUNCTYPE(None, ctypes.c_int, ctypes.c_char_p, ctypes.c_void_p)

Friend = Union[str, Mapping[str, Any]]
Coordinate = Union[Tuple[float, float], Tuple[float, float, float]]


class KynError(Exception):
    """The plug-in cannot be loaded or configured, a command cannot be given, or no reply came."""


def _default_library() -> str:
    explicit = os.environ.get("KYN_PLUGIN")
    if explicit:
        return explicit
    try:  # written by the install: where the plug-in lies, seen from this module
        from . import _installed  # type: ignore

        candidate = os.path.normpath(os.path.join(os.path.dirname(__file__), _installed.PLUGIN_FROM_MODULE))
        if os.path.exists(candidate):
            return candidate
    except ImportError:
        pass
    return "libkyn-assistant.so.0"


def _location(coordinate: Optional[Coordinate], label: Optional[str] = None) -> Optional[dict]:
    if coordinate is None and label is None:
        return None
    location: dict = {"class": "AXLocation"}
    if label is not None:
        location["label"] = label
    if coordinate is not None:
        if len(coordinate) not in (2, 3):
            raise ValueError("a coordinate is (latitude, longitude) or (latitude, longitude, accuracy)")
        location["latitude"], location["longitude"] = float(coordinate[0]), float(coordinate[1])
        if len(coordinate) == 3:
            location["accuracy"] = float(coordinate[2])
    return location


class Plugin:
    """The plug-in, loaded into this process.

    ``config_dir`` is the configuration directory (None: $XDG_CONFIG_HOME/kyn-assistant);
    ``language`` the assistant's language as a BCP 47 tag (None: config.json's, else the
    system's); ``library`` the plug-in's path (None: $KYN_PLUGIN, else the installed one).
    """

    def __init__(self, config_dir: Optional[str] = None, language: Optional[str] = None,
                 library: Optional[str] = None, timeout: float = 60.0) -> None:
        path = library or _default_library()
        try:
            self._lib = ctypes.CDLL(path)
        except OSError as error:
            raise KynError(f"cannot load the plug-in {path}: {error}") from error
        self._declare()
        self.timeout = timeout
        self._lock = threading.Lock()
        self._pending: dict = {}
        self._ids = itertools.count(1)
        self._closed = False
        # Kept alive as long as the plug-in may call them.
        self._reply_callback = _REPLY(self._on_reply)
        self._log_callback = _LOGLINE(self._on_log)
        self.set_log_level(_LOG.getEffectiveLevel())
        self._lib.kyn_plugin_set_log_callback(ctypes.cast(self._log_callback, ctypes.c_void_p), None)
        if self._lib.kyn_plugin_configure(_bytes(config_dir), _bytes(language)) != 0:
            self._lib.kyn_plugin_set_log_callback(None, None)
            raise KynError(f"the configuration directory {config_dir} does not exist")

    def _declare(self) -> None:
        lib = self._lib
        lib.kyn_plugin_version.restype = ctypes.c_char_p
        lib.kyn_plugin_configure.argtypes = [ctypes.c_char_p, ctypes.c_char_p]
        lib.kyn_plugin_configure.restype = ctypes.c_int
        lib.kyn_plugin_set_log_level.argtypes = [ctypes.c_char_p]
        lib.kyn_plugin_set_log_callback.argtypes = [ctypes.c_void_p, ctypes.c_void_p]
        lib.kyn_plugin_perform.argtypes = [ctypes.c_char_p, _REPLY, ctypes.c_void_p]
        lib.kyn_plugin_perform.restype = ctypes.c_int
        for name in ("kyn_plugin_language", "kyn_plugin_describe_location", "kyn_plugin_find_people",
                     "kyn_plugin_find_person"):
            getattr(lib, name).restype = ctypes.c_void_p  # freed with kyn_plugin_free
        lib.kyn_plugin_language.argtypes = []
        lib.kyn_plugin_describe_location.argtypes = [ctypes.c_char_p, ctypes.c_int, ctypes.c_char_p]
        lib.kyn_plugin_friend_picture.restype = ctypes.c_void_p  # freed with kyn_plugin_free
        lib.kyn_plugin_friend_picture.argtypes = [ctypes.c_char_p, ctypes.POINTER(ctypes.c_size_t),
                                                  ctypes.POINTER(ctypes.c_int), ctypes.POINTER(ctypes.c_int)]
        lib.kyn_plugin_find_people.argtypes = [ctypes.c_char_p]
        lib.kyn_plugin_find_person.argtypes = [ctypes.c_char_p]
        lib.kyn_plugin_free.argtypes = [ctypes.c_void_p]
        lib.kyn_plugin_sign_in.argtypes = [ctypes.c_char_p] * 4
        lib.kyn_plugin_sign_in.restype = ctypes.c_int
        lib.kyn_plugin_account.restype = ctypes.c_void_p
        lib.kyn_plugin_account.argtypes = []
        lib.kyn_plugin_sign_out.restype = ctypes.c_int
        lib.kyn_plugin_shutdown.argtypes = []

    # ---- life ----

    def close(self) -> None:
        """Answers every command in flight (as failed) and stops the plug-in's network thread."""
        if self._closed:
            return
        self._closed = True
        self._lib.kyn_plugin_shutdown()
        self._lib.kyn_plugin_set_log_callback(None, None)

    def __enter__(self) -> "Plugin":
        return self

    def __exit__(self, *exc: object) -> None:
        self.close()

    def set_log_level(self, level: int) -> None:
        """The lowest ``logging`` level of the plug-in's lines that reach the "kyn_assistant" logger
        (taken from the logger's level when the plug-in is loaded)."""
        word = (b"debug" if level <= logging.DEBUG else b"info" if level <= logging.INFO
                else b"error" if level <= logging.ERROR else b"off")
        self._lib.kyn_plugin_set_log_level(word)

    @property
    def version(self) -> str:
        return self._lib.kyn_plugin_version().decode()

    @property
    def language(self) -> str:
        """The assistant's language in effect."""
        return self._take(self._lib.kyn_plugin_language()) or ""

    # ---- account ----

    _SIGN_IN_PROBLEMS = {1: "the person id", 2: "the user name", 3: "the host (HOST or HOST:PORT)", 4: "the token"}

    def sign_in(self, person_id: str, username: str, host: str, token: str) -> None:
        """Signs an account in (account.json and the owner-only token file). Wrong input raises
        ValueError and leaves the previous account as it was."""
        result = self._lib.kyn_plugin_sign_in(person_id.encode(), username.encode(), host.encode(), token.encode())
        if result in self._SIGN_IN_PROBLEMS:
            raise ValueError(f"{self._SIGN_IN_PROBLEMS[result]} cannot be stored; the account is unchanged")
        if result != 0:
            raise KynError("the account could not be written; the previous account is unchanged")

    def account(self) -> Optional[dict]:
        """The signed-in account without its token, or None."""
        text = self._take(self._lib.kyn_plugin_account())
        return json.loads(text) if text else None

    def sign_out(self) -> bool:
        """Signs out; False when no one was signed in."""
        return self._lib.kyn_plugin_sign_out() == 0

    # ---- commands ----

    def perform(self, command: Mapping[str, Any], timeout: Optional[float] = None) -> dict:
        """Performs an assistant command (a dictionary in the README's layout) and returns its reply."""
        done = threading.Event()
        box: dict = {}

        def deliver(reply: dict) -> None:
            box["reply"] = reply
            done.set()

        self._start(command, deliver)
        if not done.wait(self.timeout if timeout is None else timeout):
            raise KynError("no reply from the plug-in in time")
        return box["reply"]

    async def perform_async(self, command: Mapping[str, Any]) -> dict:
        """The ``asyncio`` form of ``perform``."""
        loop = asyncio.get_running_loop()
        future = loop.create_future()

        def deliver(reply: dict) -> None:
            loop.call_soon_threadsafe(lambda: future.done() or future.set_result(reply))

        self._start(command, deliver)
        return await asyncio.wait_for(future, self.timeout)

    def search_command(self, friends: Iterable[Friend] = (), here: Optional[Coordinate] = None,
                       place: Optional[str] = None, place_at: Optional[Coordinate] = None,
                       proximity: Optional[str] = None) -> dict:
        """Where are these friends (all of them when none is named), and are they at `place`?"""
        command: dict = {"class": "AXKynSearch", "friends": [self.person(f) for f in friends]}
        if here is not None:
            command["currentLocation"] = _location(here)
        requested = _location(place_at, place)
        if requested is not None:
            command["requestedLocation"] = requested
        if proximity is not None:
            command["proximity"] = proximity
        return command

    def search(self, *args: Any, **kwargs: Any) -> dict:
        return self.perform(self.search_command(*args, **kwargs))

    async def search_async(self, *args: Any, **kwargs: Any) -> dict:
        return await self.perform_async(self.search_command(*args, **kwargs))

    @staticmethod
    def visibility_command(visible: bool) -> dict:
        """Show (True) or hide (False) my location from my friends."""
        return {"class": "AXKynVisibilityStateSet", "visible": bool(visible)}

    def set_visibility(self, visible: bool) -> dict:
        return self.perform(self.visibility_command(visible))

    async def set_visibility_async(self, visible: bool) -> dict:
        return await self.perform_async(self.visibility_command(visible))

    def geofence_command(self, friend: Friend, trigger: str = ON_ARRIVAL, place: Optional[str] = None,
                         place_at: Optional[Coordinate] = None, address: Optional[Mapping[str, str]] = None,
                         once: bool = False, notify_them: bool = False, enable: bool = True) -> dict:
        """Tell me (or them) when `friend` arrives at, leaves or is now at a place.

        The place is a label, a coordinate, or an address: a mapping with any of "street",
        "thoroughfare", "city", "stateCode", "postalCode", "countryCode". Without any, the place is
        where the friend is now ("tell me when Ada leaves").
        """
        location = _location(place_at, place)
        if address:
            location = {**(location or {"class": "AXLocation"}), **address}
        command = {"class": "AXKynGeoFenceSet", "friend": self.person(friend)}
        if location is not None:
            command["requestedLocation"] = location
        command.update({"geoFenceTrigger": trigger, "oneTimeOnly": bool(once),
                        "fenceType": NOTIFY_OTHERS if notify_them else NOTIFY_ME, "enable": bool(enable)})
        return command

    def set_geofence(self, *args: Any, **kwargs: Any) -> dict:
        return self.perform(self.geofence_command(*args, **kwargs))

    async def set_geofence_async(self, *args: Any, **kwargs: Any) -> dict:
        return await self.perform_async(self.geofence_command(*args, **kwargs))

    # ---- people and presentation ----

    def find_people(self, name: str) -> list:
        """The people of the address book whose name holds `name`."""
        return json.loads(self._take(self._lib.kyn_plugin_find_people(name.encode())) or "[]")

    def find_person(self, handle: str) -> Optional[dict]:
        """The person of the address book who holds an e-mail address or phone number."""
        text = self._take(self._lib.kyn_plugin_find_person(handle.encode()))
        return json.loads(text) if text else None

    def person(self, friend: Friend) -> dict:
        """A friend as an assistant hands it to a command: a person dictionary as it is; an e-mail
        address or phone number completed from the address book; or the one person whose name holds
        the text (KynError when no one or several people match)."""
        if not isinstance(friend, str):
            return dict(friend)
        is_email = "@" in friend
        if is_email or (sum(c.isdigit() for c in friend) >= 3 and all(c.isdigit() or c in "+()-. /" for c in friend)):
            found = self.find_person(friend)
            if found:
                return found
            if is_email:
                return {"class": "AXPerson", "emails": [{"class": "AXEmail", "emailAddress": friend}]}
            return {"class": "AXPerson", "phones": [{"class": "AXPhone", "number": friend}]}
        people = self.find_people(friend)
        exact = [p for p in people if p.get("fullName", "").casefold() == friend.casefold()]
        if len(people) == 1 or len(exact) == 1:
            return people[0] if len(people) == 1 else exact[0]
        if not people:
            raise KynError(f'no one named "{friend}" in the address book')
        raise KynError(f'"{friend}" could mean several people: ' + ", ".join(p.get("fullName", "?") for p in people))

    def describe(self, location: Mapping[str, Any], located: bool = True, here: Optional[Coordinate] = None) -> dict:
        """A friend location of a search reply for display, in the assistant's language: its
        "name", "handle", "place", "age", "spokenAge", "time" and, given where the user is, "distance"
        (absent members left out)."""
        current = None if here is None else json.dumps(_location(here)).encode()
        text = self._take(self._lib.kyn_plugin_describe_location(json.dumps(location).encode(), int(located), current))
        return json.loads(text) if text else {}

    def picture(self, location: Mapping[str, Any]) -> Optional[Tuple[bytes, int, int]]:
        """The friend's contact picture as the address book stores it (JPEG, PNG, ...), with its width
        and height in pixels; None when the friend has none."""
        size, width, height = ctypes.c_size_t(), ctypes.c_int(), ctypes.c_int()
        pointer = self._lib.kyn_plugin_friend_picture(json.dumps(location).encode(), ctypes.byref(size),
                                                       ctypes.byref(width), ctypes.byref(height))
        if not pointer:
            return None
        try:
            return ctypes.string_at(pointer, size.value), width.value, height.value
        finally:
            self._lib.kyn_plugin_free(pointer)

    # ---- plumbing ----

    def _start(self, command: Mapping[str, Any], deliver: Any) -> None:
        if self._closed:
            raise KynError("the plug-in is closed")
        with self._lock:
            ident = next(self._ids)
            self._pending[ident] = deliver
        if self._lib.kyn_plugin_perform(json.dumps(command).encode(), self._reply_callback, ident) != 0:
            with self._lock:
                self._pending.pop(ident, None)
            raise KynError("the plug-in refused the command")

    def _on_reply(self, reply_json: bytes, context: Optional[int]) -> None:
        with self._lock:
            deliver = self._pending.pop(context or 0, None)
        if deliver is None:  # the plug-in answers once; anything else is dropped
            return
        try:
            reply = json.loads(reply_json.decode())
        except ValueError:
            reply = {"class": "AXCommandFailed", "reason": "The reply is no JSON"}
        deliver(reply)

    def _on_log(self, level: int, message: bytes, _context: Optional[int]) -> None:
        _LOG.log(_LEVELS.get(level, logging.INFO), "%s", message.decode(errors="replace"))

    def _take(self, pointer: Optional[int]) -> Optional[str]:
        if not pointer:
            return None
        try:
            return ctypes.string_at(pointer).decode()
        finally:
            self._lib.kyn_plugin_free(pointer)


def _bytes(text: Optional[str]) -> Optional[bytes]:
    return None if text is None else text.encode()
