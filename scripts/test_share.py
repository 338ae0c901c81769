#!/usr/bin/env python3
"""Prints the size of the test suite against the size of the code.

Counts non-blank lines that are not only a comment in C, C++ and Python files.
Tests: tests/ and python/tests/. Code: src/, include/, sim/, cli/, capture/ and
python/varnel/. Fuzz targets and benchmarks count on neither side.
Exits 1 when the tests exceed the given share (default 0.33) of the code.
"""
import os
import sys

ROOT = os.path.join(os.path.dirname(os.path.abspath(__file__)), "..")
TESTS = ["tests", "python/tests"]
CODE = ["src", "include", "sim", "cli", "capture", "python/varnel"]
C_LIKE = {".c", ".cc", ".cpp", ".h", ".hpp"}


def counted_lines(path, python):
    count, in_block = 0, False
    with open(path, encoding="utf-8", errors="replace") as f:
        for line in f:
            s = line.strip()
            if python:
                count += bool(s) and not s.startswith("#")
                continue
            if in_block:
                if "*/" not in s:
                    continue
                in_block, s = False, s.split("*/", 1)[1].strip()
            elif s.startswith("/*"):
                if "*/" not in s:
                    in_block = True
                    continue
                s = s.split("*/", 1)[1].strip()
            count += bool(s) and not s.startswith("//")
    return count


def tree_lines(folders):
    total = 0
    for folder in folders:
        for root, _, files in os.walk(os.path.join(ROOT, folder)):
            for name in files:
                ext = os.path.splitext(name)[1]
                if ext in C_LIKE or ext == ".py":
                    total += counted_lines(os.path.join(root, name), ext == ".py")
    return total


def main():
    limit = float(sys.argv[1]) if len(sys.argv) > 1 else 0.33
    tests, code = tree_lines(TESTS), tree_lines(CODE)
    share = tests / code
    print(f"tests {tests} lines, code {code} lines: {share:.1%} (limit {limit:.0%})")
    return 0 if share <= limit else 1


if __name__ == "__main__":
    sys.exit(main())
