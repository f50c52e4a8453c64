#!/usr/bin/env python3
"""Scale run: camsim and `evwatch run` with many polled (Canon) detectors.

For each size, camsim serves size/2 Canon cameras and evwatch watches each with CanonMD and
CanonEID, each asking its camera once a second. After a warm-up, the evwatch process's CPU
time and resident memory are sampled from /proc over the measured window; then evwatch is
stopped with SIGTERM and its peak resident memory is taken from wait4().

Usage: bench/scale.py BUILD_DIR [--sizes 100,500,1000] [--seconds 30]
"""

import argparse
import json
import os
import resource
import signal
import subprocess
import sys
import tempfile
import time
import urllib.request

CLK_TCK = os.sysconf("SC_CLK_TCK")


def cpu_seconds(pid):
    with open(f"/proc/{pid}/stat") as f:
        fields = f.read().rsplit(")", 1)[1].split()
    return (int(fields[11]) + int(fields[12])) / CLK_TCK  # utime + stime


def status_kib(pid, key):
    with open(f"/proc/{pid}/status") as f:
        for line in f:
            if line.startswith(key + ":"):
                return int(line.split()[1])
    return 0


def total_requests(control_port):
    with urllib.request.urlopen(f"http://127.0.0.1:{control_port}/cameras", timeout=30) as r:
        cameras = json.load(r)["cameras"]
    return sum(c["state"]["requests"] for c in cameras)


def run_size(bin_dir, detectors, seconds, workdir):
    cameras = max(1, detectors // 2)
    config = os.path.join(workdir, f"scale-{detectors}.json")
    camsim = subprocess.Popen(
        [os.path.join(bin_dir, "camsim"), "-e", "canon", "-n", str(cameras), "--evwatch-config", config],
        stdout=subprocess.PIPE, text=True)
    try:
        ports = json.loads(camsim.stdout.readline())
        control = ports["control_port"]
        evwatch = subprocess.Popen([os.path.join(bin_dir, "evwatch"), "run", "-c", config],
                                   stdout=subprocess.DEVNULL, stderr=subprocess.PIPE, text=True)
        warmup = 3.0
        time.sleep(warmup)
        cpu0, req0, t0 = cpu_seconds(evwatch.pid), total_requests(control), time.monotonic()
        time.sleep(seconds)
        cpu1, req1, t1 = cpu_seconds(evwatch.pid), total_requests(control), time.monotonic()
        threads = status_kib(evwatch.pid, "Threads")
        stop0 = time.monotonic()
        evwatch.send_signal(signal.SIGTERM)
        _, status, usage = os.wait4(evwatch.pid, 0)
        evwatch.returncode = os.waitstatus_to_exitcode(status)
        stop_s = time.monotonic() - stop0
        errors = evwatch.stderr.read().strip()
    finally:
        camsim.send_signal(signal.SIGTERM)
        camsim.wait()
    window = t1 - t0
    cpu_per_det_s = (cpu1 - cpu0) / window / detectors
    peak_kib = usage.ru_maxrss
    return {
        "detectors": detectors,
        "requests_per_s": (req1 - req0) / window,
        "cpu_s_per_det_s": cpu_per_det_s,
        "core_percent": 100.0 * (cpu1 - cpu0) / window,
        "peak_rss_mib": peak_kib / 1024.0,
        "rss_kib_per_det": peak_kib / detectors,
        "threads": threads,
        "stop_s": stop_s,
        "exit": evwatch.returncode,
        "stderr": errors,
    }


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("build_dir")
    parser.add_argument("--sizes", default="100,500,1000")
    parser.add_argument("--seconds", type=float, default=30.0)
    args = parser.parse_args()
    bin_dir = os.path.join(args.build_dir, "bin")
    for program in ("evwatch", "camsim"):
        if not os.access(os.path.join(bin_dir, program), os.X_OK):
            sys.exit(f"scale: {bin_dir}/{program} is missing; build first")
    # A thousand detectors hold a thousand connections, and camsim as many again.
    soft, hard = resource.getrlimit(resource.RLIMIT_NOFILE)
    resource.setrlimit(resource.RLIMIT_NOFILE, (hard, hard))

    print(f"scale: polled Canon detectors, one request a second each, {args.seconds:g} s measured per size")
    header = f"{'detectors':>9} {'req/s':>8} {'CPU s/det/s':>12} {'% core':>7} {'peak RSS':>10} {'RSS/det':>9} {'threads':>7} {'stop':>6}"
    print(header)
    failed = False
    with tempfile.TemporaryDirectory(prefix="evwatch-scale-") as workdir:
        for size in (int(s) for s in args.sizes.split(",")):
            r = run_size(bin_dir, size, args.seconds, workdir)
            print(f"{r['detectors']:>9} {r['requests_per_s']:>8.1f} {r['cpu_s_per_det_s']:>12.2e} "
                  f"{r['core_percent']:>6.1f}% {r['peak_rss_mib']:>7.1f} MiB {r['rss_kib_per_det']:>5.0f} KiB "
                  f"{r['threads']:>7} {r['stop_s']:>5.1f}s", flush=True)
            if r["exit"] != 0 or r["stderr"]:
                failed = True
                print(f"  evwatch exited {r['exit']}: {r['stderr']}", flush=True)
    sys.exit(1 if failed else 0)


if __name__ == "__main__":
    main()
