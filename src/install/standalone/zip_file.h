// The package reader: the directory of a zip archive, and streams over its entries.
//
// It supports only what extraction needs: no CRC is checked, no data descriptor is read; archive
// comments, Zip64 records and multi-disk sets are not supported. Offsets are signed 32-bit
// quantities: a seek to 2^31 or beyond counts as failed on every build.
#pragma once

#include "scoped.h"

#include <cstdint>
#include <memory>
#include <string>
#include <vector>

#include <zlib.h>

/// One entry of an archive, as its headers describe it.
struct ZipEntry {
    std::string name; ///< from the local header, cut at its first NUL
    std::uint32_t uncompressedSize = 0;
    std::uint32_t compressedSize = 0;
    std::uint32_t crc32 = 0;      ///< kept, never checked
    std::uint32_t dataOffset = 0; ///< of the first data byte, from the start of the archive
    std::uint32_t method = 0;     ///< 0 stored and 8 deflated can be opened; others are listed only
};

/// Results of ZipFile::readDirectory(). All but ZipOk mean that there are no entries.
enum ZipCode : int {
    ZipOk = 0,
    ZipCannotOpen = 1,       ///< no path, or not readable
    ZipEndOfFile = 2,        ///< scan: the file ends before a central header
    ZipUnknownRecord = 3,    ///< scan: neither a local nor a central header
    ZipNameTooLong = 4,      ///< scan: a name of more than 2048 bytes
    ZipNameCutShort = 5,     ///< scan: the file ends inside a name
    ZipCannotSkipExtra = 6,  ///< scan: no seek past an extra field
    ZipCannotSkipData = 7,   ///< scan: no seek past an entry's data
    ZipUnknownEntrySize = 8, ///< scan: the sizes follow the data
};

/// A reader of one entry's uncompressed bytes.
///
/// No stream reports an error: damaged or missing data reads as a shorter entry.
class InputStream {
public:
    InputStream() = default;
    InputStream(const InputStream&) = delete;
    InputStream& operator=(const InputStream&) = delete;
    virtual ~InputStream() = default;

    /// The next byte, or -1 at the end.
    virtual int read() = 0;

    /// Up to `len` bytes into `buf`; returns their count, 0 at the end. A count below 0 is an error
    /// to callers, but neither stream of an archive returns one.
    virtual int read(char* buf, int len) = 0;

    /// The uncompressed bytes that are not delivered yet.
    virtual int available() = 0;

    /// Does nothing in either stream; part of the interface, without a caller.
    virtual void close() {}
};

/// Reads an entry that is stored uncompressed.
class X__StoredInputStream : public InputStream { // NOLINT(readability-identifier-naming)
public:
    /// Takes over `file`, whose offset is the entry's first byte; `size` is the entry's size.
    X__StoredInputStream(ScopedFd file, std::uint32_t size);

    /// Deliberate: does not check how much of the entry remains, so past its end this returns the
    /// bytes that follow in the archive, and available() becomes negative.
    int read() override;
    int read(char* buf, int len) override;
    int available() override;

private:
    ScopedFd file_;
    std::int32_t remaining_;
};

/// Reads an entry that is compressed by the deflate method.
class X__DeflatedInputStream : public InputStream { // NOLINT(readability-identifier-naming)
public:
    /// Takes over `file`, whose offset is the entry's first byte.
    X__DeflatedInputStream(ScopedFd file, std::uint32_t compressedSize,
                           std::uint32_t uncompressedSize);
    ~X__DeflatedInputStream() override;

    /// Deliberate: the byte as a signed char, so 0x80 to 0xFF are negative and 0xFF looks like the
    /// end. The stored stream returns 0 to 255.
    int read() override;

    /// Aborts the program if the entry inflates to more than its recorded size. If the compressed
    /// data ends before its end mark, what this call has inflated is dropped and 0 is returned.
    int read(char* buf, int len) override;
    int available() override;

private:
    bool refill();
    int markExhausted();

    ScopedFd file_;
    std::uint32_t compressedRemaining_; ///< compressed bytes not read from the file yet
    std::uint32_t available_;
    int status_ = 0; ///< last result of inflate; Z_STREAM_ERROR marks exhausted input
    z_stream inflate_ = {};
    unsigned char input_[4096] = {};
};

/// Where the data of `entry` begins in its archive. A seek to 2^31 or beyond fails, and the failure
/// is ignored: such an entry begins at the archive's first byte.
[[nodiscard]] std::int64_t dataStart(const ZipEntry& entry);

/// True if there is a stream for `entry`: it is not null, neither of its sizes is 0, and its method
/// is stored or deflated.
[[nodiscard]] bool hasStream(const ZipEntry* entry);

/// A stream over `entry` of the open archive `file`, for which hasStream() is true.
[[nodiscard]] std::unique_ptr<InputStream> streamOver(ScopedFd file, const ZipEntry& entry);

/// An archive and the list of its entries. It holds no handle: each stream opens the archive by
/// itself.
class ZipFile {
public:
    /// Reads the directory of the archive at `path`. Without a readable one there are no entries.
    explicit ZipFile(const char* path);
    ZipFile(const ZipFile&) = delete;
    ZipFile& operator=(const ZipFile&) = delete;
    virtual ~ZipFile() = default;

    /// The entries in the order of the directory; duplicates are kept.
    [[nodiscard]] const std::vector<ZipEntry>& entries() const { return entries_; }

    /// The first entry whose name is exactly `name`, or null. No flow calls it.
    [[nodiscard]] const ZipEntry* findEntry(const std::string& name) const;

    /// A stream over `entry`, which the caller owns and deletes. Null if `entry` is null, one of
    /// its sizes is 0, its method is neither stored nor deflated, or the archive cannot be opened.
    [[nodiscard]] InputStream* getInputStream(const ZipEntry* entry) const;

    /// The archive's path as given to the constructor.
    [[nodiscard]] const std::string& path() const { return path_; }

    /// Opens the archive for reading. Not open, with `errno`, if that fails.
    [[nodiscard]] ScopedFd openArchive() const;

    /// Fills `entries` from the archive at `path` (null is allowed): from its central directory,
    /// or, if that cannot be used, from its local headers. Returns a ZipCode (0 to 8); `entries`
    /// is empty for every code but 0.
    [[nodiscard]] static int readDirectory(const char* path, std::vector<ZipEntry>& entries);

    /// The code of readDirectory() for the archive at `path`. No flow calls it.
    [[nodiscard]] static int validate(const char* path);

private:
    std::string path_;
    std::vector<ZipEntry> entries_;
};
