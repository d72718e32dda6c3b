#include "sound_entry.h"

#include "file_codes.h"
#include "file_writing.h"
#include "zip_file.h"

#include <algorithm>
#include <cstddef>
#include <limits>

#include <sys/sendfile.h>
#include <unistd.h>

namespace {

constexpr std::size_t InputSize = std::size_t{64} * 1024;
constexpr std::size_t PieceSize = std::size_t{128} * 1024;

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

int copyDeflated(int archive, const ZipEntry& entry, int destination)
{
    static unsigned char piece[PieceSize];
    PieceReader reader(archive, entry);
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

/// The system copies by itself. Where it can't, or fails, the stream does it or tells what failed.
int copyStored(int archive, const ZipEntry& entry, int destination)
{
    if (entry.uncompressedSize > std::numeric_limits<std::int32_t>::max())
        return EntryNotSound;
    off_t at = dataStart(entry);
    std::size_t left = entry.uncompressedSize;
    while (left != 0) {
        const ssize_t count = sendfile(destination, archive, &at, left);
        if (count < 0)
            return EntryNotSound;
        if (count == 0) // a short archive reads as a shorter entry
            break;
        left -= static_cast<std::size_t>(count);
    }
    return FileOk;
}

} // namespace

int copySoundEntry(int archive, const ZipEntry& entry, int destination)
{
    return entry.method == 0 ? copyStored(archive, entry, destination)
                             : copyDeflated(archive, entry, destination);
}
