"""Who an application is, and what it may see of its own access and of others'."""

import pytest
from gi.repository import GLib

from harness.agent import ALLOW
from harness.application import FACEBOOK
from harness.bus import ACCOUNTS, AGENT_MANAGER, MANAGEMENT, NAME, PATH
from harness.expect import (
    ACCESS_DENIED,
    ALREADY_IDENTIFIED,
    GRANTED,
    NO_ACCESS,
    UNKNOWN_APPLICATION,
    UNSUPPORTED_TYPE,
    bus_error,
)
from harness.processes import run

PHOTO = "org.example.PhotoApp"


def test_the_service_says_what_it_serves(world):
    stranger = world.stranger().connection
    assert stranger.property(ACCOUNTS, "AccountTypes") == [FACEBOOK]
    assert stranger.property(ACCOUNTS, "Version") >= 1


def test_only_an_installed_application_can_register(world):
    stranger = world.stranger()
    for app_id in ("org.example.Nowhere", "", "../../etc/passwd", "org.example.PhotoApp.desktop", "a/b", "x" * 5000):
        with bus_error(UNKNOWN_APPLICATION):
            stranger.register(app_id)
    world.install(PHOTO)
    stranger.register(PHOTO)


@pytest.mark.parametrize("others", ["Hidden=true\n", "\n[Desktop Entry"], ids=["hidden", "broken"])
def test_an_entry_that_is_no_entry_is_not_installed(world, others):
    import os

    world.install(PHOTO, others=others)
    if "Hidden" not in others:
        path = os.path.join(world.root, "home/data/applications", f"{PHOTO}.desktop")
        with open(path, "w", encoding="utf-8") as file:
            file.write("no entry at all\n")
    with bus_error(UNKNOWN_APPLICATION):
        world.stranger().register(PHOTO)


def test_a_connection_registers_once(world):
    application = world.application()
    with bus_error(ALREADY_IDENTIFIED):
        application.register()
    world.install("org.example.Other")
    with bus_error(ALREADY_IDENTIFIED):
        application.register("org.example.Other")


def test_the_name_in_the_alert_is_the_one_read_at_registration(world):
    world.manager().add_account()
    agent = world.agent()
    application = world.application(name="Old Name")
    world.install(PHOTO, "New Name")
    pending = application.start_request(["email"])
    alert = agent.next()
    assert "Old Name" in alert.message and "New Name" not in alert.message
    alert.refuse()
    pending.answer()


def test_a_grant_belongs_to_the_client_and_not_to_the_connection(world):
    world.manager().add_account()
    world.agent(answer=ALLOW)
    first = world.application()
    first.request(["email"])
    second = world.application()
    assert second.access()[0] == "granted"
    assert second.token() == first.token()


def test_nobody_sees_what_another_client_holds(world):
    world.manager().add_account()
    world.agent(answer=ALLOW)
    first, second = world.application(), world.application("org.example.Other", "Other")
    first.request(["email"])
    assert second.access() == ("none", [], {})
    with bus_error(NO_ACCESS):
        second.credential()
    second.request(["email"])
    assert first.token() != second.token()


def test_a_credential_that_never_expires_has_no_date(world):
    world.manager().add_account()
    world.agent(answer=ALLOW)
    application = world.application()
    application.request(["email"])
    credential = application.credential()
    assert set(credential) == {"oauth_token", "refresh_token"}
    assert credential["refresh_token"] == ""


def test_a_client_that_was_refused_or_never_asked_has_no_credential(world):
    from harness.agent import REFUSE

    world.manager().add_account()
    application = world.application()
    with bus_error(NO_ACCESS):
        application.credential()
    world.agent(answer=REFUSE)
    application.request(["email"])
    with bus_error(NO_ACCESS):
        application.credential()


@pytest.mark.parametrize("method", ["GetAccess", "GetCredential"])
def test_an_account_type_that_nobody_serves_is_an_error(world, method):
    with bus_error(UNSUPPORTED_TYPE):
        world.application().connection.call(ACCOUNTS, method, GLib.Variant("(s)", ("com.zentor.other",)))


def test_a_change_by_someone_else_is_told_to_that_client_alone(world):
    manager = world.manager()
    manager.add_account()
    world.agent(answer=ALLOW)
    first, second = world.application(), world.application("org.example.Other", "Other")
    stranger = world.stranger()
    told, others = first.connection.signals(ACCOUNTS, "AccessChanged"), [
        client.connection.signals(ACCOUNTS, "AccessChanged") for client in (second, stranger, manager)
    ]
    assert first.request(["email"]) == GRANTED
    assert second.request(["email"]) == GRANTED
    assert told.settled() == [], "what a client brings about itself is no news to it"

    manager.revoke(PHOTO)
    assert told.wait() == [(FACEBOOK,)]
    assert [signals.settled() for signals in others] == [[], [], []]


