// The fresh installation: installs the toolkit where none is registered yet.
#pragma once

#include <string>

#include <sys/types.h>

struct FileTransaction;
struct InstallRegistry;
struct PropertyFile;

/// Creates and journals the directory `name` in `parent`, and what is missing above it. Returns 0
/// or the code of createPath(), which is logged.
[[nodiscard]] int makeSubdir(FileTransaction& transaction, const std::string& parent,
                             const std::string& name, mode_t mode);

/// Creates and journals the directory "install" in `home`, with mode 0750 under `globalFilesUmask`.
/// Returns 0 or -1.
[[nodiscard]] int createInstallDir(FileTransaction& transaction, const std::string& home);

/// Fills in the placeholders of a new "Zor.properties".
void fillMainProperties(PropertyFile& file, const std::string& home);

/// Fills in the placeholders of a new "ZorTrace.properties".
void fillTraceProperties(PropertyFile& file, const std::string& home);

/// Records in `home` whether the installation is the shared or a per-user one, and adds the record
/// to the index at `indexPath` (null: none). Not journalled; a failure is logged only.
void writeInstallType(const std::string& home, const std::string* indexPath);

/// Installs `spbPackage` into the home of `registry`, journalled.
///
/// The list of `registry` is the calling exploiter's identifier without a colon; if
/// `writeRegistry`, the list is completed and the registry is saved. `indexPath` is the file index,
/// null for none. If `useCustomPath`, traces go to `customPath`. Returns 0 or the first failure: a
/// code of a file operation, the `errno` of a property file, -1 if "install" cannot be created, or
/// the status of the scanner control program. The caller commits or rolls back.
[[nodiscard]] int freshInstall(FileTransaction& transaction, InstallRegistry& registry,
                               const std::string* indexPath, bool writeRegistry, bool useCustomPath,
                               const std::string& customPath);
