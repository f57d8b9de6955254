#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Builds the benchmarks, runs them, and writes their figures into docs/performance.md.

    benchmarks/run.py [--repetitions N] [--no-write] [SECTION...]

SECTION is one or more of the sections below; without any, all are run. A section's figures stand in the
document between the lines "<!-- figures: SECTION -->" and "<!-- end of figures -->"; what stands outside
of such lines is written by hand and stays, and so do the figures of sections that are not run.

A program is a Google Benchmark of the build, or a command of its own for a peer in another language. Each
prints {"benchmarks": [{"name": ..., "bytes_per_second": ...}, ...]}, with as many results of one name as
it has repetitions; the median of them counts. Names are "<what>/<input>/<who>" or "<what>/<who>", in the
order that the section states, where <who> is "ours" (or what the section calls us) or the peer; in growth
tables <input> is the size.
"""
import argparse
import collections
import dataclasses
import json
import os
import pathlib
import platform
import re
import statistics
import subprocess
import sys

ROOT = pathlib.Path(__file__).resolve().parent.parent
BUILD = ROOT / "build" / "benchmarks"
DOCUMENT = ROOT / "docs" / "performance.md"

# ---- What is measured ----


@dataclasses.dataclass
class Ratio:
    """We are to be at least `factor` times as fast as the fastest of `peers`; no peers means all."""
    factor: float
    peers: tuple = ()
    text: str = ""


@dataclasses.dataclass
class Limit:
    """Our figure is to be at least (or, when less is better, at most) `figure`."""
    figure: float
    text: str = ""


@dataclasses.dataclass
class Row:
    """One measure, a table row for each of its inputs. `unit` is "MB/s", one of "ns", "µs" and "ms", or
    the name of a counter of the benchmark, of which less is better, too."""
    what: str
    unit: str
    targets: list
    inputs: str = ""  # a regular expression for the inputs that the row is about

    def more_is_better(self):
        return self.unit == "MB/s"


@dataclasses.dataclass
class Growth:
    """One measure at growing sizes: a counter of time per byte or item, which is to stay flat."""
    what: str
    unit: str
    inputs: str = ""

    def more_is_better(self):
        return False


@dataclasses.dataclass
class Section:
    programs: list  # names of benchmark programs, or commands (lists); REPETITIONS stands for their number
    rows: list
    order: tuple = ("what", "input", "who")  # of the names that the programs give
    ours: str = "ours"


REPETITIONS = "REPETITIONS"
AHEAD = Ratio(1, text="ahead of all")

# As in the service's unit; for the peers, too.
HUGE_PAGES = {"GLIBC_TUNABLES": "glibc.malloc.hugetlb=1"}

SECTIONS = {
    "json": Section(
        programs=["json_benchmark"],
        rows=[
            Row("parse document JSON", "MB/s", [AHEAD]),
            Row("serialize document JSON", "MB/s", [AHEAD]),
            Row("parse object-dense JSON", "MB/s", [Ratio(3, ("nlohmann",), "3 × nlohmann")]),
            Row("serialize object-dense JSON", "MB/s", []),
            Growth("parse JSON of a size", "ns per byte"),
            Growth("serialize JSON of a size", "ns per byte"),
            Growth("parse an object, keys in order", "ns per member"),
            Growth("parse an object, keys in disorder", "ns per member"),
            Growth("serialize an object", "ns per member"),
        ]),
    "base64": Section(
        programs=["base64_benchmark",
                  ["node", "benchmarks/peers/base64.mjs", REPETITIONS]],
        rows=[
            Row("base64 encode", "MB/s", [Ratio(1, ("OpenSSL",), "no slower than OpenSSL")]),
            Row("base64 decode", "MB/s", [Ratio(1, ("OpenSSL",), "no slower than OpenSSL")]),
        ]),
    "futures": Section(
        programs=["futures_benchmark"],
        rows=[
            Row("futures: create, set, get", "ns", [AHEAD]),
            Row("futures: then", "ns", [AHEAD]),
        ]),
    "documents": Section(
        programs=["documents_benchmark"],
        order=("what", "who", "input"),
        ours="bundle",
        rows=[
            Row("read_package", "MB/s", [Ratio(4, ("python",), "4 × Python"),
                                         Ratio(0.6, ("expand_only",), "60 % of expanding only")]),
            Row("write_package", "MB/s", [Ratio(3, text="3 × the best")]),
            Row("save_unchanged", "MB/s", []),
            Row("save_one_word", "MB/s", []),
            Row("read_text", "MB/s", [Ratio(10, ("node",), "10 × Node"), Limit(1000, "1 GB/s")],
                inputs="utf-8"),
            Row("read_text", "MB/s", [Ratio(3, text="3 × the best")], inputs="shift_jis|windows"),
            Row("write_text", "MB/s", []),
            Row("small_request", "µs more than an empty handler", [Limit(20, "below 20 µs")]),
        ]),
    "detection": Section(
        programs=["detection_benchmark"],
        rows=[Row("detect a charset", "ms", [Limit(0.5, "0.5 ms")])]),
    "document_growth": Section(
        programs=["growth_benchmark"],
        order=("what", "who", "input"),
        ours="bundle",
        rows=[
            Growth("read a text of a size", "ns per byte"),
            Growth("write a text of a size", "ns per byte"),
            Growth("read a package of a size", "ns per byte"),
            Growth("write a package of a size", "ns per byte"),
            Growth("read a package of parts of 1 KB", "µs per part"),
            Growth("write a package of parts of 1 KB", "µs per part"),
            Growth("read texts of 10 KB at once", "µs per request"),
        ]),
    "saves": Section(
        programs=["saves_benchmark"],
        ours="guarded",
        rows=[
            Row("save a text", "ms", [], inputs="in memory"),
            Row("save a text", "ms", [Ratio(0.75, ("synced",), "a third more than synced")],
                inputs="60 MB on disk"),
            Row("save a text", "ms", [], inputs="1 KB on disk"),
        ]),
    "nats": Section(
        programs=[[str(BUILD / "bin" / "nats_benchmark"), REPETITIONS]],
        order=("what", "who"),
        ours="bundle",
        rows=[
            Row("small read", "µs per request", [Ratio(0.9, ("echo",), "90 % of the echo")]),
            Row("small read", "ms until the answer", []),
            Row("small read", "ms at most, of 99 in 100", []),
            Row("read of 10 MB", "MB/s", []),
            Row("read of 10 MB", "ms until the answer", []),
        ]),
}

# ---- Running ----


def build(root=ROOT, peers=True):
    """Installs what the benchmarks of the sources in `root` need, and builds them as the product is built."""
    script = """
        set -euo pipefail
        root=$1
        source "$root/packaging/set_up.sh"
        install_packages "$root/packaging/debian-packages.txt"
        install_packages "$root/packaging/debian-packages-benchmarks.txt"
        build benchmarks -DCMAKE_BUILD_TYPE=Release -DBUILD_TESTING=OFF \\
            -DEDITOR_SERIALIZATION_BENCHMARKS=ON
        [[ -z $2 || -d $root/benchmarks/peers/node_modules ]] ||
            (cd "$root/benchmarks/peers" && quietly npm npm ci)
    """
    subprocess.run(["bash", "-c", script, "build", str(root), "peers" if peers else ""], check=True)


def command_of(program, repetitions, root, only):
    """The command of a program of the sources in `root`; `only` is the one of whom it tells, if not all."""
    if isinstance(program, list):
        return [str(repetitions) if word == REPETITIONS else word.replace(str(ROOT), str(root))
                for word in program]
    return [str(root / BUILD.relative_to(ROOT) / "bin" / program), f"--benchmark_repetitions={repetitions}",
            "--benchmark_enable_random_interleaving=true", "--benchmark_format=json",
            "--benchmark_min_time=0.1"] + ([f"--benchmark_filter=/{only}(/|$)"] if only else [])


def is_built(program, root):
    """Whether a program of the sources in `root` is there; those of other languages always are."""
    command = command_of(program, 1, root, "")
    return not command[0].startswith(str(root)) or pathlib.Path(command[0]).exists()


def results_of(section, repetitions, root=ROOT, only_ours=False):
    """All that the section's programs print about single repetitions."""
    results = []
    for program in section.programs:
        if only_ours and isinstance(program, list) and program[0] == "node":
            continue
        command = command_of(program, repetitions, root, section.ours if only_ours else "")
        print("== " + " ".join(command), file=sys.stderr)
        output = subprocess.run(command, cwd=root, check=True, stdout=subprocess.PIPE, text=True,
                                env=os.environ | HUGE_PAGES).stdout
        repetitions_of_all = [result for result in json.loads(output)["benchmarks"]
                              if result.get("run_type", "iteration") == "iteration"]
        for result in repetitions_of_all:
            if result.get("error_occurred"):
                raise RuntimeError(f"{result['name']}: {result['error_message']}")
        # They ran in random order.
        results += sorted(repetitions_of_all, key=lambda result: result.get("family_index", 0))
    return results


