#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Runs the host as a worker of servers with the packaged configurations.

Usage: worker_test.py PROGRAM"""

import json
import re
import subprocess
import sys
import time
import unittest

import nats_server
from nats_configuration_test import (NOTIFICATIONS, READ_REQUESTS, READ_RESPONSE, WRITE_REQUESTS,
                                     WRITE_RESPONSE, NetworkServer, OneMachineServer)
from nats_server import Client

PROGRAM = sys.argv[1]


class Worker:
    """A worker keeps to its folder, and its answers reach who asked."""

    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        password = cls.folder / "password"
        password.write_text(nats_server.PASSWORDS["worker"] + "\n")
        cls.documents = cls.folder / "documents"
        cls.documents.mkdir()
        (cls.documents / "text").write_text("inside")
        (cls.folder / "text").write_text("outside")
        scheme = "tls" if cls.context else "nats"
        authority = ["--tls-ca", str(cls.folder / "ca.crt")] if cls.context else []
        worker = subprocess.Popen(cls.command(
            ["--nats", f"{scheme}://localhost:{cls.server.client_port}",
             "--nats-user", "worker", "--nats-password-file", str(password), *authority]))
        cls.addClassCleanup(cls.stop, worker)
        cls.wait_until_it_answers()

    @classmethod
    def command(cls, options):
        return [PROGRAM, "serve", "--root", str(cls.documents), *options]

    @classmethod
    def wait_until_it_answers(cls):
        """A request that no worker takes is lost, so it is sent again and again."""
        ada = Client(cls.server, "ada", context=cls.context)
        ada.subscribe(READ_RESPONSE + "ada.0")
        request = json.dumps({"rtcId": "ada.0", "contentType": "", "filePath": ""}).encode()
        deadline = time.monotonic() + nats_server.PATIENCE
        while not ada.messages:
            assert time.monotonic() < deadline, "no answer"
            ada.publish(READ_REQUESTS, request)
            time.sleep(0.05)
            ada.settle()
        ada.close()

    @staticmethod
    def stop(worker):
        worker.terminate()
        status = worker.wait(nats_server.PATIENCE)
        assert status == 0, f"the worker ended with {status}"

    def setUp(self):
        self.ada = self.connect("ada")
        for channel in (READ_RESPONSE + "ada.1", WRITE_RESPONSE + "ada.1", NOTIFICATIONS):
            self.assertEqual(self.ada.subscribe(channel), [])

    def request(self, channel, **keys):
        request = {"rtcId": "ada.1", "contentType": "text/plain"} | keys
        self.assertEqual(self.ada.publish(channel, json.dumps(request).encode()), [])

    def read(self, path):
        self.request(READ_REQUESTS, filePath=str(path))
        return self.ada.wait_for_message()

    def write(self, path):
        self.request(WRITE_REQUESTS, filePath=str(path), content="new", encoding="UTF-8")
        return [self.ada.wait_for_message(), self.ada.wait_for_message()]

    def test_reads_below_its_root(self):
        self.assertEqual(self.read(self.documents / "text"),
                         (READ_RESPONSE + "ada.1", b'{"data":"inside","status":true}'))

    def test_takes_what_is_outside_for_what_may_not_be_opened(self):
        for path in (self.folder / "text", self.documents / "../text"):
            self.assertEqual(self.read(path),
                             (READ_RESPONSE + "ada.1", b'{"data":"","status":true}'))

    def test_writes_below_its_root_and_tells_of_it(self):
        path = self.documents / "new"
        notification, answer = self.write(path)
        self.assertEqual(notification[0], NOTIFICATIONS)
        self.assertEqual(json.loads(notification[1]), {"filePath": str(path),
                                                       "isExistingFile": False})
        self.assertEqual(answer, (WRITE_RESPONSE + "ada.1", b"true"))
        self.assertEqual(path.read_text(), "new")

    def test_writes_nothing_outside(self):
        for name in ("text", "new"):
            self.assertEqual(self.write(self.folder / name)[1],
                             (WRITE_RESPONSE + "ada.1", b"false"))
        self.assertEqual((self.folder / "text").read_text(), "outside")
        self.assertFalse((self.folder / "new").exists())


class AfterALostServer(Worker, OneMachineServer):
    """The worker connects again, and is kept to its folder as before."""

    @classmethod
    def setUpClass(cls):
        super().setUpClass()
        cls.server.kill()
        cls.server.start()
        cls.wait_until_it_answers()


class OnOneMachine(Worker, OneMachineServer):
    pass


class OnANetwork(Worker, NetworkServer):
    pass


class OfTheUnit(Worker, OneMachineServer):
    """Started as systemd does it for the instance "srv-documents"."""

    @classmethod
    def command(cls, options):
        unit = (nats_server.PACKAGED.parent / "systemd/serialization-host@.service").read_text()
        line = re.search("^ExecStart=(.*)$", unit, re.MULTILINE).group(1)
        words = {"serialization_host": [PROGRAM], "%f": [str(cls.documents)],
                 "%i": ["srv-documents"], "$OPTIONS": ["--log-level", "info"],
                 "$INSTANCE_OPTIONS": options}
        assert set(words) <= set(line.split()), line
        return [argument for word in line.split() for argument in words.get(word, [word])]

    def test_shares_requests_with_the_instances_of_its_name(self):
        same, other = self.connect("worker"), self.connect("worker")
        self.assertEqual(same.subscribe(READ_REQUESTS, "srv-documents"), [])
        self.assertEqual(other.subscribe(READ_REQUESTS, "srv-others"), [])
        for _ in range(100):
            self.request(READ_REQUESTS, filePath=str(self.documents / "text"), rtcId="ada.2")
        for client in (same, other):
            client.settle()
        self.assertTrue(0 < len(same.messages) < 100, len(same.messages))
        self.assertEqual(len(other.messages), 100)


class ThatMayNotSubscribe(OneMachineServer):
    def test_ends_and_says_why(self):
        password = self.folder / "password"
        password.write_text(nats_server.PASSWORDS["ada"] + "\n")
        worker = subprocess.run(
            [PROGRAM, "serve", "--root", str(self.folder),
             "--nats", f"nats://localhost:{self.server.client_port}", "--nats-user", "ada",
             "--nats-password-file", str(password)],
            stderr=subprocess.PIPE, text=True, timeout=nats_server.PATIENCE, check=False)
        self.assertEqual(worker.returncode, 1)
        self.assertIn("the bundle gets no requests", worker.stderr)
        self.assertIn(f'Subscription to "{READ_REQUESTS}"', worker.stderr)


if __name__ == "__main__":
    tests = unittest.TestSuite(unittest.defaultTestLoader.loadTestsFromTestCase(case)
                               for case in (OnOneMachine, OnANetwork, AfterALostServer,
                                            OfTheUnit, ThatMayNotSubscribe))
    sys.exit(not unittest.TextTestRunner(verbosity=2).run(tests).wasSuccessful())
