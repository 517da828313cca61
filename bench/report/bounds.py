"""What bounds a time: how near it comes to what the machine copies, multiplies and loads, by the facts of a record.

measured() gives the numbers by name, None where a file of results does not have what they are made of; the columns of
the page and the reasons of explanations.txt take them from there."""

import math

import text
from results import OURS
from targets import machine_scale

ORDERINGS = (OURS, "AMD", "METIS")
OUR_STEPS = ("ordering", "symbolic", "numeric", "solve")
STEPS_OF_PEERS = ("analysis", "numeric", "solve")


def quotient(a, b):
    return a / b if a is not None and b else None


def product(*factors):
    return math.prod(factors) if None not in factors else None


NEAR = 2**18  # bytes within the second cache


def latency(machine, size, of="latency"):
    """Seconds of a dependent load, or of a "scattered" addition, over so many bytes: between the sizes that were
    measured, by their logarithm."""
    points = sorted((p["bytes"], p["seconds"]) for p in machine.get(of, []))
    if not points or not size:
        return None
    if size <= points[0][0]:
        return points[0][1]
    for (low, before), (high, after) in zip(points, points[1:]):
        if size <= high:
            return before + (after - before) * math.log(size / low) / math.log(high / low)
    return points[-1][1]


def scattered(r, size):
    """Seconds of an addition to a place that a list names, over so many bytes."""
    return latency(r.machine, size, "scattered")


def rates(r, flops=None, moved=None):
    """Of a job of so many operations on so many bytes, beside dgemm and copying; the nearer of the two bounds."""
    gflops, gbytes = quotient(flops, r.ours()), quotient(moved, r.ours())
    of_dgemm, of_copy = quotient(gflops, r.machine["dgemm"]), quotient(gbytes, r.machine["copy"])
    nearest, bound = None, None
    if of_dgemm is not None and of_copy is not None:
        nearest, bound = max((of_dgemm, "dgemm"), (of_copy, "copying"))
    return {"gflops": product(gflops, 1e-9), "gbytes": product(gbytes, 1e-9), "of_dgemm": of_dgemm,
            "of_copy": of_copy, "nearest": nearest, "bound": bound}


def loads(r, count, size):
    """Time of one of `count`, in nanoseconds and in dependent loads over so many bytes."""
    each, load = quotient(r.ours(), count), latency(r.machine, size)
    return {"ns": product(each, 1e9), "load_ns": product(load, 1e9), "loads": quotient(each, load)}


def of_assembly(run, r):
    count = r.facts.get("contributions")
    map_ns = product(quotient(r.seconds("std::map"), count), 1e9)
    numbers = loads(r, count, r.facts.get("tree_bytes"))
    if r.variant != "random order":
        numbers["loads"] = None  # what comes next is near by, and fetched ahead
    addition = scattered(r, r.facts.get("tree_bytes"))
    return {"million": quotient(product(count, 1e-6), r.ours()), "map_ns": map_ns, "map_fifth": product(map_ns, 0.2),
            "near_load_ns": product(latency(r.machine, 2**20), 1e9), "twenty_ns": 50.0 * machine_scale(r),
            "call_ns": product(r.facts.get("call"), 1e9), "scattered_ns": product(addition, 1e9),
            "additions": quotient(quotient(r.ours(), count), addition), **numbers}


def of_ordering(run, r):
    fill = {name: r.facts.get("fill", {}).get(name, {}).get("flops") for name in ORDERINGS}
    return {**{f"gflop_{name.lower()}": product(fill[name], 1e-9) for name in ORDERINGS},
            "of_amd_flops": quotient(fill[OURS], fill["AMD"]), "of_metis_flops": quotient(fill[OURS], fill["METIS"]),
            "amd_ns": product(quotient(r.seconds("AMD"), r.entries), 1e9),
            "of_amd_time": quotient(r.ours(), r.seconds("AMD")),
            **loads(r, r.entries, r.facts.get("graph_bytes"))}


