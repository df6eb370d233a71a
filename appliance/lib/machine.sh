# SPDX-License-Identifier: MIT
# shellcheck shell=bash
#
# One machine: its options, what it is given, its disks, and QEMU around it.

# Inside, a condition is waited for half as long, so that the machine can still tell which one it was.
# shellcheck source=SCRIPTDIR/../../tests/support/verdict/silence.sh
. "$SOURCE_DIR/tests/support/verdict/silence.sh"

nDisks=4
szDiskSize=6G
szKeepDir=
szBuildDir=$SOURCE_DIR/build/release
nSilence=$((2 * SILENCE_SECONDS))
szTool=${ARRAYCTL_TOOL:-}
szConsoleCopy=
szAnswers=
szWorkDir=
szBaseDir=
szAccelerator=
declare -a files=() rest=() diskArguments=()

MEMORY_MB=768
PROBE_SECONDS=10

# shellcheck disable=SC2034  # fQuiet and rest are read elsewhere
machine_options() {
    while [ $# -gt 0 ]; do
        case $1 in
        --disks | --size | --keep | --build | --silence | --file | --console | --answers | --release)
            [ $# -ge 2 ] || die "$1 needs a value; see --help"
            machine_option "$1" "$2"
            shift 2
            ;;
        --quiet) fQuiet=yes && shift ;;
        --udev) fUdev=yes && shift ;;
        --help) usage && exit 0 ;;
        --) shift && break ;;
        -*) die "unknown option $1; see --help" ;;
        *) break ;;
        esac
    done
    rest=("$@")
}

# shellcheck disable=SC2034  # szAnswers is read elsewhere
machine_option() {
    case $1 in
    --disks) nDisks=$2 ;;
    --size) szDiskSize=$2 ;;
    --keep) szKeepDir=$2 ;;
    --build) szBuildDir=$2 ;;
    --silence) nSilence=$2 ;;
    --file) files+=("$2") ;;
    --release) szRelease=$2 ;;
    --console) szConsoleCopy=$2 ;;
    --answers) szAnswers=$2 ;;
    esac
}

machine_options_check() {
    local szFile
    [[ $nDisks =~ ^[0-9]+$ && $nDisks -le 64 ]] || die "--disks takes 0 to 64, not $nDisks"
    [[ $nSilence =~ ^[1-9][0-9]*$ ]] || die "--silence takes seconds, not $nSilence"
    [[ $szDiskSize =~ ^[1-9][0-9]*[KMGT]?$ ]] || die "--size takes a size such as 6G"
    is_own_release || [[ " ${DEBIAN_RELEASES[*]} " == *" $szRelease "* ]] ||
        die "--release takes ${DEBIAN_RELEASES[*]}, not $szRelease"
    for szFile in "${files[@]}"; do
        [[ $szFile == ?*:/?* && -e ${szFile%%:*} ]] || die "--file takes SRC:/DEST, not $szFile"
    done
    [ -z "$szTool" ] || [ -x "$szTool" ] || die "no program $szTool"
    [ "$szBuildDir" = none ] || [ -x "$szBuildDir/tool/arrayctl" ] ||
        die "no tool/arrayctl in $szBuildDir; build it (cmake --preset release &&" \
            "cmake --build --preset release), or say --build none"
}

machine_open() {
    szWorkDir=$(mktemp -d "${TMPDIR:-/tmp}/appliance.XXXXXX")
    szBaseDir=$(base_ready) || exit
}

machine_close() {
    [ -z "$szWorkDir" ] && return
    [ -z "$szConsoleCopy" ] || cp "$szWorkDir/console.log" "$szConsoleCopy" 2>/dev/null
    rm -rf "$szWorkDir"
}

# The fresh build, the files of this run and the scripts of the guest, as a second archive behind
# the base: the kernel unpacks one after the other.
machine_overlay() {
    local szRoot=$szWorkDir/overlay szFile
    mkdir -p "$szRoot/usr/bin" "$szRoot/appliance"
    install -D "$APPLIANCE_DIR/guest/init" "$szRoot/init"
    install -D "$APPLIANCE_DIR/guest/arrayctl" "$szRoot/usr/bin/arrayctl"
    install -D "$APPLIANCE_DIR/guest/arrayctl-rehearse" "$szRoot/usr/bin/arrayctl-rehearse"
    install -D -m 644 "$APPLIANCE_DIR/guest/nuroinfo.conf" "$szRoot/etc.defaults/nuroinfo.conf"
    [ "$fUdev" = yes ] || install -D -m 644 "$APPLIANCE_DIR/guest/lvm.conf" "$szRoot/etc/lvm/lvm.conf"
    install -D -m 644 "$APPLIANCE_DIR/guest/welcome" "$szRoot/appliance/welcome"
    overlay_build "$szRoot" tool/arrayctl /usr/sbin/arrayctl
    overlay_build "$szRoot" platform/mdrequests/mdrequests /usr/sbin/mdrequests
    overlay_build "$szRoot" platform/sfdisk/sfdisk /usr/sbin/sfdisk
    [ -z "$szTool" ] || overlay_file "$szRoot" "$szTool" /usr/sbin/arrayctl
    overlay_build "$szRoot" rehearse/arrayctl-rehearse /usr/sbin/arrayctl-rehearse
    for szFile in "${files[@]}"; do
        overlay_file "$szRoot" "${szFile%%:*}" "${szFile#*:}"
    done
}

