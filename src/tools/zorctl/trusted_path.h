// Files and directories that no other user can exchange.
#pragma once

#include <string>

/// True if `path` is a regular file of root or of the running user, without another name, in a
/// directory that, like everything above it, nobody else can write to. Then nobody else can
/// exchange it meanwhile.
[[nodiscard]] bool isTrustedFile(const std::string& path);

/// The directory `path` without links, if nobody else can exchange what this process creates in it:
/// it and every directory above it belong to root or the running user, and others may write to none
/// of them unless it is sticky. Empty otherwise.
[[nodiscard]] std::string safeDirectory(const std::string& path);

/// Renames `backup` to the name without BackupSuffix if isTrustedFile(): checked and renamed in the
/// same open directory, so that a link on the path that is exchanged meanwhile leads nowhere else.
/// Returns false if it is not trusted or cannot be renamed.
[[nodiscard]] bool restoreTrusted(const std::string& backup);
