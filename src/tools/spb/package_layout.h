// Where the entries of an SPB land, and with which mode: the installer's rules, as questions.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include <sys/types.h>

inline constexpr std::size_t LongestName = 2048;                   ///< bytes of an entry's name
inline constexpr std::size_t LongestComponent = 255;               ///< bytes between two slashes
inline constexpr std::uint64_t SizeLimit = std::uint64_t{1} << 31; ///< seeks have 32 signed bits
inline constexpr std::size_t MostEntries = 65535; ///< the end record counts in 16 bits

inline constexpr std::uint32_t Stored = 0;
inline constexpr std::uint32_t Deflated = 8;
inline constexpr std::uint32_t MadeByUnix = 3; ///< the system that made an entry

inline constexpr std::string_view MainProperties = "config/Zor.properties";
inline constexpr std::string_view TraceProperties = "config/ZorTrace.properties";
inline constexpr std::string_view XssDir = "config/xss/";

/// Image root and platform directory: what the names of a package's entries begin with.
[[nodiscard]] const std::string& imageRoot();

/// The package directories, each with its slash, in the order of their extraction. The installer
/// extracts XssDir once more before the last one.
[[nodiscard]] const std::vector<std::string>& packageDirs();

/// Where the entry `name` lands below the target directory: "bin/a", or "bin/" for a directory.
/// Nothing for an entry that the installer passes over.
[[nodiscard]] std::optional<std::string> landingOf(std::string_view name);

/// The mode with which `place` is extracted.
[[nodiscard]] mode_t extractionMode(std::string_view place);

/// The mode that `place` has once a shared installation is complete.
[[nodiscard]] mode_t installedMode(std::string_view place);

/// The permission bits of `mode` as four octal digits.
[[nodiscard]] std::string octal(mode_t mode);

/// True when the last removal deletes the directory `place`, once its listed files are gone.
[[nodiscard]] bool removalDeletes(std::string_view place);

/// The components of `path`; a slash at its end gives an empty last one.
[[nodiscard]] std::vector<std::string_view> componentsOf(std::string_view path);
