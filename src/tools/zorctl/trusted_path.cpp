#include "trusted_path.h"

#include "paths.h"
#include "safe_path.h"

#include <climits>
#include <cstdio>

#include <fcntl.h>
#include <sys/stat.h>

namespace {

constexpr int DirectoryFlags = O_PATH | O_DIRECTORY | O_CLOEXEC;

/// Whether `isGood` holds of the open `directory` and of every directory above it.
bool holdsUpToRoot(int directory, bool (*isGood)(const struct stat&))
{
    ScopedFd current(openat(directory, ".", DirectoryFlags));
    for (;;) {
        struct stat here = {};
        struct stat above = {};
        if (!current.isOpen() || fstat(current.get(), &here) != 0 || !isGood(here))
            return false;
        current = ScopedFd(openat(current.get(), "..", DirectoryFlags));
        if (!current.isOpen() || fstat(current.get(), &above) != 0)
            return false;
        if (identityOf(above) == identityOf(here)) // "/"
            return true;
    }
}

/// Whether nobody else can write to the directory.
bool isClosedToOthers(const struct stat& status)
{
    return !othersCanPlant(status);
}

/// Whether nobody else can rename or delete what belongs to root or to us in the directory.
bool isClosedOrSticky(const struct stat& status)
{
    return isClosedToOthers(status) ||
           (isTrustedOwner(status.st_uid) && (status.st_mode & S_ISVTX) != 0);
}

bool isTrusted(const Place& place)
{
    struct stat status = {};
    return fstatat(place.fd(), place.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
           S_ISREG(status.st_mode) && isTrustedOwner(status.st_uid) && status.st_nlink == 1 &&
           holdsUpToRoot(place.fd(), isClosedToOthers);
}

} // namespace

bool isTrustedFile(const std::string& path)
{
    Place place;
    return findPlace(path, LastLink::Keep, place) == 0 && isTrusted(place);
}

std::string safeDirectory(const std::string& path)
{
    const ScopedFd directory(open(path.c_str(), DirectoryFlags));
    if (!directory.isOpen() || !holdsUpToRoot(directory.get(), isClosedOrSticky))
        return {};
    const std::string own = "/proc/self/fd/" + std::to_string(directory.get());
    char real[PATH_MAX];
    const ssize_t size = readlink(own.c_str(), real, sizeof real);
    const bool whole = size > 0 && size < static_cast<ssize_t>(sizeof real);
    return whole ? std::string(real, static_cast<std::size_t>(size)) : std::string();
}

bool restoreTrusted(const std::string& backup)
{
    Place place;
    if (findPlace(backup, LastLink::Keep, place) != 0 || !isTrusted(place) ||
        !place.name.ends_with(BackupSuffix))
        return false;
    const std::string name = place.name.substr(0, place.name.size() - BackupSuffix.size());
    return renameat(place.fd(), place.name.c_str(), place.fd(), name.c_str()) == 0;
}
