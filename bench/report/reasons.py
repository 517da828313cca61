"""Why targets are missed: explanations.txt, with the numbers of the worst case filled in."""

import string

import bounds


def read(file):
    """Lines "phase family: reason" or "phase family, variant: reason"; a family of * stands for all."""
    reasons = {}
    try:
        with open(file, encoding="utf-8") as lines:
            for line in lines:
                key, colon, reason = line.strip().partition(": ")
                if colon and not line.startswith("#"):
                    reasons[key] = reason
    except FileNotFoundError:
        pass
    return reasons


def of(result, reasons):
    """The nearest: of the family before that of all, of the variant before that of the phase; None without one."""
    for family in (result.family, "*"):
        for key in (f"{result.phase} {family}, {result.variant}", f"{result.phase} {family}"):
            if key in reasons:
                return reasons[key]
    return None


class Unknown:
    """In the place of a number that the results do not have."""

    def __format__(self, _):
        return "–"


class Numbers(dict):
    def __missing__(self, name):
        return Unknown()


def filled(reason, numbers):
    """The reason with its {name:format} filled in; a dash for what is not known, so that there is a page."""
    known = Numbers({name: value for name, value in numbers.items() if value is not None})
    return string.Formatter().vformat(reason, (), known)


def names(reason):
    """What a reason wants filled in."""
    return [name for _, name, _, _ in string.Formatter().parse(reason) if name is not None]


def sentence(run, result, reasons):
    reason = of(result, reasons)
    words = filled(reason, bounds.measured(run, result)) if reason else "not explained yet"
    return f"{words[0].upper()}{words[1:]}."
