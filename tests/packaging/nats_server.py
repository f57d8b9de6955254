# SPDX-License-Identifier: Apache-2.0
"""The packaged nats-server configurations with a test's ports, passwords and certificates, servers
that run them, and a client that speaks the server's protocol byte by byte."""

import base64
import json
import os
import pathlib
import shutil
import signal
import socket
import ssl
import subprocess
import time

PACKAGED = pathlib.Path(__file__).resolve().parents[2] / "packaging" / "nats"
PASSWORDS = {"worker": "worker's", "ada": "ada's", "ben": "ben's"}
PATIENCE = 30  # seconds that anything may take; nothing here is expected to


def server_program():
    # Debian puts it where users' search paths do not lead.
    return shutil.which("nats-server", path=os.environ["PATH"] + ":/usr/sbin")


def free_ports(count):
    sockets = [socket.create_server(("127.0.0.1", 0)) for _ in range(count)]
    ports = [s.getsockname()[1] for s in sockets]
    for s in sockets:
        s.close()
    return ports


def make_certificates(folder):
    """An authority, ca.crt, and server.crt, a certificate that it signed for this machine."""
    def openssl(*arguments):
        subprocess.run(["openssl", *arguments], cwd=folder, check=True, capture_output=True)

    key = ["-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:prime256v1", "-nodes"]
    openssl("req", "-x509", *key, "-keyout", "ca.key", "-out", "ca.crt", "-days", "2",
            "-subj", "/CN=test authority")
    openssl("req", *key, "-keyout", "server.key", "-out", "server.csr", "-subj", "/CN=localhost")
    (folder / "names").write_text("subjectAltName=DNS:localhost,IP:127.0.0.1")
    openssl("x509", "-req", "-in", "server.csr", "-CA", "ca.crt", "-CAkey", "ca.key",
            "-CAcreateserial", "-days", "2", "-extfile", "names", "-out", "server.crt")


def write_configuration(folder, replacements):
    """The packaged files in `folder`, with every text that is a key of `replacements` replaced, and
    passwords. A text that is nowhere is an error: the files would not mean what the test thinks."""
    found = set()
    for source in PACKAGED.glob("*.conf"):
        text = source.read_text()
        for old, new in replacements.items():
            if old in text:
                found.add(old)
            text = text.replace(old, new)
        (folder / source.name).write_text(text)
    assert found == set(replacements), f"not found: {set(replacements) - found}"
    (folder / "secrets.conf").write_text(
        "".join(f'{user.upper()}_PASSWORD: "{word}"\n' for user, word in PASSWORDS.items()))


class Server:
    """A running server with the configuration `file` of `folder`."""

    def __init__(self, folder, file, client_port, websocket_port=None, monitoring_port=None):
        self.client_port = client_port
        self.websocket_port = websocket_port
        self.monitoring_port = monitoring_port
        self.command = [server_program(), "-c", str(folder / file)]
        subprocess.run([*self.command, "-t"], check=True, capture_output=True)
        self.log = folder / "log"
        self.start()

    def start(self):
        with open(self.log, "wb") as log:
            self.process = subprocess.Popen(self.command, stdout=log, stderr=log)
        self.wait_until_it_says("Server is ready")

    def reload(self):
        self.process.send_signal(signal.SIGHUP)
        self.wait_until_it_says("Reloaded server configuration")

    def wait_until_it_says(self, text):
        deadline = time.monotonic() + PATIENCE
        while text not in self.log.read_text():
            if self.process.poll() is not None or time.monotonic() > deadline:
                raise RuntimeError("no server: " + self.log.read_text())
            time.sleep(0.02)

    def listening_ports(self):
        """The ports of all sockets of the process that wait for connections."""
        process = pathlib.Path(f"/proc/{self.process.pid}")
        open_files = {os.readlink(file) for file in (process / "fd").iterdir()}
        lines = [line.split() for version in ("tcp", "tcp6")
                 for line in (process / "net" / version).read_text().splitlines()[1:]]
        listening = "0A"
        return {int(columns[1].rpartition(":")[2], 16) for columns in lines
                if columns[3] == listening and f"socket:[{columns[9]}]" in open_files}

    def kill(self):
        self.process.kill()
        self.process.wait()


class Refused(Exception):
    """The server ended the connection; the text is what it said."""


class Client:
    """A connection to a server, which has taken the user's password."""

    def __init__(self, server, user=None, password=None, context=None, options=None):
        self.messages = []
        self.subscriptions = 0
        self.socket = socket.create_connection(("127.0.0.1", server.client_port), PATIENCE)
        self.socket.setsockopt(socket.IPPROTO_TCP, socket.TCP_NODELAY, 1)
        self.file = self.socket.makefile("rb")
        self.info = json.loads(self.file.readline().removeprefix(b"INFO "))
        if context:
            self.socket = context.wrap_socket(self.socket, server_hostname="localhost")
            self.file = self.socket.makefile("rb")
        login = {"verbose": False, "pedantic": False, "lang": "python", "version": "1"}
        if user:
            login |= {"user": user, "pass": PASSWORDS[user] if password is None else password}
        self.send(b"CONNECT " + json.dumps(login | (options or {})).encode() + b"\r\n")
        try:
            errors = self.settle()
            if errors:
                raise Refused(errors[0])
        except Refused:
            self.close()
            raise

    def close(self):
        self.file.close()
        self.socket.close()

    def send(self, data):
        self.socket.sendall(data)

    def settle(self):
        """Waits until the server has worked off what was sent. Returns its complaints."""
        errors = []
        try:
            self.send(b"PING\r\n")
            while (line := self.read_operation()) != "PONG":
                if line.startswith("-ERR"):
                    errors.append(line)
        except OSError as error:
            raise Refused(errors[0] if errors else str(error)) from error
        return errors

    def read_operation(self):
        """The first line of the next operation. A message is put aside with its payload."""
        line = self.file.readline().decode().rstrip("\r\n")
        if not line:
            raise ConnectionResetError("the server has closed the connection")
        if line.startswith("MSG "):
            words = line.split()
            self.messages.append((words[1], self.file.read(int(words[-1]))))
            self.file.read(2)
        elif line == "PING":
            self.send(b"PONG\r\n")
        return line

    def publish(self, channel, payload=b"{}"):
        self.send(f"PUB {channel} {len(payload)}\r\n".encode() + payload + b"\r\n")
        return self.settle()

    def subscribe(self, channel, group=""):
        self.subscriptions += 1
        self.send(f"SUB {channel} {group} {self.subscriptions}\r\n".encode())
        return self.settle()

    def wait_for_message(self):
        while not self.messages:
            self.read_operation()
        return self.messages.pop(0)


def open_websocket(server, origin, context=None):
    """The first line of the answer to a browser's attempt to connect from a page of `origin`."""
    connection = socket.create_connection(("127.0.0.1", server.websocket_port), PATIENCE)
    if context:
        connection = context.wrap_socket(connection, server_hostname="localhost")
    with connection:
        key = base64.b64encode(os.urandom(16)).decode()
        lines = ["GET / HTTP/1.1", "Host: localhost", "Upgrade: websocket", "Connection: Upgrade",
                 f"Sec-WebSocket-Key: {key}", "Sec-WebSocket-Version: 13"]
        lines += [f"Origin: {origin}"] if origin else []
        connection.sendall(("\r\n".join(lines) + "\r\n\r\n").encode())
        with connection.makefile("rb") as answer:
            return answer.readline().decode().strip()


def client_context(folder):
    return ssl.create_default_context(cafile=folder / "ca.crt")
