"""Starting rvd: what stops it, and what it says then."""

import os

import pytest

from harness.bus import ACCOUNTS


def fails_to_start(world):
    daemon = world.start(world.daemon_arguments())
    status = daemon.wait()
    daemon.assert_no_sanitizer_report()
    assert status not in (0, None) and status > 0, f"ended with {status}"
    return daemon.stderr.text


BAD_SETTINGS = {
    "unknown key": ("[Server]\nURL=http://127.0.0.1:1\nColour=blue\n", 3, "Colour"),
    "unknown section": ("[Server]\n\n[Colours]\nBlue=1\n", 3, "Colours"),
    "no number": ("[Limits]\nWaitingRequests=many\n", 2, "WaitingRequests"),
    "no limit at all": ("[Limits]\nWaitingRequestsPerClient=0\n", 2, "WaitingRequestsPerClient"),
    "a negative limit": ("[Limits]\nMessageBytes=-1\n", 2, "MessageBytes"),
    "a huge number": ("[Limits]\nNameBytes=99999999999999999999999\n", 2, "NameBytes"),
    "time-out of no number": ("[Server]\nTimeoutSeconds=1m\n", 2, "TimeoutSeconds"),
    "unknown store": ("[Credentials]\nStore=paper\n", 2, "Store"),
    "plain HTTP to elsewhere": ("[Server]\nURL=http://facebook.example\n", 2, "URL"),
    "another scheme": ("[Server]\nURL=file:///etc/passwd\n", 2, "URL"),
    "no URL": ("[Server]\nURL=nonsense\n", 2, "URL"),
}


@pytest.mark.parametrize("text, line, key", BAD_SETTINGS.values(), ids=BAD_SETTINGS.keys())
def test_a_bad_setting_stops_the_start_and_is_named(bare_world, text, line, key):
    bare_world.start_bus()
    with open(bare_world.config, "w", encoding="utf-8") as file:
        file.write(text)
    complaint = fails_to_start(bare_world)
    assert f"{bare_world.config}:{line}" in complaint
    assert key in complaint


def test_a_settings_file_that_was_named_must_be_there(bare_world):
    bare_world.start_bus()
    assert bare_world.config in fails_to_start(bare_world)


@pytest.mark.parametrize("mode", [0o755, 0o750, 0o777, 0o1777])
def test_a_state_directory_that_others_can_enter_is_refused_and_left_as_it_is(bare_world, mode):
    bare_world.start_bus()
    bare_world.configure(None)
    os.chmod(bare_world.state_dir, mode)
    assert bare_world.state_dir in fails_to_start(bare_world)
    assert os.stat(bare_world.state_dir).st_mode & 0o7777 == mode
    assert os.listdir(bare_world.state_dir) == []


def test_a_state_directory_of_somebody_else_is_refused(bare_world):
    if os.geteuid() != 0:
        pytest.skip("only root can give a directory away")
    bare_world.start_bus()
    bare_world.configure(None)
    os.chown(bare_world.state_dir, 65534, 65534)
    assert bare_world.state_dir in fails_to_start(bare_world)


def test_a_state_directory_that_is_not_there_is_made_for_the_user_alone(bare_world):
    bare_world.start_bus()
    bare_world.configure(None)
    os.rmdir(bare_world.state_dir)
    bare_world.start_daemon()
    assert os.stat(bare_world.state_dir).st_mode & 0o7777 == 0o700


def test_without_a_bus_the_start_fails(bare_world):
    bare_world.configure(None)
    bare_world.environment["DBUS_SESSION_BUS_ADDRESS"] = f"unix:path={bare_world.root}/nowhere"
    assert fails_to_start(bare_world)


def test_without_a_plug_in_no_account_type_is_served(bare_world):
    bare_world.start_bus()
    bare_world.configure(None)
    bare_world.programs = Elsewhere(bare_world.programs, bare_world.folder("no-plug-ins"))
    bare_world.start_daemon()
    assert bare_world.stranger().connection.property(ACCOUNTS, "AccountTypes") == []


@pytest.mark.parametrize("content", [b"", b"no module", b"\x7fELF" + bytes(200)], ids=["empty", "text", "half a module"])
def test_a_broken_plug_in_is_left_out(bare_world, content):
    bare_world.start_bus()
    bare_world.configure(None)
    folder = bare_world.folder("plug-ins/Broken")
    with open(os.path.join(folder, "Broken.so"), "wb") as file:
        file.write(content)
    bare_world.programs = Elsewhere(bare_world.programs, os.path.dirname(folder))
    bare_world.start_daemon()
    bare_world.daemon.stderr.wait_for(r"Broken\.so")
    assert bare_world.stranger().connection.property(ACCOUNTS, "AccountTypes") == []


class Elsewhere:
    """The same programs with another directory of plug-ins."""

    def __init__(self, programs, plugin_dir):
        self.__dict__.update(programs.__dict__)
        self.plugin_dir = plugin_dir
