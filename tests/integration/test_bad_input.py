"""Input that no well-behaved program sends: a clear error each, and an rvd that goes on unchanged."""

import pytest
from gi.repository import GLib

from harness.agent import ALLOW, REFUSE
from harness.application import FACEBOOK, options
from harness.bus import ACCOUNTS, AGENT_MANAGER, MANAGEMENT, NAME, PATH
from harness.expect import (
    FAILED,
    GRANTED,
    INVALID_ARGS,
    INVALID_OPTIONS,
    LIMITS_EXCEEDED,
    UNSUPPORTED_TYPE,
    bus_error,
)

PHOTO = "org.example.PhotoApp"


@pytest.fixture
def asking(world):
    world.manager().add_account()
    world.allowing = world.agent(answer=ALLOW)
    return world


def unchanged(world, application):
    assert world.daemon.running
    assert application.access() == ("none", [], {})
    assert world.manager().authorizations() == {}
    assert world.manager().access_log() == []
    assert world.allowing.asked() == 0
    assert application.request(["email"]) == GRANTED


def nested(depth):
    value = GLib.Variant("i", 1)
    for _ in range(depth):
        value = GLib.Variant("av", [value])
    return value


# One value of every type that the bus has. What is no string is no app ID and no audience; what is no list is no
# list of permissions.
VALUES = {
    "y": GLib.Variant("y", 7),
    "b": GLib.Variant("b", True),
    "n": GLib.Variant("n", -7),
    "q": GLib.Variant("q", 7),
    "i": GLib.Variant("i", -7),
    "u": GLib.Variant("u", 7),
    "x": GLib.Variant("x", -7),
    "t": GLib.Variant("t", 7),
    "d": GLib.Variant("d", 7.5),
    "s": GLib.Variant("s", "4711"),
    "o": GLib.Variant("o", "/4711"),
    "g": GLib.Variant("g", "a{sv}"),
    "v": GLib.Variant("v", GLib.Variant("s", "4711")),
    "as": GLib.Variant("as", ["email"]),
    "ao": GLib.Variant("ao", ["/email"]),
    "ay": GLib.Variant("ay", b"email"),
    "ai": GLib.Variant("ai", [1, 2]),
    "av": GLib.Variant("av", [GLib.Variant("s", "email"), GLib.Variant("i", 1)]),
    "empty list": GLib.Variant("as", []),
    "(si)": GLib.Variant("(si)", ("email", 1)),
    "a{sv}": GLib.Variant("a{sv}", {"a": GLib.Variant("s", "b")}),
    "a{ss}": GLib.Variant("a{ss}", {"a": "b"}),
    "aas": GLib.Variant("aas", [["email"]]),
}
STRINGS = {"s", "o", "g", "v"}
LISTS = {"as", "ao", "ay", "ai", "av", "empty list", "(si)", "aas"}


@pytest.mark.parametrize("kind", VALUES)
def test_an_app_id_of_any_type_is_a_string_or_an_error(asking, kind):
    application = asking.application()
    answered = application.start_request_with({"app_id": VALUES[kind]}).answer()
    if kind in STRINGS:
        assert answered == GRANTED
    else:
        assert answered == INVALID_OPTIONS
        unchanged(asking, application)


@pytest.mark.parametrize("kind", VALUES)
def test_permissions_of_any_type_are_a_list_or_an_error(asking, kind):
    application = asking.application()
    answered = application.start_request_with({**options(), "permissions": VALUES[kind]}).answer()
    if kind not in LISTS:
        assert answered == INVALID_OPTIONS
        unchanged(asking, application)
        return
    # Elements that are no names name nothing; "/email" is a name that only the server could explain.
    assert answered == GRANTED if kind != "ao" else answered[0] is False
    if kind != "ao":
        names = ["email"] if kind in ("as", "av", "(si)") else []
        assert application.access()[1] == names


@pytest.mark.parametrize("kind", VALUES)
def test_an_audience_of_any_type_is_a_string_where_one_is_needed(asking, kind):
    application = asking.application()
    posting = {**options(permissions=["publish_stream"]), "audience": VALUES[kind]}
    answered = application.start_request_with(posting).answer()
    if kind in STRINGS:
        assert answered == GRANTED
    else:
        assert answered == INVALID_OPTIONS
        unchanged(asking, application)


@pytest.mark.parametrize("kind", VALUES)
def test_an_audience_of_any_type_is_kept_as_it_is_where_none_is_needed(asking, kind):
    application = asking.application()
    reading = {**options(permissions=["email"]), "audience": VALUES[kind]}
    assert application.start_request_with(reading).answer() == GRANTED
    kept = application.access()[2]["audience"]
    assert kept == VALUES[kind].unpack() or list(kept) == list(VALUES[kind].unpack())
    asking.crash_daemon()
    application.register()
    assert application.access()[2]["audience"] == kept


