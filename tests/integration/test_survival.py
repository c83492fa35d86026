"""What lasts: over a restart, over a crash at any point, and over a second daemon's attempt to share."""

import os
import signal

import pytest
from gi.repository import GLib

from harness.agent import ALLOW, REFUSE
from harness.bus import BusError
from harness.expect import FAILED, GRANTED, NO_ACCESS, REFUSED_WITHOUT_ERROR, USER_REFUSED, bus_error
from harness.server import answer

CLIENTS = ("org.example.Grace", "org.example.Refused", "org.example.Direct", "org.example.Revoked")
IGNORE = "TKFacebookIgnoreAccessRequests"


class Walk:
    """A life with everything in it, in steps. Each step ends with what rvd acknowledged."""

    def __init__(self, world):
        self.world = world
        self.manager = world.manager()
        self.agent = world.agent()

    def _ask(self, client, flags, permissions, **others):
        pending = self.world.application(client).start_request(permissions, **others)
        if flags is not None:
            self.agent.next().answer(flags)
        return pending.answer()

    def add_account(self):
        self.manager.add_account("master-token", "ada")

    def allow(self):
        assert self._ask(CLIENTS[0], ALLOW, ["email"]) == GRANTED

    def allow_more(self):
        assert self._ask(CLIENTS[0], ALLOW, ["email", "publish_stream"], audience="friends") == GRANTED

    def refuse(self):
        assert self._ask(CLIENTS[1], REFUSE, ["email"]) == USER_REFUSED

    def refuse_more(self):
        assert self._ask(CLIENTS[0], REFUSE, ["manage_pages"]) == USER_REFUSED

    def authorize(self):
        assert self.manager.authorize(CLIENTS[2]) == GRANTED

    def authorize_the_refused(self):
        assert self.manager.authorize(CLIENTS[1]) == GRANTED

    def allow_another(self):
        assert self._ask(CLIENTS[3], ALLOW, ["user_photos"]) == GRANTED

    def revoke(self):
        assert self.manager.revoke(CLIENTS[3]) == GRANTED

    def forget(self):
        self.manager.forget_refusal(CLIENTS[3])

    def set_preference(self):
        self.manager.set_preference("AKey", GLib.Variant("s", "a value"))

    def reset_preference(self):
        self.manager.reset_preference("AKey")

    def add_another_account(self):
        self.manager.add_account("other-token", "grace")

    def remove_the_second_account(self):
        self.manager.remove_account(self.manager.accounts()[1]["id"])

    def allow_again(self):
        assert self._ask(CLIENTS[0], ALLOW, ["email"]) == GRANTED

    def revoke_all(self):
        assert self.manager.revoke_all() == GRANTED

    def remove_account(self):
        self.manager.remove_account(self.manager.accounts()[0]["id"])

    STEPS = (
        add_account, allow, allow_more, refuse, refuse_more, authorize, authorize_the_refused, allow_another, revoke,
        forget, set_preference, reset_preference, add_another_account, remove_the_second_account, allow_again,
        revoke_all, remove_account,
    )  # fmt: skip

    def state(self):
        """Everything that rvd keeps, as those see it who may."""
        credentials = {}
        for client in CLIENTS:
            application = self.world.application(client)
            try:
                credentials[client] = application.credential()
            except BusError as error:
                credentials[client] = error.name
            credentials[client + " holds"] = application.access()
            application.leave()
        return {
            "accounts": self.manager.accounts(),
            "authorizations": self.manager.authorizations(),
            "log": self.manager.access_log(),
            "preference": self.manager.preference("AKey"),
            "credentials": credentials,
        }

    def come_back(self):
        """What those do who notice that rvd was started again."""
        self.agent.register("desktop")


def test_nothing_acknowledged_is_lost_when_rvd_is_killed_between_any_two_steps(wired_world):
    walk = Walk(wired_world)
    for step in Walk.STEPS:
        step(walk)
        before = walk.state()
        wired_world.crash_daemon()
        walk.come_back()
        assert walk.state() == before, f"after {step.__name__}"


def test_nothing_is_lost_when_rvd_is_killed_right_after_it_has_answered(wired_world):
    """The kill follows the answer at once, with nothing asked in between."""
    walk = Walk(wired_world)
    expected = Expectation()
    for step in Walk.STEPS:
        step(walk)
        wired_world.crash_daemon()
        walk.come_back()
        expected.after(step.__name__)
        records = walk.manager.authorizations()
        assert {client: record["granted"] for client, record in records.items()} == expected.records, step.__name__
        assert len(walk.manager.accounts()) == expected.accounts, step.__name__
        assert walk.manager.preference("AKey") == expected.preference, step.__name__


