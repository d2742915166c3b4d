# SPDX-License-Identifier: Apache-2.0
# Shell code that the programs of this folder share. Sourced, never run.

# One order of names and one language of messages, wherever this runs.
export LC_ALL=C

readonly tree=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd -P)
readonly self=$tree/tools/${0##*/}

if [[ -t 1 && -z ${NO_COLOR-} && ${TERM-dumb} != dumb ]]; then
    readonly bold=$'\e[1m' red=$'\e[31m' green=$'\e[32m' cyan=$'\e[36m' plain=$'\e[0m'
else
    readonly bold='' red='' green='' cyan='' plain=''
fi

# What the program says of itself, at its top.
help_text() { awk 'NR > 2 && !/^#/ {exit} NR > 2 {sub(/^# ?/, ""); print}' "$self"; }

# Starts the program again through sudo where it is not root already.
become_root() {
    ((EUID != 0)) || return 0
    command -v sudo >/dev/null || {
        echo "${0##*/}: must be run as root (there is no sudo here)" >&2
        exit 1
    }
    exec sudo ${NO_COLOR+NO_COLOR="$NO_COLOR"} ${CI+CI="$CI"} -- "$self" "$@"
}

# What every program of this folder needs to build the library and to make a node or a lab of them.
readonly build_packages=(
    cmake ninja-build g++ pkg-config libboost-dev libcurl4-openssl-dev libssl-dev libcli11-dev
    nlohmann-json3-dev libdtl-dev libwbclient-dev libpam0g-dev libc6-dev iproute2 util-linux
    passwd procps python3
)
# What shows that the log-in is real: a PAM and a name-service module, and a client of each library.
readonly login_packages=(
    libpam-modules libpam-runtime libpam-pwdfile libnss-extrausers libc-bin pamtester openssl
    diffutils
)

# What runs the CAM service.
readonly service_packages=(
    openssl python3-aiohttp python3-alembic python3-jinja2 python3-prometheus-client
    python3-psycopg2 python3-sqlalchemy util-linux
)

# What several CAM services work with, the browser that looks at their page, and what judges their
# unit.
readonly fleet_packages=(chromium haproxy postgresql systemd)

# What the tests need beyond those.
readonly test_packages=(
    googletest python3-jsonschema patch binutils "${service_packages[@]}"
)

missing_packages() {
    local -A installed=()
    local name
    while read -r name; do
        installed[$name]=1
    done < <(dpkg-query -W -f '${db:Status-Status} ${Package}\n' "$@" 2>/dev/null |
        sed -n 's/^installed //p')
    for name in "$@"; do
        [[ -n ${installed[$name]-} ]] || echo "$name"
    done
}

# Installs those of the packages named that are missing; says nothing. The lists of packages are
# fetched only where the ones at hand do not serve.
install_packages() {
    local -a missing apt
    mapfile -t missing < <(missing_packages "$@")
    ((${#missing[@]})) || return 0
    apt=(env DEBIAN_FRONTEND=noninteractive apt-get -y -q -o Dpkg::Use-Pty=0
        -o DPkg::Lock::Timeout=120)
    "${apt[@]}" install --no-install-recommends "${missing[@]}" </dev/null ||
        { "${apt[@]}" update </dev/null &&
            "${apt[@]}" install --no-install-recommends "${missing[@]}" </dev/null; }
}

# Every file that decides who may log in and how names are resolved, with mode, owner and sum.
machine_configuration() {
    local -a files=(/etc/pam.d /etc/security /etc/nsswitch.conf /etc/hosts /etc/resolv.conf
        /etc/hostname /etc/passwd /etc/group /etc/shadow /etc/tessel /etc/samba /etc/krb5.conf
        /etc/krb5.conf.d)
    {
        find "${files[@]}" -printf '%p %y %m %u %g %l\n' 2>/dev/null
        find "${files[@]}" -type f -exec sha256sum {} + 2>/dev/null
        ls -d /lib/security /usr/libexec/tslauth /run/tslauthctl.lock 2>/dev/null
        echo "host name $(uname -n)"
    } | sort
}

# Runs a command as nobody, without any capability and with an empty /tmp. The source tree is there
# even where it lies below a folder that only root may enter.
as_nobody() {
    unshare --mount --propagation private -- bash -euc '
        tree=$1
        shift
        exec {held}<"$tree"
        mount -t tmpfs -o mode=1777 tmp /tmp
        above=
        while IFS= read -r part; do
            above+=/$part
            [[ -d $above ]] || break
            if (($(stat -c "%#a" "$above") % 2 == 0)); then
                mount -t tmpfs -o mode=0755 above "$above"
                break
            fi
        done < <(dirname "$tree" | tr / "\n" | sed 1d)
        if [[ ! -d $tree ]]; then
            mkdir -p "$tree"
            mount --no-canonicalize --bind "/proc/self/fd/$held" "$tree"
        fi
        exec {held}<&-
        cd "$tree"
        exec env HOME=/nonexistent setpriv --reuid 65534 --regid 65534 --clear-groups \
            --inh-caps=-all --bounding-set=-all --no-new-privs -- "$@"
    ' as_nobody "$tree" "$@"
}
