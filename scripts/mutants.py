#!/usr/bin/env python3
"""Does a smaller test suite still catch what a larger one caught? Mutation testing on chosen lines.

usage: mutants.py OLD_TREE NEW_TREE LINES.tsv [--build DIR]

OLD_TREE and NEW_TREE are checkouts (git worktrees) of the project with the old and the new tests, each
built in DIR (default build-tests) with the same flags, at the same depth below one folder, so that
ccache compiles a mutated file once for both. LINES.tsv has one line to mutate a row:

    FILE:LINE <tab> BINARY <tab> OLD_FILTER <tab> NEW_FILTER

FILE:LINE names the line in NEW_TREE (the same text is found in OLD_TREE's file); BINARY is the test
binary (in DIR/tests) holding the tests that covered it, or OLD_BINARY>NEW_BINARY when a check moved to
the tests of another binary (a lower layer); the filters are gtest filters of the tests that
covered it in each suite. Each line gets one mutant, the first of these that applies: a comparison
flipped, `&&` and `||` swapped, an integer constant +1, the statement deleted. A mutant is killed when the
filtered tests fail (or crash, or time out). Prints a table and exits 1 when a mutant the old suite killed
survives the new one. Both trees are restored afterwards, whatever happens.
"""
import argparse
import os
import re
import subprocess
import sys
from pathlib import Path

FLIPS = [("<=", ">"), (">=", "<"), ("==", "!="), ("!=", "=="), ("<", ">="), (">", "<=")]
COMPARISON = re.compile(r"(?<![<>=!&|+\-*/%^-])(<=|>=|==|!=|<|>)(?![<>=])")


def masked(code):
    """`code` with the insides of string and character literals blanked, at the same length."""
    return re.sub(r'"(\\.|[^"\\])*"|\'(\\.|[^\'\\])*\'', lambda m: m.group()[0] + " " * (len(m.group()) - 2) +
                  m.group()[-1], code)


def condition(code):
    """The span of the condition of an `if` on the line, or None."""
    start = code.find("if (")
    if start < 0:
        return None
    depth = 0
    for index in range(start + 3, len(code)):
        depth += {"(": 1, ")": -1}.get(code[index], 0)
        if depth == 0:
            return start + 4, index
    return None


def mutations(text):
    """The mutants a line offers, as (what, new text), best first."""
    code = masked(text.split("//")[0] if '"' not in text else text)
    if "//" in code:
        code = code[: code.index("//")]
    found = []
    for match in COMPARISON.finditer(code):
        operator = match.group(1)
        # `<` and `>` are also template brackets and arrows; only flip them between spaces.
        if operator in ("<", ">") and not (code[match.start() - 1: match.start()] == " " and
                                           code[match.end(): match.end() + 1] == " "):
            continue
        flipped = dict(FLIPS)[operator]
        found.append((f"{operator} -> {flipped}", text[:match.start()] + flipped + text[match.end():]))
        break
    for a, b in (("&&", "||"), ("||", "&&")):
        index = code.find(f" {a} ")
        if index >= 0:
            found.append((f"{a} -> {b}", text[:index + 1] + b + text[index + 3:]))
            break
    span = condition(code)
    if span:
        begin, end = span
        found.append(("condition negated", text[:begin] + "!(" + text[begin:end] + ")" + text[end:]))
    number = re.search(r"(?<![\w.%])(\d+)(?![\w.])", code)
    if number:
        value = int(number.group(1))
        found.append((f"{value} -> {value + 1}", text[:number.start()] + str(value + 1) + text[number.end():]))
    stripped = code.strip()
    if stripped.endswith(";") and not stripped.startswith(("return", "const ", "auto ", "int ", "bool ",
                                                           "QString ", "for ", "if ", "case ", "break",
                                                           "continue", "using ", "}")):
        indent = text[: len(text) - len(text.lstrip())]
        found.append(("statement deleted", indent + ";"))
    return found


def find_line(lines, text, near):
    """The index of `text` in `lines`, nearest to `near`, or None."""
    candidates = [i for i, line in enumerate(lines) if line == text]
    return min(candidates, key=lambda i: abs(i - near)) if candidates else None


def run(command, cwd=None, timeout=900):
    try:
        return subprocess.run(command, cwd=cwd, stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
                              timeout=timeout).returncode
    except subprocess.TimeoutExpired:
        return -1


def test_environment():
    environment = dict(os.environ)
    for name in ("DBUS_SESSION_BUS_ADDRESS", "DISPLAY", "WAYLAND_DISPLAY"):
        environment.pop(name, None)
    environment["QT_QPA_PLATFORM"] = "offscreen"
    return environment


def verdict(tree, build, binary, gtest_filter):
    """killed, survived or stillborn (does not build)."""
    if run(["cmake", "--build", str(tree / build), "--target", binary]) != 0:
        return "stillborn"
    try:
        result = subprocess.run([str(tree / build / "tests" / binary), f"--gtest_filter={gtest_filter}"],
                                stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL, timeout=300,
                                env=test_environment())
        return "survived" if result.returncode == 0 else "killed"
    except subprocess.TimeoutExpired:
        return "killed"


def main():
    parser = argparse.ArgumentParser()
    parser.add_argument("old", type=Path)
    parser.add_argument("new", type=Path)
    parser.add_argument("lines", type=Path)
    parser.add_argument("--build", default="build-tests")
    options = parser.parse_args()

    rows = [row.split("\t") for row in options.lines.read_text().splitlines() if row.strip() and not
            row.startswith("#")]
    lost, results = 0, []
    for place, binaries, old_filter, new_filter in rows:
        old_binary, _, new_binary = binaries.partition(">")
        new_binary = new_binary or old_binary
        file, number = place.rsplit(":", 1)
        new_path, old_path = options.new / file, options.old / file
        new_original, old_original = new_path.read_text(), old_path.read_text()
        new_lines, old_lines = new_original.split("\n"), old_original.split("\n")
        index = int(number) - 1
        text = new_lines[index]
        old_index = find_line(old_lines, text, index)
        offered = mutations(text)
        if old_index is None or not offered:
            results.append((place, "-", "no mutant", "", ""))
            continue
        what, mutated = offered[0]
        try:
            new_lines[index] = mutated
            old_lines[old_index] = mutated
            new_path.write_text("\n".join(new_lines))
            old_path.write_text("\n".join(old_lines))
            old = verdict(options.old, options.build, old_binary, old_filter)
            new = verdict(options.new, options.build, new_binary, new_filter) if old != "stillborn" else "-"
        finally:
            new_path.write_text(new_original)
            old_path.write_text(old_original)
        if old == "killed" and new != "killed":
            lost += 1
        results.append((place, what, old, new, text.strip()))
        print(f"{place:50} {what:20} old {old:9} new {new:9} {text.strip()[:60]}", flush=True)

    # Restore the binaries to the unmutated sources.
    for tree in (options.old, options.new):
        for binary in sorted({name for row in rows for name in row[1].split(">")}):
            run(["cmake", "--build", str(tree / options.build), "--target", binary])
    made = [r for r in results if r[2] in ("killed", "survived")]
    old_killed = [r for r in made if r[2] == "killed"]
    new_killed = [r for r in old_killed if r[3] == "killed"]
    print(f"{len(made)} mutants built; the old suite killed {len(old_killed)}, the new suite "
          f"{len(new_killed)} of those; {len(results) - len(made)} lines without a mutant that builds")
    return 1 if lost else 0


if __name__ == "__main__":
    sys.exit(main())
