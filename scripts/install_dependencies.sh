#!/bin/sh
# Installs the Debian packages that are missing:
#     scripts/install_dependencies.sh demo|fleet|test|bench|all
#
# "demo" is what a release build and the demo need, "fleet" what the demo of a fleet needs as well,
# "test" what all tests need, "bench" what the benchmarks need, and "all" what these and all other
# scripts need. Does nothing if all of them are installed; an ordinary user is asked for sudo's
# password. No name holds a version: where Debian's differ, a package that depends on the current one
# is named.
set -eu

demo='
    bubblewrap
    cmake
    g++
    libdeflate-dev
    ninja-build
    python3
    zlib1g-dev
'
fleet='
    ansible-core
    libcli11-dev
    nettle-dev
    nlohmann-json3-dev
    openssh-client
    openssh-server
    util-linux-extra
'
test='
    ansible-lint
    bash-completion
    black
    clang
    clang-format
    clang-tidy
    cmake-format
    codespell
    cppcheck
    debhelper
    e2fsprogs
    g++-multilib
    gcovr
    git
    googletest
    groff-base
    isort
    lib32z1-dev
    libc6-dbg
    libclang-rt-dev
    libdeflate-dev:i386
    lintian
    man-db
    nettle-dev:i386
    perl
    pycodestyle
    pylint
    python3-jsonschema
    python3-pytest
    rpm
    rpmlint
    scdoc
    shellcheck
    strace
    time
    valgrind
    xfsprogs
    yamllint
'
bench='
    7zip
    g++-multilib
    iproute2
    lib32z1-dev
    libarchive-tools
    libdeflate-dev:i386
    python3-matplotlib
    rpm
    scdoc
    strace
    unzip
'
# File systems to test on, other releases of Debian to build on, and a JSON schema.
more='
    btrfs-progs
    debootstrap
    npm
'

case ${1-} in
demo) packages=$demo ;;
fleet) packages="$demo $fleet" ;;
test) packages="$demo $fleet $test" ;;
bench) packages="$demo $fleet $bench" ;;
all) packages="$demo $fleet $test $bench $more" ;;
*) echo "Usage: $0 demo|fleet|test|bench|all" >&2; exit 2 ;;
esac

native=$(dpkg --print-architecture)
installed=$(dpkg-query --show --showformat='${db:Status-Status} ${Package}:${Architecture}\n')
missing=
for package in $packages; do
    case $package in
    *:*) line="installed $package" ;;
    *) line="installed $package:$native" ;;
    esac
    if ! printf '%s\n' "$installed" | grep -qxF -e "$line" -e "installed $package:all"; then
        missing="$missing $package"
    fi
done
[ -n "$missing" ] || exit 0
echo "Installing:$missing"

as_root=
[ "$(id -u)" -eq 0 ] || as_root=sudo
case $missing in
*openssh-server*) # its program is needed: the service is not to listen on this machine
    [ ! -d /run/systemd/system ] || $as_root systemctl --quiet mask ssh.service ssh.socket ;;
esac
case $missing in
*:i386*) $as_root dpkg --add-architecture i386 ;;
esac
# A mirror that is just being updated fails for some lists: what they lack, the next command names.
$as_root apt-get update -qq || echo "Some package lists could not be updated" >&2
# shellcheck disable=SC2086 # a list of words
$as_root env DEBIAN_FRONTEND=noninteractive \
    apt-get install -y -qq --no-install-recommends $missing
