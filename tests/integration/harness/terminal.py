"""A program on a terminal, with a person at the keyboard."""

import os
import pty
import subprocess
import termios

from harness import DEADLINE
from harness.processes import SANITIZER_REPORT, Output

LFLAG = 3  # of what termios.tcgetattr returns
END_OF_INPUT = "\x04"
INTERRUPT = "\x03"


class Screen:
    """What a terminal is sent, as a stream that ends when the program has closed it."""

    def __init__(self, descriptor):
        self._descriptor = descriptor

    def __enter__(self):
        return self

    def __exit__(self, *_):
        pass

    def read1(self, size):
        try:
            return os.read(self._descriptor, size)
        except OSError:  # nobody has the other end open any more
            return b""


class Terminal:
    """Runs a program on a terminal that is its own."""

    def __init__(self, arguments, environment):
        self._keyboard, self._line = pty.openpty()
        self.popen = subprocess.Popen(
            ["setpriv", "--pdeathsig", "KILL", "--", "setsid", "--ctty", *map(str, arguments)],
            env=environment,
            stdin=self._line,
            stdout=self._line,
            stderr=self._line,
            cwd="/",
        )
        self.screen = Output(Screen(self._keyboard), lambda: None)

    def type(self, text):
        os.write(self._keyboard, text.encode())

    @property
    def echoes(self):
        return bool(termios.tcgetattr(self._line)[LFLAG] & termios.ECHO)

    def wait(self):
        """Waits for the program's end; returns its exit status."""
        return self.popen.wait(DEADLINE)

    def dispose(self):
        if self.popen.poll() is None:
            self.popen.kill()
            self.popen.wait(DEADLINE)
        os.close(self._line)
        text = self.screen.finished()
        os.close(self._keyboard)
        assert not SANITIZER_REPORT.search(text), text
