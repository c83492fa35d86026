"""The stand-in server, as a process of its own."""

import json
import os
import urllib.error
import urllib.request

from harness import DEADLINE

OPENER = urllib.request.build_opener(urllib.request.ProxyHandler({}))


class Standin:
    """script: the answers that it gives in order before its usual ones. descriptions: text by permission. log: a
    file for what it was asked."""

    def __init__(self, world, script=(), descriptions=None, port=0, log=None):
        arguments = [world.programs.standin, "--port", port]
        if log is not None:
            arguments += ["--log", log]
        if script:
            path = os.path.join(world.root, "standin.json")
            with open(path, "w", encoding="utf-8") as file:
                json.dump(list(script), file)
            arguments += ["--script", path]
        for name, text in (descriptions or {}).items():
            arguments += ["--describe", f"{name}={text}"]
        self._process = world.start(arguments)
        self.url = self._process.stdout.wait_for(r"^(http://\S+)$").group(1)

    def whoami(self, token):
        """What a token was issued for; None where it is not valid (any more)."""
        request = urllib.request.Request(self.url + "/whoami", headers={"Authorization": f"Bearer {token}"})
        try:
            with OPENER.open(request, timeout=DEADLINE) as reply:
                return json.load(reply)
        except urllib.error.HTTPError as error:
            assert error.code == 401
            return None

    @property
    def port(self):
        return int(self.url.rsplit(":", 1)[1])

    def end(self):
        """Ends it; nobody listens at its port any more."""
        status = self._process.end()
        self._process.assert_no_sanitizer_report()
        assert status == 0, f"rvd-standin ended with {status}:\n{self._process.stderr.text}"

    def dispose(self):
        if self._process.running:
            self.end()
