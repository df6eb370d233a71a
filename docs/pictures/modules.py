#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Draws the layers, their modules and who uses whom, from the includes: modules.py ROOT >picture.svg"""
import os
import re
import sys

import drawing

# From the top down, with what a layer is for.
LAYERS = (
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


def module(path):
    return os.path.splitext(os.path.basename(path))[0]


def read(root):
    """{layer: {module: modules it uses}}; a header and the source of the same name are one module.

    What a library shares in a private header without a source is no module, and is left out.
    """
    uses, files = {}, {}
    for folder, _, _ in LAYERS:
        for where, _, names in os.walk(os.path.join(root, folder)):
            public = "include" in os.path.relpath(where, root).split(os.sep)
            for name in names:
                if name.endswith(".cpp") or (name.endswith(".h") and (public or module(name) + ".cpp" in names)):
                    files.setdefault(folder, []).append(os.path.join(where, name))
    known = {module(path) for paths in files.values() for path in paths}
    for folder, paths in files.items():
        modules = uses.setdefault(folder, {})
        for path in sorted(paths):
            with open(path, encoding="utf-8") as source:
                found = {module(target) for target in INCLUDE.findall(source.read())} & known
            modules.setdefault(module(path), set()).update(found - {module(path)})
    return uses


def everywhere(uses):
    """Modules that more than half of all modules use: drawn once, without their arrows."""
    modules = [used for layer in uses.values() for used in layer.values()]
    names = {name for used in modules for name in used}
    return {name for name in names if sum(name in used for used in modules) * 2 > len(modules)}


def levels(modules, common):
    """Rows from the bottom up: a module stands above all modules of its layer that it uses."""
    level = {}

    def of(name, above=()):
        if name in above:
            sys.exit(f"modules.py: a circle of modules: {' '.join(above)} {name}")
        if name not in level:
            level[name] = 1 + max((of(used, (*above, name)) for used in sorted(modules[name])
                                   if used in modules and used not in common), default=-1)
        return level[name]

    for name in sorted(modules):
        of(name)
    rows = [[] for _ in range(max(level.values()) + 1)]
    for name in sorted(modules):
        if name not in common:
            rows[level[name]].append(name)
    return [row for row in rows if row]


def below(name, layer, uses, common):
    """What a module uses of the layers below, as words."""
    lower = {other: folder for folder, modules in uses.items() if folder != layer for other in modules}
    return sorted(used for used in uses[layer][name] if used in lower and used not in common)


def wrapped(words, width):
    lines = [""]
    for word in words:
        if lines[-1] and len(lines[-1]) + 1 + len(word) > width:
            lines.append("")
        lines[-1] = f"{lines[-1]} {word}".strip()
    return [row for row in lines if row]


def place(layer, uses, common, width, top):
    """Positions of the layer's boxes: {module: (x, y, width, height, lines below the name)}."""
    places, y = {}, top
    for number, row in enumerate(reversed(levels(uses[layer], common))):
        notes = {name: wrapped(below(name, layer, uses, common), 24) for name in row}
        if layer == "tool":
            notes = {name: wrapped(below(name, layer, uses, common), 120) for name in row}
        widths = {name: CHARACTER * max([len(name) + 2] + [0.82 * len(note) + 2 for note in notes[name]])
                  for name in row}
        height = 24 + 12 * max(len(note) for note in notes.values())
        gap = min(GAP, (width - 2 * MARGIN - sum(widths.values())) / len(row))
        x = (width - sum(widths.values()) - gap * (len(row) - 1)) / 2
        if len(row) < 3 and layer != "tool":
            x += SWAY if number % 2 else -SWAY  # so that a line does not hide behind the box below
        for name in row:
            places[name] = (x, y, widths[name], 24 + 12 * len(notes[name]), notes[name])
            x += widths[name] + gap
        y += height + 30
    return places, y - 30


def draw_layer(layer, words, uses, common, width, top):
    places, bottom = place(layer, uses, common, width, top + 34)
    shared = sorted(name for name in uses[layer] if name in common)
    if shared:
        bottom += 26
    shapes = [drawing.box(4, top, width - 8, bottom + 12 - top, FILLS[layer], "#d0d7de", 6),
              drawing.text(MARGIN, top + 18, layer, 13, weight="bold"),
              drawing.text(MARGIN + 170, top + 18, words, 12, drawing.FAINT)]
    for name, (x, y, across, height, _) in places.items():
        for used in sorted(uses[layer][name]):
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
        shapes.append(drawing.text(width / 2, bottom, "used by most modules, lines not drawn: "
                                   + ", ".join(shared), 11, style=drawing.MONO, anchor="middle"))
    return shapes, bottom + 12


def main():
    uses = read(sys.argv[1])
    common = everywhere(uses)
    width, y = 1180, 50
    shapes = [drawing.text(MARGIN, 24, "The modules of arrayctl", 16, weight="bold"),
              drawing.text(MARGIN, 42, "A box is a module: a header and the source of the same name. A line goes down "
                           "to a module that is used; small words are modules used on lower layers.", 12,
                           drawing.FAINT)]
    for layer, _, words in LAYERS:
        more, y = draw_layer(layer, words, uses, common, width, y)
        shapes += more
        y += 10
    shapes.append(drawing.text(width / 2, y + 14, GROUND, 12, drawing.FAINT, anchor="middle"))
    sys.stdout.write(drawing.picture(width, y + 28, "The modules of arrayctl", shapes))


main()
