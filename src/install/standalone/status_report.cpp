#include "status_report.h"

#include "build_stamp.h"
#include "common_directory.h"
#include "locations.h"
#include "registry.h"
#include "settings.h"
#include "version.h"

#include <iostream>

int showStatus()
{
    *logstream << "ZOR installer version: " << zorBuildStamp << '\n'
               << "Default install type: " << installTypeName(!isRoot()) << '\n';
    std::cout << "Corvan common dir = " << readCommonDirectory(true) << '\n';
    std::cout << "\nStatus of shared (global) installation:\n";
    showInstallation(false);
    std::cout << "\nStatus of installation for current user:\n";
    showInstallation(true);
    return 0;
}

void showInstallation(bool local)
{
    (void)defaultInstallDir(local); // only for its line about a missing home directory
    const std::string path = registryPath(local);
    std::cout << "INI file = " << path << '\n';

    InstallRegistry registry;
    if (parseRegistry(path, &registry) != RegistryOk) {
        std::cout << "Not installed\n";
        return;
    }
    std::cout << "Install dir = " << registry.homeDirectory << '\n'
              << "Install version = " << formatVersion(registry.version) << '\n'
              << "Exploiter list = " << registry.exploiters << '\n';
}
