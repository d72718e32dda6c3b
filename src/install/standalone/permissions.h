// The permission pass: the modes of an installed tree, set at the end of a successful install.
#pragma once

#include "discovery.h"

/// Sets the mode of everything in the installation and its registry that has a fixed one; what does
/// not exist is passed over, a failure is logged only. Then an upgrade starts with an empty scanner
/// cache: its directory is removed through `transaction`.
void applyPermissions(FileTransaction& transaction, const Discovery& found);
