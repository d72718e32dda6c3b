// The content of a package's entries, read with bounded memory whatever their headers claim.
#pragma once

#include "package_window.h"

#include <cstddef>
#include <functional>
#include <string>

class ZipFile;
struct ZipEntry;

/// How reading an entry ended.
enum class EntryState {
    Whole,   ///< everything that its header announces was delivered
    Damaged, ///< the data is not what the header announces; nothing can be said about the rest
    Stopped, ///< the consumer had enough
};

/// Reads entries of a package that stays open.
class EntryReader {
public:
    /// `archive` must outlive this.
    explicit EntryReader(const ZipFile& archive);

    /// Delivers the content of `entry` piece by piece to `consume`, which returns false to stop.
    [[nodiscard]] EntryState read(const ZipEntry& entry,
                                  const std::function<bool(const char*, std::size_t)>& consume);

    /// Reads all of `entry` into `text` if that is at most `limit` bytes.
    [[nodiscard]] bool readSmall(const ZipEntry& entry, std::size_t limit, std::string& text);

private:
    PackageWindow window_;
};
