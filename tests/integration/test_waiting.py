"""Requests that wait at the same time: whose turn it is, and what an answer settles for the others."""

from harness.agent import ALLOW
from harness.bus import BusError
from harness.expect import GRANTED, LIMITS_EXCEEDED, REFUSED_WITHOUT_ERROR, USER_REFUSED


def test_what_an_answer_has_settled_is_not_asked_again(world):
    world.manager().add_account()
    agent = world.agent()
    application = world.application()
    both = application.start_request(["user_photos", "email"])
    alert = agent.next()
    one = application.start_request(["user_photos"])
    other = application.start_request(["email"])
    alert.allow()
    assert [pending.answer() for pending in (both, one, other)] == [GRANTED] * 3
    assert agent.asked() == 1


def test_a_refusal_settles_what_else_waits_of_a_client_without_a_grant(world):
    manager = world.manager()
    manager.add_account()
    agent = world.agent()
    application = world.application()
    first = application.start_request(["user_photos"])
    alert = agent.next()
    second = application.start_request(["email"])
    alert.refuse()
    assert first.answer() == USER_REFUSED
    assert second.answer() == REFUSED_WITHOUT_ERROR
    assert agent.asked() == 1
    assert len(manager.access_log()) == 1


def test_what_an_answer_leaves_open_is_asked_alone(wired_world, wire):
    wired_world.manager().add_account()
    agent = wired_world.agent()
    application = wired_world.application()
    first = application.start_request(["user_photos"])
    alert = agent.next()
    second = application.start_request(["user_photos", "email"])
    alert.allow()
    assert first.answer() == GRANTED
    agent.next().allow()
    assert second.answer() == GRANTED
    assert [asked.parameters["permissions"] for asked in wire.asked("/authorize")] == ["user_photos", "email"]


def test_the_answer_to_one_client_settles_nothing_for_another(world):
    world.manager().add_account()
    agent = world.agent(answer=ALLOW)
    one = world.application("org.example.One", "One").start_request(["email"])
    other = world.application("org.example.Other", "Other").start_request(["email"])
    assert one.answer() == other.answer() == GRANTED
    assert agent.asked() == 2


def test_a_client_with_many_requests_delays_another_by_no_more_than_one(world):
    world.manager().add_account()
    agent = world.agent()
    eager = world.application("org.example.Eager", "Eager")
    names = ["email", "user_photos", "user_videos", "user_status", "user_likes", "user_events"]
    pending = [eager.start_request([name]) for name in names]
    first = agent.next()
    pending.append(world.application("org.example.Patient", "Patient").start_request(["email"]))
    order = [first.description["client_id"]]
    first.allow()
    for _ in names:
        alert = agent.next()
        order.append(alert.description["client_id"])
        alert.allow()
    assert all(one.answer() == GRANTED for one in pending)
    # It may have come a moment after the first answer.
    assert order.index("org.example.Patient") <= 2, order


def test_a_client_that_asks_too_often_is_turned_away_and_another_is_not(bare_world, standin):
    bare_world.start_bus()
    bare_world.configure(standin.url, limits={"CallsPerSecond": 1})
    bare_world.start_daemon()
    manager = bare_world.manager()
    manager.add_account()
    agent = bare_world.agent(answer=ALLOW)
    eager = bare_world.application("org.example.Eager", "Eager")
    other = bare_world.application("org.example.Other", "Other")
    asked = [eager.start_request([name]) for name in ("email", "user_photos", "user_likes", "user_videos")]
    assert asked[0].answer() == GRANTED
    turned_away = 0
    for pending in asked[1:]:
        try:
            pending.answer()
        except BusError as error:
            assert error.name == LIMITS_EXCEEDED
            turned_away += 1
    assert turned_away >= 1
    assert other.request(["email"]) == GRANTED
    assert agent.asked() == len(manager.access_log()) == 2 + len(asked) - 1 - turned_away
