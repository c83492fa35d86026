"""Where tokens may be seen: in the answer to their owner and on the wire to the server, and nowhere else."""

import base64
import os
import urllib.parse

import pytest
from gi.repository import Gio, GLib

from harness.agent import ALLOW
from harness.bus import DRIVER
from harness.expect import ACCOUNTS_DOMAIN, GRANTED
from harness.server import answer

MASTER = "canary-master-5f0c7be1d2a94e38/+="
CLIENT = "canary-client-93ad61c0b7e84f52/+="


def spellings(token):
    """How a token may show, if it shows."""
    plain = token.encode()
    return {
        plain,
        base64.b64encode(plain).rstrip(b"="),
        plain.hex().encode(),
        plain.hex().upper().encode(),
        urllib.parse.quote(token, safe="").encode(),
        plain[: len(plain) // 2 + 4],
        plain[len(plain) // 2 - 4 :],
    }


def assert_nowhere(data, where, *tokens):
    for token in tokens:
        for spelling in spellings(token):
            assert spelling not in data, f"a token shows in {where}"


class Monitor:
    """Sees every message on the bus."""

    END = "com.example.TheMonitorHasSeenEnough"

    def __init__(self, world):
        self._connection = world.bus.connect()
        gone = self._connection.signals(DRIVER[2], "NameOwnerChanged")
        self.process = world.start(["dbus-monitor", "--address", world.bus.address, "--binary"])
        # A connection loses its names when it becomes a monitor; from then on it sees everything.
        count = 1
        while not any(name.startswith(":") and not owner for name, _, owner in gone.wait(count)):
            count += 1

    def messages(self):
        """All messages so far, each as its bytes and as what they say."""
        self._connection.driver("NameHasOwner", GLib.Variant("(s)", (self.END,)))
        self.process.stdout.wait_for(self.END)
        data = self.process.stdout.bytes
        messages = []
        while len(data) >= 16:
            size = Gio.DBusMessage.bytes_needed(data[:16])
            if size > len(data):
                break
            messages.append((data[:size], Gio.DBusMessage.new_from_blob(data[:size], 0)))
            data = data[size:]
        return messages


@pytest.fixture
def watched(wired_world, wire):
    wire.always("/authorize", answer({"access_token": CLIENT, "permissions": ["email"]}))
    wired_world.monitor = Monitor(wired_world)
    return wired_world


def test_a_token_is_seen_by_its_owner_alone(watched, wire):
    manager = watched.manager()
    account_id = manager.add_account(MASTER)
    watched.agent(answer=ALLOW)
    application = watched.application()
    assert application.request(["email"]) == GRANTED
    assert application.token() == CLIENT
    wire.on("/authorize", answer({"error_msg": "no", "debug": {"access_token": CLIENT}}))
    application.request(["email", "user_photos"])
    wire.on("/authorize", answer('{"access_token": "%s", }' % CLIENT))
    application.request(["email", "user_likes"])
    wire.on("/authorize", answer([{"access_token": CLIENT}]))
    application.request(["email", "user_notes"])
    manager.authorizations()
    manager.accounts()
    manager.access_log()
    with open(f"/proc/{watched.daemon.pid}/cmdline", "rb") as file:
        assert_nowhere(file.read(), "the command line", MASTER, CLIENT)
    with open(f"/proc/{watched.daemon.pid}/environ", "rb") as file:
        assert_nowhere(file.read(), "the environment", MASTER, CLIENT)

    carrying = []
    for data, message in watched.monitor.messages():
        assert_nowhere(data, "a message", MASTER)
        if CLIENT.encode() in data:
            carrying.append(message)
        else:
            assert_nowhere(data, "a message", CLIENT)
    assert [message.get_destination() for message in carrying] == [application.connection.name]
    assert carrying[0].get_message_type() == Gio.DBusMessageType.METHOD_RETURN

    watched.monitor.process.dispose()
    manager.revoke("org.example.PhotoApp")
    manager.remove_account(account_id)
    daemon = watched.daemon
    watched.stop_daemon()
    assert_nowhere(daemon.stderr.bytes, "the log", MASTER, CLIENT)
    assert_nowhere(daemon.stdout.bytes, "what rvd prints", MASTER, CLIENT)
    assert "Access request response" in daemon.stderr.text, "the log of the exchange is what was searched"


def test_the_stored_tokens_cannot_be_read_from_the_files(wired_world, wire):
    wire.always("/authorize", answer({"access_token": CLIENT, "permissions": ["email"]}))
    manager = wired_world.manager()
    manager.add_account(MASTER)
    wired_world.agent(answer=ALLOW)
    wired_world.application().request(["email"])
    for stopped in (False, True):
        for folder, _, names in os.walk(wired_world.root):
            for name in names:
                path = os.path.join(folder, name)
                if os.path.isfile(path):
                    with open(path, "rb") as file:
                        assert_nowhere(file.read(), path, MASTER, CLIENT)
        if not stopped:
            wired_world.stop_daemon()


def test_a_servers_reason_is_passed_on_but_never_the_token_beside_it(watched, wire):
    watched.manager().add_account(MASTER)
    watched.agent(answer=ALLOW)
    wire.on("/authorize", answer({"access_token": [CLIENT], "error_msg": "no"}))
    granted, error = watched.application().request(["email"])
    assert (granted, error["domain"], error["code"]) == (False, ACCOUNTS_DOMAIN, 7)
    assert_nowhere(str(error).encode(), "the error", CLIENT)
    assert_nowhere(watched.daemon.stderr.bytes, "the log", CLIENT)


def test_no_process_can_be_looked_into_by_others_of_the_user(world):
    """A core dump or a debugger of another program would see the tokens."""
    world.manager().add_account(MASTER)
    status = open(f"/proc/{world.daemon.pid}/limits", encoding="utf-8").read()
    line = next(line for line in status.splitlines() if line.startswith("Max core file size"))
    owner = os.stat(f"/proc/{world.daemon.pid}/environ").st_uid
    assert line.split()[4] == "0" or owner == 0 and os.geteuid() == 0
