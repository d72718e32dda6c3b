#include "settings_comparison.h"

#include "common_directory.h"
#include "fresh_install.h"
#include "guarded_file.h"
#include "paths.h"
#include "property_file.h"
#include "settings.h"
#include "settings_upgrade.h"
#include "survey.h"
#include "template_variables.h"
#include "text.h"

#include <algorithm>
#include <map>
#include <set>

namespace {

constexpr std::size_t SmallFile = std::size_t{1} << 20; // a file with settings

/// The values that a key may have without having been changed by the owner.
using Allowed = std::map<std::string, std::set<std::string>>;

PropertyFile linesOf(const std::string& text)
{
    PropertyFile file;
    (void)file.load(MemoryFile(text).path()); // no lines then, which differ
    return file;
}

bool isSetting(const std::string& line)
{
    const std::string key = keyOfLine(line);
    return line.find('=') != std::string::npos && !key.empty() && key[0] != '#';
}

std::string valueOf(const std::string& line)
{
    std::string value = textAfterEquals(line);
    trim(value);
    return value;
}

void allow(Allowed& allowed, const PropertyFile& file)
{
    for (const std::string& line : file.lines) {
        if (isSetting(line))
            allowed[keyOfLine(line)].insert(valueOf(line));
    }
}

void upgradeLines(PropertyFile& file, const Installation& found)
{
    const InstallRegistry& registry = found.registry;
    upgradeProperties(file, registry.homeDirectory, registry, readCommonDirectory(true));
}

/// What an upgrade adds to "Zor.properties", in addition to what the package has.
Allowed defaultsOfUpgrades(const Installation& found)
{
    PropertyFile file;
    for (const PropertyDefault* entry = ZorPropertiesUpdate; entry->key != nullptr; ++entry)
        file.lines.push_back(std::string(entry->key) + "=" + entry->value);
    upgradeLines(file, found);
    file.lines.push_back("version=" + registryVersionText(found.registry.version));
    Allowed allowed;
    for (const std::string& line : file.lines)
        allowed[keyOfLine(line)].insert(valueOf(line));
    return allowed;
}

/// What an upgrade carries into "ZorTrace.properties" from the trace settings.
Allowed carriedTraces(const std::string& home, const PropertyFile& traces)
{
    const GuardedText text = readGuarded(joinPath(joinPath(home, spbCfgDir), zorProps), SmallFile);
    const PropertyFile settings = linesOf(text.text);
    const auto rest = [&](const char* key) {
        const std::string* const line = settings.findLine(key);
        return line == nullptr ? std::string() : textAfterEquals(*line);
    };
    Allowed allowed;
    std::string file = rest("trace_file_path") + "/" + rest("trace_file");
    std::string level = "DEBUG_" + rest("trace_level");
    trim(file);
    trim(level);
    allowed["handlers.traceFile.fileName"].insert(file);
    for (const std::string& line : traces.lines) {
        if (keyOfLine(line).find(".loggers.trcLogger.level") != std::string::npos)
            allowed[keyOfLine(line)].insert(level);
    }
    return allowed;
}

/// The keys that have another value than the allowed ones, are new, or are missing.
std::vector<std::string> changedKeys(const Allowed& allowed, const PropertyFile& needed,
                                     const PropertyFile& present)
{
    std::set<std::string> seen;
    std::set<std::string> changed;
    for (const std::string& line : present.lines) {
        if (!isSetting(line))
            continue;
        const std::string key = keyOfLine(line);
        const auto values = allowed.find(key);
        seen.insert(key);
        if (values == allowed.end() || !values->second.contains(valueOf(line)))
            changed.insert(key);
    }
    for (const std::string& line : needed.lines) {
        if (isSetting(line) && !seen.contains(keyOfLine(line)))
            changed.insert(keyOfLine(line));
    }
    return {changed.begin(), changed.end()};
}

} // namespace

EditedFile editedFile(const std::string& path, const std::string& home)
{
    const std::string config = joinPath(home, spbCfgDir);
    if (path == joinPath(config, zorProps))
        return EditedFile::MainProperties;
    if (path == joinPath(config, traceProps))
        return EditedFile::TraceProperties;
    const std::string scripts = joinPath(home, auxDirInstall);
    const bool script =
        std::any_of(std::begin(ScriptNames), std::end(ScriptNames),
                    [&](const char* name) { return path == joinPath(scripts, name); });
    return script ? EditedFile::Script : EditedFile::None;
}

std::vector<std::string> changedSettings(const Installation& found, EditedFile kind,
                                         const std::string& packaged, const std::string& installed)
{
    const std::string& home = found.registry.homeDirectory;
    const bool main = kind == EditedFile::MainProperties;
    PropertyFile asShipped = linesOf(packaged);
    PropertyFile wanted = asShipped;
    if (main)
        fillMainProperties(wanted, home);
    else
        fillTraceProperties(wanted, home);

    Allowed allowed = main ? defaultsOfUpgrades(found) : carriedTraces(home, wanted);
    allow(allowed, wanted);
    allow(allowed, asShipped); // an upgrade leaves some placeholders as they are
    if (main) {
        upgradeLines(asShipped, found);
        allow(allowed, asShipped); // and fills others in
    }
    return changedKeys(allowed, wanted, linesOf(installed));
}

bool isScriptUnchanged(const Installation& found, const std::string& packaged,
                       const std::string& installed)
{
    PropertyFile wanted = linesOf(packaged);
    const PropertyFile present = linesOf(installed);
    // An upgrade of a per-user installation leaves the placeholders as they are.
    if (found.local && wanted.lines == present.lines)
        return true;
    fillScript(wanted, found.registry.homeDirectory, readCommonDirectory(true));
    return wanted.lines == present.lines;
}
