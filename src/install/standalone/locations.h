// The locations of installations: the shared one, and one for each user.
//
// "Local" is the installation of the current user, "global" the shared one.
#pragma once

#include <string>

extern const std::string ZorIniName;         ///< "zor.ini"
extern const std::string keyInstallType;     ///< "ZOR_InstallType"
extern const std::string valueInstallGlobal; ///< "global"
extern const std::string valueInstallLocal;  ///< "local"

/// What installedTypeOf() finds.
enum InstalledType : int {
    UnknownInstall = 0, ///< no readable property file: nothing installed there
    LocalInstall = 1,
    GlobalInstall = 2,
};

/// True if the real user id is 0.
[[nodiscard]] bool isRoot();

/// "local" or "global".
[[nodiscard]] std::string installTypeName(bool local);

/// The home directory in the password entry of the real user id, else of the login name; empty when
/// there is neither.
[[nodiscard]] std::string homeDirectory();

/// The default directory of the toolkit. Without a home directory, that of a local installation is
/// the global one, and an error is printed on `logstream`.
[[nodiscard]] std::string defaultInstallDir(bool local);

/// The directory of the registry file. Without a home directory the global one, silently.
[[nodiscard]] std::string registryDirectory(bool local);

/// The registry file; empty if its directory is.
[[nodiscard]] std::string registryPath(bool local);

/// The registry file of the user whose home directory is `home`.
[[nodiscard]] std::string registryPathBelow(const std::string& home);

/// The install type that the property file of the installation in `targetDir` records: an
/// InstalledType (0 to 2). A file without the key counts as global.
[[nodiscard]] int installedTypeOf(const std::string& targetDir);

/// True unless there is an installation of the other type in `targetDir`, which is then reported on
/// `logstream`.
[[nodiscard]] bool checkInstallTypeCompatibility(bool local, const std::string& targetDir);
