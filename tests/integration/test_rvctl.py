"""rvctl, against a daemon that answers by program: what it asks, what it prints, what it ends with."""

import glob
import json
import os
import pty
import re
import signal
import subprocess

import pytest
from gi.repository import GLib

from harness.bus import MANAGEMENT, PATH, BusError
from harness.fake_rvd import HELD, FakeRvd
from harness.processes import Process
from harness.terminal import INTERRUPT, Terminal

TOKEN = "EAAB-the-token-that-nobody-may-see"
FACEBOOK = "com.zentor.facebook"
PHOTO = "org.example.PhotoApp"
PREFERENCES = "com.zentor.tessel.facebook"
CHANGED = "TKFacebookEnvironmentDidChangeNotification"
DONE, REFUSED, WRONG_USE, IMPOSSIBLE = 0, 1, 2, 3

ACCESS_DENIED = "org.freedesktop.DBus.Error.AccessDenied"
INVALID_ARGS = "org.freedesktop.DBus.Error.InvalidArgs"


class Outcome:
    def __init__(self, process):
        self.status = process.wait()
        self.out = process.stdout.text
        self.err = process.stderr.text
        process.assert_no_sanitizer_report()

    @property
    def document(self):
        assert self.out.isascii()
        return json.loads(self.out)


class Tools:
    """rvctl in a world of its own, in which the fake daemon runs."""

    def __init__(self, world):
        self.world = world
        self.rvd = None

    def run_daemon(self, **answers):
        if self.world.bus is None:
            self.world.start_bus()
        self.rvd = FakeRvd(self.world.bus.connect(), answers)
        return self.rvd

    def start(self, *arguments, stdin=subprocess.DEVNULL, pass_fds=()):
        return self.world.keep(
            Process([self.world.programs.rvctl, *arguments], self.world.environment, stdin, pass_fds=pass_fds)
        )

    def run(self, *arguments, stdin=None, pass_fds=()):
        if stdin is None:
            return Outcome(self.start(*arguments, pass_fds=pass_fds))
        process = self.start(*arguments, stdin=subprocess.PIPE, pass_fds=pass_fds)
        try:
            process.popen.stdin.write(stdin)
            process.popen.stdin.close()
        except BrokenPipeError:
            pass  # it did not want all of it
        return Outcome(process)

    def json(self, *arguments, **others):
        outcome = self.run(*arguments, "--json", **others)
        return outcome.status, outcome.document

    def terminal(self, *arguments):
        return self.world.keep(Terminal([self.world.programs.rvctl, *arguments], self.world.environment))


@pytest.fixture
def tools(bare_world):
    return Tools(bare_world)


@pytest.fixture
def rvd(tools):
    daemon = tools.run_daemon()
    # What commands look at beside what they do.
    daemon.answers["ListAuthorizations"] = daemon.answers["ListPendingRevocations"] = dictionaries()
    return daemon


def decision(granted, **error):
    """The answer of a call that grants or refuses."""
    return GLib.Variant("(ba{sv})", (granted, error))


def access_error(code, domain="com.zentor.accounts"):
    return {"domain": GLib.Variant("s", domain), "code": GLib.Variant("i", code)}


def dictionaries(*entries):
    return GLib.Variant("(aa{sv})", (entries,))


def text(value):
    return GLib.Variant("s", value)


# ---- account ----


def test_an_account_is_added_with_the_token_from_standard_input(tools, rvd):
    rvd.answers["AddAccount"] = GLib.Variant("(s)", ("account-1",))
    outcome = tools.run("account", "add", "ada", stdin=TOKEN.encode() + b"\n")
    assert (outcome.status, outcome.out, outcome.err) == (DONE, "Added the account account-1.\n", "")
    (call,) = rvd.calls
    assert call.values[:2] == (FACEBOOK, "ada")
    assert call.passed == TOKEN.encode() + b"\n"


def test_an_account_is_added_with_the_token_from_a_descriptor(tools, rvd):
    rvd.answers["AddAccount"] = GLib.Variant("(s)", ("account-1",))
    reading, writing = os.pipe()
    os.write(writing, TOKEN.encode())
    os.close(writing)
    try:
        status, document = tools.json("account", "add", "ada", "--token-fd", str(reading), pass_fds=[reading])
    finally:
        os.close(reading)
    assert (status, document) == (DONE, {"account_id": "account-1"})
    assert rvd.calls[0].passed == TOKEN.encode()


def test_the_longest_token_is_handed_over_whole(tools, rvd):
    rvd.answers["AddAccount"] = GLib.Variant("(s)", ("account-1",))
    token = bytes(32 + i % 95 for i in range(65536))
    assert tools.run("account", "add", "ada", stdin=token).status == DONE
    assert rvd.calls[0].passed == token


@pytest.mark.parametrize("token", [b"", b"\n", b"x" * 65537], ids=["nothing", "an empty line", "too long"])
def test_what_is_no_token_is_wrong_use(tools, rvd, token):
    outcome = tools.run("account", "add", "ada", stdin=token)
    assert outcome.status == WRONG_USE
    assert "oken" in outcome.err
    assert rvd.calls == []


