# SPDX-License-Identifier: MIT
# shellcheck shell=sh disable=SC2034
#
# The one bound of all suites. A bound ends a hang and nothing else: it is how many seconds something
# may be silent, not how long it may take. Whoever waits for a tool or a condition waits once as long,
# a machine around it twice, and tests/run around all of that three times, so that the innermost one
# tells what hangs. Shell reads this file, verdict.py and CMake read the number from it.
#
# The environment shortens it for the tests of the bound itself.
SILENCE_SECONDS=${ARRAYCTL_SILENCE:-600}
