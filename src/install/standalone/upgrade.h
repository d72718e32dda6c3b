// The upgrade: a package brought over a registered installation, or only one more exploiter.
#pragma once

#include <string>
#include <vector>

struct FileTransaction;
struct InstallRegistry;
struct PropertyFile;

/// A key of "Zor.properties" and the value that it gets when it is missing.
struct PropertyDefault {
    const char* key;
    const char* value;
};

/// The keys that newer versions need, ended by a pair of nulls.
extern const PropertyDefault ZorPropertiesUpdate[];

/// Brings the installation of `registry` to the version of `request`, the installer's own record,
/// whose exploiter list is the calling exploiter's identifier.
///
/// Deploys the package when the installed version is older, or the same with a build date that is
/// not later; otherwise only registers the exploiter. The scanners are stopped first, disabled as
/// well with `disable`, and once stopped enabled again at the end in any case. `indexPath` is the
/// index of installed files, null for none; with `useCustomPath` the log directory is the caller's.
/// Returns 0, ScannersNotStopped (7), a code of a file operation, or the `errno` of a property
/// file. The caller commits or rolls back; deletions and changes of property files stay.
[[nodiscard]] int upgradeInstall(FileTransaction& transaction, InstallRegistry& registry,
                                 const InstallRegistry& request, const std::string* indexPath,
                                 bool disable, bool useCustomPath, const std::string& customPath);

/// Edits the lines of the installed "Zor.properties", the user's settings among them, for the
/// version of `package`. Doing it twice changes nothing more.
void upgradeProperties(PropertyFile& file, const std::string& home, const InstallRegistry& package,
                       const std::string& common);

/// Customizes the property files and, of a shared installation, the scripts of the extracted
/// package. Doing it twice changes nothing more. Returns 0 or the `errno` of a property file.
[[nodiscard]] int customizeDeployment(const std::string& home, const InstallRegistry& package,
                                      bool useCustomPath);

/// Adds the calling exploiter of `package`, unless `skipExploiterRegistration`, and a later build
/// date to `registry`; logs it. Returns true when that changed it.
bool updateRegistration(InstallRegistry& registry, const InstallRegistry& package);

/// The files in "bin" of `home` that newer versions do not carry, whether or not they exist.
[[nodiscard]] std::vector<std::string> obsoleteFiles(const std::string& home);

/// Deletes, not journalled, the files in "bin" of `home` that newer versions do not carry.
void removeObsoleteFiles(const std::string& home);
