"""Who a program is, by where it runs: in a sandbox, behind a proxy, in namespaces of its own."""

import os
import xml.etree.ElementTree

import pytest
from gi.repository import GLib

from harness.agent import ALLOW
from harness.application import FACEBOOK
from harness.bus import ACCOUNTS, AGENT_MANAGER, MANAGEMENT, BusError
from harness.expect import (
    ACCESS_DENIED,
    ACCOUNTS_DOMAIN,
    ALREADY_IDENTIFIED,
    GRANTED,
    NO_ACCESS,
    UNKNOWN_APPLICATION,
    bus_error,
)
from harness.sandbox import (
    ORDINARY,
    Unit,
    behind_bare_proxy,
    bwrap,
    marker_of,
    need_user_namespaces,
    program,
    sandboxed,
)

PHOTO = "org.example.PhotoApp"
OTHER = "org.example.Other"
INTERFACES = os.path.join(os.path.dirname(__file__), "../../interfaces")


def error_of(application, interface, method, parameters=None):
    """The name of the error that the call is answered with; None where it is answered otherwise."""
    try:
        application.connection.call(interface, method, parameters)
    except BusError as error:
        return error.name
    return None


def standing(world, application):
    """What rvd takes a program for that has not registered: "identified", "unconfined" or "unknown"."""
    managed = error_of(application, MANAGEMENT, "ListAccounts")
    registered = error_of(application, ACCOUNTS, "Register", GLib.Variant("(s)", ("org.example.Nowhere",)))
    return {
        (ACCESS_DENIED, ALREADY_IDENTIFIED): "identified",
        (None, UNKNOWN_APPLICATION): "unconfined",
        (ACCESS_DENIED, ACCESS_DENIED): "unknown",
    }[managed, registered]


def test_an_application_in_a_sandbox_is_known_by_it(world):
    world.install(PHOTO, "Photo App", others=f"X-Flatpak={PHOTO}\n")
    world.manager().add_account()
    agent = world.agent()
    application = sandboxed(world, PHOTO)
    pending = application.start_request(["email"])
    alert = agent.next()
    assert alert.description["client_id"] == PHOTO
    assert alert.description["evidence"] == "sandbox"
    assert "Photo App" in alert.message
    alert.allow()
    assert pending.answer() == GRANTED
    assert application.access()[0] == "granted"
    assert application.token()
    assert sandboxed(world, PHOTO).token() == application.token()
    with bus_error(NO_ACCESS):
        sandboxed(world, OTHER).credential()


def test_who_asks_and_how_that_is_known_stands_beside_the_words_of_the_alert(world):
    world.install(OTHER, "Sandbox")
    world.manager().add_account()
    agent = world.agent()
    clients = ((sandboxed(world, PHOTO), "sandbox"), (world.application(OTHER, "Other"), "registered"))
    for application, evidence in clients:
        pending = application.start_request(["email"])
        alert = agent.next()
        words = [text for key, text in alert.description.items() if key in ("header", "message")]
        assert alert.description["evidence"] == evidence
        assert alert.description["client_id"] == application.app_id
        assert not [text for text in words if evidence in text]
        # The name of an application that is not installed is its ID; that of another is not.
        assert any(application.app_id in text for text in words) == (application.app_id == PHOTO)
        alert.refuse()
        pending.answer()


def test_an_application_in_a_sandbox_neither_registers_nor_manages_nor_shows_alerts(world):
    world.install(OTHER)
    application = sandboxed(world, PHOTO)
    with bus_error(ALREADY_IDENTIFIED):
        application.register(OTHER)
    assert standing(world, application) == "identified"
    path = GLib.Variant("(os)", ("/agent", "desktop"))
    assert error_of(application, AGENT_MANAGER, "RegisterAgent", path) == ACCESS_DENIED


def test_an_application_that_runs_in_a_sandbox_is_no_other_program(world):
    world.install(PHOTO, others=f"X-Flatpak={PHOTO}\n")
    world.install(OTHER, others="X-SnapInstanceName=other\n")
    for app_id in (PHOTO, OTHER):
        with bus_error(UNKNOWN_APPLICATION) as error:
            world.stranger().register(app_id)
        assert "sandbox" in error.message


