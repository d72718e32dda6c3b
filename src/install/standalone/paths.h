// Operations on paths as text: nothing here looks at the disk.
#pragma once

#include <string>
#include <string_view>

/// The suffix of a backup: "/opt/x" is kept as "/opt/x.bak". There is only one generation.
inline const std::string BackupSuffix = ".bak";

/// `directory`, a "/" unless it already ends with one, `name`.
[[nodiscard]] std::string joinPath(const std::string& directory, std::string_view name);

/// As joinPath(), but an empty `name` gives `directory` unchanged.
[[nodiscard]] std::string joinPathOptional(const std::string& directory, std::string_view name);

/// True if `path` ends with "/".
[[nodiscard]] bool endsWithSlash(const std::string& path);

/// The directory that holds `path`: "/a" for "/a/b" and "/a/b/", "." for "b".
[[nodiscard]] std::string parentOf(const std::string& path);

/// `path` followed by BackupSuffix.
[[nodiscard]] std::string backupName(const std::string& path);