CANNOT_BE_HANDED_ON = {
    "keys that are numbers": GLib.Variant("a{iv}", {1: GLib.Variant("s", "a")}),
    "keys that are paths": GLib.Variant("a{os}", {"/a": "a"}),
    "keys that are booleans": GLib.Variant("a{bs}", {True: "a"}),
    "a number beyond 64 bits with sign": GLib.Variant("t", 2**63),
    "such a number deep inside": GLib.Variant("av", [GLib.Variant("at", [2**64 - 1])]),
    "17 levels": nested(17),
    "60 levels": nested(30),
}


@pytest.mark.parametrize("key", ["app_id", "permissions", "audience"])
@pytest.mark.parametrize("value", CANNOT_BE_HANDED_ON.values(), ids=CANNOT_BE_HANDED_ON.keys())
def test_a_value_that_cannot_be_handed_on_is_refused(asking, key, value):
    application = asking.application()
    with bus_error(INVALID_ARGS):
        application.start_request_with({**options(permissions=["email"]), key: value}).answer()
    unchanged(asking, application)


def test_16_levels_can_be_handed_on(asking):
    application = asking.application()
    deep = {**options(permissions=["email"]), "audience": nested(16)}
    assert application.start_request_with(deep).answer() == GRANTED
    assert application.access()[2]["audience"] == nested(16).unpack()


def test_a_value_that_cannot_be_handed_on_does_not_matter_under_a_name_that_nobody_reads(asking):
    application = asking.application()
    assert application.request(["email"], colour=nested(30)) == GRANTED


def test_a_file_descriptor_in_the_options_is_refused(asking):
    import os

    application = asking.application()
    reading, writing = os.pipe()
    try:
        parameters = GLib.Variant("(sa{sv}b)", (FACEBOOK, {"app_id": GLib.Variant("h", 0)}, True))
        with bus_error(INVALID_ARGS):
            application.connection.call(ACCOUNTS, "RequestAccess", parameters, fds=[reading])
    finally:
        os.close(reading)
        os.close(writing)
    unchanged(asking, application)


TOO_MUCH = {
    "10,000 permissions": options(permissions=[f"permission_{number}" for number in range(10_000)]),
    "10,000 times the same": options(permissions=["email"] * 10_000),
    "257 permissions": options(permissions=["email"] * 257),
    "a permission of 257 bytes": options(permissions=["x" * 257]),
    "a permission of 1 MiB": options(permissions=["x" * (1 << 20)]),
    "an app ID of 257 bytes": options(app_id="4" * 257, permissions=["email"]),
    "an app ID of 1 MiB": options(app_id="4" * (1 << 20), permissions=["email"]),
    "an audience of 257 bytes": options(permissions=["email"], audience="f" * 257),
    "an audience of 1 MiB": options(permissions=["email"], audience="f" * (1 << 20)),
    "an unknown option of 2 MiB": options(permissions=["email"], other=GLib.Variant("s", "x" * (2 << 20))),
    "129 signs of two bytes": options(app_id="é" * 129),
    "an app ID that is a list of 1 MiB": {"app_id": GLib.Variant("ay", b"x" * (1 << 20))},
}


@pytest.mark.parametrize("values", TOO_MUCH.values(), ids=TOO_MUCH.keys())
def test_options_that_are_too_large_are_refused_before_anything_is_decided(asking, values):
    application = asking.application()
    with bus_error(LIMITS_EXCEEDED):
        application.start_request_with(values).answer()
    unchanged(asking, application)


def test_options_at_the_limit_are_taken(asking):
    application = asking.application()
    assert application.request(["email"] * 256, app_id="4" * 256, audience="f" * 256) == GRANTED
    assert application.access() == ("granted", ["email"], {"app_id": "4" * 256, "audience": "f" * 256})


@pytest.mark.parametrize("value", ["\0x"[1:] + "\n\t", "\u202eevil\u2066", "𝔘𝔫𝔦𝔠𝔬𝔡𝔢 🙂", "%@ %s %n {}", "'; DROP TABLE accounts; --"])
def test_strange_text_is_text(asking, value):
    application = asking.application()
    assert application.request(["email"], app_id=value, audience=value) == GRANTED
    assert application.access()[2] == {"app_id": value, "audience": value}
    asking.crash_daemon()
    application.register()
    assert application.access()[2] == {"app_id": value, "audience": value}


def test_an_applications_name_is_plain_text_in_the_alert(asking):
    asking.allowing.answer = REFUSE
    name = "<b>Bank</b> %@ \u202e"
    application = asking.application(name=name)
    application.request(["email"])
    (alert,) = asking.allowing.shown
    assert "<b>Bank</b> %@" in alert.message
    assert "\u202e" not in alert.message, "what turns the text around is no part of a name"


