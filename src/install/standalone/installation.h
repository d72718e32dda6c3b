// One installation, fresh or upgrade, from its procedure to commit or rollback.
#pragma once

#include <string>

struct FileTransaction;
struct InstallRegistry;

/// Runs the upgrade of the registered installation `registry`, or the fresh installation of
/// `request`, the installer's own record; then commits, or, on a failure and unless `norollback`,
/// rolls back. Logs which.
///
/// `indexPath` is the index of installed files; it is made readable for everybody. `flag` asks the
/// fresh installation to write the registry and the upgrade to disable the scanners while it runs.
/// Returns the procedure's result.
[[nodiscard]] int installWithTransaction(bool upgrade, FileTransaction& transaction,
                                         InstallRegistry& registry, InstallRegistry& request,
                                         const std::string& indexPath, bool flag,
                                         bool useCustomPath, const std::string& customPath);
