"""A program that asks rvd for as much as it can, in every way it can, until its standard input is closed.

Arguments: the bus's address, and the ID to register as, or "" for a program that says nothing about itself. Prints how
many calls it made.
"""

import itertools
import os
import sys
import threading

sys.path.insert(0, os.path.dirname(os.path.dirname(os.path.abspath(__file__))))

from gi.repository import GLib  # noqa: E402
from harness.bus import ACCOUNTS, AGENT_MANAGER, MANAGEMENT, Connection  # noqa: E402

FACEBOOK = "com.zentor.facebook"


def request(permissions, app_id="4711"):
    options = {"app_id": GLib.Variant("s", app_id), "permissions": GLib.Variant("as", permissions)}
    return ACCOUNTS, "RequestAccess", GLib.Variant("(sa{sv}b)", (FACEBOOK, options, True))


def calls(number):
    """What is asked in one go; the last of them is answered at once, after all before it were read."""
    yield request(["email", "user_photos"], app_id=f"other {number}")
    yield request(["email"], app_id=str(number))
    yield request([f"name_{i}" for i in range(300)])
    yield request(["x" * 50_000])
    yield ACCOUNTS, "GetCredential", GLib.Variant("(s)", (FACEBOOK,))
    yield ACCOUNTS, "Register", GLib.Variant("(s)", (f"org.example.Not{number}",))
    yield MANAGEMENT, "GetPreference", GLib.Variant("(ss)", ("org.example", str(number)))
    yield AGENT_MANAGER, "UnregisterAgent", GLib.Variant("(o)", ("/none",))
    yield ACCOUNTS, "GetAccess", GLib.Variant("(s)", (FACEBOOK,))


def main():
    address, app_id = sys.argv[1:]
    stop = threading.Event()
    threading.Thread(target=lambda: (sys.stdin.read(), stop.set()), daemon=True).start()
    threading.Thread(target=GLib.MainLoop().run, daemon=True).start()
    made = 0
    numbers = itertools.count()
    while not stop.is_set():
        # A connection that leaves without waiting for its answers.
        connection = Connection(address)
        if app_id:
            connection.call(ACCOUNTS, "Register", GLib.Variant("(s)", (app_id,)))
        for number in itertools.islice(numbers, 50):
            pending = [connection.send(*call) for call in calls(number)]
            made += len(pending)
            pending[-1].result(60)
            if stop.is_set():
                break
        connection.close()
    print(made, flush=True)


main()
