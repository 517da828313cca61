"""What each phase is to reach. A target looks at the results and gives verdicts, one for each system it is about."""

import math
from dataclasses import dataclass

from results import definite

COPY_OF_REFERENCE = 23e9  # bytes a second of the machine that absolute times were set for
GRIDS = ("a", "b", "e")


@dataclass
class Verdict:
    result: object
    measured: float  # None: nothing to judge
    required: float
    at_most: bool = False  # else at least

    @property
    def known(self):
        return self.measured is not None

    @property
    def met(self):
        if not self.known:
            return False
        return self.measured <= self.required if self.at_most else self.measured >= self.required

    @property
    def shortfall(self):
        """1 when exactly met, above 1 by what factor it is missed."""
        if not self.known or not self.measured or not self.required:
            return math.inf
        return self.measured / self.required if self.at_most else self.required / self.measured


@dataclass
class Target:
    phase: str
    families: tuple
    text: str
    judge: object  # run -> list of Verdict
    unit: str = "x"


def between(n, first, last):
    """A requirement that changes with the logarithm of n from one (n, value) to another, and is flat outside."""
    (n0, v0), (n1, v1) = first, last
    share = min(1.0, max(0.0, math.log(n / n0) / math.log(n1 / n0)))
    return v0 + share * (v1 - v0)


def faster(phase, families, required, text, variant="", peers=None):
    """At least so many times faster than the best of the peers."""
    def judge(run):
        need = required if callable(required) else lambda r: required
        return [Verdict(r, r.ratio(peers), need(r)) for r in run.of(phase, families, variant) if definite(r)]
    return Target(phase, tuple(families), text, judge)


def machine_scale(r):
    """Absolute times were set for a machine that copies at 23 GB/s."""
    return COPY_OF_REFERENCE / r.machine["copy"]


def seconds(phase, family, case, limit, text):
    def judge(run):
        return [Verdict(r, r.ours(), limit * machine_scale(r), at_most=True)
                for r in run.of(phase, (family,)) if r.case == case]
    return Target(phase, (family,), text, judge, "s")


def hubs_stay_linear(run):
    """Time per stored entry at each size against that at a tenth of it."""
    verdicts = []
    results = run.of("ordering", ("hubs",))
    for r in results:
        size, hubs = r.case.split(" with ")
        if int(size) < 10**6:
            continue
        for smaller in results:
            if smaller.case == f"{int(size) // 10} with {hubs}" and smaller.ours():
                growth = (r.ours() / r.entries) / (smaller.ours() / smaller.entries) if r.ours() else None
                verdicts.append(Verdict(r, growth, 3.0, at_most=True))
    return verdicts


def entries_per_second(variant, required):
    def judge(run):
        return [Verdict(r, r.facts["contributions"] / r.ours() / 1e6 if r.ours() else None,
                        required / machine_scale(r))
                for r in run.of("assembly", GRIDS, variant)]
    return judge


def product_bandwidth(run):
    return [Verdict(r, r.facts["bytes"] / r.ours() / r.machine["copy"] if r.ours() else None, 0.8)
            for r in run.of("product", None, "1 vector")]


def share_of_dgemm(run):
    return [Verdict(r, r.facts["flops"] / r.ours() / r.machine["dgemm"] if r.ours() else None, 0.7)
            for r in run.of("numeric", ("b",)) if r.n >= 200000]


def numeric_speed(run):
    """A refactorization against a first one; 5 % are left to the refilling and to noise."""
    verdicts = []
    for r in run.of("refactor"):
        first = run.find(r, "numeric")
        known = r.ours() and first and first.ours()
        verdicts.append(Verdict(r, first.ours() / r.ours() if known else None, 0.95))
    return verdicts


def dense_speed(phase, peer, required):
    def judge(run):
        verdicts = []
        for r in run.of(phase):
            ours = [r.seconds(name) for name in r.times if name.startswith("qxesm")]
            theirs = r.seconds(peer)
            known = theirs and all(ours)
            verdicts.append(Verdict(r, theirs / max(ours) if known else None, required))
        return verdicts
    return judge


def peak_memory(run):
    return [Verdict(r, r.facts["peak"] / r.facts["bound"] if "peak" in r.facts else None, 1.0, at_most=True)
            for r in run.of("memory")]


