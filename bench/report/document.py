"""The page and its plots, written into a folder."""

import os

import page
import plot


def plots(run, folder):
    lines = []
    for family, title in page.FAMILIES.items():
        panels = [(phase, page.series(run, family, phase)) for phase in ("ordering", "numeric", "total")]
        if not any(series for _, series in panels):
            continue
        name = f"performance-{family}.svg"
        with open(os.path.join(folder, name), "w", encoding="utf-8") as file:
            file.write(plot.draw(panels))
        lines.append(f"Family {family}: {title}.\n\n![Time against n, family {family}]({name})\n")
    return "\n".join(lines)


def write(run, reasons, folder):
    parts = [
        "# Performance\n",
        "Written by `bench/run`; not edited by hand. Times are medians of five runs of everybody in turns, in one "
        "process and on one thread; in brackets the number of runs where one took long. A ratio above 1 means that "
        "the module is faster than the best of the others.\n",
        page.together(run) + page.disturbed(run) + page.conditions(run),
        "## Targets\n",
        "Absolute times are scaled by the copy rate, from a machine that copies at 23 GB/s.\n",
        page.overview(run),
        "## Where they are missed\n", page.misses(run, reasons),
        "## Wrong results\n", page.wrong_results(run),
        "## Time against n\n", plots(run, folder),
        "## Scaling exponents\n",
        "The slope of log(time) over log(n) over the sizes of a family, in brackets that of the fastest peer at each "
        "size.\n", page.scaling_table(run),
    ]
    for phase, title, note in page.PHASES:
        if run.of(phase):
            parts += [f"## {title}\n", note + "\n", page.phase_table(run, phase)]
    if run.of("memory"):
        parts += ["## Memory\n", "The peak of ordering and factoring once the matrix is closed, as the resident set "
                  "grew, beside 9.5 bytes for each entry of U, 60 for each stored entry and 120 for each row.\n",
                  page.memory_table(run)]
    if run.of("rank"):
        parts += ["## Rank\n", "Singular systems: the rank, and how near the pivots of a plain row by row "
                  "factorization come to the bound at which they are dropped.\n", page.rank_table(run)]
    with open(os.path.join(folder, "performance.md"), "w", encoding="utf-8") as file:
        file.write("\n".join(parts))
