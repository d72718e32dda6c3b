#!/bin/sh
# Builds and runs every test: fuzz targets for ten seconds each, sanitized 64-bit, 64-bit and 32-bit
# as they ship.
# Usage: scripts/test.sh [preset...]     (default: fuzz dev test test-i686)
set -eu
cd "$(dirname "$0")/.."
scripts/install_dependencies.sh test

[ $# -gt 0 ] || set -- fuzz dev test test-i686
for preset in "$@"; do
    echo "== $preset"
    cmake --preset "$preset" >/dev/null
    cmake --build --preset "$preset" --parallel 2
done
for preset in "$@"; do
    echo "== $preset"
    ctest --preset "$preset"
done