@pytest.mark.parametrize("descriptor", ["77", "-1", "x", "", "0x0", "99999999999999999999", "1 "])
def test_a_descriptor_that_cannot_be_read_is_wrong_use(tools, rvd, descriptor):
    outcome = tools.run("account", "add", "ada", "--token-fd", descriptor, stdin=TOKEN.encode())
    assert outcome.status == WRONG_USE
    assert rvd.calls == []


def test_a_token_in_an_argument_is_wrong_use_and_is_not_repeated(tools, rvd):
    for arguments in (["ada", TOKEN], ["ada", "--token", TOKEN], ["ada", f"--token={TOKEN}"], ["ada", "--token-fd", TOKEN]):
        outcome = tools.run("account", "add", *arguments, stdin=b"")
        assert outcome.status == WRONG_USE
        assert TOKEN not in outcome.out + outcome.err
    assert rvd.calls == []


def test_a_token_that_is_typed_is_not_shown(tools, rvd):
    rvd.answers["AddAccount"] = GLib.Variant("(s)", ("account-1",))
    terminal = tools.terminal("account", "add", "ada")
    terminal.screen.wait_for("not shown")
    assert not terminal.echoes
    terminal.type(TOKEN + "\n")
    terminal.screen.wait_for("Added the account")
    assert terminal.wait() == DONE
    assert rvd.calls[0].passed == TOKEN.encode() + b"\n"
    assert TOKEN not in terminal.screen.text
    assert terminal.echoes


def test_an_interrupt_while_a_token_is_typed_leaves_the_terminal_as_it_was(tools, rvd):
    terminal = tools.terminal("account", "add", "ada")
    terminal.screen.wait_for("not shown")
    terminal.type(TOKEN[:4] + INTERRUPT)
    assert terminal.wait() == -signal.SIGINT
    assert terminal.echoes
    assert rvd.calls == []


def test_the_end_of_input_while_a_token_is_typed_is_wrong_use(tools, rvd):
    terminal = tools.terminal("account", "add", "ada")
    terminal.screen.wait_for("not shown")
    terminal.type("\x04")
    assert terminal.wait() == WRONG_USE
    assert terminal.echoes


ACCOUNTS = dictionaries(
    {"id": text("id-1"), "account_type": text(FACEBOOK), "username": text("ada")},
    {"id": text("id-22"), "account_type": text(FACEBOOK), "username": text("grace")},
)


def test_accounts_are_listed(tools, rvd):
    rvd.answers["ListAccounts"] = ACCOUNTS
    outcome = tools.run("account", "list")
    assert outcome.status == DONE
    assert outcome.out == (
        "ID     TYPE                 USER NAME\n"
        "id-1   com.zentor.facebook  ada\n"
        "id-22  com.zentor.facebook  grace\n"
    )
    assert tools.json("account", "list") == (
        DONE,
        {
            "accounts": [
                {"account_type": FACEBOOK, "id": "id-1", "username": "ada"},
                {"account_type": FACEBOOK, "id": "id-22", "username": "grace"},
            ]
        },
    )


def test_no_accounts_are_listed_as_none(tools, rvd):
    rvd.answers["ListAccounts"] = dictionaries()
    assert tools.run("account", "list").out == "No account is set up.\n"
    assert tools.json("account", "list") == (DONE, {"accounts": []})


def test_an_account_is_removed(tools, rvd):
    assert tools.run("account", "remove", "id-1").out == (
        "Removed the account id-1 from this device.\nThere was nothing to tell the server.\n"
    )
    assert tools.json("account", "remove", "id-1") == (DONE, {"removed": "id-1", "server": "nothing"})
    assert [call.values for call in rvd.calls if call.method == "RemoveAccount"] == [("id-1",)] * 2


# ---- request ----


def test_a_request_carries_its_options(tools, rvd):
    rvd.answers["RequestAccess"] = decision(True)
    outcome = tools.run("request", "--app-id", "4711", "--permissions", "email,user_likes", "--audience", "friends")
    assert (outcome.status, outcome.out) == (DONE, "Access granted.\n")
    options = {"app_id": "4711", "permissions": ["email", "user_likes"], "audience": "friends"}
    assert rvd.calls[0].values == (FACEBOOK, options, True)


def test_a_request_carries_no_option_that_was_not_given(tools, rvd):
    rvd.answers["RequestAccess"] = decision(True)
    tools.run("request")
    tools.run("request", "--app-id", "", "--permissions", "")
    assert [call.values[1] for call in rvd.calls] == [{}, {"app_id": "", "permissions": []}]


def test_a_request_as_an_application_registers_first_on_the_same_connection(tools, rvd):
    rvd.answers["RequestAccess"] = decision(True)
    tools.run("request", "--as", "org.example.PhotoApp", "--app-id", "4711")
    assert rvd.methods() == ["Register", "RequestAccess"]
    assert rvd.calls[0].values == ("org.example.PhotoApp",)
    assert rvd.calls[0].sender == rvd.calls[1].sender


def test_a_request_waits_for_its_answer(tools, rvd):
    rvd.answers["RequestAccess"] = HELD
    process = tools.start("request", "--app-id", "4711")
    answer = rvd.held()
    assert process.running
    answer(decision(False))
    assert Outcome(process).status == REFUSED


