#!/usr/bin/env python3
"""Names per second: KXDNameParser against python-nameparser, same names, one run.

    bench/compare_nameparser.py [BUILD_DIR] [NAMES_FILE]

BUILD_DIR holds bench/kxacore_bench_names (default: build). NAMES_FILE has one
name a line (default: bench/data/names-corpus.txt). python-nameparser is the
Debian package python3-nameparser; without it only our speed is printed.
Both sides parse every name of the file, repeatedly, on one thread; ours is
the items_per_second of BM_ParseCorpus.
"""
import json
import os
import subprocess
import sys
import time

HERE = os.path.dirname(os.path.abspath(__file__))
build = sys.argv[1] if len(sys.argv) > 1 else os.path.join(HERE, "..", "build")
names_file = sys.argv[2] if len(sys.argv) > 2 else os.path.join(HERE, "data", "names-corpus.txt")
binary = os.path.join(build, "bench", "kxacore_bench_names")

try:
    from nameparser import HumanName
except ImportError:
    # Debian's package lives in the system interpreter's dist-packages, which
    # another python3 first on PATH (pyenv, a venv) does not see.
    system = "/usr/bin/python3"
    if os.path.exists(system) and os.path.realpath(sys.executable) != os.path.realpath(system):
        os.execv(system, [system] + sys.argv)
    HumanName = None

with open(names_file, encoding="utf-8", errors="replace") as f:
    names = [line.rstrip("\r\n") for line in f if line.strip()]

env = dict(os.environ, KXA_NAMES_FILE=os.path.abspath(names_file))
result = subprocess.run(
    [binary, "--benchmark_filter=BM_ParseCorpus$", "--benchmark_min_time=0.5",
     "--benchmark_format=json"],
    env=env, check=True, capture_output=True, text=True)
ours = json.loads(result.stdout)["benchmarks"][0]["items_per_second"]
print(f"names: {len(names)} from {names_file}")
print(f"KXDNameParser:      {ours:12,.0f} names/s")

if HumanName is None:
    print("python-nameparser: not installed (apt-get install python3-nameparser)")
    sys.exit(0)
for name in names[:50]:  # warm up: the package builds its tables lazily
    HumanName(name)
rounds = 0
start = time.perf_counter()
while True:
    for name in names:
        HumanName(name)
    rounds += 1
    elapsed = time.perf_counter() - start
    if elapsed >= 2.0:
        break
theirs = rounds * len(names) / elapsed
print(f"python-nameparser:  {theirs:12,.0f} names/s")
print(f"ratio (ours / python-nameparser): {ours / theirs:.1f}x")
