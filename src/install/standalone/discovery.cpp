#include "discovery.h"

#include "file_index.h"
#include "locations.h"
#include "paths.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"
#include "text.h"

#include <cstdio>
#include <ostream>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr const char* ProbeFileName = "$_ZOR_$";
constexpr mode_t ProbeFileMode = 0600;

/// Creates a file in `home` and deletes it again; false when that fails.
bool canCreateProbe(const std::string& home)
{
    const std::string probe = joinPath(home, ProbeFileName);
    if (!openStream(probe, Existing::Truncate, ProbeFileMode))
        return false;
    (void)unlinkPath(probe); // if this fails, an empty file remains
    return true;
}

/// Whether a file can be created in `home`.
int probeHome(const std::string& home, bool readOnly)
{
    const bool writable =
        readOnly ? faccessat(AT_FDCWD, (home + "/.").c_str(), W_OK | X_OK, AT_EACCESS) == 0
                 : canCreateProbe(home);
    if (writable)
        return RegistryOk;
    *logstream << "*** Error: cannot create file in INI home dir.\n";
    return HomeNotWritable;
}

/// Whether the scanner control of the installation in `home` exists and is not empty.
int checkScannerControl(const std::string& home)
{
    const std::string path = joinPath(home, trawlcfgExe);
    struct stat status = {};
    if (statPath(path, status) != 0) {
        *logstream << "*** Error: cannot find " << path << " in INI home dir.\n";
        return ScannerControlBroken;
    }
    if (status.st_size == 0) {
        *logstream << "*** Error: found " << path << " with invalid size.\n";
        return ScannerControlBroken;
    }
    *logstream << "ZOR directory verified ok\n";
    return RegistryOk;
}

int verifyHome(const std::string& home, bool readOnly)
{
    *logstream << "INI file found, verifying...\n";
    const int status = probeHome(home, readOnly);
    return status != RegistryOk ? status : checkScannerControl(home);
}

/// Reads and verifies the registry; returns the status.
int findRegistry(InstallRegistry& registry, bool readOnly)
{
    const std::string path = registryPath(localInstall);
    *logstream << "Looking for INI file: " << path << '\n';
    const int status = parseRegistry(path, &registry);
    trimRight(registry.configRootDirectory);
    if (registry.configRootDirectory.empty())
        registry.configRootDirectory = registry.homeDirectory;

    if (status == RegistryOk)
        return verifyHome(registry.homeDirectory, readOnly);
    *logstream << "INI file not found or outdated (code=" << status << ")\n";
    return status;
}

/// Private mode turns the main action into a removal.
bool decideAction(char action)
{
    if (!privateMode)
        return action == 'i';
    *logstream << "Private mode enabled\n";
    if (action == 'i')
        *logstream << "Changing Global install to remove\n";
    return false;
}

/// Makes a broken installation look older than this installer, so that an upgrade replaces it.
void forceUpdate(InstallRegistry& registry, const ZorVersion& installerVersion)
{
    *logstream << "ZOR broken in existing location, forcing update.\n";
    registry.version = installerVersion;
    if (registry.version.level > 0)
        --registry.version.level;
    ignoreUpdateErrors = true;
}

} // namespace

Discovery discoverInstallation(const CommandLine& commandLine, bool readOnly)
{
    Discovery found;
    found.status = findRegistry(found.registry, readOnly);
    found.registryFound = found.status == RegistryOk;
    found.installAction = decideAction(commandLine.action);

    if (found.status == ScannerControlBroken && found.installAction) {
        forceUpdate(found.registry, commandLine.request.version);
        found.registryFound = true;
    }

    const std::string& home =
        found.registryFound ? found.registry.homeDirectory : commandLine.destDir;
    found.homeExists = pathExists(home);
    found.upgradeNeeded =
        found.registryFound && isUpgradeNeeded(found.registry, commandLine.request);

    found.indexPath = fileIndexPath(home);
    *logstream << "Log file is: " << found.indexPath << '\n';
    found.currentZorHome = home;
    found.currentCfgHome = home;
    *logstream << "currentZorHome = '" << found.currentZorHome << "' currentCfgHome = '"
               << found.currentCfgHome << "'\n";
    return found;
}
