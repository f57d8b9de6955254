#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Runs the packaged nats-server configurations and checks what they let through and what not."""

import json
import pathlib
import socket
import ssl
import tempfile
import time
import unittest
import urllib.request

import nats_server
from nats_server import Client, Refused, Server, open_websocket

READ_REQUESTS = "/zpr/service/readRequest_cpp"
WRITE_REQUESTS = "/zpr/service/writeRequest_cpp"
READ_RESPONSE = "/zpr/service/readResponse/"
WRITE_RESPONSE = "/zpr/service/writeResponse/"
OFFERS = tuple(f"/zpr/service/{requests}/offer"
               for requests in ("readRequest_cpp", "writeRequest_cpp", "filesRequest_host"))
PIECE = "/zpr/service/piece."
NOTIFICATIONS = "/zpr/service/notifyFileSystemRequest"
LARGEST = 8 * 1024 * 1024


class WithServer(unittest.TestCase):
    """One server for all tests of a class; the class says which."""

    context = None

    @classmethod
    def setUpClass(cls):
        folder = tempfile.TemporaryDirectory()
        cls.addClassCleanup(folder.cleanup)
        cls.folder = pathlib.Path(folder.name)
        cls.server = cls.start()
        cls.addClassCleanup(cls.server.kill)

    def connect(self, user=None, password=None):
        client = Client(self.server, user, password, self.context)
        self.addCleanup(client.close)
        return client

    def assert_refused(self, errors, operation, channel):
        self.assertEqual(len(errors), 1, f"{operation} {channel}: {errors}")
        self.assertIn(f"Permissions Violation for {operation} to \"{channel}\"", errors[0])


