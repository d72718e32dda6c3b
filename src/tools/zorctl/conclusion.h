// What follows from the changes that a forecast holds.
#pragma once

#include <set>
#include <string>

struct Discovery;
struct Forecast;

/// The files that a removal of `found` deletes because the index lists them or the installer always
/// adds them.
[[nodiscard]] std::set<std::string> removableFiles(const Discovery& found);

/// Completes the forecast of a run on `found`: whether there is space enough, what would be lost,
/// and whether anything would change.
void conclude(Forecast& forecast, const Discovery& found);
