"""The terminal agent, with a person at the keyboard and a daemon that shows what the test tells it to."""

import json
import re
import signal
import subprocess

import pytest
from gi.repository import GLib

from harness.bus import BusError
from harness.fake_rvd import FakeRvd
from harness.processes import Process
from harness.terminal import END_OF_INPUT, INTERRUPT, Terminal

ALLOW, REFUSE, OTHER = 0, 1, 2
DONE, IMPOSSIBLE = 0, 3
ACCESS_DENIED = "org.freedesktop.DBus.Error.AccessDenied"
FAILED = "com.zentor.rvd.Error.Failed"
NO_REPLY = "org.freedesktop.DBus.Error.NoReply"

READY = "Ready: alerts are shown here"
PROMPT = "Type allow or refuse, then Enter: "


def description(**others):
    values = {
        "header": "Facebook",
        "message": "“Photo App” would like to see your email address.",
        "alternate_button_title": "Don’t Allow",
        "default_button_title": "OK",
        "client_id": "org.example.PhotoApp",
        "evidence": "registered",
        **others,
    }
    entries = {key: GLib.Variant("s", value) for key, value in values.items() if value is not None}
    for trait in ("top_most", "dismiss_on_lock", "dont_dismiss_on_unlock"):
        entries[trait] = GLib.Variant("b", True)
    return entries


class Desk:
    """An agent on a terminal, and the daemon that it is registered with."""

    def __init__(self, world):
        world.start_bus()
        self.world = world
        self.rvd = FakeRvd(world.bus.connect())
        self.terminal = world.keep(Terminal([world.programs.rvctl, "agent"], world.environment))
        self.agent = self.rvd.agent()
        self._read = 0
        self.wait_for(READY)

    def wait_for(self, pattern):
        """Waits until the terminal shows it after what was waited for before."""
        match = self.terminal.screen.wait_for(pattern, self._read)
        self._read = match.end()
        return match

    def type(self, text):
        self.terminal.type(text)

    def show(self, **others):
        """Shows an alert, and waits until the person is asked."""
        alert = self.rvd.show(self.agent, description(**others))
        self.wait_for(PROMPT)
        return alert

    def answers(self, typed):
        """What an alert is answered with when this is typed."""
        alert = self.show()
        self.type(typed + "\n")
        return alert.answer()


@pytest.fixture
def desk(bare_world):
    return Desk(bare_world)


@pytest.fixture
def piped(bare_world):
    """Starts an agent whose input is a pipe or a file."""
    bare_world.start_bus()
    rvd = FakeRvd(bare_world.bus.connect())

    def start(*flags, stdin=subprocess.PIPE):
        arguments = [bare_world.programs.rvctl, "agent", *flags]
        return rvd, bare_world.keep(Process(arguments, bare_world.environment, stdin))

    return start


def enter(process, text):
    process.popen.stdin.write(text)
    process.popen.stdin.flush()


# ---- what is shown ----


def test_the_agent_registers_as_a_terminal(desk):
    assert desk.agent[2] == "terminal"


def test_an_alert_is_shown_whole(desk):
    desk.show()
    text = desk.terminal.screen.text
    for line in (
        "Facebook",
        "“Photo App” would like to see your email address.",
        "Asked by org.example.PhotoApp, as the program itself says.",
        "  allow   for the button: OK",
        "  refuse  for the button: Don’t Allow",
    ):
        assert line in text.splitlines()


def test_a_program_without_a_name_is_shown_as_one(desk):
    desk.show(client_id=None, evidence="unknown")
    assert "Asked by a program that does not say which application it is." in desk.terminal.screen.text


def test_a_hostile_alert_is_shown_with_nothing_hidden_in_it(desk):
    desk.show(
        header="\x1b[2J",
        message="a\rb\n  refuse  for the button: OK\u202e",
        client_id="org.example\u2066",
        default_button_title="O\u200bK",
    )
    text = desk.terminal.screen.text
    assert "\\x1b[2J" in text
    assert "a\\rb\\n  refuse  for the button: OK\\u{202e}" in text
    assert "org.example\\u{2066}" in text
    assert "O\\u{200b}K" in text
    assert not re.search("[\x00-\x08\x0b\x0c\x0e-\x1f\x7f-\x9f\u200b\u202e\u2066]", text)


# ---- what answers ----


@pytest.mark.parametrize("typed", ["allow", "Allow", "ALLOW", "  allow ", "allow\t"])
def test_the_word_allow_presses_the_default_button(desk, typed):
    assert desk.answers(typed) == ALLOW
    desk.wait_for("Answered: OK")


