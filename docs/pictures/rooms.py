#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Draws the floors, their rooms and who uses whom, from the includes: rooms.py ROOT >picture.svg"""
import os
import re
import sys

import drawing

# From the roof down, with what a floor is for.
FLOORS = (
    ("tool", "tool", "the entry point and the seven commands: words in, words out"),
    ("libnurostoragecore", "nurostoragecore", "arrays, LVM, partitions; the runner of state-changing tools"),
    ("libhwcontrol", "hwcontrol", "what a disk is called and which port it hangs on"),
    ("libnurocore", "nurocore", "last error, lists, hash, text, files, configuration, processes"),
)
GROUND = "C library · kernel · mdadm · sfdisk · LVM · umount"
FILLS = {"tool": "#fff8c5", "libnurostoragecore": "#dafbe1", "libhwcontrol": "#ddf4ff",
         "libnurocore": "#fbefff"}
INCLUDE = re.compile(r'^\s*#\s*include\s+"([^"]+)"', re.M)
CHARACTER, GAP, SWAY, MARGIN = 6.7, 90, 110, 16


def room(path):
    return os.path.splitext(os.path.basename(path))[0]


def read(root):
    """{floor: {room: rooms it uses}}; a header and the source of the same name are one room.

    What a library shares in a private header without a source is no room, and is left out.
    """
    uses, files = {}, {}
    for folder, _, _ in FLOORS:
        for where, _, names in os.walk(os.path.join(root, folder)):
            public = "include" in os.path.relpath(where, root).split(os.sep)
            for name in names:
                if name.endswith(".cpp") or (name.endswith(".h") and (public or room(name) + ".cpp" in names)):
                    files.setdefault(folder, []).append(os.path.join(where, name))
    known = {room(path) for paths in files.values() for path in paths}
    for folder, paths in files.items():
        rooms = uses.setdefault(folder, {})
        for path in sorted(paths):
            with open(path, encoding="utf-8") as source:
                found = {room(target) for target in INCLUDE.findall(source.read())} & known
            rooms.setdefault(room(path), set()).update(found - {room(path)})
    return uses


def everywhere(uses):
    """Rooms that more than half of all rooms use: drawn once, without their arrows."""
    rooms = [used for floor in uses.values() for used in floor.values()]
    names = {name for used in rooms for name in used}
    return {name for name in names if sum(name in used for used in rooms) * 2 > len(rooms)}


def levels(rooms, common):
    """Rows from the bottom up: a room stands above all rooms of its floor that it uses."""
    level = {}

    def of(name, above=()):
        if name in above:
            sys.exit(f"rooms.py: a circle of rooms: {' '.join(above)} {name}")
        if name not in level:
            level[name] = 1 + max((of(used, (*above, name)) for used in sorted(rooms[name])
                                   if used in rooms and used not in common), default=-1)
        return level[name]

    for name in sorted(rooms):
        of(name)
    rows = [[] for _ in range(max(level.values()) + 1)]
    for name in sorted(rooms):
        if name not in common:
            rows[level[name]].append(name)
    return [row for row in rows if row]


def below(name, floor, uses, common):
    """What a room uses of the floors below, as words."""
    lower = {other: folder for folder, rooms in uses.items() if folder != floor for other in rooms}
    return sorted(used for used in uses[floor][name] if used in lower and used not in common)


def wrapped(words, width):
    lines = [""]
    for word in words:
        if lines[-1] and len(lines[-1]) + 1 + len(word) > width:
            lines.append("")
        lines[-1] = f"{lines[-1]} {word}".strip()
    return [row for row in lines if row]


def place(floor, uses, common, width, top):
    """Positions of the floor's boxes: {room: (x, y, width, height, lines below the name)}."""
    places, y = {}, top
    for number, row in enumerate(reversed(levels(uses[floor], common))):
        notes = {name: wrapped(below(name, floor, uses, common), 24) for name in row}
        if floor == "tool":
            notes = {name: wrapped(below(name, floor, uses, common), 120) for name in row}
        widths = {name: CHARACTER * max([len(name) + 2] + [0.82 * len(note) + 2 for note in notes[name]])
                  for name in row}
        height = 24 + 12 * max(len(note) for note in notes.values())
        gap = min(GAP, (width - 2 * MARGIN - sum(widths.values())) / len(row))
        x = (width - sum(widths.values()) - gap * (len(row) - 1)) / 2
        if len(row) < 3 and floor != "tool":
            x += SWAY if number % 2 else -SWAY  # so that a line does not hide behind the box below
        for name in row:
            places[name] = (x, y, widths[name], 24 + 12 * len(notes[name]), notes[name])
            x += widths[name] + gap
        y += height + 30
    return places, y - 30


def draw_floor(floor, words, uses, common, width, top):
    places, bottom = place(floor, uses, common, width, top + 34)
    shared = sorted(name for name in uses[floor] if name in common)
    if shared:
        bottom += 26
    shapes = [drawing.box(4, top, width - 8, bottom + 12 - top, FILLS[floor], "#d0d7de", 6),
              drawing.text(MARGIN, top + 18, floor, 13, weight="bold"),
              drawing.text(MARGIN + 170, top + 18, words, 12, drawing.FAINT)]
    for name, (x, y, across, height, _) in places.items():
        for used in sorted(uses[floor][name]):
            if used in places:
                to_x, to_y, to_across, _, _ = places[used]
                shapes.append(drawing.line(x + across / 2, y + height, to_x + to_across / 2, to_y, "#8c959f"))
    for name, (x, y, across, height, notes) in places.items():
        shapes.append(drawing.box(x, y, across, height, drawing.PAPER, "#57606a", 4))
        shapes.append(drawing.text(x + across / 2, y + 16, name, 11, style=drawing.MONO, anchor="middle"))
        for number, note in enumerate(notes):
            shapes.append(drawing.text(x + across / 2, y + 29 + 12 * number, note, 9, drawing.FAINT,
                                       drawing.MONO, "middle"))
    if shared:
        shapes.append(drawing.text(width / 2, bottom, "used by most rooms of the house, lines not drawn: "
                                   + ", ".join(shared), 11, style=drawing.MONO, anchor="middle"))
    return shapes, bottom + 12


def main():
    uses = read(sys.argv[1])
    common = everywhere(uses)
    width, y = 1180, 50
    shapes = [drawing.text(MARGIN, 24, "The house of arrayctl", 16, weight="bold"),
              drawing.text(MARGIN, 42, "A box is a room: a header and the source of the same name. A line goes down "
                           "to a room that is used; small words are rooms used on lower floors.", 12,
                           drawing.FAINT)]
    for floor, _, words in FLOORS:
        more, y = draw_floor(floor, words, uses, common, width, y)
        shapes += more
        y += 10
    shapes.append(drawing.text(width / 2, y + 14, GROUND, 12, drawing.FAINT, anchor="middle"))
    sys.stdout.write(drawing.picture(width, y + 28, "The house of arrayctl", shapes))


main()
