#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Compares what the sandbox suite kept of its runs on two processors.

usage: compare_transcripts.py FOLDER FOLDER

Each file is one run: output, exit status, syslog lines, commands. Two of them are the same when
every byte is. Workers that run side by side come in any order on one processor already; of such a
run the commands about one disk must be the same in the same order, and so must its log lines.
Ends with 'N passed, M failed'.
"""
import difflib
import os
import re
import sys

LOG = "== log\n"
EVENTS = "== events\n"
PROCESS_NUMBER = r"(\bpid: )\d+"


def read(path):
    with open(path, encoding="utf-8", errors="surrogateescape", newline="") as file:
        return re.sub(PROCESS_NUMBER, r"\1#", file.read())


def commands(lines):
    """Each command with the line of details below it, under what it is about: its last word."""
    found = []
    for line in lines:
        if line.startswith("    ") and found:
            found[-1][1].append(line)
        else:
            found.append((line.split()[-1] if line.split() else "", [line]))
    return found


def without_order(text):
    head, _, rest = text.partition(LOG)
    log, _, events = rest.partition(EVENTS)
    grouped = sorted(commands(events.splitlines(keepends=True)), key=lambda command: command[0])
    return head + LOG + "".join(sorted(log.splitlines(keepends=True))) + EVENTS + "".join(
        line for _, lines in grouped for line in lines)


def show(name, here, there):
    print(f"DIFFERENT: {name}")
    sys.stdout.writelines(
        line if line.endswith("\n") else line + "\n"
        for line in difflib.unified_diff(
            here.splitlines(keepends=True), there.splitlines(keepends=True), "here", "there"))


def main():
    here, there = sys.argv[1:3]
    names = sorted(set(os.listdir(here)) | set(os.listdir(there)))
    passed, failed, reordered = 0, 0, 0
    for name in names:
        paths = [os.path.join(folder, name) for folder in (here, there)]
        missing = [path for path in paths if not os.path.exists(path)]
        if missing:
            print(f"MISSING: {missing[0]}")
            failed += 1
            continue
        texts = [read(path) for path in paths]
        if texts[0] == texts[1]:
            passed += 1
        elif without_order(texts[0]) == without_order(texts[1]):
            passed += 1
            reordered += 1
        else:
            failed += 1
            show(name, *map(without_order, texts))
    print(f"{len(names)} runs, {reordered} of them with workers in another order")
    print(f"{passed} passed, {failed} failed")
    return 1 if failed or not names else 0


if __name__ == "__main__":
    sys.exit(main())
