#!/usr/bin/env python3
"""Measures what docs/performance.md tells, writes its tables and draws its plots.

    scripts/performance.py build/release/bin/zkusb_bench    measures (some minutes)
    scripts/performance.py measured.json                    takes what a benchmark has written

Each table stands between the two comments that name it.
"""
import json
import math
import pathlib
import re
import subprocess
import sys
import tempfile

ROOT = pathlib.Path(__file__).resolve().parent.parent
MEASURED = "^(calls|alternatives|counts|first|unchanged|one_more|objects/dump|RealTime)/"
PCS = ["dell-precision", "asus-b560", "hp-cardreader", "vmware-win7"]
SHAPES = ["wide", "deep"]
SIZES = [10, 100, 1000, 10000]


def measure(program):
    if program.endswith(".json"):
        text = pathlib.Path(program).read_text()
    else:
        with tempfile.TemporaryDirectory() as folder:
            file = pathlib.Path(folder) / "measured.json"
            subprocess.run([program, f"--benchmark_filter={MEASURED}", f"--benchmark_out={file}",
                            "--benchmark_out_format=json"], check=True)
            text = file.read_text()
    rows = {}
    for row in json.loads(text)["benchmarks"]:
        rows[re.sub(r"/(iterations:\d+|manual_time)", "", row["name"])] = row
    return rows


def table(head, rows):
    lines = [head, ["---"] * len(head), *rows]
    return "\n".join("| " + " | ".join(str(cell) for cell in line) + " |" for line in lines)


def whole(number):
    return f"{number:.0f}"


def one(number):
    return f"{number:.1f}"


def share(number):
    return f"{100 * number:.0f} %"


def calls(measured):
    kinds = ["calls", "opens", "requests", "sets", "manager", "volumes", "closes"]
    rows = []
    for pc in PCS:
        for build in ["first", "unchanged"]:
            row = measured[f"calls/{pc}/{build}"]
            rows.append([pc, build, *(whole(row[kind]) for kind in kinds),
                         one(row["for_each_node"]),
                         f"{one(row['quick_ms'])} to {one(row['slow_ms'])}"])
    return table(["PC", "build", *kinds, "sets and manager for each node", "ms at the prices"],
                 rows)


def saved(measured):
    rows = []
    for pc in PCS:
        row = measured[f"calls/{pc}/first"]
        rows.append([pc, *(share(row[f"share_of_{what}"]) for what in ["calls", "quick", "slow"])])
    return table(["PC", "calls", "time, hubs at 44 us", "time, hubs at 260 us"], rows)


def alternatives(measured):
    rows = []
    for pc in PCS:
        row = measured[f"alternatives/{pc}"]
        first, unchanged = (measured[f"calls/{pc}/{build}"] for build in ["first", "unchanged"])
        rows.append([pc, *(f"{whole(count)}, {one(time)} ms" for count, time in [
            (row["full_query"], row["full_query_ms"]),
            (row["devnode_walk"], row["devnode_walk_ms"]),
            (first["calls"], first["quick_ms"]), (unchanged["calls"], unchanged["quick_ms"])]),
            whole(row["requests"])])
    return table(["PC", "one full query", "devnode walk", "first build", "unchanged build",
                  "of these requests to hubs"], rows)


def growth(measured):
    rows = []
    for shape in SHAPES:
        for size in SIZES:
            row = measured[f"counts/{shape}/{size}"]
            rows.append([shape, size, *(whole(row[what]) for what in [
                "nodes", "first", "unchanged", "full_query"]), one(row["for_each_node"]),
                one(row["allocations_per_device"]), whole(row["retained_bytes_per_node"])])
    return table(["shape", "devices", "nodes", "first", "unchanged", "full query",
                  "sets and manager for each node", "allocations for each device, first",
                  "retained bytes for each node"], rows)


def own_time(measured):
    rows = []
    for shape in SHAPES:
        for size in SIZES[1:]:
            works = [measured[f"{work}/{shape}/{size}"]
                     for work in ["first", "unchanged", "one_more"]]
            rows.append([shape, size, *(one(row["own_us"]) for row in works),
                         *(one(row["x_floor"]) for row in works)])
    return table(["shape", "devices", "us for each device, first", "unchanged", "one more",
                  "build over floor, first", "unchanged", "one more"], rows)


