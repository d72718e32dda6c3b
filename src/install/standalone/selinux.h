// SELinux labels of the installed toolkit.
#pragma once

#include <string>

/// Labels the toolkit's binaries in `home` for text relocations if SELinux is enabled. Returns the
/// status of the last command; an installation never fails because of it.
int setSelinuxContext(const std::string& home);
