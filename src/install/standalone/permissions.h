// The permission pass: the modes of an installed tree, set at the end of a successful install.
#pragma once

#include "discovery.h"

#include <string>
#include <vector>

#include <sys/types.h>

/// A path and the mode that it gets if it exists.
struct Permission {
    std::string path;
    mode_t mode;
};

/// What the permission pass sets for this run's install type, in its order.
[[nodiscard]] std::vector<Permission> permissionTable(const Discovery& found);

/// Sets the mode of everything in the installation and its registry that has a fixed one. What does
/// not exist is skipped; a failure is only logged.
void applyPermissions(const Discovery& found);
