# SPDX-License-Identifier: Apache-2.0
"""A short tour of the bundle: reads and writes copies of two examples, as a client of the message bus.

Usage: tour.py SERIALIZATION_HOST

It also shows what a client looks like: frames on the standard input and output of
`serialization_host stdio`, and JSON whose strings carry bytes.
"""

import json
import pathlib
import shutil
import subprocess
import sys
import tempfile

EXAMPLES = pathlib.Path(__file__).parent
CLIENT = "tour"


class Bus:
    """The message bus of a host program, with the bundle on it."""

    def __init__(self, program):
        self.process = subprocess.Popen([program, "stdio"], stdin=subprocess.PIPE, stdout=subprocess.PIPE)

    def send(self, channel, message):
        # Strings carry bytes: each character below U+0100 stands for one.
        payload = json.dumps(message, ensure_ascii=False).encode("latin-1")
        headers = f"Channel: {channel}\r\nContent-Length: {len(payload)}\r\n\r\n"
        self.process.stdin.write(headers.encode() + payload)
        self.process.stdin.flush()

    def receive(self):
        headers = {}
        while (line := self.process.stdout.readline().strip()):
            name, _, value = line.decode().partition(":")
            headers[name.lower()] = value.strip()
        if not headers:
            sys.exit("The host ended without an answer.")
        payload = self.process.stdout.read(int(headers["content-length"]))
        return headers["channel"], json.loads(payload.decode("latin-1"))

    def close(self):
        self.process.stdin.close()
        self.process.wait()


def read(bus, path, content_type):
    bus.send(
        "/zpr/service/readRequest_cpp",
        {"rtcId": CLIENT, "contentType": content_type, "filePath": as_bytes(str(path))},
    )
    channel, answer = bus.receive()
    print(f"  answer on {channel}: status {str(answer['status']).lower()}")
    if not answer["status"]:
        sys.exit(answer.get("exception", "The file does not exist."))
    return answer


def write(bus, path, content_type, content, **more):
    bus.send(
        "/zpr/service/writeRequest_cpp",
        {"rtcId": CLIENT, "contentType": content_type, "filePath": as_bytes(str(path)), "content": content, **more},
    )
    channel, notification = bus.receive()
    existed = "replaced" if notification["isExistingFile"] else "is new"
    print(f"  notification on {channel}:\n    {pathlib.Path(notification['filePath']).name} {existed}")
    channel, answer = bus.receive()
    print(f"  answer on {channel}: {str(answer).lower()}")


def as_bytes(text, charset="utf-8"):
    return text.encode(charset).decode("latin-1")


def as_text(data, charset="utf-8"):
    return data.encode("latin-1").decode(charset)


def show(lines):
    for line in lines:
        print("    |", line)


def tour_of_a_text(bus, folder):
    path = folder / "library-notice.shift_jis.txt"
    charset = "shift_jis"
    print(f"\nReading {path.name}, a text file in Shift_JIS")
    data = read(bus, path, "text/plain")["data"]
    show(as_text(data, charset).splitlines()[:4])
    print("\nWriting it with one more line, and to a new file")
    longer = data + as_bytes("これは新しい行です。\n", charset)
    write(bus, path, "text/plain", longer, encoding="Shift_JIS")
    write(bus, folder / "copy.txt", "text/plain", longer, encoding="Shift_JIS")
    print("\nIts last line on disk")
    show(path.read_text(charset).splitlines()[-1:])


def tour_of_a_document(bus, folder):
    path = folder / "report.docx"
    print(f"\nReading {path.name}, a document package")
    document = read(bus, path, "text/xml")
    for part in document["parts"]:
        print(f"    {part['partUri']:<28} {len(part['content']):>7} bytes  {part['contentType'][-44:]}")
    print("\nWriting it with a word changed: eleven days become twelve")
    for part in document["parts"]:
        if part["partUri"] == "/word/document.xml":
            part["content"] = part["content"].replace("eleven", "twelve")
    write(bus, path, "text/xml", {key: document[key] for key in ("parts", "relationships")})
    print("\nReading it again")
    again = read(bus, path, "text/xml")
    body = next(part["content"] for part in again["parts"] if part["partUri"] == "/word/document.xml")
    print(f"    the body says \"twelve\" {body.count('twelve')} time(s), \"eleven\" {body.count('eleven')} times")


def main():
    bus = Bus(sys.argv[1])
    with tempfile.TemporaryDirectory() as name:
        folder = pathlib.Path(name)
        for example in ("library-notice.shift_jis.txt", "report.docx"):
            shutil.copy(EXAMPLES / example, folder)
        tour_of_a_text(bus, folder)
        tour_of_a_document(bus, folder)
        bus.close()


main()
