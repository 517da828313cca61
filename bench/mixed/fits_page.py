"""The page of the fits."""

import json
import os
import statistics

import text
from jobs import HERE, JOBS, OURS

PEERS = {"lme4.R": "lme4", "animal.R": "R's Matrix"}


class Results:
    """Of a job and program, the last record counts."""

    def __init__(self, path):
        self.machine, self.records = {}, {}
        with open(path, encoding="utf-8") as file:
            for line in file:
                record = json.loads(line)
                if "machine" in record:
                    load = max(record["machine"]["load"], self.machine.get("load", 0.0))
                    self.machine = record["machine"] | {"load": load}
                else:
                    self.records[record["job"], record["program"]] = record

    def of(self, job, program):
        return self.records.get((job.name, program))

    def median(self, job, program, what):
        """None for a wrong answer: it has neither time nor memory."""
        record = self.of(job, program)
        if not record or record["wrong"] or not record["runs"]:
            return None
        return statistics.median(run[what] for run in record["runs"])

    def ratio(self, job, what):
        mine, other = self.median(job, OURS, what), self.median(job, job.peer, what)
        return other / mine if mine and other else None


def explanations():
    """Why a goal is missed: lines "job: reason"."""
    with open(os.path.join(HERE, "explanations.txt"), encoding="utf-8") as file:
        pairs = (line.strip().partition(": ") for line in file if not line.startswith("#"))
        return {key: reason for key, colon, reason in pairs if colon}


def conditions(results):
    m = results.machine
    versions = {r["answer"]["facts"]["version"] for r in results.records.values()
                if r["answer"] and "version" in r["answer"]["facts"]}
    rows = [["processor", f"{m['processor']}, {m['cores']} cores, one used"],
            ["memory", f"{m['memory'] / 2**30:.0f} GiB"], ["system", m["system"]], ["qxsm", f"commit {m['commit']}"],
            ["R", ", ".join([m["r"]] + sorted(versions))], ["load when the run began", f"{m['load']:.1f} (one minute)"]]
    return text.table(["", ""], rows, left=2)


def disturbed(results):
    if results.machine["load"] <= 0.7:
        return ""
    return ("**The machine was busy with other work during this run** (see the load below). The wall's times mean "
            "little then; processor time leaves out the time of others, but not what they did to caches and memory.\n")


def goals(results, job):
    """Pairs: a goal and what was measured; whether it was met."""
    lines = []
    if job.times_faster:
        ratio = results.ratio(job, "cpu")
        lines.append((f"{job.times_faster:g} times faster than {PEERS[job.peer]}", ratio and f"{text.number(ratio)} times",
                      ratio is not None and ratio >= job.times_faster))
    for what, limit, shown in (("cpu", job.seconds, text.seconds),
                               ("peak", job.bytes, lambda b: f"{text.number(b / 1e9)} GB")):
        if limit:
            value = results.median(job, OURS, what)
            lines.append((f"at most {shown(limit)}", value and shown(value), value is not None and value <= limit))
    return lines


def overview(results):
    rows = []
    for job in JOBS:
        record = results.of(job, OURS)
        for goal, measured, met in goals(results, job):
            outcome = "not measured" if not record else "no time" if not measured else "met" if met else "**missed**"
            small = " (small data)" if record and record["quick"] else ""
            rows.append([job.name + small, goal, measured or "–", outcome])
    return text.table(["fit", "goal", "measured", "outcome"], rows, left=4)


def sentence(reason):
    return f"{reason[0].upper()}{reason[1:]}."


def misses(results):
    reasons = explanations()
    lines = [f"- {job.name}: {goal}: {measured or 'no time'}. {sentence(reasons.get(job.name, 'not explained yet'))}"
             for job in JOBS if results.of(job, OURS)
             for goal, measured, met in goals(results, job) if not met]
    return "\n".join(lines) + "\n" if lines else "None.\n"


