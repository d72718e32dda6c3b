#include "archive_writer.h"

#include "deflate_chunk.h"
#include "file_codes.h"
#include "file_writing.h"
#include "package_layout.h"
#include "progress.h"
#include "scoped.h"
#include "shown_text.h"

#include <algorithm>
#include <cerrno>
#include <condition_variable>
#include <map>
#include <mutex>
#include <numeric>
#include <thread>
#include <utility>

#include <fcntl.h>
#include <sys/stat.h>
#include <zlib.h>

namespace {

constexpr std::uint64_t ChunkSize = std::uint64_t{2} << 20;
constexpr std::uint32_t VersionNeeded = 20;
constexpr std::uint32_t Utf8Names = 0x800;

/// A part of a file.
struct Chunk {
    std::size_t source;
    std::uint64_t offset;
    std::size_t size;
    bool last;
};

/// What became of a chunk.
struct PackedChunk {
    std::vector<unsigned char> bytes;
    std::uint32_t crc = 0;
    int error = 0;
    bool changed = false; ///< the file has not the size that it had when it was found
};

std::vector<Chunk> chunksOf(const std::vector<Source>& sources)
{
    std::vector<Chunk> chunks;
    for (std::size_t i = 0; i < sources.size(); ++i) {
        for (std::uint64_t at = 0; at < sources[i].size; at += ChunkSize) {
            const std::uint64_t size = std::min(ChunkSize, sources[i].size - at);
            chunks.push_back({i, at, static_cast<std::size_t>(size), at + size == sources[i].size});
        }
    }
    return chunks;
}

/// Reads exactly `size` bytes at `offset` of `source`, and nothing may follow the last of them.
void readChunk(const Source& source, const Chunk& chunk, std::vector<unsigned char>& data,
               PackedChunk& result)
{
    const ScopedFd file(open(source.path.c_str(), O_RDONLY | O_CLOEXEC));
    struct stat status = {};
    if (!file.isOpen() || fstat(file.get(), &status) != 0) {
        result.error = errno;
        return;
    }
    result.changed = static_cast<std::uint64_t>(status.st_size) != source.size;
    data.resize(chunk.size);
    for (std::size_t done = 0; done < chunk.size && !result.changed && result.error == 0;) {
        const ssize_t count = pread(file.get(), data.data() + done, chunk.size - done,
                                    static_cast<off_t>(chunk.offset + done));
        result.error = count < 0 ? errno : 0;
        result.changed = count == 0;
        done += count > 0 ? static_cast<std::size_t>(count) : 0;
    }
}

/// Packs chunks with threads of its own; next() gives them in order.
class ChunkPacker {
public:
    ChunkPacker(const std::vector<Source>& sources, bool stored, unsigned threads)
        : sources_(sources), chunks_(chunksOf(sources)), stored_(stored),
          mostAhead_(std::size_t{4} * threads)
    {
        for (unsigned i = 0; i < threads; ++i)
            threads_.emplace_back([this] { work(); });
    }
    ChunkPacker(const ChunkPacker&) = delete;
    ChunkPacker& operator=(const ChunkPacker&) = delete;
    ~ChunkPacker()
    {
        {
            const std::lock_guard lock(mutex_);
            stop_ = true;
        }
        mayStart_.notify_all();
        for (std::thread& thread : threads_)
            thread.join();
    }

    [[nodiscard]] PackedChunk next()
    {
        std::unique_lock lock(mutex_);
        isDone_.wait(lock, [&] { return done_.contains(taken_); });
        PackedChunk chunk = std::move(done_[taken_]);
        done_.erase(taken_++);
        mayStart_.notify_all();
        return chunk;
    }

private:
    void work()
    {
        ChunkDeflater deflater;
        std::vector<unsigned char> data;
        for (;;) {
            std::size_t number = 0;
            {
                std::unique_lock lock(mutex_);
                mayStart_.wait(lock, [&] {
                    return stop_ || begun_ == chunks_.size() || begun_ < taken_ + mostAhead_;
                });
                if (stop_ || begun_ == chunks_.size())
                    return;
                number = begun_++;
            }
            PackedChunk packed = pack(chunks_[number], deflater, data);
            const std::lock_guard lock(mutex_);
            done_[number] = std::move(packed);
            isDone_.notify_one();
        }
    }

