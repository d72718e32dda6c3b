#include "removal.h"

#include "commands.h"
#include "common_directory.h"
#include "exploiters.h"
#include "file_index.h"
#include "file_operations.h"
#include "file_replacement.h"
#include "locations.h"
#include "paths.h"
#include "registry.h"
#include "safe_path.h"
#include "scanner_control.h"
#include "scoped.h"
#include "settings.h"
#include "tree_removal.h"

#include <cstdio>
#include <cstring>
#include <iterator>
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

/// The steps for the directories of the scanners, in "bin/etc", and for that directory.
void addScannerDirs(std::vector<RemovalStep>& steps)
{
    const std::string binEtc = joinPath(spbBinDir, etcDir);
    for (const char* const name : ScannerDirs)
        steps.push_back({WithFiles, joinPath(binEtc, name)});
    steps.push_back({WithFiles, binEtc});
}

/// After the listed files: what is left of the directories.
std::vector<RemovalStep> leftovers()
{
    const ClientDirs dirs;
    std::vector<RemovalStep> steps = {
        {WithFiles, UninstallFileName}, {IfEmpty, dirs.platformBin},  {IfEmpty, dirs.platformLib},
        {IfEmpty, dirs.catalogueC},     {WithFiles, dirs.catalogues}, {WithFiles, dirs.platform},
        {WithFiles, dirs.client},       {WithFiles, auxDirInstall},
    };
    addScannerDirs(steps);
    const RemovalStep rest[] = {
        {IfEmpty, joinPath(spbBinDir, spbBinPluginsDir)},
        {IfEmpty, joinPath(spbBinDir, spbBinCustomScannersDir)},
        {IfEmpty, spbBinDir},
        {WithEverything, spbPropertiesDir},
        {WithEverything, spbCfgDir},
        {WithFiles, logDir},
        {WithEverything, cacheDir},
        {IfEmpty, ""},
    };
    steps.insert(steps.end(), std::begin(rest), std::end(rest));
    return steps;
}

/// Without a list of files: everything at its known place.
std::vector<RemovalStep> knownPlaces()
{
    const ClientDirs dirs;
    std::vector<RemovalStep> steps = {
        {WithFiles, UninstallFileName}, {WithFiles, dirs.platformBin},
        {WithFiles, dirs.platformLib},  {WithFiles, dirs.catalogueC},
        {WithFiles, dirs.catalogues},   {WithFiles, dirs.platform},
        {WithFiles, dirs.client},       {WithFiles, auxDirInstall},
    };
    addScannerDirs(steps);
    const RemovalStep rest[] = {
        {WithFiles, joinPath(spbBinDir, spbBinPluginsDir)},
        {WithFiles, joinPath(spbBinDir, spbBinCustomScannersDir)},
        {WithFiles, spbBinDir},
        {WithEverything, spbPropertiesDir},
        {WithFiles, joinPath(spbCfgDir, spbCfgXssDir)},
        {WithEverything, spbCfgDir},
        {WithFiles, logDir},
        {WithEverything, cacheDir},
        {WithFiles, ""},
    };
    steps.insert(steps.end(), std::begin(rest), std::end(rest));
    return steps;
}

void perform(FileTransaction& transaction, const std::string& home, const RemovalStep& step)
{
    if (step.kind == IfEmpty)
        (void)removeDirectory(joinPathOptional(home, step.path)); // stays otherwise
    else
        (void)removeDir(transaction, home, step.path, step.kind == WithEverything);
}

void removeCommonLogDir(FileTransaction& transaction)
{
    const std::string common = readCommonDirectory(true);
    deleteTemporaryFile(commonSettingPath());
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
    const bool listed = removeListedFiles(logPath);
    for (const RemovalStep& step : removalSteps(listed))
        perform(transaction, home, step);

    if (!localInstall)
        removeCommonLogDir(transaction);
    removeRegistry();
    return 0;
}

} // namespace

std::vector<RemovalStep> removalSteps(bool listed)
{
    return listed ? leftovers() : knownPlaces();
}

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
