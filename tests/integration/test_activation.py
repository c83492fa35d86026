"""The bus starts rvd for the first who calls it."""

import os
import re

from harness.bus import ACCOUNTS

SERVICE_FILE = os.path.join(os.path.dirname(__file__), "../../packaging/dbus/com.zentor.rvd.service")


def test_a_call_starts_the_daemon_by_the_service_file_that_is_packaged(bare_world, standin):
    """The packaged file, with the installed program's path replaced by the built one's."""
    with open(SERVICE_FILE, encoding="utf-8") as file:
        service = file.read()
    bare_world.configure(standin.url)
    service, count = re.subn(r"^Exec=\S+", "Exec=" + " ".join(bare_world.daemon_arguments()), service, flags=re.M)
    assert count == 1
    assert "\nName=com.zentor.rvd\n" in service
    # Without systemd on the bus the bus starts the program itself.
    folder = bare_world.folder("services")
    with open(os.path.join(folder, "com.zentor.rvd.service"), "w", encoding="utf-8") as file:
        file.write(service)
    bare_world.start_bus(service_dirs=[folder])
    stranger = bare_world.stranger().connection
    assert stranger.property(ACCOUNTS, "AccountTypes") == ["com.zentor.facebook"]

    # It goes with the bus that started it.
    pid = stranger.driver("GetConnectionUnixProcessID", name_of_the_daemon())
    handle = os.pidfd_open(pid)
    try:
        bare_world.bus.process.end()
        import select

        assert select.select([handle], [], [], 90)[0], "rvd outlives its bus"
    finally:
        os.close(handle)


def name_of_the_daemon():
    from gi.repository import GLib

    return GLib.Variant("(s)", ("com.zentor.rvd",))
