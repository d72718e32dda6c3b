#include "permissions.h"

#include "locations.h"
#include "paths.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"

#include <iterator>
#include <ostream>
#include <string>
#include <vector>

namespace {

const std::string AllScopes = "all";

/// One row of the permission table.
struct PermissionRow {
    std::string base;
    std::string path; ///< relative to `base`; empty for `base` itself
    mode_t mode;
    std::string scope; ///< AllScopes, or the install type that the row is for
};

std::vector<PermissionRow> rowsOf(const Discovery& found)
{
    const std::string& home = found.currentZorHome;
    const std::string& cfg = found.currentCfgHome;
    const std::string reg = registryDirectory(localInstall);

    std::vector<PermissionRow> table;
    if (!found.homeExists || (applySingleUserMode && !localInstall))
        table.push_back({home, "", 0755, AllScopes});
    const PermissionRow fixed[] = {
        {cfg, cacheDir, CacheDirRootMode, valueInstallGlobal},
        {cfg, cacheDir, 0770, valueInstallLocal},
        {cfg, spbCfgDir, 0755, AllScopes},
        {cfg, joinPath(spbCfgDir, spbCfgXssDir), 0755, AllScopes},
        {cfg, joinPath(spbCfgDir, zorProps), 0644, AllScopes},
        {cfg, joinPath(spbCfgDir, traceProps), 0644, AllScopes},
        {cfg, joinPath(spbCfgDir, "ZorHWConfig.xml"), 0644, AllScopes},
        {home, spbBinDir, 0755, AllScopes},
        {home, joinPath(spbBinDir, spbBinCustomScannersDir), EtcDirMode, AllScopes},
        {home, binEtcDir, EtcDirMode, AllScopes},
        {home, joinPath(binEtcDir, "trawlfs"), EtcDirMode, AllScopes},
        {home, joinPath(binEtcDir, "trawlhw"), EtcDirMode, AllScopes},
        {home, joinPath(binEtcDir, "trawlvpd"), EtcDirMode, AllScopes},
        {home, joinPath(binEtcDir, "trawlsw"), EtcDirMode, AllScopes},
        {home, joinPath(binEtcDir, "trawlcfg"), EtcDirMode, AllScopes},
        {home, joinPath(spbBinDir, spbBinPluginsDir), 0755, AllScopes},
        {home, auxDirInstall, 0750, AllScopes},
        {home, joinPath(auxDirInstall, installProps), 0640, AllScopes},
        {home, joinPath(auxDirInstall, "trawlcfg.sh"), 0750, AllScopes},
        {home, logDir, LogDirMode, AllScopes},
        {home, UninstallFileName, 0750, AllScopes},
        {reg, "", 0755, AllScopes},
        {reg, ZorIniName, 0644, AllScopes},
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
    for (const PermissionRow& row : rowsOf(found)) {
        if (row.scope == installTypeName(localInstall) || row.scope == AllScopes)
            table.push_back({joinPath(row.base, row.path), row.mode});
    }
    return table;
}

void applyPermissions(const Discovery& found)
{
    const ScopedUmask mask(globalFilesUmask);
    const ScopedDirectoryReuse reuse;
    for (const Permission& permission : permissionTable(found))
        apply(permission);
}
