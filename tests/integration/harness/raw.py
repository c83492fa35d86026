#!/usr/bin/python3
"""A program on the bus that keeps its socket while it becomes another program, or hands it on.

It speaks as the process that has opened the connection, or over the descriptor that --fd names. It obeys one line of JSON
at a time, {action: arguments}, and prints one line for each:

    call       [interface, method, arguments]    the values or the error's name
    exec       [program, …]                      becomes that program, with this one's --fd behind its arguments
    spawn      [program, …]                      has that program speak in its place
    hang       folder                            goes to a root in which the marker of a sandbox never answers
"""

import ctypes
import json
import os
import socket
import subprocess
import sys

from gi.repository import Gio, GLib

NO_CAPABILITIES = Gio.DBusCapabilityFlags.NONE
CLONE_NEWNS = 0x00020000
MS_REC_PRIVATE = 0x4000 | 0x40000


class RawBus:
    def __init__(self, descriptor=None):
        self.serial = 0 if descriptor is None else 1000
        if descriptor is not None:
            self.socket = socket.socket(fileno=descriptor)
            return
        path = os.environ["DBUS_SESSION_BUS_ADDRESS"].removeprefix("unix:path=").split(",")[0]
        self.socket = socket.socket(socket.AF_UNIX)
        self.socket.connect(path)
        self.socket.sendall(b"\0AUTH EXTERNAL " + str(os.geteuid()).encode().hex().encode() + b"\r\n")
        assert self.socket.recv(1000).startswith(b"OK")
        self.socket.sendall(b"BEGIN\r\n")
        self.call("org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus", "Hello", None)

    def receive(self, size):
        data = b""
        while len(data) < size:
            chunk = self.socket.recv(size - len(data))
            if not chunk:
                raise EOFError
            data += chunk
        return data

    def message(self):
        head = self.receive(16)
        rest = self.receive(Gio.DBusMessage.bytes_needed(head) - 16)
        return Gio.DBusMessage.new_from_blob(head + rest, NO_CAPABILITIES)

    def send(self, destination, path, interface, method, body):
        message = Gio.DBusMessage.new_method_call(destination, path, interface, method)
        if body is not None:
            message.set_body(body)
        self.serial += 1
        message.set_serial(self.serial)
        self.socket.sendall(message.to_blob(NO_CAPABILITIES))

    def call(self, *arguments):
        self.send(*arguments)
        while True:
            answer = self.message()
            if answer.get_reply_serial() == self.serial:
                return answer


def call_rvd(bus, interface, method, text):
    body = GLib.Variant.parse(None, text, None, None) if text else None
    answer = bus.call("com.zentor.rvd", "/com/zentor/rvd", interface, method, body)
    if answer.get_message_type() == Gio.DBusMessageType.ERROR:
        return {"error": answer.get_error_name()}
    return {"values": answer.get_body().unpack() if answer.get_body() else []}


def check(result):
    if result != 0:
        error = ctypes.get_errno()
        raise OSError(error, os.strerror(error))


def hang(folder):
    """Changes to a root whose /.flatpak-info lies on a file system that nobody serves."""
    libc = ctypes.CDLL(None, use_errno=True)
    check(libc.unshare(CLONE_NEWNS))
    check(libc.mount(b"none", b"/", None, MS_REC_PRIVATE, None))
    marker = os.path.join(folder, ".flatpak-info")
    with open(marker, "w", encoding="utf-8"):
        pass
    unserved = os.open("/dev/fuse", os.O_RDWR)
    options = f"fd={unserved},rootmode=100644,user_id={os.geteuid()},group_id={os.getegid()}"
    check(libc.mount(b"unserved", marker.encode(), b"fuse", 0, options.encode()))
    os.chroot(folder)


def main():
    descriptor = int(sys.argv[2]) if sys.argv[1:2] == ["--fd"] else None
    bus = RawBus(descriptor)
    number = bus.socket.fileno()
    os.set_inheritable(number, True)
    print(json.dumps({"ready": os.getpid()}), flush=True)
    for line in sys.stdin:
        ((action, arguments),) = json.loads(line).items()
        if action == "exec":
            os.execvp(arguments[0], [*arguments, "--fd", str(number)])
        if action == "spawn":
            sys.exit(subprocess.run([*arguments, "--fd", str(number)], pass_fds=(number,), check=False).returncode)
        if action == "hang":
            hang(arguments)
            result = {"hangs": True}
        else:
            result = call_rvd(bus, *arguments)
        print(json.dumps(result), flush=True)


main()
