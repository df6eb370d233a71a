#!/bin/sh
# SPDX-License-Identifier: MIT
# Data arrays over one to four disks, at the level that suits or that a marker asks for, and what
# keeps them from being made.
# disks: 6
# size: 4672M
# shellcheck disable=SC2086,SC2317  # lists of words; check must call the functions
# shellcheck source=SCRIPTDIR/../lib-setup.sh
. /appliance/lib-setup.sh
plan 16

USAGE='usage:\n\tarrayctl destroy <RAID ID> \n\tarrayctl status <RAID ID> \n'
USAGE=$USAGE'\tarrayctl newvol \n\tarrayctl initsys \n\tarrayctl initsys-dd \n'

# How the tool asks for a data partition; the argument behind the number is empty.
DATA_COMMAND='/sbin/sfdisk -N3  -uS -q -f -j260352 -z-1 -tfd -F'
EXPANSION_UNIT='0x0 esataportcfg=0x7 support_dual_head=yes'

# level_is LEVEL DISK...: one run with what it says and leaves behind.
level_is() {
    level=$1
    shift
    check 'newvol' says 0 "Creating RAID $level volume... \n" arrayctl newvol
    check_tables "$WHOLE_8" "$@"
    members=$(printf '%s3 ' "$@")
    check 'array' array_is 2 "raid$level" 1.2 $members
    check 'superblocks' claims_are "1.2 2 raid$level $#" $members
    stop_arrays 2
}

# Stands in for the partitioner and refuses one thing.
break_partitioner() {
    mv /sbin/sfdisk /sbin/sfdisk.whole
    cat >/sbin/sfdisk <<SCRIPT
#!/bin/sh
case "\$*" in
$1) echo 'out of order' >&2 && exit 2 ;;
esac
exec /sbin/sfdisk.whole "\$@"
SCRIPT
    chmod +x /sbin/sfdisk
}

mend_partitioner() {
    mv /sbin/sfdisk.whole /sbin/sfdisk
}

for disk in sdb sdc sdd; do
    lay_out "$disk" "$LAYOUT_8"
done

bays 0x1
# Whatever is behind the system partitions goes, logical partitions included.
lay_out sda "$LAYOUT_8
3 9437184 30000 83
4 9469184 90000 5
5 9470000 20000 83
6 9492000 20000 83"
level_is 1 sda
verdict 'one disk, with other data partitions on it'

bays 0x3
level_is 1 sda sdb
verdict 'two disks, one with an older array on it'

bays 0x7
level_is 5 sda sdb sdc
verdict 'three disks'

bays 0xf
level_is 5 sda sdb sdc sdd
check 'system partitions are no matter' [ "$(arrays_known)" = '' ]
verdict 'four disks'

touch /tmp/raid.0
level_is 0 sda sdb sdc sdd
verdict 'RAID 0 over four disks'

touch /tmp/raid.1 /tmp/raid.5
bays 0x3
level_is 0 sda sdb
verdict 'the marker of RAID 0 goes before all others'

rm /tmp/raid.0
bays 0x7
level_is 1 sda sdb sdc
verdict 'the marker of RAID 1 goes before that of RAID 5'

rm /tmp/raid.1
bays 0x3
level_is 5 sda sdb
verdict 'RAID 5 over two disks'

bays 0x1
mdadm -C /dev/md2 -amd -R -l5 -f -n1 /dev/sda3 >/dev/null 2>&1
refusal=$?
check 'newvol' says 1 'Creating RAID 5 volume... \n' arrayctl newvol
check 'why' logged "err Failed to create RAID '/dev/md2' on '/dev/sda3 ', errno=$refusal"
check_tables "$WHOLE_8" sda
check 'no array' [ -z "$(arrays_known)" ]
rm /tmp/raid.5
verdict 'RAID 5 over one disk is refused by mdadm'

bays 0xf
watch_writes sda sdb sdc sdd
check 'an argument too many' says 1 "$USAGE" arrayctl newvol 2
bays 0x0
check 'no disk' says 1 'No disk to create RAID... \n' arrayctl newvol
check 'nothing is touched' nothing_written
verdict 'an argument too many, and no disk'

# The one that has no system partitions yet.
bays 0x20
check 'newvol' says 1 '' arrayctl newvol
check 'why' logged 'err Failed to create data partition of /dev/sdf, errno=0x2000'
check 'the command' logged "err Failed to [$DATA_COMMAND /dev/sdf], err=256"
check 'no partition' [ -z "$(table_of sdf)" ]
check 'no array' [ -z "$(arrays_known)" ]
verdict 'a disk without system partitions'

bays 0x7
rm -f "$OPERATION_ERRORS"
for disk in sda sdb sdc; do
    lay_out "$disk" "$LAYOUT_8
3 9437184 65536 83"
done
break_partitioner '-N3*sdb'
check 'newvol' says 1 '' arrayctl newvol
check 'the command' logged "err Failed to [$DATA_COMMAND /dev/sdb], err=512"
check 'why' logged 'err Failed to create data partition of /dev/sdb, errno=0x2000'
words="command=\"$DATA_COMMAND /dev/sdb\" Error=\"out of order \""
check 'its own words' [ "$(operation_errors)" = "$words" ]
check 'done before it' table_is sda "$WHOLE_8"
check 'half done' table_is sdb "$LAYOUT_8"
check 'not begun after it' table_is sdc "$LAYOUT_8" '3 9437184 65536 83'
check 'no array' [ -z "$(arrays_known)" ]
mend_partitioner
verdict 'a partition that cannot be made in the middle'

break_partitioner '--fast-delete*sdb'
check 'newvol' says 0 'Creating RAID 5 volume... \n' arrayctl newvol
check 'only noted' logged "debug Failed to do '/sbin/sfdisk --fast-delete 3:128 /dev/sdb'"
check 'array' array_is 2 raid5 1.2 sda3 sdb3 sdc3
mend_partitioner
verdict 'a partition that cannot be deleted, but is not there anyway'

# The array of the run before still runs.
store_data md2
uuid=$(uuid_of 2)
check 'newvol' says 1 '' arrayctl newvol
check 'why' logged 'err Failed to create data partition of /dev/sda, errno=0x2000'
check 'array' array_is 2 raid5 1.2 sda3 sdb3 sdc3
check 'the same' [ "$(uuid_of 2)" = "$uuid" ]
check_tables "$WHOLE_8" sda sdb sdc
check 'data' data_is_whole md2
stop_arrays 2
verdict 'a data array that runs'

bays $EXPANSION_UNIT raidgroup_split_units=2
expansion_unit /dev/sda,/dev/sdb,/dev/sdc
watch_writes sdc
level_is 1 sda sdb
check 'the limit' logged 'err Get 2 disks, more than raid group split unit'
check 'the one over the limit' nothing_written
verdict 'no more disks of an expansion unit than its limit'

bays $EXPANSION_UNIT raidgroup_split_units=0
check 'newvol' says 1 'No disk to create RAID... \n' arrayctl newvol
check 'the limit' logged 'err Get 0 disks, more than raid group split unit'
bays 0x7 raidgroup_split_units=2
check 'one head' says 0 'Creating RAID 5 volume... \n' arrayctl newvol
check 'no limit' [ -z "$(log_of_run | grep 'raid group split unit')" ]
check 'array' array_is 2 raid5 1.2 sda3 sdb3 sdc3
must umount "$SCSI_HOSTS"
verdict 'a limit of none, and a machine that knows no limit'

finish
