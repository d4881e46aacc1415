"""A plain SVG chart: lines over a logarithmic x axis, y from 0."""

import math
from xml.sax.saxutils import escape

WIDTH, HEIGHT = 820, 400
LEFT, RIGHT, TOP, BOTTOM = 70, 300, 40, 50
COLOURS = ["#0b5fa5", "#c4481d", "#2e7d32", "#7b3fa0", "#8a6d00", "#555555"]


def step_of(top):
    """A round distance of four to eight grid lines up to `top`."""
    power = 10 ** math.floor(math.log10(top / 4))
    return next(power * factor for factor in (1, 2, 5, 10) if top / (power * factor) <= 8)


def write(path, title, x_title, y_title, lines):
    """`lines`: {name: [(x, y)]}, x above 0."""
    xs = sorted({x for points in lines.values() for x, _ in points})
    top = max(y for points in lines.values() for _, y in points) * 1.1
    low, high = math.log10(xs[0]), math.log10(xs[-1])

    def at(x, y):
        part = (math.log10(x) - low) / (high - low) if high > low else 0.5
        return LEFT + part * (WIDTH - LEFT - RIGHT), HEIGHT - BOTTOM - y / top * (HEIGHT - TOP - BOTTOM)

    out = [f'<svg xmlns="http://www.w3.org/2000/svg" viewBox="0 0 {WIDTH} {HEIGHT}" font-family="sans-serif" '
           'font-size="12">', f'<rect width="{WIDTH}" height="{HEIGHT}" fill="white"/>',
           f'<text x="{LEFT}" y="24" font-size="15">{escape(title)}</text>',
           f'<text x="{(LEFT + WIDTH - RIGHT) / 2}" y="{HEIGHT - 12}" text-anchor="middle">{escape(x_title)}</text>',
           f'<text x="12" y="{TOP + 4}">{escape(y_title)}</text>']
    step = step_of(top)
    for i in range(int(top / step) + 1):
        _, y = at(xs[0], i * step)
        out.append(f'<line x1="{LEFT}" y1="{y:.1f}" x2="{WIDTH - RIGHT}" y2="{y:.1f}" stroke="#dddddd"/>')
        out.append(f'<text x="{LEFT - 6}" y="{y + 4:.1f}" text-anchor="end">{i * step:g}</text>')
    for x in xs:
        left, bottom = at(x, 0)
        out.append(f'<text x="{left:.1f}" y="{bottom + 18:.1f}" text-anchor="middle">{x:g}</text>')
    for i, (name, points) in enumerate(lines.items()):
        colour = COLOURS[i % len(COLOURS)]
        places = [at(x, y) for x, y in sorted(points)]
        out.append(f'<polyline fill="none" stroke="{colour}" stroke-width="2" points="'
                   + " ".join(f"{x:.1f},{y:.1f}" for x, y in places) + '"/>')
        out.extend(f'<circle cx="{x:.1f}" cy="{y:.1f}" r="3" fill="{colour}"/>' for x, y in places)
        y = TOP + 18 * i
        out.append(f'<rect x="{WIDTH - RIGHT + 12}" y="{y - 9}" width="10" height="10" fill="{colour}"/>')
        out.append(f'<text x="{WIDTH - RIGHT + 28}" y="{y}">{escape(name)}</text>')
    with open(path, "w", encoding="utf-8") as file:
        file.write("\n".join(out + ["</svg>", ""]))