@pytest.mark.parametrize("typed", ["refuse", " Refuse"])
def test_the_word_refuse_presses_the_alternate_button(desk, typed):
    assert desk.answers(typed) == REFUSE
    desk.wait_for("Answered: Don’t Allow")


def test_nothing_but_the_whole_word_answers(desk):
    alert = desk.show()
    for typed in ("", " ", "a", "y", "yes", "OK", "0", "allo", "allowed", "allow refuse", "al low", "аllow"):
        desk.type(typed + "\n")
        desk.wait_for(PROMPT)
        assert not alert.answered
    desk.type("x" * 3000 + "\n")
    desk.wait_for("is no answer")
    desk.type("refuse\n")
    assert alert.answer() == REFUSE


def test_alerts_are_answered_one_after_the_other(desk):
    assert [desk.answers(word) for word in ("refuse", "allow", "refuse")] == [REFUSE, ALLOW, REFUSE]


def test_a_second_alert_is_not_taken_while_one_is_open(desk):
    first = desk.show()
    assert desk.rvd.show(desk.agent, description()).failure().name == FAILED
    desk.type("allow\n")
    assert first.answer() == ALLOW


@pytest.mark.parametrize("missing", ["message", "default_button_title", "alternate_button_title"])
@pytest.mark.parametrize("value", [None, "", " \u200b\u202e\n"], ids=["missing", "empty", "invisible"])
def test_a_blank_alert_is_an_error_and_is_not_shown(desk, missing, value):
    assert desk.rvd.show(desk.agent, description(**{missing: value})).failure().name == FAILED
    assert "Asked by" not in desk.terminal.screen.text


# ---- what was typed too early ----


def test_a_word_that_was_begun_before_the_alert_is_thrown_away(desk):
    desk.type("allow")
    desk.wait_for("allow")  # the terminal has it
    alert = desk.show()
    desk.type("\n")
    desk.wait_for(PROMPT)
    assert not alert.answered
    desk.type("refuse\n")
    assert alert.answer() == REFUSE


def test_lines_that_were_typed_before_the_alert_are_thrown_away(desk):
    desk.terminal.popen.send_signal(signal.SIGSTOP)
    desk.type("allow\n" * 50)
    desk.wait_for("(allow\\s+){50}")
    alert = desk.rvd.show(desk.agent, description())
    desk.rvd.connection.driver("GetId", None)  # the bus has the alert
    desk.terminal.popen.send_signal(signal.SIGCONT)
    desk.wait_for(PROMPT)
    desk.type("refuse\n")
    assert alert.answer() == REFUSE


def test_what_is_typed_while_nothing_is_asked_answers_nothing(desk):
    desk.type("allow\n")
    desk.wait_for("Nothing is being asked")
    assert desk.answers("refuse") == REFUSE


def test_lines_in_a_pipe_before_the_alert_are_thrown_away(piped):
    rvd, process = piped()
    agent = rvd.agent()
    process.stdout.wait_for(READY)
    process.send_signal(signal.SIGSTOP)
    enter(process, b"allow\nallow\nallo")
    alert = rvd.show(agent, description())
    rvd.connection.driver("GetId", None)
    process.send_signal(signal.SIGCONT)
    process.stdout.wait_for(PROMPT)
    enter(process, b"w\n")
    process.stdout.wait_for("\"w\" is no answer")
    enter(process, b"refuse\n")
    assert alert.answer() == REFUSE


# ---- what ends an alert otherwise ----


def test_an_alert_that_is_withdrawn_is_taken_down_and_answers_that_no_button_was_pressed(desk):
    alert = desk.show()
    desk.rvd.dismiss(desk.agent, alert.id)
    assert alert.answer() == OTHER
    desk.wait_for("The alert was withdrawn. Nothing was answered.")
    desk.type("allow\n")
    desk.wait_for("Nothing is being asked")
    assert desk.answers("refuse") == REFUSE


def test_withdrawing_another_alert_changes_nothing(desk):
    alert = desk.show()
    desk.rvd.dismiss(desk.agent, "another")
    assert not alert.answered
    desk.type("allow\n")
    assert alert.answer() == ALLOW


def interrupts(desk):
    desk.type(INTERRUPT)


def ends_the_input(desk):
    desk.type(END_OF_INPUT)


def ends_the_input_within_a_word(desk):
    desk.type("allow" + END_OF_INPUT + END_OF_INPUT)


def terminates(desk):
    desk.terminal.popen.terminate()


@pytest.mark.parametrize("leave", [interrupts, ends_the_input, ends_the_input_within_a_word, terminates])
def test_an_agent_that_leaves_unregisters_and_leaves_its_alert_unanswered(desk, leave):
    alert = desk.show()
    leave(desk)
    assert desk.rvd.agent_that_left() == desk.agent[:2]
    assert alert.failure().name == NO_REPLY
    assert desk.terminal.wait() == DONE


