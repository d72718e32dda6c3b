// Writing to open files completely, and syncing them.
#pragma once

#include <cstddef>

class ScopedFd;

/// Writes all of `data`. Returns 0, or the code of the failed write (5, 6, 7).
[[nodiscard]] int writeAll(int fd, const void* data, std::size_t size);

/// Writes what is cached of an open file or directory to the disk. Returns 0 or an `errno`; 0 if
/// the file system does not support this.
[[nodiscard]] int syncFile(int fd);

/// Closes a file that was written: some file systems report only now that the last block failed.
/// Returns 0, or the code of the failed write (5, 6, 7).
[[nodiscard]] int closeWritten(ScopedFd& file);
