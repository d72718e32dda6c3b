#include "entry_content.h"

#include "whole_entry.h"
#include "zip_file.h"

#include <algorithm>
#include <vector>

namespace {

constexpr std::size_t BlockSize = std::size_t{128} << 10;
constexpr int RawDeflate = -15; // no header of zlib or gzip

using Consumer = std::function<bool(const char*, std::size_t)>;

/// Reads the raw bytes of an entry one block after the other.
class RawReader {
public:
    RawReader(PackageWindow& window, const ZipEntry& entry)
        : window_(window), at_(dataStart(entry)), left_(entry.compressedSize)
    {
    }

    /// The next block, valid until the next call, and its `size`; null at the end, or when the
    /// archive ends too early.
    const char* next(std::size_t& size)
    {
        size = std::min<std::size_t>(BlockSize, left_);
        const unsigned char* const block = size == 0 ? nullptr : window_.bytes(at_, size);
        at_ += static_cast<std::int64_t>(size);
        left_ -= static_cast<std::uint32_t>(size);
        return reinterpret_cast<const char*>(block);
    }

private:
    PackageWindow& window_;
    std::int64_t at_;
    std::uint32_t left_;
};

EntryState readStored(RawReader& reader, const ZipEntry& entry, const Consumer& consume)
{
    if (entry.compressedSize != entry.uncompressedSize)
        return EntryState::Damaged;
    std::size_t left = entry.uncompressedSize;
    std::size_t size = 0;
    while (const char* const block = reader.next(size)) {
        left -= size;
        if (!consume(block, size))
            return EntryState::Stopped;
    }
    return left == 0 ? EntryState::Whole : EntryState::Damaged;
}

/// The inflater of all entries, made ready for the next one; null without memory. The tools have
/// one thread.
z_stream* readyInflater()
{
    static z_stream stream = {};
    static const int made = inflateInit2(&stream, RawDeflate);
    stream.avail_in = 0;
    return made == Z_OK && inflateReset(&stream) == Z_OK ? &stream : nullptr;
}

EntryState readDeflated(RawReader& reader, const ZipEntry& entry, const Consumer& consume)
{
    z_stream* const inflater = readyInflater();
    if (inflater == nullptr)
        return EntryState::Damaged;
    z_stream& stream = *inflater;
    static std::vector<char> output(BlockSize);
    std::uint32_t left = entry.uncompressedSize;
    for (int result = Z_OK; result != Z_STREAM_END;) {
        if (stream.avail_in == 0) {
            std::size_t size = 0;
            const char* const block = reader.next(size);
            if (block == nullptr)
                return EntryState::Damaged;
            // Only read: zlib's interface lacks a const.
            stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(block));
            stream.avail_in = static_cast<uInt>(size);
        }
        stream.next_out = reinterpret_cast<Bytef*>(output.data());
        stream.avail_out = static_cast<uInt>(output.size());
        result = inflate(&stream, Z_NO_FLUSH);
        if (result != Z_OK && result != Z_STREAM_END && result != Z_BUF_ERROR)
            return EntryState::Damaged;
        const std::size_t made = output.size() - stream.avail_out;
        if (made > left)
            return EntryState::Damaged;
        left -= static_cast<std::uint32_t>(made);
        if (made != 0 && !consume(output.data(), made))
            return EntryState::Stopped;
    }
    return left == 0 ? EntryState::Whole : EntryState::Damaged;
}

} // namespace

EntryReader::EntryReader(const ZipFile& archive) : window_(archive.openArchive()) {}

EntryState EntryReader::read(const ZipEntry& entry, const Consumer& consume)
{
    if (!hasStream(&entry)) // no data, or a method that the installer does not know either
        return EntryState::Damaged;
    if (const unsigned char* const whole = wholeContent(window_, entry)) {
        const bool wanted = consume(reinterpret_cast<const char*>(whole), entry.uncompressedSize);
        return wanted ? EntryState::Whole : EntryState::Stopped;
    }
    RawReader reader(window_, entry);
    return entry.method == 0 ? readStored(reader, entry, consume)
                             : readDeflated(reader, entry, consume);
}

bool EntryReader::readSmall(const ZipEntry& entry, std::size_t limit, std::string& text)
{
    text.clear();
    const EntryState state = read(entry, [&](const char* data, std::size_t size) {
        if (text.size() + size > limit)
            return false;
        text.append(data, size);
        return true;
    });
    return state == EntryState::Whole;
}