def side_by_side(results):
    rows = []
    for job in JOBS:
        for program in filter(None, (OURS, job.peer)):
            record = results.of(job, program)
            if not record:
                continue
            name = PEERS.get(program, program)
            if record["wrong"] or not record["runs"]:
                rows.append([job.name, name] + ["wrong" if record["answer"] else "failed"] + [""] * 5)
                continue
            ratio = results.ratio(job, "cpu") if program != OURS else None
            rows.append([job.name, name, text.seconds(results.median(job, program, "cpu")),
                         text.seconds(results.median(job, program, "wall")), f"{len(record['runs'])}",
                         f"{results.median(job, program, 'peak') / 1e6:,.0f} MB", f"{record['answer']['steps']}",
                         text.number(ratio) if ratio else ""])
    head = ["fit", "program", "processor time", "wall time", "runs", "peak memory", "iterations or evaluations",
            "times slower than qxsm"]
    return text.table(head, rows, left=2)


def agreement(results):
    rows = []
    for job in JOBS:
        mine, other = results.of(job, OURS), results.of(job, job.peer)
        if not mine or not mine["answer"]:
            continue
        verdict = "; ".join(f"{PEERS.get(r['program'], r['program'])}: {r['wrong']}"
                            for r in (mine, other) if r and r["wrong"])
        theirs = other["answer"]["criterion"] if other and other["answer"] else None
        above = "–" if theirs is None else f"{theirs - mine['answer']['criterion']:+.2g}"
        verdict = verdict or ("agree" if other else "converged; nobody to compare with")
        warned = "; ".join(other["answer"]["facts"]["messages"]) if other and other["answer"] else ""
        warned = warned.replace("|", "\\|")
        rows.append([job.name, verdict, f"{mine['answer']['criterion']:.4f}", above, warned])
    return text.table(["fit", "answers", "our criterion", "the other's, above ours", "its messages"], rows, left=2)


def models(results):
    rows = []
    for job in JOBS:
        record = results.of(job, OURS)
        if record and record["answer"]:
            facts = record["answer"]["facts"]
            title = job.title if not record["quick"] else f"small data ({job.quick_size:,}) like {job.title}"
            rows.append([job.name, title, f"`{job.formula}`".replace("|", "\\|"), text.count(facts["order"]),
                         text.count(facts["entries"]), text.count(facts["factor_entries"])])
    return text.table(["fit", "data", "model", "equations", "entries", "in the factor"], rows, left=3)


def write(path, folder):
    results = Results(path)
    parts = [
        "# Performance of mixed models\n",
        "Written by `bench/mixed/run`; not edited by hand. Whole fits by REML, each in a process of its own on one "
        "thread: starting, reading the CSV files, fitting, and printing the summary. Times are medians where a fit ran "
        "more than once. An answer that is wrong has no time.\n",
        disturbed(results) + "\n" + conditions(results),
        "## Goals\n", overview(results),
        "## Where they are missed\n", misses(results),
        "## Side by side\n",
        "`qxsm` also computes what lme4 is not asked for here: standard errors of variances, Satterthwaite degrees of "
        "freedom, and standard errors of prediction of every random effect. R's Matrix is given the same equations as "
        "qxsm: its script builds A⁻¹ with inbreeding from the pedigree, analyses the factor once, updates it for each "
        "variance ratio, and minimises by `optimize()`; it computes no standard errors.\n",
        side_by_side(results),
        "## Answers\n",
        "Criteria within 1e-4 of their size and ours not above, variances within 1e-3, fixed effects within a hundredth "
        "of a standard error. For lme4's models, lme4 also evaluates its own criterion at our variances, which must be "
        "ours to 1e-8 of its size.\n",
        agreement(results),
        "## The fits\n", models(results),
    ]
    with open(os.path.join(folder, "performance-mixed.md"), "w", encoding="utf-8") as file:
        file.write("\n".join(parts))
