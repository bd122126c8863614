"""A picture of what a record costs its writer in each system, as SVG that reads in light and dark surroundings."""
import html
import math

from tables import as_figure

WIDTH, LABELS, BAR, GAP, TOP = 760, 190, 20, 8, 56
RECORD = "two 64-bit values"


def draw(tables):
    """Bars on a logarithmic scale, from the table of one thread; an empty picture without that table."""
    rows = [row for each in tables if each["name"] == "one_thread" for row in each["rows"] if row[0] == RECORD]
    rows.sort(key=lambda row: row[2])
    height = TOP + len(rows) * (BAR + GAP) + 34
    longest = math.ceil(math.log10(max((row[2] for row in rows), default=10)))
    scale = (WIDTH - LABELS - 80) / longest

    def line(x, text):
        return (f'<line class="grid" x1="{x:.1f}" y1="{TOP - 6}" x2="{x:.1f}" y2="{height - 28}"/>'
                f'<text class="axis" x="{x:.1f}" y="{height - 10}" text-anchor="middle">{text}</text>')

    def figure(ns):
        return f"{as_figure(ns)} ns"

    parts = [line(LABELS + power * scale, figure(10 ** power)) for power in range(longest + 1)]
    for number, (_, system, ns, *_) in enumerate(rows):
        y = TOP + number * (BAR + GAP)
        kind = {"libqn_tr": "own", "floor": "floor"}.get(system, "other")
        parts.append(
            f'<text class="name" x="{LABELS - 10}" y="{y + 15}" text-anchor="end">{html.escape(system)}</text>'
            f'<rect class="{kind}" x="{LABELS}" y="{y}" width="{math.log10(max(ns, 1)) * scale:.1f}" height="{BAR}" rx="3"/>'
            f'<text class="name" x="{LABELS + math.log10(max(ns, 1)) * scale + 8:.1f}" y="{y + 15}">{figure(ns)}</text>')
    return f"""<svg xmlns="http://www.w3.org/2000/svg" viewBox="0 0 {WIDTH} {height}" role="img">
<title>What a record of {RECORD} costs its writer</title>
<style>
text {{ font: 13px system-ui, sans-serif; fill: #24292f; }}
.title {{ font-size: 16px; font-weight: 600; }}
.axis {{ font-size: 11px; fill: #6e7781; }}
.grid {{ stroke: #d0d7de; stroke-width: 1; }}
.own {{ fill: #0969da; }}
.floor {{ fill: #8c959f; }}
.other {{ fill: #d4a72c; }}
@media (prefers-color-scheme: dark) {{
text {{ fill: #e6edf3; }} .axis {{ fill: #9198a1; }} .grid {{ stroke: #3d444d; }} .own {{ fill: #4493f8; }}
}}
</style>
<text class="title" x="10" y="26">What a record of {RECORD} costs its writer, one thread; logarithmic</text>
{chr(10).join(parts)}
</svg>
"""
