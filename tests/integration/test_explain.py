"""Why a request would end as it would: what is said is what then happens, and nothing comes of saying it."""

import copy
import os
import shutil
import socket
import subprocess

import pytest
from gi.repository import GLib

from harness.agent import ALLOW, REFUSE
from harness.application import FACEBOOK, options
from harness.bus import MANAGEMENT, NAME, PATH
from harness.expect import (
    ACCESS_DENIED,
    ACCOUNTS_DOMAIN,
    GRANTED,
    INVALID_ARGS,
    LIMITS_EXCEEDED,
    UNSUPPORTED_TYPE,
    bus_error,
)
from harness.processes import run
from harness.server import answer

PHOTO = "org.example.PhotoApp"
ALERT = ("header", "message", "default_button_title", "alternate_button_title")
DEFAULT_ACCESS = "com.zentor.accounts.facebook.default-access"
ALL_ACCESS = "com.zentor.accounts.all-access"
PLACEHOLDER = "[the server's description of shoe_size]"
DONE, REFUSED, WRONG_USE, IMPOSSIBLE = 0, 1, 2, 3


def start_explaining(manager, permissions=None, client=PHOTO, language="", online=None, account_type=FACEBOOK, **others):
    values = options(permissions=permissions, **others)
    if online is not None:
        values["online"] = GLib.Variant("b", online)
    parameters = GLib.Variant("(ssa{sv}s)", (account_type, client, values, language))
    return manager.connection.send(MANAGEMENT, "ExplainAccess", parameters)


def explain(manager, permissions=None, **others):
    (explanation,) = start_explaining(manager, permissions, **others).result(90)
    return explanation


def error(code):
    return {"domain": ACCOUNTS_DOMAIN, "code": code}


class Untouched:
    """Everything that an explanation could leave a trace in."""

    def __init__(self, world, wire, agent):
        self._world, self._wire, self._agent = world, wire, agent
        self._manager = world.manager()
        self._signals = [
            self._manager.connection.signals(MANAGEMENT, name) for name in ("AccountsChanged", "AuthorizationsChanged")
        ]
        self._before = self._state()

    def _state(self):
        files = {}
        for folder, _, names in os.walk(self._world.state_dir):
            for name in names:
                with open(os.path.join(folder, name), "rb") as file:
                    files[os.path.join(folder, name)] = file.read()
        return (
            files,
            self._manager.access_log(),
            self._manager.authorizations(),
            self._manager.accounts(),
            self._world.daemon.stderr.text,
            self._agent.asked(),
            len(self._wire.exchanges),
            [signals.settled() for signals in self._signals],
        )

    def check(self):
        assert self._state() == self._before


@pytest.fixture
def asking(wired_world):
    wired_world.manager().add_account("master-token")
    wired_world.install(PHOTO, "Photo App", "Name[de]=Fotos\n")
    return wired_world


# ---- what is said, and what then happens ----


def test_what_is_explained_is_what_the_user_is_asked_and_the_server_is_sent(asking, wire):
    manager, agent = asking.manager(), asking.agent()
    untouched = Untouched(asking, wire, agent)
    explanation = explain(manager, ["email", "publish_stream"], audience="friends")
    untouched.check()
    assert explanation["decision"] == "would_ask"
    assert explanation["new_permissions"] == ["email", "publish_stream"]
    assert (explanation["described"], explanation["ignored"]) == (True, False)
    assert "error" not in explanation and "description_request" not in explanation
    assert explanation["log"][0].startswith(f"debug: FacebookAccessPlugin is handling request for access from {PHOTO}.")

    pending = asking.application().start_request(["email", "publish_stream"], audience="friends")
    alert = agent.next()
    assert {key: alert.description[key] for key in ALERT} == {key: explanation[key] for key in ALERT}
    alert.allow()
    assert pending.answer() == GRANTED
    (sent,) = wire.asked("/authorize")
    said = explanation["server_request"]
    assert said.pop("exchange") == "authorize"
    said["permissions"] = ",".join(said["permissions"])
    assert said == sent.parameters

    untouched = Untouched(asking, wire, agent)
    held = explain(manager, ["email"])
    assert held["decision"] == "granted"
    assert set(held) == {"decision", "reason", "ignored", "log"}
    more = explain(manager, ["email", "user_likes"])
    assert (more["decision"], more["new_permissions"]) == ("would_ask", ["user_likes"])
    untouched.check()