class Expectation:
    def __init__(self):
        self.records = {}
        self.accounts = 0
        self.preference = []

    def after(self, step):
        grace, refused, direct, revoked = CLIENTS
        if step in ("add_account", "add_another_account"):
            self.accounts += 1
        elif step in ("allow", "allow_again", "allow_more"):
            self.records[grace] = True
        elif step == "refuse":
            self.records[refused] = False
        elif step == "authorize":
            self.records[direct] = True
        elif step == "authorize_the_refused":
            self.records[refused] = True
        elif step == "allow_another":
            self.records[revoked] = True
        elif step == "revoke":
            self.records[revoked] = False
        elif step == "forget":
            del self.records[revoked]
        elif step == "set_preference":
            self.preference = ["a value"]
        elif step == "reset_preference":
            self.preference = []
        elif step == "remove_the_second_account":
            # Access goes by the type of account: removing either one of its accounts takes all of it back.
            self.accounts -= 1
            self.records = {}
        elif step == "remove_account":
            self.accounts -= 1
            self.records = {}
        elif step == "revoke_all":
            self.records = {}


def test_everything_is_there_again_after_an_orderly_restart(wired_world):
    walk = Walk(wired_world)
    for step in Walk.STEPS[:13]:
        step(walk)
    before = walk.state()
    wired_world.restart_daemon()
    assert walk.state() == before


def test_a_restart_asks_nobody_again(world):
    world.manager().add_account()
    world.agent(answer=ALLOW)
    application = world.application()
    application.request(["email"])
    token = application.token()
    world.restart_daemon()
    application.register()
    assert application.request(["email"]) == GRANTED
    assert application.token() == token


