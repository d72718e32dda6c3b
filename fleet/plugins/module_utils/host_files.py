"""The programs and packages that the collection keeps on a host.

They are in one directory: /var/cache/corvan.zor of root, ~/.cache/corvan.zor of another user.
"packages" holds each SPB under its checksum, "programs" each set of programs under its own, and
"programs/current" is a link to the set that was used last. What is there is complete: names appear
by rename, after the content is on the disk. Only the user it belongs to can write to it.
"""

import hashlib
import os
import platform
import shutil
import stat
import tarfile
import tempfile

NAMES = ("wzorinst", "zorctl", "spb")
LOADERS = {"x86_64": "/lib64/ld-linux-x86-64.so.2", "i686": "/lib/ld-linux.so.2"}
PATH = ("/usr/local/sbin", "/usr/local/bin", "/usr/sbin", "/usr/bin", "/sbin", "/bin")
KEPT = 2  # of packages and of sets of programs: this one and the one before


class HostFilesError(Exception):
    """Why the host's files cannot be used."""


def directory_of_user():
    if os.geteuid() == 0:
        return "/var/cache/corvan.zor"
    return os.path.join(os.path.expanduser("~"), ".cache/corvan.zor")


def choose_width(offered):
    """The best width of `offered` that this host can run."""
    able = ["x86_64", "i686"] if platform.machine() == "x86_64" else ["i686"]
    for width in able:
        if width in offered and os.path.exists(LOADERS[width]):
            return width
    raise HostFilesError(
        "this host runs none of the offered programs ({0}): the 32-bit ones need libc6:i386 "
        "or glibc.i686".format(", ".join(sorted(offered)))
    )


def installed_programs():
    """The directory of the host's own zorctl, for use when no programs are offered."""
    for directory in PATH:
        if all(os.access(os.path.join(directory, name), os.X_OK) for name in NAMES):
            return directory
    raise HostFilesError(
        "wzorinst, zorctl and spb are not installed on this host, and `programs` is not set"
    )


class HostFiles:
    """What an offer of the controller is on this host: `programs` and `package` are paths.

    `missing` names what has to be transferred first: "spb", and "programs-WIDTH".
    """

    def __init__(self, offer):
        self.top = self.kept_top = directory_of_user()
        check_own_directory(self.top)
        self.missing = []
        self.package = None
        self.signers = self.signature = None
        self.offered_programs = None
        if offer.get("programs"):
            width = choose_width(offer["programs"])
            self.offered_programs = offer["programs"][width]
            name = "{0}-{1}".format(width, self.offered_programs["digest"][:16])
            self.programs = os.path.join(self.top, "programs", name)
            if not self._holds_programs():
                self.missing.append("programs-" + width)
        else:
            self.programs = installed_programs()
        self.offered_package = offer.get("spb")
        if self.offered_package:
            name = self.offered_package["sha256"]
            self.package = os.path.join(self.top, "packages", name, "toolkit.spb")
            if size_of(self.package) != self.offered_package["size"]:
                self.missing.append("spb")

    def _holds_programs(self):
        return all(
            size_of(os.path.join(self.programs, name)) == size
            for name, size in self.offered_programs["sizes"].items()
        )

    @property
    def link_is_right(self):
        link = os.path.join(self.top, "programs/current")
        return not self.offered_programs or (
            os.path.islink(link) and os.readlink(link) == os.path.basename(self.programs)
        )

    def use(self, top):
        """Has what is missing stored below the directory `top`, so that nothing is kept."""
        top = top.rstrip("/")
        if any(name.startswith("programs-") for name in self.missing):
            self.programs = self.programs.replace(self.top, top, 1)
        if "spb" in self.missing:
            self.package = self.package.replace(self.top, top, 1)
        self.top = top

    def kept(self, text):
        """`text` with paths as they are, or would be if everything were kept."""
        return text.replace(self.top, self.kept_top)

    def store(self, sources):
        """Stores what was transferred: {"spb": path, "programs-WIDTH": path}."""
        for name, source in sources.items():
            if name == "spb":
                self._store_package(source)
            else:
                self._store_programs(source)
        if self.top == self.kept_top and not self.link_is_right:
            self._set_link()

    def _store_package(self, source):
        if digest_of([source]) != self.offered_package["sha256"]:
            raise HostFilesError("the package arrived damaged")
        directory = os.path.dirname(self.package)
        make_directory(directory)
        place(source, self.package)
        forget_old(os.path.dirname(directory))

    def store_signature(self, offer):
        """Puts the signature and the signers next to the package, or where the check keeps it."""
        directory = os.path.join(self.top, "packages", self.offered_package["sha256"])
        make_directory(directory)
        self.signers = os.path.join(directory, "signers")
        self.signature = os.path.join(directory, "toolkit.spb.sig")
        place_text(offer["signers"], self.signers)
        place_text(offer["signature"], self.signature)

    def _store_programs(self, source):
        make_directory(os.path.dirname(self.programs))
        made = tempfile.mkdtemp(prefix=".new-", dir=os.path.dirname(self.programs))
        try:
            with tarfile.open(source) as archive:
                for name in NAMES:
                    with open(os.path.join(made, name), "wb") as file:
                        shutil.copyfileobj(archive.extractfile(name), file)
                        os.fchmod(file.fileno(), 0o755)
                        os.fsync(file.fileno())
            os.chmod(made, 0o755)
            found = digest_of([os.path.join(made, name) for name in NAMES])
            if found != self.offered_programs["digest"]:
                raise HostFilesError("the programs arrived damaged")
            shutil.rmtree(self.programs, ignore_errors=True)
            os.rename(made, self.programs)
        finally:
            shutil.rmtree(made, ignore_errors=True)
        forget_old(os.path.dirname(self.programs))

    def _set_link(self):
        """Makes "current" name the programs of this run."""
        link = os.path.join(self.top, "programs/current")
        scratch = link + ".new"
        if os.path.lexists(scratch):
            os.unlink(scratch)
        os.symlink(os.path.basename(self.programs), scratch)
        os.rename(scratch, link)


