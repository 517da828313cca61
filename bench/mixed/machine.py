"""What the fits ran on."""

import os
import platform
import subprocess


def first_line(*command):
    try:
        return subprocess.run(command, capture_output=True, text=True, check=True).stdout.split("\n")[0].strip()
    except (OSError, subprocess.CalledProcessError):
        return "unknown"


def described():
    processor, memory = "unknown", 0
    try:
        with open("/proc/cpuinfo", encoding="ascii", errors="replace") as file:
            processor = next((line.split(":")[1].strip() for line in file if line.startswith("model name")), processor)
        memory = os.sysconf("SC_PAGE_SIZE") * os.sysconf("SC_PHYS_PAGES")
    except (OSError, ValueError):
        pass
    here = os.path.dirname(os.path.abspath(__file__))
    return {"processor": processor, "cores": os.cpu_count(), "memory": memory, "system": platform.platform(),
            "load": os.getloadavg()[0], "commit": first_line("git", "-C", here, "describe", "--always", "--dirty"),
            "r": first_line("R", "--version")}
