#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Draws what a terminal showed: terminal.py TITLE <captured-text >picture.svg

Knows bold, green and their end; that is all the demo uses.
"""
import re
import sys

import drawing

ESCAPE = re.compile(r"\x1b\[(\d*)m")
CHARACTER, LINE, MARGIN, BAR = 7.85, 17, 16, 30
PAPER, PLAIN, BOLD, GREEN = "#0d1117", "#c9d1d9", "#ffffff", "#7ee787"
STYLES = {"0": (PLAIN, "normal"), "": (PLAIN, "normal"), "1": (BOLD, "bold"), "32": (GREEN, "normal")}


def runs(row):
    """The row's pieces as (column, words, colour, weight)."""
    colour, weight = STYLES["0"]
    column = 0
    for number, piece in enumerate(ESCAPE.split(row)):
        if number % 2 == 1:
            colour, weight = STYLES[piece]
        elif piece:
            yield column, piece, colour, weight
            column += len(piece)


def draw(title, captured):
    rows = [row.expandtabs(8).rstrip() for row in captured.strip("\n").split("\n")]
    width = MARGIN * 2 + CHARACTER * max(len(ESCAPE.sub("", row)) for row in rows)
    height = BAR + MARGIN * 2 + LINE * len(rows)
    shapes = [drawing.box(0, 0, width, BAR, "#161b22"),
              drawing.text(width / 2, 20, title, 13, "#8b949e", anchor="middle")]
    for number, row in enumerate(rows):
        for column, words, colour, weight in runs(row):
            shapes.append(drawing.text(MARGIN + CHARACTER * column, BAR + MARGIN + 12 + LINE * number,
                                       words, 13, colour, drawing.MONO, weight=weight))
    return drawing.picture(width, height, title, shapes, PAPER)


sys.stdout.write(draw(sys.argv[1], sys.stdin.read()))
