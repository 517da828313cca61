"""Plots of time against n on logarithmic axes, as SVG."""

import math
from xml.sax.saxutils import escape

from results import OURS

WIDTH, HEIGHT = 300, 230
LEFT, TOP, RIGHT, BOTTOM = 48, 28, 10, 34
LEGEND_LINE = 16
COLOURS = ["#c0392b", "#2471a3", "#1e8449", "#b9770e", "#6c3483", "#616a6b", "#117a65"]


class Axis:
    """Logarithms of a range onto pixels."""

    def __init__(self, values, begin, end):
        low, high = math.log10(min(values)), math.log10(max(values))
        if high - low < 1e-9:
            low, high = low - 0.5, high + 0.5
        margin = 0.06 * (high - low)
        self.low, self.high, self.begin, self.end = low - margin, high + margin, begin, end

    def at(self, value):
        share = (math.log10(value) - self.low) / (self.high - self.low)
        return self.begin + share * (self.end - self.begin)

    def ticks(self):
        """Powers of ten; with fewer than two of them in range, 1, 2 and 5 times those."""
        powers = range(math.floor(self.low), math.ceil(self.high) + 1)
        for steps in ((1,), (1, 2, 5)):
            ticks = [s * 10.0**p for p in powers for s in steps]
            ticks = [t for t in ticks if self.low <= math.log10(t) <= self.high]
            if len(ticks) >= 2:
                return ticks
        return ticks


def label(value):
    for limit, unit in ((1e6, "M"), (1e3, "k")):
        if value >= limit:
            return f"{value / limit:g}{unit}"
    return f"{value:g}" if value >= 1e-3 else f"{value:.0e}".replace("e-0", "e-")


def text(x, y, words, anchor="middle", size=11):
    return f'<text x="{x:.1f}" y="{y:.1f}" text-anchor="{anchor}" font-size="{size}">{escape(words)}</text>'


def line(x0, y0, x1, y1, colour, width=1.0):
    return (f'<line x1="{x0:.1f}" y1="{y0:.1f}" x2="{x1:.1f}" y2="{y1:.1f}" stroke="{colour}" '
            f'stroke-width="{width}"/>')


def frame(x, y):
    parts = []
    for t in x.ticks():
        parts += [line(x.at(t), y.begin, x.at(t), y.end, "#dddddd"), text(x.at(t), y.begin + 15, label(t))]
    for t in y.ticks():
        parts += [line(x.begin, y.at(t), x.end, y.at(t), "#dddddd"), text(x.begin - 5, y.at(t) + 4, label(t), "end")]
    parts += [line(x.begin, y.begin, x.end, y.begin, "#333333"), line(x.begin, y.begin, x.begin, y.end, "#333333")]
    parts.append(text((x.begin + x.end) / 2, y.begin + 30, "n"))
    return parts


def panel(title, series, shift):
    """One pair of axes with its legend; series maps a name to its (n, seconds). The module's own line is the first."""
    points = [p for s in series.values() for p in s]
    x = Axis([p[0] for p in points], shift + LEFT, shift + WIDTH - RIGHT)
    y = Axis([p[1] for p in points], HEIGHT - BOTTOM, TOP)
    parts = frame(x, y) + [text((x.begin + x.end) / 2, 16, title + ", seconds", size=12)]
    for k, name in enumerate(sorted(series, key=lambda name: name != OURS)):
        colour, width = COLOURS[k % len(COLOURS)], 2.4 if name == OURS else 1.2
        places = [(x.at(n), y.at(s)) for n, s in sorted(series[name])]
        path = " ".join(f"{a:.1f},{b:.1f}" for a, b in places)
        parts.append(f'<polyline points="{path}" fill="none" stroke="{colour}" stroke-width="{width}"/>')
        parts += [f'<circle cx="{a:.1f}" cy="{b:.1f}" r="2.6" fill="{colour}"/>' for a, b in places]
        level = HEIGHT + 14 + k * LEGEND_LINE
        parts += [line(x.begin, level - 4, x.begin + 18, level - 4, colour, width + 0.6),
                  text(x.begin + 24, level, name, "start")]
    return parts


def draw(panels):
    """panels: (title, series) side by side."""
    panels = [(title, series) for title, series in panels if series]
    width = WIDTH * len(panels)
    height = HEIGHT + 10 + LEGEND_LINE * max(len(series) for _, series in panels)
    parts = [f'<svg xmlns="http://www.w3.org/2000/svg" width="{width}" height="{height}" '
             f'viewBox="0 0 {width} {height}" font-family="sans-serif" fill="#222222">',
             f'<rect width="{width}" height="{height}" fill="#ffffff"/>']
    for k, (title, series) in enumerate(panels):
        parts += panel(title, series, k * WIDTH)
    return "\n".join(parts + ["</svg>"]) + "\n"
