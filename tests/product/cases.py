# SPDX-License-Identifier: MIT
"""A handful of cases in a file: functions whose name begins with "case_", each of which asserts."""
import sys
import traceback


def run(module):
    passed = failed = 0
    for name, case in list(vars(module).items()):
        if not name.startswith("case_"):
            continue
        try:
            case()
            passed += 1
            print(f"ok {name[5:].replace('_', ' ')}")
        except Exception:  # a case that breaks has failed, and the others still run
            failed += 1
            print(f"FAILED: {name[5:].replace('_', ' ')}")
            traceback.print_exc(file=sys.stdout)
    print(f"{passed} passed, {failed} failed")
    sys.exit(1 if failed or not passed else 0)


def same(found, expected, what):
    """Both as sets of words, so that the message tells what is missing and what is too much."""
    found, expected = set(found), set(expected)
    assert found == expected, f"{what}: missing {sorted(expected - found)}, too much {sorted(found - expected)}"