@pytest.mark.parametrize(
    "error, status, words",
    [
        ({}, REFUSED, "Access not granted."),
        (access_error(6), REFUSED, "rvctl account add"),
        (access_error(7), REFUSED, "refused"),
        (access_error(8), REFUSED, "--permissions"),
        (access_error(16), REFUSED, "--as APP_ID"),
        (access_error(4, "com.zentor.transfer"), IMPOSSIBLE, "com.zentor.transfer, code 4"),
        (access_error(1, "com.zentor.json"), IMPOSSIBLE, "com.zentor.json, code 1"),
    ],
)
def test_a_request_that_is_not_granted_says_why(tools, rvd, error, status, words):
    rvd.answers["RequestAccess"] = decision(False, **error)
    outcome = tools.run("request", "--app-id", "4711")
    assert outcome.status == status
    assert words in outcome.out
    expected = {key: value.unpack() for key, value in error.items()} or None
    assert tools.json("request") == (status, {"granted": False, "error": expected})


def test_the_reason_of_a_refusal_is_shown_with_nothing_hidden_in_it(tools, rvd):
    rvd.answers["RequestAccess"] = decision(False, **access_error(8), description=text("a\x1b[2J\u202eb\nc"))
    outcome = tools.run("request")
    assert "a\\x1b[2J\\u{202e}b\\nc" in outcome.out
    assert outcome.out.count("\n") == 1
    assert tools.json("request")[1]["error"]["description"] == "a\x1b[2J\u202eb\nc"


# ---- explain ----

ALERT = ("header", "message", "default_button_title", "alternate_button_title")


def explanation(**entries):
    return GLib.Variant("(a{sv})", (entries,))


def test_an_explanation_is_asked_for_with_what_was_given(tools, rvd):
    rvd.answers["ExplainAccess"] = explanation(decision=text("granted"), reason=text("It holds it."))
    tools.run("explain", "org.example.A")
    tools.run(
        "explain", "org.example.A", "--app-id", "4711", "--permissions", "email,user_likes",
        "--audience", "friends", "--language", "de", "--online",
    )  # fmt: skip
    options = {"app_id": "4711", "permissions": ["email", "user_likes"], "audience": "friends", "online": True}
    assert [call.values for call in rvd.calls] == [
        (FACEBOOK, "org.example.A", {}, ""), (FACEBOOK, "org.example.A", options, "de"),
    ]  # fmt: skip


@pytest.mark.parametrize(
    "decision, status, shown",
    [("granted", DONE, "granted at once"), ("refused", REFUSED, "refused at once"), ("would_ask", DONE, "would ask")],
)
def test_an_explanation_ends_as_the_request_would(tools, rvd, decision, status, shown):
    line = "debug: A line [of it]. [file:1 -[Class method:]]"
    entries = {
        "decision": text(decision), "reason": text("For a reason."), "ignored": GLib.Variant("b", False),
        "error": GLib.Variant("a{sv}", access_error(7)), "log": GLib.Variant("as", [line, line]),
    }  # fmt: skip
    rvd.answers["ExplainAccess"] = explanation(**entries)
    outcome = tools.run("explain", "org.example.A")
    assert outcome.status == status
    lines = outcome.out.splitlines()
    assert lines[0].startswith(f"decision     {shown}")
    assert lines[1:] == [
        "reason       For a reason.", "error        com.zentor.accounts, code 7",
        "log          debug: A line [of it].", "             debug: A line [of it].",
    ]  # fmt: skip
    document = {key: value.unpack() for key, value in entries.items()}
    assert tools.json("explain", "org.example.A") == (status, document)


# ---- access ----


def granted_access(rvd):
    options = {"app_id": text("4711"), "audience": text("friends")}
    rvd.answers["GetAccess"] = GLib.Variant("(sasa{sv})", ("granted", ["email", "user_likes"], options))
    rvd.answers["GetCredential"] = GLib.Variant(
        "(a{sv})",
        ({"oauth_token": text(TOKEN), "refresh_token": text(""), "expiry_date": GLib.Variant("x", 4102444800)},),
    )


def test_access_is_shown(tools, rvd):
    granted_access(rvd)
    outcome = tools.run("access", "--as", "org.example.PhotoApp")
    assert outcome.status == DONE
    assert outcome.out == (
        "state        granted\n"
        "permission   email\n"
        "permission   user_likes\n"
        "app_id       4711\n"
        "audience     friends\n"
    )
    assert rvd.methods() == ["Register", "GetAccess"]
    assert tools.json("access") == (
        DONE,
        {
            "state": "granted",
            "permissions": ["email", "user_likes"],
            "options": {"app_id": "4711", "audience": "friends"},
        },
    )


@pytest.mark.parametrize("state", ["none", "refused"])
def test_access_that_is_not_held_is_a_refusal(tools, rvd, state):
    rvd.answers["GetAccess"] = GLib.Variant("(sasa{sv})", (state, [], {}))
    outcome = tools.run("access")
    assert (outcome.status, outcome.out) == (REFUSED, f"state        {state}\n")
    assert tools.json("access") == (REFUSED, {"state": state, "permissions": [], "options": {}})


@pytest.mark.parametrize("flags", [[], ["--json"]])
def test_a_credential_goes_to_its_descriptor_and_nowhere_else(tools, rvd, flags):
    granted_access(rvd)
    reading, writing = os.pipe()
    outcome = tools.run("access", "--credential-fd", str(writing), *flags, pass_fds=[writing])
    os.close(writing)
    with os.fdopen(reading) as file:
        handed_out = file.read()
    assert outcome.status == DONE
    assert TOKEN not in outcome.out + outcome.err
    if flags:
        assert json.loads(handed_out) == {
            "oauth_token": TOKEN,
            "refresh_token": "",
            "expiry_date": 4102444800,
        }
    else:
        assert handed_out == TOKEN + "\n"


