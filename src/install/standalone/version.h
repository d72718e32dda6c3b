// Versions and build dates of the toolkit.
//
// A version is five unsigned 32-bit numbers, most significant first; its fifth number is read and
// compared but never written to the registry. A build date is the text "YY/MM/DD"; it breaks the
// tie between equal versions.
#pragma once

#include <cstdint>
#include <string>

struct ZorVersion {
    std::uint32_t major = 0;
    std::uint32_t minor = 0;
    std::uint32_t release = 0;
    std::uint32_t level = 0;
    std::uint32_t fifth = 0;
};

/// Reads one to five numbers separated by "." from `text`, white space around them allowed.
///
/// Numbers not given are 0, so a blank text is version 0.0.0.0.0; a number that does not fit 32
/// bits wraps around. `version` may be null to check only. Returns 0, or -1, with `version`
/// unchanged, if `text` contains anything else or a sixth number.
[[nodiscard]] int parseVersion(const std::string& text, ZorVersion* version);

/// Negative if `a` is older than `b`, 0 if equal, positive if newer: the difference, as a
/// signed 32-bit number, of the first pair of numbers that differ.
[[nodiscard]] int compareVersions(const ZorVersion& a, const ZorVersion& b);

/// The form shown to people, "2.3.0.0012"; ".5" follows only if the fifth number is above 0.
[[nodiscard]] std::string formatVersion(const ZorVersion& version);

/// The form written to the registry and the property files, "2.3.0.0012": never the fifth number.
[[nodiscard]] std::string registryVersionText(const ZorVersion& version);

/// The digits of a date "22/12/02" as the number 221202; 0 for any other text.
///
/// Year first, a larger number is a later date.
[[nodiscard]] int buildDateNumber(const std::string& text);
