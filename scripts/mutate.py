#!/usr/bin/env python3
"""Mutation sampling: how many small injected faults in src/ does the suite catch?

    python3 scripts/mutate.py [--seed N] [--count N] [--only FOLDER] [--list] [--out FILE]

Scans src/**/*.cpp|.h (files and lines sorted; comments, string and character
literals, preprocessor lines with their continuations and static_assert lines
skipped) for mutation sites of five kinds:

  cmp     a comparison flipped: == and != swapped, < to >=, <= to >, > to <=, >= to <
          (< and > only written with a blank on both sides, so templates are left alone)
  const   a decimal integer constant off by one (n+1, or n-1)
  negate  the condition of an if or while on one line negated: if (c) -> if (!(c))
  stmt    a one-line call, assignment or throw statement replaced by {}
  code    a return code swapped: an ME_ code to ME_SUCCESS (ME_SUCCESS to ME_FAIL),
          return 0 to return -17, return -1/1 to return 0, return true/false swapped

The sample is drawn with random.Random(seed) from the sorted candidates, the
count split evenly over the kinds, so the same tree and seed give the same
mutants. Each mutant is written into its file, the test programs that cover its
folder (FOLDER_TESTS below) are rebuilt incrementally in build-mutate/ and run
directly with --gtest_fail_fast under a timeout. The file is always restored,
on errors and Ctrl-C too. Verdicts: killed (a test failed, crashed or timed
out), survived, no-compile (excluded from the score).

build-mutate/ is configured like scripts/build.sh (warnings are errors, no
benchmarks) but with Ninja and -O1 without debug information: a mutant's
rebuild is one uncached compile plus the links, and on the shared 2-core
machine make's own dependency walk took 6 s per mutant and -O2 -g made a
mutant's compile and links some twice as slow. The first run configures and builds it (some 8 minutes there).

Each folder runs the test program holding its tests (read from
tests/CMakeLists.txt, so merged programs are followed) plus the programs that drive it through
whole requests: test_requests and the fault sweep (test_faults) for the layers
below the requests, test_component and test_capi above. The command's,
schemas', capture and packaging tests start processes or replay recordings
through the same code and are left out for time. Measured with the machine
under a load of 10-20: 150 mutants in about 40 minutes, 3-40 s a mutant (a
header costs the most); a test program gets TEST_TIMEOUT seconds (the slowest,
test_faults, needs some 15), and a mutant that loops counts as killed.

Not a CI stage: a tool to compare the suite before and after a change to it.
"""
import argparse
import os
import random
import re
import signal
import subprocess
import sys
import time
from pathlib import Path

ROOT = Path(__file__).resolve().parent.parent
# src folder -> the tests/ folders whose programs are run for a mutant in it.
FOLDER_TESTS = {
    "errors": ["errors", "component", "capi", "requests"],
    "xmlcheck": ["contracts", "requests"],
    "util": ["util", "readings", "requests", "faults"],
    "platform": ["platform", "component", "requests"],
    "contracts": ["contracts", "requests", "faults"],
    "settings": ["settings", "requests", "faults"],
    "readings": ["readings", "requests", "faults"],
    "session": ["session", "requests", "faults"],
    "requests": ["requests", "faults", "component"],
    "component": ["component", "capi", "faults"],
    "capi": ["capi"],
    "exports": ["cli"],
}
TEST_TIMEOUT = 60
BUILD_TIMEOUT = 900
KINDS = ["cmp", "const", "negate", "stmt", "code"]

CMP_FLIP = {"==": "!=", "!=": "==", "<": ">=", "<=": ">", ">": "<=", ">=": "<"}
CMP_RE = re.compile(r"(?<=\s)(==|!=|<=|>=|<|>)(?=\s)")
CONST_RE = re.compile(r"(?<![\w.'])(\d+)(?![\w.'])")
COND_RE = re.compile(r"\b(if|while)\s*\(")
STMT_RE = re.compile(r"^\s*(throw\b|\*?[A-Za-z_]\w*(\s*(\.|->|::)\s*~?[A-Za-z_]\w*|\[[^\]]*\])*"
                     r"\s*(\(|=(?!=)|\+=|-=|\|=|&=|\+\+|--))")
STMT_SKIP_RE = re.compile(r"^\s*(return|break|continue|goto|case|default|using|typedef|namespace|"
                          r"struct|class|enum|template|friend|public|private|protected)\b"
                          r"|=\s*(default|delete)\s*;|\)\s*(const|override|noexcept|final)\s*;")
RET_RE = re.compile(r"\breturn\s+(true|false|-?\d+)\s*;")
DECL_RE = re.compile(r"^\s*(const\s+)?[\w:<>]+[\s&*]+\w+\s*=")  # if (auto x = ...) is not negated
CODE_RE = re.compile(r"\bME_[A-Z_]+\b")


