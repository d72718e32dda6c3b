#include "upgrade.h"

#include "commands.h"
#include "common_directory.h"
#include "exploiters.h"
#include "extraction.h"
#include "file_codes.h"
#include "interruption.h"
#include "paths.h"
#include "property_file.h"
#include "registry.h"
#include "safe_path.h"
#include "scanner_control.h"
#include "selinux.h"
#include "settings.h"
#include "single_user_mode.h"
#include "template_variables.h"
#include "text.h"
#include "trace_directory.h"
#include "tree_removal.h"

#include <cstdio>
#include <ostream>

const PropertyDefault ZorPropertiesUpdate[] = {
    {"vpdscanner.default_config_file", "config.xml"},
    {"hwscanner.config_file", "ZorHWConfig.xml"},
    {"hwscanner.hpux.full_node_npar", ""},
    {"hwscanner.node_active_cores", ""},
    {"fscanner.provider_remote_cache.home", "$(ZOR_ConfigRootDirectory)$(FileSeparator)cache_data"},
    {"fscanner.provider_remote_cache.globalCache", "false"},
    {"swscanner.assume_remote_filesystems", ""},
    {"hwscanner.changepriority", "normal"},
    {"swscanner.changepriority", "normal"},
    {"fscanner.changepriority", "normal"},
    {"vpdscanner.changepriority", "normal"},
    {"hwscanner.cputhreshold", "0:0:0:0"},
    {"swscanner.cputhreshold", "0:0:0:0"},
    // Deliberate: "fsscanner", unlike its neighbours; the toolkit has always read this spelling.
    {"fsscanner.cputhreshold", "0:0:0:0"},
    {"vpdscanner.cputhreshold", "0:0:0:0"},
    {"fscanner.excludeDirs", "false"},
    {"swscanner.excludeDirs", ""},
    {"swscanner.firsttimeonly", "false"},
    {nullptr, nullptr},
};

namespace {

constexpr const char* ObsoleteFiles[] = {
    "trawlnet",  "trawlnet.so",    "trawluse",          "trawluse.so",
    "libzor.so", "kpo_config.xml", "libxerces-c.so.26",
};

constexpr const char* ObsoleteKeys[] = {
    "trawlnet.cputhreshold",
    "trawluse.cputhreshold",
    "trawluse.changepriority",
    "trawlnet.changepriority",
    "trawluse.cache_dir",
    "trawlnet.cache_dir",
    "lsof.bin",
};

/// What the old "Zor.properties" says about traces: the texts behind "=", as they stand.
struct KeptTraceTexts {
    std::string level;
    std::string path;
    std::string file;
};

std::string textOfKey(PropertyFile& file, const std::string& key)
{
    const std::string* const line = file.findLine(key);
    return line == nullptr ? std::string() : textAfterEquals(*line);
}

/// Replaces everything behind the first "=" of `line`, which gets one when it has none.
void setTextAfterEquals(std::string& line, const std::string& text)
{
    line = line.substr(0, line.find('=')) + "=" + text;
}

void addMissingKeys(PropertyFile& file)
{
    for (const PropertyDefault* entry = ZorPropertiesUpdate; entry->key != nullptr; ++entry) {
        if (file.findLine(entry->key) == nullptr)
            file.lines.push_back(std::string(entry->key) + "=" + entry->value);
    }
}

void setPackageVersion(PropertyFile& file, const InstallRegistry& package)
{
    std::string* const version = file.findLine("version");
    if (version != nullptr) // a missing one is not added
        setTextAfterEquals(*version, registryVersionText(package.version));

    std::string* const buildDate = file.findLine("build_date");
    if (buildDate != nullptr)
        setTextAfterEquals(*buildDate, package.buildDate);
    else
        file.lines.push_back("build_date=" + package.buildDate);
}

int saveOrSay(const PropertyFile& file, const std::string& path)
{
    const int code = file.save(path);
    if (code != 0)
        *logstream << "Could not save property file\n";
    return code;
}

int loadOrSay(PropertyFile& file, const std::string& path)
{
    const int code = file.load(path);
    if (code != 0)
        *logstream << "Could not load property file\n";
    return code;
}

/// Logs the trace directory that "Zor.properties" names, if it names one.
void lookForTraceDir(PropertyFile& file, const KeptTraceTexts& kept)
{
    *logstream << "Looking for Trace Dir\n";
    // Deliberate: the kept path itself serves as the key, so an ordinary file has no such line.
    const std::string* const line = file.findLine(kept.path);
    if (line != nullptr)
        *logstream << "Trace Dir: " << textAfterEquals(*line) << '\n';
}

/// Carries the kept trace settings into the new "ZorTrace.properties".
int upgradeTraceProperties(const KeptTraceTexts& kept, const std::string& home)
{
    const std::string path = joinPath(joinPath(home, spbCfgDir), traceProps);
    *logstream << "Customizing property file: " << path << '\n';
    PropertyFile file;
    const int loaded = loadOrSay(file, path);
    if (loaded != 0)
        return loaded;

    file.setValue("handlers.traceFile.fileName", kept.path + "/" + kept.file);
    file.setValueWhereKeyContains(".loggers.trcLogger.level", "DEBUG_" + kept.level);
    const int saved = saveOrSay(file, path);
    if (saved == 0)
        *logstream << "File saved successfully\n";
    return saved;
}

/// Replaces the installed files, whose scanners are stopped, by those of the package.
int deployFiles(FileTransaction& transaction, InstallRegistry& registry,
                const InstallRegistry& package, const std::string* indexPath, bool useCustomPath)
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
    return customizeDeployment(home, package, useCustomPath);
}

