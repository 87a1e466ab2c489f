#!/usr/bin/env python3
"""Dates parsed per second: kxacore's parser against Gramps' English date
parser, over the same texts in the same run (bench/data/dates-corpus.txt plus
the DATE values of ../shared/data/gedcom/*.ged when present).

    bench/compare_gramps.py BUILD_DIR      (BUILD_DIR holds bench/kxacore_bench_date_parser)

Gramps comes from Debian's gramps package; without it only our speed is shown.
"""
import json
import os
import subprocess
import sys
import time

ROOT = os.path.dirname(os.path.dirname(os.path.abspath(__file__)))


def texts():
    with open(os.path.join(ROOT, "bench/data/dates-corpus.txt"), encoding="utf-8") as f:
        lines = f.read().splitlines()
    gedcom = os.path.join(ROOT, "../shared/data/gedcom")
    if os.path.isdir(gedcom):
        for name in sorted(os.listdir(gedcom)):
            if not name.endswith(".ged"):
                continue
            with open(os.path.join(gedcom, name), "rb") as f:
                for raw in f.read().splitlines():
                    line = raw.decode("utf-8", "replace")
                    at = line.find(" DATE ")
                    if 0 <= at <= 3:
                        lines.append(line[at + 6:].strip())
    return lines


def ours(build_dir):
    binary = os.path.join(build_dir, "bench/kxacore_bench_date_parser")
    out = subprocess.run([binary, "--benchmark_filter=BM_ParseCacheOff|BM_ParseCacheOn",
                          "--benchmark_min_time=0.5", "--benchmark_format=json"],
                         cwd=ROOT, check=True, capture_output=True, text=True).stdout
    result = {}
    for bench in json.loads(out)["benchmarks"]:
        result[bench["name"]] = bench["items_per_second"]
    return result


def gramps_speed(lines):
    try:
        from gramps.gen.datehandler._dateparser import DateParser
    except Exception as error:  # not installed, or it cannot start here
        print(f"gramps: not available ({error})")
        return None
    parser = DateParser()
    for line in lines:  # warm up its caches of compiled expressions
        parser.parse(line)
    rounds = 0
    start = time.perf_counter()
    while True:
        for line in lines:
            parser.parse(line)
        rounds += 1
        elapsed = time.perf_counter() - start
        if elapsed > 2.0:
            return rounds * len(lines) / elapsed


def main():
    # Debian's gramps lives in the system Python; re-run there when another
    # interpreter (a pyenv shim) came first on PATH.
    try:
        import gramps  # noqa: F401
    except ImportError:
        system = "/usr/bin/python3"
        if os.path.exists(system) and os.path.realpath(sys.executable) != os.path.realpath(system) \
                and not os.environ.get("KXA_COMPARE_REEXEC"):
            os.environ["KXA_COMPARE_REEXEC"] = "1"
            os.execv(system, [system] + sys.argv)
    build_dir = sys.argv[1] if len(sys.argv) > 1 else os.path.join(ROOT, "build")
    lines = texts()
    print(f"texts: {len(lines)}")
    speeds = ours(build_dir)
    off = speeds.get("BM_ParseCacheOff", 0.0)
    print(f"kxacore, cache off: {off:,.0f} dates/s")
    print(f"kxacore, cache on:  {speeds.get('BM_ParseCacheOn', 0.0):,.0f} dates/s")
    theirs = gramps_speed(lines)
    if theirs:
        print(f"gramps DateParser:  {theirs:,.0f} dates/s")
        print(f"ratio (kxacore cache off / gramps): {off / theirs:.1f}x")


if __name__ == "__main__":
    main()
