#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Includes point down only: fails on one that points up or sideways.

Usage: include_direction.py [ROOT]; prints what is wrong.
"""
import os
import re
import sys

# Who may use whom; a layer may always use itself.
LAYERS = {
    "libnurocore": set(),
    "libhwcontrol": {"libnurocore"},
    "libnurostoragecore": {"libnurocore", "libhwcontrol"},
    "tool": {"libnurocore", "libhwcontrol", "libnurostoragecore"},
}
# The folder of a public header tells its layer.
HEADER_FOLDERS = {
    "nurocore": "libnurocore",
    "hwcontrol": "libhwcontrol",
    "nurostoragecore": "libnurostoragecore",
}
# Inside a layer two subjects look circular; this is how they are cut: module -> modules it may not use.
MODULES = {
    "disk_name": {"disk_port", "disk_path"},
    "disk_port": {"disk_path"},
    "partition_layout": {"raid_membership", "partition_version", "raid_info"},
    "raid_membership": {"partition_version"},
}
INCLUDE = re.compile(r'^\s*#\s*include\s+"([^"]+)"')


def sources(root, layer):
    for folder, _, names in os.walk(os.path.join(root, layer)):
        for name in sorted(names):
            if name.endswith((".h", ".cpp")):
                yield os.path.join(folder, name)


def fault(layer, path, target):
    """What is wrong with an include, or None."""
    head = target.split("/")[0]
    owner = HEADER_FOLDERS.get(head)
    module = os.path.splitext(os.path.basename(path))[0]
    used = os.path.splitext(os.path.basename(target))[0]
    if used in MODULES.get(module, set()):
        return f"{module} knows nothing of {used}"
    if owner is not None:
        if owner == layer or owner in LAYERS[layer]:
            return None
        return f"{layer} may not use {owner}"
    folder = os.path.dirname(path)
    while os.path.basename(folder) not in ("lib", "tool", layer):
        folder = os.path.dirname(folder)
    for base in (os.path.dirname(path), folder):
        if os.path.exists(os.path.join(base, target)):
            return None
    return "neither a public header of a layer below nor a private one of this layer"


def main():
    root = sys.argv[1] if len(sys.argv) > 1 else "."
    seen = wrongs = 0
    for layer in LAYERS:
        for path in sources(root, layer):
            for number, line in enumerate(open(path, encoding="utf-8"), 1):
                match = INCLUDE.match(line)
                if not match:
                    continue
                wrong = fault(layer, path, match.group(1))
                seen += 1
                if wrong is not None:
                    wrongs += 1
                    print(f"{os.path.relpath(path, root)}:{number}: includes {match.group(1)}: {wrong}")
    return 1 if wrongs or not seen else 0


sys.exit(main())
