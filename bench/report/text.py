"""Numbers and tables in Markdown."""


def number(value, digits=3):
    if value is None:
        return "–"
    if value == 0:
        return "0"
    if 1e-3 <= abs(value) < 1e6:
        text = f"{value:.{digits}g}"
        return f"{float(text):,.10g}" if "e" in text else text
    return f"{value:.{digits - 1}e}"


def seconds(value):
    """A time in the unit that suits it."""
    if value is None:
        return "–"
    for unit, factor in (("s", 1.0), ("ms", 1e3), ("µs", 1e6)):
        if value * factor >= 1.0 or unit == "µs":
            return f"{number(value * factor)} {unit}"
    return ""


def time_of(result, name):
    """A time of a contestant, or why there is none."""
    record = result.times.get(name)
    if record is None:
        return ""
    if "wrong" in record:
        return "wrong"
    if "not_run" in record:
        return "not run"
    runs = "" if record["runs"] >= 5 else f" ({record['runs']})"
    return seconds(record["seconds"]) + runs


def count(value):
    return f"{value:,.0f}"


def table(head, rows, left=1):
    """Markdown; the first `left` columns are text."""
    lines = ["| " + " | ".join(head) + " |",
             "|" + "|".join("---" if k < left else "--:" for k in range(len(head))) + "|"]
    lines += ["| " + " | ".join(row) + " |" for row in rows]
    return "\n".join(lines) + "\n"
