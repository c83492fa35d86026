"""What answers look like."""

ACCOUNTS_DOMAIN = "com.zentor.accounts"
TRANSFER_DOMAIN = "com.zentor.transfer"
JSON_DOMAIN = "com.zentor.json"

GRANTED = (True, {})
REFUSED_WITHOUT_ERROR = (False, {})
NO_ACCOUNT = (False, {"domain": ACCOUNTS_DOMAIN, "code": 6})
USER_REFUSED = (False, {"domain": ACCOUNTS_DOMAIN, "code": 7})
INVALID_OPTIONS = (False, {"domain": ACCOUNTS_DOMAIN, "code": 8})

INVALID_ARGS = "org.freedesktop.DBus.Error.InvalidArgs"
ACCESS_DENIED = "org.freedesktop.DBus.Error.AccessDenied"
UNSUPPORTED_TYPE = "com.zentor.rvd.Error.UnsupportedAccountType"
UNKNOWN_APPLICATION = "com.zentor.rvd.Error.UnknownApplication"
ALREADY_IDENTIFIED = "com.zentor.rvd.Error.AlreadyIdentified"
NO_ACCESS = "com.zentor.rvd.Error.NoAccess"
LIMITS_EXCEEDED = "com.zentor.rvd.Error.LimitsExceeded"
FAILED = "com.zentor.rvd.Error.Failed"


def bus_error(name):
    """An expectation: with bus_error(NO_ACCESS): …"""
    return _ExpectedBusError(name)


class _ExpectedBusError:
    def __init__(self, name):
        self._name = name
        self.message = None

    def __enter__(self):
        return self

    def __exit__(self, _kind, error, _trace):
        from harness.bus import BusError

        assert error is not None, f"no error came, {self._name} was expected"
        if not isinstance(error, BusError):
            return False
        assert error.name == self._name, f"{self._name} was expected, {error} came"
        assert error.message, "the error has no text"
        self.message = error.message
        return True
