"""Fits every case of a folder with the command and compares every number with the stored answers.

usage: python3 tests/mixed/cases QXSM [CASE ...]

The folder is named by QXESM_CASES; without it, everything is skipped (exit code 77). It holds tables, and a JSON file
of schema mixed-case/1 for each case. Each is fitted as it is, with rows and labels shuffled, and from three starting
points. Printed are, per case, the worst errors as parts of their tolerances.
"""

import json
import os
import sys
import tempfile
from pathlib import Path

from command import CommandFailed, Data, fit_arguments, run, scaled_start
from compare import FitComparison, Ledger
from other_kinds import compare_blup, compare_field, compare_map, compare_pedigree
from tables import Table, permutation

SKIPPED = 77
COLUMNS = (
    *("criterion", "varcomp", "se_observed", "se_average", "ratio se"),
    *("fixef", "se", "df", "contrast", "ranef", "pev_sd"),
)
SEED = 20240

STARTS = {
    "start*0.1": lambda k: 0.1,
    "start*5": lambda k: 5.0,
    "start+-": lambda k: (1.7, 0.45, 1.3, 0.6)[k % 4],
}


class Suite:
    def __init__(self, program, folder, work):
        self.program = program
        self.folder = folder
        self.work = work
        self.bad = 0
        self.runs = 0
        self.numbers = 0
        self.worst = {}  # {case: {quantity: error as a part of its tolerance}}

    def attempt(self, name, compare):
        """Runs compare(ledger) and prints a line."""
        ledger = Ledger()
        self.runs += 1
        try:
            compare(ledger)
        except (CommandFailed, KeyError, IndexError, TypeError, ValueError, StopIteration) as error:
            self.bad += 1
            print(f"FAIL {name}: {type(error).__name__}: {error}", flush=True)
            return
        self.numbers += ledger.count
        row = self.worst.setdefault(name.split()[0], {})
        for quantity, ratio in ledger.worst.items():
            column = quantity if quantity in COLUMNS else "other"
            row[column] = max(row.get(column, 0.0), ratio)
        failed = ledger.failed()
        if not ledger.count or failed:
            self.bad += 1
        shown = sorted(ledger.worst.items(), key=lambda item: -item[1])
        worst = ", ".join(f"{quantity} {ratio:.2g}" for quantity, ratio in shown[:6])
        print(f"{'FAIL' if failed else 'ok  '} {name}: {ledger.count} numbers; {worst}", flush=True)
        for quantity in failed:
            print(f"       {quantity}: {ledger.worst[quantity]:.3g} times what is allowed at {ledger.places[quantity]}")

    def table(self):
        """The worst errors of each case over all of its runs."""
        columns = (*COLUMNS, "other")
        print("\nworst error / tolerance over all runs of a case")
        print(f"{'case':<18}" + "".join(f"{column:>12}" for column in columns))
        for case, row in self.worst.items():
            cells = [f"{row[c]:.1e}" if c in row else "" for c in columns]
            print(f"{case:<18}" + "".join(f"{cell:>12}" for cell in cells))
        print()

    def fits(self, case):
        for method in case["fits"]:
            name = f"{case['id']} {method}"
            plain = Data(case, self.folder, self.work)
            found = {}

            def fit(ledger, data=plain, start=None, method=method, found=found):
                arguments = fit_arguments(case, method, data)
                answer = run(self.program, arguments + (["--start", start] if start else []))
                found.setdefault("first", answer)
                FitComparison(case, method, data, ledger).compare(answer)

            self.attempt(name, fit)
            shuffled = Data(case, self.folder, self.work, SEED)
            self.attempt(f"{name} shuffled", lambda ledger, d=shuffled, f=fit: f(ledger, data=d))
            if "first" not in found:
                continue
            for start, scale in STARTS.items():
                path = scaled_start(found["first"], self.work / "start.json", scale)
                self.attempt(f"{name} {start}", lambda ledger, p=path, f=fit: f(ledger, start=p))

    def blup(self, case):
        for seed in (None, SEED):
            data = Data(case, self.folder, self.work, seed)
            self.attempt(
                case["id"] + (" shuffled" if seed else ""),
                lambda ledger, d=data: compare_blup(
                    case, run(self.program, fit_arguments(case, "REML", d)), d, ledger
                ),
            )

    def ainv(self, case):
        table = Table.read(self.folder / case["pedigree"]["file"])
        ids = table.values("id")
        path = self.folder / case["pedigree"]["file"]
        self.attempt(case["id"], lambda ledger: compare_pedigree(case, self.program, path, ids, self.work, ledger))
        names = permutation(ids, SEED)
        shuffled = self.work / "shuffled_pedigree.csv"
        table.shuffled(SEED, {column: names for column in table.header[:3]}).write(shuffled)
        self.attempt(
            case["id"] + " shuffled",
            lambda ledger: compare_pedigree(
                case, self.program, shuffled, [names[i] for i in ids], self.work, ledger
            ),
        )

    def gmrf(self, case):
        matrix = self.folder / case["data"]["file"]
        self.attempt(case["id"], lambda ledger: compare_field(case, self.program, matrix, self.work, ledger))
        formula = "lsmr ~ 1 + (1 | district; structure)"
        as_case = {"id": case["id"], "model": {"formula": formula}, "data": {"file": case["map_model"]["data"]["file"]}}
        for seed in (None, SEED):
            data = Data(as_case, self.folder, self.work, seed)
            # The ids of the rows of the matrix.
            ids = self.work / "ids.txt"
            labels = [data.level("district", str(k + 1)) for k in range(case["data"]["rows"])]
            ids.write_text("".join(label + "\n" for label in labels), encoding="utf-8")
            arguments = ["reml", str(data.path), formula, "--kinv", f"structure={matrix}", "--json"]
            arguments += ["--ids", f"structure={ids}"] if seed else []
            self.field_fits(case, data, arguments, " shuffled" if seed else "")

    def field_fits(self, case, data, arguments, suffix):
        found = {}

        def fit(ledger, more=()):
            answer = run(self.program, arguments + list(more))
            found.setdefault("first", answer)
            compare_map(case, answer, data, ledger)

        self.attempt(f"{case['id']} map{suffix}", fit)
        if suffix or "first" not in found:
            return
        for start, scale in STARTS.items():
            path = scaled_start(found["first"], self.work / "start.json", scale)
            self.attempt(f"{case['id']} map {start}", lambda ledger, p=path: fit(ledger, ["--start", p]))


def main(arguments):
    folder = os.environ.get("QXESM_CASES")
    if not folder:
        print("skipped: QXESM_CASES names no folder of reference cases")
        return SKIPPED
    program, *chosen = arguments
    cases = [json.loads(path.read_text(encoding="utf-8")) for path in sorted(Path(folder).glob("*.json"))]
    cases = [case for case in cases if not chosen or case["id"] in chosen]
    left_out = 0
    with tempfile.TemporaryDirectory() as work:
        suite = Suite(program, Path(folder), Path(work))
        fits, others = ("lmm", "animal_reml"), {"blup": suite.blup, "ainv": suite.ainv, "gmrf": suite.gmrf}
        kinds = {kind: suite.fits for kind in fits} | others
        for case in cases:
            if case["kind"] in kinds:
                kinds[case["kind"]](case)
            else:
                left_out += 1
                print(f"left out {case['id']}: no command answers cases of kind {case['kind']}")
        suite.table()
    print(
        f"{len(cases) - left_out} cases, {left_out} left out; {suite.runs} runs, {suite.numbers} numbers compared; "
        f"{suite.bad} runs failed"
    )
    return 1 if suite.bad or not suite.runs else 0


if __name__ == "__main__":
    sys.exit(main(sys.argv[1:]))
