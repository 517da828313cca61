"""Cases that are no fits by likelihood: given variances, relationship matrices, fields."""

import math

from command import run
from tables import Table, read_matrix, write_rows


def compare_blup(case, fit, data, ledger):
    """A prediction with known variances against the answers and the printed solutions of the book."""
    answers, tolerance = case["answers"], case["tolerance"]
    solution, pev = tolerance["solution_abs"], tolerance["pev_rel"]
    for name in ("yPy",):
        ledger.number(name, fit[name], answers[name], solution, name)
    ledger.number("criterion", fit["criterion"], answers["reml_criterion"], solution, "criterion")
    rank = case["design"]["rank_of_mme"]
    ledger.same("rank", fit["equations"]["rank"], rank, "equations")
    log_det = fit["equations"]["log_det"]
    ledger.number("log det", log_det, answers["logdet_mme_full_rank_columns"], solution, "equations")
    fixed = {f["name"]: f for f in fit["fixef"]}
    printed = case["published"]
    for answer in answers["fixed"]:
        column, level = answer["name"].split(" ")
        name = data.coefficient(column + level)
        ours = fixed.get(name, {})
        ledger.number("fixef", ours.get("estimate"), answer["estimate"], solution, name)
        ledger.number("se", ours.get("se"), answer["se"], solution, name)
        ledger.number("printed", ours.get("estimate"), printed["fixed"][level], tolerance["published_abs"], name)
    answer = answers["random"][0]
    effects = fit["ranef"][0]
    for k, label in enumerate(answer["levels"]):
        label = data.level(answer["group"], label)
        place = effects["levels"].index(label)
        value, sd = effects["estimate"][place], effects["pev_sd"][place]
        reliability = effects["reliability"][place]
        ledger.number("ranef", value, answer["estimate"][k], solution, label)
        ledger.number("pev", sd * sd, answer["pev"][k], pev * answer["pev"][k], label)
        ledger.number("sep", sd, answer["sep"][k], pev * answer["sep"][k], label)
        ledger.number("reliability", reliability, answer["reliability"][k], solution, label)
        ledger.number("printed", value, printed["animal"][k], tolerance["published_abs"], label)
        ledger.number("printed", reliability, printed["reliability"][k], tolerance["published_abs"], label)


def compare_pedigree(case, program, pedigree, ids, work, ledger):
    """A, its inverse and the inbreeding of a pedigree; `ids` are the animals in the order of the answers."""
    paths = {name: str(work / name) for name in ("a", "ainv", "inbreeding", "mendelian", "ids")}
    given = [word for name, path in paths.items() for word in (f"--{name}", path)]
    facts = run(program, ["pedigree", str(pedigree), *given, "--json"])
    answers, allowed = case["answers"], case["tolerance"]["abs"]
    order = (work / "ids").read_text(encoding="utf-8").split()
    places = [order.index(animal) for animal in ids]
    for name in ("A", "Ainv"):
        matrix = read_matrix(paths[name.lower()])
        for i, row in enumerate(answers[name]):
            for j, value in enumerate(row):
                # The answers are printed with 15 digits.
                ledger.number(name, matrix[places[i]][places[j]], value, 1e-14 * abs(value) + allowed, f"{i}, {j}")
    for name, key in (("inbreeding", "inbreeding"), ("mendelian", "mendelian_sampling_d")):
        ours = dict(Table.read(paths[name]).rows)
        for animal, value in zip(ids, answers[key]):
            ledger.number(name, float(ours[animal]), value, allowed, animal)
    ledger.number("log det A", facts["log_determinant"], answers["logdet_A"], 1e-11, "")
    ledger.same("entries", facts["inverse_entries"], answers["nnz_Ainv_lower"], "")


def compare_field(case, program, matrix, work, ledger):
    """The structure matrix of a field: rank, determinant, and functions that no generalized inverse changes."""
    answers, relative = case["answers"], case["tolerance"]["rel"]
    factor = run(program, ["factor", str(matrix), "--json"])
    order = factor["rows"]
    ledger.same("rank", factor["rank"], answers["rank"], "factor")
    pivots, whole = answers["logdet_after_deleting_first_node_of_each_component"], answers["log_pseudo_determinant"]
    ledger.number("log det", factor["log_determinant"], pivots, relative * pivots, "by pivots")
    pseudo = factor["log_determinant"] + math.log(order)  # the matrix-tree theorem: one component
    ledger.number("log det", pseudo, whole, relative * whole, "pseudo")
    trace = run(program, ["trace", str(matrix), "--json"])["trace"]
    ledger.number("trace", trace, answers["trace"], relative * answers["trace"], "")
    edges, diagonal = answers["edge_contrast_variances"], answers["moore_penrose_diagonal"]
    rows = []
    for i, j in zip(edges["i"], edges["j"]):
        rows.append([(k == i - 1) - (k == j - 1) + 0.0 for k in range(order)])
    for i in diagonal["index"]:
        rows.append([(k == i - 1) - 1.0 / order for k in range(order)])
    write_rows(work / "rows.mtx", rows)
    form = str(work / "form.mtx")
    run(program, ["quad", str(matrix), str(work / "rows.mtx"), "--inverse", "-o", form, "--json"])
    form = read_matrix(form)
    for k, value in enumerate(edges["value"] + diagonal["value"]):
        ledger.number("variances", form[k][k], value, relative * value, f"row {k + 1}")


def compare_map(case, fit, data, ledger):
    """The field fitted to data."""
    answers, relative = case["map_model"], case["tolerance"]["rel"]
    ledger.same("converged", fit["convergence"], "converged", fit.get("optimizer") or "")
    ledger.number("criterion", fit["criterion"], answers["criterion"], relative * answers["criterion"], "criterion")
    theirs = [answers["variances"]["district"], answers["variances"]["residual"]]
    for ours, value, se in zip(fit["varcomp"], theirs, answers["se_average"]):
        ledger.number("varcomp", ours["vcov"], value, relative * value, ours["group"])
        ledger.number("se_average", ours["se_average"], se, relative * se, ours["group"])
    intercept = fit["fixef"][0]
    for ours, name in ((intercept["estimate"], "estimate"), (intercept["se"], "se")):
        value = answers["intercept"][name]
        ledger.number("intercept", ours, value, relative * abs(value), name)
    effects, answer = fit["ranef"][0], answers["district"]
    places = {label: k for k, label in enumerate(effects["levels"])}
    for k, index in enumerate(answer["index"]):
        place = places[data.level("district", str(index))]
        sd = answer["pev_sd"][k]
        ledger.number("ranef", effects["estimate"][place], answer["estimate"][k], relative * sd, str(index))
        ledger.number("pev_sd", effects["pev_sd"][place], sd, relative * sd, str(index))
    ledger.number("sum", effects["sum"], answer["sum"], 1e-9, "")
    squares = answer["sum_of_squares"]
    ledger.number("sum_of_squares", effects["sum_of_squares"], squares, relative * squares, "")
