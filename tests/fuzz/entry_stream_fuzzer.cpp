// An entry, made of the input's head, is read from the archive that the rest of the input is, and
// compared with what zlib makes of the same bytes at once. Extracted, it must be what its stream
// delivers, although the extraction takes a fast path where it can.
//
// Head: 1 byte (bit 0: deflated; bits 1 to 3: how it is read; bit 4: the CRC-32 is right), 1 byte
// offset of the data, 4 bytes compressed size, 4 bytes uncompressed size, little-endian.
#include "assertion_trap.h"
#include "entry_extraction.h"
#include "fuzz_support.h"
#include "zip_file.h"

#include <algorithm>
#include <memory>

#include <zlib.h>

namespace {

constexpr std::size_t HeadSize = 10;
constexpr std::uint32_t Deflated = 8;
constexpr int ExtractBlockSize = 8192;

/// What inflates to more is left out: read byte by byte it would take the time of many inputs.
constexpr std::size_t MaxContent = 1024 * KiB;

/// Block sizes that the entry is read in; 0 reads byte by byte through read().
constexpr int BlockSizes[] = {8192, 0, 1, 7, 4096, 8191, 8193, 16384};

std::uint32_t read32(const std::uint8_t* at)
{
    return static_cast<std::uint32_t>(at[0]) | static_cast<std::uint32_t>(at[1]) << 8 |
           static_cast<std::uint32_t>(at[2]) << 16 | static_cast<std::uint32_t>(at[3]) << 24;
}

/// What a stream must deliver.
struct Expected {
    std::string bytes;
    bool whole = true; ///< false: the data is damaged or short, and `bytes` is what precedes that
};

Expected inflateAtOnce(const std::string& compressed)
{
    Expected expected;
    z_stream state = {};
    require(inflateInit2(&state, -15) == Z_OK, "zlib starts");
    state.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(compressed.data()));
    state.avail_in = static_cast<uInt>(compressed.size());

    int status = Z_OK;
    while (status == Z_OK) {
        static char block[1 << 16];
        state.next_out = reinterpret_cast<Bytef*>(block);
        state.avail_out = sizeof block;
        status = inflate(&state, Z_NO_FLUSH);
        expected.bytes.append(block, sizeof block - state.avail_out);
    }
    (void)inflateEnd(&state);
    expected.whole = status == Z_STREAM_END;
    return expected;
}

/// Reads `stream` to its end; returns false when the assertion struck.
bool readInBlocks(InputStream& stream, int blockSize, std::string& bytes)
{
    static char block[16384];
    for (;;) {
        const int count = readBlock(stream, block, blockSize);
        if (count == AssertionStruck)
            return false;
        require(count >= 0 && count <= blockSize, "a count is between 0 and the block's size");
        if (count == 0) {
            require(readBlock(stream, block, blockSize) == 0, "an ended stream stays ended");
            return true;
        }
        bytes.append(block, static_cast<std::size_t>(count));
    }
}

void checkStored(InputStream& stream, int blockSize, std::uint32_t size, const std::string& rest)
{
    std::string bytes;
    if (blockSize == 0) {
        for (int byte = readByte(stream); byte >= 0; byte = readByte(stream))
            bytes += static_cast<char>(byte);
        require(bytes == rest, "bytes of a stored entry go on to the end of the archive");
        return;
    }
    require(readInBlocks(stream, blockSize, bytes), "a stored entry never ends the program");
    const std::size_t wanted = size < 0x80000000U ? size : 0;
    require(bytes == rest.substr(0, wanted), "a stored entry is delivered as it is");
}

void checkDeflatedBytes(InputStream& stream, std::uint32_t size, const Expected& expected)
{
    std::size_t count = 0;
    for (;; ++count) {
        const int byte = readByte(stream);
        if (byte == AssertionStruck) {
            require(count == size && expected.bytes.size() > size,
                    "the program ends only at the first byte past the recorded size");
            return;
        }
        if (count == expected.bytes.size()) {
            require(byte == -1, "a deflated entry has no byte more than zlib makes of it");
            return;
        }
        const auto right = static_cast<signed char>(expected.bytes[count]);
        if (byte == -1 && right != -1)
            break;
        require(byte == right, "a deflated entry's byte is zlib's, as a signed char");
    }
    // zlib may report damage in the call that delivers the byte before it.
    require(!expected.whole && count + 1 >= expected.bytes.size(),
            "only damaged data ends a deflated entry early");
}

