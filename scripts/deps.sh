# Copyright (C) 2026 The vyrservice Authors
# SPDX-License-Identifier: Apache-2.0

# shellcheck shell=bash
# The Debian 12 packages this project needs, and a function that installs the missing ones.
# Sourced by scripts/test and scripts/demo; running it alone installs them:
#   bash scripts/deps.sh

VYR_DEBIAN_PACKAGES=(
    # Build
    cmake
    ninja-build
    g++
    git
    aidl
    # Checks of the device build files (scripts/check-device), Soong's own loader among them
    blueprint-tools
    python3
    golang-go
    golang-android-soong-dev
    golang-github-google-blueprint-dev
    golang-goprotobuf-dev
    golang-google-protobuf-dev
    # Platform libraries the service is written against
    android-liblog-dev
    android-libbase-dev
    android-libcutils-dev
    libtinyxml2-dev
    # Tests and benchmarks
    googletest
    libgtest-dev
    libgmock-dev
    libbenchmark-dev
    # JSON parsing in tests of the service's dump and in the simulators' replay
    nlohmann-json3-dev
    # tools/plot-recording
    python3-matplotlib
    # unshare and nsenter, for the tests that run processes in their own namespaces
    util-linux
    # The fuzz preset (libFuzzer comes with clang's runtime libraries) and the format check
    clang
    libclang-rt-14-dev
    # clang's thread-safety analysis needs libc++, whose mutexes carry its annotations
    libc++-14-dev
    libc++abi-14-dev
    clang-format
    # The arm64 step: Debian's aarch64 compiler, the same libraries for arm64 (multiarch), and
    # qemu-user to run what it builds
    g++-aarch64-linux-gnu
    qemu-user-static
    android-liblog-dev:arm64
    android-libbase-dev:arm64
    android-libcutils-dev:arm64
    libtinyxml2-dev:arm64
    libgtest-dev:arm64
    libgmock-dev:arm64
    libbenchmark-dev:arm64
)

# Prints the packages of VYR_DEBIAN_PACKAGES that are not installed, one per line. A name without
# an architecture means the machine's own (or "all"): with arm64 added, a Multi-Arch package may be
# installed for both, and only the native one counts for it.
vyr_missing_packages() {
    local package native status
    native=$(dpkg --print-architecture)
    for package in "${VYR_DEBIAN_PACKAGES[@]}"; do
        if [[ "$package" == *:* ]]; then
            status=$(dpkg-query -W -f='${Status}' "$package" 2>/dev/null)
        else
            status=$(dpkg-query -W -f='${Status}' "$package:$native" 2>/dev/null ||
                dpkg-query -W -f='${Status}' "$package:all" 2>/dev/null)
        fi
        [[ "$status" == "install ok installed" ]] || echo "$package"
    done
}

# Installs whatever is missing with apt-get, as root or through sudo, without asking anything.
vyr_install_deps() {
    if ! command -v dpkg-query >/dev/null 2>&1 || ! command -v apt-get >/dev/null 2>&1; then
        echo "deps: this is not a Debian system; install the equivalents of:" >&2
        echo "  ${VYR_DEBIAN_PACKAGES[*]}" >&2
        return 1
    fi
    local missing
    mapfile -t missing < <(vyr_missing_packages)
    if ((${#missing[@]} == 0)); then
        return 0
    fi
    echo "deps: installing ${missing[*]}"
    local -a as_root=()
    if ((EUID != 0)); then
        if ! command -v sudo >/dev/null 2>&1; then
            echo "deps: not root and no sudo; as root run:" >&2
            echo "  apt-get update && apt-get install -y ${missing[*]}" >&2
            return 1
        fi
        # Without a terminal sudo must not wait for a password that nobody can type.
        if [[ -t 0 ]]; then as_root=(sudo); else as_root=(sudo -n); fi
    fi
    local -a apt=("${as_root[@]}" env DEBIAN_FRONTEND=noninteractive apt-get -q -y
                  -o Dpkg::Options::=--force-confdef -o Dpkg::Options::=--force-confold)
    # Packages of another architecture need it added to dpkg first.
    if [[ " ${missing[*]}" == *":arm64"* ]] && ! dpkg --print-foreign-architectures | grep -qx arm64; then
        "${as_root[@]}" dpkg --add-architecture arm64 || {
            echo "deps: cannot add the arm64 architecture to dpkg" >&2
            return 1
        }
    fi
    "${apt[@]}" update </dev/null &&
        "${apt[@]}" install --no-install-recommends "${missing[@]}" </dev/null || {
        echo "deps: apt-get failed" >&2
        return 1
    }
    mapfile -t missing < <(vyr_missing_packages)
    if ((${#missing[@]} != 0)); then
        echo "deps: still missing after apt-get: ${missing[*]}" >&2
        return 1
    fi
}

if [[ "${BASH_SOURCE[0]}" == "$0" ]]; then
    vyr_install_deps
fi
