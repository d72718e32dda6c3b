#include "reference_inflate_stream.h"

#include <algorithm>

ReferenceInflateStream::ReferenceInflateStream(std::string_view bytes, std::uint32_t compressedSize,
                                               std::uint32_t uncompressedSize)
    : rest_(bytes), compressedLeft_(compressedSize), uncompressedLeft_(uncompressedSize)
{
    (void)inflateInit2(&zlib_, -15);
}

ReferenceInflateStream::~ReferenceInflateStream()
{
    (void)inflateEnd(&zlib_);
}

/// Reads the next piece of compressed data; false when the entry or the archive has ended.
bool ReferenceInflateStream::readAhead()
{
    const std::size_t size =
        std::min({std::size_t{4096}, std::size_t{compressedLeft_}, rest_.size()});
    input_ = rest_.substr(0, size);
    rest_.remove_prefix(size);
    compressedLeft_ -= static_cast<std::uint32_t>(size);
    zlib_.next_in = reinterpret_cast<Bytef*>(input_.data());
    zlib_.avail_in = static_cast<uInt>(size);
    return size > 0;
}

int ReferenceInflateStream::read(char* buf, int len)
{
    if (len > 0) {
        zlib_.next_out = reinterpret_cast<Bytef*>(buf);
        zlib_.avail_out = static_cast<uInt>(len);
    }

    while (len > 0 && status_ == Z_OK && zlib_.avail_out > 0) {
        const bool moreInput = zlib_.avail_in > 0 || readAhead();
        status_ = inflate(&zlib_, Z_NO_FLUSH); // without input it may still hold output
        if (!moreInput && status_ == Z_BUF_ERROR)
            status_ = Z_STREAM_ERROR; // the data is used up
    }

    if (status_ != Z_OK && status_ != Z_STREAM_END) {
        uncompressedLeft_ = 0; // what this call had inflated is dropped
        return 0;
    }

    // In 32-bit arithmetic: without a block to fill, `len` is 0 or below and the room left is that
    // of the call before.
    const std::uint32_t count = static_cast<std::uint32_t>(len) - zlib_.avail_out;
    if (count > uncompressedLeft_) {
        aborted_ = true;
        return 0;
    }
    uncompressedLeft_ -= count;
    return static_cast<int>(count);
}

int ReferenceInflateStream::read()
{
    char byte = 0;
    if (read(&byte, 1) != 1)
        return -1;
    return static_cast<signed char>(byte);
}

int ReferenceInflateStream::available() const
{
    return static_cast<std::int32_t>(uncompressedLeft_);
}
