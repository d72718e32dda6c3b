// Resolving paths that another user can influence.
//
// The installer often runs as root, and some directories that it works in are writable by everyone
// by design ("bin/etc", "cache_data", the log directories). Whoever can write there can plant a
// symbolic link, a hard link or a FIFO under a name that a run is going to use, before the run or
// in the middle of it. A path passed to the system as text would make root create, truncate, chmod
// or delete whatever that name leads to. So every path is resolved here, once, component by
// component. A symbolic link is followed only if root or the running user owns it; any other is a
// stranger's link, and the path is refused. What remains is a `Place`, an open directory and a name
// in it, and every operation below acts on that pair without following or resolving anything
// again. Where a name could have been planted, opening never blocks and yields only regular files
// and directories.
//
// A refused path counts as missing (ENOENT) unless a function says otherwise. Programs that are
// run through the shell resolve their paths themselves; nothing here covers them. What is below
// "/proc/*/fd" is the caller's own and is opened directly.
#pragma once

#include "scoped.h"

#include <memory>
#include <string>

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/types.h>

/// Result of findPlace() for a path that leads through a stranger's link.
inline constexpr int StrangersLink = -1;

/// A name in an open directory. The directory stays open as long as the place is kept.
struct Place {
    std::shared_ptr<const ScopedFd> directory;
    std::string name;     ///< passed to the system as it is, so a trailing slash keeps its meaning
    bool isMagic = false; ///< a link of /proc, which only the system itself can follow

    /// The descriptor of the directory, for the system calls whose names end with "at".
    [[nodiscard]] int fd() const { return directory->get(); }
};

/// What findPlace() does with a symbolic link that is the last component.
enum class LastLink { Follow, Keep };

/// Finds the place of `path`. With LastLink::Follow its name was not a link when it was checked;
/// open it with O_NOFOLLOW all the same. The name itself may be missing.
///
/// Returns 0, StrangersLink (-1), or the `errno` of the component that could not be passed.
[[nodiscard]] int findPlace(const std::string& path, LastLink lastLink, Place& place);

/// Which file a path led to at some moment.
struct FileIdentity {
    dev_t device = 0;
    ino_t inode = 0;

    bool operator==(const FileIdentity&) const = default;
};

/// The identity of what `status` describes.
[[nodiscard]] FileIdentity identityOf(const struct stat& status);

/// While one of these lives, the directory of the last path stays open, so that many paths in one
/// directory resolve it once. Only for stretches that neither run commands nor need a directory
/// that they removed.
class ScopedDirectoryReuse {
public:
    ScopedDirectoryReuse();
    ScopedDirectoryReuse(const ScopedDirectoryReuse&) = delete;
    ScopedDirectoryReuse& operator=(const ScopedDirectoryReuse&) = delete;
    ~ScopedDirectoryReuse();
};

/// True if `owner` is root or the running user. An owner that the user namespace does not map is
/// neither.
[[nodiscard]] bool isTrustedOwner(uid_t owner);

/// True if someone other than root and the running user can create names in the directory that
/// `status` describes. A group that may write counts as others.
[[nodiscard]] bool othersCanPlant(const struct stat& status);

/// True if something exists at `path`, links followed, so false for a dangling link. If false,
/// `errno` is the reason, ENOENT for a refused path.
[[nodiscard]] bool pathExists(const std::string& path);

/// True if there is nothing at `path`, links followed, that this process could move or open: the
/// path does not exist, is refused, is too long, is a loop of links, or leads through a file or
/// through a directory that this process may not search.
///
/// False if something exists, or if that is unknown, for example after a read error of the disk:
/// the caller must then keep what may be there. A single EACCES is not trusted, since a failing
/// disk can cause it: the path is looked up a second time.
[[nodiscard]] bool pathIsMissing(const std::string& path);

/// True if `path` is a directory that no link leads to, in one system call. If false, it may still
/// be a directory.
[[nodiscard]] bool isPlainDirectory(const std::string& path);

/// stat() of `path`. Returns 0, or -1 with `errno`.
[[nodiscard]] int statPath(const std::string& path, struct stat& status);

/// Opens the existing `path`, O_CLOEXEC added to `flags`. Without O_PATH, it must be a regular file
/// or a directory, or anything in a directory in which only root and the running user can plant.
///
/// The result is not open on failure, with `errno`; ENXIO for a FIFO, socket or device that may
/// have been planted.
[[nodiscard]] ScopedFd openPath(const std::string& path, int flags);

/// openPath() of a place that findPlace() found with LastLink::Follow.
[[nodiscard]] ScopedFd openPlace(const Place& place, int flags);

/// openPath() for reading, as a stream; null on failure, with `errno`.
[[nodiscard]] ScopedFile openForReading(const std::string& path);

inline constexpr mode_t NewFileMode = 0666;    ///< of a file for which no mode is given
inline constexpr mode_t UnfinishedMode = 0600; ///< until it is written: nobody else can open it

/// What openForWriting() does with what exists.
enum class Existing {
    Refuse,   ///< only a new file, also in place of a dangling link of ours
    Truncate, ///< as fopen() "w"
    Append,   ///< as fopen() "a"
};

/// A file opened for writing.
struct WritableFile {
    ScopedFd fd{-1};
    bool created = false;
};

/// Opens `path` for writing, with O_RDWR as `access` for reading as well, or, if it is missing,
/// creates it with `mode` under the umask. Existing files are treated as for openPath(). Returns 0
/// or an `errno`, EPERM for a file with another name that someone else may have planted here.
[[nodiscard]] int openForWriting(const std::string& path, Existing existing, mode_t mode,
                                 WritableFile& file, int access = O_WRONLY);

/// openForWriting() as a stream; null on failure, with `errno`.
[[nodiscard]] ScopedFile openStream(const std::string& path, Existing existing, mode_t mode,
                                    int access = O_WRONLY);

/// The permission bits that the process umask leaves of `mode`.
[[nodiscard]] mode_t underUmask(mode_t mode);

/// What changeMode() found and did.
enum class ModeChange {
    Changed,
    NothingThere, ///< missing, or not accessible
    Failed,       ///< refused by the system, a stranger's link, or a file planted by hard link
};

/// Sets the permission bits of `path` without opening it, so this also works for a FIFO and for a
/// directory or file of mode 000. A regular file with a second name, in a directory where others
/// can plant, is not changed.
///
/// Without /proc, this works only for what can be opened for reading.
[[nodiscard]] ModeChange changeMode(const std::string& path, mode_t mode);

/// unlink() of `path`. Returns 0, or -1 with `errno`.
int unlinkPath(const std::string& path);

/// remove() of `path`: a file, or an empty directory. Returns 0, or -1 with `errno`.
int removePath(const std::string& path);

/// rmdir() of `path`. Returns 0, or -1 with `errno`.
int removeDirectoryPath(const std::string& path);

/// mkdir() of `path`. Returns 0, or -1 with `errno`.
[[nodiscard]] int createDirectoryPath(const std::string& path, mode_t mode);
