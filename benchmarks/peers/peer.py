# SPDX-License-Identifier: Apache-2.0
"""The jobs of the bundle done with Python's own library, for documents_benchmark.

Commands come on standard input, one a line, their words separated by tabs:

    load PATH               keeps the bytes of PATH, a request, for write-package
    read-package _ PATH     document package to the response of a read request
    write-package _ PATH    the loaded request to a package at PATH
    read-text _ PATH        UTF-8 text file to the response
    save PATH               writes the last response to PATH

Each is answered with a line: the nanoseconds that it took, or "error" and why.
"""

import base64
import json
import pathlib
import sys
import time
import xml.etree.ElementTree as ElementTree
import zipfile

TYPES = "{http://schemas.openxmlformats.org/package/2006/content-types}"
loaded = b""
response = b""


def response_of(value):
    return json.dumps(value, ensure_ascii=False, separators=(",", ":"), sort_keys=True).encode()


def relationships_of(archive, names, part):
    folder, _, leaf = part.rpartition("/")
    name = (folder + "/" if folder else "") + "_rels/" + leaf + ".rels"
    if name not in names:
        return []
    return [{"relationshipId": r.get("Id"), "relationshipType": r.get("Type"),
             "target": r.get("Target"), "targetMode": ""}
            for r in ElementTree.fromstring(archive.read(name))]


def read_package(path):
    with zipfile.ZipFile(path) as archive:
        names = set(archive.namelist())
        defaults, overrides = {}, {}
        for entry in ElementTree.fromstring(archive.read("[Content_Types].xml")):
            if entry.tag == TYPES + "Default":
                defaults[entry.get("Extension").lower()] = entry.get("ContentType")
            else:
                overrides[entry.get("PartName")] = entry.get("ContentType")
        parts = []
        for name in archive.namelist():
            if name == "[Content_Types].xml" or name.endswith(".rels"):
                continue
            uri = "/" + name
            kind = overrides.get(uri) or defaults.get(name.rpartition(".")[2].lower())
            content = archive.read(name)
            if kind.startswith("image/"):
                text = f"data:{kind};base64," + base64.b64encode(content).decode("ascii")
            else:
                text = content.decode("utf-8")
            parts.append({"partUri": uri, "contentType": kind, "content": text,
                          "relationship": relationships_of(archive, names, name)})
        return response_of({"status": True, "parts": parts,
                            "relationships": relationships_of(archive, names, "")})


def relationships_xml(relationships):
    root = ElementTree.Element(
        "Relationships", xmlns="http://schemas.openxmlformats.org/package/2006/relationships")
    for r in relationships:
        ElementTree.SubElement(root, "Relationship", Id=r["relationshipId"],
                               Type=r["relationshipType"], Target=r["target"])
    return ElementTree.tostring(root, encoding="utf-8", xml_declaration=True)


def write_package(path):
    document = json.loads(loaded)["content"]
    types = ElementTree.Element(
        "Types", xmlns="http://schemas.openxmlformats.org/package/2006/content-types")
    ElementTree.SubElement(types, "Default", Extension="rels", ContentType=(
        "application/vnd.openxmlformats-package.relationships+xml"))
    for part in document["parts"]:
        ElementTree.SubElement(types, "Override", PartName=part["partUri"],
                               ContentType=part["contentType"])
    with zipfile.ZipFile(path, "w", zipfile.ZIP_DEFLATED) as archive:
        archive.writestr("[Content_Types].xml",
                         ElementTree.tostring(types, encoding="utf-8", xml_declaration=True))
        archive.writestr("_rels/.rels", relationships_xml(document["relationships"]))
        for part in document["parts"]:
            name, content = part["partUri"][1:], part["content"]
            if part["contentType"].startswith("image/") and content.startswith("data:"):
                data = base64.b64decode(content[content.index(",") + 1:])
                archive.writestr(name, data, zipfile.ZIP_STORED)
            else:
                archive.writestr(name, content.encode("utf-8"))
            if part["relationship"]:
                folder, _, leaf = name.rpartition("/")
                archive.writestr((folder + "/" if folder else "") + "_rels/" + leaf + ".rels",
                                 relationships_xml(part["relationship"]))
    return b"true"


def read_text(path):
    text = pathlib.Path(path).read_bytes().decode("utf-8-sig")
    return response_of({"status": True, "data": text})


JOBS = {"read-package": read_package, "write-package": write_package, "read-text": read_text}


def main():
    global loaded, response
    for line in sys.stdin:
        command, *words = line.rstrip("\n").split("\t")
        try:
            start = time.perf_counter_ns()
            if command == "load":
                loaded = pathlib.Path(words[0]).read_bytes()
            elif command == "save":
                pathlib.Path(words[0]).write_bytes(response)
            else:
                response = b""
                start = time.perf_counter_ns()
                response = JOBS[command](words[1])
            print(time.perf_counter_ns() - start, flush=True)
        except Exception as error:  # the benchmark reports it
            print("error", type(error).__name__, str(error).replace("\n", " "), flush=True)


main()
