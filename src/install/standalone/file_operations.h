// The primitives through which an installation changes the disk.
//
// Each returns a code of file_codes.h and prints nothing. Its changes are in the journal, so a
// caller only has to return a failure. A primitive that fails before its journal entry leaves no
// entry; a partial file that it wrote remains. Permission changes are not journalled. Directories
// and files get their mode under the process umask, which the caller sets.
#pragma once

#include "entry_extraction.h"
#include "file_codes.h"
#include "paths.h"
#include "text.h"
#include "transaction.h"

#include <string>

#include <sys/types.h>

/// Copies a file; the destination is created or truncated. Nothing is journalled.
///
/// Returns 0, CannotOpenForReading (1, the destination is not touched), CannotOpenForWriting (2),
/// CannotRead (4), or the code of a failed write (5, 6, 7). A failed copy leaves what was written.
[[nodiscard]] int copyFile(const std::string& source, const std::string& destination);

/// Copies the file at `path` to its backup name, for a caller that replaces it next: journals the
/// backup and then `path` as created. The copy has owner, group, mode and attributes of the
/// original, so that a rollback restores them, and is on the disk. Does not look at the
/// transaction's backup flag.
///
/// Returns 0 or the code of copyFile(); the backup name is then deleted.
[[nodiscard]] int backupCopy(FileTransaction& transaction, const std::string& path);

/// Copies a file over `destination`, whose old content is backed up. No flow calls it.
///
/// Returns 0, CannotRename (9) or the code of copyFile(); a partly written destination has no
/// journal entry then.
[[nodiscard]] int copyFileWithBackup(FileTransaction& transaction, const std::string& source,
                                     const std::string& destination);

/// Sets the permission bits of `path`. Returns 0 or CannotChangeMode (13).
///
/// A path that leads through a stranger's link gives 13. A rollback does not undo this.
[[nodiscard]] int setFileMode(const std::string& path, mode_t mode);

/// The same. The transaction is part of the interface, not used.
[[nodiscard]] int setFileMode(FileTransaction& transaction, const std::string& path, mode_t mode);

/// Creates one directory, with 0777 if `mode` is 0. Returns 0, or -1 with `errno`.
[[nodiscard]] int makeDirectory(const std::string& path, mode_t mode);

/// Removes an empty directory. Returns 0, or -1 with `errno`.
int removeDirectory(const std::string& path);

/// Creates and journals every missing directory named before the last "/" of `path`.
///
/// Whatever already exists is skipped. Returns 0 or CannotCreateDirectory (11).
[[nodiscard]] int createPath(FileTransaction& transaction, const std::string& path, mode_t mode);

/// As createPath(), with the last component as well.
///
/// `counter` may be null. Deliberate: it is set to 0 and never incremented; to learn what was
/// created, compare changeCount().
[[nodiscard]] int createFullPath(FileTransaction& transaction, const std::string& path, mode_t mode,
                                 int* counter);
