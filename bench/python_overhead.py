#!/usr/bin/env python3
"""What the Python module adds to a filter's Running, and how threads over separate Filter
objects scale. Everything is measured in this one run, on a 1080p frame:

  overhead   a Python call of Filter against Running alone, timed inside the module around the
             plug-in's call (and, when the benchmark binary is built, against
             bench_color_adjust's Running on the same settings)
  threads    N threads, each with a Filter of its own, against one thread doing the same frames

    PYTHONPATH=build/release/python /usr/bin/python3 bench/python_overhead.py [--build DIR]

The machine's other load shows up in every figure: run it when quiet, more than once.
"""

import argparse
import json
import os
import statistics
import subprocess
import sys
import tempfile
import threading
import time

import numpy as np

HERE = os.path.dirname(os.path.abspath(__file__))
# The benchmark binary's "all5" case.
SETTINGS = dict(u_exposure=20, u_brightness=15, u_contrast=30, u_vib=40, u_sat=25)


def frame():
    rng = np.random.default_rng(7)
    return rng.integers(0, 256, (1080, 1920, 4), dtype=np.uint8)


def overhead(tfx, img, calls):
    f = tfx.Filter("ColorAdjust", **SETTINGS)
    out = np.empty_like(img)
    for _ in range(5):
        f(img)
    rows = {}
    for label, call in (("new array", lambda: f(img)), ("out=", lambda: f(img, out=out))):
        total, running = [], []
        for _ in range(calls):
            start = time.perf_counter()
            call()
            total.append(time.perf_counter() - start)
            running.append(f._native.running_ns * 1e-9)
        rows[label] = (statistics.median(total), statistics.median(running))
    return rows


def bench_binary_ms(build):
    binary = os.path.join(build, "bin", "bench_color_adjust")
    if not os.access(binary, os.X_OK):
        return None
    with tempfile.TemporaryDirectory() as d:
        out = os.path.join(d, "out.json")
        subprocess.run([binary, "--benchmark_filter=^BM_ColorAdjust/1080p/all5/",
                        "--benchmark_repetitions=5", f"--benchmark_out={out}",
                        "--benchmark_out_format=json"],
                       stdout=subprocess.DEVNULL, stderr=subprocess.DEVNULL, check=True)
        with open(out) as f:
            results = json.load(f)["benchmarks"]
    for b in results:
        if b.get("aggregate_name") == "median":
            return b["real_time"]
    return None


def threads(tfx, img, workers, frames, rounds):
    filters = [tfx.Filter("ColorAdjust", **SETTINGS) for _ in range(workers)]
    outs = [np.empty_like(img) for _ in range(workers)]

    def work(i):
        for _ in range(frames):
            filters[i](img, out=outs[i])

    def one_thread():
        for i in range(workers):
            work(i)

    def many_threads():
        ts = [threading.Thread(target=work, args=(i,)) for i in range(workers)]
        for t in ts:
            t.start()
        for t in ts:
            t.join()

    serial, parallel = [], []
    for _ in range(rounds):
        for run, times in ((one_thread, serial), (many_threads, parallel)):
            start = time.perf_counter()
            run()
            times.append(time.perf_counter() - start)
    return min(serial), min(parallel)


def _process_work(frames):
    import tessarofx as tfx

    img = frame()
    f, out = tfx.Filter("ColorAdjust", **SETTINGS), np.empty_like(img)
    start = time.perf_counter()
    for _ in range(frames):
        f(img, out=out)
    return time.perf_counter() - start


def processes(workers, frames):
    """The same work in separate processes: what the machine gives when nothing is shared, to
    read the threads' figure against."""
    import multiprocessing

    with multiprocessing.get_context("fork").Pool(workers) as pool:
        pool.map(_process_work, [1] * workers)  # started and warm
        start = time.perf_counter()
        pool.map(_process_work, [frames] * workers)
        parallel = time.perf_counter() - start
    start = time.perf_counter()
    _process_work(frames * workers)
    return time.perf_counter() - start, parallel


def main():
    parser = argparse.ArgumentParser(description=__doc__.split("\n")[0])
    parser.add_argument("--build", default=os.path.join(HERE, "..", "build", "release"))
    parser.add_argument("--calls", type=int, default=200)
    parser.add_argument("--threads", type=int, default=2)
    parser.add_argument("--frames", type=int, default=40, help="frames per thread")
    parser.add_argument("--rounds", type=int, default=5)
    args = parser.parse_args()
    sys.path.insert(0, os.path.join(args.build, "python"))
    import tessarofx as tfx

    img = frame()
    print(f"ColorAdjust, 1080p, {os.cpu_count()} CPUs; medians of {args.calls} calls")
    for label, (total, running) in overhead(tfx, img, args.calls).items():
        print(f"  Python call ({label:9}) {total * 1e3:7.3f} ms   Running {running * 1e3:7.3f} ms"
              f"   overhead {100 * (total - running) / running:5.2f}%")
    ms = bench_binary_ms(args.build)
    if ms is not None:
        total, _ = overhead(tfx, img, args.calls)["new array"]
        print(f"  bench_color_adjust Running (median of 5) {ms:7.3f} ms; the Python call is "
              f"{total * 1e3 / ms:5.3f}x that")

    serial, parallel = threads(tfx, img, args.threads, args.frames, args.rounds)
    print(f"{args.threads} threads x {args.frames} frames, each thread with its own Filter "
          f"(best of {args.rounds})")
    print(f"  one thread {serial:6.3f} s   {args.threads} threads {parallel:6.3f} s   "
          f"speed-up {serial / parallel:4.2f}x")
    serial, parallel = processes(args.threads, args.frames)
    print(f"  control: {args.threads} processes instead of threads: speed-up "
          f"{serial / parallel:4.2f}x")


if __name__ == "__main__":
    main()
