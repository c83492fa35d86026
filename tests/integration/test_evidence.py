"""Records and log entries keep how their client was known, and what is known less surely is another client."""

import hashlib
import os
import sqlite3
import struct

from harness.agent import ALLOW
from harness.application import FACEBOOK
from harness.expect import ACCOUNTS_DOMAIN, GRANTED, NO_ACCESS, bus_error

PHOTO = "org.example.PhotoApp"
SCOPE = 2


def number(value):
    return struct.pack("<q", value)


def text(value):
    return number(len(value)) + value


def optional(value):
    return number(0) if value is None else number(1) + text(value)


def digest(account_type, client_id, granted, permissions, options, changed, evidence):
    content = text(account_type) + text(client_id) + number(granted) + optional(permissions) + optional(options)
    content += number(changed) + (number(evidence) if evidence else b"")
    return hashlib.blake2b(content, digest_size=16).digest()


def set_evidence(world, client_id, evidence):
    """Makes a record one of a client that was known with this evidence, over a restart."""
    world.stop_daemon()
    database = sqlite3.connect(os.path.join(world.state_dir, "accounts.db"))
    database.text_factory = bytes
    columns = "account_type, client_id, granted, permissions, options, changed"
    where = "WHERE account_type = ? AND client_id = ?"
    row = database.execute(f"SELECT {columns}, evidence, digest FROM authorizations {where}", (FACEBOOK, client_id))
    *content, before, written = row.fetchone()
    assert written == digest(*content, before), "docs/storage.md does not say how the digest is made"
    database.execute(
        f"UPDATE authorizations SET evidence = ?, digest = ? {where}",
        (evidence, digest(*content, evidence), FACEBOOK, client_id),
    )
    database.commit()
    database.close()
    world.start_daemon()


def test_records_and_log_entries_say_how_the_client_was_known(world):
    manager = world.manager()
    manager.add_account()
    world.agent(answer=ALLOW)
    assert world.application().request(["email"]) == GRANTED
    assert manager.authorize("org.example.Direct") == GRANTED
    assert manager.authorizations()[PHOTO]["evidence"] == "registered"
    assert manager.authorizations()["org.example.Direct"]["evidence"] == "unknown"
    direct, request = manager.access_log()
    assert (direct["client_id"], direct["evidence"]) == ("org.example.Direct", "unknown")
    assert (request["client_id"], request["evidence"]) == (PHOTO, "registered")


def test_what_the_user_changes_keeps_its_evidence(world):
    manager = world.manager()
    manager.add_account()
    world.agent(answer=ALLOW)
    world.application().request(["email"])
    assert manager.revoke(PHOTO) == GRANTED
    assert manager.authorizations()[PHOTO]["evidence"] == "registered"
    assert manager.authorize(PHOTO) == GRANTED
    assert manager.authorizations()[PHOTO]["evidence"] == "registered"


def test_what_the_user_granted_is_used_by_the_registered_client(world):
    manager = world.manager()
    manager.add_account()
    world.agent(answer=ALLOW)
    assert manager.authorize(PHOTO) == GRANTED
    application = world.application()
    assert application.access()[0] == "granted"
    assert application.request(["email"]) == GRANTED
    assert manager.authorizations()[PHOTO]["evidence"] == "registered"
    assert application.token()


def test_a_record_of_stronger_evidence_is_nothing_to_a_weaker_caller(world):
    manager = world.manager()
    manager.add_account()
    application = world.application()
    agent = world.agent()
    pending = application.start_request(["email"])
    agent.next().answer(ALLOW)
    assert pending.answer() == GRANTED
    set_evidence(world, PHOTO, SCOPE)

    before = manager.authorizations()
    assert before[PHOTO]["evidence"] == "scope"
    weaker = world.application()
    assert weaker.access() == ("none", [], {})
    with bus_error(NO_ACCESS):
        weaker.credential()
    agent = world.agent()
    pending = weaker.start_request(["email"])
    alert = agent.next()
    assert PHOTO not in alert.message and "Photo App" not in alert.message
    alert.answer(ALLOW)
    granted, error = pending.answer()
    assert (granted, error["domain"], error["code"]) == (False, ACCOUNTS_DOMAIN, 16)
    assert manager.authorizations() == before
    assert [entry.get("client_id") for entry in manager.access_log()] == [None, PHOTO]

    # The client itself, known as surely as then, would find everything as it was.
    set_evidence(world, PHOTO, 1)
    assert world.application().access()[0] == "granted"
    assert world.application().token()


def test_a_standing_refusal_of_stronger_evidence_is_not_talked_over(world):
    manager = world.manager()
    manager.add_account()
    world.agent(answer=ALLOW)
    world.application().request(["email"])
    manager.revoke(PHOTO)
    set_evidence(world, PHOTO, SCOPE)
    world.agent(answer=ALLOW)
    weaker = world.application()
    assert weaker.access()[0] == "none"
    granted, error = weaker.request(["email"])
    assert (granted, error["code"]) == (False, 16)
    assert not manager.authorizations()[PHOTO]["granted"]
