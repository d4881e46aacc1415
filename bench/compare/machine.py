"""Runs commands and measures them, and tells what machine they ran on."""

import os
import platform
import shutil
import subprocess
import sys
import time


def describe(options):
    model = platform.processor()
    with open("/proc/cpuinfo", encoding="utf-8") as info:
        for line in info:
            if line.startswith("model name"):
                model = line.split(":", 1)[1].strip()
                break
    return {
        "processor": model,
        "cpus": options.cpus,
        "kernel": platform.release(),
        "load_before": os.getloadavg()[0],
        "pairs": options.pairs,
        "smoke": options.smoke,
    }


def missing(*programs):
    """The first of these programs that is not installed, or None."""
    return next((program for program in programs if shutil.which(program) is None), None)


def tell(text):
    print(f"bench: {text}", file=sys.stderr, flush=True)


class Run:
    """A command under way. Its output goes to a file, which is shown when it fails."""

    def __init__(self, command, folder, log):
        os.makedirs(folder, exist_ok=True)
        self.command = command
        self.log = log
        self.begin = time.monotonic()
        with open(log, "wb") as out:
            self.process = subprocess.Popen(command, cwd=folder, stdin=subprocess.DEVNULL, stdout=out, stderr=out)

    def finish(self, allowed=(0,), limit=None):
        """Waits, kills after `limit` seconds, and gives what the process and its children took."""
        while True:
            pid, status, usage = os.wait4(self.process.pid, os.WNOHANG if limit else 0)
            if pid != 0:
                break
            if time.monotonic() - self.begin > limit:
                self.process.kill()
                limit = None
                continue
            time.sleep(0.02)
        code = os.waitstatus_to_exitcode(status)
        self.process.returncode = code
        if code not in allowed:
            with open(self.log, encoding="utf-8", errors="replace") as log:
                sys.stderr.write(log.read()[-4000:])
            raise SystemExit(f"bench: exit code {code} of: {' '.join(self.command)}")
        return {
            "cpu_seconds": usage.ru_utime + usage.ru_stime,
            "user_seconds": usage.ru_utime,
            "system_seconds": usage.ru_stime,
            "wall_seconds": time.monotonic() - self.begin,
            # Not below the 23 MB of this program, which the process was for a moment.
            "peak_mb": usage.ru_maxrss * 1024 / 1e6,
            "context_switches": usage.ru_nvcsw + usage.ru_nivcsw,
        }


def run(command, folder, work, **how):
    return Run(command, folder, os.path.join(work, "command.log")).finish(**how)


def in_turns(options, contestants, measure):
    """`measure(name, command)` for each contestant, one after the other, `pairs` times: {name: [figures]}."""
    results = {name: [] for name in contestants}
    for _ in range(options.pairs):
        for name, command in contestants.items():
            results[name].append(measure(name, command))
    return results
