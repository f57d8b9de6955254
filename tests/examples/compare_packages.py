# SPDX-License-Identifier: Apache-2.0
"""Compares two document packages as an independent reader sees them.

Usage: compare_packages.py ONE OTHER

Prints each difference in parts, content types, relationships and bytes, and exits with 1 if there is one.
"""

import posixpath
import sys
import xml.etree.ElementTree as xml
import zipfile

CONTENT_TYPES = "{http://schemas.openxmlformats.org/package/2006/content-types}"
RELATIONSHIPS = "{http://schemas.openxmlformats.org/package/2006/relationships}"


def is_relationship_part(name):
    return posixpath.basename(posixpath.dirname(name)) == "_rels" and name.endswith(".rels")


def source_of(name):
    folder, file = posixpath.split(name)
    return posixpath.join(posixpath.dirname(folder), file[: -len(".rels")])


def contents(path):
    archive = zipfile.ZipFile(path)
    assert archive.testzip() is None, path
    entries = {name: archive.read(name) for name in archive.namelist() if not name.endswith("/")}
    types = xml.fromstring(entries.pop("[Content_Types].xml"))
    overrides = {
        element.get("PartName").lower(): element.get("ContentType")
        for element in types.iter(CONTENT_TYPES + "Override")
    }
    defaults = {
        element.get("Extension").lower(): element.get("ContentType")
        for element in types.iter(CONTENT_TYPES + "Default")
    }
    found = {}
    for name, data in entries.items():
        if is_relationship_part(name):
            for element in xml.fromstring(data).iter(RELATIONSHIPS + "Relationship"):
                found["relationship", source_of(name), element.get("Id")] = (
                    element.get("Type"),
                    element.get("Target"),
                    element.get("TargetMode", "Internal"),
                )
            continue
        extension = posixpath.splitext(name)[1][1:].lower()
        found["type", name] = overrides.get("/" + name.lower()) or defaults.get(extension)
        found["bytes", name] = data
    return found


def main():
    one, other = (contents(path) for path in sys.argv[1:])
    differences = [key for key in sorted({*one, *other}) if one.get(key) != other.get(key)]
    for key in differences:
        print(*key, "differ:", repr(one.get(key))[:200], "and", repr(other.get(key))[:200])
    print(len(one), "facts compared")
    sys.exit(1 if differences or not one else 0)


main()
