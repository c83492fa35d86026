#!/usr/bin/python3
"""A program that calls methods on the bus as it is told to, from wherever it was started: a sandbox, another
namespace, behind a proxy. It reads one call a line from standard input and prints one answer a line; in place of
an object's path "listen" and "heard" stand for hearing signals.

With --not-dumpable it keeps other programs of its user from looking at it first."""

import ctypes
import json
import os
import sys
import threading

from gi.repository import Gio, GLib

PR_SET_DUMPABLE = 4


def answer(number, values):
    with printing:
        print(json.dumps({"number": number, **values}), flush=True)


def call(bus, number, destination, path, interface, method, parameters):
    def finish(connection, result):
        try:
            reply, _ = connection.call_with_unix_fd_list_finish(result)
            answer(number, {"values": reply.unpack()})
        except GLib.Error as error:
            name = Gio.DBusError.get_remote_error(error) or f"{error.domain}.{error.code}"
            Gio.DBusError.strip_remote_error(error)
            answer(number, {"error": name, "message": error.message})

    variant = GLib.Variant.parse(None, parameters, None, None) if parameters else None
    handles = None
    if variant is not None and "h" in variant.get_type_string():
        handles = Gio.UnixFDList.new()
        null = os.open("/dev/null", os.O_RDONLY)
        handles.append(null)
        os.close(null)
    bus.call_with_unix_fd_list(
        destination, path, interface, method, variant, None, Gio.DBusCallFlags.NONE, GLib.MAXINT, handles, None, finish
    )


heard = []
waiting = []


def tell():
    while heard and waiting:
        answer(waiting.pop(0), {"values": [heard]})


def listen(bus, number, interface, member):
    """Answers when signals of that name are delivered from now on."""

    def hear(_bus, _sender, _path, _interface, _member, parameters):
        heard.append(parameters.unpack())
        tell()

    bus.signal_subscribe(None, interface, member, None, None, Gio.DBusSignalFlags.NONE, hear)
    call(bus, number, "org.freedesktop.DBus", "/org/freedesktop/DBus", "org.freedesktop.DBus", "GetId", None)


def wait(_bus, number, _interface, _member):
    waiting.append(number)
    tell()


def obey(bus, number, destination, path, interface, method, parameters):
    if path == "listen":
        listen(bus, number, interface, method)
    elif path == "heard":
        wait(bus, number, interface, method)
    else:
        call(bus, number, destination, path, interface, method, parameters)


def read_calls(bus, loop):
    for line in sys.stdin:
        arguments = json.loads(line)
        GLib.idle_add(lambda arguments=arguments: obey(bus, *arguments) or GLib.SOURCE_REMOVE)
    loop.quit()


printing = threading.Lock()
if "--not-dumpable" in sys.argv:
    ctypes.CDLL(None).prctl(PR_SET_DUMPABLE, 0)
connection = Gio.bus_get_sync(Gio.BusType.SESSION)
answer(0, {"name": connection.get_unique_name()})
main = GLib.MainLoop()
threading.Thread(target=read_calls, args=(connection, main), daemon=True).start()
main.run()
