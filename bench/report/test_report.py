"""Tests of the page: python3 test_report.py RESULTS, the JSON lines of a complete run."""

import json
import math
import os
import sys
import tempfile
import unittest
import xml.etree.ElementTree as xml

import bounds
import document
import page
import reasons
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


def bounded(*records, latency=((2**20, 10e-9), (2**24, 140e-9), (2**28, 180e-9)), dgemm=100e9, copy=20e9):
    """A run on a machine whose rates are easy to reckon with."""
    run = run_of(*records)
    run.machine.update(dgemm=dgemm, copy=copy, latency=[{"bytes": b, "seconds": s} for b, s in latency],
                       scattered=[{"bytes": 2**18, "seconds": 0.5e-9}, {"bytes": 2**24, "seconds": 2e-9}], update=10e9)
    return run


def numbers_of(run):
    return bounds.measured(run, run.results[-1])


class Bounds(unittest.TestCase):
    def test_a_result_is_held_to_the_rates_of_its_own_run(self):
        files = []
        for copy, case in ((10e9, "first"), (40e9, "second")):
            machine = {"machine": {**MACHINE["machine"], "copy": copy, "load": copy / 10e9}}
            job = record("a", case, 9, "product", {OURS: 1.0}, "1 vector", bytes=8e9)
            files.append(tempfile.NamedTemporaryFile("w", suffix=".jsonl"))
            files[-1].write(json.dumps(machine) + "\n" + json.dumps(job) + "\n")
            files[-1].flush()
        run = Run([file.name for file in files])
        for file in files:
            file.close()
        self.assertEqual([v.measured for v in verdicts(run, "product", "80 %")], [0.8, 0.2])
        self.assertEqual([bounds.measured(run, r)["of_copy"] for r in run.results], [0.8, 0.2])
        self.assertIn("10.0 to 40.0 GB/s", page.conditions(run))
        self.assertIn("busy", page.disturbed(run))
        self.assertIn("2 runs", page.together(run))

    def test_latency_lies_between_the_sizes_that_were_measured(self):
        run = bounded()
        self.assertEqual([bounds.latency(run.machine, size) for size in (1, 2**20, 2**24, 2**30)],
                         [10e-9, 10e-9, 140e-9, 180e-9])
        self.assertAlmostEqual(bounds.latency(run.machine, 2**22), 75e-9)
        self.assertIsNone(bounds.latency(run_of().machine, 2**22))

    def test_the_nearest_bound_is_the_larger_share(self):
        numbers = numbers_of(bounded(record("d", "x", 9, "numeric", {OURS: 1.0}, flops=10e9, bytes=8e9)))
        self.assertEqual((numbers["of_dgemm"], numbers["of_copy"], numbers["bound"]), (0.1, 0.4, "copying"))
        numbers = numbers_of(bounded(record("b", "x", 9, "numeric", {OURS: 1.0}, flops=70e9, bytes=8e9)))
        self.assertEqual((numbers["nearest"], numbers["bound"]), (0.7, "dgemm"))

    def test_a_multiply_add_stands_beside_a_scattered_addition(self):
        numbers = numbers_of(bounded(record("d", "x", 9, "numeric", {OURS: 2.0}, flops=8e9, bytes=1e9)))
        self.assertEqual((numbers["each_ns"], numbers["scattered_ns"]), (0.5, 0.5))

    def test_an_entry_of_a_product_stands_beside_a_scattered_addition_over_both_vectors(self):
        numbers = numbers_of(bounded(record("d", "x", 2**20, "product", {OURS: 3 * 2**20 * 4e-9}, bytes=1e9)))
        self.assertAlmostEqual(numbers["ns"], 4.0)
        self.assertAlmostEqual(numbers["scattered_ns"], 2.0)
        self.assertAlmostEqual(numbers["of_scattered"], 0.5)

    def test_without_the_ordering_the_other_steps_decide(self):
        steps = {OURS: {"ordering": 0.6, "symbolic": 0.1, "numeric": 0.2, "solve": 0.1},
                 "fast": {"analysis": 1.0, "numeric": 0.5, "solve": 0.5}}
        run = bounded(record("c", "x", 9, "total", {OURS: 2.0, "fast": 3.0, "slow": 9.0}, steps=steps))
        numbers = numbers_of(run)
        self.assertAlmostEqual(numbers["without_ordering"], 1.5 / 0.4)
        self.assertAlmostEqual(numbers["ordering_alone"], 1.5 / 0.6)
        self.assertEqual(dict(bounds.columns(run, run.results[0])), {
            "ordering / symbolic / numeric / solve": "60 / 10 / 20 / 10 %",
            "fastest peer: analysis / numeric / solve": "50 / 25 / 25 %", "without the ordering": "3.75",
            "the ordering alone": "2.5"})

    def test_an_entry_takes_so_many_loads(self):
        numbers = numbers_of(bounded(record("e", "x", 9, "assembly", {OURS: 0.7, "std::map": 1.4}, "random order",
                                            contributions=10**6, tree_bytes=2**24, call=3e-9)))
        self.assertAlmostEqual(numbers["loads"], 5.0)
        self.assertAlmostEqual(numbers["map_ns"], 1400.0)
        self.assertAlmostEqual(numbers["call_ns"], 3.0)
        self.assertAlmostEqual(numbers["additions"], 350.0)
        natural = numbers_of(bounded(record("e", "x", 9, "assembly", {OURS: 0.7}, "natural order",
                                            contributions=10**6, tree_bytes=2**24)))
        self.assertAlmostEqual(natural["ns"], 700.0)
        self.assertIsNone(natural["loads"])

    def test_the_inverse_takes_twice_the_operations_of_the_factor(self):
        run = bounded(record("a", "x", 9, "numeric", {OURS: 1.0}, flops=10e9),
                      record("a", "x", 9, "inverse", {OURS: 0.5}))
        self.assertAlmostEqual(numbers_of(run)["gflops"], 40.0)
        self.assertAlmostEqual(numbers_of(run)["gflop"], 20.0)
        self.assertAlmostEqual(numbers_of(run)["dgemm_seconds"], 0.2)

    def test_a_solve_touches_its_vectors_at_every_entry(self):
        numbers = numbers_of(bounded(record("a", "x", 10**6, "solve", {OURS: 0.5}, factor_entries=10**7, count=2,
                                            bytes=2e9, flops=8e7)))
        self.assertAlmostEqual(numbers["of_copy"], 0.2)
        self.assertAlmostEqual(numbers["touched"], (2.0 + 0.48) / 0.5)
        self.assertAlmostEqual(numbers["of_update"], 0.496)
        addition = 0.5 + 1.5 * math.log2(8e6 / 2**18) / 6  # of the six doublings between the two sizes
        self.assertAlmostEqual(numbers["scattered_ns"], addition)
        self.assertAlmostEqual(numbers["of_scattered"], 0.02 * addition)
        self.assertAlmostEqual(numbers["row"], 10.0)

    def test_refilling_is_judged_by_what_it_moves(self):
        numbers = numbers_of(bounded(record("f", "x", 9, "refactor", {OURS: 0.4}, refilling=0.1, refill_bytes=1e9)))
        self.assertAlmostEqual(numbers["of_copy"], 0.5)
        self.assertAlmostEqual(numbers["share_refill"], 25.0)

    def test_records_without_the_facts_have_dashes(self):
        for phase in bounds.MEASURED:
            run = run_of(record("d", "x", 100, phase, {OURS: 1.0, "peer": 1.2}, contributions=5))
            table = page.phase_table(run, phase)
            for head, _ in bounds.COLUMNS[phase]:
                self.assertIn(head, table)
            self.assertIn("–", table)


