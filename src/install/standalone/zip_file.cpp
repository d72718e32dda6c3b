#undef NDEBUG // the assertion below holds in every build type
#include "zip_file.h"

#include "package_window.h"

#include <algorithm>
#include <cassert>
#include <cstdio>
#include <cstring>
#include <limits>

#include <fcntl.h>
#include <sys/stat.h>

namespace {

constexpr std::uint32_t MaxNameLength = 2048;
constexpr std::size_t EndRecordSize = 22;
constexpr std::size_t CentralHeaderSize = 46;
constexpr std::size_t LocalHeaderSize = 30;
constexpr std::uint32_t SizesFollowData = 8; // bit 3 of the general-purpose flags

constexpr std::int64_t SeekLimit = std::int64_t{1} << 31;

std::uint32_t read16(const unsigned char* at)
{
    return static_cast<std::uint32_t>(at[0] | at[1] << 8);
}

std::uint32_t read32(const unsigned char* at)
{
    return read16(at) | read16(at + 2) << 16;
}

bool hasSignature(const unsigned char* at, unsigned char third, unsigned char fourth)
{
    return at[0] == 'P' && at[1] == 'K' && at[2] == third && at[3] == fourth;
}

/// Reads up to `size` bytes; fewer only at the end of the file or if reading fails.
std::size_t readUpTo(int fd, void* buffer, std::size_t size)
{
    std::size_t done = 0;
    while (done < size) {
        const ssize_t count = ::read(fd, static_cast<char*>(buffer) + done, size - done);
        if (count <= 0)
            break;
        done += static_cast<std::size_t>(count);
    }
    return done;
}

ScopedFd openForReading(const char* path)
{
    return ScopedFd(::open(path, O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
}

/// Reads an archive's headers one after the other.
class HeaderReader {
public:
    explicit HeaderReader(ScopedFd file) : window_(std::move(file)) {}

    [[nodiscard]] std::int64_t position() const { return position_; }

    bool seek(std::int64_t position)
    {
        if (position < 0 || position >= SeekLimit)
            return false;
        position_ = position;
        return true;
    }

    bool skip(std::uint32_t count) { return seek(position_ + count); }

    bool seekBeforeEnd(std::int64_t distance)
    {
        const std::int64_t end = ::lseek(window_.fd(), 0, SEEK_END);
        return seek(end - distance);
    }

    /// Reads exactly `size` bytes and moves on.
    bool read(void* buffer, std::size_t size)
    {
        const unsigned char* const bytes = window_.bytes(position_, size);
        if (bytes == nullptr)
            return false;
        std::memcpy(buffer, bytes, size);
        position_ += static_cast<std::int64_t>(size);
        return true;
    }

private:
    PackageWindow window_;
    std::int64_t position_ = 0;
};

/// Reads a name of `length` bytes and cuts it at its first NUL.
bool readName(HeaderReader& reader, std::uint32_t length, std::string& name)
{
    char text[MaxNameLength + 1];
    if (!reader.read(text, length))
        return false;
    text[length] = '\0';
    name = text;
    return true;
}

/// Reads sizes and offsets of `count` central headers; dataOffset is the local header's until
/// resolveLocalHeader() has run.
bool readCentralHeaders(HeaderReader& reader, std::uint32_t count, std::vector<ZipEntry>& entries)
{
    for (std::uint32_t i = 0; i < count; ++i) {
        unsigned char header[CentralHeaderSize];
        if (!reader.read(header, sizeof header) || !hasSignature(header, 1, 2))
            return false;

        const std::uint32_t nameLength = read16(header + 28);
        // Deliberate: a file comment is not skipped. The next header is then not found, and the
        // archive is read through the scan.
        if (nameLength > MaxNameLength || !reader.skip(nameLength + read16(header + 30)))
            return false;

        ZipEntry& entry = entries.emplace_back();
        entry.method = read16(header + 10);
        entry.crc32 = read32(header + 16);
        entry.compressedSize = read32(header + 20);
        entry.uncompressedSize = read32(header + 24);
        entry.dataOffset = read32(header + 42);
    }
    return true;
}

/// Sets the name of `entry` and the offset of its data. The local signature is not checked.
bool resolveLocalHeader(HeaderReader& reader, ZipEntry& entry)
{
    unsigned char header[LocalHeaderSize];
    if (!reader.seek(entry.dataOffset) || !reader.read(header, sizeof header))
        return false;

    const std::uint32_t nameLength = read16(header + 26);
    if (read16(header + 8) != entry.method || nameLength > MaxNameLength)
        return false;
    if (!readName(reader, nameLength, entry.name))
        return false;

    entry.dataOffset = static_cast<std::uint32_t>(reader.position()) + read16(header + 28);
    return true;
}

/// Reads the central directory; no entries if anything about it is wrong.
void readCentralDirectory(HeaderReader& reader, std::vector<ZipEntry>& entries)
{
    // The end record is expected in one place only, so an archive comment hides it.
    unsigned char end[EndRecordSize];
    if (!reader.seekBeforeEnd(EndRecordSize) || !reader.read(end, sizeof end) ||
        !hasSignature(end, 5, 6))
        return;

    const std::uint32_t count = read16(end + 10);
    if (read16(end + 8) != count || !reader.seek(read32(end + 16)))
        return;
    if (!readCentralHeaders(reader, count, entries) ||
        !std::all_of(entries.begin(), entries.end(),
                     [&](ZipEntry& entry) { return resolveLocalHeader(reader, entry); }))
        entries.clear();
}

/// Reads one local header, whose signature is checked already, and moves past its data.
int scanLocalHeader(HeaderReader& reader, const unsigned char* header, ZipEntry& entry)
{
    const std::uint32_t nameLength = read16(header + 26);
    if (nameLength > MaxNameLength)
        return ZipNameTooLong;
    if (!readName(reader, nameLength, entry.name))
        return ZipNameCutShort;

    entry.method = read16(header + 8);
    entry.crc32 = read32(header + 14);
    entry.compressedSize = read32(header + 18);
    entry.uncompressedSize = read32(header + 22);
    const bool sizesKnown =
        entry.crc32 != 0 || entry.compressedSize != 0 || entry.uncompressedSize != 0;
    if (!sizesKnown && (read16(header + 6) & SizesFollowData) != 0)
        return ZipUnknownEntrySize;

    const std::uint32_t extraLength = read16(header + 28);
    if (extraLength != 0 && !reader.skip(extraLength))
        return ZipCannotSkipExtra;
    entry.dataOffset = static_cast<std::uint32_t>(reader.position());
    if (entry.compressedSize != 0 && !reader.skip(entry.compressedSize))
        return ZipCannotSkipData;
    return ZipOk;
}

/// Walks the local headers from the start of the file to the first central header.
int scanLocalHeaders(HeaderReader& reader, std::vector<ZipEntry>& entries)
{
    (void)reader.seek(0); // cannot fail
    for (;;) {
        unsigned char header[LocalHeaderSize];
        if (!reader.read(header, sizeof header))
            return ZipEndOfFile;
        if (hasSignature(header, 1, 2))
            return ZipOk;
        if (!hasSignature(header, 3, 4))
            return ZipUnknownRecord;

        ZipEntry entry;
        const int code = scanLocalHeader(reader, header, entry);
        if (code != ZipOk)
            return code;
        entries.push_back(std::move(entry));
    }
}

} // namespace

std::int64_t dataStart(const ZipEntry& entry)
{
    return entry.dataOffset < SeekLimit ? entry.dataOffset : 0;
}

X__StoredInputStream::X__StoredInputStream(ScopedFd file, std::uint32_t size)
    : file_(std::move(file)), remaining_(static_cast<std::int32_t>(size))
{
}

int X__StoredInputStream::read()
{
    unsigned char byte = 0;
    if (readUpTo(file_.get(), &byte, 1) != 1)
        return -1;
    // In unsigned arithmetic: a size of 2^31 or more begins below 0 and may pass the smallest
    // number.
    remaining_ = static_cast<std::int32_t>(static_cast<std::uint32_t>(remaining_) - 1);
    return byte;
}

int X__StoredInputStream::read(char* buf, int len)
{
    const std::int32_t wanted = std::min(len, remaining_);
    if (wanted <= 0)
        return 0;
    const auto count =
        static_cast<std::int32_t>(readUpTo(file_.get(), buf, static_cast<std::size_t>(wanted)));
    remaining_ -= count;
    return count;
}

int X__StoredInputStream::available()
{
    return remaining_;
}

X__DeflatedInputStream::X__DeflatedInputStream(ScopedFd file, std::uint32_t compressedSize,
                                               std::uint32_t uncompressedSize)
    : file_(std::move(file)), compressedRemaining_(compressedSize), available_(uncompressedSize)
{
    (void)inflateInit2(&inflate_, -15); // raw data; if it fails, so does the first inflate
}

X__DeflatedInputStream::~X__DeflatedInputStream()
{
    (void)inflateEnd(&inflate_);
}

int X__DeflatedInputStream::read()
{
    char c = 0;
    if (read(&c, 1) != 1)
        return -1;
    return static_cast<signed char>(c);
}

/// Reads ahead compressed bytes; false if none are left.
bool X__DeflatedInputStream::refill()
{
    const std::size_t wanted = std::min<std::size_t>(sizeof input_, compressedRemaining_);
    const std::size_t count = readUpTo(file_.get(), input_, wanted);
    compressedRemaining_ -= static_cast<std::uint32_t>(count);
    inflate_.next_in = input_;
    inflate_.avail_in = static_cast<uInt>(count);
    return count != 0;
}

int X__DeflatedInputStream::markExhausted()
{
    status_ = Z_STREAM_ERROR;
    available_ = 0;
    return 0;
}

int X__DeflatedInputStream::read(char* buf, int len)
{
    if (!file_.isOpen())
        return 0;

    if (len > 0) {
        inflate_.next_out = reinterpret_cast<Bytef*>(buf);
        inflate_.avail_out = static_cast<uInt>(len);
        while (status_ == Z_OK && inflate_.avail_out != 0) {
            const bool dry = inflate_.avail_in == 0 && !refill();
            // Also without input: inflate may hold output that did not fit the previous block.
            status_ = inflate(&inflate_, Z_NO_FLUSH);
            if (dry && status_ == Z_BUF_ERROR)
                return markExhausted();
        }
    }

    if (status_ != Z_OK && status_ != Z_STREAM_END) {
        available_ = 0;
        return 0;
    }

    // Deliberate: with `len` 0 or below this counts the room that the previous call left, and an
    // entry that inflates to more than its recorded size ends the program.
    const auto result = static_cast<int>(static_cast<unsigned>(len) - inflate_.avail_out);
    if (!(available_ >= static_cast<unsigned>(result))) {
        (void)std::fflush(nullptr); // the abort would drop what was printed so far
        __assert_fail("available_ >= (unsigned) result", "zip_file", 432,
                      "virtual int X__DeflatedInputStream::read(char*, int)");
    }
    available_ -= static_cast<unsigned>(result);
    return result;
}

int X__DeflatedInputStream::available()
{
    return static_cast<std::int32_t>(available_);
}

bool hasStream(const ZipEntry* entry)
{
    return entry != nullptr && entry->compressedSize != 0 && entry->uncompressedSize != 0 &&
           (entry->method == 0 || entry->method == 8);
}

std::unique_ptr<InputStream> streamOver(ScopedFd file, const ZipEntry& entry)
{
    (void)::lseek(file.get(), dataStart(entry), SEEK_SET); // deliberate: the result is ignored
    if (entry.method == 0)
        return std::make_unique<X__StoredInputStream>(std::move(file), entry.uncompressedSize);
    return std::make_unique<X__DeflatedInputStream>(std::move(file), entry.compressedSize,
                                                    entry.uncompressedSize);
}

ZipFile::ZipFile(const char* path) : path_(path == nullptr ? "" : path)
{
    (void)readDirectory(path, entries_); // a failure leaves the list empty
}

const ZipEntry* ZipFile::findEntry(const std::string& name) const
{
    const auto found = std::find_if(entries_.begin(), entries_.end(),
                                    [&](const ZipEntry& entry) { return entry.name == name; });
    return found == entries_.end() ? nullptr : &*found;
}

ScopedFd ZipFile::openArchive() const
{
    return openForReading(path_.c_str());
}

InputStream* ZipFile::getInputStream(const ZipEntry* entry) const
{
    if (!hasStream(entry))
        return nullptr;
    ScopedFd file = openArchive();
    return file.isOpen() ? streamOver(std::move(file), *entry).release() : nullptr;
}

int ZipFile::readDirectory(const char* path, std::vector<ZipEntry>& entries)
{
    entries.clear();
    if (path == nullptr)
        return ZipCannotOpen;
    ScopedFd file = openForReading(path);
    if (!file.isOpen())
        return ZipCannotOpen;

    HeaderReader reader(std::move(file));
    readCentralDirectory(reader, entries);
    if (!entries.empty())
        return ZipOk;

    const int code = scanLocalHeaders(reader, entries);
    if (code != ZipOk)
        entries.clear();
    return code;
}

int ZipFile::validate(const char* path)
{
    std::vector<ZipEntry> discarded;
    return readDirectory(path, discarded);
}
