// Reading open files, line by line.
#pragma once

#include <cstdio>
#include <string>

/// Reads one line of `file` into `line`, without its newline. NUL is an ordinary byte.
///
/// A last line without a newline counts. Returns false at the end of the file or if reading fails
/// (see ferror()); a line cut short by a failure is not returned.
[[nodiscard]] bool readLine(std::FILE* file, std::string& line);
