"""Tests of the parts of the benchmark of mixed models: python3 test_mixed.py"""

import csv
import dataclasses
import json
import os
import sys
import tempfile
import unittest

HERE = os.path.dirname(os.path.abspath(__file__))
sys.path.append(os.path.join(os.path.dirname(HERE), "report"))

import answers  # noqa: E402
import data  # noqa: E402
import fits_page  # noqa: E402
from answers import Answer  # noqa: E402
from jobs import JOBS, OURS  # noqa: E402
from process import measured  # noqa: E402

MACHINE = {"machine": {"processor": "p", "cores": 1, "memory": 1, "system": "s", "load": 0.0, "commit": "0", "r": "R"}}
OURS_RIGHT = Answer(1000.0, [4.0, 1.0], [2.0], [0.1], [2.0], scales=[4.0, 1.0])


def table(path):
    with open(path, encoding="ascii") as file:
        return list(csv.DictReader(file))


class Data(unittest.TestCase):
    def written(self, name, size):
        with tempfile.TemporaryDirectory() as folder:
            data.WRITERS[name](size, folder)
            return {f: table(os.path.join(folder, f)) for f in sorted(os.listdir(folder))}

    def test_the_same_seed_gives_the_same_data(self):
        self.assertEqual(self.written("animal", 1300), self.written("animal", 1300))

    def test_ratings_have_three_students_and_about_a_lecturer_for_seventy(self):
        (rows,) = self.written("crossed", 7000).values()
        self.assertEqual((len(rows), len({r["student"] for r in rows})), (7000, 300))
        self.assertTrue(100 <= len({r["lecturer"] for r in rows}) <= 110)

    def test_a_pupil_has_one_school_and_one_sex_and_all_records_are_there(self):
        (rows,) = self.written("growth", 3000).values()
        self.assertEqual(len(rows), 3000)
        self.assertEqual(len({(r["pupil"], r["school"], r["sex"]) for r in rows}), 500)

    def test_parents_are_older_and_most_animals_have_records(self):
        files = self.written("animal", 2400)
        records, pedigree = files["animal-2400.csv"], files["pedigree-2400.csv"]
        for row in pedigree:
            for parent in (row["sire"], row["dam"]):
                self.assertTrue(not parent or int(parent) < int(row["id"]))
        self.assertTrue(0.55 < len(records) / len(pedigree) < 0.65)
        self.assertGreater(sum(bool(row["sire"]) for row in pedigree), 1000)


class Measuring(unittest.TestCase):
    def run_python(self, code, longest=60.0):
        with tempfile.TemporaryDirectory() as folder:
            return measured([sys.executable, "-c", code], folder, longest)

    def test_memory_and_time_are_those_of_the_program(self):
        run = self.run_python("import time; x = bytearray(100 << 20); [i for i in range(10**6)]; time.sleep(0.2)")
        self.assertGreaterEqual(run.peak, 100 << 20)
        self.assertGreater(run.wall, 0.2)
        self.assertTrue(0.0 < run.cpu < run.wall)

    def test_a_program_that_takes_too_long_is_stopped(self):
        run = self.run_python("import time; time.sleep(60)", 0.3)
        self.assertNotEqual(run.status, 0)
        self.assertLess(run.wall, 30.0)

    def test_everybody_has_one_thread(self):
        self.assertEqual(self.run_python("import os; print(os.environ['OMP_NUM_THREADS'])").output, "1\n")


