// Reads the headers of an archive by the installer's rules, to explain what its reader does.
#pragma once

#include "package_file.h"

#include <vector>

/// Puts the details of the entries of the archive `fd` into `details`, in the installer's order;
/// `findings` gets what is unusual, such as why the central directory is not used. No details:
/// there is no package.
///
/// Returns 0, or EFBIG for a file of more than a million entries, which only one made to fill the
/// memory has.
[[nodiscard]] int readHeaderDetails(int fd, Findings& findings,
                                    std::vector<HeaderDetails>& details);
