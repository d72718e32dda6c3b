#include "paths.h"

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
