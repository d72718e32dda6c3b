#include "sound_entry.h"

#include "file_codes.h"
#include "file_writing.h"
#include "package_window.h"
#include "zip_file.h"

#include <algorithm>
#include <cstddef>
#include <limits>
#include <memory>
#include <new>

#include <libdeflate.h>
#include <sys/sendfile.h>
#include <unistd.h>

namespace {

constexpr std::size_t InputSize = std::size_t{64} * 1024;
constexpr std::size_t PieceSize = std::size_t{128} * 1024;

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
constexpr std::size_t ProbeSize = 256;
constexpr std::size_t ProbeContentSize = std::size_t{16} * 1024;
constexpr std::size_t TinyBlock = 64;
constexpr std::size_t FewBlocks = 4;

/// Whether the first bytes of deflated data are blocks of fewer than TinyBlock bytes each.
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
    stream.avail_in = ProbeSize;
    stream.next_out = content;
    stream.avail_out = ProbeContentSize;

    constexpr int atBlockEnd = 128; // of data_type, see inflate()
    std::size_t blocks = 0;
    std::size_t used = 0;
    while (inflate(&stream, Z_BLOCK) == Z_OK && stream.avail_out != 0) {
        if ((stream.data_type & atBlockEnd) != 0) {
            ++blocks;
            used = ProbeSize - stream.avail_in;
        }
    }
    (void)inflateEnd(&stream);
    return blocks >= FewBlocks && used < blocks * TinyBlock;
}

/// Inflates the raw deflated data of one entry, piece by piece.
class PieceReader {
public:
    /// Reads the data of `entry` from `archive`.
    PieceReader(int archive, const ZipEntry& entry)
        : archive_(archive), at_(dataStart(entry)), packedLeft_(entry.compressedSize)
    {
        status_ = inflateInit2(&inflate_, -15);
    }
    PieceReader(const PieceReader&) = delete;
    PieceReader& operator=(const PieceReader&) = delete;
    ~PieceReader() { (void)inflateEnd(&inflate_); }

    /// Inflates into `piece`, to its end unless the data ends before; returns the count.
    std::size_t next(unsigned char (&piece)[PieceSize])
    {
        inflate_.next_out = piece;
        inflate_.avail_out = PieceSize;
        while (status_ == Z_OK && inflate_.avail_out != 0) {
            if (inflate_.avail_in == 0)
                refill();
            status_ = inflate(&inflate_, Z_NO_FLUSH); // with nothing left to take in: Z_BUF_ERROR
        }
        return PieceSize - inflate_.avail_out;
    }

    [[nodiscard]] bool atEnd() const { return status_ == Z_STREAM_END; }
    [[nodiscard]] bool isSound() const { return status_ == Z_OK || atEnd(); }

private:
    void refill()
    {
        static unsigned char input[InputSize];
        const ssize_t count =
            pread(archive_, input, std::min<std::size_t>(InputSize, packedLeft_), at_);
        if (count <= 0)
            return;
        at_ += count;
        packedLeft_ -= static_cast<std::uint32_t>(count);
        inflate_.next_in = input;
        inflate_.avail_in = static_cast<uInt>(count);
    }

    int archive_;
    off_t at_;
    std::uint32_t packedLeft_; ///< compressed bytes that are not read yet
    int status_;               ///< last answer of zlib
    z_stream inflate_ = {};
};

int copyInPieces(const PackageWindow& package, const ZipEntry& entry, int destination)
{
    static unsigned char piece[PieceSize];
    PieceReader reader(package.fd(), entry);
    std::uint32_t room = entry.uncompressedSize;
    do {
        const std::size_t count = reader.next(piece);
        if (!reader.isSound() || count > room)
            return EntryNotSound;
        room -= static_cast<std::uint32_t>(count);
        const int code = writeAll(destination, piece, count);
        if (code != FileOk)
            return code;
    } while (!reader.atEnd());
    return FileOk;
}

int copyDeflated(PackageWindow& package, const ZipEntry& entry, int destination)
{
    const unsigned char* const content = wholeContent(package, entry);
    return content != nullptr ? writeAll(destination, content, entry.uncompressedSize)
                              : copyInPieces(package, entry, destination);
}

/// Lets the system copy. Where it cannot, or fails, the stream does it or reports the failure.
int copyStored(const PackageWindow& package, const ZipEntry& entry, int destination)
{
    if (entry.uncompressedSize > std::numeric_limits<std::int32_t>::max())
        return EntryNotSound;
    off_t at = dataStart(entry);
    std::size_t left = entry.uncompressedSize;
    while (left != 0) {
        const ssize_t count = sendfile(destination, package.fd(), &at, left);
        if (count < 0)
            return EntryNotSound;
        if (count == 0) // a short archive reads as a shorter entry
            break;
        left -= static_cast<std::size_t>(count);
    }
    return FileOk;
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

int copySoundEntry(PackageWindow& package, const ZipEntry& entry, int destination)
{
    return entry.method == 0 ? copyStored(package, entry, destination)
                             : copyDeflated(package, entry, destination);
}