/// The common log directory and the registry, after `deployed` files or without any.
int finishUpgrade(FileTransaction& transaction, InstallRegistry& registry,
                  const InstallRegistry& package, bool deployed, bool useCustomPath,
                  const std::string& customPath)
{
    if (!localInstall && !useCustomPath) {
        const int code =
            setupCommonLogDir(transaction, registry.homeDirectory, useCustomPath, customPath);
        if (code != 0)
            return code;
    }
    if (deployed)
        registry.version = package.version;
    const bool changed = updateRegistration(registry, package);
    return deployed || changed ? saveRegistry(transaction, registry) : FileOk;
}

} // namespace

void upgradeProperties(PropertyFile& file, const std::string& home, const InstallRegistry& package,
                       const std::string& common)
{
    for (const char* const key : ObsoleteKeys)
        file.clearWhereKeyContains(key);
    setPackageVersion(file, package);
    addMissingKeys(file);

    replaceAll(file, tokenZorDestDir, home);
    replaceAll(file, tokenZorCfgRoot, home);
    replaceAll(file, tokenCorvanCommonDir, common);
    replaceAll(file, tokenFileSeparator, "/");
    replaceAll(file, tokenScannerMode, fileScannerMode);
}

int customizeDeployment(const std::string& home, const InstallRegistry& package, bool useCustomPath)
{
    const std::string path = joinPath(joinPath(home, spbCfgDir), zorProps);
    *logstream << "Customizing properties file: " << path << '\n';
    PropertyFile properties;
    int code = loadOrSay(properties, path);
    if (code != 0)
        return code;

    const KeptTraceTexts kept = {textOfKey(properties, "trace_level"),
                                 textOfKey(properties, "trace_file_path"),
                                 textOfKey(properties, "trace_file")};
    // Not before: the setting of the common directory may be written here.
    const std::string common = readCommonDirectory(useCustomPath);
    upgradeProperties(properties, home, package, common);
    code = saveOrSay(properties, path);
    if (code != 0)
        return code;

    lookForTraceDir(properties, kept);
    code = upgradeTraceProperties(kept, home);
    if (code == 0 && !localInstall)
        updateScripts(home, common);
    return code;
}

bool updateRegistration(InstallRegistry& registry, const InstallRegistry& package)
{
    bool changed = false;
    const std::string& exploiter = package.exploiters;
    if (!isExploiterRegistered(registry, exploiter)) {
        if (skipExploiterRegistration) {
            *logstream << "Exploiter registration skipped\n";
        } else {
            *logstream << "Adding exploiter " << exploiter << " to INI file\n";
            addExploiter(registry, exploiter);
            changed = true;
        }
    }
    if (buildDateNumber(package.buildDate) > buildDateNumber(registry.buildDate)) {
        *logstream << "Updating BuildDate informations to: " << package.buildDate << '\n';
        registry.buildDate = package.buildDate;
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
                   const InstallRegistry& request, const std::string* indexPath, bool disable,
                   bool useCustomPath, const std::string& customPath)
{
    const std::string& home = registry.homeDirectory;
    detectSingleUserMode(home);

    const bool deploys = isUpgradeNeeded(registry, request);
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
        else if (isInterrupted())
            code = RunInterrupted;
        else
            code = deployFiles(transaction, registry, request, indexPath, useCustomPath);
    } else {
        *logstream << "Installed ZOR is not older than this version, updating exploiters only\n";
    }
    if (code == FileOk && isInterrupted())
        code = RunInterrupted;
    if (code == FileOk)
        code = finishUpgrade(transaction, registry, request, deploys, useCustomPath, customPath);

    // Also after a failure: the caller only undoes what the journal holds.
    if (createSingleUserModeFile)
        createSingleUserModeFlag(transaction, home, indexPath);
    if (stopped && restartScanners(home) != 0)
        *logstream << "*** Error: could not restart ZOR.\n";
    return code;
}
