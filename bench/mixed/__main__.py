"""Fits mixed models with qxsm and with R, one process a fit, and writes the page of times, memory and agreement.

    python3 bench/mixed --qxsm build/release/bin/qxsm [--quick] [--job crossed,growth] [--add] FOLDER

Data and results.jsonl go to build/bench/mixed, the page performance-mixed.md to FOLDER. --add keeps the results that
are there; what is measured again takes their place. Exits 1 when an answer was wrong."""

import argparse
import dataclasses
import json
import os
import subprocess
import sys
import tempfile

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.append(os.path.join(os.path.dirname(HERE), "report"))

import answers  # noqa: E402
import fits_page  # noqa: E402
import machine  # noqa: E402
from jobs import HERE as SCRIPTS, JOBS, OURS  # noqa: E402
from process import measured  # noqa: E402

LONG = 60.0  # seconds of a fit that is not repeated


class Race:
    """One job: the programs in turns, then their answers side by side."""

    def __init__(self, job, options, scratch):
        self.job, self.options, self.scratch = job, options, scratch
        self.runs, self.answers, self.wrong = {}, {}, {}

    def commands(self):
        yield OURS, self.job.ours(self.options.qxsm, self.options.work, self.options.quick)
        if self.job.peer:
            yield self.job.peer, self.job.theirs(self.answer_file(), self.options.work, self.options.quick)

    def answer_file(self):
        return os.path.join(self.scratch, "answer.json")

    def fit(self, name, command):
        run = measured(command, self.scratch, self.options.longest)
        print(f"{self.job.name:8} {name:9} {run.cpu:8.2f} s of processor, {run.wall:8.2f} s, {run.peak / 2**20:8.0f} MiB",
              file=sys.stderr, flush=True)
        if run.status not in ((0, 1) if name == OURS else (0,)):
            stopped = f"stopped after {run.wall:.0f} s" if run.wall >= self.options.longest else ""
            self.wrong[name] = stopped or f"exit code {run.status}: {run.errors.strip()[-300:] or run.output[-300:]}"
            return
        self.runs.setdefault(name, []).append(run.times())
        if name == OURS:
            self.answers[name] = answers.ours(run.output)
        else:
            with open(self.answer_file(), encoding="utf-8") as file:
                self.answers[name] = answers.theirs(file.read())

    def all_rounds(self):
        for _ in range(1 if self.options.quick else self.options.rounds):
            for name, command in self.commands():
                if name not in self.wrong and not any(r["cpu"] > LONG for r in self.runs.get(name, [])):
                    self.fit(name, command)
        self.compare()

    def compare(self):
        ours, theirs = self.answers.get(OURS), self.answers.get(self.job.peer)
        if ours and ours.doubt:
            self.wrong[OURS] = ours.doubt
        if ours and theirs:
            about_ours, about_theirs = answers.judged(ours, theirs, self.certificate(ours))
            self.wrong |= {n: w for n, w in ((OURS, about_ours), (self.job.peer, about_theirs)) if w}

    def certificate(self, ours):
        """lme4's criterion at our parameters; the animal model's script has nothing like it."""
        if self.job.peer != "lme4.R":
            return None
        script = os.path.join(SCRIPTS, "lme4_criterion.R")
        command = ["Rscript", "--vanilla", script, self.job.files(self.options.work, self.options.quick)[0],
                   self.job.formula] + [repr(t) for t in ours.theta]
        run = measured(command, self.scratch, self.options.longest)
        return float(run.output) if run.status == 0 else float("nan")

    def records(self):
        for name, _ in self.commands():
            answer = self.answers.get(name)
            yield {"job": self.job.name, "quick": self.options.quick, "program": name, "runs": self.runs.get(name, []),
                   "wrong": self.wrong.get(name, ""), "answer": dataclasses.asdict(answer) if answer else None}


def make_data(job, options):
    if all(os.path.exists(f) for f in job.files(options.work, options.quick)):
        return
    size = str(job.quick_size if options.quick else job.size)
    # A process of its own: what this one holds would count as memory of the fits.
    subprocess.run([sys.executable, "-B", os.path.join(SCRIPTS, "data.py"), job.data, size, options.work], check=True)


def parsed():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--qxsm", required=True)
    parser.add_argument("--quick", action="store_true", help="small data, one round")
    parser.add_argument("--job", default=",".join(j.name for j in JOBS), help="some of " + ", ".join(j.name for j in JOBS))
    parser.add_argument("--rounds", type=int, default=3)
    parser.add_argument("--add", action="store_true", help="keep earlier results")
    parser.add_argument("--longest", type=float, default=3600.0, help="seconds after which a fit is stopped")
    parser.add_argument("--work", default=os.path.join("build", "bench", "mixed"))
    parser.add_argument("folder")
    options = parser.parse_args()
    options.jobs = [j for j in JOBS if j.name in options.job.split(",")]
    if len(options.jobs) != len(options.job.split(",")):
        parser.error(f"--job: found {options.job}, expected some of {', '.join(j.name for j in JOBS)}")
    return options


def main():
    options = parsed()
    os.makedirs(options.work, exist_ok=True)
    results = os.path.join(options.work, "results.jsonl")
    wrong = False
    with open(results, "a" if options.add else "w", encoding="utf-8") as file:
        file.write(json.dumps({"machine": machine.described()}) + "\n")
        for job in options.jobs:
            make_data(job, options)
            with tempfile.TemporaryDirectory() as scratch:
                race = Race(job, options, scratch)
                race.all_rounds()
                file.writelines(json.dumps(r) + "\n" for r in race.records())
                file.flush()
                wrong = wrong or bool(race.wrong)
                for name, text in race.wrong.items():
                    print(f"{job.name}, {name}: {text}", file=sys.stderr)
    os.makedirs(options.folder, exist_ok=True)
    fits_page.write(results, options.folder)
    sys.exit(1 if wrong else 0)


if __name__ == "__main__":
    main()
