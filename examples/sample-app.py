#!/usr/bin/python3
"""A sample application: asks for access to the user's Facebook account and uses the token that it gets.

Needs Debian's python3-gi. The application must be installed, that is, have a desktop entry with its ID."""

import argparse
import json
import sys
import urllib.error
import urllib.request

from gi.repository import Gio, GLib

FACEBOOK = "com.zentor.facebook"


class Rvd:
    """The accounts daemon, as an application sees it."""

    def __init__(self, application_id):
        self._bus = Gio.bus_get_sync(Gio.BusType.SESSION)
        try:
            self._call("Register", GLib.Variant("(s)", (application_id,)))
        except GLib.Error as error:
            # Known already: by the sandbox that it runs in, or by the unit that the session started.
            if Gio.DBusError.get_remote_error(error) != "com.zentor.rvd.Error.AlreadyIdentified":
                raise

    def _call(self, method, arguments):
        # Without a time-out: the answer comes when the user has answered.
        reply = self._bus.call_sync(
            "com.zentor.rvd", "/com/zentor/rvd", "com.zentor.rvd.Accounts1", method, arguments,
            None, Gio.DBusCallFlags.NONE, GLib.MAXINT, None,
        )  # fmt: skip
        return reply.unpack()

    def request_access(self, app_id, permissions, audience=None):
        """(granted, error): the error is empty where there is nothing more to say."""
        options = {"app_id": GLib.Variant("s", app_id), "permissions": GLib.Variant("as", permissions)}
        if audience:
            options["audience"] = GLib.Variant("s", audience)
        return self._call("RequestAccess", GLib.Variant("(sa{sv}b)", (FACEBOOK, options, True)))

    def token(self):
        (credential,) = self._call("GetCredential", GLib.Variant("(s)", (FACEBOOK,)))
        return credential["oauth_token"]


def permissions_of(server, token):
    """Uses the token: asks the server what it is good for. None where the server does not accept it."""
    request = urllib.request.Request(f"{server}/whoami", headers={"Authorization": f"Bearer {token}"})
    try:
        with urllib.request.urlopen(request) as reply:
            return json.load(reply)["permissions"]
    except urllib.error.HTTPError:
        return None


def use(server, token):
    permissions = permissions_of(server, token)
    if permissions is None:
        print("The server does not accept the token.", flush=True)
    else:
        print(f"The server accepts the token, for: {', '.join(permissions)}.", flush=True)


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--id", default="com.zentor.rvd.SampleApp", help="the application's ID")
    parser.add_argument("--app-id", default="4711", help="the ID that Facebook knows the application by")
    parser.add_argument("--audience", choices=["everyone", "friends", "only_me"], help="who may see what it posts")
    parser.add_argument("--server", help="the server with which the token is tried")
    parser.add_argument("--again", action="store_true", help="try the token once more when standard input ends")
    parser.add_argument("permissions", nargs="*", default=["email", "user_photos"])
    arguments = parser.parse_args()

    rvd = Rvd(arguments.id)
    granted, error = rvd.request_access(arguments.app_id, arguments.permissions, arguments.audience)
    if not granted:
        print(f"Refused{': ' + str(error) if error else ''}.", flush=True)
        return 1
    print("Granted.", flush=True)
    if arguments.server:
        token = rvd.token()
        use(arguments.server, token)
        if arguments.again:
            sys.stdin.read()
            use(arguments.server, token)
    return 0


if __name__ == "__main__":
    sys.exit(main())
