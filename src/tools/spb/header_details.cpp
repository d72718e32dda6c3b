#include "header_details.h"

#include "package_layout.h"
#include "shown_text.h"

#include <algorithm>
#include <cerrno>
#include <string_view>

#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr std::int64_t EndSize = 22;
constexpr std::int64_t CentralSize = 46;
constexpr std::int64_t LocalSize = 30;
constexpr std::int64_t Zip64LocatorSize = 20;
constexpr std::int64_t LongestComment = 65535;
constexpr std::uint32_t SizesFollow = 8;

constexpr std::size_t MostScanned = 1000000; // entries without a central directory to count them

constexpr const char* NotUsed = "; the central directory is not used, only the local headers are";

std::uint32_t read16(const char* at)
{
    const auto byte = [&](int i) { return std::uint32_t{static_cast<unsigned char>(at[i])}; };
    return byte(0) | byte(1) << 8;
}

std::uint32_t read32(const char* at)
{
    return read16(at) | read16(at + 2) << 16;
}

/// Reads at a position that, like the installer's, cannot reach 2 GiB.
class Reader {
public:
    explicit Reader(int fd) : fd_(fd)
    {
        struct stat status = {};
        size_ = fstat(fd, &status) == 0 ? status.st_size : 0;
    }

    [[nodiscard]] std::int64_t position() const { return position_; }
    [[nodiscard]] std::int64_t size() const { return size_; }

    bool seek(std::int64_t position)
    {
        if (position < 0 || position >= static_cast<std::int64_t>(SizeLimit))
            return false;
        position_ = position;
        return true;
    }

    bool skip(std::int64_t count) { return seek(position_ + count); }

    /// Up to `count` bytes, at most the window's size, without moving on.
    std::string_view peek(std::int64_t count)
    {
        if (position_ < start_ || position_ + count > start_ + held_)
            fill();
        const std::int64_t at = position_ - start_;
        return {window_ + at,
                static_cast<std::size_t>(std::clamp<std::int64_t>(held_ - at, 0, count))};
    }

    /// Exactly `count` bytes; nothing when the file ends before.
    std::optional<std::string_view> read(std::int64_t count)
    {
        const std::string_view bytes = peek(count);
        if (static_cast<std::int64_t>(bytes.size()) < count)
            return std::nullopt;
        position_ += count;
        return bytes;
    }

private:
    void fill()
    {
        start_ = position_;
        held_ = 0;
        while (held_ < WindowSize) {
            const ssize_t count = pread(
                fd_, window_ + held_, static_cast<std::size_t>(WindowSize - held_), start_ + held_);
            if (count <= 0)
                break;
            held_ += count;
        }
    }

    static constexpr std::int64_t WindowSize = 8192;
    int fd_;
    std::int64_t size_ = 0;
    std::int64_t position_ = 0;
    std::int64_t start_ = 0; ///< the window holds the bytes from here on
    std::int64_t held_ = 0;
    char window_[WindowSize] = {};
};

/// Reads the headers in the two ways that the installer tries one after the other.
class HeaderExplainer {
public:
    HeaderExplainer(int fd, Findings& findings) : fd_(fd), reader_(fd), findings_(findings) {}

    int explain(std::vector<HeaderDetails>& details)
    {
        if (!readCentralDirectory()) {
            details_.clear();
            if (!scanLocalHeaders())
                details_.clear();
        }
        details = std::move(details_);
        return tooMany_ ? EFBIG : 0;
    }

private:
    bool unusable(std::string_view code, std::optional<std::string> entry,
                  const std::string& reason)
    {
        findings_.add(code, std::move(entry), reason + NotUsed);
        return false;
    }

    bool unusable(const std::string& reason)
    {
        return unusable("central-directory", std::nullopt, reason);
    }

    bool readCentralDirectory();
    bool readEndRecord(std::uint32_t& count, std::uint32_t& offset);
    [[nodiscard]] bool hasComment() const;
    bool readCentralHeaders(std::uint32_t count, std::vector<std::uint32_t>& offsets,
                            std::vector<std::string>& names, std::vector<std::uint32_t>& methods);
    bool readLocalHeader(const std::string& centralName, std::uint32_t method, std::uint32_t offset,
                         HeaderDetails& details);
    bool scanLocalHeaders();
    bool scanLocalHeader(std::int64_t start, std::string_view header);
    bool unreadable(std::int64_t start, const std::string& reason);

