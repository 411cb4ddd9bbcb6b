#!/usr/bin/env python3
"""Compiles every header of the project on its own, so none leans on what a precompiled header or an
earlier include happened to bring.

Usage: scripts/check-headers.py BUILD_DIR [FILE...]
BUILD_DIR is a configured build (any; precompiled headers are stripped from its commands; run its
*_autogen targets first). Each header is compiled with the flags of a source file that includes it, or
of one in its own folder where nothing includes it. A .cpp file named among the
FILEs is checked with its own flags. Prints the files that fail; exit status 1 if any does.
"""
import json
import os
import shlex
import subprocess
import sys
import tempfile
from concurrent.futures import ThreadPoolExecutor

root = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))


def flags_of(entry):
    args = entry["arguments"] if "arguments" in entry else shlex.split(entry["command"])
    kept, skip = [], False
    for arg in args[1:]:
        if skip:
            skip = False
            continue
        if arg in ("-o", "-c", "-MF", "-MT", "-include"):
            skip = True
            continue
        if arg in ("-MD", "-Winvalid-pch") or arg == entry["file"]:
            continue
        kept.append(arg)
    return [args[0]] + kept


def main():
    if len(sys.argv) < 2:
        sys.exit(__doc__)
    build = sys.argv[1]
    with open(os.path.join(build, "compile_commands.json")) as f:
        entries = [e for e in json.load(f) if e["file"].endswith(".cpp") and "_autogen" not in e["file"]]
    by_file = {os.path.realpath(e["file"]): e for e in entries}
    by_folder = {}
    for entry in entries:
        by_folder.setdefault(os.path.dirname(os.path.realpath(entry["file"])), entry)
    widest = max(entries, key=lambda e: len(flags_of(e)))
    # A header is checked with the flags of a file that includes it: those are the folders it may see.
    users = {}
    for entry in entries:
        with open(entry["file"], errors="replace") as f:
            for line in f:
                if line.startswith('#include "'):
                    users.setdefault(line.split('"')[1], entry)
    headers = sys.argv[2:] or subprocess.run(
        ["git", "-C", root, "ls-files", "*.h"], capture_output=True, text=True, check=True).stdout.split()
    headers = [os.path.realpath(os.path.join(root, h)) for h in headers]

    def check(header):
        if header in by_file:
            entry = by_file[header]
            result = subprocess.run(flags_of(entry) + ["-fsyntax-only", header], cwd=entry["directory"],
                                    capture_output=True, text=True)
            return header, result.returncode, result.stderr
        entry = users.get(os.path.basename(header)) or by_folder.get(os.path.dirname(header), widest)
        with tempfile.NamedTemporaryFile("w", suffix=".cpp") as unit:
            unit.write('#include "%s"\n' % header)
            unit.flush()
            result = subprocess.run(flags_of(entry) + ["-I", os.path.dirname(header), "-fsyntax-only", unit.name],
                                    cwd=entry["directory"], capture_output=True, text=True)
        return header, result.returncode, result.stderr

    failed = 0
    with ThreadPoolExecutor(max_workers=int(os.environ.get("JOBS", "2"))) as pool:
        for header, code, errors in pool.map(check, headers):
            if code != 0:
                failed += 1
                print("== %s\n%s" % (os.path.relpath(header, root), errors))
    print("%d of %d files do not compile on their own" % (failed, len(headers)))
    sys.exit(1 if failed else 0)


if __name__ == "__main__":
    main()
