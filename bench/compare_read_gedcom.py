#!/usr/bin/env python3
"""Whole-file GEDCOM check throughput: `kxacore gedcom check` against the npm
package read-gedcom (0.3.x) parsing the same files and every DATE, NAME and
PLAC value in them, in one run.

    bench/compare_read_gedcom.py [BUILD_DIR] [GEDCOM_DIR] [LARGE_MB]

BUILD_DIR holds tools/kxacore/kxacore and bench/kxacore_bench_gedcom
(default: build/release, configured with -DKXA_BUILD_BENCH=ON). GEDCOM_DIR
holds the real files (default: ../shared/data/gedcom beside the repository).
A large file of at least LARGE_MB (default 120) megabytes is built in a
temporary folder by repeating the real files' records with renamed ids (in
UTF-8, under one header), and deleted after. read-gedcom is installed with
npm into a scratch folder; without npm or the registry its column is skipped.
Two speeds for kxacore: in process (kxacore_bench_gedcom: the file in
memory, every check, like read-gedcom's timing of parse and values) and the
whole CLI run (process start, reading the file, the report: wall clock, best
of three under 10 MB). The ratio compares the in-process speeds. Peak memory
is the child's maximum resident set.
"""
import json
import os
import re
import shutil
import subprocess
import sys
import tempfile
import time

HERE = os.path.dirname(os.path.abspath(__file__))
ROOT = os.path.join(HERE, "..")
build = sys.argv[1] if len(sys.argv) > 1 else os.path.join(ROOT, "build", "release")
gedcom_dir = sys.argv[2] if len(sys.argv) > 2 else os.path.join(ROOT, "..", "shared", "data", "gedcom")
large_mb = int(sys.argv[3]) if len(sys.argv) > 3 else 120
kxacore = os.path.join(build, "tools", "kxacore", "kxacore")
bench_binary = os.path.join(build, "bench", "kxacore_bench_gedcom")

# How each real file is written (for building the large file in UTF-8).
ENCODINGS = {"norse-gods-cp1252.ged": "cp1252", "TGC55C.ged": "latin-1", "washington.ged": "cp1252"}

NODE_SCRIPT = r"""
const rg = require(process.argv[2]);
const fs = require('fs');
const path = process.argv[3];
const buffer = fs.readFileSync(path);
const arrayBuffer = buffer.buffer.slice(buffer.byteOffset, buffer.byteOffset + buffer.byteLength);
const start = process.hrtime.bigint();
const root = rg.parseGedcom(arrayBuffer);
let dates = 0, names = 0, places = 0;
const stack = [root];
while (stack.length) {
  const node = stack.pop();
  if (node.tag === 'DATE') { rg.parseDate(node.value); dates++; }
  else if (node.tag === 'NAME') { rg.parseNameParts(node.value); names++; }
  else if (node.tag === 'PLAC') { rg.parsePlaceParts(node.value); places++; }
  for (const child of node.children) stack.push(child);
}
const seconds = Number(process.hrtime.bigint() - start) / 1e9;
console.log(JSON.stringify({seconds, dates, names, places}));
"""


def run_measured(command):
    """Runs `command`; returns (wall seconds, peak RSS in MB, stdout)."""
    start = time.perf_counter()
    child = subprocess.Popen(command, stdout=subprocess.PIPE, stderr=subprocess.DEVNULL)
    out = child.stdout.read()
    _, status, usage = os.wait4(child.pid, 0)
    child.returncode = os.waitstatus_to_exitcode(status)
    return time.perf_counter() - start, usage.ru_maxrss / 1024.0, out, child.returncode


