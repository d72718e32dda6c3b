#!/bin/sh
# Builds and runs every test: scripts/test.sh [preset...]   (default: fuzz dev test-i686 test)
#
# CONTRIBUTING.md says what each preset covers. All presets are tested even if one fails. Prints what
# each part took and the ten slowest tests.
set -eu
cd "$(dirname "$0")/.."
scripts/install_dependencies.sh test

[ $# -gt 0 ] || set -- fuzz dev test-i686 test
processors=$(nproc)
began=$(date +%s)
status=0

# Shows how long the part $1 took, since the last part.
took()
{
    now=$(date +%s)
    echo "== $1: $((now - began)) s"
    began=$now
}

for preset in "$@"; do
    cmake --preset "$preset" >/dev/null
    # The 64-bit release is not built with unit tests: those of dev and test-i686 are the same.
    case $preset in
    fuzz) targets=fuzz_targets ;;
    test) targets='wzorinst zorctl spb manual_pages unwind_test' ;;
    *) targets=all ;;
    esac
    # shellcheck disable=SC2086 # a list of words
    cmake --build --preset "$preset" --parallel "$processors" --target $targets
    took "building $preset"
done
for preset in "$@"; do
    case $preset in
    test) kinds='life|packaging' ;;
    *) kinds= ;;
    esac
    ctest --preset "$preset" --parallel "$processors" --output-junit results.xml \
        ${kinds:+--label-regex "$kinds"} || status=1
    took "testing $preset"
done

echo "== the ten slowest tests"
for preset in "$@"; do
    sed -n 's/.*<testcase name="\([^"]*\)".* time="\([^"]*\)".*/\2 s '"$preset"' \1/p' \
        "build/$preset/results.xml"
done | sort -rn | head -n 10
exit "$status"