def test_a_refusal_at_once_is_explained_with_its_error(wired_world, wire):
    manager, agent = wired_world.manager(), wired_world.agent(answer=REFUSE)
    explanation = explain(manager, ["email"])
    assert (explanation["decision"], explanation["error"]) == ("refused", error(6))

    manager.add_account()
    explanation = explain(manager, ["publish_stream"])
    assert (explanation["decision"], explanation["error"]) == ("refused", error(8))

    wired_world.application().request(["email"])
    untouched = Untouched(wired_world, wire, agent)
    explanation = explain(manager, ["email"])
    assert explanation["decision"] == "refused"
    assert "error" not in explanation
    assert "refusal of the application stands" in explanation["reason"]
    untouched.check()


def test_policy_is_explained(bare_world, wire):
    bare_world.entitle(PHOTO, DEFAULT_ACCESS)
    bare_world.entitle("org.example.System", ALL_ACCESS)
    bare_world.start_bus()
    bare_world.configure(wire.url)
    bare_world.start_daemon()
    manager = bare_world.manager()
    assert explain(manager, ["email"])["decision"] == "granted"
    assert explain(manager, client="org.example.System")["decision"] == "granted"
    manager.add_account()
    explanation = explain(manager, ["email", "shoe_size"])
    assert explanation["decision"] == "would_ask"
    assert "message" not in explanation
    assert explanation["server_request"]["permissions"] == ["email", "shoe_size"]


def test_a_request_that_the_users_preference_ignores_is_explained_as_such(asking, wire):
    manager, agent = asking.manager(), asking.agent(answer=ALLOW)
    manager.set_preference("TKFacebookIgnoreAccessRequests", GLib.Variant("b", True))
    manager.post_notification()
    explanation = explain(manager, ["email"])
    assert (explanation["decision"], explanation["ignored"]) == ("would_ask", True)
    assert explanation["new_permissions"] == ["email"]
    assert "server_request" not in explanation
    assert "user-set pref" in explanation["log"][-1]
    assert asking.application().request(["email"]) == (False, {})
    assert agent.shown[0].message == explanation["message"]
    assert wire.asked("/authorize") == []


def test_explaining_first_does_not_keep_a_change_of_the_preference_from_being_seen(asking):
    manager = asking.manager()
    assert explain(manager, ["email"])["ignored"] is False
    manager.set_preference("TKFacebookIgnoreAccessRequests", GLib.Variant("b", True))
    manager.post_notification()
    asking.agent(answer=ALLOW)
    assert asking.application().request(["email"]) == (False, {})
    assert explain(manager, ["user_likes"])["ignored"] is True


# ---- unknown permissions, and the server ----


def test_the_server_describes_unknown_permissions_only_where_it_is_wanted(asking, wire):
    wire.always("/describe", answer('"see your shoe size"'))
    manager, agent = asking.manager(), asking.agent()
    untouched = Untouched(asking, wire, agent)
    offline = explain(manager, ["email", "shoe_size"], audience="friends")
    assert (offline["decision"], offline["described"]) == ("would_ask", False)
    assert PLACEHOLDER in offline["message"]
    assert offline["description_request"] == {
        "exchange": "describe", "permissions": ["shoe_size"], "audience": "ALL_FRIENDS",
    }  # fmt: skip
    assert explain(manager, ["email", "shoe_size"], audience="friends", online=False) == offline
    untouched.check()

    online = explain(manager, ["email", "shoe_size"], audience="friends", online=True)
    assert online["described"] is True
    assert online["message"] == offline["message"].replace(PLACEHOLDER, "see your shoe size")
    (described,) = wire.asked("/describe")
    assert described.bearer == "master-token"
    assert described.parameters == {"permissions": "shoe_size", "audience": "ALL_FRIENDS"}
    assert wire.asked("/authorize") == []
    assert agent.asked() == 0
    assert "master-token" not in repr(online)


