"""The collection as it is built: its content, its documentation, and what linters say of it."""

import os
import shutil
import subprocess
import sys
import tarfile

import pytest

from harness import REPOSITORY

COLLECTION = "ansible_collections/corvan/zor"
MODULES = ["corvan.zor.toolkit", "corvan.zor.gate"]
ROLES = ["corvan.zor.rollout", "corvan.zor.status"]


def need(program):
    if not shutil.which(program):
        pytest.skip(f"{program} is missing")


@pytest.fixture(scope="module")
def built(tmp_path_factory):
    """The archive, and the directory it was extracted into."""
    need("ansible-galaxy")
    work = tmp_path_factory.mktemp("collection")
    line = ["ansible-galaxy", "collection", "build", "--output-path", work]
    environment = {**os.environ, "ANSIBLE_HOME": str(work / "home")}
    subprocess.run(line, cwd=REPOSITORY / "fleet", env=environment, check=True, capture_output=True)
    archive = work / "corvan-zor-9.2.30.tar.gz"
    target = work / COLLECTION
    target.mkdir(parents=True)
    with tarfile.open(archive) as content:
        content.extractall(target)
    return archive, target


def run(built, *line):
    """Status and output of a command in the extracted collection."""
    archive, target = built
    work = archive.parent
    environment = {
        **os.environ,
        "ANSIBLE_COLLECTIONS_PATH": str(work),
        "ANSIBLE_HOME": str(work / "home"),
        "HOME": str(work / "home"),
        "LC_ALL": "C.UTF-8",
        "NO_COLOR": "1",
    }
    done = subprocess.run(
        line,
        cwd=target,
        env=environment,
        stdout=subprocess.PIPE,
        stderr=subprocess.STDOUT,
        text=True,
        check=False,
    )
    return done.returncode, done.stdout


def test_the_archive_holds_what_belongs_to_the_collection(built):
    archive, _ = built
    with tarfile.open(archive) as content:
        names = sorted(name for name in content.getnames() if "." in os.path.basename(name))

    assert names == [
        "CHANGELOG.md",
        "FILES.json",
        "MANIFEST.json",
        "README.md",
        "meta/runtime.yml",
        "playbooks/rollout.yml",
        "plugins/action/gate.py",
        "plugins/action/toolkit.py",
        "plugins/module_utils/host_files.py",
        "plugins/module_utils/toolkit_state.py",
        "plugins/module_utils/zorctl.py",
        "plugins/modules/gate.py",
        "plugins/modules/toolkit.py",
        "plugins/plugin_utils/controller_files.py",
        "plugins/plugin_utils/gate.py",
        "plugins/plugin_utils/report.py",
        "roles/rollout/defaults/main.yml",
        "roles/rollout/meta/argument_specs.yml",
        "roles/rollout/meta/main.yml",
        "roles/rollout/tasks/main.yml",
        "roles/status/files/corvan_zor.fact",
        "roles/status/meta/argument_specs.yml",
        "roles/status/meta/main.yml",
        "roles/status/tasks/main.yml",
    ]


@pytest.mark.parametrize(
    "kind, name", [("module", n) for n in MODULES] + [("role", n) for n in ROLES]
)
def test_everything_is_documented(built, kind, name):
    status, text = run(built, "ansible-doc", "-t", kind, name)

    assert status == 0, text
    assert name.upper() in text.upper()
    # Ansible's own parts may give warnings.
    assert [line for line in text.splitlines() if "WARNING" in line and "corvan" in line] == []


def test_ansible_lint_finds_nothing(built):
    need("ansible-lint")
    status, text = run(
        built,
        *("ansible-lint", "--offline", "--profile", "production", "-q"),
        # Newer versions want variables without the collection's name, and no ansible-core 2.14.
        *("-x", "var-naming[no-role-prefix],meta-runtime[unsupported-version]"),
    )
    assert status == 0, text


def test_yamllint_finds_nothing(built):
    need("yamllint")
    rules = "{extends: default, rules: {line-length: {max: 100}}}"
    assert run(built, "yamllint", "--strict", "-d", rules, ".") == (0, "")


def test_pycodestyle_finds_nothing(built):
    """E402: the documentation of a module comes before its imports."""
    need("pycodestyle")
    assert run(built, "pycodestyle", "--max-line-length=100", "--ignore=E402,W503", ".") == (0, "")


def test_the_sources_compile_with_every_python(built):
    need("ansible-test")
    version = f"{sys.version_info[0]}.{sys.version_info[1]}"
    line = ["ansible-test", "sanity", "--test", "compile", "--python", version, "--color", "no"]
    status, text = run(built, *line)
    assert status == 0, text
    assert 'Running sanity test "compile"' in text
