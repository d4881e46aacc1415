"""The whole job: a file of MPEG-TS to MP4 files, as fast as it goes. `cp` is the floor."""

import os
import shutil
import subprocess

import machine
import material

GST_QUEUE = "queue max-size-time=5000000000 max-size-bytes=0 max-size-buffers=0"


def contestants(options, source, file_minutes):
    """The first one is ours."""
    seconds = file_minutes * 60
    commands = {
        "receiver": [os.path.join(options.build, "host", "receiver"), "-i", source, "--speed", "1000", "-o", ".",
                     "--max-minutes", str(max(1, round(file_minutes)))],
        "ffmpeg, segments": ["ffmpeg", "-v", "error", "-i", source, "-map", "0", "-c", "copy", "-f", "segment",
                             "-segment_time", str(seconds), "-segment_format", "mp4", "%03d.mp4"],
        "ffmpeg, one file": ["ffmpeg", "-v", "error", "-i", source, "-map", "0", "-c", "copy", "one.mp4"],
        "splitmuxsink": ["gst-launch-1.0", "-q", "filesrc", f"location={source}", "!", "tsdemux", "name=d",
                         "splitmuxsink", "name=s", "location=%03d.mp4", f"max-size-time={int(seconds * 1e9)}",
                         "d.", "!", *GST_QUEUE.split(), "!", "h264parse", "!", "s.video",
                         "d.", "!", *GST_QUEUE.split(), "!", "aacparse", "!", "s.audio_0"],
        "cp": ["cp", source, "copy.ts"],
    }
    for element in ("splitmuxsink", "tsdemux"):
        if machine.missing("gst-inspect-1.0") or subprocess.run(["gst-inspect-1.0", "--exists", element]).returncode:
            machine.tell(f"splitmuxsink is left out: GStreamer has no {element} here (scripts/bootstrap --bench)")
            del commands["splitmuxsink"]
            break
    return commands


def run(options):
    tables = []
    for minutes in options.job_minutes:
        source = material.stream(options, minutes)
        folder = os.path.join(options.work, "recorded")

        def measure(_name, command):
            try:
                return machine.run(command, folder, options.work, limit=900)
            finally:
                shutil.rmtree(folder)

        tables.append({
            "title": f"{minutes:g} min of MPEG-TS ({os.path.getsize(source) / 1e6:.0f} MB) to files of a minute, in memory",
            "figures": ["cpu_seconds", "wall_seconds", "peak_mb", "context_switches"],
            "runs": machine.in_turns(options, contestants(options, source, 1), measure),
        })
    return tables
