#include "durability.h"

#include "file_codes.h"
#include "file_writing.h"
#include "paths.h"
#include "safe_path.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

/// Opens the directory `path`, or the nearest existing one above it.
ScopedFd openNearest(std::string path)
{
    for (;;) {
        ScopedFd directory = openPath(path, O_RDONLY | O_DIRECTORY);
        const std::string parent = parentOf(path);
        if (directory.isOpen() || parent == path)
            return directory;
        path = parent;
    }
}

/// The code for an error of a sync. If the file system cannot sync, that is not a failed write.
int codeOf(int error)
{
    return error == EIO || error == ENOSPC || error == EDQUOT ? CannotWrite : FileOk;
}

bool areOnOneFileSystem(const ScopedFd& a, const ScopedFd& b)
{
    struct stat first = {};
    struct stat second = {};
    return fstat(a.get(), &first) == 0 && fstat(b.get(), &second) == 0 &&
           first.st_dev == second.st_dev;
}

} // namespace

FileSystemSync::FileSystemSync(const std::vector<std::string>& directories)
{
    for (const std::string& path : directories) {
        ScopedFd directory = openNearest(path);
        const bool isKnown =
            std::any_of(fileSystems_.begin(), fileSystems_.end(), [&](const ScopedFd& known) {
                return areOnOneFileSystem(known, directory);
            });
        if (directory.isOpen() && !isKnown)
            fileSystems_.push_back(std::move(directory));
    }
}

int FileSystemSync::sync() const
{
    int code = FileOk;
    for (const ScopedFd& fileSystem : fileSystems_) {
        if (syncfs(fileSystem.get()) != 0 && code == FileOk)
            code = codeOf(errno);
    }
    return code;
}

int syncDirectories(const std::vector<std::string>& directories)
{
    int code = FileOk;
    for (const std::string& directory : directories) {
        const ScopedFd fd = openPath(directory, O_RDONLY | O_DIRECTORY);
        if (fd.isOpen() && code == FileOk)
            code = codeOf(syncFile(fd.get()));
    }
    return code;
}
