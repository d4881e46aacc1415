"""Live: the same packets by UDP to ours and to ffmpeg at the same time."""

import os
import shutil
import socket

import machine
import material

# Exit code of the receiver when units were lost.
LOST = 8


def free_port():
    with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as probe:
        probe.bind(("127.0.0.1", 0))
        return probe.getsockname()[1]


def pair(options, source):
    """Both receivers wait when the sender begins; it ends them, and their processor time is that of all its packets."""
    ports = [free_port(), free_port()]
    addresses = [f"udp://127.0.0.1:{port}" for port in ports]
    folders = [os.path.join(options.work, "live", name) for name in ("ours", "peer")]
    logs = [os.path.join(options.work, f"live{i}.log") for i in range(3)]
    seconds = options.seconds
    ours = machine.Run([os.path.join(options.build, "host", "receiver"), "-i", addresses[0], "-o", ".",
                        "--max-minutes", "1", "--seconds", str(seconds)], folders[0], logs[0])
    # Packets that come while it has no reader yet wait in the socket, as they do in ours.
    peer = machine.Run(["ffmpeg", "-v", "error", "-i", addresses[1], "-map", "0", "-c", "copy", "-t", str(seconds),
                        "-f", "segment", "-segment_time", "60", "-segment_format", "mp4", "%03d.mp4"], folders[1], logs[1])
    outputs = "|".join(f"[f=mpegts]{address}?pkt_size=1316" for address in addresses)
    sender = machine.Run(["ffmpeg", "-v", "error", "-re", "-stream_loop", "-1", "-i", source, "-t", str(seconds + 10),
                          "-map", "0", "-c", "copy", "-f", "tee", outputs], options.work, logs[2])
    try:
        limit = seconds + 60
        figures = {"receiver": ours.finish(allowed=(0, LOST), limit=limit), "ffmpeg": peer.finish(limit=limit)}
    finally:
        sender.process.kill()
        sender.process.wait()
        shutil.rmtree(os.path.join(options.work, "live"))
    if ours.process.returncode == LOST:
        machine.tell("the receiver lost packets: the machine was too busy for this run")
    for figure in figures.values():
        figure["percent_of_a_core"] = figure["cpu_seconds"] / seconds * 100
    return figures


def run(options):
    tables = []
    for megabits in [6] if options.smoke else [6, 20, 60]:
        source = material.clip(options, megabits)
        runs = {"receiver": [], "ffmpeg": []}
        for _ in range(options.pairs):
            for name, figure in pair(options, source).items():
                runs[name].append(figure)
        tables.append({
            "title": f"UDP, 59.94, {megabits} Mb/s, {options.seconds} s",
            "figures": ["percent_of_a_core", "cpu_seconds", "peak_mb", "context_switches"],
            "runs": runs,
        })
    return tables