def test_a_credential_is_not_written_to_a_terminal(tools, rvd):
    granted_access(rvd)
    keyboard, line = pty.openpty()
    try:
        outcome = tools.run("access", "--credential-fd", str(line), pass_fds=[line])
    finally:
        os.close(keyboard)
        os.close(line)
    assert outcome.status == WRONG_USE
    assert "terminal" in outcome.err
    assert rvd.calls == []


@pytest.mark.parametrize("descriptor", ["0", "1", "2", "77", "x", "-3"])
def test_a_credential_needs_a_descriptor_of_its_own(tools, rvd, descriptor):
    granted_access(rvd)
    outcome = tools.run("access", "--credential-fd", descriptor)
    assert outcome.status == WRONG_USE
    assert TOKEN not in outcome.out + outcome.err
    assert rvd.calls == []


def test_a_credential_of_an_application_without_access_is_a_refusal(tools, rvd):
    rvd.answers["GetAccess"] = GLib.Variant("(sasa{sv})", ("none", [], {}))
    rvd.answers["GetCredential"] = BusError("com.zentor.rvd.Error.NoAccess", "no")
    with open(os.devnull, "wb") as file:
        outcome = tools.run("access", "--credential-fd", str(file.fileno()), pass_fds=[file.fileno()])
    assert outcome.status == REFUSED
    assert "rvctl request" in outcome.err


def test_a_credential_that_cannot_be_written_is_no_success(tools, rvd):
    granted_access(rvd)
    with open("/dev/full", "wb") as file:
        outcome = tools.run("access", "--credential-fd", str(file.fileno()), pass_fds=[file.fileno()])
    assert outcome.status == IMPOSSIBLE


# ---- list, authorize, revoke, forget, log ----

RECORDS = dictionaries(
    {
        "client_id": text("org.example.PhotoApp"),
        "name": text("Photo App"),
        "granted": GLib.Variant("b", True),
        "permissions": GLib.Variant("as", ["email", "user_likes"]),
        "options": GLib.Variant("a{sv}", {"app_id": text("4711")}),
        "changed": GLib.Variant("x", 1714566600),
        "evidence": text("registered"),
    },
    {
        "client_id": text("org.example.Game"),
        "name": text("写真"),
        "granted": GLib.Variant("b", False),
        "options": GLib.Variant("a{sv}", {}),
        "changed": GLib.Variant("x", 0),
        "evidence": text("unknown"),
    },
)


def test_authorizations_are_listed(tools, rvd):
    tools.world.environment["TZ"] = "UTC"
    rvd.answers["ListAuthorizations"] = RECORDS
    outcome = tools.run("list")
    assert outcome.status == DONE
    assert outcome.out == (
        "CLIENT                NAME       ACCESS   PERMISSIONS        OPTIONS      EVIDENCE    CHANGED\n"
        "org.example.PhotoApp  Photo App  granted  email, user_likes  app_id=4711  registered  2024-05-01 12:30:00\n"
        "org.example.Game      写真       refused  -                  -            unknown     1970-01-01 00:00:00\n"
    )
    status, document = tools.json("list")
    assert status == DONE
    assert document["authorizations"] == RECORDS.unpack()[0]


def test_no_authorizations_are_listed_as_none(tools, rvd):
    rvd.answers["ListAuthorizations"] = dictionaries()
    assert tools.run("list").out == "No application has been granted or refused access.\n"
    assert tools.json("list") == (DONE, {"authorizations": []})


REVOKED = "Access revoked on this device.\nThere was nothing to tell the server.\n"
DIRECT = [
    (["authorize", PHOTO], "AuthorizeAccess", (FACEBOOK, PHOTO), "granted", ("Access granted.\n", {})),
    (["revoke", PHOTO], "RevokeAccess", (FACEBOOK, PHOTO), "revoked", (REVOKED, {"server": "nothing"})),
    (["revoke", "--all"], "RevokeAllAccess", (FACEBOOK,), "revoked", (REVOKED, {"server": "nothing"})),
]


@pytest.mark.parametrize("arguments, method, values, word, said", DIRECT)
def test_a_direct_change_is_made(tools, rvd, arguments, method, values, word, said):
    rvd.answers[method] = decision(True)
    outcome = tools.run(*arguments)
    assert (outcome.status, outcome.out) == (DONE, said[0])
    assert tools.json(*arguments) == (DONE, {"succeeded": True, "error": None, **said[1]})
    assert [call.values for call in rvd.calls if call.method == method] == [values] * 2


@pytest.mark.parametrize("arguments, method, values, word, said", DIRECT)
def test_a_direct_change_that_is_refused_says_so(tools, rvd, arguments, method, values, word, said):
    rvd.answers[method] = decision(False, **access_error(6))
    outcome = tools.run(*arguments)
    assert outcome.status == REFUSED
    assert f"Access not {word}. No account is set up" in outcome.out
    assert tools.json(*arguments)[1] == {
        "succeeded": False,
        "error": {"domain": "com.zentor.accounts", "code": 6},
    }