void checkDeflatedBlocks(InputStream& stream, int blockSize, std::uint32_t size,
                         const Expected& expected)
{
    std::string bytes;
    const bool ended = readInBlocks(stream, blockSize, bytes);
    require(expected.bytes.starts_with(bytes), "a deflated entry's bytes are zlib's");

    const std::size_t total = expected.bytes.size();
    const auto block = static_cast<std::size_t>(blockSize);
    const std::size_t wholeBlocks = total - total % block;
    if (!ended) {
        require((expected.whole ? total : wholeBlocks) > size,
                "the program ends only for more bytes than recorded");
        return;
    }
    require(bytes.size() <= size, "more bytes than recorded end the program");
    require(stream.available() ==
                static_cast<std::int32_t>(expected.whole ? size - bytes.size() : 0),
            "what is available falls by what was delivered, and to 0 by damage");
    if (expected.whole) {
        require(bytes.size() == total, "an intact entry is delivered to its last byte");
    } else {
        // The block with the damage or the end is dropped. zlib may report damage
        // in the call that has just filled the block before.
        require(bytes.size() == wholeBlocks || bytes.size() + block == wholeBlocks,
                "damage costs the block that it is in");
    }
}

void checkExtraction(const ZipFile& archive, const ZipEntry& entry)
{
    static const MemoryFile extracted;
    const std::unique_ptr<InputStream> stream(archive.getInputStream(&entry));
    std::string bytes;
    if (!readInBlocks(*stream, ExtractBlockSize, bytes))
        return; // the extraction would end the program

    FileTransaction transaction;
    transaction.backup = false;
    require(extractFile(transaction, archive, &entry, extracted.path(), 0) == FileOk,
            "an entry that has a stream is extracted");
    require(extracted.content() == bytes, "what is extracted is what the stream delivers");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    if (size < HeadSize)
        return 0;
    ZipEntry entry;
    entry.method = (data[0] & 1) != 0 ? Deflated : 0;
    entry.dataOffset = data[1];
    entry.compressedSize = read32(data + 2);
    entry.uncompressedSize = read32(data + 6);
    const int blockSize = BlockSizes[data[0] >> 1 & 7];

    static const MemoryFile file;
    file.write(data + HeadSize, size - HeadSize);
    std::string rest(reinterpret_cast<const char*>(data + HeadSize), size - HeadSize);
    rest.erase(0, entry.dataOffset);

    const ZipFile archive(file.path().c_str());
    const std::unique_ptr<InputStream> stream(archive.getInputStream(&entry));
    const bool isEmpty = entry.compressedSize == 0 || entry.uncompressedSize == 0;
    require((stream == nullptr) == isEmpty, "only an empty entry has no stream");
    if (stream == nullptr)
        return 0;
    if (entry.method != Deflated) {
        checkStored(*stream, blockSize, entry.uncompressedSize, rest);
        checkExtraction(archive, entry);
        return 0;
    }
    const Expected expected = inflateAtOnce(rest.substr(0, entry.compressedSize));
    if (expected.bytes.size() > MaxContent)
        return 0;
    if ((data[0] & 0x10) != 0)
        entry.crc32 = static_cast<std::uint32_t>(crc32_z(
            0, reinterpret_cast<const Bytef*>(expected.bytes.data()), expected.bytes.size()));
    // Up to three inflate at a time, each with a window and a state of 40 KiB. The fast path has a
    // buffer for the content and a window on the data, of 256 KiB or the size of the data.
    const std::size_t whole = 1033 * std::min<std::size_t>(entry.compressedSize, rest.size());
    const ResourceBound bound(416 * KiB + 6 * expected.bytes.size() + whole, 2000);
    if (blockSize == 0)
        checkDeflatedBytes(*stream, entry.uncompressedSize, expected);
    else
        checkDeflatedBlocks(*stream, blockSize, entry.uncompressedSize, expected);
    checkExtraction(archive, entry);
    return 0;
}
