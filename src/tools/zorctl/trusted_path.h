// Which files root may put in the place of others.
#pragma once

#include <string>

/// True if `path` is a regular file of root or of the running user, without another name, in a
/// directory that, like everything above it, nobody else can write to. Then nobody else can
/// exchange it meanwhile.
[[nodiscard]] bool isTrustedFile(const std::string& path);