def owed(attempts=0, client=PHOTO, **others):
    """What is pending: one revocation."""
    return dictionaries(
        {
            "client_ids": GLib.Variant("as", [client]),
            "app_id": text("4711"),
            "since": GLib.Variant("x", 1714566600),
            "attempts": GLib.Variant("x", attempts),
            **others,
        }
    )


class Server:
    """What a daemon says of what it owes the server: these answers in order, the last one for good. It tells of each
    change when it has been asked."""

    def __init__(self, rvd, *answers):
        self.rvd = rvd
        self.answers = list(answers)
        rvd.answers["ListAuthorizations"] = RECORDS
        rvd.answers["RevokeAccess"] = rvd.answers["RevokeAllAccess"] = decision(True)
        rvd.answers["ListPendingRevocations"] = self.answer

    def answer(self, _call):
        if len(self.answers) == 1:
            return self.answers[0]
        GLib.idle_add(self.announce)
        return self.answers.pop(0)

    def announce(self):
        self.rvd.connection.gio.emit_signal(
            None, PATH, MANAGEMENT, "AuthorizationsChanged", GLib.Variant("(s)", (FACEBOOK,))
        )


FAILURE = {"failure": text("it is\x1b]0; off")}


@pytest.mark.parametrize("arguments", [["revoke", PHOTO], ["revoke", "--all"], ["account", "remove", "id-1"]])
@pytest.mark.parametrize(
    "answers, word, words",
    [
        ([dictionaries(), dictionaries()], "told", "The server has been told."),
        ([dictionaries(), owed(), dictionaries()], "told", "The server has been told."),
        ([owed(3, **FAILURE), owed(3, **FAILURE), dictionaries()], "told", "The server has been told."),
        ([dictionaries(), owed(), owed(1, **FAILURE)], "pending", "has not been told yet: it is\\x1b]0; off"),
        ([owed(3, **FAILURE), owed(4, **FAILURE)], "pending", "has not been told yet: it is\\x1b]0; off"),
        ([dictionaries(), BusError("com.zentor.rvd.Error.Failed", "no")], "unknown", "is not known"),
        ([BusError("com.zentor.rvd.Error.Failed", "no")], "unknown", "is not known"),
    ],
    ids=["at once", "a little later", "after failures", "not yet", "still not", "no word of it", "never a word of it"],
)
def test_a_revocation_says_whether_the_server_has_been_told(tools, rvd, arguments, answers, word, words):
    Server(rvd, *answers)
    outcome = tools.run(*arguments)
    assert outcome.status == DONE
    first, _, rest = outcome.out.partition("\n")
    assert "this device" in first
    assert words in rest
    assert ("rvctl list --pending" in rest) == (word != "told")
    Server(rvd, *answers)
    status, document = tools.json(*arguments)
    assert (status, document["server"]) == (DONE, word)


def test_what_is_owed_for_another_client_does_not_count(tools, rvd):
    Server(rvd, owed(1, client="org.example.Game"))
    assert tools.json("revoke", PHOTO)[1]["server"] == "told"


def test_what_is_pending_is_listed(tools, rvd):
    tools.world.environment["TZ"] = "UTC"
    rvd.answers["ListPendingRevocations"] = owed(2, **FAILURE)
    outcome = tools.run("list", "--pending")
    assert (outcome.status, outcome.out) == (
        DONE,
        "CLIENTS               APP ID  REVOKED              ATTEMPTS  LAST FAILURE\n"
        "org.example.PhotoApp  4711    2024-05-01 12:30:00  2         it is\\x1b]0; off\n",
    )
    assert tools.json("list", "--pending") == (DONE, {"pending": owed(2, **FAILURE).unpack()[0]})
    rvd.answers["ListPendingRevocations"] = dictionaries()
    assert tools.run("list", "--pending").out == "The server has been told of everything.\n"
    assert tools.json("list", "--pending") == (DONE, {"pending": []})


def test_a_refusal_is_forgotten(tools, rvd):
    assert tools.run("forget", "org.example.Game").out.startswith("Refusal forgotten")
    assert tools.json("forget", "org.example.Game") == (DONE, {"forgotten": "org.example.Game"})
    assert [call.values for call in rvd.calls] == [(FACEBOOK, "org.example.Game")] * 2


ENTRIES = dictionaries(
    {
        "time": GLib.Variant("x", 1714566600),
        "account_type": text(FACEBOOK),
        "client_id": text("org.example.PhotoApp"),
        "granted": GLib.Variant("b", True),
        "requested": GLib.Variant("b", True),
        "evidence": text("sandbox"),
    },
    {
        "time": GLib.Variant("x", 0),
        "account_type": text(FACEBOOK),
        "granted": GLib.Variant("b", False),
        "requested": GLib.Variant("b", False),
        "evidence": text("unknown"),
    },
)


def test_the_access_log_is_shown(tools, rvd):
    tools.world.environment["TZ"] = "UTC"
    rvd.answers["ListAccessLog"] = ENTRIES
    outcome = tools.run("log")
    assert outcome.status == DONE
    assert outcome.out == (
        "TIME                 RESULT       HOW      CLIENT                EVIDENCE  ACCOUNT TYPE\n"
        "2024-05-01 12:30:00  granted      request  org.example.PhotoApp  sandbox   com.zentor.facebook\n"
        "1970-01-01 00:00:00  not granted  direct   -                     unknown   com.zentor.facebook\n"
    )
    status, document = tools.json("log", "--limit", "7")
    assert (status, document["entries"]) == (DONE, ENTRIES.unpack()[0])
    assert [call.values for call in rvd.calls] == [(50,), (7,)]


