#include "zip_builder.h"

#include <gtest/gtest.h>

#include <fstream>
#include <numeric>

#include <zlib.h>

namespace {

std::string number16(std::uint32_t value)
{
    return {static_cast<char>(value & 0xFFU), static_cast<char>(value >> 8 & 0xFFU)};
}

std::string number32(std::uint32_t value)
{
    return number16(value & 0xFFFFU) + number16(value >> 16);
}

std::uint32_t sizeOf(const std::string& text)
{
    return static_cast<std::uint32_t>(text.size());
}

/// The fields from the flags to the extra field's length, which both headers share.
template <typename Header>
std::string sharedFields(const Header& header)
{
    return number16(header.flags) + number16(header.method) +
           number32(0) + // time and date of the file
           number32(header.crc) + number32(header.compressedSize) +
           number32(header.uncompressedSize) +
           number16(header.nameLength.value_or(sizeOf(header.name))) +
           number16(sizeOf(header.extra));
}

template <typename Header>
void describe(Header& header, const std::string& name, std::uint32_t method,
              const std::string& content, const std::string& data)
{
    header.name = name;
    header.method = method;
    header.crc = static_cast<std::uint32_t>(
        crc32(0, reinterpret_cast<const Bytef*>(content.data()), sizeOf(content)));
    header.compressedSize = sizeOf(data);
    header.uncompressedSize = sizeOf(content);
}

ZipItem item(const std::string& name, std::uint32_t method, const std::string& content,
             const std::string& data)
{
    ZipItem result;
    result.data = data;
    describe(result.local, name, method, content, data);
    describe(result.central, name, method, content, data);
    return result;
}

std::string centralBytes(CentralHeader header, std::uint32_t itemOffset)
{
    header.localOffset = header.localOffset.value_or(itemOffset);
    return headerBytes(header);
}

} // namespace

ZipItem storedItem(const std::string& name, const std::string& content)
{
    return item(name, 0, content, content);
}

ZipItem deflatedItem(const std::string& name, const std::string& content, int level)
{
    return item(name, 8, content, rawDeflate(content, level));
}

std::string zipBytes(const ZipArchive& archive)
{
    std::vector<std::uint32_t> offsets;
    std::uint32_t offset = 0;
    for (const ZipItem& each : archive.items) {
        offsets.push_back(offset);
        offset += sizeOf(headerBytes(each.local)) + sizeOf(each.data);
    }

    std::vector<std::size_t> all(archive.items.size());
    std::iota(all.begin(), all.end(), 0);
    const std::vector<std::size_t> listed = archive.listed.value_or(all);

    std::string bytes = localBytes(archive);
    EndRecord end = archive.end;
    end.directoryOffset = end.directoryOffset.value_or(sizeOf(bytes));
    end.entriesOnDisk = end.entriesOnDisk.value_or(static_cast<std::uint32_t>(listed.size()));
    end.totalEntries = end.totalEntries.value_or(static_cast<std::uint32_t>(listed.size()));
    for (const std::size_t i : listed)
        bytes += centralBytes(archive.items[i].central, offsets[i]);
    return bytes + recordBytes(end);
}

std::string localBytes(const ZipArchive& archive)
{
    std::string bytes;
    for (const ZipItem& each : archive.items) {
        bytes += headerBytes(each.local);
        bytes += each.data;
    }
    return bytes;
}

std::string headerBytes(const LocalHeader& header)
{
    return header.signature + number16(20) + sharedFields(header) + header.name + header.extra;
}

std::string headerBytes(const CentralHeader& header)
{
    return header.signature + number16(20) + number16(20) + sharedFields(header) +
           number16(sizeOf(header.comment)) + number16(0) + // disk
           number16(0) +                                    // internal attributes
           number32(0) +                                    // external attributes
           number32(header.localOffset.value_or(0)) + header.name + header.extra + header.comment;
}

std::string recordBytes(const EndRecord& record)
{
    return record.signature + number16(record.thisDisk) + number16(record.directoryDisk) +
           number16(record.entriesOnDisk.value_or(0)) + number16(record.totalEntries.value_or(0)) +
           number32(0) + // size of the directory
           number32(record.directoryOffset.value_or(0)) + number16(sizeOf(record.comment)) +
           record.comment;
}

std::string rawDeflate(const std::string& content, int level)
{
    z_stream stream = {};
    EXPECT_EQ(Z_OK, deflateInit2(&stream, level, Z_DEFLATED, -15, 8, Z_DEFAULT_STRATEGY));
    std::string data(deflateBound(&stream, static_cast<uLong>(content.size())), '\0');
    stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(content.data()));
    stream.avail_in = sizeOf(content);
    stream.next_out = reinterpret_cast<Bytef*>(data.data());
    stream.avail_out = sizeOf(data);
    EXPECT_EQ(Z_STREAM_END, deflate(&stream, Z_FINISH));
    data.resize(data.size() - stream.avail_out);
    (void)deflateEnd(&stream);
    return data;
}

std::string rawInflate(const std::string& compressed, std::size_t size)
{
    z_stream stream = {};
    EXPECT_EQ(Z_OK, inflateInit2(&stream, -15));
    std::string content(size + 1, '\0'); // one more: room to show that nothing follows
    stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(compressed.data()));
    stream.avail_in = sizeOf(compressed);
    stream.next_out = reinterpret_cast<Bytef*>(content.data());
    stream.avail_out = sizeOf(content);
    EXPECT_EQ(Z_STREAM_END, inflate(&stream, Z_FINISH));
    EXPECT_EQ(1U, stream.avail_out);
    (void)inflateEnd(&stream);
    content.pop_back();
    return content;
}

void writeSparseFile(const std::string& path,
                     const std::vector<std::pair<std::uint64_t, std::string>>& pieces)
{
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    for (const auto& [offset, bytes] : pieces) {
        file.seekp(static_cast<std::streamoff>(offset));
        file << bytes;
    }
    file.close();
    ASSERT_TRUE(file) << "cannot write " << path;
}
