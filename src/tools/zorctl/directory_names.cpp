#include "directory_names.h"

#include "paths.h"
#include "safe_path.h"
#include "scoped.h"

#include <cerrno>
#include <string_view>

#include <fcntl.h>
#include <sys/stat.h>

namespace {

bool isDirectory(DIR* dir, const dirent& entry)
{
    if (entry.d_type != DT_UNKNOWN)
        return entry.d_type == DT_DIR;
    struct stat status = {};
    return fstatat(dirfd(dir), entry.d_name, &status, AT_SYMLINK_NOFOLLOW) == 0 &&
           S_ISDIR(status.st_mode);
}

} // namespace

Listed listDirectory(const std::string& path, std::size_t most, DirectoryNames& names)
{
    ScopedFd fd = openPath(path, O_RDONLY | O_DIRECTORY);
    const ScopedDir dir(fd.isOpen() ? fdopendir(fd.get()) : nullptr);
    if (!dir)
        return errno == ENOENT || errno == ENOTDIR ? Listed::Missing : Listed::NotAll;
    (void)fd.release(); // the stream owns it now
    std::size_t count = 0;
    while (const dirent* const entry = readdir(dir.get())) {
        const std::string_view name = entry->d_name;
        if (name == "." || name == "..")
            continue;
        if (++count > most)
            return Listed::NotAll;
        auto& list = isDirectory(dir.get(), *entry) ? names.directories : names.files;
        list.push_back(joinPath(path, name));
    }
    return Listed::All;
}
