"""The toolkit that the system tests install, and its package.

Small, but with every file that the installer touches. The scanner programs log their command lines
and their LD_LIBRARY_PATH to files outside of every installation, so that these survive a removal.
They fail if a test says so in /var/scanners/fail: each line is a text and an exit status, and the
first text found in the program's path and arguments decides.
"""

from harness.zip_archive import DEFLATED, IMAGE_ROOT, STORED, Archive

COMMAND_LOG = "/var/scanners/commands"
LIBRARY_PATH_LOG = "/var/scanners/library_paths"
FAILURES = "/var/scanners/fail"

SCANNER_PROGRAM = b"""#!/bin/sh
line=$0
for argument in "$@"; do line="$line [$argument]"; done
echo "$line" >>/var/scanners/commands
echo "${LD_LIBRARY_PATH-(unset)}" >>/var/scanners/library_paths
echo "scanner control output: $*"
echo "scanner control error: $*" >&2
[ -e /var/scanners/fail ] || exit 0
while read -r text status; do
    case "$0 $*" in *"$text"*) exit "$status" ;; esac
done </var/scanners/fail
exit 0
"""

ZOR_PROPERTIES = b"""# Settings of the toolkit
version=9.2.30.0000
build_date=22/12/02

trace_level=3
trace_file_path=$(ZOR_DestinationDir)$(FileSeparator)logs
trace_file=zor.log
fscanner.default_provider=$(fscanner_mode)
fscanner.cache_dir=$(ZOR_ConfigRootDirectory)$(FileSeparator)cache_data
common_dir=$(CorvanCommonDir)
two=$(ZOR_DestinationDir):$(ZOR_DestinationDir)
"""

ZOR_TRACE_PROPERTIES = b"""handlers.traceFile.fileName=$(ZOR_DestinationDir)/logs/default.log
zor.loggers.trcLogger.level=DEBUG_MIN
config.root=$(ZOR_ConfigRootDirectory)
unknown=$(NoSuchPlaceholder)
separator=$(FileSeparator)
"""

TRAWLCFG_SCRIPT = b"""#!/bin/sh
ZOR_HOME=$(ZOR_DestinationDir)
PAIR=$(ZOR_DestinationDir):$(ZOR_DestinationDir)
ZOR_CONFIG=$(ZOR_ConfigRootDirectory)
COMMON=$(CorvanCommonDir)
OTHER=$(NoSuchPlaceholder)
"""

RMDIRS_SCRIPT = b"""#!/bin/sh
rmdir "$(ZOR_DestinationDir)/cache_data" "$(CorvanCommonDir)/ZOR"
"""

# The package's files in the order of the archive, below the image root.
FILES = {
    "bin/": b"",
    "bin/trawlcfg": SCANNER_PROGRAM,
    "bin/trawlfs": SCANNER_PROGRAM,
    "bin/trawlhw": b"\x7fELF hardware scanner\x00\xff",
    "bin/libzorcore.so": b"core library\n" * 700,
    "properties/": b"",
    "properties/scan.properties": b"depth=4\n",
    "config/": b"",
    "config/Zor.properties": ZOR_PROPERTIES,
    "config/ZorTrace.properties": ZOR_TRACE_PROPERTIES,
    "config/ZorHWConfig.xml": b"<hardware/>\n",
    "config/xss/": b"",
    "config/xss/schema.xss": b"<schema/>\n",
    "install/": b"",
    "install/trawlcfg.sh": TRAWLCFG_SCRIPT,
    "install/rmdirs.sh": RMDIRS_SCRIPT,
}


def archive(changes=None, without=()):
    """The package as an archive still open to changes.

    `changes` maps names below the image root to other or further contents; `without` names what
    is left out. Every second file is stored, so that both kinds of stream are used.
    """
    files = dict(FILES)
    files.update(changes or {})
    result = Archive()
    for number, (name, data) in enumerate(files.items()):
        if name not in without:
            result.add(IMAGE_ROOT + name, data, STORED if number % 2 else DEFLATED)
    return result


def package(changes=None, without=()):
    """The package's bytes."""
    return archive(changes, without).content()