def test_a_server_without_a_description_makes_it_a_refusal(asking, wire):
    manager = asking.manager()
    assert explain(manager, ["shoe_size"])["decision"] == "would_ask"
    explanation = explain(manager, ["shoe_size"], online=True)
    assert (explanation["decision"], explanation["error"]) == ("refused", error(7))
    assert "counts as refused" in explanation["reason"]
    assert manager.authorizations() == {}


def test_a_server_that_is_down_is_missed_only_by_who_asks_it(bare_world):
    with socket.create_server(("127.0.0.1", 0)) as nobody:
        port = nobody.getsockname()[1]
    bare_world.start_bus()
    bare_world.configure(f"http://127.0.0.1:{port}")
    bare_world.start_daemon()
    manager = bare_world.manager()
    manager.add_account()
    explanation = explain(manager, ["email", "shoe_size"])
    assert (explanation["decision"], explanation["described"]) == ("would_ask", False)
    explanation = explain(manager, ["email", "shoe_size"], online=True)
    assert (explanation["decision"], explanation["error"]) == ("refused", error(7))
    assert any("could not be reached" in line for line in explanation["log"])


def test_without_a_server_set_up_consent_is_of_no_use(bare_world):
    bare_world.start_bus()
    bare_world.configure(None)
    bare_world.start_daemon()
    manager = bare_world.manager()
    manager.add_account()
    explanation = explain(manager, ["email"])
    assert explanation["decision"] == "would_ask"
    assert explanation["error"]["domain"] == "com.zentor.transfer"
    assert "server_request" not in explanation


def test_an_explanation_that_nobody_waits_for_any_more_is_given_up(asking, wire):
    wire.on("/describe", lambda exchange: exchange.read_until_closed())
    leaving = asking.manager()
    start_explaining(leaving, ["shoe_size"], online=True)
    assert wire.next().path == "/describe"
    leaving.connection.close()
    # The server sees the connection end, and answers the next one.
    wire.always("/describe", answer('"see your shoe size"'))
    assert "see your shoe size" in explain(asking.manager(), ["shoe_size"], online=True)["message"]


def test_many_are_explained_at_a_time_beside_requests_that_wait(asking, wire):
    manager, agent = asking.manager(), asking.agent()
    pending = asking.application().start_request(["email"])
    alert = agent.next()
    wanted = [["email"], ["user_likes"], ["email", "publish"], ["shoe_size"]] * 10
    futures = [start_explaining(manager, permissions, audience="friends") for permissions in wanted]
    for permissions, future in zip(wanted, futures):
        (explanation,) = future.result(90)
        assert explanation["new_permissions"] == permissions
    assert not pending.answered
    alert.allow()
    assert pending.answer() == GRANTED
    assert agent.asked() == 1


# ---- languages ----


@pytest.fixture
def bilingual(bare_world, wire, tmp_path):
    """A daemon whose plug-in has a few words of German as well."""
    plugins = os.path.join(bare_world.root, "plugins")
    shutil.copytree(bare_world.programs.plugin_dir, plugins)
    po = tmp_path / "de.po"
    po.write_text(
        'msgid ""\nmsgstr "Content-Type: text/plain; charset=UTF-8\\n"\n\n'
        'msgctxt "ACCOUNT_ACCESS_REQUEST_TITLE"\nmsgid "title"\nmsgstr "Zugriff auf Ihr Facebook-Konto erlauben?"\n\n'
        'msgctxt "ACCOUNT_ACCESS_ALLOW_BUTTON_TITLE"\nmsgid "allow"\nmsgstr "Erlauben"\n\n'
        'msgctxt "ACCOUNT_ACCESS_BASIC_MESSAGE"\nmsgid "basic"\nmsgstr "%@ möchte Ihr Konto benutzen."\n',
        encoding="utf-8",
    )
    compiled = os.path.join(plugins, "TKFacebookAccountAccessPlugin/resources/Localizable/de.mo")
    subprocess.run(["msgfmt", "-o", compiled, po], check=True)
    bare_world.programs = copy.copy(bare_world.programs)
    bare_world.programs.plugin_dir = plugins
    bare_world.install(PHOTO, "Photo App", "Name[de]=Fotos\n")
    bare_world.start_bus()
    bare_world.configure(wire.url)
    bare_world.start_daemon()
    bare_world.manager().add_account()
    return bare_world


