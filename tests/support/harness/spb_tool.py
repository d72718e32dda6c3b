"""Runs the tool `spb`, and builds packages in which it finds nothing.

The environment variable SPB names the binary under test.
"""

import json
import os
import pty
import re
import subprocess

from harness import REPOSITORY, toolkit

SCRIPTS = REPOSITORY / "scripts"
TOOL = os.path.realpath(os.environ.get("SPB", "spb"))

# What `spb check` reports about the toolkit is gone with these.
WITHOUT_FINDINGS = {
    "config/ZorTrace.properties": b"handlers.traceFile.fileName=$(ZOR_DestinationDir)/logs/t.log\n"
    b"config.root=$(ZOR_ConfigRootDirectory)\n",
    "install/trawlcfg.sh": b"#!/bin/sh\nexec '$(ZOR_DestinationDir)/bin/trawlcfg' \"$@\"\n"
    b"# $(ZOR_ConfigRootDirectory) $(CorvanCommonDir) $(date)\n",
    "install/rmdirs.sh": b"#!/bin/sh\nrmdir '$(ZOR_DestinationDir)/logs' \\\n"
    b"'$(ZOR_ConfigRootDirectory)/config' '$(CorvanCommonDir)/ZOR'\n",
}


def archive(changes=None, without=()):
    """A package without findings, still open to changes; the arguments are as in `toolkit`."""
    return toolkit.archive({**WITHOUT_FINDINGS, **(changes or {})}, without)


def run(*arguments, **options):
    return subprocess.run(
        [TOOL, *arguments], capture_output=True, text=True, check=False, **options
    )


def check(path):
    """Exit status of `spb check`, and its findings as triples of kind, code and entry."""
    done = run("check", "--json", path)
    assert done.stderr == ""
    report = json.loads(done.stdout)
    return done.returncode, [(f["kind"], f["code"], f["entry"]) for f in report["findings"]]


def shown_on_a_terminal(*arguments):
    """What a run that succeeds shows on a terminal that is its standard error."""
    ours, theirs = pty.openpty()
    process = subprocess.Popen([TOOL, *arguments], stderr=theirs)
    os.close(theirs)
    shown = b""
    try:
        while piece := os.read(ours, 4096):
            shown += piece
    except OSError:  # the other end is closed: the process has ended
        pass
    os.close(ours)
    assert process.wait() == 0
    return shown


def codes():
    """Every code that `spb check` can report, with its kind."""
    source = (REPOSITORY / "src/tools/spb/findings.cpp").read_text()
    return {
        code: kind.lower() for code, kind in re.findall(r'{"([a-z0-9-]+)", Kind::(\w+)}', source)
    }