def size_of(path):
    """The size of a regular file, or -1."""
    try:
        found = os.lstat(path)
    except OSError:
        return -1
    return found.st_size if stat.S_ISREG(found.st_mode) else -1


def check_own_directory(path):
    """Raises HostFilesError if `path` is there and not ours alone to write to."""
    if not os.path.lexists(path):
        return
    found = os.lstat(path)
    if not stat.S_ISDIR(found.st_mode) or found.st_uid != os.geteuid() or found.st_mode & 0o022:
        raise HostFilesError(path + " is not a directory that only its user can write to")


def make_directory(path):
    """Makes `path` and its missing parents with mode 0755, whatever the umask is."""
    if not os.path.isdir(path):
        make_directory(os.path.dirname(path))
        os.mkdir(path)
        os.chmod(path, 0o755)


def digest_of(paths):
    """One SHA-256 of the content of all `paths`."""
    total = hashlib.sha256()
    for path in paths:
        with open(path, "rb") as file:
            while block := file.read(1 << 20):
                total.update(block)
    return total.hexdigest()


def place(source, target):
    """Copies the file `source` to `target`, which appears only when it is complete."""
    handle, scratch = tempfile.mkstemp(prefix=".new-", dir=os.path.dirname(target))
    try:
        with os.fdopen(handle, "wb") as file, open(source, "rb") as content:
            shutil.copyfileobj(content, file, 1 << 20)
            os.fchmod(file.fileno(), 0o644)
            os.fsync(file.fileno())
        os.rename(scratch, target)
    except OSError:
        os.unlink(scratch)
        raise


def place_text(text, target):
    with open(target + ".new", "w", encoding="utf-8") as file:
        file.write(text)
    os.rename(target + ".new", target)


def forget_old(directory):
    """Deletes all but the newest entries of `directory`."""
    entries = [entry for entry in os.scandir(directory) if not entry.is_symlink()]
    entries.sort(key=lambda entry: entry.stat().st_mtime_ns, reverse=True)
    for entry in entries[KEPT:]:
        if entry.is_dir(follow_symlinks=False):
            shutil.rmtree(entry.path)
        else:
            os.unlink(entry.path)