# ---- Figures ----

SECONDS = {"ns": 1e-9, "us": 1e-6, "µs": 1e-6, "ms": 1e-3, "s": 1.0}


def figure_of(result, unit):
    """The result in `unit`."""
    if unit == "MB/s":
        return result["bytes_per_second"] / 1e6
    if unit in SECONDS:
        manual = result["name"].endswith("/manual_time")
        return result["real_time" if manual else "cpu_time"] * SECONDS[result["time_unit"]] / SECONDS[unit]
    # Google Benchmark gives rates per second; a time per item is an inverted one, in seconds.
    return result[unit]


def split(name, order):
    """The parts of a name, by what they say; an input that is not there is empty."""
    words = name.removesuffix("/manual_time").split("/")
    if len(words) < len(order):
        order = [part for part in order if part != "input"]
    return collections.defaultdict(str, zip(order, words, strict=True))


def figures(section, row, results):
    """All figures of each <who>, for each <input> in the order of the results."""
    found = collections.defaultdict(lambda: collections.defaultdict(list))
    for result in results:
        name = split(result["name"], section.order)
        if name["what"] == row.what and re.search(row.inputs, name["input"]):
            found[name["input"]][name["who"]].append(figure_of(result, row.unit))
    return found


def medians(section, row, results):
    """The median of each <who>, for each <input> in the order of the results."""
    return {given: {who: statistics.median(values) for who, values in by_who.items()}
            for given, by_who in figures(section, row, results).items()}


