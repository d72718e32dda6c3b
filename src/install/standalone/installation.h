// One installation, fresh or upgrade, from its procedure to commit or rollback.
#pragma once

#include <string>

struct FileTransaction;
struct InstallRegistry;

/// What is done to install a package.
enum class Procedure {
    FreshInstall,
    Upgrade,      ///< of an installation that is not newer: its files are replaced
    Registration, ///< an upgrade of a newer installation: only registers the exploiter
};

/// Installs as `request`, the installer's own record, or upgrades the registered installation
/// `registry`; then commits or, on a failure and unless `norollback`, rolls back. Logs which.
///
/// `indexPath` is the file index; it is made readable for everybody. `flag` makes the fresh
/// installation write the registry, and the upgrade disable the scanners while it runs. Returns the
/// procedure's result.
[[nodiscard]] int installWithTransaction(Procedure procedure, FileTransaction& transaction,
                                         InstallRegistry& registry, InstallRegistry& request,
                                         const std::string& indexPath, bool flag,
                                         bool useCustomPath, const std::string& customPath);

/// The same for callers that have not chosen a procedure: an upgrade if `upgrade`, which replaces
/// the files if isUpgradeNeeded(), otherwise a fresh installation. No flow calls it.
[[nodiscard]] int installWithTransaction(bool upgrade, FileTransaction& transaction,
                                         InstallRegistry& registry, InstallRegistry& request,
                                         const std::string& indexPath, bool flag,
                                         bool useCustomPath, const std::string& customPath);