def test_what_a_request_carries_says_nothing_about_who_asks(world):
    world.manager().add_account()
    agent = world.agent()
    names = ("client_id", "id", "name", "bundle_id", "evidence", "desktop_id")
    claims = {name: GLib.Variant("s", OTHER) for name in names}
    claims |= {name: GLib.Variant("u", 1) for name in ("pid", "uid", "ProcessID", "UnixUserID")}
    pending = sandboxed(world, PHOTO).start_request(["email"], app_id=OTHER, **claims)
    alert = agent.next()
    assert (alert.description["client_id"], alert.description["evidence"]) == (PHOTO, "sandbox")
    assert OTHER not in alert.message
    alert.refuse()
    pending.answer()


def test_what_a_sandboxed_application_was_granted_is_not_its_namesakes(world):
    world.manager().add_account()
    agent = world.agent(answer=ALLOW)
    application = sandboxed(world, PHOTO)
    assert application.request(["email"]) == GRANTED
    token = application.token()
    namesake = world.application(PHOTO)
    assert namesake.access() == ("none", [], {})
    with bus_error(NO_ACCESS):
        namesake.credential()
    assert namesake.request(["email"])[0] is False
    assert agent.shown[-1].description["evidence"] != "sandbox"
    assert application.token() == token


def test_a_program_that_the_session_started_as_an_application_is_that_one(world):
    world.install(PHOTO, "Photo App")
    world.manager().add_account()
    agent = world.agent()
    unit = Unit(world, f"app-gnome-{PHOTO}-4711.scope")
    application = unit.program()
    pending = application.start_request(["email"])
    alert = agent.next()
    assert (alert.description["client_id"], alert.description["evidence"]) == (PHOTO, "scope")
    alert.allow()
    assert pending.answer() == GRANTED
    with bus_error(ALREADY_IDENTIFIED):
        application.register(PHOTO)
    assert application.connection.call(MANAGEMENT, "ListAccounts")
    assert standing(world, unit.program("below")) == "unconfined"


@pytest.mark.parametrize("others", [None, "X-Flatpak=org.example.PhotoApp\n"], ids=["not installed", "in a sandbox"])
def test_a_unit_is_no_evidence_of_an_application_that_it_cannot_be(world, others):
    if others:
        world.install(PHOTO, others=others)
    assert standing(world, Unit(world, f"app-{PHOTO}-1.scope").program()) == "unconfined"


