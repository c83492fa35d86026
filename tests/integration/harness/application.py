"""Sample applications: each a connection of its own that asks rvd for access."""

import concurrent.futures
import os

from gi.repository import GLib

from harness import DEADLINE
from harness.bus import ACCOUNTS, MANAGEMENT

FACEBOOK = "com.zentor.facebook"


class Pending:
    """A request that may not be answered yet."""

    def __init__(self, future):
        self._future = future

    @property
    def answered(self):
        return self._future.done()

    def answer(self):
        """Waits for the answer: (granted, error)."""
        return self._future.result(DEADLINE)

    @staticmethod
    def first_of(requests):
        """Waits until one of them is answered, and tells which."""
        by_future = {request._future: request for request in requests}
        done, _ = concurrent.futures.wait(by_future, DEADLINE, concurrent.futures.FIRST_COMPLETED)
        return by_future[next(iter(done))]


def options(app_id="4711", permissions=None, audience=None, **others):
    """The options of a request as rvd takes them. Others: GLib.Variant by key."""
    values = dict(others)
    if app_id is not None:
        values["app_id"] = GLib.Variant("s", app_id)
    if permissions is not None:
        values["permissions"] = GLib.Variant("as", permissions)
    if audience is not None:
        values["audience"] = GLib.Variant("s", audience)
    return values


class Application:
    def __init__(self, connection, app_id=None):
        self.connection = connection
        self.app_id = app_id

    def register(self, app_id=None):
        self.connection.call(ACCOUNTS, "Register", GLib.Variant("(s)", (self.app_id if app_id is None else app_id,)))

    def start_request(self, permissions=None, interact=True, account_type=FACEBOOK, **others):
        return self.start_request_with(options(permissions=permissions, **others), interact, account_type)

    def start_request_with(self, values, interact=True, account_type=FACEBOOK):
        parameters = GLib.Variant("(sa{sv}b)", (account_type, values, interact))
        return Pending(self.connection.send(ACCOUNTS, "RequestAccess", parameters))

    def request(self, permissions=None, **others):
        """Asks for access, and waits for the answer: (granted, error)."""
        return self.start_request(permissions, **others).answer()

    def access(self):
        """What it holds: (state, permissions, options)."""
        return self.connection.call(ACCOUNTS, "GetAccess", GLib.Variant("(s)", (FACEBOOK,)))

    def credential(self):
        return self.connection.call(ACCOUNTS, "GetCredential", GLib.Variant("(s)", (FACEBOOK,)))

    def token(self):
        return self.credential()["oauth_token"]

    def leave(self):
        self.connection.close()


class Manager:
    """What the device's user does through a tool."""

    def __init__(self, connection):
        self.connection = connection

    def _call(self, method, signature=None, *values, fds=()):
        parameters = GLib.Variant(signature, values) if signature else None
        return self.connection.call(MANAGEMENT, method, parameters, fds=fds)

    def add_account(self, token="master-token", username="ada", account_type=FACEBOOK):
        """token: text or bytes that are written to a pipe, or a file descriptor that is handed over."""
        if isinstance(token, int):
            return self._call("AddAccount", "(ssh)", account_type, username, 0, fds=[token])
        data = token.encode() if isinstance(token, str) else token
        reading = os.memfd_create("token")
        try:
            os.write(reading, data)
            os.lseek(reading, 0, os.SEEK_SET)
            return self._call("AddAccount", "(ssh)", account_type, username, 0, fds=[reading])
        finally:
            os.close(reading)

    def remove_account(self, account_id):
        return self._call("RemoveAccount", "(s)", account_id)

    def accounts(self):
        return self._call("ListAccounts")

    def authorizations(self):
        """The records by client ID."""
        records = self._call("ListAuthorizations", "(s)", FACEBOOK)
        return {record["client_id"]: record for record in records}

    def authorize(self, client_id):
        return self._call("AuthorizeAccess", "(ss)", FACEBOOK, client_id)

    def revoke(self, client_id):
        return self._call("RevokeAccess", "(ss)", FACEBOOK, client_id)

    def start_authorize(self, client_id):
        parameters = GLib.Variant("(ss)", (FACEBOOK, client_id))
        return Pending(self.connection.send(MANAGEMENT, "AuthorizeAccess", parameters))

    def revoke_all(self):
        return self._call("RevokeAllAccess", "(s)", FACEBOOK)

    def pending_revocations(self, account_type=FACEBOOK):
        return self._call("ListPendingRevocations", "(s)", account_type)

    def forget_refusal(self, client_id):
        return self._call("ForgetRefusal", "(ss)", FACEBOOK, client_id)

    def access_log(self, limit=1000):
        return self._call("ListAccessLog", "(u)", limit)

    def preference(self, key, application_id="com.zentor.tessel.facebook"):
        return self._call("GetPreference", "(ss)", application_id, key)

    def set_preference(self, key, value, application_id="com.zentor.tessel.facebook"):
        return self._call("SetPreference", "(ssv)", application_id, key, value)

    def reset_preference(self, key, application_id="com.zentor.tessel.facebook"):
        return self._call("ResetPreference", "(ss)", application_id, key)

    def post_notification(self, name="TKFacebookEnvironmentDidChangeNotification"):
        return self._call("PostNotification", "(s)", name)
