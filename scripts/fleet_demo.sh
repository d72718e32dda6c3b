#!/bin/sh
# Shows a roll-out to eight hosts that stops, the fix, the second run, and the report. The hosts are
# namespaces of this machine, which stays as it is. Usage: scripts/fleet_demo.sh [REPORT_DIR]
#
# Needs root. The report is left in REPORT_DIR if one is given.
set -eu
cd "$(dirname "$0")/.."
[ "$(id -u)" -eq 0 ] || { echo "$0: the hosts' namespaces need root" >&2; exit 2; }
scripts/install_dependencies.sh fleet

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
report=${1:-$work/report}
mkdir -p "$report"
report=$(CDPATH='' cd -- "$report" && pwd)

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

say "Build the programs"
quietly cmake --preset release
quietly cmake --build --preset release --parallel --target wzorinst --target zorctl --target spb
programs=$work/programs/$(uname -m)
mkdir -p "$programs"
cp build/release/src/install/standalone/wzorinst build/release/src/tools/zorctl/zorctl \
    build/release/src/tools/spb/spb "$programs"

say "Pack two releases of the example toolkit"
quietly scripts/build_toolkit.sh "$work/toolkit"
quietly "$programs/spb" pack "$work/toolkit" -o "$work/release1.spb"
echo 'title=Release 2' >>"$work/toolkit/properties/trawlhw.properties"
quietly "$programs/spb" pack "$work/toolkit" -o "$work/release2.spb"

fleet/hosts run 8 -- scripts/fleet_demo_life.sh "$work" "$report"
