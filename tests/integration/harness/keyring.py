"""The desktop's keyring on the private bus."""

import signal
import subprocess

from gi.repository import GLib

from harness.bus import NameWatch
from harness.processes import run

NAME = "org.freedesktop.secrets"


class Keyring:
    """gnome-keyring in this world, unlocked. What it holds survives kill() and start()."""

    def __init__(self, world):
        self._world = world
        if "TSAN_OPTIONS" in world.environment:
            # GLib is not built with the sanitizer, which does not see what orders its threads.
            world.environment["TSAN_OPTIONS"] += ":ignore_noninstrumented_modules=1"
        self._connection = world.bus.connect()
        self._watch = NameWatch(world.bus.connect(), NAME)
        self.process = None
        self.start()

    def start(self):
        self.process = self._world.start(
            ["gnome-keyring-daemon", "--foreground", "--unlock", "--components=secrets"],
            stdin=subprocess.PIPE,
        )
        self.process.popen.stdin.write(b"password")
        self.process.popen.stdin.close()
        self._watch.wait(owned=True, while_running=self.process)

    def kill(self):
        self.process.end(signal.SIGKILL)
        self._watch.wait(owned=False)

    def lock(self):
        """It stays locked until it is ended and started again."""
        self._connection.call(
            "org.freedesktop.Secret.Service",
            "Lock",
            GLib.Variant("(ao)", (["/org/freedesktop/secrets/collection/login"],)),
            destination=NAME,
            path="/org/freedesktop/secrets",
        )

    def secrets(self, **attributes):
        """The text of each of rvd's items with these attributes."""
        words = [word for pair in attributes.items() for word in pair]
        _, shown, _ = run(
            ["secret-tool", "search", "--all", "xdg:schema", "com.zentor.rvd.Credential", *words],
            self._world.environment,
        )
        return [line[len("secret = ") :] for line in shown.splitlines() if line.startswith("secret = ")]