class Permissions:
    """What holds for every packaged configuration."""

    def test_nobody_gets_in_without_a_password(self):
        with self.assertRaisesRegex(Refused, "Authorization Violation"):
            self.connect()

    def test_nobody_gets_in_with_a_wrong_password_or_name(self):
        for user, password in [("ada", ""), ("ada", "ben's"), ("worker", "ada's")]:
            with self.assertRaisesRegex(Refused, "Authorization Violation"):
                self.connect(user, password)
        with self.assertRaisesRegex(Refused, "Authorization Violation"):
            Client(self.server, context=self.context, options={"user": "eve", "pass": "ada's"})
        with self.assertRaisesRegex(Refused, "Authorization Violation"):
            Client(self.server, context=self.context, options={"auth_token": "ada's"})

    def test_clients_publish_on_the_request_channels_and_nowhere_else(self):
        ada = self.connect("ada")
        for channel in (READ_REQUESTS, WRITE_REQUESTS, *OFFERS, PIECE + "worker.ada.1",
                        PIECE + "worker.ada.tab.7"):
            self.assertEqual(ada.publish(channel), [])
        for channel in (READ_RESPONSE + "ada.1", READ_RESPONSE + "ben.1", WRITE_RESPONSE + "ben.1",
                        PIECE + "worker.ben.1", PIECE + "worker.ada", PIECE + "ada.1",
                        READ_RESPONSE, NOTIFICATIONS, "anything", "_INBOX.1",
                        "$SYS.REQ.SERVER.PING"):
            self.assert_refused(ada.publish(channel), "Publish", channel)

    def test_clients_subscribe_to_their_own_answers_and_the_notifications(self):
        ada = self.connect("ada")
        for channel in (READ_RESPONSE + "ada.>", WRITE_RESPONSE + "ada.>", READ_RESPONSE + "ada.1",
                        READ_RESPONSE + "ada.*", WRITE_RESPONSE + "ada.tab.7", NOTIFICATIONS):
            self.assertEqual(ada.subscribe(channel), [], channel)

    def test_clients_subscribe_to_nothing_else(self):
        ada = self.connect("ada")
        for channel in (">", "*", "*.>", "*.*", READ_RESPONSE + "ben.>", READ_RESPONSE + "ben.1",
                        WRITE_RESPONSE + "ben.>", READ_RESPONSE + ">", READ_RESPONSE + "*",
                        READ_RESPONSE + "ada", READ_RESPONSE + "adam.>", READ_REQUESTS,
                        WRITE_REQUESTS, *OFFERS, PIECE + ">", PIECE + "*.ada.>", "_INBOX.>",
                        "$SYS.>"):
            self.assert_refused(ada.subscribe(channel), "Subscription", channel)

    def test_clients_cannot_get_anothers_answers_by_joining_a_group(self):
        ada = self.connect("ada")
        errors = ada.subscribe(READ_RESPONSE + "ben.>", "group")
        self.assertIn("Permissions Violation for Subscription", errors[0])

    def test_workers_subscribe_to_the_request_channels_and_nothing_else(self):
        worker = self.connect("worker")
        for channel in (READ_REQUESTS, WRITE_REQUESTS, *OFFERS):
            self.assertEqual(worker.subscribe(channel), [])
            self.assertEqual(worker.subscribe(channel, "group"), [])
        self.assertEqual(worker.subscribe(PIECE + "worker.>"), [])
        for channel in (">", "*", "*.>", READ_RESPONSE + "ada.>", WRITE_RESPONSE + "ada.1",
                        NOTIFICATIONS, "$SYS.>"):
            self.assert_refused(worker.subscribe(channel), "Subscription", channel)

    def test_workers_publish_answers_and_notifications_and_no_requests(self):
        worker = self.connect("worker")
        for channel in (READ_RESPONSE + "ada.1", WRITE_RESPONSE + "ben.tab.7", NOTIFICATIONS):
            self.assertEqual(worker.publish(channel), [], channel)
        for channel in (READ_REQUESTS, WRITE_REQUESTS, *OFFERS, "anything"):
            self.assert_refused(worker.publish(channel), "Publish", channel)

    def test_an_answer_reaches_whose_name_it_bears_and_nobody_else(self):
        worker, ada, ben = self.connect("worker"), self.connect("ada"), self.connect("ben")
        for client, name in ((ada, "ada"), (ben, "ben")):
            self.assertEqual(client.subscribe(READ_RESPONSE + name + ".>"), [])
        self.assertEqual(worker.subscribe(READ_REQUESTS), [])
        self.assertEqual(ada.publish(READ_REQUESTS, b'{"rtcId":"ada.1"}'), [])
        self.assertEqual(worker.wait_for_message(), (READ_REQUESTS, b'{"rtcId":"ada.1"}'))
        self.assertEqual(worker.publish(READ_RESPONSE + "ada.1", b"answer"), [])
        self.assertEqual(ada.wait_for_message(), (READ_RESPONSE + "ada.1", b"answer"))
        ben.settle()
        self.assertEqual(ben.messages, [])

    def test_each_request_goes_to_one_worker_of_a_group(self):
        ada, one, other = self.connect("ada"), self.connect("worker"), self.connect("worker")
        for worker in (one, other):
            self.assertEqual(worker.subscribe(READ_REQUESTS, "group"), [])
        for _ in range(100):
            self.assertEqual(ada.publish(READ_REQUESTS), [])
        for worker in (one, other):
            worker.settle()
        self.assertEqual(len(one.messages) + len(other.messages), 100)
        self.assertTrue(one.messages and other.messages)

    def test_a_message_of_8_mb_passes(self):
        worker, ada = self.connect("worker"), self.connect("ada")
        self.assertEqual(ada.info["max_payload"], LARGEST)
        self.assertEqual(worker.subscribe(WRITE_REQUESTS), [])
        payload = b"x" * LARGEST
        self.assertEqual(ada.publish(WRITE_REQUESTS, payload), [])
        self.assertTrue(worker.wait_for_message() == (WRITE_REQUESTS, payload))

    def test_a_larger_message_ends_the_connection(self):
        ada = self.connect("ada")
        ada.send(f"PUB {WRITE_REQUESTS} {LARGEST + 1}\r\n".encode())
        with self.assertRaisesRegex(Refused, "Maximum Payload Violation"):
            ada.settle()

    def test_browsers_are_let_in_from_the_pages_that_are_named(self):
        for origin in self.origins:
            self.assertIn("101", open_websocket(self.server, origin, self.context), origin)

    def test_browsers_are_not_let_in_from_other_pages(self):
        for origin in ("https://example.com", "null", self.origins[0] + ".example.com",
                       self.origins[0] + "1", "http://editor.example.org"):
            self.assertIn("403", open_websocket(self.server, origin, self.context), origin)

    def test_nothing_else_listens(self):
        self.assertEqual(self.server.listening_ports(),
                         {self.server.client_port, self.server.websocket_port})


