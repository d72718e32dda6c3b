#!/bin/sh
# Builds the example toolkit: scripts/build_toolkit.sh OUTDIR
#
# Copies examples/toolkit to OUTDIR and compiles its shared libraries and its one compiled program
# (examples/toolkit-src) into OUTDIR/bin, so that OUTDIR can be packed into an SPB. The same sources
# and compiler give the same bytes. CC and CFLAGS may name the compiler and its options, for example
# CFLAGS=-m32. Of an OUTDIR that exists, the four package directories are replaced.
set -eu

[ $# -eq 1 ] || { echo "Usage: $0 OUTDIR" >&2; exit 2; }
examples=$(CDPATH='' cd -- "$(dirname -- "$0")/../examples" && pwd)
mkdir -p -- "$1"
out=$(CDPATH='' cd -- "$1" && pwd)

for dir in bin properties config install; do
    rm -rf "${out:?}/$dir"
done
cp -R "$examples/toolkit/." "$out"

# Relative names and no build id: the bytes do not depend on the path of the tree.
cd "$examples/toolkit-src"
compile()
{
    # shellcheck disable=SC2086
    ${CC:-cc} -std=c11 -D_DEFAULT_SOURCE -O2 -Wall -Wextra ${CFLAGS-} \
        -s -Wl,--build-id=none "$@"
}
compile -shared -fPIC -o "$out/bin/libzorhw.so" zorhw.c
compile -shared -fPIC -o "$out/bin/libzorfs.so" zorfs.c
# Finds its libraries in its own directory, even without LD_LIBRARY_PATH.
# shellcheck disable=SC2016
compile -o "$out/bin/trawlprobe" trawlprobe.c -L "$out/bin" -lzorhw -lzorfs \
    -Wl,-rpath,'$ORIGIN'
