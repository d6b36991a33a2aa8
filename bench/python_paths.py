#!/usr/bin/env python3
"""OCR of one batch of real pages three ways, in one run: `corvel ocr`, the Python module
with a thread pool, and corvelbase.distributed.ocr_many on a LocalCluster of two worker
processes. Prints pages per minute, each path's time against `corvel ocr` (its
overhead), the same for CPU time (which other work on the machine hardly changes), peak
memory (per worker for Dask), and whether every path read the same text.

Each path runs in a process of its own, started and timed the same way, so its time
takes in the interpreter, the imports and the engines' start-up as `corvel ocr` takes in
its own; Dask's line also gives the time of ocr_many alone, without the cluster's
start-up, which a long collection pays once. Rounds take the paths in turn (rotated each
round) and the median of each path is reported.

Every path gets the same per-page --timeout (600 s by default): the engine's own deadline
is wall time, which a machine busy with other work can exhaust, and a page failed that
way would measure the machine, not the path.

Usage: bench/python_paths.py [--corpus DIR] [--corvel PATH] [--threads N] [--rounds N]
                             [--level accurate|fast] [--timeout SECONDS]
(PYTHONPATH must reach the built package: `make bench` sets it.)
"""
import argparse
import json
import os
import statistics
import subprocess
import sys
import time
from pathlib import Path

ROOT = Path(__file__).resolve().parents[1]

MODULE = r"""
import concurrent.futures, json, sys
import corvelbase
paths, threads, level = json.loads(sys.argv[1]), int(sys.argv[2]), sys.argv[3]
timeout = float(sys.argv[4])
read = lambda p: corvelbase.ocr(p, level=level, timeout=timeout).text
with concurrent.futures.ThreadPoolExecutor(threads) as pool:
    texts = list(pool.map(read, paths))
json.dump({"texts": texts}, sys.stdout)
"""

DASK = r"""
import json, resource, sys, tempfile, time
from pathlib import Path
from dask.distributed import Client, LocalCluster
from corvelbase.distributed import ocr_many
paths, level, timeout = json.loads(sys.argv[1]), sys.argv[3], float(sys.argv[4])
started = time.monotonic()
with LocalCluster(n_workers=2, threads_per_worker=1, processes=True,
                  dashboard_address=None) as cluster, Client(cluster) as client:
    up = time.monotonic()
    with tempfile.TemporaryDirectory() as out:
        # JSON, as `corvel ocr --json` writes it, so that the texts compare page by page.
        report = ocr_many(paths, out, client, level=level, timeout=timeout, formats=["json"])
        done = time.monotonic()
        texts = ["\f".join(page["text"] for page in json.loads(
                     (Path(out) / (Path(p).stem + ".json")).read_text())["files"][0]["pages"])
                 for p in paths]
    peak = client.run(lambda: resource.getrusage(resource.RUSAGE_SELF).ru_maxrss)
# The driver's own peak: the one the parent sees also counts the workers, its children.
json.dump({"texts": texts, "startup": up - started, "ocr_many": done - up,
           "failed": len(report.failed), "worker_peak_kib": sorted(peak.values()),
           "driver_peak_kib": resource.getrusage(resource.RUSAGE_SELF).ru_maxrss}, sys.stdout)
"""


def run(command, allowed=(0,)):
    """(wall seconds, CPU seconds, peak resident KiB, stdout) of a child process that
    exits with one of the `allowed` statuses. The CPU time takes in the processes the
    child started and waited for (Dask's workers)."""
    started = time.monotonic()
    child = subprocess.Popen(command, stdout=subprocess.PIPE)
    out = child.stdout.read()
    _, status, usage = os.wait4(child.pid, 0)
    wall = time.monotonic() - started
    if os.waitstatus_to_exitcode(status) not in allowed:
        sys.exit(f"{command[0]} failed with status {status}")
    return wall, usage.ru_utime + usage.ru_stime, usage.ru_maxrss, out


