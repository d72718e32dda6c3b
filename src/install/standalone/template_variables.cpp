#include "template_variables.h"

#include "paths.h"
#include "property_file.h"
#include "safe_path.h"
#include "settings.h"

#include <ostream>

const std::string tokenZorDestDir = "$(ZOR_DestinationDir)";
const std::string tokenZorCfgRoot = "$(ZOR_ConfigRootDirectory)";
const std::string tokenCorvanCommonDir = "$(CorvanCommonDir)";
const std::string tokenFileSeparator = "$(FileSeparator)";
const std::string tokenScannerMode = "$(fscanner_mode)";

int replaceAll(PropertyFile& file, const std::string& placeholder, const std::string& value)
{
    return file.replaceText(placeholder, value);
}

void fillScript(PropertyFile& script, const std::string& home, const std::string& common)
{
    replaceAll(script, tokenZorDestDir, home);
    replaceAll(script, tokenZorCfgRoot, home); // not the configuration root of the registry
    replaceAll(script, tokenCorvanCommonDir, common);
}

int updateScript(const std::string& fileName, const std::string& home, const std::string& common)
{
    const std::string path = joinPath(home, joinPath(auxDirInstall, fileName));
    *logstream << "Updating file with variables " << path << '\n';
    if (!pathExists(path)) {
        *logstream << "Script does not exist " << path << '\n';
        return 0;
    }

    *logstream << "Updating: " << path << '\n';
    PropertyFile script;
    const int loaded = script.load(path);
    if (loaded != 0)
        return loaded;

    fillScript(script, home, common);

    const int saved = script.save(path);
    if (saved != 0)
        *logstream << "Could not save script file " << path << '\n';
    return saved;
}

void updateScripts(const std::string& home, const std::string& common)
{
    for (const char* const name : ScriptNames)
        (void)updateScript(name, home, common);
}
