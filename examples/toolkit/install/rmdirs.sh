#!/bin/sh
# Removes directories of the toolkit that a removal left because they were not empty: only those
# that are empty now, the deepest first. The installer fills in the three directories; to use this
# after a removal, copy it before.
# shellcheck disable=SC2016 # what looks like a command is a placeholder
set -eu

for dir in \
    '$(ZOR_ConfigRootDirectory)/cache_data' \
    '$(ZOR_ConfigRootDirectory)/config/xss' \
    '$(ZOR_ConfigRootDirectory)/config' \
    '$(ZOR_DestinationDir)/properties' \
    '$(ZOR_DestinationDir)/install' \
    '$(ZOR_DestinationDir)/logs' \
    '$(ZOR_DestinationDir)/bin/etc/trawlfs' \
    '$(ZOR_DestinationDir)/bin/etc/trawlhw' \
    '$(ZOR_DestinationDir)/bin/etc/trawlsw' \
    '$(ZOR_DestinationDir)/bin/etc/trawlvpd' \
    '$(ZOR_DestinationDir)/bin/etc' \
    '$(ZOR_DestinationDir)/bin/plugins' \
    '$(ZOR_DestinationDir)/bin/customscanners' \
    '$(ZOR_DestinationDir)/bin' \
    '$(ZOR_DestinationDir)' \
    '$(CorvanCommonDir)/ZOR/logs' \
    '$(CorvanCommonDir)/ZOR'; do
    if [ -d "$dir" ] && rmdir "$dir" 2>/dev/null; then
        printf 'Removed %s\n' "$dir"
    fi
done
