// What a stream over a deflated entry must do, in its simplest form: the reference for faster ones.
//
// It works in small steps, on bytes in memory, and is meant to be read rather than to be fast:
// compressed data is read ahead 4096 bytes at a time, and each piece goes through inflate into the
// caller's block until that is full. What a damaged, truncated or mis-sized entry delivers follows
// from these steps.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

#include <zlib.h>

class ReferenceInflateStream {
public:
    /// Reads the entry whose data begins at `bytes`, which ends where the archive ends.
    ReferenceInflateStream(std::string_view bytes, std::uint32_t compressedSize,
                           std::uint32_t uncompressedSize);
    ReferenceInflateStream(const ReferenceInflateStream&) = delete;
    ReferenceInflateStream& operator=(const ReferenceInflateStream&) = delete;
    ~ReferenceInflateStream();

    /// As InputStream::read(buf, len), but where the program would be ended nothing is returned and
    /// aborted() is true from then on.
    int read(char* buf, int len);

    /// As InputStream::read().
    int read();

    [[nodiscard]] int available() const;

    /// True when the last call would have ended the program; no further call makes sense then.
    [[nodiscard]] bool aborted() const { return aborted_; }

private:
    bool readAhead();

    std::string_view rest_;          ///< of the archive, from the next byte to read
    std::uint32_t compressedLeft_;   ///< of the entry's recorded compressed size
    std::uint32_t uncompressedLeft_; ///< of the entry's recorded size
    std::string input_;              ///< the piece that was read ahead
    z_stream zlib_ = {};
    int status_ = Z_OK;
    bool aborted_ = false;
};
