#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Writes the JSON texts that the benchmarks parse.

    json_inputs.py FOLDER

The documents are made from the office files of examples/: the parts of one file, as a client sends
them to be written, with the main part lengthened by paragraphs, rows or slides of that file with
other words in them, and with as many images as the name says:

    text-*.json     escaped XML only
    mixed-*.json    as many bytes of escaped XML as of images in base64
    images-*.json   nine bytes of base64 to one of escaped XML

Another text, records.json, is what documents are not: many small objects of short strings and numbers.
"""
import base64
import json
import pathlib
import random
import re
import sys
import zipfile

EXAMPLES = pathlib.Path(__file__).resolve().parents[2] / "examples"

WORDS = ("the of and a to in is that for it as was with be by on not he his but at are this have "
         "from or had an they which one you were her all she there would their we him been has "
         "quarterly harbour report meeting timetable budget delivery neighbour library signature").split()

# The file, its main part, and what the main part is made of.
SOURCES = [
    ("report.docx", "word/document.xml", re.compile(r"<w:p[ >].*?</w:p>", re.DOTALL)),
    ("sales.xlsx", "xl/worksheets/sheet1.xml", re.compile(r"<row .*?</row>", re.DOTALL)),
    ("meeting.pptx", "ppt/slides/slide1.xml", re.compile(r"<p:sp>.*?</p:sp>", re.DOTALL)),
]

CONTENT_TYPE = "application/vnd.openxmlformats-officedocument"


def with_other_words(xml, rng):
    """The XML with each text in it replaced by one of about its length."""
    def text(match):
        count = max(1, len(match.group(1)) // 5)
        return ">" + " ".join(rng.choices(WORDS, k=count)) + "<"
    return re.sub(r">([^<>]*[A-Za-z][^<>]*)<", text, xml)


def lengthened(xml, pieces, size, rng):
    """The XML with `size` bytes of `pieces` put behind the first of them."""
    added = []
    length = 0
    while length < size:
        piece = with_other_words(rng.choice(pieces), rng)
        added.append(piece)
        length += len(piece)
    place = xml.index(pieces[0]) + len(pieces[0])
    return xml[:place] + "".join(added) + xml[place:]


def document(source, text_bytes, image_bytes, rng):
    """A document's content: its parts, and images that have `image_bytes` in base64."""
    file, main_part, piece = source
    parts = []
    with zipfile.ZipFile(EXAMPLES / file) as package:
        for name in package.namelist():
            if not name.endswith(".xml") or name.startswith("["):
                continue
            xml = package.read(name).decode("utf-8")
            if name == main_part:
                xml = lengthened(xml, piece.findall(xml), text_bytes, rng)
            parts.append({"partUri": "/" + name, "contentType": CONTENT_TYPE + "+xml", "content": xml,
                          "relationship": []})
    number = 0
    while image_bytes > 0:
        number += 1
        length = min(image_bytes, rng.randrange(20_000, 2_000_000))
        data = base64.b64encode(rng.randbytes(length * 3 // 4)).decode("ascii")
        image_bytes -= len(data) + 1
        parts.append({"partUri": f"/media/image{number}.png", "contentType": "image/png",
                      "content": "data:image/png;base64," + data, "relationship": []})
    relationships = [{"relationshipId": f"rId{i}", "relationshipType": CONTENT_TYPE + "/image",
                      "target": part["partUri"], "targetMode": ""} for i, part in enumerate(parts)]
    return {"parts": parts, "relationships": relationships}


def records(count, rng):
    return {"records": [{
        "id": i,
        "name": " ".join(rng.choices(WORDS, k=2)),
        "mail": f"user.{rng.randrange(100_000)}@example.org",
        "active": rng.random() < 0.7,
        "score": rng.randrange(1_000_000) / 100,
        "tags": rng.sample(WORDS, k=rng.randrange(4)),
        "place": {"lat": round(rng.uniform(-90, 90), 6), "lon": round(rng.uniform(-180, 180), 6),
                  "zone": None}} for i in range(count)]}


def main():
    folder = pathlib.Path(sys.argv[1])
    folder.mkdir(parents=True, exist_ok=True)
    rng = random.Random(1)

    def write(name, value):
        text = json.dumps(value, ensure_ascii=False, separators=(",", ":"))
        (folder / f"{name}.json").write_text(text, encoding="utf-8")

    kb, mb = 1_000, 1_000_000
    report, sales, meeting = SOURCES
    write("text-100KB", document(report, 70 * kb, 0, rng))
    write("text-5MB", document(sales, 4_400 * kb, 0, rng))
    write("text-50MB", document(report, 44 * mb, 0, rng))
    write("mixed-5MB", document(meeting, 2_300 * kb, 2_500 * kb, rng))
    write("images-5MB", document(report, 400 * kb, 4_500 * kb, rng))
    write("records", records(20_000, rng))


main()