def test_programs():
    """tests/ folder -> the test program holding its sources, from tests/CMakeLists.txt
    (a program may hold several folders: varnel_test(name folder/x.cpp ...))."""
    programs = {}
    for name, sources in re.findall(r"varnel_test\((\w+)([^)]*)\)", (ROOT / "tests/CMakeLists.txt").read_text()):
        for source in sources.split():
            programs[source.split("/")[0] if "/" in source else name] = "test_" + name
    return programs


def programs_for(path, programs):
    return list(dict.fromkeys(programs[f] for f in FOLDER_TESTS[Path(path).parts[1]] if f in programs))


def masked_lines(text):
    """The text's lines with comments and string/char literals blanked (same columns)."""
    out, i, n = [], 0, len(text)
    while i < n:
        c = text[i]
        if text.startswith("//", i):
            j = text.find("\n", i)
            j = n if j < 0 else j
            out.append(" " * (j - i))
            i = j
        elif text.startswith("/*", i):
            j = text.find("*/", i + 2)
            j = n if j < 0 else j + 2
            out.append(re.sub(r"[^\n]", " ", text[i:j]))
            i = j
        elif c == 'R' and text.startswith('R"', i) and (i == 0 or not (text[i - 1].isalnum() or text[i - 1] == "_")):
            d = text.find("(", i)
            end = ")" + text[i + 2:d] + '"'
            j = text.find(end, d)
            j = n if j < 0 else j + len(end)
            out.append(re.sub(r"[^\n]", " ", text[i:j]))
            i = j
        elif c in "\"'" and not (c == "'" and i > 0 and text[i - 1].isalnum()):  # 1'000 separators
            j = i + 1
            while j < n and text[j] != c and text[j] != "\n":
                j += 2 if text[j] == "\\" else 1
            j = min(j + 1, n)
            out.append(c + " " * (j - i - 2) + c if j - i >= 2 else c)
            i = j
        else:
            out.append(c)
            i += 1
    return "".join(out).split("\n")


def matching_paren(line, start):
    depth = 0
    for k in range(start, len(line)):
        depth += {"(": 1, ")": -1}.get(line[k], 0)
        if depth == 0:
            return k
    return -1


def sites(path):
    """Every (line number, kind, column, before, after) candidate in one file."""
    text = path.read_text()
    found, continued, prev = [], False, ";"
    for no, (line, m) in enumerate(zip(text.split("\n"), masked_lines(text)), 1):
        code = m.strip()
        skip = continued or code.startswith("#") or "static_assert" in code
        continued = m.rstrip().endswith("\\") and (continued or code.startswith("#"))
        if skip or not code:
            prev = prev if not code else code[-1]
            continue
        for x in CMP_RE.finditer(m):
            found.append((no, "cmp", x.start(), x.group(), CMP_FLIP[x.group()]))
        for x in CONST_RE.finditer(m):
            v = int(x.group())
            for w in ([v + 1, v - 1] if v > 0 else [v + 1]):
                found.append((no, "const", x.start(), x.group(), str(w)))
        for x in COND_RE.finditer(m):
            close = matching_paren(m, x.end() - 1)
            if close > x.end() and not DECL_RE.match(m[x.end():close]):
                cond = line[x.end():close]
                found.append((no, "negate", x.end(), cond, "!(" + cond + ")"))
        if (prev in ";{}):" and code.endswith(";") and code.count("(") == code.count(")")
                and STMT_RE.match(m) and not STMT_SKIP_RE.search(m)):
            col = len(m) - len(m.lstrip())
            found.append((no, "stmt", col, line[col:len(m.rstrip())], "{}"))
        for x in RET_RE.finditer(m):
            v = x.group(1)
            after = {"true": "false", "false": "true", "0": "-17"}.get(v, "0")
            found.append((no, "code", x.start(1), v, after))
        for x in CODE_RE.finditer(m):
            found.append((no, "code", x.start(), x.group(), "ME_FAIL" if x.group() == "ME_SUCCESS" else "ME_SUCCESS"))
        prev = code[-1]
    return found