    int fd_;
    Reader reader_;
    Findings& findings_;
    std::vector<HeaderDetails> details_;
    bool tooMany_ = false;
};

std::string cutAtNul(std::string_view name)
{
    return std::string(name.substr(0, name.find('\0')));
}

void keepWholeName(HeaderDetails& details, std::string_view name)
{
    if (name.find('\0') != std::string_view::npos)
        details.wholeName = std::string(name);
}

bool HeaderExplainer::hasComment() const
{
    const std::int64_t start = std::max<std::int64_t>(0, reader_.size() - EndSize - LongestComment);
    std::string tail(static_cast<std::size_t>(reader_.size() - start), '\0');
    const ssize_t count = pread(fd_, tail.data(), tail.size(), start);
    tail.resize(static_cast<std::size_t>(std::max<ssize_t>(count, 0)));

    for (std::size_t at = tail.rfind("PK\5\6"); at != std::string::npos;
         at = at == 0 ? std::string::npos : tail.rfind("PK\5\6", at - 1)) {
        if (at + EndSize <= tail.size() &&
            at + EndSize + read16(tail.data() + at + 20) == tail.size())
            return true;
    }
    return false;
}

bool HeaderExplainer::readEndRecord(std::uint32_t& count, std::uint32_t& offset)
{
    const std::int64_t size = reader_.size();
    const auto end = reader_.seek(size - EndSize) ? reader_.read(EndSize) : std::nullopt;
    if (!end || !end->starts_with("PK\5\6")) {
        return hasComment() ? unusable("archive-comment", std::nullopt, "the archive has a comment")
                            : unusable("there is no end record at the end");
    }
    const std::uint32_t onDisk = read16(end->data() + 8);
    count = read16(end->data() + 10);
    offset = read32(end->data() + 16);

    (void)reader_.seek(std::max<std::int64_t>(0, size - EndSize - Zip64LocatorSize));
    if (reader_.peek(4) == "PK\6\7")
        findings_.add("zip64", std::nullopt,
                      "the installer does not know Zip64 records: it may see a part of the archive "
                      "only");
    return onDisk == count || unusable("its end record speaks of more disks");
}

bool HeaderExplainer::readCentralHeaders(std::uint32_t count, std::vector<std::uint32_t>& offsets,
                                         std::vector<std::string>& names,
                                         std::vector<std::uint32_t>& methods)
{
    std::uint32_t commentLength = 0; // of the header before
    for (std::uint32_t number = 0; number < count; ++number) {
        const auto header = reader_.read(CentralSize);
        if (!header || !header->starts_with("PK\1\2")) {
            if (commentLength != 0)
                return unusable("file-comment", names.back(), "it has a comment");
            return unusable("it has no header number " + std::to_string(number + 1) + " of " +
                            std::to_string(count));
        }
        const char* const at = header->data();
        const std::uint32_t madeBy = read16(at + 4);
        HeaderDetails& details = details_.emplace_back();
        details.flags = read16(at + 8);
        details.unixMode = madeBy >> 8 == MadeByUnix ? read32(at + 38) >> 16 : 0;
        methods.push_back(read16(at + 10));
        offsets.push_back(read32(at + 42));
        const std::uint32_t nameLength = read16(at + 28);
        const std::uint32_t extraLength = read16(at + 30);
        commentLength = read16(at + 32);
        if (nameLength > LongestName)
            return unusable("a name has " + std::to_string(nameLength) + " bytes, more than " +
                            std::to_string(LongestName));
        names.emplace_back(reader_.peek(nameLength));
        if (!reader_.skip(nameLength + extraLength))
            return unusable("it reaches 2 GiB");
    }
    (void)reader_.skip(commentLength); // where it leads nowhere, no header follows
    return true;
}

