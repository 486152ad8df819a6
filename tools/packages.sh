# SPDX-License-Identifier: Apache-2.0
# Sourced by the scripts at the root: installs the Debian packages that are missing.
# shellcheck shell=bash

build_packages=(g++ cmake ninja-build pkg-config libsqlite3-dev libglib2.0-dev libjson-glib-dev
    libicu-dev libical-dev libcli11-dev libfmt-dev nlohmann-json3-dev libgtest-dev libgmock-dev
    libbenchmark-dev locales tzdata)
check_packages=(clang clang-format clang-tidy libclang-rt-14-dev)

# need_packages NAME...: installs those that are missing, naming them first.
need_packages() {
    local missing=() package
    for package in "$@"; do
        [[ $(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null) == installed ]] ||
            missing+=("$package")
    done
    ((${#missing[@]})) || return 0
    echo "Installing Debian packages: ${missing[*]}" >&2
    local as_root=()
    if ((EUID != 0)); then
        as_root=(sudo)
        [[ -t 0 ]] || as_root=(sudo --non-interactive)
    fi
    if ! { "${as_root[@]}" apt-get update -qq &&
        "${as_root[@]}" env DEBIAN_FRONTEND=noninteractive apt-get install -y -qq \
            --no-install-recommends "${missing[@]}" >/dev/null; }; then
        echo "Could not install them. Run as root: apt-get install ${missing[*]}" >&2
        return 3
    fi
}

# build_preset NAME [TARGET...]: configures once, then builds; quiet unless something is to be said.
build_preset() {
    local preset=$1
    shift
    if [[ ! -f build/$preset/build.ninja ]]; then
        cmake --preset "$preset" >"/tmp/qor-configure.$$" 2>&1 ||
            { cat "/tmp/qor-configure.$$" >&2; rm -f "/tmp/qor-configure.$$"; return 3; }
        rm -f "/tmp/qor-configure.$$"
    fi
    cmake --build --preset "$preset" ${1:+--target "$@"}
}
