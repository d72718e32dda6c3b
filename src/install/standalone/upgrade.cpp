#include "upgrade.h"

#include "commands.h"
#include "exploiters.h"
#include "extraction.h"
#include "file_codes.h"
#include "interruption.h"
#include "paths.h"
#include "registry.h"
#include "safe_path.h"
#include "scanner_control.h"
#include "selinux.h"
#include "settings.h"
#include "settings_upgrade.h"
#include "single_user_mode.h"
#include "trace_directory.h"
#include "tree_removal.h"

#include <cstdio>
#include <ostream>

namespace {

constexpr const char* ObsoleteFiles[] = {
    "trawlnet",  "trawlnet.so",    "trawluse",          "trawluse.so",
    "libzor.so", "kpo_config.xml", "libxerces-c.so.26",
};

/// Replaces the installed files by those of the package. The scanners are stopped.
int deployFiles(FileTransaction& transaction, InstallRegistry& registry,
                const InstallRegistry& request, const std::string* indexPath, bool useCustomPath)
{
    const std::string& home = registry.homeDirectory;
    (void)removeDir(transaction, home, spbPropertiesDir, true);
    removeObsoleteFiles(home);

    const int extracted = extractPackage(spbPackage, transaction, registry, false, indexPath);
    if (extracted != FileOk) {
        *logstream << "File extraction failed\n";
        return extracted;
    }
    (void)setSelinuxContext(home); // never fatal
    if (isInterrupted())
        return RunInterrupted;
    return customizeDeployment(home, request, useCustomPath);
}

/// The common log directory and the registry, after `deployed` files or without any.
int finishUpgrade(FileTransaction& transaction, InstallRegistry& registry,
                  const InstallRegistry& request, bool deployed, bool useCustomPath,
                  const std::string& customPath)
{
    if (!localInstall && !useCustomPath) {
        const int code =
            setupCommonLogDir(transaction, registry.homeDirectory, useCustomPath, customPath);
        if (code != 0)
            return code;
    }
    if (deployed)
        registry.version = request.version;
    const bool changed = updateRegistration(registry, request);
    return deployed || changed ? saveRegistry(transaction, registry) : FileOk;
}

} // namespace

bool updateRegistration(InstallRegistry& registry, const InstallRegistry& request)
{
    bool changed = false;
    const std::string& exploiter = request.exploiters;
    if (!isExploiterRegistered(registry, exploiter)) {
        if (skipExploiterRegistration) {
            *logstream << "Exploiter registration skipped\n";
        } else {
            *logstream << "Adding exploiter " << exploiter << " to INI file\n";
            addExploiter(registry, exploiter);
            changed = true;
        }
    }
    if (buildDateNumber(request.buildDate) > buildDateNumber(registry.buildDate)) {
        *logstream << "Updating BuildDate informations to: " << request.buildDate << '\n';
        registry.buildDate = request.buildDate;
        changed = true;
    }
    return changed;
}

std::vector<std::string> obsoleteFiles(const std::string& home)
{
    std::vector<std::string> paths;
    for (const char* const name : ObsoleteFiles)
        paths.push_back(joinPath(joinPath(home, spbBinDir), name));
    return paths;
}

void removeObsoleteFiles(const std::string& home)
{
    for (const std::string& path : obsoleteFiles(home)) {
        if (pathExists(path))
            (void)deleteFile(path); // best effort
    }
}

int upgradeInstall(FileTransaction& transaction, InstallRegistry& registry,
                   const InstallRegistry& request, const std::string* indexPath, bool deploys,
                   bool disable, bool useCustomPath, const std::string& customPath)
{
    const std::string& home = registry.homeDirectory;
    detectSingleUserMode(home);

    bool stopped = false;
    int code = FileOk;
    if (deploys) {
        *logstream << "Installed ZOR is older (or the same version), performing upgrade "
                      "(deploying files)\n";
        setLibraryPath(home);
        (void)setSelinuxContext(home); // never fatal
        code = stopScanners(home, disable, true);
        stopped = code == 0;
        if (!stopped)
            *logstream << "Cannot stop ZOR for update\n";
        else if (!isInterrupted())
            code = deployFiles(transaction, registry, request, indexPath, useCustomPath);
    } else {
        *logstream << "Installed ZOR is not older than this version, updating exploiters only\n";
    }
    if (code == FileOk && isInterrupted())
        code = RunInterrupted;
    if (code == FileOk)
        code = finishUpgrade(transaction, registry, request, deploys, useCustomPath, customPath);

    // Also after a failure: the caller undoes only what is in the journal.
    if (createSingleUserModeFile)
        createSingleUserModeFlag(transaction, home, indexPath);
    if (stopped && restartScanners(home) != 0)
        *logstream << "*** Error: could not restart ZOR.\n";
    return code;
}
