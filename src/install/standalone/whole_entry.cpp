#include "whole_entry.h"

#include "package_window.h"
#include "zip_file.h"

#include <cstddef>
#include <memory>
#include <new>

#include <libdeflate.h>
#include <zlib.h>

namespace {

/// Entries up to this size are inflated whole. Larger ones would gain as much (at 64 MiB a whole
/// entry still takes half the time of one in pieces): this bounds the memory.
constexpr std::uint32_t MaxWholeSize = std::uint32_t{16} * 1024 * 1024;

/// Memory that is used again and again. Its content is lost when it grows.
class Buffer {
public:
    /// At least `size` bytes; null when there is not enough memory.
    unsigned char* ofSize(std::size_t size)
    {
        if (size > size_) {
            bytes_.reset(); // first, so that the old and the new one are never held together
            bytes_.reset(new (std::nothrow) unsigned char[size]);
            size_ = bytes_ ? size : 0;
        }
        return bytes_.get();
    }

private:
    std::unique_ptr<unsigned char[]> bytes_;
    std::size_t size_ = 0;
};

/// A match of 258 bytes takes at least two bits.
constexpr std::uint32_t MostContentOfAByte = 1032;

/// Whether to inflate `entry` whole. Data that is as long as its content is mostly stored blocks,
/// which zlib copies just as fast, or tiny blocks, whose tables zlib builds faster. And no memory
/// is spent on a size that the data cannot have.
bool isWorthInflatingWhole(const ZipEntry& entry)
{
    return entry.uncompressedSize <= MaxWholeSize &&
           entry.compressedSize < entry.uncompressedSize &&
           entry.uncompressedSize / MostContentOfAByte <= entry.compressedSize;
}

/// Entries with less data are not probed: the probe would cost more than it can save.
constexpr std::uint32_t MinProbedSize = std::uint32_t{16} * 1024;
constexpr std::size_t ProbeContentSize = std::size_t{16} * 1024;
constexpr uInt TinyBlock = 64;
constexpr int FewBlocks = 4;

/// Inflates the next block of `stream` and moves past it; false if it does not end within its next
/// TinyBlock bytes.
bool passTinyBlock(z_stream& stream)
{
    constexpr int atBlockEnd = 128; // of data_type, see inflate()
    stream.avail_in = TinyBlock;
    do {
        if (inflate(&stream, Z_BLOCK) != Z_OK)
            return false;
    } while ((stream.data_type & atBlockEnd) == 0 && stream.avail_in != 0);
    return (stream.data_type & atBlockEnd) != 0;
}

/// Whether deflated data begins with blocks of at most TinyBlock bytes each.
///
/// No compressor writes an entry of such blocks. They would take libdeflate a third longer than
/// zlib, because it builds larger tables for each. Data that becomes like that later on is not
/// recognised, and costs that third.
bool beginsWithTinyBlocks(const unsigned char* packed)
{
    static unsigned char content[ProbeContentSize];
    z_stream stream = {};
    if (inflateInit2(&stream, -15) != Z_OK)
        return false;
    stream.next_in = const_cast<unsigned char*>(packed); // only read
    stream.next_out = content;
    stream.avail_out = ProbeContentSize;
    int blocks = 0;
    while (blocks < FewBlocks && passTinyBlock(stream))
        ++blocks;
    (void)inflateEnd(&stream);
    return blocks == FewBlocks;
}

} // namespace

// The stream is the definition of an entry's content, and its zlib refuses some data that
// libdeflate (1.14) accepts:
// - more than 286 codes of literals and lengths or more than 30 of distances, and the length
//   symbols 286 and 287 and the distance symbols 30 and 31 of the fixed code;
// - code lengths whose code is empty or has a single symbol, a use of a distance where the block
//   has no distance code, and the unused half of a code with a single symbol;
// - a repeated code length that goes on past the last one.
// The stream would deliver a shorter entry then. No compressor writes such data, and recognising
// it would take a second decoder. Where the content has the recorded size and CRC-32 all the same,
// it is what was packed, and nobody is served by less: such an entry counts as sound.
const unsigned char* wholeContent(PackageWindow& package, const ZipEntry& entry)
{
    if (entry.method == 0 || !isWorthInflatingWhole(entry))
        return nullptr;
    static const std::unique_ptr<libdeflate_decompressor, void (*)(libdeflate_decompressor*)>
        decompressor(libdeflate_alloc_decompressor(), libdeflate_free_decompressor);
    static Buffer buffer;
    const unsigned char* const packed = package.bytes(dataStart(entry), entry.compressedSize);
    if (!decompressor || packed == nullptr)
        return nullptr;

    if (entry.compressedSize >= MinProbedSize && beginsWithTinyBlocks(packed))
        return nullptr;
    unsigned char* const content = buffer.ofSize(entry.uncompressedSize);
    if (content == nullptr)
        return nullptr;
    std::size_t used = 0; // the deflate stream may end before the entry's data
    std::size_t size = 0;
    if (libdeflate_deflate_decompress_ex(decompressor.get(), packed, entry.compressedSize, content,
                                         entry.uncompressedSize, &used,
                                         &size) != LIBDEFLATE_SUCCESS)
        return nullptr;
    const bool confirmed =
        size == entry.uncompressedSize && libdeflate_crc32(0, content, size) == entry.crc32;
    return confirmed ? content : nullptr;
}
