#include "paths.h"

#include <algorithm>

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

std::string parentOf(const std::string& path)
{
    const std::size_t slash = path.find_last_of('/', path.find_last_not_of('/'));
    if (slash == std::string::npos)
        return ".";
    return path.substr(0, std::max<std::size_t>(slash, 1));
}

std::string backupName(const std::string& path)
{
    return path + BackupSuffix;
}
