#include "removal.h"

#include "commands.h"
#include "common_directory.h"
#include "exploiters.h"
#include "file_index.h"
#include "file_operations.h"
#include "file_replacement.h"
#include "locations.h"
#include "paths.h"
#include "safe_path.h"
#include "scanner_control.h"
#include "scoped.h"
#include "settings.h"
#include "trace_directory.h"

#include <cstdio>
#include <cstring>
#include <optional>
#include <ostream>

namespace {

/// One row of the table of directories, deepest first.
struct DirectoryRow {
    std::string path;
    std::optional<RemovalKind> afterIndex; ///< once the files of an index are deleted; may be left
    RemovalKind withoutIndex = IfEmpty;
};

std::vector<DirectoryRow> directoryTable()
{
    const std::string client = joinPath(auxDirInstall, "QMX_CLI"); // the command line client
    const std::string platform = joinPath(client, interp);
    const std::string catalogues = joinPath(platform, "msg_cat");
    return {
        {UninstallFileName, WithFiles, WithFiles},
        {joinPath(platform, "bin"), IfEmpty, WithFiles},
        {joinPath(platform, "lib"), IfEmpty, WithFiles},
        {joinPath(catalogues, "C"), IfEmpty, WithFiles},
        {catalogues, WithFiles, WithFiles},
        {platform, WithFiles, WithFiles},
        {client, WithFiles, WithFiles},
        {auxDirInstall, WithFiles, WithFiles},
        {joinPath(binEtcDir, "trawlhw"), WithFiles, WithFiles},
        {joinPath(binEtcDir, "trawluse"), WithFiles, WithFiles},
        {joinPath(binEtcDir, "trawlnet"), WithFiles, WithFiles},
        {joinPath(binEtcDir, "trawlfs"), WithFiles, WithFiles},
        {joinPath(binEtcDir, "trawlsw"), WithFiles, WithFiles},
        {joinPath(binEtcDir, "trawlvpd"), WithFiles, WithFiles},
        {binEtcDir, WithFiles, WithFiles},
        {joinPath(spbBinDir, spbBinPluginsDir), IfEmpty, WithFiles},
        {joinPath(spbBinDir, spbBinCustomScannersDir), IfEmpty, WithFiles},
        {spbBinDir, IfEmpty, WithFiles},
        {spbPropertiesDir, WithEverything, WithEverything},
        {joinPath(spbCfgDir, spbCfgXssDir), std::nullopt, WithFiles},
        {spbCfgDir, WithEverything, WithEverything},
        {logDir, WithFiles, WithFiles},
        {cacheDir, WithEverything, WithEverything},
        {"", IfEmpty, WithFiles},
    };
}

void perform(const std::string& home, const RemovalStep& step)
{
    const std::string path = joinPathOptional(home, step.path);
    if (step.kind == IfEmpty)
        (void)removeDirectory(path); // stays otherwise
    else
        (void)removeTree(path, step.kind == WithEverything, false); // best effort
}

void removeCommonLogDir()
{
    const std::string common = readCommonDirectory(true);
    deleteTemporaryFile(commonSettingPath());
    (void)removeTree(commonLogDir(common), false, false);           // best effort
    (void)removeTree(joinPath(common, zorCommonDir), false, false); // best effort
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
int removeToolkit(const InstallRegistry& registry, const std::string* indexPath)
{
    const std::string& home = registry.homeDirectory;
    setLibraryPath(home);
    const int stopped = stopScanners(home, true, true);
    if (stopped != 0) {
        *logstream << "Could not shutdown ZOR.\n";
        return stopped;
    }

    if (indexPath != nullptr) {
        refreshFileIndex(registry, *indexPath);
        deleteTemporaryFile(*indexPath); // of a run that was killed
    }
    const bool listed = removeListedFiles(indexPath);
    for (const RemovalStep& step : removalSteps(listed))
        perform(home, step);

    if (!localInstall)
        removeCommonLogDir();
    removeRegistry();
    return 0;
}

} // namespace

std::vector<RemovalStep> removalSteps(bool listed)
{
    std::vector<RemovalStep> steps;
    for (const DirectoryRow& row : directoryTable()) {
        const std::optional<RemovalKind> kind = listed ? row.afterIndex : row.withoutIndex;
        if (kind)
            steps.push_back({*kind, row.path});
    }
    return steps;
}

int removeInstallation(FileTransaction& transaction, InstallRegistry& registry,
                       const InstallRegistry& request, const std::string* indexPath)
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
    return removeToolkit(registry, indexPath);
}

bool removeListedFiles(const std::string* indexPath)
{
    if (indexPath == nullptr)
        return false;
    const ScopedFile index = openForReading(*indexPath);
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
        (void)unlinkPath(*indexPath); // best effort
    return anyListed;
}
