// An SPB as the installer reads it, and why it reads it that way.
//
// The entries are those of the installer's own reader (zip_file.h). What that reader passes over
// in silence (flags, names of the central directory, why that is not used) is read here a second
// time, for explanations.
#pragma once

#include "findings.h"
#include "scoped.h"
#include "zip_file.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

inline constexpr std::uint32_t EncryptedFlag = 1;

/// What the headers of an entry hold that the installer does not look at.
struct HeaderDetails {
    std::uint32_t flags = 0;
    std::uint32_t unixMode = 0;             ///< type and permissions; 0 when not made by Unix
    std::optional<std::string> wholeName;   ///< of the local header, when it holds a NUL
    std::optional<std::string> centralName; ///< when it is another name
};

/// What readEntry() has read.
struct EntryContent {
    std::uint64_t delivered = 0; ///< bytes that the installer would write
    std::uint32_t crc = 0;       ///< of these
    bool opened = false;         ///< false: the installer cannot open the entry
    bool beyondSize = false;     ///< more than the entry's size: the installer aborts here
    bool stopped = false;        ///< the sink wanted no more

    /// True when these are the bytes that were packed.
    [[nodiscard]] bool isSound(const ZipEntry& entry) const
    {
        return !beyondSize && delivered == entry.uncompressedSize && crc == entry.crc32;
    }
};

/// Takes bytes of an entry; false to get no more.
using ContentSink = std::function<bool(const char* data, std::size_t size)>;

/// An SPB that stays open.
class PackageFile {
public:
    /// Opens the package at `path` and reads its directory; `findings` gets what is unusual about
    /// that. Returns null with `error` set to the `errno` when the file cannot be read; EINVAL for
    /// what is no regular file.
    static std::unique_ptr<PackageFile> open(const std::string& path, Findings& findings,
                                             int& error);

    /// In the installer's order. None: the installer finds no package in the file.
    [[nodiscard]] const std::vector<ZipEntry>& entries() const { return archive_->entries(); }
    [[nodiscard]] const HeaderDetails& details(std::size_t number) const
    {
        return details_[number];
    }

    [[nodiscard]] int fd() const { return file_.get(); }

    /// Gives `sink` the bytes of `entry` that the installer would write. An empty entry, which the
    /// installer cannot open, is not opened here either.
    [[nodiscard]] EntryContent readEntry(const ZipEntry& entry, const ContentSink& sink) const;

private:
    PackageFile(ScopedFd file, std::vector<HeaderDetails> details,
                std::unique_ptr<ZipFile> archive);

    ScopedFd file_;
    std::vector<HeaderDetails> details_;
    std::unique_ptr<ZipFile> archive_;
};
