#!/usr/bin/env python3
"""Makes one-token mutants of the sources, builds and tests each, and lists those that survive.

    scripts/mutate.py --seed N [--count N] [--first N] [--minutes N] FOLDER...

Works in a copy of the repository in build/mutants, so sources stay as they are. Each source is compiled alone
and each test program linked only when its turn comes: those of the mutant's own room first, then the cheapest
first, until one fails, crashes or hangs. A mutant that does not compile counts as none. Each line of the output
is one mutant: caught or SURVIVED, where, what was changed, and the program that saw it; the last lines are the
counts. The same seed makes the same mutants of the same sources.
"""
import argparse
import fcntl
import json
import os
import pathlib
import random
import re
import resource
import shutil
import signal
import subprocess
import sys
import time

SWAPS = [("==", "!="), ("!=", "=="), ("<=", "<"), (">=", ">"), (" < ", " <= "), (" > ", " >= "), ("&&", "||"),
         ("||", "&&"), (" + ", " - "), (" - ", " + "), ("true", "false"), ("false", "true"), ("++", "--"),
         ("+= ", "-= "), ("nullptr ? ", "nullptr ? !"), ("S_OK", "S_FALSE"), ("E_POINTER", "E_FAIL"),
         ("if (!", "if ("), (" 0", " 1"), (" 1", " 2"), (".front()", ".back()"), ("break;", ";"), ("continue;", ";"),
         ("begin()", "rbegin()"), ("first", "second"), (".push_back(", ".emplace_back(), static_cast<void>("),
         ("const std::lock_guard lock", "// const std::lock_guard lock")]


def code_spans(text):
    """The parts of a source that are neither comment nor preprocessor line nor text."""
    skip = re.compile(r'//[^\n]*|/\*.*?\*/|R"\(.*?\)"|"(?:\\.|[^"\\\n])*"|^[ \t]*#[^\n]*|static_assert\([^;]*;', re.S | re.M)
    at = 0
    for found in skip.finditer(text):
        yield at, found.start()
        at = found.end()
    yield at, len(text)


def places(text):
    for begin, end in code_spans(text):
        for old, new in SWAPS:
            at = text.find(old, begin, end)
            while at >= 0:
                yield at, old, new
                at = text.find(old, at + 1, end)


PROGRAM_LIMIT = 4 << 30  # bytes of address space: a mutant may ask for memory without end


class Tests:
    """The test programs of a build and the exact counts, cheapest first; those of the mutant's own room before all others."""

    def __init__(self, build, seconds):
        self.build, self.seconds = build, seconds
        listed = subprocess.run(["ninja", "-C", str(build), "-t", "targets", "all"], check=True, capture_output=True, text=True)
        self.names = sorted(set(re.findall(r"^(zkusb_\w+_tests|zkusb_growth): phony", listed.stdout, re.M)))
        self.cost = {}

    def make(self, targets):
        return run(["ninja", "-C", str(self.build), "-j2", *targets], self.build, self.seconds)

    def passes(self, name):
        begun = time.monotonic()
        limit = max(self.seconds, 10 * self.cost.get(name, 0))
        code = run([str(self.build / "bin" / name), "--gtest_fail_fast", "--gtest_brief=1"], self.build, limit)
        self.cost.setdefault(name, time.monotonic() - begun)
        return code == 0

    def in_order_for(self, room):
        def rank(name):
            near = name.startswith(f"zkusb_{room}_") or (room, name) == ("monitor", "zkusb_notifier_tests")
            return (not near, self.cost[name])
        return sorted(self.names, key=rank)

    def verdict(self, room):
        """caught or SURVIVED with the program that says so; "not built" where the compiler refuses the mutant."""
        for number, name in enumerate(self.in_order_for(room)):
            if self.make([name]) != 0:
                return "not built", name if number else ""
            if not self.passes(name):
                return "caught", name
        return "SURVIVED", ""


def run(command, folder, seconds):
    def bound():
        resource.setrlimit(resource.RLIMIT_AS, (PROGRAM_LIMIT, PROGRAM_LIMIT))
        for ignored in (signal.SIGHUP, signal.SIGINT, signal.SIGQUIT):  # in what runs in the background
            signal.signal(ignored, signal.SIG_DFL)
    with subprocess.Popen(command, cwd=folder, stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL, preexec_fn=bound,
                          start_new_session=True) as process:
        try:
            return process.wait(seconds)
        except subprocess.TimeoutExpired:
            os.killpg(process.pid, signal.SIGKILL)  # and what it has started
            return -1