def dump(measured):
    rows = []
    for shape in SHAPES:
        for size in [25, 250, 2500, 10000]:
            row = measured[f"objects/dump/{shape}/{size}"]
            rows.append([shape, size, whole(row["nodes"]), f"{1e6 * row['per_node']:.2f}",
                         f"{row['allocations_per_node']:.2f}"])
    return table(["shape", "devices", "nodes", "us for each node", "allocations for each node"],
                 rows)


def road(measured):
    parts = ["to_build_us", "to_sink_us", "sinks_us", "best_us"]
    rows = [[sinks, *(one(measured[f"RealTime/{sinks}"][part]) for part in parts)]
            for sinks in [1, 10, 100]]
    return table(["sinks", "broadcast to build", "build to first sink", "first to last sink",
                  "whole path"], rows)


def plot(path, title, least, most, lines):
    """Lines over the sizes, both axes logarithmic."""
    def place(value, low, high, begin, end):
        return begin + (end - begin) * math.log10(value / low) / math.log10(high / low)

    def x(value):
        return place(value, SIZES[0], SIZES[-1], 80, 490)

    def y(value):
        return place(value, least, most, 350, 40)

    svg = ['<svg xmlns="http://www.w3.org/2000/svg" width="640" height="400" '
           'font-family="sans-serif" font-size="12">',
           '<rect width="640" height="400" fill="white"/>',
           f'<text x="80" y="22" font-size="14">{title}</text>']
    for size in SIZES:
        svg += [f'<line x1="{x(size):.1f}" x2="{x(size):.1f}" y1="40" y2="350" stroke="#ddd"/>',
                f'<text x="{x(size):.1f}" y="368" text-anchor="middle">{size}</text>']
    value = least
    while value <= most:
        svg += [f'<line y1="{y(value):.1f}" y2="{y(value):.1f}" x1="80" x2="490" stroke="#ddd"/>',
                f'<text x="74" y="{y(value) + 4:.1f}" text-anchor="end">{value}</text>']
        value *= 10
    svg.append('<text x="285" y="390" text-anchor="middle">devices plugged in</text>')
    for name, colour, values in lines:
        points = " ".join(f"{x(size):.1f},{y(value):.1f}" for size, value in zip(SIZES, values))
        svg += [f'<polyline fill="none" stroke-width="2" stroke="{colour}" points="{points}"/>',
                f'<text x="{x(SIZES[-1]) + 6:.1f}" y="{y(values[-1]) + 4:.1f}" '
                f'fill="{colour}">{name}</text>']
    path.write_text("\n".join([*svg, "</svg>"]) + "\n")


def plots(measured, folder):
    lines = [("wide, first", "#1f77b4", "wide", "first"),
             ("wide, unchanged", "#6baed6", "wide", "unchanged"),
             ("deep, first", "#d62728", "deep", "first"),
             ("deep, unchanged", "#ff9896", "deep", "unchanged"),
             ("wide, full query", "#7f7f7f", "wide", "full_query")]
    for file, title, least, most, suffix in [
            ("calls", "Platform calls of a build", 100, 10_000_000, ""),
            ("prices", "Milliseconds of a build, hub requests at 44 us", 1, 100_000, "_ms")]:
        plot(folder / f"{file}.svg", title, least, most,
             [(name, colour, [measured[f"counts/{shape}/{size}"][what + suffix] for size in SIZES])
              for name, colour, shape, what in lines])


def main():
    if len(sys.argv) != 2:
        sys.exit(__doc__)
    measured = measure(sys.argv[1])
    page = ROOT / "docs" / "performance.md"
    text = page.read_text()
    for make in [calls, saved, alternatives, growth, own_time, dump, road]:
        begin, end = f"<!-- {make.__name__} -->\n", "\n<!-- end -->"
        before, rest = text.split(begin)
        text = before + begin + make(measured) + end + rest.split(end, 1)[1]
    page.write_text(text)
    plots(measured, ROOT / "docs" / "plots")


main()
