#include "paths.h"

#include <cerrno>

#include <unistd.h>

std::string joinPath(const std::string& directory, std::string_view name)
{
    std::string path;
    path.reserve(directory.size() + 1 + name.size());
    path += directory;
    if (!endsWithSlash(directory))
        path += '/';
    path += name;
    return path;
}

std::string joinPathOptional(const std::string& directory, std::string_view name)
{
    return name.empty() ? directory : joinPath(directory, name);
}

bool endsWithSlash(const std::string& path)
{
    return !path.empty() && path.back() == '/';
}

std::string backupName(const std::string& path)
{
    return std::string(path).append(BackupSuffix);
}

bool pathExists(const std::string& path)
{
    return access(path.c_str(), F_OK) == 0;
}

bool pathIsMissing(const std::string& path)
{
    if (pathExists(path))
        return false;
    // A refusal is asked for twice: it must be the machine's rule, and no answer of a failing disk.
    // cppcheck-suppress knownConditionTrueFalse // the disk may answer otherwise now
    if (errno == EACCES && pathExists(path))
        return false;
    return errno == ENOENT || errno == ENOTDIR || errno == ELOOP || errno == ENAMETOOLONG ||
           errno == EACCES;
}
