#!/bin/sh
# SPDX-License-Identifier: MIT
#
# Inside the virtual appliance: the demo, then what the docs say to type there. Each part begins with
# a line of its own, so that the reader can tell them apart.
export PATH=/usr/bin:/usr/sbin

/demo.sh
while IFS= read -r command; do
    printf '== %s\n' "$command"
    sh -c "$command"
    printf '== status %s\n' "$?"
done </commands
