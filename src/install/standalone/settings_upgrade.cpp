#include "settings_upgrade.h"

#include "common_directory.h"
#include "paths.h"
#include "property_file.h"
#include "registry.h"
#include "settings.h"
#include "template_variables.h"
#include "text.h"

#include <optional>
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

constexpr const char* ObsoleteKeys[] = {
    "trawlnet.cputhreshold",
    "trawluse.cputhreshold",
    "trawluse.changepriority",
    "trawlnet.changepriority",
    "trawluse.cache_dir",
    "trawlnet.cache_dir",
    "lsof.bin",
};

/// What the old "Zor.properties" says about traces: the text after each "=", unchanged.
struct KeptTraceTexts {
    std::string level;
    std::string path;
    std::string file;
};

std::string textOfKey(const PropertyFile& file, const std::string& key)
{
    const std::string* const line = file.findLine(key);
    return line == nullptr ? std::string() : textAfterEquals(*line);
}

KeptTraceTexts keptTraceTexts(const PropertyFile& file)
{
    return {textOfKey(file, "trace_level"), textOfKey(file, "trace_file_path"),
            textOfKey(file, "trace_file")};
}

/// Replaces everything after the first "=" of `line`; a line without "=" gets one.
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

void setInstalledVersion(PropertyFile& file, const InstallRegistry& request)
{
    std::string* const version = file.findLine("version");
    if (version != nullptr) // a missing one is not added
        setTextAfterEquals(*version, registryVersionText(request.version));

    std::string* const buildDate = file.findLine("build_date");
    if (buildDate != nullptr)
        setTextAfterEquals(*buildDate, request.buildDate);
    else
        file.lines.push_back("build_date=" + request.buildDate);
}

/// The trace directory that `file`, the upgraded "Zor.properties", names, if it names one.
std::optional<std::string> traceDirOf(const PropertyFile& file, const KeptTraceTexts& kept)
{
    // Deliberate: the kept path itself serves as the key, so an ordinary file has no such line.
    const std::string* const line = file.findLine(kept.path);
    return line == nullptr ? std::nullopt : std::optional(textAfterEquals(*line));
}

/// Writes the kept trace settings into the new "ZorTrace.properties".
int upgradeTraceProperties(const KeptTraceTexts& kept, const std::string& config)
{
    const int code = customizePropertyFile(joinPath(config, traceProps), [&](PropertyFile& file) {
        file.setValue("handlers.traceFile.fileName", kept.path + "/" + kept.file);
        file.setValueWhereKeyContains(".loggers.trcLogger.level", "DEBUG_" + kept.level);
    });
    if (code == 0)
        *logstream << "File saved successfully\n";
    return code;
}

} // namespace

void upgradeProperties(PropertyFile& file, const std::string& home, const InstallRegistry& request,
                       const std::string& common)
{
    for (const char* const key : ObsoleteKeys)
        file.clearWhereKeyContains(key);
    setInstalledVersion(file, request);
    addMissingKeys(file);

    replaceAll(file, tokenZorDestDir, home);
    replaceAll(file, tokenZorCfgRoot, home);
    replaceAll(file, tokenCorvanCommonDir, common);
    replaceAll(file, tokenFileSeparator, "/");
    replaceAll(file, tokenScannerMode, fileScannerMode);
}

int customizeDeployment(const std::string& home, const InstallRegistry& request, bool useCustomPath)
{
    const std::string config = joinPath(home, spbCfgDir);
    const std::string path = joinPath(config, zorProps);
    *logstream << "Customizing properties file: " << path << '\n';
    std::string common;
    KeptTraceTexts kept;
    std::optional<std::string> traceDir;
    int code = editPropertyFile(path, [&](PropertyFile& file) {
        kept = keptTraceTexts(file);
        // Not earlier: this may write the setting of the common directory.
        common = readCommonDirectory(useCustomPath);
        upgradeProperties(file, home, request, common);
        traceDir = traceDirOf(file, kept);
    });
    if (code != 0)
        return code;

    *logstream << "Looking for Trace Dir\n";
    if (traceDir)
        *logstream << "Trace Dir: " << *traceDir << '\n';

    code = upgradeTraceProperties(kept, config);
    if (code == 0 && !localInstall)
        updateScripts(home, common);
    return code;
}
