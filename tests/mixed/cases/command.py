"""From a case to the command line that answers it."""

import json
import re
import subprocess
from pathlib import Path

from tables import Table, in_order, is_integer, is_number, permutation


class CommandFailed(Exception):
    """The command did not answer with what was asked for."""


def run(program, arguments, expect=0):
    """The JSON object that the command prints."""
    done = subprocess.run([program, *arguments], capture_output=True, text=True, timeout=600, check=False)
    if done.returncode != expect:
        shown = " ".join(f"'{a}'" if re.search(r"[^\w./=+-]", a) else a for a in arguments)
        raise CommandFailed(f"exit code {done.returncode} of qxsm {shown}\n{done.stderr.strip()}")
    return json.loads(done.stdout)


def split_formula(formula):
    """The fixed part, and [(coefficients, group, structure)] of the random terms."""
    terms = [
        (coefs.strip(), group.strip(), structure.strip() if structure else None)
        for coefs, group, structure in re.findall(r"\(([^()|]*)\|([^();]*)(?:;([^()]*))?\)", formula)
    ]
    return re.sub(r"\([^()]*\|[^()]*\)", "", formula), terms


class Data:
    """The table of a case with its pedigree, as they are or shuffled, in files of their own."""

    def __init__(self, case, folder, work, seed=None):
        self.case = case
        self.fixed, self.terms = split_formula(case["model"]["formula"])
        self.table = Table.read(folder / case["data"]["file"])
        self.pedigree = None
        if "pedigree" in case:
            self.pedigree = Table.read(folder / case["pedigree"]["file"])
        self.renaming = {}  # {column: {old: new}}
        self.orders = self.declared_orders()
        if seed is not None:
            self.shuffle(seed)
        tag = "plain" if seed is None else f"shuffled{seed}"
        self.path = work / f"{case['id']}_{tag}.csv"
        self.table.write(self.path)
        if self.pedigree:
            self.pedigree_path = work / f"{case['id']}_{tag}_pedigree.csv"
            self.pedigree.write(self.pedigree_path)

    def fixed_factors(self):
        """Columns of the fixed part that are factors."""
        words = set(re.findall(r"[A-Za-z_.][\w.]*", self.fixed.split("~")[1]))
        declared = self.case["data"].get("columns", {})
        return [
            column
            for column in self.table.header
            if column in words
            and (
                declared.get(column, {}).get("type") == "factor"
                or (column not in declared and not all(is_number(v) for v in self.table.values(column)))
            )
        ]

    def declared_orders(self):
        """{column: levels} of the factors of the fixed part, in the order that the answers have."""
        declared = self.case["data"].get("columns", {})
        return {
            column: declared.get(column, {}).get("levels") or in_order(self.table.values(column))
            for column in self.fixed_factors()
        }

    def shuffle(self, seed):
        """Deals the labels of every factor out again, and the rows."""
        tied = {group for _, group, structure in self.terms if structure == "pedigree"}
        columns = set(self.orders) | {g for _, group, _ in self.terms for g in group.split(":")}
        for k, column in enumerate(sorted(columns - tied)):
            self.renaming[column] = permutation(in_order(self.table.values(column)), seed + k)
        if self.pedigree:
            names = permutation(in_order(self.pedigree.values("id")), seed + 100)
            self.renaming |= {column: names for column in tied}
            self.pedigree = self.pedigree.shuffled(seed, {c: names for c in self.pedigree.header[:3]})
        self.table = self.table.shuffled(seed, self.renaming)
        self.orders = {
            column: [self.renaming[column][level] for level in levels] for column, levels in self.orders.items()
        }

    def arguments(self):
        """What the command is told of the data."""
        given = []
        numeric = [c for c, levels in self.orders.items() if all(is_number(level) for level in levels)]
        if numeric:
            given += ["--factor", ",".join(numeric)]
        for column, levels in self.orders.items():
            if levels != in_order(levels):
                given += ["--levels", f"{column}={','.join(levels)}"]
        if self.pedigree:
            given += ["--pedigree", str(self.pedigree_path)]
        return given

    def coefficient(self, name):
        """What a column of X is called with the labels dealt out again."""
        parts = []
        for part in name.split(":"):
            for column, levels in self.renaming.items():
                if part.startswith(column) and part[len(column):] in levels:
                    part = column + levels[part[len(column):]]
                    break
            parts.append(part)
        return ":".join(parts)

    def level(self, group, label):
        """What a level of a grouping factor is called, as `coefficient`."""
        columns = group.split(":")
        parts = label.split(":") if len(columns) > 1 else [label]
        return ":".join(self.renaming.get(c, {}).get(p, p) for c, p in zip(columns, parts))


def signed(weight, what):
    return f"{'- ' if weight < 0 else '+ '}{abs(weight)!r}*{what}"


def contrast_arguments(fit, columns, data):
    """--test for each contrast of a fit, first all of them by columns of X, then all by cells."""
    given = []
    for k, contrast in enumerate(fit.get("contrasts", [])):
        terms = [signed(w, data.coefficient(name)) for w, name in zip(contrast["L"], columns) if w != 0]
        given += ["--test", f"c{k}: " + " ".join(terms).removeprefix("+ ")]
    for k, contrast in enumerate(fit.get("contrasts", [])):
        cells = []
        for cell in contrast["cells"]:
            at = ", ".join(f"{column}={data.level(column, str(value))}" for column, value in cell["at"].items())
            cells.append(signed(cell["weight"], f"at({at})"))
        given += ["--test", f"d{k}: " + " ".join(cells).removeprefix("+ ")]
    return given


def fit_arguments(case, method, data):
    """The whole line for a fit by REML or ML, without a start."""
    subcommand = {"lmm": "lmm", "animal_reml": "reml", "blup": "blup"}[case["kind"]]
    given = [subcommand, str(data.path), case["model"]["formula"], *data.arguments(), "--json"]
    if method == "ML":
        given.append("--ml")
    if case["kind"] == "blup":
        for name, value in case["model"]["variances"].items():
            given += ["--var", f"{name}={value!r}"]
        return given
    columns = case["model"]["fixed_columns"]
    return given + contrast_arguments(case["fits"][method], columns, data)


def scaled_start(fit, path, scale):
    """Writes the fit with every theta changed by scale(its number)."""
    start = dict(fit)
    start["theta"] = [theta * scale(k) for k, theta in enumerate(fit["theta"])]
    Path(path).write_text(json.dumps(start), encoding="utf-8")
    return str(path)
