"""Reads the answers of the programs and compares them.

A fit is right when its criterion is the lowest and its variances and fixed effects are those of the other program. That
our criterion belongs to our variances is for lme4 to say, where it can: it evaluates its own there."""

import json
import math
from dataclasses import dataclass, field

CRITERION = 1e-4  # of the criterion: beyond it, a fit ended elsewhere
OURS_ABOVE = 1e-7  # of the criterion: what ours may be above another's, by rounding
SAME_PLACE = 1e-8  # of the criterion: two programs, the same parameters
VARIANCE = 1e-3  # of the variance, for a covariance of the two standard deviations
FIXED_EFFECT = 1e-2  # of its standard error


@dataclass
class Answer:
    criterion: float
    variances: list
    fixef: list = field(default_factory=list)
    se: list = field(default_factory=list)
    theta: list = field(default_factory=list)
    steps: int = 0
    fit_seconds: float = 0.0
    scales: list = field(default_factory=list)  # what a difference of each variance is measured by
    doubt: str = ""
    facts: dict = field(default_factory=dict)


def scales_of(varcomp):
    variance = {(c["group"], c["var1"]): c["vcov"] for c in varcomp if c["var2"] is None}
    return [math.sqrt(variance[c["group"], c["var1"]] * variance[c["group"], c["var2"] or c["var1"]]) for c in varcomp]


def ours(text):
    fit = json.loads(text)
    kept = [f for f in fit["fixef"] if f["estimate"] is not None]
    facts = {k: fit["equations"][k] for k in ("order", "entries", "factor_entries", "flops")}
    return Answer(fit["criterion"], [c["vcov"] for c in fit["varcomp"]], [f["estimate"] for f in kept],
                  [f["se"] for f in kept], fit["theta"], len(fit["iterations"]), fit["seconds"],
                  scales_of(fit["varcomp"]), "" if fit["convergence"] == "converged" else fit["convergence"], facts)


def theirs(text):
    fit = json.loads(text)
    return Answer(fit["criterion"], fit["variances"], fit.get("fixef", []), fit.get("se", []), fit.get("theta", []),
                  fit["evaluations"], fit["fit"], facts={k: fit[k] for k in ("messages", "version")})


def variance_difference(a, b):
    if len(a.variances) != len(b.variances):
        return math.inf
    return max(abs(x - y) / s if s > 0.0 else (0.0 if x == y else math.inf)
               for x, y, s in zip(a.variances, b.variances, a.scales))


def fixed_difference(a, b):
    """Zero where the other program tells no fixed effects."""
    if not b.fixef:
        return 0.0
    if len(a.fixef) != len(b.fixef):
        return math.inf
    return max(abs(x - y) / s for x, y, s in zip(a.fixef, b.fixef, a.se))


def judged(a, b, at_ours=None):
    """What is wrong with our answer and with the other one: two texts, empty for a right answer. `at_ours` is the
    other program's criterion at our parameters."""
    scale = max(1.0, abs(a.criterion))
    above = b.criterion - a.criterion
    if a.doubt:
        return a.doubt, ""
    if at_ours is not None and not abs(at_ours - a.criterion) <= SAME_PLACE * scale:
        return f"the criterion {a.criterion:.6f} is {at_ours:.6f} by the other program", ""
    if not above >= -OURS_ABOVE * scale:
        return f"the criterion is {-above:.3g} above the other's", ""
    if not above <= CRITERION * scale:
        return "", f"stopped {above:.3g} above our criterion"
    for name, difference, allowed in (("variances", variance_difference(a, b), VARIANCE),
                                      ("fixed effects", fixed_difference(a, b), FIXED_EFFECT)):
        if not difference <= allowed:
            text = f"{name} differ by {difference:.2g}"
            # With nobody to say where the criterion of ours is right, neither has a time.
            return ("" if at_ours is not None else text), f"{text}, with a criterion {above:.3g} above ours"
    return "", ""
