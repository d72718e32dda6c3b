// The settings of an installation that an upgrade keeps: its property files and scripts are adapted
// to the new version.
#pragma once

#include <string>

struct InstallRegistry;
struct PropertyFile;

/// A key of "Zor.properties" and the value that it gets if it is missing.
struct PropertyDefault {
    const char* key;
    const char* value;
};

/// The keys that newer versions need, followed by a pair of nulls.
extern const PropertyDefault ZorPropertiesUpdate[];

/// Edits the lines of the installed "Zor.properties", including the user's settings, for the
/// version of `request`. Doing it twice has the same result.
void upgradeProperties(PropertyFile& file, const std::string& home, const InstallRegistry& request,
                       const std::string& common);

/// Customizes the property files and, in a shared installation, the scripts of the extracted
/// package. Doing it twice has the same result. Returns 0 or the `errno` of a property file.
[[nodiscard]] int customizeDeployment(const std::string& home, const InstallRegistry& request,
                                      bool useCustomPath);
