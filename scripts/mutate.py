#!/usr/bin/env python3
"""Makes one-token mutants of the sources, builds and tests each, and lists those that survive.

    scripts/mutate.py --seed N --count N --build DIR --targets "T..." --tests "COMMAND" FOLDER...

Works in a copy of the repository beside the build (DIR/mutants), so sources stay as they are. A mutant that
does not compile counts as none. Each line of the output is one mutant: caught or SURVIVED, where, and what was
changed; the last lines are the counts. The same seed makes the same mutants of the same sources.
"""
import argparse
import pathlib
import random
import re
import shlex
import shutil
import subprocess
import sys

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


def run(command, folder, seconds):
    try:
        return subprocess.run(command, cwd=folder, shell=isinstance(command, str), timeout=seconds,
                              stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL).returncode
    except subprocess.TimeoutExpired:
        return -1


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--seed", type=int, default=1)
    parser.add_argument("--count", type=int, default=20)
    parser.add_argument("--build", default="build/debug")
    parser.add_argument("--targets", default="all")
    parser.add_argument("--tests", required=True, help="run in the build folder of the copy; {bin} is its programs")
    parser.add_argument("--seconds", type=int, default=600, help="for one build or one run of the tests")
    parser.add_argument("folders", nargs="+")
    args = parser.parse_args()

    root = pathlib.Path(__file__).resolve().parent.parent
    copy = root / "build" / "mutants"
    listed = subprocess.run(["git", "ls-files", "-co", "--exclude-standard"], cwd=root, check=True, capture_output=True, text=True)
    for name in listed.stdout.splitlines():
        source, target = root / name, copy / name
        if not source.is_file() or (target.is_file() and target.read_bytes() == source.read_bytes()):
            continue
        target.parent.mkdir(parents=True, exist_ok=True)
        shutil.copy(source, target)
    subprocess.run(["cmake", "--preset", pathlib.Path(args.build).name], cwd=copy, check=True, stdout=subprocess.DEVNULL)
    build = ["cmake", "--build", "--preset", pathlib.Path(args.build).name, "--target", *shlex.split(args.targets)]
    tests = args.tests.replace("{bin}", str(copy / args.build / "bin"))
    if run(build, copy, 7200) != 0 or run(tests, copy, args.seconds) != 0:
        sys.exit("the sources as they are do not build, or fail their tests")

    files = sorted(path for folder in args.folders for path in (copy / folder).rglob("*.cpp"))
    every = [(path, *place) for path in files for place in places(path.read_text())]
    chosen = random.Random(args.seed).sample(every, min(args.count, len(every)))
    print(f"seed {args.seed}: {len(chosen)} of {len(every)} mutants", flush=True)
    counts = {"caught": 0, "SURVIVED": 0, "not built": 0}
    for path, at, old, new in chosen:
        text = path.read_text()
        path.write_text(text[:at] + new + text[at + len(old):])
        outcome = "not built"
        if run(build, copy, args.seconds) == 0:
            outcome = "SURVIVED" if run(tests, copy, args.seconds) == 0 else "caught"
        path.write_text(text)
        counts[outcome] += 1
        line = text.count("\n", 0, at) + 1
        print(f"{outcome:9}  {path.relative_to(copy)}:{line}  {old.strip()} -> {new.strip()}  |  "
              f"{text.splitlines()[line - 1].strip()}", flush=True)
    built = counts["caught"] + counts["SURVIVED"]
    print(f"{built} built, {counts['caught']} caught, {counts['SURVIVED']} survived, {counts['not built']} not built")


if __name__ == "__main__":
    main()
