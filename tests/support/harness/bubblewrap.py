"""A machine for one test: a root directory, and the bwrap command line that runs in it.

The root directory is on the host, so that whatever a test plants or inspects in it has exact
bytes and modes. Only programs and libraries are borrowed from the real machine, read-only; its
/etc, /opt, /usr/kel and homes are never seen. A user namespace with a single mapping makes the
answers the same whether the suite is run by root or by an ordinary user: user 0 of the sandbox
has all capabilities over it, every other user has none. Tests of owners, which only root can run,
do without the mapping.
"""

import os
import shutil
import subprocess
import tempfile

# Children of /usr that are not borrowed: the toolkit's common directory is in /usr/kel, and
# /usr/sbin must not bring the real machine's SELinux tools.
OWN_USR_CHILDREN = ("kel", "sbin")

# Merged into /usr on the supported systems; elsewhere they are mounted unchanged.
MERGED_DIRECTORIES = ("bin", "lib", "lib32", "lib64", "libx32")

# The settings of a sanitizer or of GoogleTest reach the sandboxed program, nothing else does.
PASSED_VARIABLES = ("ASAN_", "LSAN_", "UBSAN_", "GTEST_", "WZOR_")

SKELETON = {
    "/etc": 0o755,
    "/home": 0o755,
    "/media": 0o755,
    "/opt": 0o755,
    "/proc": 0o755,
    "/dev": 0o755,
    "/root": 0o700,
    "/tmp": 0o1777,
    "/usr": 0o755,
    "/usr/sbin": 0o755,
    "/var": 0o755,
}

# Not part of what tests compare.
COUNTS = "/var/counts"

NAME_SERVICES = "passwd: files\ngroup: files\nhosts: files\n"


def at(root, path):
    """The host's name of `path`, which begins with "/", of the machine in `root`."""
    return root + path


def new_root():
    """Makes a root directory with its basic files below the host's temporary directory."""
    root = os.path.realpath(tempfile.mkdtemp(prefix="wzorinst-"))
    os.chmod(root, 0o755)
    for path, mode in SKELETON.items():
        os.mkdir(at(root, path))
        os.chmod(at(root, path), mode)
    os.symlink("usr/sbin", at(root, "/sbin"))
    for name in MERGED_DIRECTORIES:
        if os.path.islink("/" + name):
            os.symlink(os.readlink("/" + name), at(root, "/" + name))
    write(root, "/etc/nsswitch.conf", NAME_SERVICES)
    if os.path.exists("/etc/ld.so.cache"):
        shutil.copy("/etc/ld.so.cache", at(root, "/etc/ld.so.cache"))
    for path in borrowed_paths():
        make_mount_point(root, path)
    return root


def write(root, path, text):
    with open(at(root, path), "w", encoding="utf-8") as file:
        file.write(text)
    os.chmod(at(root, path), 0o644)


def write_users(root, users):
    """Writes /etc/passwd and /etc/group for `users`: (name, uid, home) each."""
    write(root, "/etc/passwd", "".join(f"{n}:x:{u}:{u}::{h}:/bin/sh\n" for n, u, h in users))
    write(root, "/etc/group", "".join(f"{n}:x:{u}:\n" for n, u, _ in users))


def delete_root(root):
    """Deletes the root directory, whatever modes the tests gave to its directories."""
    try:
        shutil.rmtree(root)
    except PermissionError:
        subprocess.run(["chmod", "-R", "u+rwx", root], check=True)
        shutil.rmtree(root)


def borrowed_paths():
    """The real machine's directories that a sandbox sees read-only, at their own paths."""
    children = sorted(os.listdir("/usr"))
    paths = ["/usr/" + name for name in children if name not in OWN_USR_CHILDREN]
    paths += [
        "/" + name
        for name in MERGED_DIRECTORIES
        if os.path.isdir("/" + name) and not os.path.islink("/" + name)
    ]
    if os.path.isdir("/etc/alternatives"):
        paths.append("/etc/alternatives")
    return paths


def make_mount_point(root, path):
    """Makes the empty directory or file over which `path` of the host is mounted."""
    if os.path.isdir(path):
        os.makedirs(at(root, path), exist_ok=True)
    elif not os.path.lexists(at(root, path)):
        os.makedirs(os.path.dirname(at(root, path)), exist_ok=True)
        with open(at(root, path), "wb"):
            pass


def environment_of(home, changes=None):
    """The sandboxed program's whole environment: `changes` win, None takes a variable away.

    WZOR_SANDBOX allows the tests that plant files in /etc or /usr to do so.
    """
    environment = {"PATH": "/usr/bin", "TZ": "UTC0", "HOME": home, "WZOR_SANDBOX": "1"}
    environment.update(
        {name: value for name, value in os.environ.items() if name.startswith(PASSED_VARIABLES)}
    )
    environment.update(changes or {})
    return {name: value for name, value in environment.items() if value is not None}


def command_line(
    root,
    command,
    *,
    uid,
    environment,
    directory="/tmp",
    read_only=None,
    writable=None,
    options=(),
    maps_users=True,
):
    """The bwrap command line that runs `command` as `uid` on the machine in `root`.

    `read_only` maps paths of the sandbox to host paths bound there read-only; `writable` names
    the only places of the machine that can be written (None: all of it). `options` are further
    bwrap options, applied last. Without `maps_users`, users are those of the host: then `uid` is 0.
    """
    line = ["bwrap", "--die-with-parent", "--unshare-pid", "--unshare-ipc"]
    if maps_users:
        line += ["--unshare-user", "--uid", str(uid), "--gid", str(uid)]
    assert maps_users or uid == 0
    if uid == 0:
        line += ["--cap-add", "ALL"]
    line += ["--bind", root, "/"]
    for path in borrowed_paths():
        line += ["--ro-bind", path, path]
    line += ["--proc", "/proc", "--dev", "/dev"]
    for inside, host in (read_only or {}).items():
        line += ["--ro-bind", host, inside]
    if counts := os.environ.get("WZOR_COUNTS"):
        # Where a build that counts what runs adds its counts (scripts/coverage).
        line += ["--bind", counts, COUNTS]
        environment = {**environment, "GCOV_PREFIX": COUNTS}
    if writable is not None:
        for path in writable:
            line += ["--bind", at(root, path), path]
        line += ["--remount-ro", "/"]
    line += ["--clearenv"]
    for name, value in sorted(environment.items()):
        line += ["--setenv", name, value]
    return line + ["--chdir", directory, *options, "--", *command]
