#include "tree_removal.h"

#include "file_operations.h"
#include "paths.h"
#include "scoped.h"
#include "settings.h"

#include <cstdio>
#include <ostream>
#include <string_view>

#include <sys/stat.h>

namespace {

bool isDotName(std::string_view name)
{
    return name == "." || name == "..";
}

/// Deletes what the directory `path` lists as `name`; see removeTree(). Returns the result so far,
/// `result`, as this thing changes it.
bool removeChild(const std::string& path, const char* name, bool recurse, bool keepDirs,
                 bool result)
{
    const std::string child = joinPath(path, name);
    struct stat status = {};
    if (lstat(child.c_str(), &status) != 0)
        return false; // "." tells too: in a directory that may be listed but not searched
    if (!S_ISDIR(status.st_mode))
        return deleteFile(child) == 0 && result;
    if (!recurse || isDotName(name))
        return result;
    // Deliberate: a later success hides an earlier failure.
    return removeTree(child, true, keepDirs) || result;
}

} // namespace

int deleteFile(const std::string& path)
{
    *logstream << "DEL: " << path << '\n';
    return std::remove(path.c_str());
}

// Recursion: each level makes the path longer, and the system takes no path beyond PATH_MAX.
bool removeTree(const std::string& path, bool recurse, bool keepDirs)
{
    ScopedDir dir(opendir(path.c_str()));
    if (!dir)
        return false;

    bool result = true;
    while (const dirent* entry = readdir(dir.get()))
        result = removeChild(path, entry->d_name, recurse, keepDirs, result);
    dir.reset();
    if (keepDirs)
        return result;

    if (removeDirectory(path) != 0)
        return false;
    *logstream << "RMDIR: " << path << '\n';
    return result;
}

int removeDir(FileTransaction& /*transaction*/, const std::string& base, const std::string& sub,
              bool recursive)
{
    (void)removeTree(joinPathOptional(base, sub), recursive, false); // best effort
    return 0;
}

int removeFiles(const std::string& base, const std::string& sub, bool recursive)
{
    (void)removeTree(joinPathOptional(base, sub), recursive, true); // best effort
    return 0;
}
