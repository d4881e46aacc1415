"""Tables of what was measured: medians with minimum and maximum, and ours over each peer pair by pair."""

import statistics

UNITS = {
    "cpu_seconds": "CPU s", "wall_seconds": "s", "peak_mb": "peak MB", "context_switches": "context switches",
    "lost": "lost packets (1: yes)", "percent_of_a_core": "% of a core", "ns_per_sample": "ns CPU/sample", "mb_per_second": "MB/s",
    "heap_bytes_per_sample": "heap bytes/sample", "close_ms": "Close ms", "microseconds": "us",
    "channels": "channels",
    "median_us": "median us", "p99_9_us": "99.9th percentile us", "max_us": "maximum us",
}


def number(value):
    digits = 0 if value >= 100 or value in (0, 1) else 1 if value >= 10 else 2
    return f"{value:,.{digits}f}"


def spread(values):
    """"median (minimum to maximum)"."""
    if len(values) == 1:
        return number(values[0])
    return f"{number(statistics.median(values))} ({number(min(values))} to {number(max(values))})"


def table(found):
    names = list(found["runs"])
    figures = found["figures"]
    compared = not found.get("no_peer")
    header = ["", *(UNITS[figure] for figure in figures), *(["ours over it, by " + UNITS[figures[0]]] if compared else [])]
    lines = [f"### {found['title']}", "", "| " + " | ".join(header) + " |", "|" + " --- |" * len(header)]
    ours = found["runs"][names[0]]
    for name in names:
        runs = found["runs"][name]
        row = [name, *(spread([run[figure] for run in runs]) for figure in figures)]
        if compared:
            ratios = [a[figures[0]] / b[figures[0]] for a, b in zip(ours, runs) if b[figures[0]] > 0]
            row.append("" if name == names[0] or not ratios else spread(ratios))
        lines.append("| " + " | ".join(row) + " |")
    return "\n".join(lines) + "\n"


def section(name, tables):
    return f"## {name}\n\n" + "\n".join(table(found) for found in tables)


def machine(found):
    cpus = ",".join(str(cpu) for cpu in found["cpus"])
    smoke = " Smoke run: the figures mean nothing." if found["smoke"] else ""
    return (f"{found['processor']}, processors {cpus}, Linux {found['kernel']}, load average {found['load_before']:.1f}, "
            f"{found['pairs']} pairs.{smoke}\n")
