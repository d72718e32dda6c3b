#!/bin/sh
# Shows the whole life of an installation of the example toolkit, in a sandbox: the machine stays as
# it is. Usage: scripts/demo.sh          (as root or as an ordinary user)
set -eu
cd "$(dirname "$0")/.."
scripts/install_dependencies.sh demo

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

say() { printf '\n### %s\n' "$*"; }

# Runs a command; shows its output and ends the demo if it fails.
quietly()
{
    if ! "$@" >"$work/output" 2>&1; then
        cat "$work/output" >&2
        echo "This command failed: $*" >&2
        exit 1
    fi
}

say "Build the installer"
quietly cmake --preset release
quietly cmake --build --preset release --parallel --target wzorinst

say "Build the example toolkit and pack it into an SPB"
quietly scripts/build_toolkit.sh "$work/toolkit"
quietly scripts/pack_toolkit.py "$work/toolkit" -o "$work/toolkit.spb"
cp build/release/src/install/standalone/wzorinst "$work"

tests/support/sandbox --read-only "$work" -- "$PWD/scripts/demo_life.sh" "$work"