class OneMachineServer(WithServer):
    @classmethod
    def start(cls):
        client, websocket = nats_server.free_ports(2)
        nats_server.write_configuration(cls.folder, {
            '"127.0.0.1:4222"': f'"127.0.0.1:{client}"',
            '"127.0.0.1:9222"': f'"127.0.0.1:{websocket}"',
        })
        return Server(cls.folder, "one-machine.conf", client, websocket)


class OneMachine(Permissions, OneMachineServer):
    origins = ("http://127.0.0.1:8080", "http://localhost:8080")


class ChangeOfUsers(OneMachineServer):
    def test_is_taken_over_while_the_server_runs(self):
        ada = self.connect("ada")
        users = self.folder / "users.conf"
        users.write_text(users.read_text().replace("ben", "eve"))
        self.server.reload()
        eve = Client(self.server, options={"user": "eve", "pass": "ben's"})
        self.addCleanup(eve.close)
        self.assertEqual(eve.subscribe(READ_RESPONSE + "eve.>"), [])
        with self.assertRaisesRegex(Refused, "Authorization Violation"):
            self.connect("ben")
        self.assertEqual(ada.publish(READ_REQUESTS), [])


def network_replacements(folder, client, websocket):
    return {
        "0.0.0.0:4222": f"127.0.0.1:{client}",
        "0.0.0.0:9222": f"127.0.0.1:{websocket}",
        "/etc/editor-nats/server.crt": str(folder / "server.crt"),
        "/etc/editor-nats/server.key": str(folder / "server.key"),
    }


class NetworkServer(WithServer):
    @classmethod
    def start(cls):
        nats_server.make_certificates(cls.folder)
        cls.context = nats_server.client_context(cls.folder)
        ports = nats_server.free_ports(2)
        nats_server.write_configuration(cls.folder, network_replacements(cls.folder, *ports))
        return Server(cls.folder, "network.conf", *ports)


class Network(Permissions, NetworkServer):
    origins = ("https://editor.example.org",)

    def test_nobody_gets_in_unencrypted(self):
        with self.assertRaises(Refused):
            Client(self.server, "ada")
        self.assertNotIn("101", open_websocket(self.server, self.origins[0]))


class ChangeOfCertificate(NetworkServer):
    def test_is_taken_over_while_the_server_runs(self):
        nats_server.make_certificates(self.folder)
        self.server.reload()
        new_context = nats_server.client_context(self.folder)
        ada = Client(self.server, "ada", context=new_context)
        self.addCleanup(ada.close)
        self.assertIn("101", open_websocket(self.server, None, new_context))
        with self.assertRaises(ssl.SSLError):
            Client(self.server, "ada", context=self.context)