@pytest.mark.parametrize("leave", [interrupts, ends_the_input, terminates])
def test_an_agent_without_an_alert_leaves_when_it_is_told_to(desk, leave):
    leave(desk)
    assert desk.rvd.agent_that_left() == desk.agent[:2]
    assert desk.terminal.wait() == DONE


def test_an_answer_in_a_file_answers_nothing(piped, tmp_path):
    path = tmp_path / "answers"
    path.write_text("allow\n" * 100)
    with open(path, "rb") as file:
        rvd, process = piped(stdin=file)
        agent = rvd.agent()
    assert rvd.agent_that_left() == agent[:2]
    assert process.wait() == DONE
    assert "Answered" not in process.stdout.text


def test_a_pipe_that_is_closed_after_the_answer_still_gives_it(piped):
    rvd, process = piped()
    alert = rvd.show(rvd.agent(), description())
    process.stdout.wait_for(PROMPT)
    process.popen.stdin.write(b"allow\n")
    process.popen.stdin.close()
    assert alert.answer() == ALLOW
    assert process.wait() == DONE


def test_an_agent_that_cannot_be_read_shows_nothing_and_answers_nothing(bare_world):
    bare_world.start_bus()
    rvd = FakeRvd(bare_world.bus.connect())
    command = f"exec {bare_world.programs.rvctl} agent >/dev/full"
    process = bare_world.keep(Process(["sh", "-c", command], bare_world.environment, subprocess.PIPE))
    rvd.agent()
    assert process.wait() == IMPOSSIBLE
    assert "cannot be written" in process.stderr.text


# ---- who may call ----


def test_nobody_but_the_daemon_shows_or_withdraws_an_alert(desk):
    stranger = desk.world.bus.connect()
    shown = desk.rvd.show(desk.agent, description(message="from a stranger"), by=stranger)
    assert shown.failure().name == ACCESS_DENIED
    alert = desk.show()
    with pytest.raises(BusError, match=ACCESS_DENIED):
        desk.rvd.dismiss(desk.agent, alert.id, by=stranger)
    assert not alert.answered
    assert "from a stranger" not in desk.terminal.screen.text
    desk.type("allow\n")
    assert alert.answer() == ALLOW


def test_a_daemon_that_stopped_shows_nothing_any_more(desk):
    former = desk.rvd.connection
    alert = desk.show()
    desk.rvd.leave()
    desk.wait_for("The alert was withdrawn")
    desk.wait_for("rvd has stopped")
    assert not alert.answered
    assert desk.rvd.show(desk.agent, description(), by=former).failure().name == ACCESS_DENIED


def test_the_agent_registers_with_the_next_daemon(desk):
    desk.show()
    desk.rvd.leave()
    desk.wait_for("rvd has stopped")
    desk.rvd = FakeRvd(desk.world.bus.connect())
    desk.agent = desk.rvd.agent()
    desk.wait_for(READY)
    assert desk.answers("allow") == ALLOW


def test_a_bus_that_ends_ends_the_agent(desk):
    desk.world.bus.process.end()
    assert desk.terminal.wait() == IMPOSSIBLE


# ---- as JSON ----


def test_events_are_printed_as_json_lines(piped):
    rvd, process = piped("--json")
    agent = rvd.agent()
    first = rvd.show(agent, description(message="a\u202eb"))
    process.stdout.wait_for('"prompt"')
    enter(process, b"perhaps\nallow\n")
    assert first.answer() == ALLOW
    second = rvd.show(agent, description(client_id=None, evidence=None))
    process.stdout.wait_for('(?s)"answered".*"prompt"')
    rvd.dismiss(agent, second.id)
    assert second.answer() == OTHER
    process.popen.stdin.close()
    assert process.wait() == DONE
    assert process.stdout.text.isascii()
    events = [json.loads(line) for line in process.stdout.text.splitlines()]
    alert = {
        "event": "alert",
        "header": "Facebook",
        "message": "a\u202eb",
        "default_button_title": "OK",
        "alternate_button_title": "Don’t Allow",
        "client_id": "org.example.PhotoApp",
        "evidence": "registered",
    }
    prompt = {"event": "prompt", "default_button": "allow", "alternate_button": "refuse"}
    assert events[:6] == [
        {"event": "registered"},
        alert,
        prompt,
        {"event": "not_an_answer", "line": "perhaps"},
        prompt,
        {"event": "answered", "response_flags": 0},
    ]
    assert [event["event"] for event in events[6:]] == ["alert", "prompt", "taken_down"]
    assert "client_id" not in events[6]
