#!/usr/bin/env python3
# SPDX-License-Identifier: MIT
"""The runner and the bound: verdict_test.py [FILTER]

A stand-in for the unit suite's program does what a test program may do. The silence is short here
alone; elsewhere it is that of silence.sh. A tool that never answers is a test of the sandbox suite.
"""
import os
import re
import subprocess
import sys
import tempfile

import verdict

RUN = os.path.join(verdict.ROOT, "tests/run")
PASSES = "echo '[ RUN      ] Some.Passes'; echo '[       OK ] Some.Passes (0 ms)'\n"
FAILS = "echo '[ RUN      ] Some.Fails'; echo wrong; echo '[  FAILED  ] Some.Fails (0 ms)'\n"
# The switched-off processor of a machine that is there: it never says a word. Where there is no base yet,
# the machine that tries the new one runs.
STOPPED_MACHINE = """eval "$(declare -f machine_qemu | sed '1s/machine_qemu/machine_qemu_running/')"
machine_qemu() {
    [ -n "${ARRAYCTL_BASE:-}" ] || set -- "$@" -S
    echo "$BASHPID" >"$PROCESS_FILE"
    machine_qemu_running "$@"
}
"""


def run(program, silence="600"):
    """What tests/run has to say of a unit suite whose program is this shell script."""
    with tempfile.TemporaryDirectory() as build:
        path = os.path.join(build, "tests/unit/unit_tests")
        os.makedirs(os.path.dirname(path))
        with open(path, "w", encoding="ascii") as file:
            file.write(f"#!/bin/sh\n{program}")
        os.chmod(path, 0o755)
        ended = subprocess.run([RUN, build, "unit"], env=dict(os.environ, ARRAYCTL_SILENCE=silence),
                               capture_output=True, text=True, check=False)
        assert ended.stderr == "", ended.stderr
        again = re.findall(r"^    again: (.*)", ended.stdout, re.M)
        text = ended.stdout.replace(build, "BUILD")
        repeated = [subprocess.run(command, shell=True, cwd=verdict.ROOT, capture_output=True, text=True,
                                   check=False).stdout for command in again if silence == "600"]
    lines = [line for line in text.split("\n") if not line.startswith("took ")]
    return lines[:-1], ended.returncode, repeated


def is_running(process):
    return os.path.exists(f"/proc/{process}") and "Z" not in open(f"/proc/{process}/stat", encoding="ascii").read()


def case_outcomes_are_told_and_counted():
    assert run(PASSES) == (["ok Some.Passes", "1 passed, 0 failed"], 0, [])


def case_a_failure_comes_with_what_is_wrong_and_the_command_that_runs_it_again():
    lines, status, repeated = run(PASSES + 'case "$*" in *Fails|*"*") ' + FAILS.replace("\n", "") + ";; esac; exit 1")
    assert lines == ["ok Some.Passes", "FAILED Some.Fails", "    wrong", "    again: tests/run BUILD unit Some.Fails",
                     "1 passed, 1 failed"] and status == 1, lines
    assert len(repeated) == 1 and "FAILED Some.Fails\n" in repeated[0], repeated


def case_a_program_that_dies_fails_the_test_that_ran():
    lines, status, _ = run(PASSES + "echo '[ RUN      ] Some.Dies'; kill -SEGV $$")
    assert lines[1:4] == ["FAILED Some.Dies", "    it ended by signal SIGSEGV", "    again: tests/run BUILD unit Some.Dies"]
    assert (lines[-1], status) == ("1 passed, 1 failed", 1), lines


def case_a_program_that_dies_between_tests_has_failed():
    lines, status, _ = run(PASSES + "exit 3")
    assert (lines[1:3], status) == (["FAILED unit_tests", "    it ended with status 3"], 1), lines


def case_a_program_that_runs_nothing_has_failed():
    lines, status, _ = run("exit 0")
    assert (lines[:2], status) == (["FAILED unit", "    it ran nothing"], 1), lines


def case_a_hang_is_ended_and_told():
    with tempfile.NamedTemporaryFile() as told:
        lines, status, _ = run(f"{PASSES}echo '[ RUN      ] Some.Hangs'; sleep 1000000 & echo $! >{told.name}; wait", "5")
        child = told.read().decode().strip()
    assert lines[1:3] == ["FAILED Some.Hangs", "    it hangs: silent for 10 s"], lines
    assert (lines[-1], status) == ("1 passed, 1 failed", 1), lines
    assert child and not is_running(child)


def case_a_program_that_is_slow_and_alive_is_left_alone():
    lines, status, _ = run("for i in 1 2 3 4 5 6 7 8 9 10 11; do echo $i; sleep 1; done\n" + PASSES, "3")
    assert (lines[-1], status) == ("1 passed, 0 failed", 0), lines


def case_a_machine_that_stops_is_ended_and_told():
    with tempfile.TemporaryDirectory() as folder:
        machine, process = os.path.join(folder, "machine.sh"), os.path.join(folder, "process")
        with open(machine, "w", encoding="ascii") as file:
            file.write(STOPPED_MACHINE)
        ended = subprocess.run(
            ["appliance/run", "--build", "none", "--disks", "1", "--silence", "4", "appliance/demo.sh"],
            cwd=verdict.ROOT, env=dict(os.environ, ARRAYCTL_MACHINE=machine, PROCESS_FILE=process),
            capture_output=True, text=True, check=False)
        with open(process, encoding="ascii") as file:
            assert not is_running(file.read().strip())
    assert ended.returncode == 125, ended
    assert "appliance: silent for 4 s, so it hangs\n" in ended.stderr, ended.stderr


verdict.cases(globals(), "".join(sys.argv[1:2]))
