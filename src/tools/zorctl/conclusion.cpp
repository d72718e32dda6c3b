#include "conclusion.h"

#include "discovery.h"
#include "file_index.h"
#include "forecast.h"
#include "guarded_index.h"
#include "locations.h"
#include "paths.h"
#include "permissions.h"
#include "settings.h"

#include <algorithm>
#include <vector>

#include <sys/stat.h>

namespace {

/// Whether the permission pass of an installation would change nothing.
bool modesAreSet(const Forecast& forecast, const Discovery& found)
{
    if (!found.installAction || !forecast.failure.empty())
        return true;
    const std::vector<Permission> table = permissionTable(found);
    return std::all_of(table.begin(), table.end(), [](const Permission& permission) {
        struct stat status = {};
        return stat(permission.path.c_str(), &status) != 0 ||
               (status.st_mode & 07777) == permission.mode;
    });
}

/// The deleted files that no installation put there.
std::vector<std::string> ownerFiles(const Forecast& forecast, const Discovery& found)
{
    const std::set<std::string> known = removableFiles(found);
    const std::string registry = registryPath(localInstall);
    const std::set<std::string> own = {
        found.indexPath, registry, backupName(registry),
        joinPath(forecast.home, joinPath(auxDirInstall, installProps))};
    std::vector<std::string> files;
    for (const std::string& path : forecast.tree.deleted()) {
        if (!known.contains(path) && !own.contains(path))
            files.push_back(path);
    }
    return files;
}

} // namespace

std::set<std::string> removableFiles(const Discovery& found)
{
    std::set<std::string> files = readGuardedIndex(found.indexPath).files;
    addInstallerFiles(found.registry, files);
    return files;
}

void conclude(Forecast& forecast, const Discovery& found)
{
    forecast.measureSpace();
    if (forecast.spaceNeeded > forecast.spaceAvailable)
        forecast.fail("the file system has not enough space");
    const SimulatedTree& tree = forecast.tree;
    if (privateMode) { // never rolled back
        for (const std::set<std::string>& paths : {tree.deleted(), tree.written()})
            forecast.notRestored.insert(forecast.notRestored.end(), paths.begin(), paths.end());
    }
    forecast.ownerFiles = ownerFiles(forecast, found);
    forecast.unchanged = tree.created().empty() && tree.written().empty() &&
                         tree.deleted().empty() && tree.createdDirectories().empty() &&
                         tree.deletedDirectories().empty() && modesAreSet(forecast, found);
}
