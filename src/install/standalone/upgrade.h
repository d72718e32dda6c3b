// The upgrade: a package brought over a registered installation, or only one more exploiter.
#pragma once

#include <string>
#include <vector>

struct FileTransaction;
struct InstallRegistry;

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

/// Adds the calling exploiter of `package`, unless `skipExploiterRegistration`, and a later build
/// date to `registry`; logs it. Returns true when that changed it.
bool updateRegistration(InstallRegistry& registry, const InstallRegistry& package);

/// The files in "bin" of `home` that newer versions do not carry, whether or not they exist.
[[nodiscard]] std::vector<std::string> obsoleteFiles(const std::string& home);

/// Deletes, not journalled, the files in "bin" of `home` that newer versions do not carry.
void removeObsoleteFiles(const std::string& home);
