"""Tests of the page: python3 test_report.py RESULTS, the JSON lines of a complete run."""

import json
import os
import sys
import tempfile
import unittest
import xml.etree.ElementTree as xml

import document
import page
from results import OURS, Run, exponent
from targets import TARGETS, Verdict, between

RESULTS = sys.argv.pop() if len(sys.argv) > 1 else None
MACHINE = {"machine": {
    "copy": 23e9, "dgemm": 80e9, "load": 0.0, "clock": "cpu", "processor": "p", "cores": 1, "memory": 1, "system": "s",
    "compiler": "c", "commit": "0", "cholmod": "1", "metis": "1", "eigen": "1", "openblas": "o", "kernels": "k"}}


def run_of(*records):
    """A run with these records and a machine."""
    with tempfile.NamedTemporaryFile("w", suffix=".jsonl") as file:
        file.writelines(json.dumps(r) + "\n" for r in (MACHINE,) + records)
        file.flush()
        return Run([file.name])


def record(family, case, n, phase, times, variant="", **facts):
    timed = [{"name": k, "seconds": v, "runs": 5} if isinstance(v, float) else {"name": k, "wrong": v}
             for k, v in times.items()]
    return {"family": family, "case": case, "n": n, "entries": 3 * n, "phase": phase, "variant": variant,
            "times": timed, "facts": facts}


def verdicts(run, phase, text):
    return [v for t in TARGETS if t.phase == phase and t.text.startswith(text) for v in t.judge(run)]


class Judging(unittest.TestCase):
    def test_a_ratio_is_taken_to_the_fastest_peer(self):
        run = run_of(record("a", "x", 62500, "numeric", {OURS: 1.0, "slow": 9.0, "fast": 2.5}))
        (verdict,) = verdicts(run, "numeric", "3 x")
        self.assertEqual((verdict.measured, verdict.required, verdict.met), (2.5, 3.0, False))
        self.assertAlmostEqual(verdict.shortfall, 1.2)

    def test_a_wrong_result_has_no_time_and_meets_nothing(self):
        run = run_of(record("d", "x", 100, "numeric", {OURS: "relative residual 1", "peer": 1.0}))
        (verdict,) = verdicts(run, "numeric", "2 x")
        self.assertFalse(verdict.known or verdict.met)
        self.assertIn("relative residual 1", page.wrong_results(run))
        self.assertIn("wrong", page.phase_table(run, "numeric"))

    def test_a_wrong_peer_is_no_peer(self):
        run = run_of(record("d", "x", 100, "numeric", {OURS: 1.0, "fast": "garbage", "slow": 3.0}))
        self.assertEqual(verdicts(run, "numeric", "2 x")[0].measured, 3.0)

    def test_a_later_record_of_the_same_job_counts(self):
        run = run_of(*(record("d", "x", 100, "numeric", {OURS: s, "peer": 4.0}) for s in (1.0, 2.0)))
        self.assertEqual([v.measured for v in verdicts(run, "numeric", "2 x")], [2.0])

    def test_hubs_are_compared_with_a_tenth_of_their_size(self):
        run = run_of(record("hubs", "100000 with 30 hubs", 1e5, "ordering", {OURS: 0.1}),
                     record("hubs", "1000000 with 30 hubs", 1e6, "ordering", {OURS: 4.0}))
        (verdict,) = verdicts(run, "ordering", "time per entry")
        self.assertAlmostEqual(verdict.measured, 4.0)
        self.assertFalse(verdict.met)

    def test_singular_systems_are_not_compared(self):
        run = run_of(record("c", "9 x 9, all dummies", 4000, "numeric", {OURS: 1.0, "peer": 1.0}))
        self.assertEqual(verdicts(run, "numeric", "2 x at"), [])

    def test_limits_from_above_and_from_below(self):
        self.assertTrue(Verdict(None, 1.0, 1.0).met and Verdict(None, 1.0, 1.0, at_most=True).met)
        self.assertFalse(Verdict(None, 0.9, 1.0).met or Verdict(None, 1.1, 1.0, at_most=True).met)

    def test_requirements_between_two_sizes(self):
        self.assertEqual(between(10, (100, 3.0), (10000, 1.0)), 3.0)
        self.assertAlmostEqual(between(1000, (100, 3.0), (10000, 1.0)), 2.0)
        self.assertEqual(between(10**6, (100, 3.0), (10000, 1.0)), 1.0)

    def test_exponents(self):
        self.assertAlmostEqual(exponent([(10, 2.0), (100, 200.0), (1000, 20000.0)]), 2.0)
        self.assertIsNone(exponent([(10, 2.0), (10, 3.0)]))


class Page(unittest.TestCase):
    def test_every_miss_is_listed_with_its_reason(self):
        run = run_of(record("e", "x", 100, "numeric", {OURS: 1.0, "peer": 1.2}))
        self.assertIn("Short rows.", page.misses(run, {"numeric e": "short rows"}))
        self.assertIn("Not explained yet.", page.misses(run, {}))
        self.assertIn("**missed** in 1 of 1", page.overview(run))

    def test_a_target_without_a_time_of_ours_is_not_passed_over(self):
        run = run_of({**record("arrow", "50000", 50000, "ordering", {}),
                      "times": [{"name": OURS, "not_run": "about 99 s"}, {"name": "AMD", "seconds": 1.0, "runs": 5}]},
                     record("d", "x", 100, "numeric", {OURS: "garbage", "peer": 1.0}))
        self.assertIn("**no time** in 1 of 1 (about 99 s)", page.overview(run))
        self.assertIn("**no time** in 1 of 1 (garbage)", page.overview(run))

    def test_what_was_not_run_has_a_place_on_the_page(self):
        for phase, table in (("memory", page.memory_table), ("rank", page.rank_table)):
            run = run_of(record("c", "x", 100, phase, {}))
            self.assertIn("not run", table(run))
            self.assertFalse(any(v.known for v in verdicts(run, phase, "")))

    def test_a_page_is_written_from_one_job_that_was_not_run(self):
        run = run_of({**record("a", "x", 100, "numeric", {}), "times": [{"name": OURS, "not_run": "about 99 s"}]})
        with tempfile.TemporaryDirectory() as folder:
            document.write(run, {}, folder)
            with open(os.path.join(folder, "performance.md"), encoding="utf-8") as file:
                self.assertIn("| not run |", file.read())

    @unittest.skipUnless(RESULTS, "no results were given")
    def test_a_run_makes_a_whole_page(self):
        run = Run([RESULTS])
        with tempfile.TemporaryDirectory() as folder:
            document.write(run, {}, folder)
            with open(os.path.join(folder, "performance.md"), encoding="utf-8") as file:
                words = file.read()
            for _, title, _ in page.PHASES:
                self.assertIn(f"\n## {title}\n", words)
            for family in page.FAMILIES:
                drawing = xml.parse(os.path.join(folder, f"performance-{family}.svg")).getroot()
                self.assertTrue(drawing.tag.endswith("svg"))
                self.assertIn(f"(performance-{family}.svg)", words)


if __name__ == "__main__":
    unittest.main()
