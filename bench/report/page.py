"""The page: what was measured, against what it was to be."""

import bounds
import reasons as explained
import text
from results import OURS, definite, exponent
from targets import TARGETS

FAMILIES = {
    "a": "5-point grids",
    "b": "7-point grids in three dimensions",
    "c": "ratings of lecturers by students (mixed-model equations)",
    "d": "animal models",
    "e": "squares of 5-point grids (13 points)",
    "f": "subjects with six coefficients, ten fixed effects",
}
IN_STEPS = f"{OURS}, in steps"  # the module once more, for the shares of its steps
PHASES = [
    ("assembly", "Assembly",
     "Every contribution entered by itself, up to 64 of which wait for each other in a large matrix; Eigen takes "
     "them all at once. A load is one whose address the load "
     "before gave, over a memory as large as the trees."),
    ("closing", "Closing", "From trees, or from the maps, to compressed rows."),
    ("ordering", "Ordering",
     "Minimum degree here and in AMD, nested dissection in METIS, which is given its graph. The time of an entry "
     "beside that of a dependent load over a memory as large as the graph, both triangles."),
    ("symbolic", "Symbolic factorization",
     "The module's own permutation given to all. CHOLMOD's simplicial analysis counts but leaves the subscripts to the "
     "numeric phase; the supernodal one makes them and is the peer here. Bytes: an entry of A read and written, 32, "
     "the subscripts of U and four words a row."),
    ("numeric", "Numeric factorization",
     "The module's own permutation given to all. Everybody allocates anew in each run, from memory that the run before "
     "has freed: the module's host and the C library of the peers keep it. Bytes: "
     "16 for each entry of U, written and read, and 16 for each of A; the nearest bound is the larger share."),
    ("total", "Order, factor and solve",
     "From a closed matrix to one solution, everybody with orderings of their own. The steps of the module are timed "
     "in runs of their own; without the ordering: the ratio if it took no time at all; the ordering alone: if nothing "
     "else took any."),
    ("solve", "Solves", "With a factor that is there. Bytes: in a pass over the factor, sixteen vectors at "
     "most, the values and the kept subscripts of U twice and five words a row, and three words a row for each "
     "vector. The places of x in the caches: three words an entry of U for each vector."),
    ("inverse", "Diagonal of the inverse",
     "Beside a column by column Takahashi on CHOLMOD's factor, in the same order. Operations: "
     "twice those of the factorization."),
    ("trace", "Trace of an inverse product", "tr(A⁻B), B on the pattern of A."),
    ("refactor", "Refactor loop", "New values on the same pattern. Refilling moves 24 bytes an entry."),
    ("product", "Symmetric product", "From one stored triangle. Bytes: 16 for each entry, and the vectors."),
    ("iteration", "Conjugate gradients", "Time of a step; one stored triangle, diagonal preconditioner. Bytes: those "
     "of the product, and nine words a row."),
    ("dense factor", "Dense factor", "Packed here, full for dpotrf, packed for dpptrf."),
    ("dense inverse", "Dense inverse", "Packed here, full for LAPACK."),
]


def conditions(run):
    m = run.machine
    clock = {"cpu": "processor time of the process", "wall": "the wall's time"}[m["clock"]]
    rows = [
        ["processor", f"{m['processor']}, {m['cores']} cores, one used"],
        ["memory", f"{m['memory'] / 2**30:.0f} GiB"],
        ["system, compiler", f"{m['system']}, GCC {m['compiler']}"],
        ["module", f"commit {m['commit']}"],
        ["peers", f"CHOLMOD {m['cholmod']}, METIS {m['metis']}, Eigen {m['eigen']}, {m['openblas'].strip()}"],
        ["OpenBLAS kernels", m["kernels"]],
        ["dgemm, order 2000", f"{span(run, 'dgemm')} GFLOP/s"],
        ["copy, read and written", f"{span(run, 'copy')} GB/s"],
        ["a dependent load", latencies(m)],
        ["an addition to a scattered place", latencies(m, "scattered")],
        ["adding one vector to another", f"{m['update'] / 1e9:.0f} GB/s within 1 MB" if "update" in m else "–"],
        ["load when a run began", f"{span(run, 'load', 1.0)} (one minute)"],
        ["clock", clock],
    ]
    return text.table(["", ""], rows, left=2)


def span(run, name, unit=1e9):
    """Of the runs that the page is put together from."""
    values = [machine[name] / unit for machine in run.machines]
    least, most = f"{min(values):.1f}", f"{max(values):.1f}"
    return least if least == most else f"{least} to {most}"


def latencies(machine, of="latency"):
    points = [f"{text.number(p['seconds'] * 1e9)} ns over {p['bytes'] / 2**20:.3g} MB" for p in machine.get(of, [])]
    return ", ".join(points) or "–"


def together(run):
    """A sentence when the page has more than one run."""
    count = len(run.machines)
    return "" if count == 1 else (f"Put together from {count} runs of the program; every result is held to the rates "
                                  "that were measured when its own run began.\n\n")


def disturbed(run):
    """A sentence when the machine was not ours alone."""
    if max(machine["load"] for machine in run.machines) <= 0.7:
        return ""
    return ("**The machine was busy with other work during this run** (see the load below). Processor time leaves out "
            "the time of others but not what they did to caches and memory, so ratios here are worth less than those "
            "of a quiet run.\n\n")


def shown(verdict, target):
    need = ("at most " if verdict.at_most else "at least ") + text.number(verdict.required) + " " + target.unit
    return f"{text.number(verdict.measured)} {target.unit}, {need}"


