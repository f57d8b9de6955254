#!/usr/bin/env bash
# SPDX-License-Identifier: Apache-2.0
# Runs the tests that make system calls and allocations fail, and prints how many each of them did.
# Usage: count_faults.sh BUILD-FOLDER
set -euo pipefail
results=$(mktemp -d)
trap 'rm -r "$results"' EXIT

for program in host_faults out_of_memory package requests serialization; do
    "$1/bin/${program}_test" --gtest_filter='*Faults*:SaveFault*' --gtest_brief=1 \
        --gtest_output="json:$results/$program.json" >&2
done
python3 - "$results"/*.json <<'END'
import json
import sys

total = 0
for file in sys.argv[1:]:
    for suite in json.load(open(file))["testsuites"]:
        for test in suite["testsuite"]:
            faults = int(test.get("faults", 0))
            total += faults
            print(f"{faults:6} {suite['name']}.{test['name']}")
print(f"{total:6} in all")
END
