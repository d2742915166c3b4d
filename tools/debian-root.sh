# SPDX-License-Identifier: Apache-2.0
# Debian root file systems below build/roots, made once and kept. Sourced after common.sh, never
# run.

readonly roots=$tree/build/roots

# Where this machine's own Debian comes from. Nothing where apt does not know: debootstrap has a
# default.
debian_mirror() {
    apt-get indextargets --format '$(REPO_URI)' 'Created-By: Packages' 'Label: Debian' |
        sort -u | head -n 1
}

# suite_of RELEASE: the name of a Debian by its number.
suite_of() {
    case $1 in
        12) echo bookworm ;;
        13) echo trixie ;;
        *) echo "no Debian '$1' is known here, only 12 and 13" >&2; return 1 ;;
    esac
}

# debian_root NAME SUITE ARCHITECTURE PACKAGE...: a minimal system with these packages. Another list
# of packages makes it anew.
debian_root() {
    local folder=$roots/$1 suite=$2 architecture=$3 wanted="$*"
    shift 3
    [[ $(cat "$folder.made" 2>/dev/null) != "$wanted" ]] || return 0
    rm -rf "$folder" "$folder.made"
    mkdir -p "$folder" "$roots/archives/$suite"
    flock "$roots/archives/$suite.lock" debootstrap --variant=minbase --arch="$architecture" \
        --cache-dir="$roots/archives/$suite" "$suite" "$folder" $(debian_mirror) || return
    # debootstrap's own way of installing knows no order of dependencies.
    in_root "$folder" apt-get -q update &&
        with_archives "$suite" "$folder" apt-get -q -y -o Dpkg::Use-Pty=0 --no-install-recommends \
            install "$@" || return
    echo "$wanted" >"$folder.made"
}

# with_archives SUITE FOLDER COMMAND...: in the root, where apt keeps what it fetches for the next
# root. One at a time: apt itself would not wait for another's.
with_archives() {
    local archives=$roots/archives/$1
    shift
    mkdir -p "$archives/partial"
    {
        flock 8
        BIND="${BIND-} $archives:/var/cache/apt/archives" in_root "$@" 8>&-
    } 8>"$archives.lock"
}

# in_root FOLDER COMMAND...: as root in it, with the machine's network and nothing else of it but
# the folders that BIND names, each a word SOURCE:TARGET.
in_root() {
    local folder=$1
    shift
    unshare --mount --propagation private --pid --fork --kill-child --uts --ipc -- bash -euc '
        folder=$1
        shift
        mount --bind "$folder" "$folder"
        mount -t proc proc "$folder/proc"
        mount --rbind /dev "$folder/dev"
        mount -t tmpfs -o mode=1777 tmp "$folder/tmp"
        for bound in ${BIND-}; do
            mkdir -p "$folder${bound#*:}"
            mount --bind "${bound%:*}" "$folder${bound#*:}"
        done
        cp -L /etc/resolv.conf "$folder/etc/resolv.conf" 2>/dev/null || :
        exec env -i PATH="${ROOT_PATH-}/usr/sbin:/usr/bin:/sbin:/bin" LC_ALL=C.UTF-8 HOME=/root \
            DEBIAN_FRONTEND=noninteractive ${ROOT_ENVIRONMENT-} chroot "$folder" "$@"
    ' in_root "$folder" "$@"
}
