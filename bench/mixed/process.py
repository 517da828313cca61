"""Runs a program by itself and measures it."""

import os
import signal
import subprocess
import threading
import time
from dataclasses import dataclass


@dataclass
class Run:
    status: int
    wall: float  # seconds
    cpu: float  # seconds, of the user and of the system for it
    peak: int  # bytes resident
    output: str
    errors: str

    def times(self):
        return {"wall": self.wall, "cpu": self.cpu, "peak": self.peak}


def environment():
    """One thread for everybody, and the kernels that each BLAS takes by itself."""
    names = {"OMP_NUM_THREADS": "1", "OPENBLAS_NUM_THREADS": "1"}
    return {k: v for k, v in os.environ.items() if k != "OPENBLAS_CORETYPE"} | names


def measured(command, scratch, longest):
    """The peak is that of the largest process that the command was. Past `longest` seconds it is stopped."""
    output, errors = os.path.join(scratch, "output"), os.path.join(scratch, "errors")
    with open(output, "wb") as out, open(errors, "wb") as err:
        began = time.monotonic()
        process = subprocess.Popen(command, stdin=subprocess.DEVNULL, stdout=out, stderr=err, env=environment(),
                                   start_new_session=True)
        guard = threading.Timer(longest, os.killpg, (process.pid, signal.SIGKILL))
        guard.start()
        _, status, usage = os.wait4(process.pid, 0)
        wall = time.monotonic() - began
        guard.cancel()
        process.returncode = os.waitstatus_to_exitcode(status)
    with open(output, encoding="utf-8", errors="replace") as out, open(errors, encoding="utf-8", errors="replace") as err:
        return Run(process.returncode, wall, usage.ru_utime + usage.ru_stime, usage.ru_maxrss * 1024, out.read(),
                   err.read())