WRONG_CALLS = [
    (ACCOUNTS, "Register", None),
    (ACCOUNTS, "Register", GLib.Variant("(i)", (1,))),
    (ACCOUNTS, "RequestAccess", GLib.Variant("(s)", (FACEBOOK,))),
    (ACCOUNTS, "RequestAccess", GLib.Variant("(sa{ss}b)", (FACEBOOK, {}, True))),
    (ACCOUNTS, "GetAccess", GLib.Variant("(o)", ("/a",))),
    (ACCOUNTS, "GetCredential", GLib.Variant("(as)", ([],))),
    (ACCOUNTS, "NoSuchMethod", None),
    (MANAGEMENT, "AddAccount", GLib.Variant("(sss)", (FACEBOOK, "ada", "token"))),
    (MANAGEMENT, "ListAccessLog", GLib.Variant("(i)", (-1,))),
    (MANAGEMENT, "SetPreference", GLib.Variant("(sss)", ("a", "b", "c"))),
    (MANAGEMENT, "NoSuchMethod", GLib.Variant("(s)", ("x" * (1 << 20),))),
    (AGENT_MANAGER, "RegisterAgent", GLib.Variant("(ss)", ("not a path", "desktop"))),
    ("com.example.Nothing", "Nothing", None),
]


@pytest.mark.parametrize("interface, method, parameters", WRONG_CALLS)
def test_a_call_that_is_none_of_the_services_is_refused_by_the_bus_rules(world, interface, method, parameters):
    with pytest.raises(Exception, match=r"org\.freedesktop\.DBus\.Error\.(InvalidArgs|Unknown\w+)"):
        world.bus.connect().call(interface, method, parameters)
    assert world.daemon.running


@pytest.mark.parametrize("size", [1 << 20, 16 << 20])
@pytest.mark.parametrize(
    "interface, method, make",
    [
        (ACCOUNTS, "Register", lambda text: GLib.Variant("(s)", (text,))),
        (ACCOUNTS, "GetAccess", lambda text: GLib.Variant("(s)", (text,))),
        (ACCOUNTS, "GetCredential", lambda text: GLib.Variant("(s)", (text,))),
        (ACCOUNTS, "RequestAccess", lambda text: GLib.Variant("(sa{sv}b)", (text, {}, True))),
        (MANAGEMENT, "AuthorizeAccess", lambda text: GLib.Variant("(ss)", (FACEBOOK, text))),
        (MANAGEMENT, "RevokeAccess", lambda text: GLib.Variant("(ss)", (FACEBOOK, text))),
        (MANAGEMENT, "ForgetRefusal", lambda text: GLib.Variant("(ss)", (FACEBOOK, text))),
        (MANAGEMENT, "RemoveAccount", lambda text: GLib.Variant("(s)", (text,))),
        (MANAGEMENT, "ListAuthorizations", lambda text: GLib.Variant("(s)", (text,))),
        (MANAGEMENT, "PostNotification", lambda text: GLib.Variant("(s)", (text,))),
        (MANAGEMENT, "GetPreference", lambda text: GLib.Variant("(ss)", (text, text))),
    ],
    ids=lambda value: value if isinstance(value, str) else "",
)
def test_a_text_of_megabytes_harms_nobody(world, interface, method, make, size):
    manager = world.manager()
    try:
        world.application().connection.call(interface, method, make("x" * size))
    except Exception as error:
        assert "NoReply" not in str(error), error
        assert len(str(error)) < 10_000, "the error repeats the text"
    assert world.daemon.running
    assert manager.accounts() == []
    assert manager.authorizations() == {}


def test_a_client_that_does_not_read_its_answers_holds_up_nobody_else(asking):
    silent = asking.bus.connect()
    for _ in range(2000):
        silent.gio.call(NAME, PATH, ACCOUNTS, "GetAccess", GLib.Variant("(s)", (FACEBOOK,)), None, 0, -1, None, None)
    application = asking.application()
    assert application.request(["email"]) == GRANTED


def test_a_preference_of_any_size_is_kept_or_refused_and_the_others_stay(world):
    manager = world.manager()
    manager.set_preference("Small", GLib.Variant("s", "kept"))
    for value in (GLib.Variant("s", "x" * (2 << 20)), nested(30), GLib.Variant("t", 2**63)):
        try:
            manager.set_preference("Large", value)
        except Exception as error:
            assert INVALID_ARGS in str(error) or LIMITS_EXCEEDED in str(error) or FAILED in str(error), error
    world.restart_daemon()
    assert manager.preference("Small") == ["kept"]


@pytest.mark.parametrize("account_type", ["", "COM.ZENTOR.FACEBOOK", "com.zentor.facebook ", "\u0000"[1:] + "x"])
def test_an_account_type_is_served_only_under_its_exact_name(world, account_type):
    with bus_error(UNSUPPORTED_TYPE):
        world.application().start_request(["email"], account_type=account_type).answer()
