#!/usr/bin/env python3
"""summary.py RESULTS: adds up the unit tests (Google Test's JSON) and the scenarios of one run,
says what was skipped and why, and ends with the line "N passed, N failed, N skipped".
Exit status 1 when a test failed or none ran, and in CI (CI=true) also when one was skipped."""
import json
import os
import pathlib
import re
import sys


def unit_tests(folder):
    for path in sorted(folder.glob("*/*.json")):
        report = json.loads(path.read_text(encoding="utf-8", errors="replace"))
        for suite in report["testsuites"]:
            for test in suite["testsuite"]:
                name = f"{path.parent.name}: {suite['name']}.{test['name']}"
                if test.get("failures"):
                    yield name, "failed", ""
                elif test["result"] == "SKIPPED":
                    reason = " ".join(s.get("message", "") for s in test.get("skipped", []))
                    yield name, "skipped", reason.strip().splitlines()[-1] if reason else "no reason"
                elif test["status"] == "RUN":
                    yield name, "passed", ""


def main():
    folder = pathlib.Path(sys.argv[1])
    count = {"passed": 0, "failed": 0, "skipped": 0}
    for name, result, reason in unit_tests(folder):
        count[result] += 1
        if result != "passed":
            print(f"{result}: {name} {reason}")
    for log in sorted(folder.glob("*-scenarios.log")):
        text = log.read_text(encoding="utf-8", errors="replace")
        for line in re.findall(r"^skipped: .*", text, re.M):
            print(line)
        for passed, failed, skipped in re.findall(
                r"^(\d+) passed, (\d+) failed, (\d+) skipped$", text, re.M)[-1:]:
            count["passed"] += int(passed)
            count["failed"] += int(failed)
            count["skipped"] += int(skipped)
    print(f"{count['passed']} passed, {count['failed']} failed, {count['skipped']} skipped")
    in_ci = os.environ.get("CI") == "true"
    return 1 if count["failed"] or not count["passed"] or (in_ci and count["skipped"]) else 0


if __name__ == "__main__":
    sys.exit(main())
