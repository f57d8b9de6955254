# SPDX-License-Identifier: Apache-2.0
"""Describes a document package in lines, with nothing but Python's own zip and XML modules.

Usage: describe_package.py FILE

One line for each archive entry in order, for each part's content type and for each relationship. The
tests compare the lines with what they wrote.
"""

import hashlib
import sys
import xml.etree.ElementTree as ElementTree
import zipfile

CONTENT_TYPES = "{http://schemas.openxmlformats.org/package/2006/content-types}"
RELATIONSHIPS = "{http://schemas.openxmlformats.org/package/2006/relationships}"


def describe(path):
    with zipfile.ZipFile(path) as archive:
        if archive.testzip() is not None:
            raise SystemExit("damaged: " + archive.testzip())
        types = ElementTree.fromstring(archive.read("[Content_Types].xml"))
        overrides = {e.get("PartName").lower(): e.get("ContentType")
                     for e in types.iter(CONTENT_TYPES + "Override")}
        defaults = {e.get("Extension").lower(): e.get("ContentType")
                    for e in types.iter(CONTENT_TYPES + "Default")}
        for entry in archive.infolist():
            name = "/" + entry.filename
            content = archive.read(entry)
            yield f"entry {name} {hashlib.sha256(content).hexdigest()}"
            if name == "/[Content_Types].xml":
                continue
            extension = name.rpartition("/")[2].rpartition(".")[2].lower()
            yield f"type {overrides.get(name.lower(), defaults.get(extension))}"
            if extension == "rels":
                for e in ElementTree.fromstring(content).iter(RELATIONSHIPS + "Relationship"):
                    mode = e.get("TargetMode", "Internal")
                    yield f"relationship {e.get('Id')} {e.get('Type')} {mode} {e.get('Target')}"


sys.stdout.reconfigure(encoding="utf-8")
for line in describe(sys.argv[1]):
    print(line)