@pytest.mark.parametrize(
    "arguments, times",
    [
        (["--client", "org.example.PhotoApp"], [1714566600]),
        (["--client", "org.example.Nobody"], []),
        (["--since", "1970-01-01"], [1714566600, 0]),
        (["--since", "1970-01-01T00:00:01"], [1714566600]),
        (["--until", "2024-05-01"], [1714566600, 0]),
        (["--until", "2024-05-01T12:29"], [0]),
        (["--since", "2024-05-01 12:30:00", "--until", "2024-05-01T14:30:00+02:00"], [1714566600]),
        (["--until", "2024-05-01", "--limit", "1"], [1714566600]),
    ],
)
def test_the_access_log_is_filtered(tools, rvd, arguments, times):
    tools.world.environment["TZ"] = "UTC"
    rvd.answers["ListAccessLog"] = ENTRIES
    status, document = tools.json("log", *arguments)
    assert (status, [entry["time"] for entry in document["entries"]]) == (DONE, times)
    assert [call.values for call in rvd.calls] == [(2**32 - 1,)]
    if not times:
        assert tools.run("log", *arguments).out == "There is no such entry.\n"


def test_an_empty_access_log_says_so(tools, rvd):
    rvd.answers["ListAccessLog"] = dictionaries()
    assert tools.run("log").out == "Nothing has been asked for yet.\n"


# ---- preference ----


@pytest.mark.parametrize(
    "stored, shown, value",
    [
        ([], "Not set.", None),
        ([GLib.Variant("b", True)], "true", True),
        ([GLib.Variant("x", -5)], "-5", -5),
        ([GLib.Variant("d", 0.5)], "0.5", 0.5),
        ([text("a\nb")], "a\\nb", "a\nb"),
        ([GLib.Variant("av", [GLib.Variant("x", 1), text("é")])], '[1,"\\u00e9"]', [1, "é"]),
        ([GLib.Variant("a{sv}", {"a": GLib.Variant("b", False)})], '{"a":false}', {"a": False}),
    ],
)
def test_a_preference_is_shown(tools, rvd, stored, shown, value):
    rvd.answers["GetPreference"] = GLib.Variant("(av)", (stored,))
    outcome = tools.run("preference", "get", "Key")
    assert (outcome.status, outcome.out) == (DONE, shown + "\n")
    assert tools.json("preference", "get", "Key", "--application", "org.example") == (
        DONE,
        {"key": "Key", "value": value},
    )
    assert [call.values for call in rvd.calls] == [(PREFERENCES, "Key"), ("org.example", "Key")]


@pytest.mark.parametrize(
    "typed, stored",
    [
        ("true", GLib.Variant("b", True)),
        ("17", GLib.Variant("x", 17)),
        ("-17", GLib.Variant("x", -17)),
        ("9223372036854775807", GLib.Variant("x", 2**63 - 1)),
        ("1.5", GLib.Variant("d", 1.5)),
        ("yes", text("yes")),
        ("", text("")),
        ('"true"', text("true")),
        ("[1, [true]]", GLib.Variant("av", [GLib.Variant("x", 1), GLib.Variant("av", [GLib.Variant("b", True)])])),
        ('{"a": "b"}', GLib.Variant("a{sv}", {"a": text("b")})),
        ("--json", text("--json")),
    ],
)
def test_a_preference_is_set_and_everybody_is_told(tools, rvd, typed, stored):
    outcome = tools.run("preference", "set", "--", "Key", typed)
    assert (outcome.status, outcome.out) == (DONE, "Preference set.\n")
    assert rvd.methods() == ["SetPreference", "PostNotification"]
    application, key, value = rvd.calls[0].values
    assert (application, key, value) == (PREFERENCES, "Key", stored.unpack())
    assert type(value) is type(stored.unpack())
    assert rvd.calls[1].values == (CHANGED,)


@pytest.mark.parametrize(
    "typed", ["null", "9223372036854775808", '"a\\u0000b"', '{"\\u0000":1}', "[" * 17 + "]" * 17]
)
def test_a_preference_that_cannot_be_kept_is_wrong_use(tools, rvd, typed):
    assert tools.run("preference", "set", "Key", typed).status == WRONG_USE
    assert rvd.calls == []


def test_the_deepest_preference_is_set(tools, rvd):
    assert tools.run("preference", "set", "Key", "[" * 16 + "]" * 16).status == DONE


def test_a_preference_is_reset_and_everybody_is_told(tools, rvd):
    assert tools.run("preference", "reset", "Key").out == "Preference reset.\n"
    assert tools.json("preference", "reset", "Key") == (DONE, {"key": "Key", "value": None})
    assert rvd.methods() == ["ResetPreference", "PostNotification"] * 2


# ---- what goes wrong ----