    [[nodiscard]] PackedChunk pack(const Chunk& chunk, ChunkDeflater& deflater,
                                   std::vector<unsigned char>& data) const
    {
        PackedChunk result;
        readChunk(sources_[chunk.source], chunk, data, result);
        if (result.error != 0 || result.changed)
            return result;
        result.crc = static_cast<std::uint32_t>(crc32_z(0, data.data(), data.size()));
        if (stored_)
            result.bytes = data;
        else if (!deflater.deflate(data.data(), data.size(), chunk.last, result.bytes))
            result.error = ENOMEM;
        return result;
    }

    const std::vector<Source>& sources_;
    const std::vector<Chunk> chunks_;
    const bool stored_;
    const std::size_t mostAhead_;
    std::mutex mutex_;
    std::condition_variable mayStart_;
    std::condition_variable isDone_;
    std::map<std::size_t, PackedChunk> done_;
    std::size_t begun_ = 0;
    std::size_t taken_ = 0;
    bool stop_ = false;
    std::vector<std::thread> threads_;
};

void append16(std::string& bytes, std::uint32_t value)
{
    bytes += static_cast<char>(value & 0xff);
    bytes += static_cast<char>(value >> 8 & 0xff);
}

void append32(std::string& bytes, std::uint32_t value)
{
    append16(bytes, value);
    append16(bytes, value >> 16);
}

bool isAscii(std::string_view text)
{
    return std::all_of(text.begin(), text.end(),
                       [](char c) { return static_cast<unsigned char>(c) < 0x80; });
}

/// What an entry's headers say.
struct EntryFields {
    std::string name;
    std::uint32_t method = Stored;
    std::uint32_t crc = 0;
    std::uint32_t packed = 0;
    std::uint32_t size = 0;
    std::uint32_t mode = 0; ///< with the file's type
    std::uint32_t offset = 0;
};

class ArchiveWriter {
public:
    ArchiveWriter(int fd, const std::vector<Source>& sources, const ArchiveOptions& options,
                  ArchiveFailure& failure)
        : fd_(fd), sources_(sources), options_(options), failure_(failure),
          progress_("packing", sources.size(),
                    std::accumulate(
                        sources.begin(), sources.end(), std::uint64_t{0},
                        [](std::uint64_t sum, const Source& source) { return sum + source.size; })),
          chunks_(sources, options.stored, options.threads)
    {
    }

    bool write()
    {
        for (const Source& source : sources_) {
            const std::uint32_t mode = extractionMode(source.relative);
            EntryFields fields;
            fields.name = imageRoot() + source.relative;
            fields.mode = mode | (source.isDir() ? S_IFDIR : S_IFREG);
            fields.offset = static_cast<std::uint32_t>(at_);
            fields.size = static_cast<std::uint32_t>(source.size);
            const bool written =
                source.isDir() ? put(localHeader(fields)) : addFile(source, fields);
            if (!written)
                return false;
            central_ += centralHeader(fields);
        }
        return finish();
    }

private:
    bool fail(int error, std::string path, std::string reason)
    {
        failure_ = {error, std::move(path), std::move(reason)};
        return false;
    }

    bool put(std::string_view bytes)
    {
        errno = 0;
        if (writeAll(fd_, bytes.data(), bytes.size()) != FileOk)
            return fail(errno == 0 ? EIO : errno, "", "");
        at_ += bytes.size();
        return at_ < SizeLimit || fail(0, "", PackageTooLarge);
    }

    [[nodiscard]] std::string fixedPart(const EntryFields& fields) const
    {
        std::string bytes;
        append16(bytes, VersionNeeded);
        append16(bytes, !isAscii(fields.name) && isUtf8(fields.name) ? Utf8Names : 0);
        append16(bytes, fields.method);
        append16(bytes, options_.time);
        append16(bytes, options_.date);
        append32(bytes, fields.crc);
        append32(bytes, fields.packed);
        append32(bytes, fields.size);
        append16(bytes, static_cast<std::uint32_t>(fields.name.size()));
        append16(bytes, 0);
        return bytes;
    }

