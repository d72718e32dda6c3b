// The extraction of a package, worked out on a forecast.
#pragma once

#include <set>
#include <string>

struct Forecast;

/// Extracts the package of the settings into `home`, as freshInstall() (`fresh`) or
/// upgradeInstall() does, and adds the paths of its files to `deployed`. With `keepsBackups`, what
/// is in the way is moved to its backup name first. A failure is in `forecast`.
void simulateExtraction(Forecast& forecast, const std::string& home, bool fresh, bool keepsBackups,
                        std::set<std::string>& deployed);