class Reasons(unittest.TestCase):
    EXPLANATIONS = reasons.read(os.path.join(os.path.dirname(os.path.abspath(__file__)), "explanations.txt"))

    def test_numbers_are_filled_in_and_missing_ones_are_dashes(self):
        numbers = {"of_copy": 0.456, "peer": "p", "loads": None}
        words = reasons.filled("{of_copy:.2f} of {peer}, {loads:.1f} loads", numbers)
        self.assertEqual(words, "0.46 of p, – loads")

    def test_the_family_comes_before_all_and_the_variant_before_the_phase(self):
        (result,) = run_of(record("a", "x", 1, "solve", {OURS: 1.0}, "one")).results
        known = {"solve *": "1", "solve *, one": "2", "solve a": "3", "solve a, one": "4"}
        for key in sorted(known, key=known.get, reverse=True):
            self.assertEqual(reasons.of(result, known), known.pop(key))
        self.assertIsNone(reasons.of(result, known))

    def test_a_reason_names_numbers_that_its_phase_has(self):
        self.assertTrue(self.EXPLANATIONS)
        for key, reason in self.EXPLANATIONS.items():
            phase = key.partition(",")[0].rpartition(" ")[0]
            known = numbers_of(run_of(record("d", "x", 100, phase, {OURS: 1.0})))
            self.assertTrue(reasons.names(reason), f"{key} rests on no number")
            self.assertLessEqual(set(reasons.names(reason)), set(known), key)

    def test_every_phase_with_a_target_that_is_a_speed_has_a_reason(self):
        for target in TARGETS:
            if target.phase not in bounds.MEASURED:
                continue
            for family in target.families:
                orders = [record(family, "x", 1, target.phase, {OURS: 1.0}, f"{v} order")
                          for v in ("natural", "random")]
                for result in run_of(*orders).results:
                    self.assertIsNotNone(reasons.of(result, self.EXPLANATIONS), (target.phase, family))

    @unittest.skipUnless(RESULTS, "no results were given")
    def test_a_run_has_every_number_of_its_reasons(self):
        run = Run([RESULTS])
        judged = [v.result for t in TARGETS for v in t.judge(run) if v.known]
        for result in judged:
            reason = reasons.of(result, self.EXPLANATIONS)
            known = bounds.measured(run, result)
            for name in reasons.names(reason or ""):
                self.assertIsNotNone(known[name], (result.phase, result.family, result.case, name))


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

    def test_the_module_is_no_peer_of_itself(self):
        def times(ours):
            return {OURS: ours, page.IN_STEPS: ours / 9, f"{OURS}, METIS": ours / 2, "peer": 20.0}

        run = run_of(*(record("a", f"of {n}", n, "total", times(s)) for n, s in ((10, 1.0), (100, 10.0))))
        self.assertIn("| 1 (0) |", page.scaling_table(run))
        self.assertNotIn(page.IN_STEPS, page.series(run, "a", "total"))

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
