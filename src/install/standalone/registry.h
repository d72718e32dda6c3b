// The install registry: one "zor.ini" names the version, home and users of an installation.
//
// Five lines "key = value", each ended by a newline, in the order version, build date, home,
// exploiters, configuration root. The reader also accepts other orders, other spacing and other
// lines; if a key occurs twice, the later line wins.
#pragma once

#include "common_directory.h"
#include "exploiters.h"
#include "install_registry.h"
#include "text.h"
#include "transaction.h"
#include "version.h"

#include <string>

extern const std::string KeyVersion;             ///< "ZOR_Version"
extern const std::string KeyBuildDate;           ///< "ZOR_BuildDate"
extern const std::string KeyHomeDir;             ///< "ZOR_HomeDirectory"
extern const std::string KeyExploiters;          ///< "ZOR_Exploiters"
extern const std::string KeyConfigRootDirectory; ///< "ZOR_ConfigRootDirectory"

/// Results of parseRegistry(). The numbers are printed and therefore fixed.
enum RegistryCode : int {
    RegistryOk = 0,
    RegistryCannotOpen = 1,
    RegistryIncomplete = 2, ///< version, exploiters or home is missing, or reading failed
    RegistryBadVersion = 3, ///< nothing after the bad version line was read
};

/// Reads the registry file at `path` into `registry`, which may be null to check only.
///
/// Returns a RegistryCode (0 to 3). Fields whose key does not occur keep their value, so callers
/// pass a new record; after a failure it contains what was read until then.
[[nodiscard]] int parseRegistry(const std::string& path, InstallRegistry* registry);

/// True if the package of `request`, the installer's own record, must replace `installed`: that has
/// an older version, or the same version and a build date that is not later.
[[nodiscard]] bool isUpgradeNeeded(const InstallRegistry& installed,
                                   const InstallRegistry& request);

/// Writes the whole registry file at `path`, journalled; an existing file is copied to its backup
/// name first if the transaction keeps backups.
///
/// The replacement is atomic (replaceFile()). Returns 0, CannotOpenForWriting (2), CannotWrite (5)
/// for any failed write, or the code of backupCopy(); after a failure the old registry is still
/// there.
[[nodiscard]] int writeRegistry(FileTransaction& transaction, const std::string& path,
                                const InstallRegistry& registry);

/// writeRegistry() to the registry of this run's install type; logs what it does and a failure's
/// code, which it returns.
[[nodiscard]] int saveRegistry(FileTransaction& transaction, const InstallRegistry& registry);
