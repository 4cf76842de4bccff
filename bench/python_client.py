#!/usr/bin/python3
"""The exchange as a user would script it without the plug-in: Debian's python3-requests posts the
plug-in's request to the server on a kept-alive session and decodes the answer into Python objects
of the same content as the plug-in's reply: names from the address book, place text, age.

Usage: python_client.py search|visibility|geofence REQUEST.json CA.pem CONTACTS_DIR
REQUEST.json holds "url", "headers" ("Name: value" lines), "username", "password" and "body".
Prints the mean time of one exchange in microseconds, over about two seconds of exchanges."""

import json
import pathlib
import sys
import time
from dataclasses import dataclass
from typing import Optional

import requests

SECONDS = 2.0


@dataclass
class FriendLocation:
    name: str
    handle: str
    place: str
    age_seconds: Optional[float]
    latitude: Optional[float]
    longitude: Optional[float]


@dataclass
class Fence:
    name: str
    handle: str
    place: str
    latitude: Optional[float]
    longitude: Optional[float]


def phone_key(number):
    return "".join(c for c in number if c.isdigit() or c == "+")


def read_contacts(folder):
    """Handle -> full name, from the vCards of the address book (read once, as the plug-in does)."""
    names = {}
    for path in sorted(pathlib.Path(folder).rglob("*.vcf")):
        text = path.read_text(encoding="utf-8", errors="replace").replace("\r\n ", "").replace("\n ", "")
        name, handles = None, []
        for line in text.splitlines():
            field, _, value = line.partition(":")
            kind = field.split(";")[0].upper()
            if kind == "FN":
                name = value
            elif kind == "EMAIL":
                handles.append(value.lower())
            elif kind == "TEL":
                handles.append(phone_key(value))
            elif kind == "END":
                for handle in handles:
                    names.setdefault(handle, name)
                name, handles = None, []
    return names


def name_for(contacts, handle):
    key = handle.lower() if "@" in handle else phone_key(handle)
    return contacts.get(key) or handle


def place_of(location):
    for label in location.get("labels") or []:
        if isinstance(label, dict) and label.get("label"):
            return label["label"]
    address = location.get("address") or {}
    city, state = address.get("locality"), address.get("stateCode")
    if city and state and city != state:
        return f"{city}, {state}"
    return city or state or "No location"


def friend_location(contacts, handle, entry, now):
    location = entry.get("location") or {}
    timestamp = location.get("timestamp")
    return FriendLocation(name_for(contacts, handle), handle, place_of(location),
                          now - timestamp / 1000.0 if isinstance(timestamp, (int, float)) else None,
                          location.get("latitude"), location.get("longitude"))


def decode_search(answer, contacts, request):
    now = time.time()
    return [friend_location(contacts, handle, entry, now)
            for handle, entry in (answer.get("locations") or {}).items()
            if isinstance(entry, dict) and entry.get("status") != 411]


def decode_visibility(answer, contacts, request):
    me = answer.get("myInfo") or {}
    handle = me.get("preferredEmail") or request["username"]
    return friend_location(contacts, handle, me, time.time())


def decode_geofence(answer, contacts, request):
    fence = answer.get("fence") or {}
    address = answer.get("fullAddress") or {}
    handles = fence.get("emails") or request["body"].get("emails") or [""]
    label = request["body"].get("label")
    return Fence(name_for(contacts, handles[-1]), handles[-1], label or address.get("streetAddress") or "",
                 fence.get("latitude"), fence.get("longitude"))


DECODERS = {"search": decode_search, "visibility": decode_visibility, "geofence": decode_geofence}


def main():
    kind, request_file, ca_file, contacts_dir = sys.argv[1:5]
    request = json.loads(pathlib.Path(request_file).read_text())
    decode = DECODERS[kind]
    contacts = read_contacts(contacts_dir)
    session = requests.Session()
    session.auth = (request["username"], request["password"])
    session.headers.update(dict(h.split(": ", 1) for h in request["headers"] if ": " in h))

    def exchange():
        # verify given here: the session's would yield to REQUESTS_CA_BUNDLE from the environment
        response = session.post(request["url"], data=json.dumps(request["body"]).encode(), verify=ca_file)
        response.raise_for_status()
        return decode(response.json(), contacts, request)

    exchange()  # connect once: the loop measures warm exchanges
    count, start = 0, time.perf_counter()
    while True:
        exchange()
        count += 1
        elapsed = time.perf_counter() - start
        if elapsed >= SECONDS:
            break
    print(f"{elapsed / count * 1e6:.1f}")


if __name__ == "__main__":
    main()
