#include "locations.h"

#include "paths.h"
#include "property_file.h"
#include "settings.h"

#include <ostream>

#include <pwd.h>
#include <unistd.h>

const std::string ZorIniName = "zor.ini";
const std::string keyInstallType = "ZOR_InstallType";
const std::string valueInstallGlobal = "global";
const std::string valueInstallLocal = "local";

namespace {

constexpr const char* GlobalInstallDir = "/opt/corvan/zor";
constexpr const char* GlobalRegistryDir = "/etc/zor";
constexpr const char* LocalRegistryDirName = ".zor";

} // namespace

bool isRoot()
{
    return getuid() == 0;
}

std::string installTypeName(bool local)
{
    return local ? valueInstallLocal : valueInstallGlobal;
}

std::string homeDirectory()
{
    // The installer has one thread: the static results of the user database are its own.
    if (const passwd* entry = getpwuid(getuid()))
        return entry->pw_dir;
    const char* const login = getlogin();
    if (login == nullptr)
        return {};
    const passwd* const entry = getpwnam(login);
    return entry == nullptr ? "" : entry->pw_dir;
}

std::string defaultInstallDir(bool local)
{
    if (!local)
        return GlobalInstallDir;
    const std::string home = homeDirectory();
    if (home.empty()) {
        *logstream << "*** Error: cannot retrieve home directory for current user.\n";
        return GlobalInstallDir;
    }
    return joinPath(home, "corvan/zor");
}

std::string registryDirectory(bool local)
{
    const std::string home = local ? homeDirectory() : std::string();
    return home.empty() ? GlobalRegistryDir : joinPath(home, LocalRegistryDirName);
}

std::string registryPath(bool local)
{
    const std::string directory = registryDirectory(local);
    return directory.empty() ? std::string() : joinPath(directory, ZorIniName);
}

std::string registryPathBelow(const std::string& home)
{
    return joinPath(joinPath(home, LocalRegistryDirName), ZorIniName);
}

int installedTypeOf(const std::string& targetDir)
{
    PropertyFile properties;
    if (properties.load(joinPath(targetDir, joinPath(auxDirInstall, installProps))) != 0)
        return UnknownInstall;
    return properties.getValue(keyInstallType) == valueInstallLocal ? LocalInstall : GlobalInstall;
}

bool checkInstallTypeCompatibility(bool local, const std::string& targetDir)
{
    const int type = installedTypeOf(targetDir);
    if (type == UnknownInstall || (type == LocalInstall) == local)
        return true;
    *logstream << "*** Error: incompatible install type\n"
               << "ZOR already installed as " << installTypeName(type == LocalInstall) << " in "
               << targetDir << '\n';
    return false;
}
