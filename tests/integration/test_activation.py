"""The bus starts rvd for the first who calls it."""

import os
import re
import select

from gi.repository import GLib

from harness import DEADLINE
from harness.bus import ACCOUNTS, NAME


def test_a_call_starts_the_daemon_which_goes_with_its_bus(bare_world, standin):
    bare_world.configure(standin.url)
    # The service file that is installed, with the program of this build and this test's places in it. Nothing
    # here listens to systemd, so the bus starts the program itself.
    packaged = os.path.join(bare_world.programs.build_dir, "packaging/dbus", NAME + ".service")
    with open(packaged, encoding="utf-8") as file:
        service = file.read()
    assert f"\nName={NAME}\n" in service
    command = " ".join(bare_world.daemon_arguments())
    service, count = re.subn(r"^Exec=/\S+/rvd$", f"Exec={command}", service, flags=re.M)
    assert count == 1
    folder = bare_world.folder("services")
    with open(os.path.join(folder, NAME + ".service"), "w", encoding="utf-8") as file:
        file.write(service)
    bare_world.start_bus(service_dirs=[folder])

    stranger = bare_world.stranger().connection
    assert stranger.property(ACCOUNTS, "AccountTypes") == ["com.zentor.facebook"]

    pid = stranger.driver("GetConnectionUnixProcessID", GLib.Variant("(s)", (NAME,)))
    daemon = os.pidfd_open(pid)
    try:
        bare_world.bus.process.end()
        ended, _, _ = select.select([daemon], [], [], DEADLINE)
        assert ended, "rvd outlives its bus"
    finally:
        os.close(daemon)
