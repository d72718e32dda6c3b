#include "fresh_install.h"

#include "common_directory.h"
#include "extraction.h"
#include "file_index.h"
#include "file_operations.h"
#include "file_replacement.h"
#include "interruption.h"
#include "locations.h"
#include "paths.h"
#include "property_file.h"
#include "registry.h"
#include "scoped.h"
#include "selinux.h"
#include "settings.h"
#include "single_user_mode.h"
#include "template_variables.h"
#include "trace_directory.h"

#include <cstdio>
#include <ostream>

namespace {

constexpr mode_t UserCacheDirMode = 0770;
constexpr mode_t RegistryDirMode = 0755;

int makeSubdirOrReport(FileTransaction& transaction, const std::string& parent,
                       const std::string& name, mode_t mode)
{
    const ScopedUmask mask(globalFilesUmask);
    const int code = makeSubdir(transaction, parent, name, mode);
    if (code != FileOk)
        *logstream << "Cannot create subdir: " << name << '\n';
    return code;
}

/// Creates the directories that the package does not contain.
int createDirectories(FileTransaction& transaction, const std::string& home)
{
    const mode_t cacheMode = isRoot() ? CacheDirRootMode : UserCacheDirMode;
    int code = makeSubdirOrReport(transaction, home, cacheDir, cacheMode);
    if (code == FileOk)
        code = makeSubdirOrReport(transaction, joinPath(home, spbBinDir), etcDir, EtcDirMode);
    if (code != FileOk)
        return code;

    code = createInstallDir(transaction, home);
    if (code != 0)
        *logstream << "Cannot create extra directories!\n";
    return code;
}

int customizeProperties(const std::string& home)
{
    const std::string config = joinPath(home, spbCfgDir);
    const int code = customizePropertyFile(
        joinPath(config, zorProps), [&](PropertyFile& file) { fillMainProperties(file, home); });
    if (code != 0)
        return code;
    return customizePropertyFile(joinPath(config, traceProps),
                                 [&](PropertyFile& file) { fillTraceProperties(file, home); });
}

/// Completes the exploiter list and saves the registry.
int registerInstallation(FileTransaction& transaction, InstallRegistry& registry)
{
    if (skipExploiterRegistration)
        registry.exploiters.clear();
    registry.exploiters += ":";

    {
        const ScopedUmask mask(globalFilesUmask);
        // If this fails, so does the save.
        (void)createFullPath(transaction, registryDirectory(localInstall), RegistryDirMode,
                             nullptr);
    }
    return saveRegistry(transaction, registry);
}

/// The installation up to its last fatal step.
int installFiles(FileTransaction& transaction, InstallRegistry& registry,
                 const std::string* indexPath, bool writeRegistry, bool useCustomPath)
{
    const std::string& home = registry.homeDirectory;
    const int extracted = extractPackage(spbPackage, transaction, registry, true, indexPath);
    (void)setSelinuxContext(home); // also of a part; never fatal
    if (extracted != FileOk)
        return extracted;

    int code = isInterrupted() ? RunInterrupted : createDirectories(transaction, home);
    if (code == 0)
        code = isInterrupted() ? RunInterrupted : customizeProperties(home);
    if (code != 0)
        return code;

    updateScripts(home, readCommonDirectory(useCustomPath));
    if (isInterrupted())
        return RunInterrupted;
    if (writeRegistry)
        code = registerInstallation(transaction, registry);
    if (code == FileOk)
        writeInstallType(home, indexPath);
    return code;
}

} // namespace

int makeSubdir(FileTransaction& transaction, const std::string& parent, const std::string& name,
               mode_t mode)
{
    const int code = createPath(transaction, joinPath(parent, name + "/"), mode);
    if (code != FileOk)
        *logstream << "Error creating dir " << name << " in " << parent << " result=" << code
                   << " (" << fileErrorText(static_cast<unsigned>(code)) << ")\n";
    return code;
}

int createInstallDir(FileTransaction& transaction, const std::string& home)
{
    const ScopedUmask mask(globalFilesUmask);
    return makeSubdir(transaction, home, auxDirInstall, InstallDirMode) == FileOk ? 0 : -1;
}

void fillMainProperties(PropertyFile& file, const std::string& home)
{
    replaceAll(file, tokenZorDestDir, home);
    replaceAll(file, tokenZorCfgRoot, home);
    replaceAll(file, tokenFileSeparator, "/");
    replaceAll(file, tokenScannerMode, fileScannerMode);
}

void fillTraceProperties(PropertyFile& file, const std::string& home)
{
    replaceAll(file, tokenZorDestDir, home);
    replaceAll(file, tokenZorCfgRoot, home);
}

void writeInstallType(const std::string& home, const std::string* indexPath)
{
    const ScopedUmask mask(globalFilesUmask);
    const std::string path = joinPath(home, joinPath(auxDirInstall, installProps));
    const std::string& type = localInstall ? valueInstallLocal : valueInstallGlobal;
    const int code = replaceFile(path, NewFileMode, [&](std::FILE* file) {
        (void)std::fprintf(file, "%s=%s\n", keyInstallType.c_str(), type.c_str());
    });
    if (code == CannotOpenForWriting)
        *logstream << "Could not create file " << path << '\n';
    else if (indexPath != nullptr)
        appendToFileIndex(*indexPath, path);
}

int freshInstall(FileTransaction& transaction, InstallRegistry& registry,
                 const std::string* indexPath, bool writeRegistry, bool useCustomPath,
                 const std::string& customPath)
{
    const std::string& home = registry.homeDirectory;
    detectSingleUserMode(home);
    *logstream << "Performing fresh install on " << home << " (config=" << joinPath(home, spbCfgDir)
               << ")\n";

    const int code = installFiles(transaction, registry, indexPath, writeRegistry, useCustomPath);
    if (createSingleUserModeFile) // in every case
        createSingleUserModeFlag(transaction, home, indexPath);
    if (code != 0)
        return code;
    if (isInterrupted())
        return RunInterrupted;

    // A per-user installation does not use the common directory.
    if (localInstall && !useCustomPath)
        return 0;
    return updateCommonTracePath(transaction, home, useCustomPath, customPath);
}