def build_large_file(files, folder, target_mb):
    bodies = []
    for path in files:
        with open(path, "rb") as f:
            raw = f.read()
        text = raw.decode(ENCODINGS.get(os.path.basename(path), "utf-8-sig"), errors="replace")
        lines = re.split(r"\r\n|\r|\n", text)
        # Records between the header and the trailer; a record whose first
        # line is malformed ("0  _PUBLISH") is left out, since read-gedcom
        # stops at it.
        body, inside = [], False
        record_start = re.compile(r"0 (@[^@ ]+@ )?[A-Za-z0-9_]+( |$)")
        for line in lines:
            if line.startswith("0"):
                inside = (record_start.match(line) is not None
                          and not (line.startswith("0 HEAD") or line.startswith("0 TRLR")))
            if inside and line:
                body.append(line)
        bodies.append("\n".join(body) + "\n")
    one_round = sum(len(b.encode("utf-8")) for b in bodies)
    rounds = max(1, -(-target_mb * 1024 * 1024 // one_round))
    pointer = re.compile(r"@([^@#\s][^@\s]*)@")
    path = os.path.join(folder, "large.ged")
    with open(path, "w", encoding="utf-8", newline="\n") as out:
        out.write("0 HEAD\n1 GEDC\n2 VERS 5.5.1\n2 FORM LINEAGE-LINKED\n1 CHAR UTF-8\n")
        for r in range(rounds):
            for i, body in enumerate(bodies):
                out.write(pointer.sub(lambda m: "@R%d_%d_%s@" % (r, i, m.group(1)), body))
        out.write("0 TRLR\n")
    return path, rounds


def in_process_speeds(folder):
    """MB/s of KXGChecker per file name, from kxacore_bench_gedcom."""
    if not os.path.exists(bench_binary):
        return {}
    result = subprocess.run([bench_binary, "--benchmark_min_time=0.5", "--benchmark_format=json"],
                            env=dict(os.environ, KXA_GEDCOM_DIR=folder), check=True,
                            capture_output=True, text=True)
    return {b["name"].split("/", 1)[1]: b["bytes_per_second"] / 1e6
            for b in json.loads(result.stdout)["benchmarks"]}


def install_read_gedcom(folder):
    npm = shutil.which("npm")
    node = shutil.which("node")
    if not npm or not node:
        return None, "npm or node is not installed"
    result = subprocess.run([npm, "install", "--silent", "--prefix", folder, "read-gedcom@0.3"],
                            capture_output=True, text=True)
    module = os.path.join(folder, "node_modules", "read-gedcom")
    if result.returncode != 0 or not os.path.isdir(module):
        return None, "npm could not install read-gedcom: " + result.stderr.strip()[:200]
    script = os.path.join(folder, "read.js")
    with open(script, "w") as f:
        f.write(NODE_SCRIPT)
    return (node, module, script), None


def main():
    if not os.path.exists(kxacore):
        sys.exit(f"build kxacore first: {kxacore} is missing")
    files = sorted(os.path.join(gedcom_dir, n) for n in os.listdir(gedcom_dir) if n.endswith(".ged"))
    if not files:
        sys.exit(f"no .ged files in {gedcom_dir}")
    scratch = tempfile.mkdtemp(prefix="kxacore-bench-gedcom-")
    try:
        peer, why = install_read_gedcom(scratch)
        large, rounds = build_large_file(files, scratch, large_mb)
        print(f"large file: {os.path.getsize(large) / 1e6:.0f} MB ({rounds} rounds of {len(files)} files)")
        if peer is None:
            print(f"read-gedcom: skipped ({why})")
        speeds = in_process_speeds(gedcom_dir)
        speeds.update(in_process_speeds(scratch))
        if not speeds:
            print(f"in-process speeds: skipped ({bench_binary} is missing: configure with -DKXA_BUILD_BENCH=ON)")
        print(f"{'file':<26}{'MB':>7}{'kxacore MB/s':>13}{'CLI MB/s':>9}{'peak MB':>8}"
              f"{'read-gedcom MB/s':>17}{'peak MB':>8}{'ratio':>7}")
        total_ours = total_theirs = total_bytes = 0.0
        for path in files + [large]:
            name = os.path.basename(path)
            size_mb = os.path.getsize(path) / 1e6
            repeats = 3 if size_mb < 10 else 1
            cli = min(run_measured([kxacore, "gedcom", "check", path])[0] for _ in range(repeats))
            _, our_peak, _, _ = run_measured([kxacore, "gedcom", "check", path])
            ours = speeds.get(name)
            line = (f"{name:<26}{size_mb:7.1f}{(f'{ours:.1f}' if ours else '-'):>13}"
                    f"{size_mb / cli:9.1f}{our_peak:8.0f}")
            if peer is not None:
                node, module, script = peer
                best, their_peak, failed = None, 0.0, None
                for _ in range(repeats):
                    _, peak, out, status = run_measured(
                        [node, "--max-old-space-size=16384", script, module, path])
                    if status != 0:
                        failed = "rejects the file"
                        break
                    seconds = json.loads(out)["seconds"]
                    best = seconds if best is None else min(best, seconds)
                    their_peak = max(their_peak, peak)
                if failed:
                    line += f"{failed:>17}"
                else:
                    theirs = size_mb / best
                    line += f"{theirs:17.1f}{their_peak:8.0f}"
                    if ours:
                        line += f"{ours / theirs:7.1f}"
                        if path != large:
                            total_ours += size_mb / ours
                            total_theirs += best
                            total_bytes += size_mb
            print(line)
        if total_ours > 0:
            print(f"real files both read, together: kxacore {total_bytes / total_ours:.1f} MB/s, "
                  f"read-gedcom {total_bytes / total_theirs:.1f} MB/s, ratio {total_theirs / total_ours:.1f}")
        print("kxacore MB/s: in process, every check; CLI MB/s: the whole program run, report included.")
        print("read-gedcom: parseGedcom and the DATE/NAME/PLAC parses, file already in memory.")
    finally:
        shutil.rmtree(scratch, ignore_errors=True)


if __name__ == "__main__":
    main()
