#include "entry_extraction.h"

#include "file_writing.h"
#include "safe_path.h"
#include "whole_entry.h"
#include "zip_file.h"

#include <algorithm>
#include <cerrno>
#include <cstddef>
#include <limits>
#include <utility>

#include <fcntl.h>
#include <sys/sendfile.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr std::size_t InputSize = std::size_t{256} * 1024;
constexpr std::size_t PieceSize = std::size_t{256} * 1024;

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

int copySoundEntry(PackageWindow& package, const ZipEntry& entry, int destination)
{
    return entry.method == 0 ? copyStored(package, entry, destination)
                             : copyDeflated(package, entry, destination);
}

namespace {

constexpr int ExtractBlockSize = 8192;

/// Opens `destination` for a file of `package`, its old content backed up. Returns 0, or the code
/// of what failed.
///
/// In a new installation nothing is in the way, so this first tries to create the file, and checks
/// what exists only if that fails. After a file that replaced another, this one probably does, too,
/// and the check comes first.
int openDestination(FileTransaction& transaction, OpenPackage& package,
                    const std::string& destination, WritableFile& file)
{
    if (!lastFileReplacedAnother(transaction) &&
        openForWriting(destination, Existing::Refuse, UnfinishedMode, file) == 0)
        return FileOk;

    struct stat moved = {};
    const int backedUp = backupFile(transaction, destination, moved);
    if (backedUp != FileOk)
        return backedUp;
    // After a backup the name is free. Whatever is there now was planted.
    const Existing existing = transaction.backup ? Existing::Refuse : Existing::Truncate;
    const int error = openForWriting(destination, existing, UnfinishedMode, file);
    package.fileWasReplaced(moved);
    if (existing == Existing::Truncate)
        package.fileWasTruncated();
    return error == 0 ? FileOk : CannotOpenForWriting;
}

int writeContent(InputStream& stream, int destination)
{
    char block[ExtractBlockSize];
    for (;;) {
        const int count = stream.read(block, sizeof block);
        if (count < 0)
            return CannotRead;
        if (count == 0)
            return FileOk;
        const int code = writeAll(destination, block, static_cast<std::size_t>(count));
        if (code != FileOk)
            return code;
    }
}

/// Writes `entry`, which is in the open package `source`, to the new file `destination`.
int writeEntry(const ZipEntry& entry, PackageWindow& source, int destination)
{
    const int copied = copySoundEntry(source, entry, destination);
    if (copied != EntryNotSound)
        return copied;

    // The content of a damaged entry is what its stream delivers in blocks of ExtractBlockSize.
    // For a device, which cannot be truncated, the error is EINVAL.
    if (lseek(destination, 0, SEEK_SET) != 0 || (ftruncate(destination, 0) != 0 && errno != EINVAL))
        return writeErrorCode(errno);
    // From the package as it was opened: this file may have replaced it.
    ScopedFd own(fcntl(source.fd(), F_DUPFD_CLOEXEC, 0));
    if (!own.isOpen())
        return CannotOpenForReading;
    return writeContent(*streamOver(std::move(own), entry), destination);
}

} // namespace

std::shared_ptr<PackageWindow> OpenPackage::open(const ZipEntry* entry)
{
    if (!hasStream(entry))
        return nullptr;
    if (!file_) {
        ScopedFd file = archive_.openArchive();
        struct stat status = {};
        if (file.isOpen() && fstat(file.get(), &status) == 0) {
            identity_ = identityOf(status);
            file_ = std::make_shared<PackageWindow>(std::move(file));
        }
    }
    return file_;
}

void OpenPackage::fileWasReplaced(const struct stat& moved)
{
    // No path leads through a plain file, and this is asked for each file of an upgrade.
    if (S_ISREG(moved.st_mode) && identityOf(moved) != identity_)
        return;
    struct stat named = {};
    if (stat(archive_.path().c_str(), &named) != 0 || identityOf(named) != identity_)
        file_.reset();
}

void OpenPackage::fileWasTruncated()
{
    if (file_)
        file_->forget();
}

int extractOpenFile(FileTransaction& transaction, OpenPackage& package, const ZipEntry* entry,
                    const std::string& destination, mode_t mode)
{
    const auto source = package.open(entry);
    if (!source)
        return CannotOpenForReading;

    WritableFile file;
    const int opened = openDestination(transaction, package, destination, file);
    if (opened != FileOk)
        return opened;
    record(transaction, Created, destination); // before its first byte: a rollback finds it

    const int code = writeEntry(*entry, *source, file.fd.get());
    if (code == FileOk && mode != 0)
        (void)fchmod(file.fd.get(), mode); // the content is what counts
    else if (file.created)
        (void)fchmod(file.fd.get(), underUmask(NewFileMode)); // it remains under "-norollback"
    return code == FileOk ? closeWritten(file.fd) : code;
}

int extractFile(FileTransaction& transaction, const ZipFile& archive, const ZipEntry* entry,
                const std::string& destination, mode_t mode)
{
    OpenPackage package(archive);
    return extractOpenFile(transaction, package, entry, destination, mode);
}