def without_time(verdicts):
    """How many have no time of ours, with the reason of the last: those must not look as if nobody had asked."""
    missing = [v for v in verdicts if not v.known and OURS in v.result.times and v.result.ours() is None]
    if not missing:
        return ""
    record = missing[-1].result.times[OURS]
    return f"**no time** in {len(missing)} of {len(verdicts)} ({record.get('wrong') or record.get('not_run')})"


def overview(run):
    rows = []
    for target in TARGETS:
        verdicts = target.judge(run)
        known = [v for v in verdicts if v.known]
        families = ", ".join(target.families)
        missing = without_time(verdicts)
        if not known:
            rows.append([target.phase, families, target.text, missing or "not measured", ""])
            continue
        worst = max(known, key=lambda v: v.shortfall)
        met = sum(v.met for v in known)
        outcome = "met" if met == len(known) else f"**missed** in {len(known) - met} of {len(known)}"
        rows.append([target.phase, families, target.text, ", ".join(filter(None, (outcome, missing))),
                     f"{worst.result.family} {worst.result.case}: {shown(worst, target)}"])
    return text.table(["phase", "families", "target", "outcome", "worst case"], rows, left=5)


def misses(run, reasons):
    """Every missed target with its reason, when somebody has written one down."""
    lines = []
    for target in TARGETS:
        missed = [v for v in target.judge(run) if v.known and not v.met]
        for family in sorted({v.result.family for v in missed}):
            worst = max((v for v in missed if v.result.family == family), key=lambda v: v.shortfall)
            lines.append(f"- {target.phase}, {family} ({worst.result.case}), {target.text}: {shown(worst, target)}. "
                         + explained.sentence(run, worst.result, reasons))
    return "\n".join(lines) + "\n" if lines else "None.\n"


def headings(rows):
    """Every heading once, in the order of their columns."""
    return list(dict.fromkeys(head for row in rows for head, _ in row))


def phase_table(run, phase):
    results = run.of(phase)
    names = []
    for r in results:
        names += [n for n in r.times if n not in names]
    names.sort(key=lambda name: not name.startswith(OURS))
    variants = any(r.variant for r in results)
    added = [bounds.columns(run, r) for r in results]
    head = ["family", "case"] + (["variant"] if variants else []) + ["n", "entries"] + names
    head += ["faster than the best by"] + headings(added)
    rows = []
    for r, own in zip(results, added):
        peers = ("CHOLMOD supernodal",) if phase == "symbolic" else ("std::map",) if phase == "assembly" else None
        row = [r.family, r.case] + ([r.variant] if variants else []) + [text.count(r.n), text.count(r.entries)]
        row += [text.time_of(r, name) for name in names] + [text.number(r.ratio(peers))]
        rows.append(row + [dict(own).get(name, "–") for name in headings(added)])
    return text.table(head, rows, left=3 if variants else 2)


def wrong_results(run):
    lines = [f"- {r.phase} {r.variant}, {r.family} {r.case}, {name}: {record['wrong']}"
             for r in run.results for name, record in r.times.items() if "wrong" in record]
    return "\n".join(lines) + "\n" if lines else "None: every result was checked, and right.\n"


def memory_table(run):
    rows = []
    for r in run.of("memory"):
        f = r.facts
        if "peak" not in f:
            rows.append([r.family, r.case, text.count(r.n), "", "not run", "", ""])
            continue
        rows.append([r.family, r.case, text.count(r.n), text.count(f["factor_entries"]), f"{f['peak'] / 1e6:,.1f}",
                     f"{f['bound'] / 1e6:,.1f}", text.number(f["peak"] / f["bound"])])
    return text.table(["family", "case", "n", "entries of U", "peak, MB", "bound, MB", "peak / bound"], rows, left=2)


def rank_table(run):
    rows = []
    for r in run.of("rank"):
        f = r.facts
        if "rank" not in f:
            rows.append([r.case, text.count(r.n), "not run", "", "", "", ""])
            continue
        rows.append([r.case, text.count(r.n), text.count(f["rank"]), text.count(f["expected"]),
                     text.count(f["plain_rank"]), text.number(f["largest_dropped"]),
                     text.number(f["smallest_accepted"])])
    return text.table(["case", "n", "rank", "known", "of a plain factorization",
                       "largest dropped pivot / bound", "smallest accepted / bound"], rows)


def series(run, family, phase, variant=""):
    """For each program its (n, seconds); only the systems that peers can do."""
    lines = {}
    for r in run.of(phase, (family,), variant):
        if not definite(r):
            continue
        for name in r.times:
            if r.seconds(name) and name != IN_STEPS:
                lines.setdefault(name, []).append((r.n, r.seconds(name)))
    return lines


SCALING = [("ordering", ""), ("symbolic", ""), ("numeric", ""), ("total", ""), ("solve", "1 right-hand side"),
           ("inverse", "")]


def scaling_table(run):
    rows = []
    for family in FAMILIES:
        row = [family]
        for phase, variant in SCALING:
            lines = series(run, family, phase, variant)
            ours = exponent(lines.get(OURS, []))
            best = {}
            for name, points in lines.items():
                for n, s in points if not name.startswith(OURS) else []:
                    best[n] = min(s, best.get(n, s))
            row.append(f"{text.number(ours)} ({text.number(exponent(best.items()))})")
        rows.append(row)
    return text.table(["family"] + [p for p, _ in SCALING], rows)
