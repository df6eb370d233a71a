# SPDX-License-Identifier: MIT
# shellcheck shell=bash

# Prints how many tests of a log of GoogleTest have passed and how many have failed. A log without
# its closing line, as a program that dies leaves it, has a failure, whatever came before.
googletest_counts() { # LOG
    awk '
        /^\[  PASSED  \] / { closed = 1; passed = $4 }
        /^\[  FAILED  \] .* ms\)$/ { failed++ }
        END { print passed + 0, failed + (!closed && !failed) }' "$1"
}
