// Reads a package through a window, so that one system call serves many headers or small entries.
//
// Whoever reads a package mostly goes forward: over the headers of its directory, or from entry to
// entry. The window grows while that holds, and becomes small again at every jump, so that a
// package whose entries are far apart or in any order costs no more than it did without a window.
#pragma once

#include "scoped.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <utility>

class PackageWindow {
public:
    /// Takes over `file`. Its file offset is neither used nor changed.
    explicit PackageWindow(ScopedFd file) : file_(std::move(file)) {}

    [[nodiscard]] int fd() const { return file_.get(); }

    /// The `size` bytes at offset `at`, valid until the next call. Null when the file ends before
    /// or cannot be read, or when there is not enough memory for them.
    [[nodiscard]] const unsigned char* bytes(std::int64_t at, std::size_t size);

    /// Drops what it holds, for a file whose content has changed.
    void forget() { held_ = 0; }

private:
    bool holds(std::int64_t at, std::size_t size) const;
    bool moveTo(std::int64_t at, std::size_t size);
    bool makeRoom(std::size_t size);

    ScopedFd file_;
    std::unique_ptr<unsigned char[]> buffer_;
    std::size_t capacity_ = 0;
    std::int64_t start_ = 0;    ///< offset of the buffer's first byte
    std::size_t held_ = 0;      ///< bytes in the buffer
    std::size_t readAhead_ = 0; ///< what the last move read at least, if the file was long enough
};
