"""One program asks for as much as it can: the others do not notice, and nothing of it stays."""

import os
import re
import subprocess
import sys
import threading

from harness import DEADLINE
from harness.agent import ALLOW
from harness.expect import GRANTED

SECONDS = float(os.environ.get("RVD_FLOOD_SECONDS", "4"))
FLOOD = os.path.join(os.path.dirname(os.path.abspath(__file__)), "harness", "flood.py")
EAGER = "org.example.Eager"
# Sanitizers keep what was freed, to find out who still uses it.
IS_MEASURABLE = not any(name in os.environ for name in ("ASAN_OPTIONS", "TSAN_OPTIONS"))


def anonymous_memory(process):
    with open(f"/proc/{process.pid}/status", encoding="ascii") as file:
        return int(re.search(r"^RssAnon:\s+(\d+) kB", file.read(), re.M).group(1)) * 1024


def descriptors(process):
    return len(os.listdir(f"/proc/{process.pid}/fd"))


def wait_until(holds):
    """The system tells nobody when a process gives memory back, so this looks again and again."""
    pause = threading.Event()
    for _ in range(int(DEADLINE * 5)):
        if holds():
            return True
        pause.wait(0.2)
    return False


class Flood:
    """Programs that flood, one registered and one unknown."""

    def __init__(self, world):
        world.install(EAGER, "Eager")
        self._processes = [
            world.start([sys.executable, "-B", FLOOD, world.bus.address, app_id], stdin=subprocess.PIPE)
            for app_id in (EAGER, "")
        ]

    def end(self):
        """How many calls they made."""
        for process in self._processes:
            process.popen.stdin.close()
        return sum(int(process.stdout.finished()) for process in self._processes)


def test_held_grants_are_answered_while_one_client_floods_and_memory_and_descriptors_come_back(
    bare_world, standin
):
    world = bare_world
    world.start_bus()
    world.configure(standin.url, limits={"CallsPerSecond": 1_000_000})  # nothing slows the flood down
    world.start_daemon()
    world.manager().add_account()
    agent = world.agent(answer=ALLOW)
    holder = world.application()
    assert holder.request(["email"]) == GRANTED
    token = holder.token()
    agent.answer = None  # from now on nobody answers
    memory, files = anonymous_memory(world.daemon), descriptors(world.daemon)

    flood = Flood(world)
    agent.next()
    answered = 0
    over = threading.Event()
    threading.Timer(SECONDS, over.set).start()
    while not over.is_set():
        assert holder.request(["email"]) == GRANTED
        assert holder.token() == token
        answered += 1
    made = flood.end()
    assert answered > 0 and made > 0
    assert wait_until(lambda: descriptors(world.daemon) == files), (files, descriptors(world.daemon))
    if IS_MEASURABLE:
        limit = memory + 2 * 1024 * 1024
        assert wait_until(lambda: anonymous_memory(world.daemon) <= limit), (memory, anonymous_memory(world.daemon))
    assert set(world.manager().authorizations()) == {holder.app_id}
    print(f"{made} calls of the flood, {answered} held grants answered meanwhile; memory {memory} before, "
          f"{anonymous_memory(world.daemon)} after; {files} descriptors")  # fmt: skip
