// The install registry: one "zor.ini" names the version, home and users of an installation.
//
// Five lines "key = value", each ended by a newline, in the order version, build date, home,
// exploiters, configuration root. The reader also takes other orders, other spacing and other
// lines; of a key that occurs twice the later line wins.
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
    RegistryBadVersion = 3, ///< nothing behind the bad version line was read
};

/// Reads the registry file at `path` into `registry`, which may be null to check only.
///
/// Returns a RegistryCode (0 to 3). Fields whose key does not occur keep their value, so callers
/// give a fresh record; after a code other than 0 it holds what was read before.
[[nodiscard]] int parseRegistry(const std::string& path, InstallRegistry* registry);

/// True when `package` goes over `installed`: that is older, or of the same version and not of a
/// later build, so the same build too.
[[nodiscard]] bool isUpgradeNeeded(const InstallRegistry& installed,
                                   const InstallRegistry& package);

/// Writes the whole registry file at `path`, journalled; an existing file is copied to its backup
/// name first when the transaction keeps backups.
///
/// Whoever reads it meanwhile finds the old or the new registry (replaceFile()). Returns 0,
/// CannotOpenForWriting (2), CannotWrite (5) whatever the reason, or the code of backupCopy(); in
/// each of these cases the old registry is still there.
[[nodiscard]] int writeRegistry(FileTransaction& transaction, const std::string& path,
                                const InstallRegistry& registry);

/// writeRegistry() to the registry of this run's install type; logs what it does and a failure's
/// code, which it returns.
[[nodiscard]] int saveRegistry(FileTransaction& transaction, const InstallRegistry& registry);
