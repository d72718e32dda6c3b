#include "permissions.h"

#include "locations.h"
#include "paths.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"
#include "tree_removal.h"

#include <ostream>
#include <string>
#include <vector>

namespace {

struct Row {
    std::string base;
    std::string relativePath;
    mode_t mode;
    std::string scope; ///< "all", or the install type that it is for
};

std::vector<Row> rowsOf(const Discovery& found)
{
    const std::string& home = found.currentZorHome;
    const std::string& cfg = found.currentCfgHome;
    const std::string reg = registryDirectory(localInstall);

    std::vector<Row> table;
    if (!found.homeExists || (applySingleUserMode && !localInstall))
        table.push_back({home, "", 0755, "all"});
    const Row fixed[] = {
        {cfg, "cache_data", CacheDirRootMode, "global"},
        {cfg, "cache_data", 0770, "local"},
        {cfg, "config", 0755, "all"},
        {cfg, "config/xss", 0755, "all"},
        {cfg, "config/Zor.properties", 0644, "all"},
        {cfg, "config/ZorTrace.properties", 0644, "all"},
        {cfg, "config/ZorHWConfig.xml", 0644, "all"},
        {home, "bin", 0755, "all"},
        {home, "bin/customscanners", EtcDirMode, "all"},
        {home, "bin/etc", EtcDirMode, "all"},
        {home, "bin/etc/trawlfs", EtcDirMode, "all"},
        {home, "bin/etc/trawlhw", EtcDirMode, "all"},
        {home, "bin/etc/trawlvpd", EtcDirMode, "all"},
        {home, "bin/etc/trawlsw", EtcDirMode, "all"},
        {home, "bin/etc/trawlcfg", EtcDirMode, "all"},
        {home, "bin/plugins", 0755, "all"},
        {home, "install", 0750, "all"},
        {home, "install/zor_install.properties", 0640, "all"},
        {home, "install/trawlcfg.sh", 0750, "all"},
        {home, "logs", LogDirMode, "all"},
        {home, "_uninst", 0750, "all"},
        {reg, "", 0755, "all"},
        {reg, "zor.ini", 0644, "all"},
    };
    table.insert(table.end(), std::begin(fixed), std::end(fixed));
    return table;
}

void apply(const Permission& permission)
{
    const std::string& path = permission.path;
    if (changeMode(path, permission.mode) == ModeChange::Failed)
        *logstream << "Unable to change permissions to '" << path << "' file/directory\n";
}

} // namespace

std::vector<Permission> permissionTable(const Discovery& found)
{
    std::vector<Permission> table;
    for (const Row& row : rowsOf(found)) {
        if (row.scope == installTypeName(localInstall) || row.scope == "all")
            table.push_back({joinPath(row.base, row.relativePath), row.mode});
    }
    return table;
}

void applyPermissions(FileTransaction& transaction, const Discovery& found)
{
    {
        const ScopedUmask mask(globalFilesUmask);
        for (const Permission& permission : permissionTable(found))
            apply(permission);
    }
    if (found.upgradeNeeded)
        (void)removeDir(transaction, found.currentZorHome, cacheDir, true);
}
