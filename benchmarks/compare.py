#!/usr/bin/env python3
# SPDX-License-Identifier: Apache-2.0
"""Tells what became slower or faster between two commits.

    benchmarks/compare.py [--rounds N] [--keep DIR] OLD NEW [SECTION...]

Builds the benchmarks of both commits in scratch folders and runs ours, without the peers, in turn: each
round runs both, one after the other and in changing order, so that what else the machine does meanwhile
falls on both. SECTION is one or more of those of benchmarks/run.py; without any, all are run.

A figure has changed when the middle halves of its values, from the first to the third quartile, do not
overlap, and the medians differ by more than 5 %. Whatever changes less is noise, or cannot be told from
it. The exit status is 1 when something became slower.
"""
import argparse
import collections
import pathlib
import statistics
import subprocess
import sys
import tempfile

import run

SMALLEST_CHANGE = 0.05


def checkout(commit, folder):
    """The files of `commit`, built."""
    folder.mkdir(parents=True, exist_ok=True)
    archive = subprocess.run(["git", "archive", commit], cwd=run.ROOT, check=True,
                             stdout=subprocess.PIPE).stdout
    subprocess.run(["tar", "-x", "-C", str(folder)], input=archive, check=True)
    run.build(folder, peers=False)
    return folder


def figures_of(section, root):
    """One value for each of our figures: {(what, input, unit): (value, whether more is better)}. None
    where the sources in `root` lack one of the section's programs."""
    if not all(run.is_built(program, root) for program in section.programs):
        return {}
    results = run.results_of(section, 1, root, only_ours=True)
    values = {}
    for row in section.rows:
        for given, by_who in run.figures(section, row, results).items():
            for value in by_who.get(section.ours, []):
                values[(row.what, given, row.unit)] = (value, row.more_is_better())
    return values


def measure(sections, roots, rounds):
    """All values of each figure, by root."""
    values = collections.defaultdict(lambda: {root: [] for root in roots})
    more_is_better = {}
    for i in range(rounds):
        for name in sections:
            for root in roots if i % 2 == 0 else reversed(roots):
                print(f"== round {i + 1} of {rounds}: {name}, {root.name}", file=sys.stderr)
                for figure, (value, more) in figures_of(run.SECTIONS[name], root).items():
                    values[figure][root].append(value)
                    more_is_better[figure] = more
    return values, more_is_better


def middle_half(values):
    """The first and the third quartile."""
    if len(values) < 2:
        return values[0], values[0]
    first, _, third = statistics.quantiles(values, n=4, method="inclusive")
    return first, third


def speed_up(old, new, more_is_better):
    """How many times as fast the new values are; 1 for what cannot be told from noise."""
    (old_low, old_high), (new_low, new_high) = middle_half(old), middle_half(new)
    if old_low <= new_high and new_low <= old_high:
        return 1.0
    factor = statistics.median(new) / statistics.median(old)
    factor = factor if more_is_better else 1 / factor
    return factor if abs(factor - 1) > SMALLEST_CHANGE else 1.0


def report(values, more_is_better, old, new):
    """Prints the changes. Returns whether something became slower."""
    changes = []
    missing = []
    for figure, by_root in values.items():
        if not by_root[old] or not by_root[new]:
            missing.append((figure, "OLD" if not by_root[old] else "NEW"))
            continue
        factor = speed_up(by_root[old], by_root[new], more_is_better[figure])
        if factor != 1.0:
            changes.append((factor, figure, by_root))
    for factor, (what, given, unit), by_root in sorted(changes, key=lambda change: change[0]):
        word = "slower" if factor < 1 else "faster"
        print(f"{word} ×{factor:.2f}: {what} {given}: {run.shown(statistics.median(by_root[old]))} → "
              f"{run.shown(statistics.median(by_root[new]))} {unit}")
    for (what, given, unit), where in missing:
        print(f"not in {where}: {what} {given}, {unit}")
    print(f"{len(changes)} of {len(values) - len(missing)} figures changed beyond the noise")
    return any(factor < 1 for factor, _, _ in changes)


def main():
    parser = argparse.ArgumentParser(description="Tells what became slower or faster between two commits.")
    parser.add_argument("--rounds", type=int, default=7)
    parser.add_argument("--keep", metavar="DIR", help="build in this folder, and leave it")
    parser.add_argument("old", metavar="OLD")
    parser.add_argument("new", metavar="NEW")
    parser.add_argument("sections", nargs="*", metavar="SECTION", help=", ".join(run.SECTIONS))
    arguments = parser.parse_args()
    unknown = set(arguments.sections) - set(run.SECTIONS)
    if unknown:
        parser.error(f"no such section: {', '.join(sorted(unknown))}")

    with tempfile.TemporaryDirectory(prefix="compare-") as scratch:
        folder = pathlib.Path(arguments.keep or scratch).resolve()
        old, new = (checkout(commit, folder / name)
                    for name, commit in (("old", arguments.old), ("new", arguments.new)))
        values, more_is_better = measure(arguments.sections or list(run.SECTIONS), [old, new],
                                         arguments.rounds)
        sys.exit(1 if report(values, more_is_better, old, new) else 0)


if __name__ == "__main__":
    main()