def test_an_unknown_program_is_granted_nothing_and_leaves_nothing(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent(answer=ALLOW)
    application = behind_bare_proxy(world)
    granted, error = application.request(["email"])
    assert (granted, error["domain"], error["code"]) == (False, ACCOUNTS_DOMAIN, 16)
    assert "client_id" not in agent.shown[0].description
    assert agent.shown[0].description["evidence"] == "unknown"
    assert application.access() == ("none", [], {})
    assert error_of(application, ACCOUNTS, "GetCredential", GLib.Variant("(s)", (FACEBOOK,))) == NO_ACCESS
    assert not manager.authorizations()


def test_a_program_behind_a_bare_proxy_is_unknown(world):
    world.install(PHOTO)
    application = behind_bare_proxy(world)
    with bus_error(ACCESS_DENIED):
        application.register(PHOTO)
    assert standing(world, application) == "unknown"
    assert "is a bus proxy" in world.logs()


def test_a_program_in_namespaces_of_its_own_is_unknown(world):
    need_user_namespaces()
    for wrapper in (["unshare", "-Ur"], ["unshare", "-Urm"], bwrap(world)):
        assert standing(world, program(world, wrapper)) == "unknown", wrapper
    assert standing(world, program(world)) == "unconfined"


@pytest.mark.parametrize(
    "text",
    ["", "[Runtime]\nname=org.example.PhotoApp\n", marker_of(PHOTO) + "[Application]\nname=org.example.Other\n",
     marker_of("../" + PHOTO), marker_of(PHOTO) + "#" * 65536],
    ids=["empty", "runtime", "two", "path", "large"],
)  # fmt: skip
def test_a_sandbox_that_does_not_say_which_application_it_is_for_is_unknown(world, text):
    assert standing(world, program(world, bwrap(world, text))) == "unknown"


def test_what_a_program_is_called_in_its_own_view_of_the_files_does_not_matter(world):
    need_user_namespaces()
    # A file of the program's own lies over a trusted program's in its own mounts.
    script = 'mount --bind /usr/bin/python3 /usr/bin/busctl && shift && exec /usr/bin/busctl "$@"'
    application = program(world, ["unshare", "-Urm", "sh", "-c", script, "sh"])
    assert os.readlink(f"/proc/{application.connection.process.pid}/exe") == "/usr/bin/busctl"
    assert standing(world, application) == "unknown"


def test_a_program_that_does_not_let_itself_be_looked_at_is_unknown(bare_world, standin):
    # The daemon has no more rights than its user, as in a session.
    bare_world.start_bus()
    bare_world.configure(standin.url)
    bare_world.start_daemon(ORDINARY)
    assert standing(bare_world, program(bare_world, ORDINARY)) == "unconfined"
    hidden = program(bare_world, ORDINARY, options=["--not-dumpable"])
    assert standing(bare_world, hidden) == "unknown"
    assert "Permission denied" in bare_world.logs()
    assert standing(bare_world, sandboxed(bare_world, PHOTO)) == "identified"


def methods():
    """Every method of every interface that rvd offers, with arguments that it takes."""
    values = {
        "s": "''", "o": "objectpath '/a'", "b": "false", "u": "uint32 1", "v": "<1>", "h": "handle 0", "a{sv}": "@a{sv} {}",
    }  # fmt: skip
    texts = {"account_type": f"'{FACEBOOK}'", "kind": "'desktop'"}
    for name in ("Accounts1", "Agent1", "Management1"):
        tree = xml.etree.ElementTree.parse(os.path.join(INTERFACES, f"com.zentor.rvd.{name}.xml"))
        for interface in tree.iter("interface"):
            if interface.get("name") == "com.zentor.rvd.Agent1":
                continue  # what agents offer
            for method in interface.iter("method"):
                arguments = [
                    texts.get(arg.get("name"), values[arg.get("type")])
                    for arg in method.iter("arg")
                    if arg.get("direction") == "in"
                ]
                yield interface.get("name"), method.get("name"), f"({', '.join(arguments)}{',' * (len(arguments) == 1)})"


UNCONFINED = ("unconfined", "registered", "in a unit")


def expectation(kind, interface, method):
    """The error that the call must be answered with, or None where it must not be AccessDenied."""
    if kind == "another user":
        return ACCESS_DENIED
    unconfined = kind in UNCONFINED
    if interface in (MANAGEMENT, AGENT_MANAGER):
        return None if unconfined else ACCESS_DENIED
    if method == "Register":
        if kind == "unconfined":
            return None
        return ALREADY_IDENTIFIED if kind in ("registered", "in a unit", "sandboxed") else ACCESS_DENIED
    return None


def caller(world, kind):
    if kind == "in a unit":
        world.install(OTHER)
        return Unit(world, f"app-gnome-{OTHER}-1.scope").program()
    if kind == "another user":
        if os.geteuid() != 0:
            pytest.skip("only root can speak as another user")
        return program(world, user=65534)
    if kind == "registered":
        world.install(PHOTO)
        application = program(world)
        application.register(PHOTO)
        return application
    if kind == "unconfined":
        return program(world)
    if kind == "sandboxed":
        return sandboxed(world, PHOTO)
    if kind == "behind a bare proxy":
        return behind_bare_proxy(world)
    need_user_namespaces()
    return program(world, ["unshare", "-Ur"])


KINDS = [
    "another user", "unconfined", "registered", "in a unit", "sandboxed", "behind a bare proxy", "in a foreign namespace",
]  # fmt: skip


@pytest.mark.parametrize("kind", KINDS)
def test_every_method_is_for_those_whom_it_is_for(world, kind):
    application = caller(world, kind)
    table = list(methods())
    assert len(table) >= 19
    wrong = []
    for interface, method, arguments in table:
        parameters = GLib.Variant.parse(None, arguments, None, None) if arguments != "()" else None
        error = error_of(application, interface, method, parameters)
        expected = expectation(kind, interface, method)
        if (error != expected) if expected else (error == ACCESS_DENIED):
            wrong.append(f"{interface}.{method}{arguments}: {error}, not {expected}")
    assert not wrong, "\n".join(wrong)
    if kind not in UNCONFINED:
        assert world.manager().accounts() == []


def test_a_sandboxed_client_hears_of_what_others_change(world):
    manager = world.manager()
    manager.add_account()
    world.agent(answer=ALLOW)
    application = sandboxed(world, PHOTO)
    assert application.request(["email"]) == GRANTED
    told = application.connection.signals(ACCOUNTS, "AccessChanged")
    manager.revoke(PHOTO)
    assert told() == [[FACEBOOK]]
