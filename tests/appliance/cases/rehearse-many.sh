#!/bin/sh
# SPDX-License-Identifier: MIT
# More disks than the duplicator's command has room for: a rehearsal says so.
# disks: 26
# size: 4672M
# shellcheck disable=SC2086,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-rehearse.sh
. /appliance/lib-rehearse.sh
plan 2

printf '#!/bin/sh\n' >/bin/nurodd
chmod +x /bin/nurodd
machine internalportcfg=0xffffff usbportcfg=0x10000000 maxdisks=26
check '24 disks' warns initsys-dd 'the command does not look at /dev/sdy'
check 'all have room' is_not grep -q 'more disks than a command has room for' "$TOLD"
verdict 'as many disks as there is room for'

machine internalportcfg=0x3ffffff usbportcfg=0x10000000 maxdisks=26
check '26 disks' warns initsys-dd
check 'why' grep -q \
    'there are more disks than a command has room for: .*4 of 52 partitions left out, no room in the command' "$TOLD"
verdict 'two more'
finish