def of_symbolic(run, r):
    peer = r.seconds("CHOLMOD supernodal")
    return {"peer_ns": product(quotient(peer, r.entries), 1e9), **loads(r, r.entries, 16.0 * r.entries),
            **rates(r, moved=r.facts.get("bytes"))}


def row_length(numeric):
    """Entries of a row of U on average."""
    return quotient(numeric.facts.get("factor_entries"), numeric.n) if numeric else None


def of_numeric(run, r):
    numbers = rates(r, r.facts.get("flops"), r.facts.get("bytes"))
    return {"row": row_length(r), "each_ns": quotient(2.0, numbers["gflops"]),
            "scattered_ns": product(scattered(r, NEAR), 1e9), **numbers}


def of_solve(run, r):
    ordering = run.find(r, "ordering")
    fill = ordering.facts.get("fill", {}) if ordering else {}
    ours, metis = (fill.get(name, {}).get("entries") for name in (OURS, "METIS"))
    # A row of U adds to places of x on the way down and reads them on the way up: three words for each vector.
    places = product(24.0, r.facts.get("factor_entries"), r.facts.get("count"))
    moved = r.facts.get("bytes")
    touched = moved + places if None not in (moved, places) else None
    speed = quotient(touched, r.ours())
    # One vector: on the way down every entry adds to a place of its own.
    addition = scattered(r, max(NEAR, 8.0 * r.n))
    additions = product(addition, r.facts.get("factor_entries"))
    return {"metis_fill": quotient(metis, ours), "row": row_length(r), "touched": product(speed, 1e-9),
            "of_update": quotient(speed, r.machine.get("update")), "of_scattered": quotient(additions, r.ours()),
            "scattered_ns": product(addition, 1e9),
            **rates(r, r.facts.get("flops"), r.facts.get("bytes"))}


def shares(steps, names):
    """Per cent of each step; None where they were not timed."""
    whole = sum(steps.values()) if steps else None
    return {name: product(quotient(steps.get(name) if steps else None, whole), 100.0) for name in names}


def of_total(run, r):
    peer, _ = r.best_peer()
    steps = r.facts.get("steps", {})
    ours, theirs = shares(steps.get(OURS), OUR_STEPS), shares(steps.get(peer), STEPS_OF_PEERS)
    alone = product(ours["ordering"], 0.01)
    rest = None if alone is None else 1.0 - alone
    return {**{f"share_{name}": share for name, share in ours.items()},
            **{f"peer_{name}": share for name, share in theirs.items()},
            "without_ordering": quotient(r.ratio(), rest), "ordering_alone": quotient(r.ratio(), alone)}


def of_inverse(run, r):
    """Each entry of a row of U meets each other one: twice the operations of the factorization."""
    numeric = run.find(r, "numeric")
    flops = product(2.0, numeric.facts.get("flops") if numeric else None)
    row = row_length(numeric)
    return {"row": row, "gflop": product(flops, 1e-9), "inverse_mb": product(8e-6 * r.n, row),
            "dgemm_seconds": quotient(flops, r.machine["dgemm"]), **rates(r, flops)}


def of_refactor(run, r):
    refilling, numeric = r.facts.get("refilling"), run.find(r, "numeric")
    speed = quotient(r.facts.get("refill_bytes"), refilling)
    return {"refill_ms": product(refilling, 1e3), "refill_gbytes": product(speed, 1e-9),
            "of_copy": quotient(speed, r.machine["copy"]),
            "share_refill": product(quotient(refilling, r.ours()), 100.0),
            "numeric_ms": product(r.facts.get("numeric"), 1e3),
            "first_ms": product(numeric.ours() if numeric else None, 1e3)}