def shown(figure):
    """Three significant digits, no exponent."""
    if figure >= 100:
        return f"{figure:.0f}"
    return f"{figure:.3g}"


def advantage(row, ours, peer):
    """How many times as good our figure is."""
    return ours / peer if row.more_is_better() else peer / ours


def check(row, target, ours, peers):
    """Whether the target is met."""
    if isinstance(target, Limit):
        return ours >= target.figure if row.more_is_better() else ours <= target.figure
    compared = [figure for who, figure in peers.items() if not target.peers or who in target.peers]
    if not compared:
        raise ValueError(f"{row.what}: none of {target.peers} was measured")
    return all(advantage(row, ours, peer) >= target.factor for peer in compared)


def row_lines(section, row, results):
    lines = []
    for given, by_who in medians(section, row, results).items():
        ours = by_who.pop(section.ours)
        peers = sorted(by_who.items(), key=lambda peer: peer[1], reverse=row.more_is_better())
        said = ", ".join(f"{who} {shown(figure)} (×{advantage(row, ours, figure):.2f})"
                         for who, figure in peers)
        targets = "; ".join(target.text for target in row.targets)
        met = "; ".join("yes" if check(row, target, ours, by_who) else "**no**"
                        for target in row.targets)
        lines.append(f"| {row.what} | {given} | {shown(ours)} {row.unit} | {said} | {targets} | {met} |")
    return lines


def growth_lines(section, row, results):
    by_size = medians(section, row, results)
    if not by_size:
        return []
    ours = [by_who[section.ours] for by_who in by_size.values()]
    return ["", f"{row.what}, {row.unit}:", "",
            "| " + " | ".join(by_size) + " |",
            "|" + "---:|" * len(ours),
            "| " + " | ".join(shown(figure) for figure in ours) + " |"]


def table_of(section, results):
    lines = []
    for row in section.rows:
        if isinstance(row, Row):
            lines += row_lines(section, row, results)
    if lines:
        lines = ["| measure | input | ours | peers (ours is × times as good) | target | met |",
                 "|---|---|---:|---|---|---|"] + lines
    for row in section.rows:
        if isinstance(row, Growth):
            lines += growth_lines(section, row, results)
    return "\n".join(lines)


def machine():
    """One line about what the figures were measured on."""
    model = next((line.split(":", 1)[1].strip() for line in open("/proc/cpuinfo", encoding="utf-8")
                  if line.startswith("model name")), platform.machine())
    compiler = subprocess.run(["c++", "--version"], check=True, stdout=subprocess.PIPE,
                              text=True).stdout.splitlines()[0]
    return f"{model}, {os.cpu_count()} cores; {compiler}"


def write(name, text):
    """Puts the section's figures into their place in the document."""
    begin, end = f"<!-- figures: {name} -->\n", "<!-- end of figures -->"
    document = DOCUMENT.read_text(encoding="utf-8")
    before, found, rest = document.partition(begin)
    if not found:
        raise ValueError(f"{DOCUMENT} has no place for the figures of {name}")
    after = rest.partition(end)[2]
    DOCUMENT.write_text(before + begin + text + "\n" + end + after, encoding="utf-8")


def main():
    parser = argparse.ArgumentParser(description="Runs benchmarks and writes docs/performance.md.")
    parser.add_argument("--repetitions", type=int, default=5)
    parser.add_argument("--no-write", action="store_true", help="only print the tables")
    parser.add_argument("sections", nargs="*", metavar="SECTION", help=", ".join(SECTIONS))
    arguments = parser.parse_args()
    unknown = set(arguments.sections) - set(SECTIONS)
    if unknown:
        parser.error(f"no such section: {', '.join(sorted(unknown))}")

    build()
    for name in arguments.sections or SECTIONS:
        results = results_of(SECTIONS[name], arguments.repetitions)
        text = (f"Medians of {arguments.repetitions} repetitions on {machine()}.\n\n"
                + table_of(SECTIONS[name], results))
        print(f"\n{name}\n{text}")
        if not arguments.no_write:
            write(name, text)


if __name__ == "__main__":
    main()