class Cluster(unittest.TestCase):
    @classmethod
    def setUpClass(cls):
        folder = tempfile.TemporaryDirectory()
        cls.addClassCleanup(folder.cleanup)
        cls.folder = pathlib.Path(folder.name)
        nats_server.make_certificates(cls.folder)
        cls.context = nats_server.client_context(cls.folder)
        cls.cluster_ports = nats_server.free_ports(3)
        cls.servers = [cls.start(i) for i in range(3)]
        for server in cls.servers:
            cls.addClassCleanup(server.kill)
            cls.wait_for_routes(server, 2)

    @classmethod
    def start(cls, number):
        folder = cls.folder / str(number)
        folder.mkdir()
        client, websocket, monitoring = nats_server.free_ports(3)
        replacements = network_replacements(cls.folder, client, websocket) | {
            "/etc/editor-nats/cluster.crt": str(cls.folder / "server.crt"),
            "/etc/editor-nats/cluster.key": str(cls.folder / "server.key"),
            "/etc/editor-nats/cluster-ca.crt": str(cls.folder / "ca.crt"),
            '"nats-1"': f'"nats-{number + 1}"',
            "0.0.0.0:6222": f"127.0.0.1:{cls.cluster_ports[number]}",
        }
        for i, port in enumerate(cls.cluster_ports):
            replacements[f"nats-{i + 1}.example.org:6222"] = f"127.0.0.1:{port}"
        nats_server.write_configuration(folder, replacements)
        with open(folder / "site.conf", "a") as site:
            site.write(f'http: "127.0.0.1:{monitoring}"\n')
        return Server(folder, "cluster.conf", client, websocket, monitoring)

    @staticmethod
    def wait_for_routes(server, count):
        url = f"http://127.0.0.1:{server.monitoring_port}/routez"
        deadline = time.monotonic() + nats_server.PATIENCE
        while True:
            with urllib.request.urlopen(url, timeout=nats_server.PATIENCE) as answer:
                routes = json.load(answer)["num_routes"]
            if routes == count:
                return
            if time.monotonic() > deadline:
                raise RuntimeError(f"{routes} routes instead of {count}")
            time.sleep(0.05)

    def connect(self, number, user):
        client = Client(self.servers[number], user, context=self.context)
        self.addCleanup(client.close)
        return client

    def exchange(self, client_at, worker_at):
        """A request at one server is answered at another."""
        ada, worker = self.connect(client_at, "ada"), self.connect(worker_at, "worker")
        self.assertEqual(ada.subscribe(READ_RESPONSE + "ada.>"), [])
        self.assertEqual(worker.subscribe(READ_REQUESTS, "group"), [])
        self.publish_until_taken(ada, worker, READ_REQUESTS, b"request")
        self.publish_until_taken(worker, ada, READ_RESPONSE + "ada.1", b"answer")
        worker.close()

    def publish_until_taken(self, sender, receiver, channel, payload):
        """A subscription takes a moment to be known in the whole cluster."""
        deadline = time.monotonic() + nats_server.PATIENCE
        while not receiver.messages and time.monotonic() < deadline:
            self.assertEqual(sender.publish(channel, payload), [])
            receiver.settle()
        self.assertEqual(receiver.messages[0], (channel, payload))


class WholeCluster(Cluster):
    def test_requests_and_answers_pass_between_servers(self):
        for client_at, worker_at in ((0, 1), (1, 2), (2, 0)):
            self.exchange(client_at, worker_at)

    def greet_as_server(self, context):
        """What a server of the cluster says to one that connects."""
        address = ("127.0.0.1", self.cluster_ports[0])
        with (socket.create_connection(address, nats_server.PATIENCE) as connection,
              context.wrap_socket(connection, server_hostname="localhost") as route):
            return route.recv(4096)

    def test_servers_with_a_certificate_of_the_authority_may_join(self):
        context = nats_server.client_context(self.folder)
        context.load_cert_chain(self.folder / "server.crt", self.folder / "server.key")
        self.assertTrue(self.greet_as_server(context).startswith(b"INFO "))

    def test_nobody_joins_without_a_certificate(self):
        with self.assertRaises(OSError):
            self.greet_as_server(nats_server.client_context(self.folder))

    def test_nobody_joins_with_a_certificate_of_another_authority(self):
        foreign = self.folder / "foreign"
        foreign.mkdir()
        nats_server.make_certificates(foreign)
        context = nats_server.client_context(self.folder)
        context.load_cert_chain(foreign / "server.crt", foreign / "server.key")
        with self.assertRaises(OSError):
            self.greet_as_server(context)


class ClusterThatLosesAServer(Cluster):
    def test_goes_on_with_the_other_two(self):
        self.servers[2].kill()
        for server in self.servers[:2]:
            self.wait_for_routes(server, 1)
        self.exchange(0, 1)


if __name__ == "__main__":
    unittest.main(verbosity=2)
