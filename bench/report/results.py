"""The measurements of a run, read from its JSON lines."""

import json
import math
from dataclasses import dataclass, field

OURS = "qxesm"


@dataclass
class Result:
    """One job on one system: the times of everybody who did it."""

    family: str
    case: str
    n: float
    entries: float
    phase: str
    variant: str
    times: dict = field(default_factory=dict)
    facts: dict = field(default_factory=dict)
    machine: dict = field(default_factory=dict)  # as it was when the file of this result began

    def seconds(self, name):
        """Median of a program; None when it did not run or was wrong."""
        return self.times.get(name, {}).get("seconds")

    def ours(self):
        return self.seconds(OURS)

    def best_peer(self, names=None):
        """(name, seconds) of the fastest peer, all of them or those whose name begins as one of `names`."""
        found = [
            (record["seconds"], name)
            for name, record in self.times.items()
            if not name.startswith(OURS)
            and "seconds" in record
            and (names is None or any(name.startswith(n) for n in names))
        ]
        return min(found)[::-1] if found else (None, None)

    def ratio(self, names=None):
        """How many times faster than the best peer; None when either is missing."""
        ours, (_, theirs) = self.ours(), self.best_peer(names)
        return theirs / ours if ours and theirs else None


class Run:
    def __init__(self, files):
        self.machines = []
        results = {}
        for name in files:
            with open(name, encoding="utf-8") as lines:
                for line in lines:
                    self._take(json.loads(line), results)
        self.results = list(results.values())

    def _take(self, record, results):
        if "machine" in record:
            self.machines.append(record["machine"])
            return
        times = {t["name"]: t for t in record["times"]}
        result = Result(
            record["family"], record["case"], record["n"], record["entries"], record["phase"], record["variant"],
            times, record["facts"], self.machine)
        # A later run of the same job takes the place of an earlier one.
        results[result.family, result.case, result.phase, result.variant] = result

    @property
    def machine(self):
        return self.machines[-1]

    def of(self, phase, families=None, variant=None):
        return [
            r for r in self.results
            if r.phase == phase
            and (families is None or r.family in families)
            and (variant is None or r.variant == variant)
        ]

    def find(self, like, phase, variant=""):
        """Another phase of the same system."""
        for r in self.results:
            if (r.family, r.case, r.phase, r.variant) == (like.family, like.case, phase, variant):
                return r
        return None


def definite(result):
    """Not one of the singular systems, which have no peers."""
    return "all dummies" not in result.case


def exponent(points):
    """Slope of log(seconds) over log(n) by least squares; None for fewer than two sizes."""
    logs = [(math.log(n), math.log(s)) for n, s in points if n > 0 and s and s > 0]
    if len({x for x, _ in logs}) < 2:
        return None
    mean_x = sum(x for x, _ in logs) / len(logs)
    mean_y = sum(y for _, y in logs) / len(logs)
    return sum((x - mean_x) * (y - mean_y) for x, y in logs) / sum((x - mean_x) ** 2 for x, _ in logs)
