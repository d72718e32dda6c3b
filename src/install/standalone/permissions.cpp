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

struct Permission {
    std::string base;
    std::string relativePath;
    mode_t mode;
    std::string scope; ///< "all", or the install type that it is for
};

std::vector<Permission> permissionTable(const Discovery& found)
{
    const std::string& home = found.currentZorHome;
    const std::string& cfg = found.currentCfgHome;
    const std::string reg = registryDirectory(localInstall);

    std::vector<Permission> table;
    if (!found.homeExists || (applySingleUserMode && !localInstall))
        table.push_back({home, "", 0755, "all"});
    const Permission fixed[] = {
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
    if (permission.scope != installTypeName(localInstall) && permission.scope != "all")
        return;
    const std::string path = joinPath(permission.base, permission.relativePath);
    if (changeMode(path, permission.mode) == ModeChange::Failed)
        *logstream << "Unable to change permissions to '" << path << "' file/directory\n";
}

} // namespace

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
