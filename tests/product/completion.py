#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""The completion in a real bash on a terminal, where keys are typed: completion.py

The shell runs in a mount namespace whose /sys/block has the arrays that the cases want.
"""
import os
import pty
import re
import select
import sys

sys.path.insert(0, os.path.join(os.path.dirname(__file__), "../support/verdict"))
import verdict  # noqa: E402
from verdict import ROOT  # noqa: E402

ARRAYS = "mount -t tmpfs none /sys/block && mkdir /sys/block/md0 /sys/block/md12 /sys/block/md127 " \
         "/sys/block/md_d0 /sys/block/sda"
PROMPT = "ready> "


def wait_for(terminal, pattern, seen=""):
    while not re.search(pattern, seen):
        assert select.select([terminal], [], [], verdict.silence())[0], f"no {pattern!r} in {seen!r}"
        seen += os.read(terminal, 4096).decode()
    return seen


def typed(keys, sourced="tool/completion/arrayctl"):
    """The command line that bash has after these keys; an answer of several words as "a b c"."""
    pid, terminal = pty.fork()
    if pid == 0:
        os.chdir(ROOT)
        os.environ.update(PS1=PROMPT, TERM="dumb", HISTFILE="")
        os.execvp("unshare", ["unshare", "-m", "sh", "-c", ARRAYS + " && exec bash --norc --noprofile -i"])
    try:
        wait_for(terminal, re.escape(PROMPT))
        setup = f"bind 'set bell-style none'; bind 'set show-all-if-ambiguous on'; . {sourced}; echo so\"\"urced\n"
        os.write(terminal, setup.encode())
        wait_for(terminal, r"\nsourced\r\n" + re.escape(PROMPT))
        # The end of the line is marked by letters that are typed behind what was completed.
        os.write(terminal, keys.encode() + b"=end")
        seen = wait_for(terminal, "=end")
        return re.sub(r"\s+", " ", seen.replace(PROMPT, "")).strip()
    finally:
        os.kill(pid, 9)
        os.waitpid(pid, 0)
        os.close(terminal)


def case_a_word_that_is_begun_is_ended():
    assert typed("arrayctl st\t") == "arrayctl status =end"
    assert typed("arrayctl de\t") == "arrayctl destroy =end"
    assert typed("arrayctl n\t") == "arrayctl newvol =end"


def case_words_with_the_same_beginning_are_listed():
    seen = typed("arrayctl i\t")
    assert seen == "arrayctl i initsys initsys-dd arrayctl initsys=end", seen
    assert typed("arrayctl enumformatalldisks_\t") == "arrayctl enumformatalldisks_indualhead_install =end"


def case_numbers_of_arrays_are_offered_behind_status_and_destroy():
    for word in ("status", "destroy"):
        seen = typed(f"arrayctl {word} \t")
        assert seen == f"arrayctl {word} 0 12 127 arrayctl {word} =end", seen
    assert typed("arrayctl status 127\t") == "arrayctl status 127 =end"


def case_nothing_else_is_offered():
    for keys in ("arrayctl x\t", "arrayctl newvol \t", "arrayctl initsys \t", "arrayctl status 0 \t",
                 "arrayctl destroy 5\t", "arrayctl Status \t"):
        assert typed(keys) == keys.replace("\t", "").rstrip(" ") + (" " if keys[-2] == " " else "") + "=end", keys


def case_a_rehearsal_is_completed_like_the_command():
    sourced = "rehearse/completion/arrayctl-rehearse"
    assert typed("arrayctl-rehearse --c\t", sourced) == "arrayctl-rehearse --commands =end"
    assert typed("arrayctl-rehearse --json new\t", sourced) == "arrayctl-rehearse --json newvol =end"
    assert typed("arrayctl-rehearse --tool /x status 127\t", sourced) == "arrayctl-rehearse --tool /x status 127 =end"
    seen = typed("arrayctl-rehearse destroy \t", sourced)
    assert seen == "arrayctl-rehearse destroy 0 12 127 arrayctl-rehearse destroy =end", seen
    assert typed("arrayctl-rehearse newvol \t", sourced) == "arrayctl-rehearse newvol =end"


verdict.cases(globals(), "".join(sys.argv[1:2]))
