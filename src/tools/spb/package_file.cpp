#include "package_file.h"

#include "header_details.h"

#include <algorithm>
#include <cerrno>
#include <limits>

#include <fcntl.h>
#include <sys/stat.h>

namespace {

constexpr int InstallerBlock = 8192; // bytes that the installer asks of a stream at a time

/// The archive by a path that leads to the file that is open, whoever replaces it meanwhile; the
/// path as given where there is no /proc.
std::string pathOf(int fd, const std::string& path)
{
    const std::string own = "/proc/self/fd/" + std::to_string(fd);
    struct stat status = {};
    return stat(own.c_str(), &status) == 0 ? own : path;
}

} // namespace

PackageFile::PackageFile(ScopedFd file, std::vector<HeaderDetails> details,
                         std::unique_ptr<ZipFile> archive)
    : file_(std::move(file)), details_(std::move(details)), archive_(std::move(archive))
{
    details_.resize(archive_->entries().size()); // differs only in a file that is being written
}

std::unique_ptr<PackageFile> PackageFile::open(const std::string& path, Findings& findings,
                                               int& error)
{
    ScopedFd file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    struct stat status = {};
    if (!file.isOpen() || fstat(file.get(), &status) != 0) {
        error = errno;
        return nullptr;
    }
    if (!S_ISREG(status.st_mode)) {
        error = S_ISDIR(status.st_mode) ? EISDIR : EINVAL;
        return nullptr;
    }
    std::vector<HeaderDetails> headers;
    error = readHeaderDetails(file.get(), findings, headers);
    if (error != 0)
        return nullptr;
    auto archive = std::make_unique<ZipFile>(pathOf(file.get(), path).c_str());
    // NOLINTNEXTLINE(cppcoreguidelines-owning-memory): the constructor is private
    return std::unique_ptr<PackageFile>(
        new PackageFile(std::move(file), std::move(headers), std::move(archive)));
}

EntryContent PackageFile::readEntry(const ZipEntry& entry, const ContentSink& sink) const
{
    // The deflated stream ends the program on an entry that holds more than its size. Told of a
    // larger one, it delivers the same bytes, and the size is compared here.
    ZipEntry unlimited = entry;
    if (entry.method != 0 && entry.uncompressedSize != 0)
        unlimited.uncompressedSize = std::numeric_limits<std::uint32_t>::max();

    EntryContent content;
    const std::unique_ptr<InputStream> stream(archive_->getInputStream(&unlimited));
    if (!stream)
        return content;
    content.opened = true;
    char block[InstallerBlock];
    for (int count = 0; (count = stream->read(block, sizeof block)) > 0;) {
        const auto size = static_cast<std::size_t>(count);
        content.crc = static_cast<std::uint32_t>(
            ::crc32(content.crc, reinterpret_cast<const Bytef*>(block), static_cast<uInt>(size)));
        content.delivered += size;
        content.beyondSize = content.delivered > entry.uncompressedSize;
        content.stopped = !content.beyondSize && !sink(block, size);
        if (content.beyondSize || content.stopped)
            break;
    }
    return content;
}
