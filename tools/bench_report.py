#!/usr/bin/env python3
"""Prints the results of the benchmark programs (Google Benchmark JSON files)
as figures beside their baselines, with ratios and targets.

Times are CPU times of the benchmarking thread (the machine is shared, so wall
times mostly measure the neighbours), per iteration. "baseline" is the
figure's baseline measured in the same run; "ratio" is time / baseline, or for
growth lines the large size's time / the small size's.
"""
import json
import re
import sys

# (what, measured benchmark, baseline benchmark, largest ratio allowed or None)
# Names are without "BM_" and without the "/min_time:..." and
# "/iterations:..." parts; "{}" stands for the argument part shared by both.
PAIRS = [
    ("Catalogue scan, GenerateManifest(true)", "Scan/{}", "ReadKitFiles/{}", 4.0),
    ("Cached catalogue read, ReadManifest", "ReadManifest/{}", "ParseManifestDom/{}", 2.0),
    ("Log reprocessing, Process(0)", "Process/{}", "ParseLogsOnly/{}", 2.0),
    ("Record one module in a run, file written", "RecordModule/{}", "ParseOneLog/{}", None),
    ("Record one module in a run, all but the write", "RecordModuleNoWrite/{}", "ParseOneLog/{}", None),
    ("Resource file save", "SaveResourceFile/{}", "WriteFileBaseline/{}", None),
    ("Resource file load", "LoadResourceFile/{}", "ReadFileBaseline/{}", None),
    ("Decode 10 MB", "Decode/{}", "DecodeIconv/{}", 2.0),
    ("Encode 10 MB", "Encode/{}", "EncodeIconv/{}", 2.0),
]

# (what, benchmark of the small size, of the large size, largest ratio allowed)
GROWTH = [
    ("Scan 8,000 / 2,000 modules", "Scan/modules:2000", "Scan/modules:8000", 4.5),
    ("Reprocessing 8,000 / 2,000 logs", "Process/modules:2000", "Process/modules:8000", 4.5),
    ("Record one module, all but the write, 8,000 / 500 kit", "RecordModuleNoWrite/modules:500",
     "RecordModuleNoWrite/modules:8000", 1.5),
    ("Resource save 65,535 / 16,383", "SaveResourceFile/16383", "SaveResourceFile/65535", 4.5),
    ("Resource load 65,535 / 16,383", "LoadResourceFile/16383", "LoadResourceFile/65535", 4.5),
    # The same ratio, second over first, of one run shared by four handsets
    # (wall time) against Run() on one.
    ("Sharded run, 24 modules of 0.2 s: 4 handsets / Run() on 1", "HarnessRun", "ShardedRun/handsets:4", 0.35),
    ("Sharded run, 24 modules of 0.2 s: 1 handset / Run() on 1", "HarnessRun", "ShardedRun/handsets:1", 1.1),
]

# (what, benchmark, largest time allowed in seconds)
LIMITS = [
    ("Resource save of 65,535 resources", "SaveResourceFile/65535", 1.0),
    ("Resource load of 65,535 resources", "LoadResourceFile/65535", 1.0),
]

# (what, benchmark name pattern, counter, largest value allowed or None): a
# counter of each matching benchmark, shown as the figure.
COUNTERS = [
    ("Shard balance, longest / mean, history known", r"ShardPlan/shards:\d+/known_percent:100",
     "longest_over_mean", 1.10),
    ("Shard balance, longest / mean, 80 % known", r"ShardPlan/shards:\d+/known_percent:80",
     "longest_over_mean", None),
    ("Shard balance, longest / mean, test cases only", r"ShardPlan/shards:\d+/known_percent:0",
     "longest_over_mean", None),
]

UNITS = {"ns": 1e-9, "us": 1e-6, "ms": 1e-3, "s": 1.0}


def clean(name):
    name = re.sub(r"^BM_", "", name)
    return re.sub(r"/(min_time|iterations|repeats|real_time)[^/]*", "", name)