overlay_build() {
    if [ -e "$szBuildDir/$2" ]; then
        copy_with_libraries "$szBuildDir/$2" "$3" "$1"
    fi
}

# The programs of a newer release need its own libraries, which serve those of this machine, too.
is_inside() {
    is_newer_release && grep -qx "${1#/}" "$szBaseDir/libraries"
}

# A folder's entry in the archive would replace the link of the same name, so /bin and the like
# are taken for what they stand for.
overlay_file() {
    local szRoot=$1 szSource=$2 szDest=$3
    [[ $szDest =~ ^/(bin|sbin|lib|lib64)/ ]] && szDest=/usr$szDest
    mkdir -p "$szRoot$(dirname "$szDest")"
    if [ -d "$szSource" ]; then
        cp -rL "$szSource" "$szRoot$szDest"
    else
        copy_with_libraries "$szSource" "$szDest" "$szRoot"
    fi
}

machine_initrd() {
    pack "$szWorkDir/overlay" "$szWorkDir/overlay.cpio"
    cat "$szBaseDir/base.cpio" "$szWorkDir/overlay.cpio" >"$szWorkDir/initrd"
}

# Blank unless they were kept: a kept image is taken as it is.
machine_disks() {
    local szDir=${szKeepDir:-$szWorkDir} nDisk
    mkdir -p "$szDir"
    for ((nDisk = 0; nDisk < nDisks; nDisk++)); do
        [ -e "$szDir/disk$nDisk.raw" ] || truncate -s "$szDiskSize" "$szDir/disk$nDisk.raw" ||
            die "no disk of $szDiskSize in $szDir"
        diskArguments+=(
            -drive "if=none,id=disk$nDisk,format=raw,cache=unsafe,discard=unmap,detect-zeroes=unmap,file=$szDir/disk$nDisk.raw"
            -device "scsi-hd,bus=scsi.0,scsi-id=$nDisk,drive=disk$nDisk,serial=disk$nDisk"
        )
    done
}

# A node /dev/kvm is no promise: on some virtual hosts the guest hangs before its first message.
# So one boot without anything to start decides, once for this kernel and this QEMU.
machine_accelerator() {
    local szAnswer
    szAnswer=$CACHE_DIR/accelerator-$(uname -r)-$("$QEMU" --version | sed -n '1s/[^0-9.]*\([0-9.]*\).*/\1/p')
    if [ -n "${ARRAYCTL_ACCEL:-}" ]; then
        printf '%s\n' "$ARRAYCTL_ACCEL"
    elif [ ! -w /dev/kvm ]; then
        echo tcg
    else
        [ -s "$szAnswer" ] || kvm_probe >"$szAnswer"
        cat "$szAnswer"
    fi
}

kvm_probe() {
    note "trying hardware virtualisation (up to $PROBE_SECONDS s, once)"
    timeout "$PROBE_SECONDS" "$QEMU" -nodefaults -no-user-config -display none -no-reboot \
        -machine q35,accel=kvm -cpu max -m 256 -kernel "$szBaseDir/vmlinuz" \
        -append "console=ttyS0 panic=-1" -serial "file:$szWorkDir/probe.log" \
        </dev/null >/dev/null 2>&1
    if grep -q 'Kernel panic' "$szWorkDir/probe.log" 2>/dev/null; then
        echo kvm
    else
        echo tcg
    fi
}

# Runs QEMU with the arguments given on top of those that every machine has.
machine_qemu() {
    local szKernelLine=$1
    shift
    # oops=panic: a driver that stumbles must not go unseen; panic=-1 and -no-reboot: it ends at once.
    # no_timer_check: on a busy host the kernel would miss the ticks that it counts while it boots.
    exec "$QEMU" -nodefaults -no-user-config -display none -no-reboot \
        -machine "q35,accel=$szAccelerator" -cpu max -m "$MEMORY_MB" \
        -kernel "$szBaseDir/vmlinuz" -initrd "$szWorkDir/initrd" \
        -append "console=ttyS0 panic=-1 oops=panic no_timer_check DISKS=$nDisks SILENCE=$((nSilence / 2)) $szKernelLine" \
        -device virtio-scsi-pci,id=scsi "${diskArguments[@]}" "$@"
}
