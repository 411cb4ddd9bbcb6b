#!/usr/bin/env python3
"""Lines and branches one coverage report (scripts/coverage.sh) covers and another does not.

usage: coverage-compare.py [--before-rev REV] BEFORE.json AFTER.json [OTHER.json...]
What the OTHER reports cover counts as covered after (the suites of other test binaries, when AFTER is
the report of some binaries only). With --before-rev, BEFORE was measured on the sources of git revision
REV: its lines are followed to where they stand now, and lines since changed or removed are listed apart.
Exits 1 when AFTER misses something BEFORE covered in a line that still holds the same text, so code that
was deleted or moved is listed apart and does not count as lost.
"""
import difflib
import json
import subprocess
import sys
from pathlib import Path


def covered(report):
    lines, branches = {}, {}
    for entry in json.loads(Path(report).read_text())["files"]:
        name = entry["file"]
        for line in entry["lines"]:
            if line.get("gcovr/noncode"):
                continue
            number = line["line_number"]
            if line["count"] > 0:
                lines.setdefault(name, set()).add(number)
            for index, branch in enumerate(line.get("branches", [])):
                if branch["count"] > 0:
                    branches.setdefault(name, set()).add((number, index))
    return lines, branches


def line_map(revision, name, now):
    """Old line number -> current line number for the lines of `name` unchanged since `revision`."""
    shown = subprocess.run(["git", "show", f"{revision}:{name}"], capture_output=True, text=True)
    if shown.returncode != 0:
        return {}
    old = shown.stdout.splitlines()
    mapping = {}
    for block in difflib.SequenceMatcher(None, old, now, autojunk=False).get_matching_blocks():
        for offset in range(block.size):
            mapping[block.a + offset + 1] = block.b + offset + 1
    return mapping


def follow(revision, before_lines, before_branches):
    """The before sets moved to today's line numbers, and the count of lines that changed or went."""
    lines, branches, changed = {}, {}, 0
    for name in set(before_lines) | set(before_branches):
        path = Path(name)
        now = path.read_text(errors="replace").splitlines() if path.exists() else []
        mapping = line_map(revision, name, now)
        for number in before_lines.get(name, set()):
            if number in mapping:
                lines.setdefault(name, set()).add(mapping[number])
            else:
                changed += 1
        for number, index in before_branches.get(name, set()):
            if number in mapping:
                branches.setdefault(name, set()).add((mapping[number], index))
    return lines, branches, changed


def main():
    arguments = sys.argv[1:]
    revision = None
    if arguments[:1] == ["--before-rev"]:
        revision, arguments = arguments[1], arguments[2:]
    before_lines, before_branches = covered(arguments[0])
    if revision:
        before_lines, before_branches, changed = follow(revision, before_lines, before_branches)
        print(f"{changed} covered lines of {revision} have since changed or gone (not counted)")
    after_lines, after_branches = covered(arguments[1])
    for other in arguments[2:]:
        other_lines, other_branches = covered(other)
        for name, numbers in other_lines.items():
            after_lines.setdefault(name, set()).update(numbers)
        for name, pairs in other_branches.items():
            after_branches.setdefault(name, set()).update(pairs)
    lost = 0
    for name in sorted(set(before_lines) | set(before_branches)):
        path = Path(name)
        text = path.read_text(errors="replace").splitlines() if path.exists() else None
        missing_lines = sorted(before_lines.get(name, set()) - after_lines.get(name, set()))
        missing_branches = sorted(before_branches.get(name, set()) - after_branches.get(name, set()))
        if not missing_lines and not missing_branches:
            continue
        if text is None:
            print(f"{name}: gone (deleted or moved)")
            continue
        for number in missing_lines:
            lost += 1
            source = text[number - 1].strip() if number <= len(text) else "?"
            print(f"{name}:{number}: line no longer covered: {source}")
        for number, index in missing_branches:
            if number in missing_lines:
                continue
            lost += 1
            source = text[number - 1].strip() if number <= len(text) else "?"
            print(f"{name}:{number}: branch {index} no longer taken: {source}")
    total = lambda sets: sum(len(s) for s in sets.values())
    print(f"before: {total(before_lines)} lines, {total(before_branches)} branches covered; "
          f"after: {total(after_lines)} lines, {total(after_branches)} branches; {lost} lost")
    return 1 if lost else 0


if __name__ == "__main__":
    sys.exit(main())
