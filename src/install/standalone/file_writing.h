// Writing to open files, to the last byte and the disk.
#pragma once

#include <cstddef>

class ScopedFd;

/// Writes all of `data`. Returns 0, or the code of the failed write (5, 6, 7).
[[nodiscard]] int writeAll(int fd, const void* data, std::size_t size);

/// Writes what is cached of an open file or directory to the disk. Returns 0 or an `errno`. A file
/// system that cannot do that has nothing to report.
[[nodiscard]] int syncFile(int fd);

/// Closes a file that was written: a file system may report only now that the last block failed.
/// Returns 0, or the code of the failed write (5, 6, 7).
[[nodiscard]] int closeWritten(ScopedFd& file);
