# SPDX-License-Identifier: MIT
#
# Which row of the page of recovery it is: what one sees of the disks behind a reboot comes in, as the page's
# block prints it; "row N" comes out, "ended" for a run that had come to its end, and nothing for a state that
# the page does not have.
#
#     awk -v ran=initsys|newvol|destroy -v had=data|blank -f rows.awk
#
# The cases on real disks read it, and the kill suite.
/^sd/ {
    disks++
    parts = ""
    for (i = 2; i <= NF; i++) parts = parts substr($i, 1, 1)
    count[parts]++
    if (/3:md2/) data++
}
function row() {
    if (ran == "initsys" && had == "data") {
        if (data < disks) return 0
        if (count["3"] > 0 && count["3"] + count["13"] + count["123"] == disks) return 1
        if (count["13"] > 0 && count["13"] + count["123"] == disks) return 4
        return count["123"] == disks ? 5 : 0
    }
    if (ran == "initsys") {
        if (count[""] + count["1"] + count["12"] != disks) return 0
        if (count["12"] == disks) return 5
        return count["1"] > 0 && count["12"] > 0 ? 6 : 7
    }
    if (ran == "newvol") return count["12"] + count["123"] == disks ? 9 : 0
    if (ran != "destroy" || count["123"] != disks) return 0
    return data == disks ? 11 : data == disks - 1 ? 12 : data > 0 ? 13 : -1
}
END {
    number = row()
    if (number > 0) print "row " number
    if (number < 0) print "ended"
}
