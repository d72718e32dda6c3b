#include "simulated_tree.h"

#include "paths.h"
#include "scoped.h"

#include <cerrno>
#include <string_view>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

using Kind = SimulatedTree::Kind;

Kind kindOnDisk(const std::string& path)
{
    struct stat status = {};
    if (stat(path.c_str(), &status) != 0)
        return Kind::Missing;
    return S_ISDIR(status.st_mode) ? Kind::Directory : Kind::File;
}

Kind entryOnDisk(const std::string& path)
{
    struct stat status = {};
    if (lstat(path.c_str(), &status) != 0)
        return Kind::Missing;
    return S_ISDIR(status.st_mode) ? Kind::Directory : Kind::File;
}

} // namespace

Kind SimulatedTree::kindOf(const std::string& path) const
{
    const auto changed = changes_.find(path);
    return changed != changes_.end() ? changed->second.kind : kindOnDisk(path);
}

Kind SimulatedTree::kindOfEntry(const std::string& path) const
{
    const auto changed = changes_.find(path);
    return changed != changes_.end() ? changed->second.kind : entryOnDisk(path);
}

bool SimulatedTree::canCreateIn(const std::string& path) const
{
    if (kindOf(path) != Kind::Directory)
        return false;
    if (kindOnDisk(path) != Kind::Directory)
        return true; // made by the run itself
    return faccessat(AT_FDCWD, path.c_str(), W_OK | X_OK, AT_EACCESS) == 0;
}

unsigned long long SimulatedTree::sizeOf(const std::string& path) const
{
    const auto changed = changes_.find(path);
    if (changed != changes_.end())
        return changed->second.size;
    struct stat status = {};
    return stat(path.c_str(), &status) == 0 ? static_cast<unsigned long long>(status.st_size) : 0;
}

std::vector<std::string> SimulatedTree::list(const std::string& path) const
{
    std::set<std::string> names;
    if (const ScopedDir dir{opendir(path.c_str())}) {
        while (const dirent* entry = readdir(dir.get())) {
            const std::string_view name = entry->d_name;
            if (name != "." && name != "..")
                names.insert(joinPath(path, name));
        }
    }
    const std::string prefix = joinPath(path, "");
    for (auto at = changes_.lower_bound(prefix);
         at != changes_.end() && at->first.starts_with(prefix); ++at) {
        if (at->first.find('/', prefix.size()) != std::string::npos)
            continue; // further below
        if (at->second.kind == Kind::Missing)
            names.erase(at->first);
        else
            names.insert(at->first);
    }
    return {names.begin(), names.end()};
}

void SimulatedTree::write(const std::string& path, unsigned long long size)
{
    changes_[path] = {Kind::File, size};
}

bool SimulatedTree::makeDirectory(const std::string& path)
{
    if (!canCreateIn(parentOf(path)))
        return false;
    changes_[path] = {Kind::Directory, 0};
    return true;
}

bool SimulatedTree::makePath(const std::string& path)
{
    for (std::size_t slash = path.find('/', 1); slash != std::string::npos;
         slash = path.find('/', slash + 1)) {
        const std::string directory = path.substr(0, slash);
        if (!exists(directory) && !makeDirectory(directory))
            return false;
    }
    return true;
}

bool SimulatedTree::remove(const std::string& path)
{
    const Kind kind = kindOfEntry(path);
    if (kind == Kind::Missing || (kind == Kind::Directory && !list(path).empty()))
        return false;
    if (!canCreateIn(parentOf(path)))
        return false;
    changes_[path] = {Kind::Missing, 0};
    return true;
}

bool SimulatedTree::removeTree(const std::string& path, bool recurse)
{
    if (kindOf(path) != Kind::Directory)
        return false;
    for (const std::string& child : list(path)) {
        if (kindOfEntry(child) != Kind::Directory)
            (void)remove(child);
        else if (recurse)
            (void)removeTree(child, true);
    }
    return remove(path);
}

SimulatedTree::Paths SimulatedTree::written() const
{
    Paths paths = changes(Kind::File, Kind::File);
    paths.merge(changes(Kind::Directory, Kind::File));
    return paths;
}

SimulatedTree::Paths SimulatedTree::changes(Kind before, Kind after) const
{
    Paths paths;
    for (const auto& [path, node] : changes_) {
        if (node.kind == after && entryOnDisk(path) == before)
            paths.insert(path);
    }
    return paths;
}