COMMANDS = {
    "account add": (["account", "add", "ada"], "AddAccount"),
    "account list": (["account", "list"], "ListAccounts"),
    "account remove": (["account", "remove", "id-1"], "RemoveAccount"),
    "request": (["request"], "RequestAccess"),
    "request --as": (["request", "--as", "org.example.A"], "Register"),
    "access": (["access"], "GetAccess"),
    "access --as": (["access", "--as", "org.example.A"], "Register"),
    "explain": (["explain", "org.example.A"], "ExplainAccess"),
    "list": (["list"], "ListAuthorizations"),
    "list --pending": (["list", "--pending"], "ListPendingRevocations"),
    "authorize": (["authorize", "org.example.A"], "AuthorizeAccess"),
    "revoke": (["revoke", "org.example.A"], "RevokeAccess"),
    "revoke --all": (["revoke", "--all"], "RevokeAllAccess"),
    "forget": (["forget", "org.example.A"], "ForgetRefusal"),
    "log": (["log"], "ListAccessLog"),
    "preference get": (["preference", "get", "Key"], "GetPreference"),
    "preference set": (["preference", "set", "Key", "1"], "SetPreference"),
    "preference reset": (["preference", "reset", "Key"], "ResetPreference"),
    "agent": (["agent"], "RegisterAgent"),
}
EVERY_COMMAND = pytest.mark.parametrize("arguments, method", COMMANDS.values(), ids=COMMANDS.keys())


@EVERY_COMMAND
def test_without_a_daemon_nothing_can_be_done(tools, arguments, method):
    tools.world.start_bus()
    outcome = tools.run(*arguments, "--json", stdin=TOKEN.encode())
    assert outcome.status == IMPOSSIBLE
    assert "rvd is not running" in outcome.err
    assert "systemctl --user start rvd" in outcome.err
    assert outcome.document == {"failure": outcome.err.removeprefix("rvctl: ").removesuffix(".\n")}


@EVERY_COMMAND
def test_without_a_bus_nothing_can_be_done(tools, arguments, method):
    outcome = tools.run(*arguments, stdin=TOKEN.encode())
    assert outcome.status == IMPOSSIBLE
    assert "no session bus" in outcome.err


@EVERY_COMMAND
def test_a_caller_that_is_turned_away_is_told_why(tools, rvd, arguments, method):
    rvd.answers[method] = BusError(ACCESS_DENIED, "no")
    outcome = tools.run(*arguments, stdin=TOKEN.encode())
    assert outcome.status == IMPOSSIBLE
    assert "its own user" in outcome.err
    assert TOKEN not in outcome.out + outcome.err


@EVERY_COMMAND
def test_an_error_is_shown_with_nothing_hidden_in_it(tools, rvd, arguments, method):
    rvd.answers[method] = BusError("com.zentor.rvd.Error.Failed", "the\x1b]0;disk\u2066 is\nfull")
    outcome = tools.run(*arguments, stdin=TOKEN.encode())
    assert outcome.status == IMPOSSIBLE
    assert "the\\x1b]0;disk\\u{2066} is\\nfull" in outcome.err
    assert outcome.err.count("\n") == 1
    assert outcome.out == ""


@EVERY_COMMAND
def test_an_error_that_nobody_knows_is_no_success(tools, rvd, arguments, method):
    rvd.answers[method] = BusError("org.example.Unheard.Of", "what?")
    outcome = tools.run(*arguments, stdin=TOKEN.encode())
    assert outcome.status == IMPOSSIBLE
    assert "what?" in outcome.err


@pytest.mark.parametrize(
    "name, words",
    [
        ("com.zentor.rvd.Error.UnsupportedAccountType", "no plug-in"),
        ("com.zentor.rvd.Error.UnknownApplication", "desktop entry"),
        ("com.zentor.rvd.Error.LimitsExceeded", "limits"),
        ("com.zentor.rvd.Error.AlreadyIdentified", "why"),
        (INVALID_ARGS, "why"),
    ],
)
def test_each_error_of_the_daemon_is_put_into_words(tools, rvd, name, words):
    rvd.answers["Register"] = BusError(name, "why")
    outcome = tools.run("request", "--as", "org.example.A")
    assert outcome.status == IMPOSSIBLE
    assert words in outcome.err


def test_a_daemon_that_stops_before_it_answers_is_noticed(tools, rvd):
    rvd.answers["RequestAccess"] = HELD
    process = tools.start("request")
    rvd.held()
    rvd.connection.close()
    outcome = Outcome(process)
    assert outcome.status == IMPOSSIBLE
    assert "stopped before it answered" in outcome.err


def test_an_entry_of_another_type_is_no_success(tools, rvd):
    rvd.answers["ListAccounts"] = dictionaries({"id": GLib.Variant("x", 5)})
    outcome = tools.run("account", "list")
    assert outcome.status == IMPOSSIBLE
    assert "makes no sense" in outcome.err


def test_output_that_cannot_be_written_is_no_success(tools, rvd):
    rvd.answers["ListAccounts"] = ACCOUNTS
    command = f"exec {tools.world.programs.rvctl} account list >/dev/full"
    process = tools.world.start(["sh", "-c", command])
    assert process.wait() == IMPOSSIBLE
    assert "cannot be written" in process.stderr.text


