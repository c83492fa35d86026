"""Credentials in the desktop's keyring: a real one, on the test's own bus."""

import base64
import os

import pytest

from harness.agent import ALLOW
from harness.bus import BusError
from harness.expect import GRANTED
from harness.keyring import Keyring
from harness.server import answer

MASTER = "canary-master-5f0c7be1d2a94e38"
CLIENT = "canary-client-93ad61c0b7e84f52"
APP = "org.example.PhotoApp"


@pytest.fixture
def keyring_world(bare_world, wire):
    """An rvd that keeps credentials in the desktop's keyring."""
    wire.always("/authorize", answer({"access_token": CLIENT, "permissions": ["email"]}))
    wire.always("/revoke", answer({}))
    bare_world.start_bus()
    bare_world.keyring = Keyring(bare_world)
    use_store(bare_world, wire, "secret-service")
    bare_world.start_daemon()
    return bare_world


def use_store(world, wire, store):
    world.configure(wire.url, others=f"[Credentials]\nStore={store}\n")


def granted_application(world):
    application = world.application(APP)
    assert application.request(["email"]) == GRANTED
    return application


def has_token(application):
    try:
        return application.token() == CLIENT
    except BusError as error:
        assert error.name == "com.zentor.rvd.Error.NoAccess"
        return False


def holds(text, token):
    return token.encode() in base64.b64decode(text)


def refuses_to_start(world):
    daemon = world.start(world.daemon_arguments())
    assert daemon.wait() > 0
    return daemon.stderr.text


def assert_no_secret_is_shown(world):
    for daemon in world.daemons:
        for token in (MASTER, CLIENT):
            for spelling in (token, base64.b64encode(token.encode()).decode()[4:-4]):
                assert spelling not in daemon.stderr.text + daemon.stdout.text


def test_credentials_live_in_the_keyring_and_go_with_a_revocation(keyring_world):
    world, keyring = keyring_world, keyring_world.keyring
    manager = world.manager()
    account = manager.add_account(MASTER)
    world.agent(answer=ALLOW)
    application = granted_application(world)
    assert has_token(application)
    [own] = keyring.secrets(account=account, kind="account")
    [client] = keyring.secrets(account=account, client=APP)
    assert holds(own, MASTER) and holds(client, CLIENT)
    assert not os.path.exists(os.path.join(world.state_dir, "credentials.key"))

    world.restart_daemon()
    application.register()
    assert has_token(application)
    manager.revoke(APP)
    assert not has_token(application)
    assert keyring.secrets() == [own]
    manager.remove_account(account)
    assert keyring.secrets() == []
    assert_no_secret_is_shown(world)


def test_changing_the_setting_moves_the_credentials_there_and_back(keyring_world, wire):
    world, keyring = keyring_world, keyring_world.keyring
    world.manager().add_account(MASTER)
    world.agent(answer=ALLOW)
    application = granted_application(world)
    for store, in_keyring in (("sealed", 0), ("secret-service", 2)):
        world.stop_daemon()
        use_store(world, wire, store)
        world.start_daemon()
        application.register()
        assert has_token(application)
        assert len(keyring.secrets()) == in_keyring
        assert "The credentials were moved from" in world.daemon.stderr.text
    assert_no_secret_is_shown(world)


def test_a_move_that_cannot_be_made_refuses_to_start_and_loses_nothing(keyring_world, wire):
    world, keyring = keyring_world, keyring_world.keyring
    world.manager().add_account(MASTER)
    world.agent(answer=ALLOW)
    application = granted_application(world)
    world.stop_daemon()
    use_store(world, wire, "sealed")
    keyring.lock()
    complaint = refuses_to_start(world)
    assert "the desktop's keyring is locked" in complaint
    assert "set Store=secret-service again" in complaint
    keyring.kill()
    assert "cannot be moved from the desktop's keyring" in refuses_to_start(world)
    keyring.start()
    world.start_daemon()
    application.register()
    assert has_token(application)
    assert keyring.secrets() == []
    assert_no_secret_is_shown(world)


def test_without_its_keyring_rvd_serves_all_but_credentials_and_a_revocation_holds(keyring_world):
    world, keyring = keyring_world, keyring_world.keyring
    manager = world.manager()
    manager.add_account(MASTER)
    world.agent(answer=ALLOW)
    application = granted_application(world)
    other = world.application("org.example.Other", "Other")
    assert other.request(["email"]) == GRANTED

    world.stop_daemon()
    keyring.kill()
    world.start_daemon()
    assert "Until the desktop's keyring can be used" in world.daemon.stderr.text
    application.register()
    other.register()
    assert application.access()[0] == "granted"
    assert not has_token(application)
    manager.revoke(APP)
    with pytest.raises(BusError):
        manager.add_account("another token")
    assert len(manager.accounts()) == 1

    keyring.start()
    assert not has_token(application)
    assert len(keyring.secrets()) == 3
    # Now that it works, what could not be deleted is deleted.
    assert has_token(other)
    assert keyring.secrets(client=APP) == []
    assert len(keyring.secrets()) == 2
    assert_no_secret_is_shown(world)
