#include "entry_content.h"

#include "scoped.h"
#include "zip_file.h"

#include <algorithm>
#include <vector>

#include <unistd.h>

namespace {

constexpr std::size_t BlockSize = std::size_t{128} << 10;
constexpr int RawDeflate = -15; // no header of zlib or gzip

using Consumer = std::function<bool(const char*, std::size_t)>;

/// Reads the raw bytes of an entry one block after the other.
class RawReader {
public:
    RawReader(int archive, const ZipEntry& entry)
        : archive_(archive), at_(dataStart(entry)), left_(entry.compressedSize)
    {
    }

    /// The next block; empty at the end, or when the archive ends too early.
    std::size_t next()
    {
        const std::size_t wanted = std::min<std::size_t>(block_.size(), left_);
        const ssize_t count =
            wanted == 0 ? 0 : pread(archive_, block_.data(), wanted, static_cast<off_t>(at_));
        if (count <= 0)
            return 0;
        at_ += count;
        left_ -= static_cast<std::uint32_t>(count);
        return static_cast<std::size_t>(count);
    }

    [[nodiscard]] char* data() { return block_.data(); }

private:
    int archive_;
    std::int64_t at_;
    std::uint32_t left_;
    // One for all: to allocate and clear a block for each of many small entries costs more than to
    // read them. The tools have one thread.
    inline static std::vector<char> block_ = std::vector<char>(BlockSize);
};

EntryState readStored(RawReader& reader, const ZipEntry& entry, const Consumer& consume)
{
    if (entry.compressedSize != entry.uncompressedSize)
        return EntryState::Damaged;
    std::uint32_t left = entry.uncompressedSize;
    while (const std::size_t count = reader.next()) {
        left -= static_cast<std::uint32_t>(count);
        if (!consume(reader.data(), count))
            return EntryState::Stopped;
    }
    return left == 0 ? EntryState::Whole : EntryState::Damaged;
}

/// The inflater of all entries, made ready for the next one; null without memory.
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
            const std::size_t count = reader.next();
            if (count == 0)
                return EntryState::Damaged;
            stream.next_in = reinterpret_cast<Bytef*>(reader.data());
            stream.avail_in = static_cast<uInt>(count);
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

EntryState readEntry(const ZipFile& archive, const ZipEntry& entry, const Consumer& consume)
{
    if (!hasStream(&entry)) // no data, or a method that the installer does not know either
        return EntryState::Damaged;
    const ScopedFd file = archive.openArchive();
    if (!file.isOpen())
        return EntryState::Damaged;
    RawReader reader(file.get(), entry);
    return entry.method == 0 ? readStored(reader, entry, consume)
                             : readDeflated(reader, entry, consume);
}

bool readSmallEntry(const ZipFile& archive, const ZipEntry& entry, std::size_t limit,
                    std::string& text)
{
    text.clear();
    const EntryState state = readEntry(archive, entry, [&](const char* data, std::size_t size) {
        if (text.size() + size > limit)
            return false;
        text.append(data, size);
        return true;
    });
    return state == EntryState::Whole;
}
