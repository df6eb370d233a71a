#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Draws the partition layouts to scale, from the table in the source: layouts.py ROOT >picture.svg"""
import os
import re
import sys

import drawing

TABLE = "libnurostoragecore/lib/partition/partition_layout.cpp"
SECTORS_A_UNIT = 11000  # one unit of the picture
LEFT, TOP, ROW, BAR = 150, 92, 30, 18
SYSTEM, SWAP, GAP, DATA = "#54aeff", "#4ac26b", "#d0d7de", "#fb8f44"


def layouts(source):
    """Rows of the table: version, kind, and places as (name, start, size); size None has no end."""
    fixed = re.search(r"BuildinStorageRow\(u32.*?partitions = \{(.*?)\},\s*\.buildinStorage", source, re.S)
    numbers = [int(number) for number in re.findall(r"\{?\{(\d+), (\d+), TYPE", fixed.group(1))
               for number in number]
    table = source[source.index("LAYOUTS = {"):]
    table = table[:table.index("};")]
    for row in re.finditer(r"(BuildinStorageRow|Row)\(([^)]*)\)", table):
        values = [int(value) for value in row.group(2).split(",")]
        if row.group(1) == "BuildinStorageRow":
            yield values[0], "built-in storage", [
                ("system", numbers[0], numbers[1]), ("swap", numbers[2], numbers[3]),
                ("data", numbers[4], numbers[5])]
            continue
        version, raid, start, system, swap, gap = values
        end = start + system + swap
        yield version, "RAID" if raid else "no RAID", [
            ("system", start, system), ("swap", start + system, swap),
            ("gap", end, gap), ("data", end + gap, None)]


def draw_row(y, version, kind, places, right):
    shapes = [drawing.text(16, y + 13, f"{version}", 13, weight="bold"),
              drawing.text(34, y + 13, kind, 12, drawing.FAINT)]
    for name, start, size in places:
        x = LEFT + start / SECTORS_A_UNIT
        width = right - x if size is None else size / SECTORS_A_UNIT
        fill = {"system": SYSTEM, "swap": SWAP, "gap": GAP, "data": DATA}[name]
        shapes.append(drawing.box(x, y, width, BAR, fill, drawing.PAPER))
        if name != "gap":
            words = f"{start}" if size is None else f"{start} + {size}"
            if len(words) * 6.1 + 6 < width:
                shapes.append(drawing.text(x + 4, y + 13, words, 10, style=drawing.MONO))
    return shapes


def draw(rows):
    last = max(start + (size or 0) for _, _, places in rows for _, start, size in places)
    right = LEFT + last / SECTORS_A_UNIT + 90
    width, height = right + 16, TOP + ROW * len(rows) + 16
    shapes = [drawing.text(16, 26, "Partition layouts, to scale", 16, weight="bold"),
              drawing.text(16, 46, "Numbers in the bars: first sector + sectors of 512 bytes. The data partition "
                           "reaches to the disk's end.", 12, drawing.FAINT)]
    x = LEFT
    for name, fill in (("1: system", SYSTEM), ("2: swap", SWAP), ("left free", GAP), ("3: data", DATA)):
        shapes += [drawing.box(x, 56, 12, 12, fill), drawing.text(x + 17, 66, name, 12)]
        x += 100
    for gib in range(0, int(last / 2097152) + 1):
        mark = LEFT + gib * 2097152 / SECTORS_A_UNIT
        shapes += [drawing.line(mark, TOP - 8, mark, height - 10, "#eaeef2"),
                   drawing.text(mark, TOP - 10, f"{gib} GiB", 10, drawing.FAINT, anchor="middle")]
    for number, (version, kind, places) in enumerate(rows):
        shapes += draw_row(TOP + ROW * number, version, kind, places, right)
    return drawing.picture(width, height, "Partition layouts, to scale", shapes)


def main():
    with open(os.path.join(sys.argv[1], TABLE), encoding="utf-8") as source:
        sys.stdout.write(draw(list(layouts(source.read()))))


if __name__ == "__main__":
    main()
