"""A server for rvd that is told what to answer, and remembers what it was asked.

rvd-standin plays the server that behaves; this one records the bytes on the wire and can do what no server
should."""

import json
import queue
import secrets
import socket
import struct
import threading
from urllib.parse import parse_qs

from harness import DEADLINE


class Exchange:
    """One request that the server received."""

    def __init__(self, connection, path, headers, body):
        self._connection = connection
        self.path = path
        self.headers = headers
        self.body = body
        self.parameters = {
            key: values[0] for key, values in parse_qs(body, keep_blank_values=True, strict_parsing=bool(body)).items()
        }

    @property
    def bearer(self):
        kind, _, token = self.headers.get("authorization", "").partition(" ")
        return token if kind == "Bearer" else None

    def write(self, data):
        self._connection.sendall(data)

    def read_until_closed(self):
        """Waits until the other side has closed the connection."""
        try:
            while self._connection.recv(65536):
                pass
        except ConnectionError:
            pass

    def reset(self):
        """Breaks the connection off hard."""
        self._connection.setsockopt(socket.SOL_SOCKET, socket.SO_LINGER, struct.pack("ii", 1, 0))


def answer(body, status="200 OK", headers=()):
    """What answers with this body: bytes, text, or anything that becomes JSON."""
    if not isinstance(body, (bytes, str)):
        body = json.dumps(body)
    if isinstance(body, str):
        body = body.encode()
    lines = [f"HTTP/1.1 {status}", f"Content-Length: {len(body)}", "Connection: close", *headers]
    return lambda exchange: exchange.write("\r\n".join(lines).encode() + b"\r\n\r\n" + body)


def issue_token(exchange):
    """What a server that agrees to everything answers to an authorize exchange."""
    names = [name for name in exchange.parameters.get("permissions", "").split(",") if name]
    answer({"access_token": "client-" + secrets.token_hex(16), "permissions": names})(exchange)


class WireServer:
    """Listens on a loopback port. Each answer is a function of the exchange; the first of those told with
    on() that are left for a path is used, and after them the path's usual one."""

    def __init__(self):
        self.exchanges = []
        self._arrived = queue.Queue()
        self._answers = {}
        self._usual = {"/authorize": issue_token, "/describe": answer('"API_EC_PARAM"'), "/revoke": answer("{}")}
        self._lock = threading.Lock()
        self._connections = set()
        self._listener = socket.create_server(("127.0.0.1", 0), backlog=128)
        self.url = f"http://127.0.0.1:{self._listener.getsockname()[1]}"
        self._thread = threading.Thread(target=self._accept, daemon=True)
        self._thread.start()

    def on(self, path, *answers):
        with self._lock:
            self._answers.setdefault(path, []).extend(answers)

    def always(self, path, usual):
        with self._lock:
            self._usual[path] = usual

    def next(self):
        """The next request, when it is there."""
        try:
            return self._arrived.get(timeout=DEADLINE)
        except queue.Empty:
            raise AssertionError("nothing was asked of the server") from None

    def asked(self, path):
        with self._lock:
            return [exchange for exchange in self.exchanges if exchange.path == path]

    def _accept(self):
        while True:
            try:
                connection, _ = self._listener.accept()
            except OSError:
                return
            threading.Thread(target=self._serve, args=(connection,), daemon=True).start()

    def _serve(self, connection):
        with self._lock:
            self._connections.add(connection)
        try:
            with connection:
                exchange = self._read(connection)
                if exchange is None:
                    return
                with self._lock:
                    self.exchanges.append(exchange)
                    answers = self._answers.get(exchange.path)
                    respond = answers.pop(0) if answers else self._usual[exchange.path]
                self._arrived.put(exchange)
                respond(exchange)
        except (BrokenPipeError, ConnectionError):
            pass  # whoever asked does not want to know any more
        finally:
            with self._lock:
                self._connections.discard(connection)

    @staticmethod
    def _read(connection):
        data = b""
        while b"\r\n\r\n" not in data:
            chunk = connection.recv(65536)
            if not chunk:
                return None
            data += chunk
        head, _, body = data.partition(b"\r\n\r\n")
        request, *lines = head.decode().split("\r\n")
        method, path, _ = request.split(" ")
        headers = {name.lower(): value.strip() for name, _, value in (line.partition(":") for line in lines)}
        assert method == "POST", request
        while len(body) < int(headers.get("content-length", "0")):
            body += connection.recv(65536)
        return Exchange(connection, path, headers, body.decode())

    def dispose(self):
        self._listener.shutdown(socket.SHUT_RDWR)
        self._listener.close()
        with self._lock:
            open_connections = list(self._connections)
        for connection in open_connections:
            try:
                connection.shutdown(socket.SHUT_RDWR)
            except OSError:
                pass
        self._thread.join(DEADLINE)
