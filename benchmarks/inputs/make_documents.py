#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Makes the documents that benchmarks/documents_benchmark.cpp reads and writes.

    make_documents.py FOLDER

Texts of 100 KB to 50 MB, made of the sentences of real texts, in the charsets that the benchmarks
compare, and packages from text-heavy to image-heavy, whose XML is made of such words and whose
images are PNG files of noise. The same files come out on every machine that has the same zlib.
Files that are there already are left alone.
"""

import io
import pathlib
import random
import re
import struct
import sys
import zipfile
import zlib

TEXTS = pathlib.Path(__file__).resolve().parents[2] / "tests/data/charsets/texts"
DATE = (1980, 1, 1, 0, 0, 0)
OFFICE = "http://schemas.openxmlformats.org/officeDocument/2006"
PACKAGE = "http://schemas.openxmlformats.org/package/2006"


def sentences(language):
    text = (TEXTS / f"{language}.txt").read_text(encoding="utf-8")
    return [s.strip() + " " for s in re.split(r"(?<=[.!?。])\s*|\n", text) if s.strip()]


def words(language):
    return re.findall(r"[^\W\d_]+", (TEXTS / f"{language}.txt").read_text(encoding="utf-8"))


def text_of(pool, size, seed, encoding):
    """Lines of some sentences of `pool` each, `size` bytes in `encoding` but for one line."""
    rng = random.Random(seed)
    chunks, total = [], 0
    while total < size:
        line = "".join(rng.choices(pool, k=rng.randint(1, 6))).rstrip() + "\n"
        chunks.append(line.encode(encoding))
        total += len(chunks[-1])
    return b"".join(chunks)


def make_texts(folder):
    english = [s.encode("ascii", "ignore").decode() for s in sentences("en")]
    japanese = sentences("ja")
    russian = sentences("ru")
    mixed = english * 2 + japanese + russian
    for name, pool, encoding in [
        ("ascii.utf-8", english, "utf-8"),
        ("japanese.utf-8", japanese, "utf-8"),
        ("mixed.utf-8", mixed, "utf-8"),
        ("japanese.shift_jis", japanese, "shift_jis"),
        ("russian.windows-1251", russian, "windows-1251"),
    ]:
        for label, size in [("100KB", 100_000), ("5MB", 5_000_000), ("50MB", 50_000_000)]:
            write(folder / f"{name}.{label}.txt", lambda: text_of(pool, size, name, encoding))


def png_of_noise(rng, side):
    """A true-colour PNG that no compression makes smaller, as photographs are."""

    def chunk(kind, data):
        return struct.pack(">I", len(data)) + kind + data + struct.pack(">I", zlib.crc32(kind + data))

    header = struct.pack(">IIBBBBB", side, side, 8, 2, 0, 0, 0)
    rows = b"".join(b"\0" + rng.randbytes(3 * side) for _ in range(side))
    return (b"\x89PNG\r\n\x1a\n" + chunk(b"IHDR", header) + chunk(b"IDAT", zlib.compress(rows, 1)) +
            chunk(b"IEND", b""))


def document_xml(rng, pool, size):
    """Running text with the formatting around each piece of it that word processors write."""
    pieces = ['<?xml version="1.0" encoding="UTF-8" standalone="yes"?>\r\n<w:document xmlns:w="'
              'http://schemas.openxmlformats.org/wordprocessingml/2006/main"><w:body>']
    total = 0
    while total < size:
        runs = []
        for _ in range(rng.randint(1, 5)):
            properties = rng.choice(['', '', '<w:rPr><w:b/></w:rPr>',
                                     '<w:rPr><w:sz w:val="24"/><w:lang w:val="en-GB"/></w:rPr>'])
            text = " ".join(rng.choices(pool, k=rng.randint(3, 20)))
            runs.append(f'<w:r>{properties}<w:t xml:space="preserve">{text} </w:t></w:r>')
        paragraph = (f'<w:p w:rsidR="00{rng.getrandbits(24):06X}" w:rsidRDefault="'
                     f'00{rng.getrandbits(24):06X}">' + "".join(runs) + "</w:p>")
        pieces.append(paragraph)
        total += len(paragraph)
    pieces.append("</w:body></w:document>")
    return "".join(pieces).encode("utf-8")


def sheet_xml(rng, rows):
    """A worksheet: short cells of numbers and of indices of shared strings."""
    pieces = ['<?xml version="1.0" encoding="UTF-8" standalone="yes"?>\r\n<worksheet xmlns="'
              'http://schemas.openxmlformats.org/spreadsheetml/2006/main"><sheetData>']
    for row in range(1, rows + 1):
        cells = []
        for column in "ABCDEFGHIJKL":
            if column < "D":
                cells.append(f'<c r="{column}{row}" s="1" t="s"><v>{rng.randrange(5000)}</v></c>')
            else:
                cells.append(f'<c r="{column}{row}" s="2"><v>{rng.uniform(0, 1e5):.2f}</v></c>')
        pieces.append(f'<row r="{row}" spans="1:12">' + "".join(cells) + "</row>")
    pieces.append("</sheetData></worksheet>")
    return "".join(pieces).encode("utf-8")


def relationships_xml(relationships):
    lines = "".join(f'<Relationship Id="{i}" Type="{t}" Target="{target}"/>'
                    for i, t, target in relationships)
    return (f'<?xml version="1.0" encoding="UTF-8" standalone="yes"?>\r\n<Relationships xmlns="'
            f'{PACKAGE}/relationships">{lines}</Relationships>').encode("utf-8")


def package(main_name, main_type, parts, images):
    """A package of the main part, `parts` (name, type, content) and images, related to the main."""
    types = [f'<Default Extension="rels" ContentType="application/vnd.openxmlformats-package.'
             f'relationships+xml"/>', '<Default Extension="png" ContentType="image/png"/>']
    types += [f'<Override PartName="/{name}" ContentType="{kind}"/>' for name, kind, _ in parts]
    related = [(f"rId{i}", f"{OFFICE}/relationships/other", "/" + name)
               for i, (name, _, _) in enumerate(parts) if name != main_name]
    related += [(f"rIdImage{i}", f"{OFFICE}/relationships/image", f"media/image{i}.png")
                for i in range(len(images))]
    folder, _, leaf = main_name.rpartition("/")
    buffer = io.BytesIO()
    with zipfile.ZipFile(buffer, "w") as archive:

        def add(name, content, method=zipfile.ZIP_DEFLATED):
            info = zipfile.ZipInfo(name, DATE)
            info.compress_type = method
            archive.writestr(info, content)

        add("[Content_Types].xml",
            f'<?xml version="1.0" encoding="UTF-8" standalone="yes"?>\r\n<Types xmlns="{PACKAGE}/'
            f'content-types">{"".join(types)}</Types>')
        add("_rels/.rels",
            relationships_xml([("rId1", f"{OFFICE}/relationships/officeDocument", main_name)]))
        for name, _, content in parts:
            add(name, content)
            if name == main_name:
                add(f"{folder}/_rels/{leaf}.rels", relationships_xml(related))
        for i, image in enumerate(images):
            add(f"{folder}/media/image{i}.png", image, zipfile.ZIP_STORED)
    return buffer.getvalue()


WORD = "application/vnd.openxmlformats-officedocument.wordprocessingml."
SHEET = "application/vnd.openxmlformats-officedocument.spreadsheetml."


def word_document(seed, text_size, image_count, image_side):
    rng = random.Random(seed)
    pool = words("en") * 3 + words("de")
    parts = [("word/document.xml", WORD + "document.main+xml", document_xml(rng, pool, text_size))]
    for name in ["styles", "settings", "footnotes", "header1", "footer1"]:
        parts.append((f"word/{name}.xml", f"{WORD}{name}+xml",
                      document_xml(rng, pool, 20_000 + text_size // 50)))
    images = [png_of_noise(rng, image_side) for _ in range(image_count)]
    return package("word/document.xml", WORD + "document.main+xml", parts, images)


def workbook(seed, rows, sheets=3):
    rng = random.Random(seed)
    parts = [("xl/workbook.xml", SHEET + "sheet.main+xml", sheet_xml(rng, 5))]
    parts += [(f"xl/worksheets/sheet{i}.xml", SHEET + "worksheet+xml", sheet_xml(rng, rows))
              for i in range(1, sheets + 1)]
    return package("xl/workbook.xml", SHEET + "sheet.main+xml", parts, [])


def make_packages(folder):
    write(folder / "small.docx", lambda: word_document("small", 60_000, 1, 60))
    write(folder / "text-heavy.docx", lambda: word_document("text", 8_000_000, 0, 0))
    write(folder / "mixed.docx", lambda: word_document("mixed", 4_000_000, 8, 400))
    write(folder / "image-heavy.docx", lambda: word_document("images", 300_000, 20, 600))
    write(folder / "sheets.xlsx", lambda: workbook("sheets", 8_000))
    write(folder / "many-sheets.xlsx", lambda: workbook("many sheets", 1_000, 24))


def write(path, make):
    if not path.exists():
        partial = path.with_suffix(".partial")
        partial.write_bytes(make())
        partial.rename(path)


def main():
    if len(sys.argv) != 2:
        sys.exit(__doc__)
    folder = pathlib.Path(sys.argv[1])
    folder.mkdir(parents=True, exist_ok=True)
    make_texts(folder)
    make_packages(folder)


if __name__ == "__main__":
    main()