class Judging(unittest.TestCase):
    def judged(self, at_ours=None, **changes):
        return answers.judged(OURS_RIGHT, dataclasses.replace(OURS_RIGHT, **changes), at_ours)

    def test_answers_that_agree_are_right(self):
        self.assertEqual(self.judged(1000.0), ("", ""))
        self.assertEqual(self.judged(criterion=1000.00001, variances=[4.003, 0.9995]), ("", ""))

    def test_a_criterion_above_the_others_is_wrong(self):
        self.assertIn("above the other's", self.judged(criterion=999.99)[0])

    def test_a_program_that_stopped_early_is_wrong(self):
        ours, theirs = self.judged(criterion=1001.0)
        self.assertEqual(ours, "")
        self.assertIn("stopped 1 above", theirs)

    def test_a_criterion_that_is_not_that_of_the_variances_is_wrong(self):
        self.assertIn("by the other program", self.judged(1000.1)[0])
        self.assertIn("by the other program", self.judged(float("nan"))[0])

    def test_other_variances_are_wrong_for_whom_nobody_vouches(self):
        ours, theirs = self.judged(1000.0, variances=[4.1, 1.0])
        self.assertEqual(ours, "")
        self.assertIn("variances differ by 0.025", theirs)
        self.assertTrue(all(self.judged(variances=[4.1, 1.0])))
        self.assertTrue(all(self.judged(variances=[4.0])))

    def test_fixed_effects_are_compared_by_their_standard_errors(self):
        self.assertEqual(self.judged(fixef=[2.0005]), ("", ""))
        self.assertIn("fixed effects", self.judged(fixef=[2.01])[1])

    def test_not_converged_is_wrong(self):
        self.assertEqual(answers.judged(dataclasses.replace(OURS_RIGHT, doubt="stopped"), OURS_RIGHT)[0], "stopped")

    def test_a_covariance_is_measured_by_the_two_variances(self):
        varcomp = [{"group": "g", "var1": "a", "var2": None, "vcov": 4.0},
                   {"group": "g", "var1": "a", "var2": "b", "vcov": 0.0},
                   {"group": "g", "var1": "b", "var2": None, "vcov": 9.0},
                   {"group": "Residual", "var1": None, "var2": None, "vcov": 2.0}]
        self.assertEqual(answers.scales_of(varcomp), [4.0, 6.0, 9.0, 2.0])


class Page(unittest.TestCase):
    def page_of(self, *records):
        with tempfile.TemporaryDirectory() as folder:
            path = os.path.join(folder, "results.jsonl")
            with open(path, "w", encoding="utf-8") as file:
                file.writelines(json.dumps(r) + "\n" for r in (MACHINE,) + records)
            fits_page.write(path, folder)
            with open(os.path.join(folder, "performance-mixed.md"), encoding="utf-8") as file:
                return file.read()

    def record(self, program, seconds, wrong="", facts=None, job="crossed"):
        answer = dataclasses.asdict(dataclasses.replace(OURS_RIGHT, facts=facts or {
            "order": 3, "entries": 4, "factor_entries": 5, "flops": 6.0}))
        runs = [{"wall": 2.0 * s, "cpu": s, "peak": 10**6} for s in seconds]
        return {"job": job, "quick": False, "program": program, "runs": runs, "wrong": wrong, "answer": answer}

    def peer(self, seconds, wrong=""):
        return self.record("lme4.R", seconds, wrong, {"version": "lme4 1", "messages": ["singular"]})

    def test_a_goal_is_judged_by_medians_of_processor_time(self):
        page = self.page_of(self.record(OURS, [1.0, 1.0, 50.0]), self.peer([11.0, 12.0, 13.0]))
        self.assertIn("| crossed | 10 times faster than lme4 | 12 times | met |", page)
        self.assertIn("singular", page)
        self.assertNotIn("busy", page)

    def test_a_missed_goal_is_said(self):
        page = self.page_of(self.record(OURS, [1.0]), self.peer([9.0]))
        self.assertIn("**missed**", page)
        self.assertIn("- crossed: 10 times faster than lme4: 9 times.", page)

    def test_a_wrong_answer_has_no_time(self):
        page = self.page_of(self.record(OURS, [1.0], "variances differ by 1"), self.peer([9.0]))
        self.assertIn("no time", page)
        self.assertIn("| crossed | qxsm | wrong |", page)
        self.assertIn("qxsm: variances differ by 1", page)
        self.assertNotIn("1 s", page.split("## Side by side")[1].split("lme4 |")[0])

    def test_limits_of_time_and_memory_are_those_of_the_largest_model(self):
        page = self.page_of(self.record(OURS, [700.0], job="million"))
        self.assertIn("| million | at most 600 s | 700 s | **missed** |", page)
        self.assertIn("| million | at most 12 GB | 0.001 GB | met |", page)
        self.assertIn("nobody to compare with", page)

    def test_every_job_has_a_goal_or_somebody_to_compare_with(self):
        for job in JOBS:
            self.assertTrue(job.peer or job.seconds, job.name)


if __name__ == "__main__":
    unittest.main()
