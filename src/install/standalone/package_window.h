// Reads a package through a window, so that one system call serves many headers or small entries.
//
// A package is mostly read forward: over the headers of its directory, or from entry to entry. The
// window grows during forward reads and becomes small again at every jump, so a package whose
// entries are far apart or unordered costs no more than without a window.
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

    /// The `size` bytes at offset `at`, valid until the next call. Null if the file ends before
    /// that or cannot be read, or if there is not enough memory.
    [[nodiscard]] const unsigned char* bytes(std::int64_t at, std::size_t size);

    /// Drops the buffered bytes, for a file whose content has changed.
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
    std::size_t readAhead_ = 0; ///< the least that the last move read, if the file was long enough
};