bool HeaderExplainer::readLocalHeader(const std::string& centralName, std::uint32_t method,
                                      std::uint32_t offset, HeaderDetails& details)
{
    const auto header = reader_.seek(offset) ? reader_.read(LocalSize) : std::nullopt;
    if (!header)
        return unusable("central-directory", centralName, "its local header cannot be read");
    const std::uint32_t localMethod = read16(header->data() + 8);
    const std::uint32_t nameLength = read16(header->data() + 26);
    if (localMethod != method)
        return unusable("method-differs", centralName,
                        "its local header says method " + std::to_string(localMethod) +
                            ", the central directory " + std::to_string(method));
    const auto name = nameLength <= LongestName ? reader_.read(nameLength) : std::nullopt;
    if (!name)
        return unusable("central-directory", centralName,
                        "the name in its local header cannot be read");
    keepWholeName(details, *name);
    if (centralName != *name)
        details.centralName = centralName;
    return true;
}

bool HeaderExplainer::readCentralDirectory()
{
    std::uint32_t count = 0;
    std::uint32_t offset = 0;
    if (!readEndRecord(count, offset))
        return false;
    if (!reader_.seek(offset))
        return unusable("it begins at 2 GiB or beyond");

    std::vector<std::uint32_t> offsets;
    std::vector<std::string> names;
    std::vector<std::uint32_t> methods;
    if (!readCentralHeaders(count, offsets, names, methods))
        return false;
    if (names.empty())
        return unusable("it lists nothing");
    if (reader_.peek(4) == "PK\1\2")
        findings_.add("entries-not-counted", std::nullopt,
                      "the end record counts " + std::to_string(count) +
                          " entries; the installer does not see those after them");
    for (std::size_t i = 0; i < names.size(); ++i) {
        if (!readLocalHeader(names[i], methods[i], offsets[i], details_[i]))
            return false;
    }
    return true;
}

bool HeaderExplainer::unreadable(std::int64_t start, const std::string& reason)
{
    findings_.add("unreadable", std::nullopt,
                  "the installer finds no package: at byte " + std::to_string(start) + ", " +
                      reason);
    return false;
}

bool HeaderExplainer::scanLocalHeader(std::int64_t start, std::string_view header)
{
    const char* const at = header.data();
    HeaderDetails details;
    details.flags = read16(at + 6);
    const std::uint32_t crc = read32(at + 14);
    const std::uint32_t packed = read32(at + 18);
    const std::uint32_t size = read32(at + 22);
    const std::uint32_t nameLength = read16(at + 26);
    const std::uint32_t extraLength = read16(at + 28);
    if (nameLength > LongestName) {
        findings_.add("name-too-long", std::nullopt,
                      "at byte " + std::to_string(start) + ", the name has " +
                          std::to_string(nameLength) + " bytes, more than " +
                          std::to_string(LongestName));
        return false;
    }
    const auto bytes = reader_.read(nameLength);
    if (!bytes)
        return unreadable(start, "the file ends inside a name");
    const std::string name = cutAtNul(*bytes);
    keepWholeName(details, *bytes);
    if (crc == 0 && packed == 0 && size == 0 && (details.flags & SizesFollow) != 0) {
        findings_.add("unknown-size", name,
                      "its size follows its data, and no usable central directory states it");
        return false;
    }
    if (extraLength != 0 && !reader_.skip(extraLength))
        return unreadable(start, "an extra field reaches 2 GiB");
    if (packed != 0 && !reader_.skip(packed))
        return unreadable(start, "the data of " + shown(name) + " reaches 2 GiB");
    details_.push_back(std::move(details));
    return true;
}

bool HeaderExplainer::scanLocalHeaders()
{
    (void)reader_.seek(0); // cannot fail
    for (;;) {
        const std::int64_t start = reader_.position();
        const auto header = reader_.read(LocalSize);
        if (!header)
            return unreadable(start, "the file ends before a central directory");
        if (header->starts_with("PK\1\2"))
            return !details_.empty() || unreadable(0, "the archive holds no entries");
        tooMany_ = details_.size() == MostScanned;
        if (tooMany_)
            return false;
        if (!header->starts_with("PK\3\4"))
            return unreadable(start, "there is neither an entry nor a central directory");
        if (!scanLocalHeader(start, std::string(*header)))
            return false;
    }
}

} // namespace

int readHeaderDetails(int fd, Findings& findings, std::vector<HeaderDetails>& details)
{
    return HeaderExplainer(fd, findings).explain(details);
}
