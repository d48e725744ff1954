#!/usr/bin/env python3
"""Reads the golden messages with GLib, which knows nothing of our codec, and holds them against the introspection files.

    read_golden_messages.py MESSAGES_FOLDER INTROSPECTION_FOLDER
"""
import pathlib
import re
import sys

from gi.repository import Gio, GLib

ROW = re.compile(r"^[0-9a-f]{4} ((?: [0-9a-f]{2})+)")


def messages_in(path):
    """Each message of a golden file as its title and bytes."""
    title, data = None, bytearray()
    for line in [*path.read_text(encoding="utf-8").splitlines(), ""]:
        row = ROW.match(line)
        if row:
            data += bytes.fromhex(row[1].replace(" ", ""))
        elif line and not line.startswith("and "):
            title = line
        elif not line and data:
            yield title, bytes(data)
            data = bytearray()


def parse(data):
    return Gio.DBusMessage.new_from_blob(data, Gio.DBusCapabilityFlags.UNIX_FD_PASSING)


def signature_of(arguments):
    return "".join(argument.signature for argument in arguments)


def body_signature(message):
    body = message.get_body()
    return body.get_type_string()[1:-1] if body else ""


def main(messages, introspection):
    interfaces = {}
    for path in sorted(pathlib.Path(introspection).glob("*.xml")):
        for interface in Gio.DBusNodeInfo.new_for_xml(path.read_text(encoding="utf-8")).interfaces:
            interfaces[interface.name] = interface
    calls = 0
    for name in ("requests", "callbacks"):
        for title, data in messages_in(pathlib.Path(messages) / f"{name}.txt"):
            message = parse(data)
            method = interfaces[message.get_interface()].lookup_method(message.get_member())
            assert method, f"{title}: no method {message.get_member()}"
            assert message.get_path() == "/com/quillon/kelvod", title
            assert body_signature(message) == signature_of(method.in_args), title
            calls += 1
    requests = interfaces["com.quillon.KelvoKit.KVDaemonProtocol"]
    replies = 0
    for title, data in messages_in(pathlib.Path(messages) / "replies.txt"):
        message = parse(data)
        assert message.get_message_type() == Gio.DBusMessageType.METHOD_RETURN, title
        assert body_signature(message) == signature_of(requests.lookup_method(title).out_args), title
        replies += 1
    others = 0
    for name in ("standard_answers", "failed_reply", "frame_given_back"):
        for title, data in messages_in(pathlib.Path(messages) / f"{name}.txt"):
            try:
                parse(data)
            except GLib.Error as error:
                sys.exit(f"{title}: {error.message}")
            others += 1
    print(f"{calls} calls, {replies} replies and {others} other messages read")
    return 0 if calls >= 29 and replies >= 10 and others >= 8 else 1


if __name__ == "__main__":
    sys.exit(main(*sys.argv[1:]))