def exact_rank(run):
    return [Verdict(r, float(r.facts["rank"] == r.facts["expected"]) if "rank" in r.facts else None, 1.0)
            for r in run.of("rank")]


def inverse_targets(phase):
    return [
        faster(phase, GRIDS, 15.0, "15 x faster than a column Takahashi"),
        faster(phase, "c", 10.0, "10 x faster than a column Takahashi"),
        faster(phase, "d", 3.0, "3 x faster than a column Takahashi"),
        seconds(phase, "d", "1000000 animals", 2.0, "10⁶ animals in 2 s"),
    ]


TARGETS = [
    Target("assembly", GRIDS, "40 million entries/s in natural order",
           entries_per_second("natural order", 40.0), "M/s"),
    Target("assembly", GRIDS, "20 million entries/s in random order",
           entries_per_second("random order", 20.0), "M/s"),
    faster("assembly", ("a", "b", "c", "d", "e", "f", "row"), 5.0, "5 x `std::map` per row, natural order",
           "natural order", ("std::map",)),
    faster("assembly", ("a", "b", "c", "d", "e", "f", "row"), 5.0, "5 x `std::map` per row, random order",
           "random order", ("std::map",)),
    faster("ordering", ("a", "e"), 1 / 1.2, "1.2 x AMD's time or less", peers=("AMD",)),
    faster("ordering", "b", 0.5, "2 x AMD's time or less", peers=("AMD",)),
    faster("ordering", ("c", "f"), 1.0, "AMD's time or less", peers=("AMD",)),
    seconds("ordering", "d", "1000000 animals", 3.0, "10⁶ animals in 3 s"),
    seconds("ordering", "arrow", "50000", 0.2, "arrowhead of 50,000 in 0.2 s"),
    seconds("ordering", "crossed", "1 + 300 x 20000", 0.2, "intercept + 300 x 20,000 in 0.2 s"),
    Target("ordering", ("hubs",), "time per entry at 10⁶ at most 3 x that at 10⁵", hubs_stay_linear),
    faster("symbolic", "abcdef", 1.5, "1.5 x CHOLMOD's supernodal analysis", peers=("CHOLMOD supernodal",)),
    faster("numeric", "a", lambda r: between(r.n, (62500, 3.0), (1e6, 2.2)), "3 x at 62,500 to 2.2 x at 10⁶"),
    faster("numeric", "b", lambda r: between(r.n, (27000, 1.4), (216000, 1.0)), "1.4 x at 30³ to 1.0 x at 60³"),
    Target("numeric", ("b",), "70 % of dgemm's rate at 60³", share_of_dgemm),
    faster("numeric", "c", lambda r: between(r.n, (4000, 2.0), (50000, 1.3)), "2 x at 4,000 to 1.3 x at 50,000"),
    faster("numeric", "d", 2.0, "2 x"),
    faster("numeric", "e", 1.6, "1.6 x"),
    faster("numeric", "f", 5.0, "5 x"),
    faster("total", "acdf", 2.0, "2 x, everybody's own ordering"),
    faster("solve", "abcdef", 2.0, "2 x for 1 right-hand side", "1 right-hand side"),
    faster("solve", "adf", 4.0, "4 x for 32 right-hand sides", "32 right-hand sides"),
    faster("solve", "bce", 2.0, "2 x for 32 right-hand sides", "32 right-hand sides"),
    *inverse_targets("inverse"),
    *inverse_targets("trace"),
    Target("refactor", tuple("abcdef"), "the speed of a first numeric factorization", numeric_speed),
    Target("product", tuple("abcdef"), "80 % of the copy rate", product_bandwidth),
    faster("iteration", "abcdef", 1.3, "1.3 x Eigen's half-storage iteration"),
    Target("dense factor", ("dense",), "dpotrf's speed", dense_speed("dense factor", "dpotrf", 1.0)),
    Target("dense inverse", ("dense",), "70 % of dpotrf + dpotri",
           dense_speed("dense inverse", "dpotrf + dpotri", 0.7)),
    Target("memory", tuple("abcdef"), "9.5 bytes per entry of U, 60 per entry of A, 120 per row", peak_memory),
    Target("rank", ("c", "file"), "exact", exact_rank),
]