def corvel_path(args, pages):
    command = [args.corvel, "ocr", "--json", "--timeout", str(args.timeout)]
    command += ["--fast"] if args.level == "fast" else []
    # 1: some page failed; its text is then missing from the comparison below.
    wall, cpu, peak, out = run(command + [str(p) for p in pages], allowed=(0, 1))
    texts = ["\f".join(page["text"] for page in file["pages"])
             for file in json.loads(out)["files"]]
    return {"wall": wall, "cpu": cpu, "peak_kib": peak, "texts": texts}


def python_path(script, args, pages):
    wall, cpu, peak, out = run([sys.executable, "-c", script, json.dumps([str(p) for p in pages]),
                           str(args.threads), args.level, str(args.timeout)])
    return {"wall": wall, "cpu": cpu, "peak_kib": peak, **json.loads(out)}


def main():
    parser = argparse.ArgumentParser(description=__doc__.splitlines()[0])
    parser.add_argument("--corpus", default="/work/shared/ocr-corpus/images",
                        help="a folder of real page images (outside the repository)")
    parser.add_argument("--corvel", default=str(ROOT / "build/release/tools/corvel/corvel"))
    parser.add_argument("--threads", type=int, default=6,
                        help="the module's thread pool (default: the jobs the shared queue "
                             "runs at once, as `corvel ocr` queues every page)")
    parser.add_argument("--rounds", type=int, default=1)
    parser.add_argument("--level", choices=["accurate", "fast"], default="accurate")
    parser.add_argument("--timeout", type=float, default=600,
                        help="seconds each page may take, on every path")
    args = parser.parse_args()
    load = os.getloadavg()[0]  # other work on the machine skews every path alike only so far

    pages = sorted(Path(args.corpus).glob("*.png")) if Path(args.corpus).is_dir() else []
    if not pages:
        print(f"(no pages in {args.corpus}; the repository's pages only)")
    pages += sorted((ROOT / "tests/fixtures/ocr/pages").glob("*.png"))

    paths = {
        "corvel ocr": lambda: corvel_path(args, pages),
        f"module, {args.threads} threads": lambda: python_path(MODULE, args, pages),
        "ocr_many, LocalCluster 2x1": lambda: python_path(DASK, args, pages),
    }
    names = list(paths)
    runs = {name: [] for name in names}
    for round_ in range(args.rounds):
        for name in names[round_ % 3:] + names[:round_ % 3]:
            runs[name].append(paths[name]())

    print(f"{len(pages)} pages ({args.level}), {args.rounds} round(s), {os.cpu_count()} cores, "
          f"load average at the start {load:.1f}")
    reference = statistics.median(r["wall"] for r in runs["corvel ocr"])
    reference_cpu = statistics.median(r["cpu"] for r in runs["corvel ocr"])
    texts = runs["corvel ocr"][0]["texts"]
    for name in names:
        wall = statistics.median(r["wall"] for r in runs[name])
        last = runs[name][-1]
        same = sum(a == b for a, b in zip(last["texts"], texts))
        rounds = "/".join(f"{r['wall']:.1f}" for r in runs[name])
        line = (f"{name:28} {len(pages) / wall * 60:6.1f} pages/min  {wall:7.1f} s "
                f"(rounds {rounds})  {(wall / reference - 1) * 100:+6.1f}% vs corvel  "
                f"peak {last['peak_kib'] / 1024:6.0f} MiB  same text {same}/{len(pages)}")
        # The machine's other work lengthens every path's wall time, but hardly its CPU time.
        cpu = statistics.median(r["cpu"] for r in runs[name])
        line += f"\n{'':28} CPU {cpu:.1f} s ({(cpu / reference_cpu - 1) * 100:+.1f}% vs corvel)"
        if "ocr_many" in last:
            alone = statistics.median(r["ocr_many"] for r in runs[name])
            workers = ", ".join(f"{kib / 1024:.0f}" for kib in last["worker_peak_kib"])
            line += (f"\n{'':28} ocr_many alone {alone:.1f} s "
                     f"({(alone / reference - 1) * 100:+.1f}% vs corvel), cluster start-up "
                     f"{statistics.median(r['startup'] for r in runs[name]):.1f} s, "
                     f"peak per worker {workers} MiB (driver {last['driver_peak_kib'] / 1024:.0f} MiB), "
                     f"failed pages {last['failed']}")
        print(line)


if __name__ == "__main__":
    main()
