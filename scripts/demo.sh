#!/bin/sh
# Shows a whole life of the example toolkit on a machine of its own: this one stays as it is.
# Usage: scripts/demo.sh          (as root or as an ordinary user)
set -eu
cd "$(dirname "$0")/.."
scripts/install_dependencies.sh

say() { printf '\n### %s\n' "$*"; }

say "Build the installer"
cmake --preset release >/dev/null
cmake --build --preset release --parallel 2 --target wzorinst | tail -n 1

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

say "Build the example toolkit and pack it into an SPB"
scripts/build_toolkit.sh "$work/toolkit"
scripts/pack_toolkit.py "$work/toolkit" -o "$work/toolkit.spb"
cp build/release/src/install/standalone/wzorinst "$work"

tests/support/sandbox --read-only "$work" -- "$PWD/scripts/demo_life.sh" "$work"