def copied_tree(root):
    copy = root / "build" / "mutants"
    listed = subprocess.run(["git", "ls-files", "-co", "--exclude-standard"], cwd=root, check=True, capture_output=True, text=True)
    for name in listed.stdout.splitlines():
        source, target = root / name, copy / name
        if not source.is_file() or (target.is_file() and target.read_bytes() == source.read_bytes()):
            continue
        target.parent.mkdir(parents=True, exist_ok=True)
        shutil.copy(source, target)
    return copy


def configured(copy):
    build = copy / "build" / "mutants"
    linker = ["-DCMAKE_EXE_LINKER_FLAGS=-fuse-ld=mold", "-DCMAKE_SHARED_LINKER_FLAGS=-fuse-ld=mold"]
    subprocess.run(["cmake", "-S", str(copy), "-B", str(build), "-G", "Ninja", "-DCMAKE_BUILD_TYPE=Debug",
                    # A mutant is often one that the compiler warns of, which is no reason not to build it.
                    "-DCMAKE_CXX_FLAGS_DEBUG=-O0 -g0 -w", f"-DCMAKE_PROJECT_INCLUDE={copy}/scripts/mutants.cmake",
                    *(linker if shutil.which("ld.mold") else [])], check=True, stdout=subprocess.DEVNULL)
    return build


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--seed", type=int, required=True)
    parser.add_argument("--count", type=int, default=20)
    parser.add_argument("--first", type=int, default=1, help="go on with that mutant of the same seed and count")
    parser.add_argument("--minutes", type=float, default=0, help="begin no mutant after so long")
    parser.add_argument("--seconds", type=int, default=300, help="for one build, or one test program that hangs")
    parser.add_argument("--again", action="store_true", help="the sources have not changed since the last run: believe its times")
    parser.add_argument("folders", nargs="+")
    args = parser.parse_args()
    begun = time.monotonic()

    os.environ["ZKUSB_TESTS"] = "all"
    root = pathlib.Path(__file__).resolve().parent.parent
    # Two runs in one copy would test each other's mutants.
    (root / "build").mkdir(exist_ok=True)
    only = (root / "build" / "mutants.lock").open("w")
    fcntl.flock(only, fcntl.LOCK_EX | fcntl.LOCK_NB)
    copy = copied_tree(root)
    build = configured(copy)
    tests = Tests(build, args.seconds)
    if run(["ninja", "-C", str(build), "-j2", *tests.names], build, 7200) != 0:
        sys.exit("the sources as they are do not build")
    times = build / "times.json"
    if args.again and times.is_file():
        tests.cost = json.loads(times.read_text())
    for name in tests.names:
        if name not in tests.cost and not tests.passes(name):
            sys.exit(f"the sources as they are fail {name}")
    times.write_text(json.dumps(tests.cost))
    print(", ".join(f"{name} {tests.cost[name]:.0f} s" for name in sorted(tests.names, key=tests.cost.get)), flush=True)

    compiled = {pathlib.Path(entry["file"]) for entry in json.loads((build / "compile_commands.json").read_text())}
    files = sorted(path for folder in args.folders for path in (copy / folder).rglob("*.cpp") if path in compiled)
    every = [(path, *place) for path in files for place in places(path.read_text())]
    chosen = random.Random(args.seed).sample(every, min(args.count, len(every)))
    print(f"seed {args.seed}: {len(chosen)} of {len(every)} mutants", flush=True)
    counts = {"caught": 0, "SURVIVED": 0, "not built": 0}
    for number, (path, at, old, new) in enumerate(chosen, 1):
        if number < args.first:
            continue
        if args.minutes and time.monotonic() - begun > 60 * args.minutes:
            print(f"out of time before mutant {number}")
            break
        text = path.read_text()
        try:
            path.write_text(text[:at] + new + text[at + len(old):])
            outcome, program = tests.verdict(path.relative_to(copy).parts[0])
        finally:
            path.write_text(text)
        counts[outcome] += 1
        line = text.count("\n", 0, at) + 1
        print(f"{number:4} {outcome:9} {path.relative_to(copy)}:{line}  {old.strip()} -> {new.strip()}  |  "
              f"{text.splitlines()[line - 1].strip()}  |  {program}", flush=True)
    built = counts["caught"] + counts["SURVIVED"]
    print(f"{built} built, {counts['caught']} caught, {counts['SURVIVED']} survived, {counts['not built']} not built")


if __name__ == "__main__":
    main()