def test_a_kill_while_the_alert_is_open_records_nothing(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent()
    application = world.application()
    pending = application.start_request(["email"])
    agent.next()
    world.crash_daemon()
    with pytest.raises(BusError, match="NoReply"):
        pending.answer()
    application.register()
    assert application.access() == ("none", [], {})
    assert manager.access_log() == []
    agent.register("desktop")
    pending = application.start_request(["email"])
    agent.next().allow()
    assert pending.answer() == GRANTED


def test_a_kill_while_the_server_is_waited_for_leaves_neither_grant_nor_credential(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    wired_world.agent(answer=ALLOW)
    application = wired_world.application()
    wire.on("/authorize", lambda exchange: exchange.read_until_closed())
    pending = application.start_request(["email"])
    wire.next()
    wired_world.crash_daemon()
    with pytest.raises(BusError, match="NoReply"):
        pending.answer()
    application.register()
    assert application.access() == ("none", [], {})
    with bus_error(NO_ACCESS):
        application.credential()


def test_a_stop_while_the_alert_is_open_takes_it_down_and_records_nothing(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent()
    application = world.application()
    waiting = [application.start_request(["email"]), application.start_request(["user_photos"])]
    alert = agent.next()
    world.stop_daemon()
    alert.wait_until_dismissed()
    for pending in waiting:
        assert_nothing_was_decided(pending)
    world.start_daemon()
    application.register()
    assert application.access() == ("none", [], {})
    assert manager.authorizations() == {}
    assert manager.access_log() == []


def test_a_stop_while_the_server_is_waited_for_records_nothing(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    wired_world.agent(answer=ALLOW)
    application = wired_world.application()
    arrived = len(manager.access_log())
    wire.on("/authorize", lambda exchange: exchange.read_until_closed())
    pending = application.start_request(["email"])
    wire.next()
    wired_world.stop_daemon()
    assert_nothing_was_decided(pending)
    wired_world.start_daemon()
    application.register()
    assert application.access() == ("none", [], {})
    assert manager.authorizations() == {}
    assert arrived == 0


def test_a_stop_while_a_description_is_waited_for_records_nothing(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    application = wired_world.application()
    wire.on("/describe", lambda exchange: exchange.read_until_closed())
    pending = application.start_request(["shoe_size"])
    wire.next()
    wired_world.stop_daemon()
    assert_nothing_was_decided(pending)
    wired_world.start_daemon()
    assert manager.authorizations() == {}
    assert manager.access_log() == []


def assert_nothing_was_decided(pending):
    try:
        assert pending.answer() == REFUSED_WITHOUT_ERROR
    except BusError as error:
        # rvd left the bus before it could answer, or answered that it stops.
        assert error.name in ("org.freedesktop.DBus.Error.NoReply", FAILED), error


def test_a_caller_that_leaves_while_the_server_is_waited_for_gets_no_grant(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    wired_world.agent(answer=ALLOW)
    application = wired_world.application()
    wire.on("/authorize", lambda exchange: exchange.read_until_closed())
    application.start_request(["email"])
    wire.next()
    application.leave()
    again = wired_world.application()
    assert again.access()[0] == "none"
    assert again.request(["email"]) == GRANTED
    assert set(manager.authorizations()) == {"org.example.PhotoApp"}


@pytest.mark.parametrize("number", [signal.SIGTERM, signal.SIGINT])
def test_the_daemon_stops_in_order_on_a_signal(world, number):
    daemon = world.daemon
    world.daemon = None
    assert daemon.end(number) == 0
    daemon.assert_no_sanitizer_report()


def test_the_daemon_ends_when_the_bus_goes(bare_world, standin):
    bare_world.start_bus()
    bare_world.configure(standin.url)
    daemon = bare_world.start_daemon()
    bare_world.daemon = None
    bare_world.bus.process.end()
    daemon.wait()
    daemon.assert_no_sanitizer_report()


def test_a_second_daemon_on_the_same_state_is_refused(world):
    manager = world.manager()
    manager.add_account()
    second = world.start(world.daemon_arguments())
    assert second.wait() != 0
    second.assert_no_sanitizer_report()
    assert world.state_dir in second.stderr.text
    assert len(manager.accounts()) == 1
    assert world.daemon.running


def test_a_second_daemon_on_the_same_bus_is_refused(world):
    manager = world.manager()
    manager.add_account()
    arguments = world.daemon_arguments()
    arguments[arguments.index("--state-dir") + 1] = world.folder("other-state", 0o700)
    second = world.start(arguments)
    assert second.wait() != 0
    assert "bus name" in second.stderr.text
    assert len(manager.accounts()) == 1


def test_many_answers_before_a_kill_are_all_kept(wired_world, wire):
    """Requests that are answered while others still run: whatever was acknowledged is there afterwards."""
    manager = wired_world.manager()
    manager.add_account()
    wired_world.agent(answer=ALLOW)
    applications = [wired_world.application(f"org.example.App{number:02}") for number in range(24)]
    running = [(application, application.start_request(["email"])) for application in applications]
    for _, pending in running[:12]:
        assert pending.answer() == GRANTED
    acknowledged = [application for application, pending in running if pending.answered]
    wired_world.crash_daemon()
    records = manager.authorizations()
    for application in acknowledged:
        assert records[application.app_id]["granted"] is True
        application.register()
        assert application.token()
    for application, _ in running:
        if application in acknowledged:
            continue
        application.register()
        state = application.access()[0]
        if state == "none":
            with bus_error(NO_ACCESS):
                application.credential()
        else:
            assert state == "granted" and application.token()


def test_a_lost_key_makes_credentials_absent_and_keeps_the_records(wired_world, wire):
    manager = wired_world.manager()
    manager.add_account()
    wired_world.agent(answer=ALLOW)
    application = wired_world.application()
    application.request(["email"])
    wired_world.stop_daemon()
    os.unlink(os.path.join(wired_world.state_dir, "credentials.key"))
    wired_world.start_daemon()
    application.register()
    assert application.access() == ("granted", ["email"], {"app_id": "4711"})
    with bus_error(NO_ACCESS):
        application.credential()


def test_a_damaged_store_is_set_aside_and_everybody_is_asked_again(wired_world):
    manager = wired_world.manager()
    manager.add_account()
    agent = wired_world.agent(answer=ALLOW)
    application = wired_world.application()
    application.request(["email"])
    wired_world.stop_daemon()
    database = os.path.join(wired_world.state_dir, "accounts.db")
    size = os.path.getsize(database)
    with open(database, "r+b") as file:
        file.write(os.urandom(size))
    wired_world.start_daemon()
    assert manager.accounts() == []
    assert [name for name in os.listdir(wired_world.state_dir) if "damaged" in name]
    wired_world.daemon.stderr.wait_for("damaged")
    manager.add_account()
    agent.register("desktop")
    application.register()
    assert application.request(["email"]) == GRANTED
    assert agent.asked() == 2


def test_the_files_that_last_are_for_the_user_alone(world):
    world.manager().add_account()
    for name in os.listdir(world.state_dir):
        mode = os.lstat(os.path.join(world.state_dir, name)).st_mode & 0o777
        assert mode & 0o077 == 0, f"{name} has mode {mode:o}"