@pytest.mark.parametrize(
    "arguments",
    [
        [],
        ["account"],
        ["preference"],
        ["explode"],
        ["account", "add"],
        ["account", "remove"],
        ["account", "list", "more"],
        ["request", "more"],
        ["request", "--app-id"],
        ["request", "--answer", "allow"],
        ["agent", "--answer", "allow"],
        ["explain"],
        ["explain", "org.example.A", "--online", "yes"],
        ["authorize"],
        ["revoke"],
        ["revoke", "org.example.A", "--all"],
        ["revoke", "org.example.A", "org.example.B"],
        ["forget"],
        ["log", "--limit", "many"],
        ["log", "--limit", "-1"],
        ["log", "--limit", "4294967296"],
        ["log", "--since", "yesterday"],
        ["log", "--until", "2024-02-30"],
        ["log", "--since", "2024-05-01T24:00"],
        ["preference", "get"],
        ["preference", "set", "Key"],
        ["--json"],
        [b"account", b"remove", b"\xff"],
    ],
)
def test_wrong_use_is_told_apart(tools, rvd, arguments):
    process = subprocess.run(
        [tools.world.programs.rvctl, *arguments],
        env=tools.world.environment,
        stdin=subprocess.DEVNULL,
        capture_output=True,
        check=False,
    )
    assert process.returncode == WRONG_USE, process
    assert process.stdout == b""
    assert process.stderr.startswith(b"rvctl: ")
    assert rvd.calls == []


# ---- hostile texts ----

HOSTILE = [
    "\x1b[2J\x1b[H",
    "\x1b]0;title\x07",
    "a\rb",
    "a\nID  TYPE",
    "\u202egnp.exe",
    "\u2066\u2069\u200b\u200d\ufeff",
    "\u0085\u2028\u2029",
    "\x7f\x80\x9b31m",
    "e\u0301\u0301",
    "\U000e0041\u00ad",
    "%s%n",
    "--all",
]
HIDDEN = re.compile(
    "[\x00-\x09\x0b-\x1f\x7f-\x9f\u00ad\u200b-\u200f\u2028-\u202e\u2060-\u206f\ufeff\U000e0000-\U000e007f]"
)


@pytest.mark.parametrize("hostile", HOSTILE)
def test_a_hostile_text_is_shown_on_its_line_and_comes_unchanged_in_json(tools, rvd, hostile):
    rvd.answers["ListAccounts"] = dictionaries(
        {"id": text(hostile), "account_type": text(hostile), "username": text(hostile)}
    )
    rvd.answers["ListAuthorizations"] = dictionaries(
        {
            "client_id": text(hostile),
            "name": text(hostile),
            "granted": GLib.Variant("b", True),
            "permissions": GLib.Variant("as", [hostile, hostile]),
            "options": GLib.Variant("a{sv}", {hostile: text(hostile)}),
            "changed": GLib.Variant("x", -1),
        }
    )
    rvd.answers["ListAccessLog"] = dictionaries({"client_id": text(hostile), "account_type": text(hostile)})
    rvd.answers["GetAccess"] = GLib.Variant(
        "(sasa{sv})", (hostile, [hostile], {hostile: text(hostile), "b": GLib.Variant("as", [hostile])})
    )
    rvd.answers["AddAccount"] = GLib.Variant("(s)", (hostile,))
    rvd.answers["ExplainAccess"] = explanation(
        decision=text("would_ask"),
        **{key: text(hostile) for key in ("reason", *ALERT)},
        error=GLib.Variant("a{sv}", {"domain": text(hostile), "description": text(hostile)}),
        new_permissions=GLib.Variant("as", [hostile]),
        server_request=GLib.Variant("a{sv}", {"exchange": text(hostile), "permissions": GLib.Variant("as", [hostile])}),
        log=GLib.Variant("as", [hostile]),
    )
    for arguments, lines in (
        (["account", "list"], 2),
        (["list"], 2),
        (["log"], 2),
        (["access"], 4),
        (["explain", "org.example.A"], 11),
        (["account", "add", "ada"], 1),
    ):
        outcome = tools.run(*arguments, stdin=b"token")
        assert not HIDDEN.search(outcome.out), arguments
        assert outcome.out.count("\n") == lines, arguments
    assert tools.json("account", "list")[1]["accounts"][0]["id"] == hostile
    assert tools.json("list")[1]["authorizations"][0]["options"] == {hostile: hostile}
    assert tools.json("access")[1]["permissions"] == [hostile]


# ---- help, man page, completions ----

HELP = ["", "account", "preference", *(name for name in COMMANDS if " --" not in name)]


def help_of(tools, name):
    outcome = tools.run(*name.split(), "--help")
    assert (outcome.status, outcome.err) == (DONE, "")
    return outcome.out


@pytest.mark.parametrize("name", HELP)
def test_help_fits_a_screen(tools, name):
    lines = help_of(tools, name).splitlines()
    assert len(lines) <= 24
    assert max(map(len, lines)) <= 80


def packaged(name):
    (path,) = glob.glob(os.path.join(os.path.dirname(__file__), "../../packaging", name))
    with open(path, encoding="utf-8") as file:
        return file.read()


@pytest.mark.parametrize("page", ["man/rvctl.1", "completions/rvctl.bash", "completions/_rvctl", "completions/rvctl.fish"])
def test_what_is_packaged_knows_every_sub_command_and_option(tools, page):
    content = packaged(page).replace("Fl -", "--")
    for name in HELP:
        for word in name.split():
            assert re.search(rf"\b{word}\b", content), word
        for option in re.findall(r"--[a-z-]+", help_of(tools, name)):
            word = option.removeprefix("--") if page.endswith(".fish") else option
            assert word in content, option
