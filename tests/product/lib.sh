# shellcheck shell=bash
# SPDX-License-Identifier: MIT
#
# Cases of the product suite that are shell: each is a command that has to succeed.

nPassed=0
nFailed=0

complain() {
    printf '%s\n' "$*"
    return 1
}

is() { # NAME COMMAND...
    local szName=$1 szOutput
    shift
    if szOutput=$("$@" 2>&1); then
        nPassed=$((nPassed + 1))
        printf 'ok %s\n' "$szName"
    else
        nFailed=$((nFailed + 1))
        printf 'FAILED: %s\n%s\n' "$szName" "$szOutput"
    fi
}

summary() {
    printf '%d passed, %d failed\n' "$nPassed" "$nFailed"
    [ "$nFailed" -eq 0 ] && [ "$nPassed" -gt 0 ]
}
