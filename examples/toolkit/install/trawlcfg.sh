#!/bin/sh
# Runs the scanner control of the toolkit in this directory's parent, with the toolkit's libraries
# on the library path. The installer fills in the three directories.
# shellcheck disable=SC2016 # what looks like a command is a placeholder
set -eu

zor_home='$(ZOR_DestinationDir)'
zor_config='$(ZOR_ConfigRootDirectory)/config'
common_dir='$(CorvanCommonDir)'

if [ "${1-}" = -where ]; then
    printf 'home=%s\nconfig=%s\ntraces=%s\n' "$zor_home" "$zor_config" "$common_dir/ZOR/logs"
    exit 0
fi

LD_LIBRARY_PATH=$zor_home/bin${LD_LIBRARY_PATH:+:$LD_LIBRARY_PATH}
export LD_LIBRARY_PATH
exec "$zor_home/bin/trawlcfg" "$@"
