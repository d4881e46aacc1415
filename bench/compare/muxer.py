"""Muxer against libavformat's, in one process; and the space check over the length of a file."""

import json
import os
import statistics
import subprocess

import plot

FORMS = {
    "normal": [],
    "normal, space check at each chunk": ["--space-check"],
    "fragmented": ["--fragmented"],
}
FIGURES = ["ns_per_sample", "mb_per_second", "heap_bytes_per_sample", "close_ms"]
DAY = [1, 10, 60, 120, 480, 1440]


def race(options, minutes, *how):
    program = os.path.join(options.build, "bench", "muxer_race")
    command = [program, "--minutes", str(minutes), "--pairs", str(options.pairs), *how]
    printed = subprocess.run(command, check=True, capture_output=True, text=True,
                             env={**os.environ, "TMPDIR": options.work})
    found = json.loads(printed.stdout.splitlines()[-1])
    return {"ours": found["ours"], "libavformat": found["peer"]}


def space_check(options):
    """Microseconds that measuring `moov` takes at each length: {minutes: microseconds}."""
    program = os.path.join(options.build, "bench", "boxlib_bench")
    lengths = "|".join(str(minutes) for minutes in (DAY[:2] if options.smoke else DAY))
    printed = subprocess.run([program, f"--benchmark_filter=^BM_SpaceCheck/minutes:({lengths})$",
                              "--benchmark_min_time=" + ("0.01" if options.smoke else "0.2"),
                              "--benchmark_format=json"], check=True, capture_output=True, text=True)
    found = json.loads(printed.stdout)["benchmarks"]
    return {int(one["name"].rsplit(":", 1)[1]): one["cpu_time"] for one in found}


def run(options):
    tables = []
    for sink, how in {"a sink that counts": [], "a file in memory": ["--to-file"]}.items():
        for form, flags in FORMS.items():
            # A file of two hours would fill the memory.
            for minutes in options.lengths if not how else [m for m in options.lengths if m <= 10]:
                for size in (12500,) if how or options.smoke or minutes > 10 else (12500, 125000):
                    tables.append({
                        "title": f"{form}, pictures of {size} bytes, {minutes:g} min, to {sink}",
                        "figures": FIGURES,
                        "runs": race(options, minutes, "--picture-bytes", str(size), *flags, *how),
                        "curve": (form, minutes) if size == 12500 and not how else None,
                    })
    check = space_check(options)
    tables.append({
        "title": "Space check: measuring `moov` of a file of so many minutes",
        "figures": ["microseconds"],
        "runs": {f"{minutes} min": [{"microseconds": value}] for minutes, value in check.items()},
        "space_check": check,
        "no_peer": True,
    })
    return tables


def draw(tables, folder):
    """muxer.svg: nanoseconds a sample of both over the length. space_check.svg: microseconds of a check."""
    os.makedirs(folder, exist_ok=True)
    lines = {}
    for table in tables:
        if table.get("curve"):
            form, minutes = table["curve"]
            for name, runs in table["runs"].items():
                if name == "ours" or form != "normal, space check at each chunk":
                    median = statistics.median(run["ns_per_sample"] for run in runs)
                    lines.setdefault(f"{name}, {form}", []).append((minutes, median))
    plot.write(os.path.join(folder, "muxer.svg"), "Muxer alone: processor time of a sample",
               "minutes in the file", "ns", lines)
    check = next(table["space_check"] for table in tables if "space_check" in table)
    plot.write(os.path.join(folder, "space_check.svg"), "Space check of a normal file",
               "minutes in the file", "us", {"ours": sorted(check.items())})
