// Where installations lie: the shared one, and one per user.
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

/// True when the real user id is 0.
[[nodiscard]] bool isRoot();

/// "local" or "global".
[[nodiscard]] std::string installTypeName(bool local);

/// The home directory in the password entry of the real user id, else of the login name; empty when
/// there is neither.
[[nodiscard]] std::string homeDirectory();

/// Where the toolkit goes unless told otherwise. Without a home directory a local installation has
/// the global place, and a line on `logstream` says so.
[[nodiscard]] std::string defaultInstallDir(bool local);

/// The directory of the registry file. Without a home directory the global one, silently.
[[nodiscard]] std::string registryDirectory(bool local);

/// The registry file; empty when its directory is.
[[nodiscard]] std::string registryPath(bool local);

/// The registry file of the user whose home directory is `home`.
[[nodiscard]] std::string registryPathBelow(const std::string& home);

/// The install type that the property file of the installation in `targetDir` records: an
/// InstalledType (0 to 2). A file without the key counts as global.
[[nodiscard]] int installedTypeOf(const std::string& targetDir);

/// True unless an installation of the other type occupies `targetDir`; two lines on `logstream`
/// tell when it does.
[[nodiscard]] bool checkInstallTypeCompatibility(bool local, const std::string& targetDir);