def test_the_words_are_those_of_the_language_that_is_asked_for(bilingual, wire):
    manager = bilingual.manager()
    english = explain(manager)
    assert english["header"] == "Allow access to your Facebook account?"
    assert "Photo App" in english["message"]
    assert explain(manager, language="en_GB.UTF-8") == english
    for language in ("de", "de_AT", "de-AT", "de_DE.UTF-8"):
        german = explain(manager, language=language)
        assert german["header"] == "Zugriff auf Ihr Facebook-Konto erlauben?"
        assert german["message"] == "\u2068Fotos\u2069 möchte Ihr Konto benutzen."
        assert german["default_button_title"] == "Erlauben"
        assert german["alternate_button_title"] == english["alternate_button_title"]

    wire.always("/describe", answer('"etwas Neues"'))
    explain(manager, ["shoe_size"], language="de_AT", online=True)
    assert wire.asked("/describe")[0].headers["accept-language"].startswith("de-AT, de;q=")


@pytest.mark.parametrize("language", ["fr", "xx", "C", "../de", "d e", "de\n", "-", "@", "_AT"])
def test_a_language_without_words_is_an_error(bilingual, language):
    with bus_error(INVALID_ARGS) as failure:
        explain(bilingual.manager(), language=language)
    assert "language" in failure.message


# ---- what cannot be explained ----


def test_what_makes_no_request_is_not_explained(asking):
    manager = asking.manager()
    with bus_error(UNSUPPORTED_TYPE):
        explain(manager, account_type="com.zentor.other")
    with bus_error(INVALID_ARGS):
        explain(manager, client="")
    with bus_error(LIMITS_EXCEEDED):
        explain(manager, ["email"] * 257)
    with bus_error(LIMITS_EXCEEDED):
        explain(manager, audience="f" * 257)
    with bus_error(INVALID_ARGS):
        values = dict(options(), online=GLib.Variant("s", "yes"))
        manager.connection.call(MANAGEMENT, "ExplainAccess", GLib.Variant("(ssa{sv}s)", (FACEBOOK, PHOTO, values, "")))
    assert explain(manager, client="org.example.NotInstalled")["message"].count("org.example.NotInstalled") == 1


def test_another_user_is_not_told(asking):
    if os.geteuid() != 0:
        pytest.skip("only root can speak as another user")
    status, _, complaint = run(
        ["gdbus", "call", "--address", asking.bus.address, "--dest", NAME, "--object-path", PATH,
         "--method", f"{MANAGEMENT}.ExplainAccess", FACEBOOK, PHOTO, "{'app_id': <'4711'>}", "''"],
        asking.environment, user=65534,
    )  # fmt: skip
    assert status != 0
    assert ACCESS_DENIED in complaint


# ---- rvctl explain ----


def rvctl(world, *arguments):
    return run([world.programs.rvctl, "explain", PHOTO, "--app-id", "4711", *arguments], world.environment)


def test_rvctl_explains_on_a_screen(asking, wire):
    status, out, err = rvctl(asking, "--permissions", "email,shoe_size")
    assert (status, err) == (DONE, "")
    lines = out.splitlines()
    assert lines[0] == "decision     would ask the user"
    assert "new          email, shoe_size" in lines
    assert "    Allow access to your Facebook account?" in lines
    assert "    [Don’t Allow] [Allow]" in lines
    assert "“Photo App” will be able to" in out
    assert "--online" in out
    assert f"sent         authorize  app_id=4711  bundle_id={PHOTO}  permissions=email, shoe_size" in lines
    assert len(lines) <= 20

    assert rvctl(asking, "--permissions", "publish")[0] == REFUSED
    wire.always("/describe", answer('"see your shoe size"'))
    assert "see your shoe size" in rvctl(asking, "--permissions", "shoe_size", "--online")[1]
    status, out, err = rvctl(asking, "--language", "xx")
    assert (status, out) == (IMPOSSIBLE, "")
    assert "no words in this language" in err
