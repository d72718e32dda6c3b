#include "removal.h"

#include "common_directory.h"
#include "environment.h"
#include "exploiters.h"
#include "file_operations.h"
#include "file_replacement.h"
#include "install_log.h"
#include "locations.h"
#include "paths.h"
#include "registry.h"
#include "scanner_control.h"
#include "safe_path.h"
#include "scoped.h"
#include "settings.h"
#include "tree_removal.h"

#include <cstdio>
#include <cstring>
#include <ostream>

namespace {

constexpr const char* ScannerDirs[] = {
    "trawlhw", "trawluse", "trawlnet", "trawlfs", "trawlsw", "trawlvpd",
};

/// The directories of the command line client, relative to the installation.
struct ClientDirs {
    std::string client = joinPath(auxDirInstall, "QMX_CLI");
    std::string platform = joinPath(client, interp);
    std::string catalogues = joinPath(platform, "msg_cat");
    std::string platformBin = joinPath(platform, "bin");
    std::string platformLib = joinPath(platform, "lib");
    std::string catalogueC = joinPath(catalogues, "C");
};

/// Removes directories of one installation, deeper ones first by the order of the calls.
class DirectoryRemoval {
public:
    DirectoryRemoval(FileTransaction& transaction, const std::string& home)
        : transaction_(transaction), home_(home)
    {
    }

    /// The files directly in it, then the directory if that leaves it empty.
    void withFiles(const std::string& sub) const
    {
        (void)removeDir(transaction_, home_, sub, false);
    }

    void withEverything(const std::string& sub) const
    {
        (void)removeDir(transaction_, home_, sub, true);
    }

    void ifEmpty(const std::string& sub) const
    {
        (void)removeDirectory(joinPathOptional(home_, sub)); // stays otherwise
    }

private:
    FileTransaction& transaction_;
    const std::string& home_;
};

void removeScannerDirs(const DirectoryRemoval& remove)
{
    const std::string binEtc = joinPath(spbBinDir, etcDir);
    for (const char* const name : ScannerDirs)
        remove.withFiles(joinPath(binEtc, name));
    remove.withFiles(binEtc);
}

/// After the listed files: what is left of the directories.
void removeLeftovers(const DirectoryRemoval& remove)
{
    const ClientDirs dirs;
    remove.withFiles(UninstallFileName);
    remove.ifEmpty(dirs.platformBin);
    remove.ifEmpty(dirs.platformLib);
    remove.ifEmpty(dirs.catalogueC);
    remove.withFiles(dirs.catalogues);
    remove.withFiles(dirs.platform);
    remove.withFiles(dirs.client);
    remove.withFiles(auxDirInstall);
    removeScannerDirs(remove);
    remove.ifEmpty(joinPath(spbBinDir, spbBinPluginsDir));
    remove.ifEmpty(joinPath(spbBinDir, spbBinCustomScannersDir));
    remove.ifEmpty(spbBinDir);
    remove.withEverything(spbPropertiesDir);
    remove.withEverything(spbCfgDir);
    remove.withFiles(logDir);
    remove.withEverything(cacheDir);
    remove.ifEmpty("");
}

/// Without a list of files: everything at its known place.
void removeKnownPlaces(const DirectoryRemoval& remove)
{
    const ClientDirs dirs;
    remove.withFiles(UninstallFileName);
    remove.withFiles(dirs.platformBin);
    remove.withFiles(dirs.platformLib);
    remove.withFiles(dirs.catalogueC);
    remove.withFiles(dirs.catalogues);
    remove.withFiles(dirs.platform);
    remove.withFiles(dirs.client);
    remove.withFiles(auxDirInstall);
    removeScannerDirs(remove);
    remove.withFiles(joinPath(spbBinDir, spbBinPluginsDir));
    remove.withFiles(joinPath(spbBinDir, spbBinCustomScannersDir));
    remove.withFiles(spbBinDir);
    remove.withEverything(spbPropertiesDir);
    remove.withFiles(joinPath(spbCfgDir, spbCfgXssDir));
    remove.withEverything(spbCfgDir);
    remove.withFiles(logDir);
    remove.withEverything(cacheDir);
    remove.withFiles("");
}

void removeCommonLogDir(FileTransaction& transaction)
{
    const std::string common = readCommonDirectory(true);
    deleteTemporaryFile(commonDirectorySetting());
    (void)removeDir(transaction, common, joinPath(zorCommonDir, logDir), false);
    (void)removeDir(transaction, common, zorCommonDir, false);
}

void removeRegistry()
{
    const std::string directory = registryDirectory(localInstall);
    (void)deleteFile(registryPath(localInstall));
    deleteTemporaryFile(registryPath(localInstall));
    (void)removeDirectory(directory);             // stays while it holds other files
    *logstream << "RMDIR: " << directory << '\n'; // Deliberate: also when it stays
}

/// Deletes the installation, for which no exploiter is left.
int removeToolkit(FileTransaction& transaction, const InstallRegistry& registry,
                  const std::string* logPath)
{
    const std::string& home = registry.homeDirectory;
    setLibraryPath(home);
    const int stopped = stopScanners(home, true, true);
    if (stopped != 0) {
        *logstream << "Could not shutdown ZOR.\n";
        return stopped;
    }

    if (logPath != nullptr) {
        refreshFileIndex(registry, *logPath);
        deleteTemporaryFile(*logPath); // of a run that was killed
    }
    const DirectoryRemoval remove(transaction, home);
    if (removeListedFiles(logPath))
        removeLeftovers(remove);
    else
        removeKnownPlaces(remove);

    if (!localInstall)
        removeCommonLogDir(transaction);
    removeRegistry();
    return 0;
}

} // namespace

int removeInstallation(FileTransaction& transaction, InstallRegistry& registry,
                       const InstallRegistry& request, const std::string* logPath)
{
    const std::string& exploiter = request.exploiters;
    if (!isExploiterRegistered(registry, exploiter)) {
        *logstream << "ZOR not installed for exploiter " << exploiter << ", nothing to do\n";
        if (registry.exploiters != ":")
            return 0;
        *logstream << "Exploiter list empty, ok to remove anyway\n";
    }

    if (removeExploiter(registry, exploiter) == OthersRemain) {
        *logstream << "Exploiter list not empty, updating INI file only\n";
        return saveRegistry(transaction, registry);
    }
    return removeToolkit(transaction, registry, logPath);
}

bool removeListedFiles(const std::string* logPath)
{
    if (logPath == nullptr)
        return false;
    const ScopedFile index = openForReading(*logPath);
    if (!index)
        return false;

    const ScopedDirectoryReuse reuse;
    bool anyListed = false;
    char line[1024];
    while (std::fgets(line, sizeof line, index.get()) != nullptr) {
        if (line[0] == '#')
            continue;
        line[std::strcspn(line, "\n")] = '\0';
        *logstream << "RM FILE: " << line << '\n';
        (void)unlinkPath(line); // best effort
        anyListed = true;
    }
    if (anyListed)
        (void)unlinkPath(*logPath); // best effort
    return anyListed;
}
