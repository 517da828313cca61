"""What is fitted, by whom, and what is asked of it."""

import os
from dataclasses import dataclass

HERE = os.path.dirname(os.path.abspath(__file__))
OURS = "qxsm"


@dataclass(frozen=True)
class Job:
    name: str
    data: str  # of data.py
    size: int
    quick_size: int
    title: str
    formula: str
    peer: str = ""  # a script beside this file
    pedigree: bool = False
    times_faster: float = 0.0  # the goals: over the peer, seconds, bytes
    seconds: float = 0.0
    bytes: float = 0.0

    def files(self, folder, quick):
        """The data, and the pedigree if there is one."""
        size = self.quick_size if quick else self.size
        names = [f"{self.data}-{size}.csv"] + ([f"pedigree-{size}.csv"] if self.pedigree else [])
        return [os.path.join(folder, name) for name in names]

    def ours(self, qxsm, folder, quick):
        files = self.files(folder, quick)
        command = [qxsm, "reml" if self.pedigree else "lmm", files[0], self.formula, "--json", "--quiet"]
        return command + (["--pedigree", files[1]] if self.pedigree else [])

    def theirs(self, answer, folder, quick):
        files = self.files(folder, quick)
        command = ["Rscript", "--vanilla", os.path.join(HERE, self.peer)]
        return command + (files if self.pedigree else [files[0], self.formula]) + [answer]


ANIMAL = "yield ~ 0 + herdyear + (1 | animal; pedigree)"
JOBS = [
    Job("crossed", "crossed", 70_000, 7_000, "70,000 ratings of 1,100 lecturers by 3,000 students",
        "rating ~ service + department + studage + lectage + (1 | student) + (1 | lecturer)", "lme4.R",
        times_faster=10.0),
    Job("growth", "growth", 300_000, 12_000, "300,000 measurements of 50,000 pupils in 500 schools",
        "score ~ age * sex + (age | school/pupil)", "lme4.R", times_faster=10.0),
    Job("animal", "animal", 200_000, 5_000, "200,000 animals, records on 60 %", ANIMAL, "animal.R", pedigree=True),
    Job("million", "animal", 1_000_000, 20_000, "1,000,000 animals, records on 60 %", ANIMAL, pedigree=True,
        seconds=600.0, bytes=12e9),
]
