#include "source_tree.h"

#include "package_layout.h"
#include "paths.h"
#include "scoped.h"
#include "shown_text.h"

#include <algorithm>
#include <cerrno>
#include <cstring>

#include <sys/stat.h>

namespace {

/// The names in the directory `path`, sorted. Returns 0 or the `errno`.
int listDirectory(const std::string& path, std::vector<std::string>& names)
{
    const ScopedDir dir(opendir(path.c_str()));
    if (!dir)
        return errno;
    for (;;) {
        errno = 0;
        const dirent* const entry = readdir(dir.get());
        if (entry == nullptr)
            break;
        if (std::strcmp(entry->d_name, ".") != 0 && std::strcmp(entry->d_name, "..") != 0)
            names.emplace_back(entry->d_name);
    }
    const int error = errno;
    std::sort(names.begin(), names.end());
    return error;
}

bool isDirectory(const std::string& path)
{
    struct stat status = {};
    return stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

bool isRealDirectory(const std::string& path)
{
    struct stat status = {};
    return lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

/// Gives `source` its size. Returns why it cannot be packed as a file; nothing if it can.
std::string examine(Source& source)
{
    struct stat status = {};
    if (stat(source.path.c_str(), &status) != 0)
        return std::strerror(errno);
    if (S_ISDIR(status.st_mode))
        return "a link to a directory cannot be packed";
    if (!S_ISREG(status.st_mode))
        return "neither a file nor a directory";
    source.size = static_cast<std::uint64_t>(status.st_size);
    if (source.size == 0)
        return "an empty file cannot be installed";
    if (source.size >= SizeLimit)
        return "a file of 2 GiB or more cannot be installed";
    return "";
}

void addNameFaults(const Source& source, std::vector<std::string>& reasons)
{
    const std::string name = shown(source.relative) + ": ";
    const std::size_t length = imageRoot().size() + source.relative.size();
    if (length > LongestName)
        reasons.push_back(name + "the entry's name has " + std::to_string(length) +
                          " bytes with the image root, more than " + std::to_string(LongestName));
    const std::size_t room = LongestComponent - BackupSuffix.size();
    if (componentsOf(source.relative).back().size() > room)
        reasons.push_back(name + "a file's name of more than " + std::to_string(room) +
                          " bytes leaves an upgrade no room for a backup");
    if (source.relative.find('\n') != std::string::npos)
        reasons.push_back(name + "a newline in a name would break the index of installed files");
}

int findPackageDirs(const std::string& tree, SourceTree& found, std::string& failed)
{
    std::vector<std::string> names;
    failed = tree;
    const int error = listDirectory(tree, names);
    if (error != 0)
        return error;
    const auto& known = packageDirs();
    for (const std::string& name : names) {
        const bool isPackageDir =
            std::find(known.begin(), known.end(), name + "/") != known.end() &&
            isDirectory(joinPath(tree, name));
        (isPackageDir ? found.directories : found.leftOut).push_back(name);
    }
    if (found.directories.empty())
        found.reasons.push_back(shown(tree) + ": holds none of the package directories bin, "
                                              "properties, config, install");
    return 0;
}

} // namespace

int findSources(const std::string& tree, SourceTree& found, std::string& failed)
{
    int error = findPackageDirs(tree, found, failed);
    std::vector<std::string> pending;
    for (const std::string& name : found.directories)
        pending.push_back(name + "/");
    while (error == 0 && !pending.empty()) {
        const std::string directory = pending.back();
        pending.pop_back();
        const std::string path = joinPath(tree, directory);
        found.sources.push_back({directory, path, 0});
        std::vector<std::string> names;
        failed = path;
        error = listDirectory(path, names);
        for (const std::string& name : names) {
            Source source = {directory + name, path + name, 0};
            if (isRealDirectory(source.path)) {
                pending.push_back(source.relative + "/");
                continue;
            }
            const std::string reason = examine(source);
            if (!reason.empty())
                found.reasons.push_back(shown(source.relative) + ": " + reason);
            found.sources.push_back(std::move(source));
        }
    }

    for (const Source& source : found.sources)
        addNameFaults(source, found.reasons);
    if (found.sources.size() > MostEntries)
        found.reasons.push_back(std::to_string(found.sources.size()) +
                                " files and directories are more than the " +
                                std::to_string(MostEntries) + " entries that the installer sees");
    std::sort(found.reasons.begin(), found.reasons.end());
    std::sort(found.sources.begin(), found.sources.end(),
              [](const Source& a, const Source& b) { return a.relative < b.relative; });
    return error;
}
