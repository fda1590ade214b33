"""Account servers of a test's own: over TLS, with certificates from an authority of its own, and over Unix sockets."""

import json
import socket
import ssl
import subprocess
import threading
from pathlib import Path

HOST = "accounts.example"
CONFIGURATION = """[ca]
default_ca = own
[own]
database = {folder}/index
serial = {folder}/serial
new_certs_dir = {folder}
default_md = sha256
policy = any
unique_subject = no
x509_extensions = named
[any]
commonName = supplied
[named]
subjectAltName = DNS:{host}
"""


def openssl(*arguments):
    subprocess.run(["openssl", *map(str, arguments)], check=True, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL)


class Authority:
    """Issues certificates; `certificate` is its own, for those who trust it."""

    def __init__(self, folder):
        self.folder = Path(folder)
        self.folder.mkdir()
        self.certificate, self._key = self.folder / "authority.pem", self.folder / "authority.key"
        openssl("req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-days", "30",
                "-subj", "/CN=test authority", "-addext", "basicConstraints=critical,CA:TRUE",
                "-keyout", self._key, "-out", self.certificate)
        (self.folder / "index").write_text("", encoding="ascii")
        (self.folder / "serial").write_text("01\n", encoding="ascii")

    def issue(self, name, host=HOST, start="20200101000000Z", end="20490101000000Z"):
        """The files of a certificate for a host, and of its key."""
        base = self.folder / name
        (self.folder / "ca.conf").write_text(CONFIGURATION.format(folder=self.folder, host=host), encoding="ascii")
        openssl("req", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-subj", f"/CN={name}",
                "-keyout", f"{base}.key", "-out", f"{base}.csr")
        openssl("ca", "-batch", "-config", self.folder / "ca.conf", "-cert", self.certificate, "-keyfile", self._key,
                "-in", f"{base}.csr", "-out", f"{base}.pem", "-startdate", start, "-enddate", end, "-notext")
        return f"{base}.pem", f"{base}.key"

    def self_signed(self, host=HOST):
        base = self.folder / "self"
        openssl("req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-days", "30",
                "-subj", "/CN=self", "-addext", f"subjectAltName=DNS:{host}", "-keyout", f"{base}.key", "-out", f"{base}.pem")
        return f"{base}.pem", f"{base}.key"


def answer(status, body, kind="application/json", fields=""):
    content = (body if isinstance(body, str) else json.dumps(body)).encode()
    head = f"HTTP/1.1 {status} Whatever\r\nContent-Type: {kind}\r\nContent-Length: {len(content)}\r\n{fields}\r\n"
    return head.encode() + content


def problem(status, name, **more):
    return answer(status, {"type": f"urn:welcomer:problem:{name}", "status": status, **more}, "application/problem+json")


class Server:
    """Answers each request with what a function makes of it, (line, body) -> bytes; one connection for each.

    Without a certificate it answers what is no HTTP as other such servers do, unless it is silent.
    """

    def __init__(self, reply, certificate=None, path=None, context=None, is_silent=False):
        self.requests, self.connections, self._is_silent = [], 0, is_silent
        self._reply, self._context = reply, context
        if certificate:
            self._context = context or ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
            self._context.load_cert_chain(*certificate)
        self._socket = socket.socket(socket.AF_UNIX if path else socket.AF_INET)
        self._socket.bind(str(path) if path else ("127.0.0.1", 0))
        self._socket.listen(64)
        self.port = None if path else self._socket.getsockname()[1]
        self._open = []
        self._thread = threading.Thread(target=self._serve, daemon=True)
        self._thread.start()

    def close(self):
        self._socket.shutdown(socket.SHUT_RDWR)
        self._thread.join(timeout=60)
        self._socket.close()

    def _serve(self):
        while True:
            try:
                connection, _ = self._socket.accept()
            except OSError:
                return
            self.connections += 1
            connection.settimeout(60)
            try:
                with self._context.wrap_socket(connection, server_side=True) if self._context else connection as stream:
                    self._serve_one(stream)
            except OSError:
                connection.close()

    def _serve_one(self, stream):
        data = b""
        while b"\r\n\r\n" not in data:
            more = stream.recv(65536)
            if not more:
                return
            data += more
            if data.startswith(b"\x16\x03") and not self._is_silent:
                stream.sendall(b"HTTP/1.1 400 Bad Request\r\n\r\n")
                return
        head, body = data.split(b"\r\n\r\n", 1)
        fields = dict(line.lower().split(": ", 1) for line in head.decode().split("\r\n")[1:])
        while len(body) < int(fields.get("content-length", 0)):
            body += stream.recv(65536)
        self.requests.append((head.decode(), body.decode()))
        stream.sendall(self._reply(head.decode().split("\r\n")[0], body.decode()))
