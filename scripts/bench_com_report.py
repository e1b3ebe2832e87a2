#!/usr/bin/env python3
"""Sets the host-call benchmarks side by side: native, and through COM per
architecture. Each file is Google Benchmark's JSON output of kpx-bench or
kpx-combench; the first is the native one, the others are named after their
architecture (x64.json, x86.json).

Per member: the time of a call (plain run), the host's share (host_ns of
the metered run), the add-in's own share (the one less the other) and, for
the DLL, its own share over the native add-in's own share. Of repeated runs
the shortest counts: on a busy machine the others carry waiting time."""

import json
import os
import sys

MEMBERS = [("BM_Name", "Name"),
           ("BM_EnableClassMenuOneClass", "OnEnableContextMenuItems (class)"),
           ("BM_Activate", "OnActivate")]
GOAL = 2.0


def load(path):
    with open(path) as f:
        data = json.load(f)
    # Of repeated runs, the least disturbed: the shortest time, and the
    # smallest host share, each on its own.
    runs = {}
    for b in data["benchmarks"]:
        if b.get("error_occurred") or b.get("run_type") == "aggregate":
            continue
        scale = {"ns": 1.0, "us": 1e3, "ms": 1e6, "s": 1e9}[b.get("time_unit", "ns")]
        name = b.get("run_name", b["name"])
        time, host = b["real_time"] * scale, b.get("host_ns")
        if name in runs:
            old = runs[name]
            time = min(time, old[0])
            host = min(host, old[1]) if host is not None and old[1] is not None else host
        runs[name] = (time, host, b.get("hostCalls"))
    return runs


def shares(runs, member):
    plain = runs.get(member + "/metered:0")
    metered = runs.get(member + "/metered:1")
    if not plain or not metered or metered[1] is None:
        return None
    total, host = plain[0], metered[1]
    return total, host, total - host, plain[2]


def ns(v):
    return "%10.0f" % v if v >= 100 else "%10.1f" % v


def main(paths):
    sides = [("native", load(paths[0]))]
    for p in paths[1:]:
        sides.append((os.path.splitext(os.path.basename(p))[0], load(p)))
    print()
    print("Time per call in ns: total / the host's share / the add-in's own share "
          "(host calls per call); for the DLL, its own share over the native add-in's.")
    missed = []
    for member, title in MEMBERS:
        print()
        print(title)
        native = shares(sides[0][1], member)
        for name, runs in sides:
            s = shares(runs, member)
            if not s:
                print("  %-7s not measured" % name)
                continue
            line = "  %-7s %s total %s host %s own   (%s host calls)" % (
                name, ns(s[0]), ns(s[1]), ns(s[2]), "%.0f" % s[3] if s[3] is not None else "?")
            if name != "native" and native and native[2] > 0:
                ratio = s[2] / native[2]
                line += "   own %.1fx native" % ratio
                if ratio > GOAL:
                    missed.append("%s %s (%.1fx)" % (title, name, ratio))
            print(line)
    platform = [("BM_PlatformRegistryRead", "registry value read"), ("BM_PlatformCreateKey", "registry key created"),
                ("BM_PlatformFileExists", "file existence test"), ("BM_PlatformDoEvents", "DoEvents (message loop)")]
    if any(n + "" in runs for _, runs in sides[1:] for n, _ in platform):
        print()
        print("The DLL's platform calls under Wine, ns each (OnActivate makes several):")
        for member, title in platform:
            cells = ["%s %s" % (name, ns(runs[member][0]).strip()) for name, runs in sides[1:] if member in runs]
            print("  %-26s %s" % (title, "   ".join(cells)))
    print()
    if missed:
        print("Over %.0fx the native add-in's own share: %s" % (GOAL, "; ".join(missed)))
    else:
        print("Every DLL share within %.0fx the native add-in's own share." % GOAL)


if __name__ == "__main__":
    if len(sys.argv) < 2:
        sys.exit("usage: bench_com_report.py native.json [x64.json x86.json]")
    main(sys.argv[1:])
