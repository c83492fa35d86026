"""Processes that are ended with the test, and what they print."""

import re
import signal
import subprocess
import threading
import time

from harness import DEADLINE

SANITIZER_REPORT = re.compile(
    r"ERROR: (Address|Leak)Sanitizer|WARNING: ThreadSanitizer|runtime error:|DEADLYSIGNAL"
)


class Output:
    """What a process prints on one stream, line by line, as it comes."""

    def __init__(self, stream, notify):
        self._bytes = bytearray()
        self._changed = threading.Condition()
        self._notify = notify
        self._thread = threading.Thread(target=self._read, args=(stream,), daemon=True)
        self._thread.start()

    def _read(self, stream):
        with stream:
            for chunk in iter(lambda: stream.read1(65536), b""):
                with self._changed:
                    self._bytes += chunk
                    self._changed.notify_all()
        self._notify()
        with self._changed:
            self._changed.notify_all()

    @property
    def bytes(self):
        with self._changed:
            return bytes(self._bytes)

    @property
    def text(self):
        return self.bytes.decode("utf-8", "replace")

    def finished(self):
        """Waits until the stream has ended, and returns all of it."""
        self._thread.join(DEADLINE)
        assert not self._thread.is_alive(), "the stream is still open"
        return self.text

    def wait_for(self, pattern, start=0):
        """The first match of the pattern at or after the position; fails where the stream ends without one."""
        end = time.monotonic() + DEADLINE
        with self._changed:
            while True:
                text = self._bytes.decode("utf-8", "replace")
                match = re.compile(pattern, re.M).search(text, start)
                if match:
                    return match
                if not self._thread.is_alive() and threading.current_thread() is not self._thread:
                    raise AssertionError(f"ended without printing {pattern!r}:\n{text}")
                if not self._changed.wait(max(0.0, end - time.monotonic())) and time.monotonic() >= end:
                    raise AssertionError(f"did not print {pattern!r}:\n{text}")


class Process:
    """A program that runs until the test ends it. It dies with the test's own process, whatever happens."""

    def __init__(self, arguments, environment, stdin=subprocess.DEVNULL, user=None, pass_fds=()):
        self.arguments = [str(argument) for argument in arguments]
        wrapper = ["setpriv", "--pdeathsig", "KILL"]
        if user is not None:
            wrapper += ["--reuid", str(user), "--regid", str(user), "--clear-groups"]
        self._ended = threading.Event()
        self._on_end = []
        self.popen = subprocess.Popen(
            [*wrapper, "--", *self.arguments],
            env=environment,
            stdin=stdin,
            stdout=subprocess.PIPE,
            stderr=subprocess.PIPE,
            pass_fds=pass_fds,
            cwd="/",
        )
        self.stdout = Output(self.popen.stdout, lambda: None)
        self.stderr = Output(self.popen.stderr, lambda: None)
        threading.Thread(target=self._reap, daemon=True).start()

    def _reap(self):
        self.popen.wait()
        self._ended.set()
        for callback in self._on_end:
            callback()

    def on_end(self, callback):
        self._on_end.append(callback)
        if self._ended.is_set():
            callback()

    @property
    def pid(self):
        return self.popen.pid

    @property
    def running(self):
        return not self._ended.is_set()

    def wait(self):
        """Waits for the end; returns the exit status."""
        assert self._ended.wait(DEADLINE), f"{self.arguments[0]} does not end:\n{self.stderr.text}"
        self.stdout.finished()
        self.stderr.finished()
        return self.popen.returncode

    def send_signal(self, number):
        if self.running:
            self.popen.send_signal(number)

    def end(self, number=signal.SIGTERM):
        """Ends the process with the signal; returns the exit status."""
        self.send_signal(number)
        return self.wait()

    def dispose(self):
        """Ends the process whatever it is doing."""
        if self.running:
            self.popen.send_signal(signal.SIGCONT)
            self.popen.kill()
        self._ended.wait(DEADLINE)

    def assert_no_sanitizer_report(self):
        report = SANITIZER_REPORT.search(self.stderr.text)
        assert not report, f"{self.arguments[0]} reported a fault:\n{self.stderr.text}"


def run(arguments, environment, stdin=b"", user=None):
    """Runs a program to its end: (exit status, standard output, standard error)."""
    process = Process(arguments, environment, stdin=subprocess.PIPE, user=user)
    try:
        try:
            process.popen.stdin.write(stdin)
            process.popen.stdin.close()
        except BrokenPipeError:
            pass
        status = process.wait()
        process.assert_no_sanitizer_report()
        return status, process.stdout.text, process.stderr.text
    finally:
        process.dispose()
