// Paths as texts: joining them, the name of a backup, the test for existence.
#pragma once

#include <string>
#include <string_view>

/// Ends the name of a backup: "/opt/x" is kept as "/opt/x.bak". One generation only.
inline constexpr std::string_view BackupSuffix = ".bak";

/// `directory`, a "/" unless it already ends with one, `name`.
[[nodiscard]] std::string joinPath(const std::string& directory, std::string_view name);

/// As joinPath(), but an empty `name` gives `directory` unchanged. Completes the set: the flows
/// of the installer reach it through the removal of directories only.
[[nodiscard]] std::string joinPathOptional(const std::string& directory, std::string_view name);

/// True when `path` ends with "/". No flow calls it but joinPath().
[[nodiscard]] bool endsWithSlash(const std::string& path);

/// `path` followed by BackupSuffix.
[[nodiscard]] std::string backupName(const std::string& path);

/// True when something exists at `path`, links followed: a dangling link does not.
[[nodiscard]] bool pathExists(const std::string& path);

/// True when surely nothing exists at `path`, links followed. A path that cannot be looked at, for
/// example because the disk fails, neither exists nor is missing: what lies there must be kept.
[[nodiscard]] bool pathIsMissing(const std::string& path);

/// True when the way to `path` must not be searched: nothing there can be seen, moved or opened.
[[nodiscard]] bool pathIsBarred(const std::string& path);
