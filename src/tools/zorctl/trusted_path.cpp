#include "trusted_path.h"

#include "paths.h"
#include "safe_path.h"

#include <cstdio>

#include <fcntl.h>
#include <sys/stat.h>

namespace {

constexpr int DirectoryFlags = O_PATH | O_DIRECTORY | O_CLOEXEC;

/// Whether nobody else can write to the open `directory` or to any directory above it.
bool isClosedToOthers(int directory)
{
    ScopedFd current(openat(directory, ".", DirectoryFlags));
    for (;;) {
        struct stat here = {};
        struct stat above = {};
        if (!current.isOpen() || fstat(current.get(), &here) != 0 || othersCanPlant(here))
            return false;
        current = ScopedFd(openat(current.get(), "..", DirectoryFlags));
        if (!current.isOpen() || fstat(current.get(), &above) != 0)
            return false;
        if (identityOf(above) == identityOf(here)) // "/"
            return true;
    }
}

bool isTrusted(const Place& place)
{
    struct stat status = {};
    return fstatat(place.fd(), place.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
           S_ISREG(status.st_mode) && isTrustedOwner(status.st_uid) && status.st_nlink == 1 &&
           isClosedToOthers(place.fd());
}

} // namespace

bool isTrustedFile(const std::string& path)
{
    Place place;
    return findPlace(path, LastLink::Keep, place) == 0 && isTrusted(place);
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