    [[nodiscard]] std::string localHeader(const EntryFields& fields) const
    {
        return "PK\3\4" + fixedPart(fields) + fields.name;
    }

    [[nodiscard]] std::string centralHeader(const EntryFields& fields) const
    {
        std::string bytes = "PK\1\2";
        append16(bytes, MadeByUnix << 8 | VersionNeeded);
        bytes += fixedPart(fields);
        append16(bytes, 0); // comment
        append16(bytes, 0); // disk
        append16(bytes, 0); // internal attributes
        append32(bytes, fields.mode << 16);
        append32(bytes, fields.offset);
        return bytes + fields.name;
    }

    /// Writes the chunks of `source`, then the header, which is known only then.
    bool addFile(const Source& source, EntryFields& fields)
    {
        if (!put(localHeader(fields)))
            return false;
        const std::uint64_t start = at_;
        fields.method = options_.stored ? Stored : Deflated;
        for (std::uint64_t done = 0; done < source.size;) {
            const std::uint64_t size = std::min(ChunkSize, source.size - done);
            const PackedChunk chunk = chunks_.next();
            if (chunk.error != 0)
                return fail(chunk.error, source.path, "");
            if (chunk.changed)
                return fail(0, source.path, "changed while it was packed");
            fields.crc = static_cast<std::uint32_t>(
                crc32_combine(fields.crc, chunk.crc, static_cast<z_off_t>(size)));
            if (!put({reinterpret_cast<const char*>(chunk.bytes.data()), chunk.bytes.size()}))
                return false;
            done += size;
            progress_.advance(size);
        }
        if (!options_.stored && at_ - start >= source.size && !storeInstead(source, fields, start))
            return false;
        fields.packed = static_cast<std::uint32_t>(at_ - start);
        const std::string header = localHeader(fields);
        return pwrite(fd_, header.data(), header.size(), static_cast<off_t>(fields.offset)) ==
                   static_cast<ssize_t>(header.size()) ||
               fail(errno, "", "");
    }

    /// Replaces the data that begins at `start`, which compression has made no smaller.
    bool storeInstead(const Source& source, EntryFields& fields, std::uint64_t start)
    {
        const auto back = static_cast<off_t>(start);
        if (lseek(fd_, back, SEEK_SET) != back || ftruncate(fd_, back) != 0)
            return fail(errno, "", "");
        at_ = start;
        fields.method = Stored;
        std::uint32_t crc = 0;
        for (std::uint64_t done = 0; done < source.size;) {
            const auto size = static_cast<std::size_t>(std::min(ChunkSize, source.size - done));
            PackedChunk chunk;
            readChunk(source, {0, done, size, false}, chunk.bytes, chunk);
            if (chunk.error != 0)
                return fail(chunk.error, source.path, "");
            crc = static_cast<std::uint32_t>(crc32_z(crc, chunk.bytes.data(), chunk.bytes.size()));
            done += size;
            if (chunk.changed || (done == source.size && crc != fields.crc))
                return fail(0, source.path, "changed while it was packed");
            if (!put({reinterpret_cast<const char*>(chunk.bytes.data()), chunk.bytes.size()}))
                return false;
        }
        return true;
    }

    bool finish()
    {
        const auto start = static_cast<std::uint32_t>(at_);
        const auto count = static_cast<std::uint32_t>(sources_.size());
        std::string end = "PK\5\6";
        append16(end, 0);
        append16(end, 0);
        append16(end, count);
        append16(end, count);
        append32(end, static_cast<std::uint32_t>(central_.size()));
        append32(end, start);
        append16(end, 0);
        return put(central_) && put(end);
    }

    int fd_;
    const std::vector<Source>& sources_;
    const ArchiveOptions& options_;
    ArchiveFailure& failure_;
    Progress progress_;
    ChunkPacker chunks_;
    std::uint64_t at_ = 0;
    std::string central_;
};

} // namespace

bool writeArchive(int fd, const std::vector<Source>& sources, const ArchiveOptions& options,
                  ArchiveFailure& failure)
{
    return ArchiveWriter(fd, sources, options, failure).write();
}
