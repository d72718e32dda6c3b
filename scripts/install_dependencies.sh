#!/bin/sh
# Installs the Debian packages that building, testing and the demo need.
# Usage: scripts/install_dependencies.sh
# Does nothing when all of them are there; as an ordinary user it asks sudo for the rest.
set -eu

packages='
    bash-completion
    bubblewrap
    clang
    clang-format
    clang-tidy
    cmake
    cppcheck
    g++
    g++-multilib
    gcovr
    googletest
    groff-base
    lib32z1-dev
    libc6-dbg
    libclang-rt-14-dev
    libcli11-dev
    man-db
    ninja-build
    nlohmann-json3-dev
    python3
    python3-jsonschema
    python3-pytest
    rpm
    scdoc
    strace
    time
    valgrind
    zlib1g-dev
'

missing=
for package in $packages; do
    status=$(dpkg-query --show --showformat='${db:Status-Status}' "$package" 2>/dev/null || true)
    [ "$status" = installed ] || missing="$missing $package"
done
[ -n "$missing" ] || exit 0

as_root=
[ "$(id -u)" -eq 0 ] || as_root=sudo
echo "Installing:$missing"
$as_root apt-get update -qq
# shellcheck disable=SC2086 # a list of words
DEBIAN_FRONTEND=noninteractive $as_root apt-get install -y -qq --no-install-recommends $missing
