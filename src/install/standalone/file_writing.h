// Writing to open files: what a short write means, and what closing may still tell.
#pragma once

#include <cstddef>

class ScopedFd;

/// Writes all of `data`. Returns 0, or the code of the failed write (5, 6, 7).
[[nodiscard]] int writeAll(int fd, const void* data, std::size_t size);

/// Closes a file that was written: a file system may tell only now that the last block failed.
/// Returns 0, or the code of the failed write (5, 6, 7).
[[nodiscard]] int closeWritten(ScopedFd& file);
