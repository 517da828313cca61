"""Holds what the command says against the stored answers, each number with its tolerance."""

import math

INFINITE = math.inf
DF_REL = 1e-4


class Ledger:
    """The worst error of each quantity, as a part of what is allowed, and how many numbers were compared."""

    def __init__(self):
        self.worst = {}
        self.places = {}
        self.count = 0

    def note(self, quantity, ratio, place=""):
        self.count += 1
        if not ratio <= self.worst.get(quantity, -1.0):
            self.worst[quantity] = ratio if ratio == ratio else INFINITE
            self.places[quantity] = place

    def number(self, quantity, ours, theirs, allowed, place=""):
        if ours is None:
            self.note(quantity, INFINITE, f"{place}: no number, expected {theirs!r}")
            return
        error = abs(ours - theirs)
        ratio = 0.0 if error == 0.0 else error / allowed if allowed > 0.0 else INFINITE
        self.note(quantity, ratio, f"{place}: {ours!r}, expected {theirs!r}")

    def same(self, quantity, ours, theirs, place=""):
        self.note(quantity, 0.0 if ours == theirs else INFINITE, f"{place}: {ours!r}, expected {theirs!r}")

    def failed(self):
        return [quantity for quantity, ratio in self.worst.items() if not ratio <= 1.0]