def sample(seed, count, only):
    # Folders without a row (the Windows-only COM layer) are not sampled.
    files = sorted(p for p in (ROOT / "src").rglob("*")
                   if p.suffix in (".cpp", ".h") and p.relative_to(ROOT / "src").parts[0] in FOLDER_TESTS)
    if only:
        files = [p for p in files if p.relative_to(ROOT / "src").parts[0] == only]
    by_kind = {k: [] for k in KINDS}
    for p in files:
        for no, kind, col, before, after in sites(p):
            by_kind[kind].append((p.relative_to(ROOT).as_posix(), no, kind, col, before, after))
    rng = random.Random(seed)
    chosen, share = [], [count // len(KINDS) + (i < count % len(KINDS)) for i in range(len(KINDS))]
    for kind, want in zip(KINDS, share):
        chosen += rng.sample(by_kind[kind], min(want, len(by_kind[kind])))
    return sorted(chosen, key=lambda m: (m[0], m[1], m[3], m[2], m[5]))


def run(cmd, timeout, **kw):
    """(exit code, output); None as exit code on a timeout. The whole process group is killed."""
    p = subprocess.Popen(cmd, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True, errors="replace",
                         start_new_session=True, **kw)
    try:
        out, _ = p.communicate(timeout=timeout)
        return p.returncode, out
    except subprocess.TimeoutExpired:
        kill(p)
        return None, p.communicate()[0]
    except BaseException:
        kill(p)
        p.wait()
        raise


def kill(p):
    try:
        os.killpg(p.pid, signal.SIGKILL)
    except ProcessLookupError:
        pass


def build(build_dir, targets):
    rc, out = run(["cmake", "--build", str(build_dir), "-j2"] + [a for t in targets for a in ("--target", t)],
                  BUILD_TIMEOUT)
    return rc == 0, out


def verdict(mutant, build_dir, programs):
    path, no, kind, col, before, after = mutant
    tests = programs_for(path, programs)
    f = ROOT / path
    original = f.read_bytes()
    lines = original.decode().split("\n")
    line = lines[no - 1]
    assert line[col:col + len(before)] == before, f"{path}:{no} moved"
    lines[no - 1] = line[:col] + after + line[col + len(before):]
    try:
        f.write_text("\n".join(lines))
        ok, _ = build(build_dir, tests)
        if not ok:
            return "no-compile", ""
        for t in tests:
            rc, out = run([str(build_dir / "bin" / t), "--gtest_fail_fast", "--gtest_brief=1"], TEST_TIMEOUT,
                          cwd=build_dir / "tests")
            if rc is None:
                return "killed", f"{t} timed out"
            if rc != 0:
                failed = re.findall(r"\[  FAILED  \] (\S+)", out)
                return "killed", f"{t} " + (failed[0] if failed else f"exit {rc}")
        return "survived", ""
    finally:
        f.write_bytes(original)


def interrupted(*_):
    raise KeyboardInterrupt  # so the mutated file is restored on kill too


def main():
    ap = argparse.ArgumentParser(description=__doc__.split("\n")[0])
    ap.add_argument("--seed", type=int, default=20)
    ap.add_argument("--count", type=int, default=150)
    ap.add_argument("--only", choices=sorted(FOLDER_TESTS), help="only mutants in src/FOLDER")
    ap.add_argument("--list", action="store_true", help="print the sample without running it")
    ap.add_argument("--build-dir", default="build-mutate")
    ap.add_argument("--out", help="also write the results to this file")
    args = ap.parse_args()
    signal.signal(signal.SIGTERM, interrupted)
    mutants = sample(args.seed, args.count, args.only)
    out = open(args.out, "w") if args.out else None

    def say(text):
        print(text, flush=True)
        if out:
            out.write(text + "\n")
            out.flush()

    def show(m):
        return f"{m[0]}:{m[1]} {m[2]} {m[4].strip()} -> {m[5]}"

    say(f"seed {args.seed}, {len(mutants)} mutants" + (f" in src/{args.only}" if args.only else ""))
    if args.list:
        for m in mutants:
            say(show(m))
        return 0
    build_dir = (ROOT / args.build_dir).resolve()
    if not (build_dir / "CMakeCache.txt").exists():
        subprocess.run(["cmake", "-S", str(ROOT), "-B", str(build_dir), "-G", "Ninja",
                        "-DCMAKE_BUILD_TYPE=RelWithDebInfo"] +
                       [f"-DCMAKE_{lang}_FLAGS_RELWITHDEBINFO=-O1 -DNDEBUG" for lang in ("C", "CXX")] +
                       ["-DVARNEL_WERROR=ON", "-DVARNEL_BUILD_BENCHMARKS=OFF"], check=True, stdout=subprocess.DEVNULL)
    programs = test_programs()
    needed = sorted({t for m in mutants for t in programs_for(m[0], programs)})
    ok, log = build(build_dir, needed)
    if not ok:
        sys.stderr.write(log + "\nThe unmutated tree does not build.\n")
        return 1
    counts, survivors, start = {"killed": 0, "survived": 0, "no-compile": 0}, [], time.time()
    for i, m in enumerate(mutants, 1):
        t0 = time.time()
        v, why = verdict(m, build_dir, programs)
        counts[v] += 1
        if v == "survived":
            survivors.append(m)
        say(f"[{i}/{len(mutants)}] {show(m)}: {v}{' (' + why + ')' if why else ''} {time.time() - t0:.0f} s")
    scored = counts["killed"] + counts["survived"]
    say(f"\nkilled {counts['killed']}/{scored} ({100 * counts['killed'] / max(scored, 1):.1f} %), "
        f"{counts['no-compile']} did not compile, {(time.time() - start) / 60:.1f} min")
    say(f"survivors ({len(survivors)}):")
    for m in survivors:
        say("  " + show(m))
    # Leave the build dir matching the restored sources.
    build(build_dir, needed)
    return 0


if __name__ == "__main__":
    sys.exit(main())
