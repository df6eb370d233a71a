#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""Compares what the sandbox suite kept of its runs on two processors.

usage: compare_transcripts.py FOLDER FOLDER

Each file is one run: output, exit status, syslog lines, commands. Two of them are the same when
every byte is. Workers that run side by side come in any order on one processor already; of such a
run the commands about one disk must be the same in the same order, and so must its log lines.
"""
import difflib
import os
import re
import sys

sys.path.insert(0, os.path.join(os.path.dirname(__file__), "../support/verdict"))
import verdict  # noqa: E402

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


def difference(here, there):
    """What is wrong, None when nothing is, and a remark."""
    if here == there:
        return None, ""
    here, there = without_order(here), without_order(there)
    if here == there:
        return None, "workers in another order"
    lines = (text.splitlines() for text in (here, there))
    return "\n".join(difflib.unified_diff(*lines, "here", "there", lineterm="")), ""


def main():
    folders = sys.argv[1:3]
    for name in sorted(set(os.listdir(folders[0])) | set(os.listdir(folders[1]))):
        paths = [os.path.join(folder, name) for folder in folders]
        missing = [path for path in paths if not os.path.exists(path)]
        wrong, note = (f"no {missing[0]}", "") if missing else difference(*map(read, paths))
        verdict.tell(f"transcript: {name}", wrong, note)


if __name__ == "__main__":
    main()
