# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# Outcomes as verdict.py has them, told by shell scripts. szFilter is the filter that they were given.

szFilter=${szFilter:-}

# Whether a test of that name was asked for.
wanted() { # NAME
    # shellcheck disable=SC2053  # a pattern
    [[ -z $szFilter || $1 == *"$szFilter"* || $1 == $szFilter ]]
}

# What a failed test says comes on standard input.
failed() { # NAME
    printf 'FAILED %s\n' "$1"
    sed 's/^/    /'
}

# A command that has to succeed; what it prints is told when it does not.
test_is() { # NAME COMMAND...
    local szName=$1 szSaid
    shift
    wanted "$szName" || return 0
    if szSaid=$("$@" 2>&1); then
        printf 'ok %s\n' "$szName"
    else
        failed "$szName" <<<"$szSaid"
    fi
}

# For such commands: says what is wrong and fails.
complain() {
    printf '%s\n' "$*"
    return 1
}
