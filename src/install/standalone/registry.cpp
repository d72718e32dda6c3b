#include "registry.h"

#include "file_codes.h"
#include "file_operations.h"
#include "file_reading.h"
#include "file_replacement.h"
#include "locations.h"
#include "paths.h"
#include "safe_path.h"
#include "settings.h"
#include "text.h"

#include <cstdio>
#include <ostream>

const std::string KeyVersion = "ZOR_Version";
const std::string KeyBuildDate = "ZOR_BuildDate";
const std::string KeyHomeDir = "ZOR_HomeDirectory";
const std::string KeyExploiters = "ZOR_Exploiters";
const std::string KeyConfigRootDirectory = "ZOR_ConfigRootDirectory";

namespace {

constexpr mode_t RegistryFileMode = 0666;

/// Which of the required keys have been read.
struct SeenKeys {
    bool version = false;
    bool exploiters = false;
    bool home = false;
};

/// Parses one line of the file; false for a version line that does not parse.
bool takeLine(const std::string& line, InstallRegistry& registry, SeenKeys& seen)
{
    if (line.find('=') == std::string::npos)
        return true;
    const std::string key = keyOfLine(line);
    std::string value = textAfterEquals(line);
    trim(value);

    if (key == KeyVersion) {
        seen.version = parseVersion(value, &registry.version) == 0;
        return seen.version;
    }
    if (key == KeyExploiters) {
        registry.exploiters = value;
        seen.exploiters = true;
    } else if (key == KeyHomeDir) {
        registry.homeDirectory = value;
        seen.home = true;
    } else if (key == KeyBuildDate) {
        registry.buildDate = value;
    } else if (key == KeyConfigRootDirectory) {
        registry.configRootDirectory = value;
    }
    return true;
}

std::string registryText(const InstallRegistry& registry)
{
    return KeyVersion + " = " + registryVersionText(registry.version) + "\n" + //
           KeyBuildDate + " = " + registry.buildDate + "\n" +                  //
           KeyHomeDir + " = " + registry.homeDirectory + "\n" +                //
           KeyExploiters + " = " + registry.exploiters + "\n" +                //
           KeyConfigRootDirectory + " = " + registry.configRootDirectory + "\n";
}

} // namespace

int parseRegistry(const std::string& path, InstallRegistry* registry)
{
    const ScopedFile file = openForReading(path);
    if (!file)
        return RegistryCannotOpen;

    InstallRegistry discarded;
    InstallRegistry& target = registry != nullptr ? *registry : discarded;
    SeenKeys seen;
    std::string line;
    while (readLine(file.get(), line)) {
        if (!takeLine(line, target, seen))
            return RegistryBadVersion;
    }

    // A registry of which only a part could be read is not complete.
    const bool complete = seen.version && seen.exploiters && seen.home;
    return complete && std::ferror(file.get()) == 0 ? RegistryOk : RegistryIncomplete;
}

bool isUpgradeNeeded(const InstallRegistry& installed, const InstallRegistry& request)
{
    const int difference = compareVersions(installed.version, request.version);
    if (difference != 0)
        return difference < 0;
    return buildDateNumber(request.buildDate) >= buildDateNumber(installed.buildDate);
}

int writeRegistry(FileTransaction& transaction, const std::string& path,
                  const InstallRegistry& registry)
{
    const bool keepsBackup = transaction.backup && !pathIsMissing(path);
    if (keepsBackup) {
        const int code = backupCopy(transaction, path);
        if (code != FileOk)
            return code;
    }

    const std::string text = registryText(registry);
    struct stat status = {};
    FileIdentity written; // until the registry is replaced, that of the old one
    if (statPath(path, status) == 0)
        written = identityOf(status);
    const int code = replaceFile(
        path, RegistryFileMode,
        [&](std::FILE* file) { (void)std::fwrite(text.data(), 1, text.size(), file); }, &written);
    if (!keepsBackup && code != CannotOpenForWriting)
        record(transaction, Created, path);
    claim(transaction, path, written);
    return code == FileOk || code == CannotOpenForWriting ? code : CannotWrite;
}

int saveRegistry(FileTransaction& transaction, const InstallRegistry& registry)
{
    const std::string path = registryPath(localInstall);
    *logstream << "Saving INI file to " << path << '\n';
    const int code = writeRegistry(transaction, path, registry);
    if (code != FileOk)
        *logstream << "*** Error: could not open or write to INI file. Error = " << code << '\n';
    return code;
}