def our_terms(fit):
    """The random terms with their variances and effects: [{group, coefs, levels, components, effects}]."""
    terms = []
    at_component = at_effect = 0
    for term in fit["random"]:
        k = len(term["terms"])
        terms.append(
            {
                "group": term["group"],
                "coefs": term["terms"],
                "levels": term["levels"],
                "components": list(range(at_component, at_component + k * (k + 1) // 2)),
                "effects": fit["ranef"][at_effect : at_effect + k],
            }
        )
        at_component += k * (k + 1) // 2
        at_effect += k
    return terms


def match_terms(case, fit, answers, data):
    """[(their group, their coefficients, our term)] in the order of the answers."""
    ours = our_terms(fit)
    matched = []
    theirs = {}
    for effects in answers["ranef"]:
        key = (effects["group"], effects["nlevels"])
        coef = effects.get("term", "(Intercept)")
        theirs.setdefault(key, []).append(coef)
    expected = []
    for key, coefs in theirs.items():
        separate = [t for t in case["model"].get("random", []) if t["group"] == key[0]]
        expected += [(key, t["terms"]) for t in separate] if separate else [(key, coefs)]
    for (group, levels), coefs in expected:
        named_now = [data.coefficient(coef) for coef in coefs]
        same = [t for t in ours if t["coefs"] == named_now and t["levels"] == levels and t not in matched]
        named = [t for t in same if t["group"] == group]
        if not same:
            raise KeyError(f"no random term ({' + '.join(coefs)} | {group}) with {levels} levels in the answer")
        matched.append((named or same)[0])
    return [(key[0], coefs, term) for (key, coefs), term in zip(expected, matched)]


class FitComparison:
    """One fit of one case against one answer."""

    def __init__(self, case, method, data, ledger):
        self.case = case
        self.answers = case["fits"][method]
        self.method = method
        self.data = data
        self.ledger = ledger
        self.tolerance = case["tolerance"]

    def compare(self, fit):
        dropped = [self.data.coefficient(n) for n in self.case["design"].get("dropped_by_lme4") or []]
        aliased = [column["name"] for column in fit["aliased"]]
        self.same_columns = sorted(dropped) == sorted(aliased)
        self.ledger.same("rank", len(fit["fixef"]), self.case["design"]["rank"], "fixef")
        self.ledger.same("converged", fit["convergence"], "converged", fit.get("optimizer") or "")
        self.summary(fit)
        self.fixed(fit)
        terms = match_terms(self.case, fit, self.answers, self.data)
        self.variances(fit, terms)
        self.relative_factors(fit, terms)
        self.effects(terms)
        asked = self.answers.get("contrasts", [])
        for k, contrast in enumerate(asked):
            # Each was asked for twice, by columns and by cells.
            for ours in (fit["contrasts"][k], fit["contrasts"][len(asked) + k]):
                self.contrast(fit, ours, contrast)

    def summary(self, fit):
        allowed = self.tolerance["criterion_abs"]
        # The restricted likelihood depends on the columns that are kept.
        names = ["criterion", "loglik", "AIC", "BIC"] if self.same_columns or self.method == "ML" else []
        for name in names:
            self.ledger.number("criterion", fit[name], self.answers[name], allowed, name)
        for name in ("n_par", "df_residual", "singular"):
            if name in self.answers:
                self.ledger.same(name, fit[name], self.answers[name], name)
        relative = self.tolerance["varcomp_rel"]
        self.ledger.number("sigma", fit["sigma"], self.answers["sigma"], relative * self.answers["sigma"])

    def fixed(self, fit):
        ours = {f["name"]: f for f in fit["fixef"]}
        to_se, to_se_se = self.tolerance["fixef_rel_to_se"], self.tolerance["se_rel"]
        names = []
        for f in self.answers["fixef"] if self.same_columns else []:
            name = self.data.coefficient(f["name"])
            names.append(name)
            mine = ours.get(name, {})
            self.ledger.number("fixef", mine.get("estimate"), f["estimate"], to_se * f["se"], name)
            self.ledger.number("se", mine.get("se"), f["se"], to_se_se * f["se"], name)
            self.ledger.number("t", mine.get("t"), f["t"], to_se + to_se_se * abs(f["t"]), name)
            if f.get("df_satterthwaite") is not None:
                df = f["df_satterthwaite"]
                self.ledger.number("df", mine.get("df_satterthwaite"), df, DF_REL * df, name)
        if isinstance(self.answers.get("vcov_fixef"), list) and self.same_columns:
            self.covariances(fit, names)

    def covariances(self, fit, names):
        places = [[f["name"] for f in fit["fixef"]].index(name) for name in names]
        theirs = self.answers["vcov_fixef"]
        for i, row in enumerate(theirs):
            for j, value in enumerate(row):
                allowed = 2.0 * self.tolerance["se_rel"] * math.sqrt(theirs[i][i] * theirs[j][j])
                ours = fit["vcov_fixef"][places[i]][places[j]]
                self.ledger.number("vcov", ours, value, allowed, f"{names[i]}, {names[j]}")

    def variances(self, fit, terms):
        places = [place for _, _, term in terms for place in term["components"]] + [len(fit["varcomp"]) - 1]
        theirs = self.answers["varcomp"]
        self.ledger.same("varcomp count", len(fit["varcomp"]), len(theirs))
        relative = self.tolerance["varcomp_rel"]
        for place, answer in zip(places, theirs):
            ours, name = fit["varcomp"][place], f"{answer['group']} {answer.get('var1')} {answer.get('var2')}"
            self.ledger.number("varcomp", ours["vcov"], answer["vcov"], relative * abs(answer["vcov"]), name)
            if answer["sdcor"] is not None:
                self.ledger.number("sdcor", ours["sdcor"], answer["sdcor"], relative * abs(answer["sdcor"]), name)
            for kind in ("se_observed", "se_average"):
                if answer[kind] is None:
                    self.ledger.same(kind, ours[kind], None, name)
                else:
                    allowed = self.tolerance["se_rel"] * answer[kind]
                    self.ledger.number(kind, ours[kind], answer[kind], allowed, name)
        self.information(fit, places)
        for (group, _, term), answer in zip(terms, self.answers.get("ratios", [])):
            self.ratio(fit["ratios"][self.ratio_place(fit, term)], answer, group)

    def relative_factors(self, fit, terms):
        # On the boundary several factors make one covariance matrix.
        if "theta" not in self.answers or self.answers["singular"]:
            return
        theirs = self.answers["theta"]
        places = [place for _, _, term in terms for place in term["components"]]
        self.ledger.same("theta count", len(fit["theta"]), len(theirs))
        allowed = self.tolerance["varcomp_rel"] * max(theirs)
        for place, theta in zip(places, theirs):
            self.ledger.number("theta", fit["theta"][place], theta, allowed, str(place))

    @staticmethod
    def ratio_place(fit, term):
        """Without --ratio there is one for each variance, in the order of the terms."""
        return [t["components"] for t in our_terms(fit)].index(term["components"])

    def ratio(self, ours, answer, name):
        allowed = self.tolerance["varcomp_rel"]
        self.ledger.number("ratio", ours["estimate"], answer["estimate"], allowed * answer["estimate"], name)
        allowed = self.tolerance["se_rel"] * answer["se_delta"]
        self.ledger.number("ratio se", ours["se_delta"], answer["se_delta"], allowed, name)

    def information(self, fit, places):
        theirs = self.answers.get("information")
        if not theirs:
            return
        free = [place - 1 for place in fit["information"]["free"]]
        free_theirs = theirs.get("free", range(1, len(places) + 1))
        rows = [free.index(places[k - 1]) if places[k - 1] in free else None for k in free_theirs]
        for kind in ("observed", "average"):
            matrix = theirs[kind]
            for i, row in enumerate(matrix):
                for j, value in enumerate(row):
                    allowed = 2.0 * self.tolerance["se_rel"] * math.sqrt(abs(matrix[i][i] * matrix[j][j]))
                    known = rows[i] is not None and rows[j] is not None and fit["information"][kind]
                    ours = fit["information"][kind][rows[i]][rows[j]] if known else None
                    self.ledger.number(f"{kind} inf.", ours, value, allowed, f"{i + 1}, {j + 1}")

    def effects(self, terms):
        sigma = self.answers["sigma"]
        for effects in self.answers["ranef"]:
            coef = effects.get("term", "(Intercept)")
            key = (effects["group"], effects["nlevels"])
            coefs, term = next((c, t) for g, c, t in terms if (g, t["levels"]) == key and coef in c)
            ours = term["effects"][coefs.index(coef)]
            places = {label: k for k, label in enumerate(ours["levels"])}
            for k, label in enumerate(effects["levels"]):
                self.effect(ours, places.get(self.data.level(term["group"], label)), effects, k, sigma)
            self.sums(ours, effects, sigma)

    def effect(self, ours, place, effects, k, sigma):
        name = f"{effects['group']} {effects['levels'][k]}"
        relative, se = self.tolerance["ranef_rel_to_sd"], self.tolerance["se_rel"]
        # A variance of 0 makes all of these exactly 0.
        sd = effects["pev_sd"][k] or sigma
        value = None if place is None else ours["estimate"][place]
        self.ledger.number("ranef", value, effects["estimate"][k], relative * sd, name)
        for kind in ("cond_sd", "pev_sd"):
            value = None if place is None or not ours[kind] else ours[kind][place]
            self.ledger.number(kind, value, effects[kind][k], se * effects[kind][k], name)

    def sums(self, ours, effects, sigma):
        name, n = effects["group"], effects["nlevels"]
        self.ledger.same("levels", ours["nlevels"], n, name)
        relative = self.tolerance["ranef_rel_to_sd"]
        size = math.sqrt(effects["sum_pev"]) or sigma
        self.ledger.number("sum", ours["sum"], effects["sum"], relative * math.sqrt(n) * size, name)
        for kind in ("sum_of_squares", "sum_pev"):
            self.ledger.number(kind, ours.get(kind), effects[kind], 2.0 * relative * effects[kind], name)

    def contrast(self, fit, ours, answer):
        combination = dict(zip(fit["fixed_columns"], ours["L"]))
        for name, weight in zip(self.case["model"]["fixed_columns"], answer["L"]):
            value = combination.get(self.data.coefficient(name))
            self.ledger.number("L", value, weight, 1e-12 * (1.0 + abs(weight)), f"{answer['name']}: {name}")
        self.ledger.same("verdict", ours["estimable"], answer["estimable"], answer["name"])
        if not answer["estimable"]:
            self.ledger.same("made up", [ours["estimate"], ours["se"]], [None, None], answer["name"])
            return
        allowed = self.tolerance["fixef_rel_to_se"] * answer["se"]
        self.ledger.number("contrast", ours["estimate"], answer["estimate"], allowed, answer["name"])
        allowed = self.tolerance["se_rel"] * answer["se"]
        self.ledger.number("contrast se", ours["se"], answer["se"], allowed, answer["name"])
