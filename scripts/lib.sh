# shellcheck shell=bash disable=SC2034
# Shared by the scripts of this folder; sourced, never run. Sets KRV_ROOT and works from there.
set -euo pipefail
KRV_ROOT=$(cd "$(dirname "${BASH_SOURCE[0]}")/.." && pwd)
cd "$KRV_ROOT"

# What each job needs, as Debian 12 packages.
KRV_PACKAGES_BUILD=(g++ cmake ninja-build make pkg-config
    libxerces-c-dev libxalan-c-dev libexpat1-dev libboost-regex-dev libproj-dev proj-data
    libtiff-dev libgeotiff-dev libjpeg62-turbo-dev libdeflate-dev libisal-dev libzstd-dev liblz4-dev zlib1g-dev libopenjp2-7-dev
    libcli11-dev libfmt-dev nlohmann-json3-dev libpng-dev libvips-dev)
KRV_PACKAGES_TEST=(libgtest-dev libgmock-dev)
# What benchmarks compare with; nothing else needs them.
KRV_PACKAGES_BENCH=(libcairo2-dev libagg-dev libvips-tools libtiff-tools)
KRV_PACKAGES_FUZZ=(clang-16 libclang-rt-16-dev)
KRV_PACKAGES_CI=(clang-format-14 clang-tidy-16)
# API pages.
KRV_PACKAGES_DOC=(doxygen)

say() { printf '\n== %s\n' "$*"; }
fail() { printf 'error: %s\n' "$*" >&2; exit 1; }

# krv_missing PACKAGE...: those that are not installed, on one line.
krv_missing()
{
    local oPackage oMissing=""
    for oPackage in "$@"; do
        if [ "$(dpkg-query -W -f='${db:Status-Status}' "$oPackage" 2>/dev/null)" != installed ]; then
            oMissing+=" $oPackage"
        fi
    done
    printf '%s' "${oMissing# }"
}

# krv_setup PACKAGE...: installs what is missing. Touches neither the network nor the system when nothing is.
krv_setup()
{
    local oMissing oSudo=""
    if ! command -v dpkg-query >/dev/null; then
        echo "This is not a Debian system; its equivalents of these packages must be there: $*"
        return
    fi
    oMissing=$(krv_missing "$@")
    if [ -z "$oMissing" ]; then
        echo "Set-up: every needed package is installed."
        return
    fi
    say "Set-up: installing $oMissing"
    if [ "$(id -u)" -ne 0 ]; then
        oSudo=sudo
        command -v sudo >/dev/null || fail "these packages are missing, and there is no sudo to install them: $oMissing"
    fi
    $oSudo apt-get update -q </dev/null || fail "apt-get update failed; these packages are missing: $oMissing"
    # shellcheck disable=SC2086 # one argument per package
    $oSudo env DEBIAN_FRONTEND=noninteractive apt-get install -q -y --no-install-recommends $oMissing </dev/null ||
        fail "apt-get could not install: $oMissing"
}

# krv_jobs: one compiler per processor, as long as each has 1.5 GiB of memory.
krv_jobs()
{
    local nProcessors nFit
    nProcessors=$(nproc)
    nFit=$(awk '/^MemAvailable:/ { print int($2 / 1572864) }' /proc/meminfo)
    [ "$nFit" -ge 1 ] || nFit=1
    echo $((nProcessors < nFit ? nProcessors : nFit))
}

# krv_build PRESET [CMAKE OPTION...]: configures and builds build/PRESET; quiet unless something goes wrong.
krv_build()
{
    local oPreset=$1 oLog="build/$1/configure.log"
    shift
    say "Building build/$oPreset"
    mkdir -p "build/$oPreset"
    if ! cmake --preset "$oPreset" "$@" >"$oLog" 2>&1; then
        cat "$oLog"
        fail "configuring build/$oPreset failed"
    fi
    cmake --build --preset "$oPreset" -j "$(krv_jobs)"
}
