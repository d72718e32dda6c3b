// The upgrade of a registered installation: replaces its files, or only registers one more
// exploiter.
#pragma once

#include <string>
#include <vector>

struct FileTransaction;
struct InstallRegistry;

/// Upgrades the installation of `registry` to the version of `request`, the installer's own record,
/// whose exploiter list is the calling exploiter's identifier.
///
/// If `deploys` (see isUpgradeNeeded()), the package replaces the installed files; otherwise only
/// the exploiter is registered. The scanners are stopped first (and disabled if `disable`); once
/// stopped, they are always enabled again at the end. `indexPath` is the file index, null for none;
/// with `useCustomPath` the caller provides the log directory. Returns 0, ScannersNotStopped (7), a
/// code of a file operation, or the `errno` of a property file. The caller commits or rolls back;
/// deletions and changes of property files are not undone.
[[nodiscard]] int upgradeInstall(FileTransaction& transaction, InstallRegistry& registry,
                                 const InstallRegistry& request, const std::string* indexPath,
                                 bool deploys, bool disable, bool useCustomPath,
                                 const std::string& customPath);

/// Adds the calling exploiter of `request`, unless `skipExploiterRegistration`, and a later build
/// date to `registry`; logs it. Returns true if that changed `registry`.
bool updateRegistration(InstallRegistry& registry, const InstallRegistry& request);

/// The files in "bin" of `home` that newer versions do not contain, whether or not they exist.
[[nodiscard]] std::vector<std::string> obsoleteFiles(const std::string& home);

/// Deletes obsoleteFiles(). Not journalled.
void removeObsoleteFiles(const std::string& home);
