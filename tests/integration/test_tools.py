"""rvctl and its agent with a real rvd: what a person does with them, from the account to its removal."""

import json
import os

import pytest

from harness.processes import Process, run
from harness.terminal import Terminal

PHOTO_APP = "org.example.PhotoApp"
TOKEN = "the-master-token-of-ada"
PROMPT = "Type allow or refuse, then Enter: "
DONE, REFUSED, IMPOSSIBLE = 0, 1, 3


class Person:
    """Somebody with a terminal."""

    def __init__(self, world):
        self.world = world
        world.install(PHOTO_APP, "Photo App")

    def rvctl(self, *arguments, stdin=b""):
        return run([self.world.programs.rvctl, *arguments], self.world.environment, stdin)

    def ask(self, *arguments):
        """What rvctl prints as JSON, and what it ends with."""
        status, out, _ = self.rvctl(*arguments, "--json")
        return status, json.loads(out)

    def start(self, *arguments, **others):
        arguments = [self.world.programs.rvctl, *arguments]
        return self.world.keep(Process(arguments, self.world.environment, **others))

    def start_request(self, permissions="email"):
        return self.start(
            "request", "--as", PHOTO_APP, "--app-id", "4711", "--permissions", permissions, "--json"
        )

    def agent(self):
        terminal = self.world.keep(
            Terminal([self.world.programs.rvctl, "agent"], self.world.environment)
        )
        terminal.screen.wait_for("Ready")
        return terminal

    def answer(self, agent, word):
        """Answers the next alert of the agent."""
        agent.screen.wait_for(PROMPT)
        agent.type(word + "\n")
        agent.screen.wait_for("Answered")


@pytest.fixture
def person(world):
    person = Person(world)
    assert person.rvctl("account", "add", "ada", stdin=TOKEN.encode() + b"\n")[0] == DONE
    return person


def outcome(process):
    return process.wait(), json.loads(process.stdout.text)


def test_access_is_granted_used_and_taken_away(person):
    agent = person.agent()
    request = person.start_request()
    person.answer(agent, "allow")
    assert outcome(request) == (DONE, {"granted": True, "error": None})
    assert "Photo App" in agent.screen.text

    access = {"state": "granted", "permissions": ["email"], "options": {"app_id": "4711"}}
    assert person.ask("access", "--as", PHOTO_APP) == (DONE, access)
    reading, writing = os.pipe()
    handing = person.start("access", "--as", PHOTO_APP, "--credential-fd", str(writing), pass_fds=[writing])
    os.close(writing)
    assert handing.wait() == DONE
    with os.fdopen(reading) as file:
        token = file.read()
    assert token.endswith("\n") and len(token) > 8 and TOKEN not in token
    assert token.strip() not in handing.stdout.text + handing.stderr.text

    (record,) = person.ask("list")[1]["authorizations"]
    assert (record["client_id"], record["name"], record["granted"]) == (PHOTO_APP, "Photo App", True)
    assert person.ask("revoke", PHOTO_APP) == (DONE, {"succeeded": True, "error": None, "server": "told"})
    assert person.ask("access", "--as", PHOTO_APP)[0] == REFUSED
    entries = person.ask("log")[1]["entries"]
    assert [(entry["granted"], entry["requested"]) for entry in entries] == [(False, False), (True, True)]


def test_a_refusal_stands_until_it_is_forgotten(person):
    agent = person.agent()
    request = person.start_request()
    person.answer(agent, "refuse")
    assert outcome(request)[0] == REFUSED
    assert outcome(person.start_request())[0] == REFUSED
    assert person.ask("forget", PHOTO_APP) == (DONE, {"forgotten": PHOTO_APP})
    position = len(agent.screen.text)
    request = person.start_request()
    agent.screen.wait_for(PROMPT, position)
    agent.type("allow\n")
    assert outcome(request)[0] == DONE


def test_a_request_that_is_given_up_takes_its_alert_down(person):
    agent = person.agent()
    request = person.start_request()
    agent.screen.wait_for(PROMPT)
    request.end()
    agent.screen.wait_for("The alert was withdrawn")
    assert person.ask("list")[1]["authorizations"] == []


def test_an_alert_of_an_agent_that_ends_is_shown_by_the_next(person):
    first = person.agent()
    request = person.start_request()
    first.screen.wait_for(PROMPT)
    first.type("\x03")
    assert first.wait() == DONE
    assert request.running
    person.answer(person.agent(), "allow")
    assert outcome(request)[0] == DONE


def test_an_agent_outlives_its_daemon(person):
    agent = person.agent()
    person.world.crash_daemon()
    agent.screen.wait_for("(?s)rvd has stopped.*Ready")
    request = person.start_request()
    person.answer(agent, "allow")
    assert outcome(request)[0] == DONE


def test_ignoring_requests_is_in_effect_at_once(person):
    key = "TKFacebookIgnoreAccessRequests"
    agent = person.agent()

    def ask():
        position = len(agent.screen.text)
        request = person.start_request()
        agent.screen.wait_for(PROMPT, position)
        agent.type("allow\n")
        return outcome(request)[0]

    assert person.ask("preference", "set", key, "false")[0] == DONE
    assert person.ask("preference", "set", key, "true") == (DONE, {"key": key, "value": True})
    assert ask() == REFUSED
    assert person.ask("preference", "get", key) == (DONE, {"key": key, "value": True})
    assert person.ask("preference", "reset", key) == (DONE, {"key": key, "value": None})
    assert ask() == DONE


def test_a_client_is_authorized_directly(person):
    assert person.ask("authorize", PHOTO_APP) == (DONE, {"succeeded": True, "error": None})
    assert person.ask("revoke", "--all") == (DONE, {"succeeded": True, "error": None, "server": "nothing"})


def test_an_account_is_removed(person):
    (account,) = person.ask("account", "list")[1]["accounts"]
    assert account["username"] == "ada"
    assert person.ask("account", "remove", "another")[0] == IMPOSSIBLE
    assert person.ask("account", "remove", account["id"]) == (DONE, {"removed": account["id"], "server": "nothing"})
    assert person.ask("account", "list") == (DONE, {"accounts": []})
    status, document = outcome(person.start_request())
    assert status == REFUSED
    assert document["error"]["code"] == 6


def test_a_token_is_in_nothing_that_the_tools_print(person):
    for arguments in (["account", "list"], ["list"], ["log"], ["access"]):
        for flags in ([], ["--json"]):
            _, out, err = person.rvctl(*arguments, *flags)
            assert TOKEN not in out + err


def test_a_deep_preference_that_the_daemon_takes_comes_back(person):
    value = "[" * 16 + "]" * 16
    assert person.rvctl("preference", "set", "Deep", value)[0] == DONE
    assert person.rvctl("preference", "get", "Deep")[1] == value + "\n"