def of_moving(run, r):
    addition = scattered(r, 16.0 * r.n)  # an entry reads a place of x and adds to one of y
    rowless = r.facts.get("without_rows")
    moved = rates(r, moved=r.facts.get("bytes"))
    return {"rowless_ns": product(quotient(rowless, r.entries), 1e9), "of_rowless": quotient(rowless, r.ours()),
            "copy_at_most": quotient(moved["of_copy"], quotient(rowless, r.ours())),
            "matrix_mb": 16e-6 * r.entries, "vector_mb": 8e-6 * r.n,
            "ns": product(quotient(r.ours(), r.entries), 1e9), "scattered_ns": product(addition, 1e9),
            "of_scattered": quotient(product(addition, r.entries), r.ours()), **moved}


MEASURED = {
    "assembly": of_assembly, "ordering": of_ordering, "symbolic": of_symbolic, "numeric": of_numeric,
    "total": of_total, "solve": of_solve, "inverse": of_inverse, "trace": of_inverse, "refactor": of_refactor,
    "product": of_moving, "iteration": of_moving,
}
# By phase: heading, and the name of its number or a function of them all.
COLUMNS = {
    "assembly": [
        ("million/s", "million"), ("ns an entry", "ns"), ("std::map, ns", "map_ns"),
        ("loads of memory an entry", "loads"), ("a call alone, ns", "call_ns")],
    "ordering": [
        ("Gflop of the factor: " + ", ".join(ORDERINGS),
         lambda m: ", ".join(text.number(m[f"gflop_{name.lower()}"]) for name in ORDERINGS)),
        ("ns an entry", "ns"), ("a dependent load, ns", "load_ns")],
    "symbolic": [("ns an entry", "ns"), ("loads of memory an entry", "loads"), ("of the copy rate", "of_copy")],
    "numeric": [
        ("GFLOP/s", "gflops"), ("of dgemm", "of_dgemm"), ("of the copy rate", "of_copy"),
        ("ns a multiply-add", "each_ns"), ("entries of a row of U", "row"),
        ("nearest bound", lambda m: f"{m['bound']}, {m['nearest']:.2f}" if m["bound"] else "–")],
    "total": [
        ("ordering / symbolic / numeric / solve", lambda m: parts(m, [f"share_{name}" for name in OUR_STEPS])),
        ("fastest peer: analysis / numeric / solve", lambda m: parts(m, [f"peer_{name}" for name in STEPS_OF_PEERS])),
        ("without the ordering", "without_ordering"), ("the ordering alone", "ordering_alone")],
    "solve": [("of the copy rate", "of_copy"), ("GB/s", "gbytes"), ("with the places of x, GB/s", "touched"),
              ("of adding vectors", "of_update"),
              ("GFLOP/s", "gflops")],
    "inverse": [("GFLOP/s", "gflops"), ("of dgemm", "of_dgemm"), ("entries of a row of U", "row")],
    "trace": [("GFLOP/s", "gflops"), ("of dgemm", "of_dgemm"), ("entries of a row of U", "row")],
    "refactor": [
        ("refilling, ms", "refill_ms"), ("refilling, GB/s", "refill_gbytes"),
        ("refilling, % of the time", "share_refill"), ("factoring again, ms", "numeric_ms"),
        ("factoring first, ms", "first_ms")],
    "product": [("of the copy rate", "of_copy"), ("without rows, ns an entry", "rowless_ns"),
                ("of that", "of_rowless"), ("of the copy rate at most", "copy_at_most")],
    "iteration": [("of the copy rate", "of_copy")],
}


def parts(numbers, names):
    if any(numbers[name] is None for name in names):
        return "–"
    return " / ".join(f"{numbers[name]:.0f}" for name in names) + " %"


def measured(run, r):
    """The numbers of a record by name; for every phase its size and its fastest peer."""
    peer, _ = r.best_peer()
    of_phase = MEASURED[r.phase](run, r) if r.phase in MEASURED else {}
    return {"n": r.n, "entries": r.entries, "peer": peer, **of_phase}


def columns(run, r):
    """Headings and words of the columns that a phase has for itself."""
    numbers = measured(run, r)
    return [(head, what(numbers) if callable(what) else text.number(numbers[what]))
            for head, what in COLUMNS.get(r.phase, [])]
