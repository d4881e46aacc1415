"""Instructions of three fixed jobs, which do not depend on how busy the machine is."""

import json
import os
import re
import subprocess
import tempfile

import machine
import material

KEPT = "docs/performance/instructions.json"
WORSE = 1.05


def jobs(options):
    race = os.path.join(options.build, "bench", "muxer_race")
    alone = [race, "--pairs", "1", "--without-peer", "--minutes", "2", "--picture-bytes", "1000"]
    receiver = [os.path.join(options.build, "host", "receiver"), "-i", material.stream(options, 0.1), "--speed", "1000",
                "-o", os.path.join(options.work, "recorded")]
    return {
        "two minutes through the normal muxer, space check at each chunk": [*alone, "--space-check"],
        "two minutes through the fragment muxer": [*alone, "--fragmented"],
        "six seconds of MPEG-TS through the receiver": receiver,
    }


def count(command, options):
    """Callgrind's count, over all threads."""
    printed = subprocess.run(["valgrind", "--tool=callgrind", "--callgrind-out-file=/dev/null", *command], check=True,
                             capture_output=True, text=True, cwd=options.work)
    return int(re.search(r"Collected : (\d+)", printed.stderr).group(1))


def run(options):
    """The exit code: 1 when a job takes more than 5 % more than was kept."""
    if machine.missing("valgrind"):
        raise SystemExit("bench: valgrind is not installed (scripts/bootstrap --bench)")
    with tempfile.TemporaryDirectory(prefix="bench.", dir=options.work) as options.work:
        found = {name: count(command, options) for name, command in jobs(options).items()}
    if options.keep_instructions:
        os.makedirs(os.path.dirname(KEPT), exist_ok=True)
        with open(KEPT, "w", encoding="utf-8") as out:
            json.dump(found, out, indent=1)
            out.write("\n")
        kept = found
    else:
        with open(KEPT, encoding="utf-8") as file:
            kept = json.load(file)
    worse = False
    for name, instructions in found.items():
        ratio = instructions / kept[name]
        verdict = " WORSE" if ratio > WORSE else ""
        worse = worse or ratio > WORSE
        print(f"{instructions / 1e6:10.1f} million, {ratio:.3f} of what was kept:{verdict} {name}")
    return 1 if worse else 0
