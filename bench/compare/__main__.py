"""scripts/bench: what this system costs beside what users would pick instead.

Each figure is taken in pairs, ours and the peer's in turns, on the same processors, so that a machine which slows down
slows down both; what counts is the ratio pair by pair. Prints a table for each section; --json keeps all figures, and
--curves writes the space check and the muxer over the length of the file as SVG. Peers that are not installed are left out
and told.
"""

import argparse
import json
import os
import sys
import tempfile

import instructions
import job
import latency
import live
import machine
import muxer
import report

SECTIONS = {
    "muxer": muxer.run,
    "job": job.run,
    "live": live.run,
    "channels": live.channels,
    "latency": latency.run,
}


def parse():
    parser = argparse.ArgumentParser(prog="scripts/bench", description=__doc__,
                                     formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("sections", nargs="*", metavar="SECTION", help=f"which of {', '.join(SECTIONS)}; else all")
    parser.add_argument("--smoke", action="store_true", help="tiny inputs: shows that everything runs, and measures nothing")
    parser.add_argument("--pairs", type=int, default=5, help="runs of each (5)")
    parser.add_argument("--cpus", help="processors to run on, as 0,1; else all that this process may use")
    parser.add_argument("--lengths", default="1,10,60,120", help="minutes of the muxer's files (1,10,60,120)")
    parser.add_argument("--job-minutes", default="10", help="minutes of MPEG-TS of the whole job (10)")
    parser.add_argument("--seconds", type=int, default=30, help="seconds of a live run (30)")
    parser.add_argument("--most-channels", type=int, default=32, help="where the trial of channels ends (32)")
    parser.add_argument("--work", help="folder for material and recordings, best in memory; else one of /dev/shm")
    parser.add_argument("--json", metavar="FILE", help="where all figures go")
    parser.add_argument("--curves", metavar="FOLDER", help="where the curves go, as SVG")
    parser.add_argument("--instructions", action="store_true",
                        help="count instructions of three fixed jobs instead, and fail when one is more than 5 %% worse "
                        "than what docs/performance/instructions.json keeps")
    parser.add_argument("--keep-instructions", action="store_true", help="count them and keep them there")
    options = parser.parse_args()
    for section in options.sections:
        if section not in SECTIONS:
            parser.error(f"there is no section '{section}'")
    options.build = os.path.abspath("build/bench")
    options.cpus = [int(cpu) for cpu in options.cpus.split(",")] if options.cpus else sorted(os.sched_getaffinity(0))
    options.lengths = [float(minutes) for minutes in options.lengths.split(",")]
    options.job_minutes = [float(minutes) for minutes in options.job_minutes.split(",")]
    if options.smoke:
        options.pairs = 1
        options.lengths = [0.1, 0.2]
        options.job_minutes = [0.05]
        options.seconds = 4
    return options


def main():
    options = parse()
    os.sched_setaffinity(0, options.cpus)
    os.environ["QX_LOG"] = os.devnull
    if options.instructions or options.keep_instructions:
        return instructions.run(options)
    figures = {"machine": machine.describe(options)}
    print(report.machine(figures["machine"]))
    room = "/dev/shm" if os.path.isdir("/dev/shm") else None
    with tempfile.TemporaryDirectory(prefix="bench.", dir=options.work or room) as work:
        options.work = work
        for name in options.sections or SECTIONS:
            figures[name] = SECTIONS[name](options)
            print(report.section(name, figures[name]), flush=True)
    figures["machine"]["load_after"] = os.getloadavg()[0]
    print(f"Load average at the end: {figures['machine']['load_after']:.1f}")
    if options.json:
        with open(options.json, "w", encoding="utf-8") as out:
            json.dump(figures, out, indent=1)
            out.write("\n")
    if options.curves and "muxer" in figures:
        muxer.draw(figures["muxer"], options.curves)
    return 0


if __name__ == "__main__":
    sys.exit(main())
