# SPDX-License-Identifier: MIT
"""What the pictures share: a little SVG, written so that the same input gives the same bytes."""
import html

PAPER = "#ffffff"
INK = "#24292f"
FAINT = "#6e7781"
SANS = "font-family:system-ui,-apple-system,'Segoe UI',sans-serif"
MONO = "font-family:ui-monospace,SFMono-Regular,Menlo,Consolas,'DejaVu Sans Mono',monospace"


def text(x, y, words, size=12, fill=INK, style=SANS, anchor="start", weight="normal"):
    return (f'<text x="{x:g}" y="{y:g}" font-size="{size}" fill="{fill}" text-anchor="{anchor}" '
            f'font-weight="{weight}" style="{style}" xml:space="preserve">{html.escape(words)}</text>')


def box(x, y, width, height, fill, stroke="none", radius=0):
    return (f'<rect x="{x:g}" y="{y:g}" width="{width:g}" height="{height:g}" rx="{radius}" '
            f'fill="{fill}" stroke="{stroke}"/>')


def line(x1, y1, x2, y2, stroke=FAINT, width=1):
    return (f'<line x1="{x1:g}" y1="{y1:g}" x2="{x2:g}" y2="{y2:g}" stroke="{stroke}" '
            f'stroke-width="{width}"/>')


def picture(width, height, title, shapes, paper=PAPER):
    head = (f'<svg xmlns="http://www.w3.org/2000/svg" viewBox="0 0 {width:g} {height:g}" '
            f'width="{width:g}" height="{height:g}" role="img">')
    return "\n".join([head, "<!-- SPDX-License-Identifier: MIT -->",
                      f"<title>{html.escape(title)}</title>",
                      box(0, 0, width, height, paper), *shapes, "</svg>", ""])
