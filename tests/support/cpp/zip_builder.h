// Zip archives made byte by byte, sound or wrong in any field.
//
// An archive is its items (local header, data, central header, in the order of the file) and an end
// record. Fields that are left unset get the value that makes the archive sound: offsets, counts,
// lengths of names. Every other field is written unchanged, so a test says in one assignment
// what is wrong with its archive:
//
//     ZipArchive archive = {{storedItem("a", "text")}};
//     archive.items[0].local.method = 8;
//     writeFile(path, zipBytes(archive));
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

struct LocalHeader {
    std::string signature = "PK\x03\x04";
    std::uint32_t flags = 0;
    std::uint32_t method = 0;
    std::uint32_t crc = 0;
    std::uint32_t compressedSize = 0;
    std::uint32_t uncompressedSize = 0;
    std::optional<std::uint32_t> nameLength; ///< unset: that of `name`
    std::string name;
    std::string extra;
};

struct CentralHeader {
    std::string signature = "PK\x01\x02";
    std::uint32_t flags = 0;
    std::uint32_t method = 0;
    std::uint32_t crc = 0;
    std::uint32_t compressedSize = 0;
    std::uint32_t uncompressedSize = 0;
    std::optional<std::uint32_t> nameLength; ///< unset: that of `name`
    std::string name;
    std::string extra;
    std::string comment;
    std::optional<std::uint32_t> localOffset; ///< unset: the item's place
};

struct ZipItem {
    LocalHeader local;
    CentralHeader central;
    std::string data; ///< as it is in the archive
};

struct EndRecord {
    std::string signature = "PK\x05\x06";
    std::uint32_t thisDisk = 0;
    std::uint32_t directoryDisk = 0;
    std::optional<std::uint32_t> entriesOnDisk;   ///< unset: as many as listed
    std::optional<std::uint32_t> totalEntries;    ///< unset: as many as listed
    std::optional<std::uint32_t> directoryOffset; ///< unset: the directory's place
    std::string comment;
};

struct ZipArchive {
    std::vector<ZipItem> items;
    std::optional<std::vector<std::size_t>> listed = {}; ///< the directory; unset: items in order
    EndRecord end = {};
};

/// An item with correct headers: `content`, stored.
ZipItem storedItem(const std::string& name, const std::string& content);

/// An item with correct headers: `content`, deflated at `level` (0 to 9).
ZipItem deflatedItem(const std::string& name, const std::string& content, int level = 6);

/// The whole archive.
std::string zipBytes(const ZipArchive& archive);

/// The archive up to where its directory would begin.
std::string localBytes(const ZipArchive& archive);

/// One header with its name and extra field, without data; the unset offset of a central header is
/// written as 0.
std::string headerBytes(const LocalHeader& header);
std::string headerBytes(const CentralHeader& header);

/// An end record and its comment; what is unset is written as 0.
std::string recordBytes(const EndRecord& record);

/// `content` as raw deflate data.
std::string rawDeflate(const std::string& content, int level = 6);

/// What zlib makes of the raw deflate data `compressed` in one call: all `size` bytes of it. Fails
/// the test when the data ends before or after.
std::string rawInflate(const std::string& compressed, std::size_t size);

/// Makes the file at `path` hold `pieces` (offset and bytes) and nothing between them; the file
/// system keeps no blocks for the holes.
void writeSparseFile(const std::string& path,
                     const std::vector<std::pair<std::uint64_t, std::string>>& pieces);
