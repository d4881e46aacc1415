"""Live, by UDP: one recording of the same packets by ours and by ffmpeg, and how many recordings the machine carries."""

import os
import re
import shutil
import socket
import time

import machine
import material

# Exit code of the receiver when units were lost.
LOST = 8
# Exit code of either when it could make nothing of what it received.
FAILED = 1
# Runs of a pair until both made something of it.
ATTEMPTS = 3
# What ffmpeg says of packets that did not come.
TOLD_OF_LOSS = re.compile(r"corrupt|overrun|error while decoding", re.IGNORECASE)


def free_ports(count):
    probes = [socket.socket(socket.AF_INET, socket.SOCK_DGRAM) for _ in range(count)]
    for probe in probes:
        probe.bind(("127.0.0.1", 0))
    ports = [probe.getsockname()[1] for probe in probes]
    for probe in probes:
        probe.close()
    return ports


def receiver(options, address):
    return [os.path.join(options.build, "host", "receiver"), "-i", address, "-o", ".", "--max-minutes", "1",
            "--seconds", str(options.seconds)]


def ffmpeg(options, address):
    return ["ffmpeg", "-v", "warning", "-i", address, "-map", "0", "-c", "copy", "-t", str(options.seconds), "-f", "segment",
            "-segment_time", "60", "-segment_format", "mp4", "%03d.mp4"]


def record(options, source, makers):
    """One run of each maker's command at the same time, from one sender: its figures, with `lost`. The recordings wait when
    the sender begins; what comes while one has no reader yet waits in its socket."""
    folder = os.path.join(options.work, "live")
    addresses = [f"udp://127.0.0.1:{port}" for port in free_ports(len(makers))]
    outputs = "|".join(f"[f=mpegts]{address}?pkt_size=1316" for address in addresses)
    started = []
    figures = []
    try:
        for i, (maker, address) in enumerate(zip(makers, addresses)):
            started.append(machine.Run(maker(options, address), os.path.join(folder, str(i)),
                                       os.path.join(options.work, f"live{i}.log")))
        time.sleep(1)
        started.append(machine.Run(["ffmpeg", "-v", "error", "-re", "-stream_loop", "-1", "-i", source,
                                    "-t", str(options.seconds + 10), "-map", "0", "-c", "copy", "-f", "tee", outputs],
                                   options.work, os.path.join(options.work, "sender.log")))
        for run in started[:-1]:
            figure = run.finish(allowed=(0, LOST, FAILED), limit=options.seconds + 60)
            figure["failed"] = run.process.returncode == FAILED
            with open(run.log, encoding="utf-8", errors="replace") as log:
                figure["lost"] = int(run.process.returncode != 0 or bool(TOLD_OF_LOSS.search(log.read())))
            figure["percent_of_a_core"] = figure["cpu_seconds"] / options.seconds * 100
            figures.append(figure)
    finally:
        for run in started:
            if run.process.returncode is None:
                run.process.kill()
                run.process.wait()
        shutil.rmtree(folder, ignore_errors=True)
    return figures


def pair(options, source):
    for _ in range(ATTEMPTS):
        figures = record(options, source, [receiver, ffmpeg])
        if not any(figure["failed"] for figure in figures):
            return figures
    raise SystemExit(f"bench: no pair of live runs out of {ATTEMPTS} recorded anything")


def run(options):
    tables = []
    for megabits in [6] if options.smoke else [6, 20, 60]:
        source = material.clip(options, megabits)
        runs = {"receiver": [], "ffmpeg": []}
        for _ in range(options.pairs):
            for name, figure in zip(runs, pair(options, source)):
                if figure["lost"]:
                    machine.tell(f"{name} lost packets at {megabits} Mb/s")
                runs[name].append(figure)
        tables.append({
            "title": f"UDP, 59.94, {megabits} Mb/s, {options.seconds} s",
            "figures": ["percent_of_a_core", "peak_mb", "context_switches", "lost"],
            "runs": runs,
        })
    return tables


def carried(options, source, maker):
    """The most recordings at once of which none lost anything, by doubling; the sender runs on the same machine."""
    most = 0
    number = 1
    while number <= (1 if options.smoke else options.most_channels):
        if any(figure["lost"] for figure in record(options, source, [maker] * number)):
            break
        most = number
        number *= 2
    return most


def channels(options):
    source = material.clip(options, 6)
    runs = {"receiver": [], "ffmpeg": []}
    for _ in range(options.pairs):
        for name, maker in zip(runs, (receiver, ffmpeg)):
            runs[name].append({"channels": carried(options, source, maker)})
    return [{"title": f"Recordings of 6 Mb/s at once, without a loss in {options.seconds} s, at most {options.most_channels}",
             "figures": ["channels"], "runs": runs}]
