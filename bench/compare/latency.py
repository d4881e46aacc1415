"""What a live host sees: the time that each push takes at 60 Mb/s."""

import json
import os
import subprocess

MEDIA = ("video", "audio", "meta")


def run(options):
    program = os.path.join(options.build, "bench", "push_latency_bench")
    runs = {name: [] for name in MEDIA}
    for _ in range(options.pairs):
        printed = subprocess.run([program, "--benchmark_format=json"], check=True, capture_output=True, text=True)
        counters = json.loads(printed.stdout)["benchmarks"][0]
        for name in MEDIA:
            runs[name].append({
                "median_us": counters[f"{name} median us"],
                "p99_9_us": counters[f"{name} p99.9 us"],
                "max_us": counters[f"{name} max us"],
            })
    return [{"title": "Push, 10 s of stream at 60 Mb/s", "figures": ["median_us", "p99_9_us", "max_us"], "runs": runs,
             "no_peer": True}]