def test_every_change_of_a_record_is_announced_without_saying_whose(world):
    manager = world.manager()
    changed = manager.connection.signals(MANAGEMENT, "AuthorizationsChanged")
    manager.add_account()
    world.agent(answer=ALLOW)
    world.application().request(["email"])
    assert changed.wait() == [(FACEBOOK,)]
    # Nothing is owed to the server for a client without an app ID, which would be announced as well.
    for count, change in enumerate((manager.authorize, manager.revoke, manager.forget_refusal), 2):
        change("org.example.Direct")
        assert changed.wait(count) == [(FACEBOOK,)] * count


@pytest.mark.parametrize(
    "interface, method, arguments",
    [
        (ACCOUNTS, "Register", ["string:org.example.PhotoApp"]),
        (ACCOUNTS, "GetAccess", [f"string:{FACEBOOK}"]),
        (ACCOUNTS, "GetCredential", [f"string:{FACEBOOK}"]),
        (MANAGEMENT, "ListAccounts", []),
        (MANAGEMENT, "ListAuthorizations", [f"string:{FACEBOOK}"]),
        (MANAGEMENT, "RevokeAllAccess", [f"string:{FACEBOOK}"]),
        (MANAGEMENT, "ListAccessLog", ["uint32:1"]),
        (MANAGEMENT, "RemoveAccount", ["string:1"]),
        (MANAGEMENT, "AuthorizeAccess", [f"string:{FACEBOOK}", "string:a"]),
        (MANAGEMENT, "RevokeAccess", [f"string:{FACEBOOK}", "string:a"]),
        (MANAGEMENT, "ListPendingRevocations", [f"string:{FACEBOOK}"]),
        (MANAGEMENT, "ForgetRefusal", [f"string:{FACEBOOK}", "string:a"]),
        (MANAGEMENT, "GetPreference", ["string:a", "string:b"]),
        (MANAGEMENT, "ResetPreference", ["string:a", "string:b"]),
        (MANAGEMENT, "SetPreference", ["string:a", "string:b", "variant:int32:1"]),
        (MANAGEMENT, "PostNotification", ["string:a"]),
        (AGENT_MANAGER, "RegisterAgent", ["objpath:/a", "string:desktop"]),
        (AGENT_MANAGER, "UnregisterAgent", ["objpath:/a"]),
    ],
)
def test_another_user_is_turned_away_everywhere(world, interface, method, arguments):
    import os

    if os.geteuid() != 0:
        pytest.skip("only root can speak as another user")
    world.install(PHOTO)
    status, _, complaint = run(
        ["dbus-send", f"--bus={world.bus.address}", "--print-reply", f"--dest={NAME}", PATH,
         f"{interface}.{method}", *arguments],
        world.environment, user=65534,
    )  # fmt: skip
    assert status != 0
    assert ACCESS_DENIED in complaint


def test_entitlements_are_believed_from_roots_files_alone(bare_world, wire):
    import os

    if os.geteuid() != 0:
        pytest.skip("only root can make files of root's")
    DEFAULT = "com.zentor.accounts.facebook.default-access"
    clients = {name: f"org.example.{name}" for name in ("Good", "Foreign", "Writable", "Link")}
    for client in clients.values():
        bare_world.entitle(client, DEFAULT)
    folder = bare_world.entitlements_dir
    os.chown(os.path.join(folder, "org.example.Foreign.conf"), 65534, 65534)
    os.chmod(os.path.join(folder, "org.example.Writable.conf"), 0o666)
    os.rename(os.path.join(folder, "org.example.Link.conf"), os.path.join(bare_world.root, "elsewhere.conf"))
    os.chown(os.path.join(bare_world.root, "elsewhere.conf"), 65534, 65534)
    os.symlink(os.path.join(bare_world.root, "elsewhere.conf"), os.path.join(folder, "org.example.Link.conf"))
    bare_world.start_bus()
    bare_world.configure(wire.url)
    bare_world.start_daemon()
    granted = {name: bare_world.application(client).request(["email"])[0] for name, client in clients.items()}
    assert granted == {"Good": True, "Foreign": False, "Writable": False, "Link": False}
