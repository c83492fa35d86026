"""One test's world: everything that it starts lives in a folder of its own and ends with it."""

import contextlib
import os
import shutil
import signal
import tempfile

from harness.agent import Agent
from harness.application import Application, Manager
from harness.bus import NAME, Bus, NameWatch
from harness.processes import Process

# Settings of the sanitizers pass through to what is tested; nothing else of the caller's environment does.
PASSED_ON = ("PATH", "ASAN_OPTIONS", "UBSAN_OPTIONS", "LSAN_OPTIONS", "TSAN_OPTIONS", "LLVM_PROFILE_FILE")


class World:
    """server_url: the server that rvd uses; None leaves the setting out."""

    def __init__(self, programs):
        self.programs = programs
        self.root = tempfile.mkdtemp(prefix="rvd-test-")
        os.chmod(self.root, 0o755)
        # Entitlements are believed only below directories that nobody but root can write.
        self.trusted = tempfile.mkdtemp(prefix="rvd-test-", dir="/run" if os.geteuid() == 0 else self.root)
        os.chmod(self.trusted, 0o755)
        self.environment = self._environment()
        self.state_dir = self.folder("state/rvd", 0o700)
        self.entitlements_dir = os.path.join(self.trusted, "entitlements.d")
        os.mkdir(self.entitlements_dir, 0o755)
        self.config = os.path.join(self.root, "rvd.conf")
        self.bus = None
        self.daemon = None
        self.daemons = []  # every rvd that ran in this world
        self._processes = []
        self._disposables = []

    def _environment(self):
        environment = {name: os.environ[name] for name in PASSED_ON if name in os.environ}
        environment["LANG"] = "C.UTF-8"
        environment["HOME"] = self.folder("home", 0o700)
        for name in ("CONFIG", "DATA", "STATE", "CACHE"):
            environment[f"XDG_{name}_HOME"] = self.folder(f"home/{name.lower()}", 0o700)
        environment["XDG_RUNTIME_DIR"] = self.folder("run", 0o700)
        environment["XDG_DATA_DIRS"] = self.folder("share")
        environment["XDG_CONFIG_DIRS"] = self.folder("etc")
        return environment

    def folder(self, name, mode=0o755):
        path = os.path.join(self.root, name)
        os.makedirs(path, mode=mode, exist_ok=True)
        os.chmod(path, mode)
        return path

    def start_bus(self, service_dirs=(), policies=()):
        self.bus = Bus(self.folder("bus"), self.environment, service_dirs, policies)
        self.environment["DBUS_SESSION_BUS_ADDRESS"] = self.bus.address
        self._watch = NameWatch(self.bus.connect(), NAME)

    def keep(self, disposable):
        """Has it disposed of at the end; returns it."""
        self._disposables.append(disposable)
        return disposable

    def start(self, arguments, environment=None, **others):
        """Starts a program in this world."""
        process = Process(arguments, environment or self.environment, **others)
        self._processes.append(process)
        return process

    # ---- the daemon ----

    def configure(self, server_url, timeout_seconds=None, limits=None, others=""):
        lines = ["[Server]"]
        if server_url is not None:
            lines.append(f"URL={server_url}")
        if timeout_seconds is not None:
            lines.append(f"TimeoutSeconds={timeout_seconds}")
        lines.append("[Limits]")
        lines += [f"{name}={value}" for name, value in (limits or {}).items()]
        with open(self.config, "w", encoding="utf-8") as file:
            file.write("\n".join(lines) + "\n" + others)

    def daemon_arguments(self):
        return [
            self.programs.rvd,
            "--config", self.config,
            "--state-dir", self.state_dir,
            "--plugin-dir", self.programs.plugin_dir,
            "--entitlements-dir", self.entitlements_dir,
        ]  # fmt: skip

    def start_daemon(self, wrapper=()):
        """Starts rvd, by a command where one is given, and waits until it is on the bus."""
        self.daemon = self.start([*wrapper, *self.daemon_arguments()])
        self.daemons.append(self.daemon)
        self.daemon.on_end(self._watch.wake)
        self._watch.wait(owned=True, while_running=self.daemon)
        return self.daemon

    def stop_daemon(self):
        """Stops rvd in order; it must leave nothing to complain of."""
        daemon = self.daemon
        self.daemon = None
        status = daemon.end()
        daemon.assert_no_sanitizer_report()
        assert status == 0, f"rvd ended with {status}:\n{daemon.stderr.text}"
        self._watch.wait(owned=False)

    def kill_daemon(self):
        daemon = self.daemon
        self.daemon = None
        daemon.end(signal.SIGKILL)
        daemon.assert_no_sanitizer_report()
        self._watch.wait(owned=False)

    def restart_daemon(self):
        self.stop_daemon()
        return self.start_daemon()

    def crash_daemon(self):
        """Kills rvd without a warning and starts it again."""
        self.kill_daemon()
        return self.start_daemon()

    # ---- who speaks to it ----

    def install(self, app_id, name=None, others=""):
        """Installs an application's desktop entry."""
        folder = self.folder("home/data/applications")
        with open(os.path.join(folder, f"{app_id}.desktop"), "w", encoding="utf-8") as file:
            file.write(f"[Desktop Entry]\nType=Application\nName={name or app_id}\nExec=/bin/true\n{others}")

    def entitle(self, app_id, *entitlements):
        """Gives a client entitlements."""
        path = os.path.join(self.entitlements_dir, f"{app_id}.conf")
        with open(path, "w", encoding="utf-8") as file:
            file.write(f"[{app_id}]\nEntitlements={''.join(e + ';' for e in entitlements)}\n")
        os.chmod(path, 0o644)

    def application(self, app_id="org.example.PhotoApp", name="Photo App"):
        """An installed application that has registered as itself."""
        self.install(app_id, name)
        application = Application(self.bus.connect(), app_id)
        application.register()
        return application

    def stranger(self):
        """A program that does not say who it is."""
        return Application(self.bus.connect())

    def agent(self, kind="desktop", **others):
        return Agent(self.bus.connect(), kind, **others)

    def manager(self):
        return Manager(self.bus.connect())

    # ---- the end ----

    def logs(self):
        return "".join(
            f"--- rvd {daemon.pid}\n{daemon.stdout.text}{daemon.stderr.text}" for daemon in self.daemons
        )

    def dispose(self):
        """Ends everything, in order where it still runs, and says what did not go well."""
        with contextlib.ExitStack() as last_to_first:
            last_to_first.callback(shutil.rmtree, self.root)
            if self.trusted.startswith("/run/"):
                last_to_first.callback(shutil.rmtree, self.trusted)
            if self.bus is not None:
                last_to_first.callback(self.bus.dispose)
            for process in self._processes:
                last_to_first.callback(process.dispose)
            for disposable in self._disposables:
                last_to_first.callback(disposable.dispose)
            for daemon in self.daemons:
                last_to_first.callback(daemon.assert_no_sanitizer_report)
            if self.daemon is not None and self.daemon.running:
                last_to_first.callback(self.stop_daemon)
