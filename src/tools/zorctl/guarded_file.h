// Reading files that other users may have put where ours are expected.
//
// A FIFO or device at such a place must not make us wait, and a file without an end must not fill
// the memory: only regular files are read, up to a limit. What was read is parsed by the
// installer's own readers, which take a path: MemoryFile gives them one to the bytes that were
// read, so that nobody can change these in between.
#pragma once

#include "scoped.h"

#include <cstddef>
#include <string>
#include <string_view>

enum class ReadState {
    Read,
    Missing,
    Unreadable, ///< no permission, or reading failed
    NotRegular, ///< a directory, FIFO, socket or device
    TooLarge,
};

/// The bytes of a file, or why there are none.
struct GuardedText {
    ReadState state = ReadState::Missing;
    std::string text;
};

/// Reads the regular file at `path`, links followed, if it holds at most `limit` bytes. Never
/// waits.
[[nodiscard]] GuardedText readGuarded(const std::string& path, std::size_t limit);

/// "read", "missing", "unreadable", "not-regular" or "too-large".
[[nodiscard]] const char* readStateName(ReadState state);

/// A private copy of some bytes, in memory, that has a path.
class MemoryFile {
public:
    explicit MemoryFile(std::string_view bytes);

    /// A path by which this process can open the copy; one that leads nowhere if it could not be
    /// made (without /proc, or without memory).
    [[nodiscard]] const std::string& path() const { return path_; }

private:
    ScopedFd file_;
    std::string path_;
};
