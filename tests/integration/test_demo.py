"""scripts/demo with a person at the keyboard."""

import os

import pytest

from harness.terminal import Terminal

DEMO = os.path.join(os.path.dirname(__file__), "../../scripts/demo")


@pytest.mark.parametrize(
    "typed, shown",
    [("allow\r", "The server does not accept the token"), ("what?\rREFUSE\r", "Refusal forgotten")],
    ids=["allow", "refuse after a slip"],
)
def test_the_demo_asks_the_person_and_goes_on_with_the_answer(programs, bare_world, typed, shown):
    environment = {**bare_world.environment, "TMPDIR": bare_world.root}
    terminal = bare_world.keep(Terminal([DEMO, "--build-dir", programs.build_dir], environment))
    terminal.screen.wait_for("then Enter: ")
    terminal.type(typed)
    assert terminal.wait() == 0, terminal.screen.text
    assert shown in terminal.screen.text
    assert not [name for name in os.listdir(bare_world.root) if name.startswith("rvd-demo")]