def load(paths):
    results = {}
    for path in paths:
        try:
            with open(path) as f:
                data = json.load(f)
        except (OSError, ValueError) as error:
            print(f"cannot read {path}: {error}", file=sys.stderr)
            continue
        for b in data.get("benchmarks", []):
            if b.get("run_type") == "aggregate" and b.get("aggregate_name") != "mean":
                continue
            results[clean(b.get("run_name", b["name"]))] = b
    return results


def seconds(b):
    # Benchmarks of waiting work (handsets running in other threads) measure
    # wall time; the rest the CPU time of the benchmarking thread.
    key = "real_time" if "/real_time" in b.get("name", "") else "cpu_time"
    return b[key] * UNITS.get(b.get("time_unit", "ns"), 1e-9)


def show(value):
    if value >= 1.0:
        return f"{value:9.3f} s "
    if value >= 1e-3:
        return f"{value * 1e3:9.3f} ms"
    return f"{value * 1e6:9.3f} us"


def verdict(ratio, limit):
    if limit is None:
        return ""
    return f"<= {limit:<4g} {'ok' if ratio <= limit else 'MISSED'}"


def main(paths):
    results = load(paths)
    missed = []
    lines = []
    width = 62
    lines.append(f"{'figure':{width}} {'time':>12} {'baseline':>12} {'ratio':>7}  target")
    for what, measured, baseline, limit in PAIRS:
        pattern = re.compile("^" + re.escape(measured).replace(r"\{\}", "(.*)") + "$")
        for name in sorted(results, key=lambda n: (len(n), n)):
            m = pattern.match(name)
            if not m:
                continue
            b = results[name]
            base = results.get(baseline.replace("{}", m.group(1)))
            label = f"{what} [{m.group(1)}{' ' + b['label'] if b.get('label') else ''}]"
            if b.get("error_occurred") or base is None or base.get("error_occurred"):
                why = b.get("error_message") or (base or {}).get("error_message") or "no baseline"
                lines.append(f"{label:{width}} {'ERROR: ' + why}")
                missed.append(label)
                continue
            t, tb = seconds(b), seconds(base)
            ratio = t / tb if tb > 0 else float("inf")
            lines.append(f"{label:{width}} {show(t)} {show(tb)} {ratio:7.2f}  {verdict(ratio, limit)}")
            if limit is not None and ratio > limit:
                missed.append(label)
    for what, small, large, limit in GROWTH:
        if small in results and large in results:
            a, b = seconds(results[small]), seconds(results[large])
            ratio = b / a if a > 0 else float("inf")
            lines.append(f"{what:{width}} {show(b)} {show(a)} {ratio:7.2f}  {verdict(ratio, limit)}")
            if ratio > limit:
                missed.append(what)
    for what, name, limit in LIMITS:
        if name in results:
            t = seconds(results[name])
            ok = t <= limit
            lines.append(f"{what:{width}} {show(t)} {'':>12} {'':>7}  <= {limit:g} s {'ok' if ok else 'MISSED'}")
            if not ok:
                missed.append(what)
    for what, pattern, counter, limit in COUNTERS:
        for name in sorted(results, key=lambda n: (len(n), n)):
            if not re.fullmatch(pattern, name) or counter not in results[name]:
                continue
            value = results[name][counter]
            label = f"{what} [{name.split('/')[1]}]"
            lines.append(f"{label:{width}} {value:12.3f} {'':>12} {'':>7}  {verdict(value, limit)}")
            if limit is not None and value > limit:
                missed.append(label)
    for b in [b for _, b in sorted(results.items()) if "peak_MiB" in b]:
        label = f"Peak memory, {clean(b['name'])} (baseline: idle child)"
        peak, base = b["peak_MiB"], b.get("baseline_MiB", 0.0)
        limit = b.get("limit_MiB")
        ok = limit is None or peak <= limit
        lines.append(f"{label:{width}} {peak:8.1f} MiB {base:8.1f} MiB {peak / base if base else 0:7.2f}"
                     f"  {'<= %g MiB ' % limit if limit else ''}{'ok' if ok else 'MISSED'}")
        if not ok:
            missed.append(label)
    print("\n".join(lines))
    print()
    print("All targets met." if not missed else "Targets missed: " + "; ".join(missed))
    return 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
