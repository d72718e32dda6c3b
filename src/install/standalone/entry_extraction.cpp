#include "entry_extraction.h"

#include "file_writing.h"
#include "safe_path.h"
#include "sound_entry.h"
#include "zip_file.h"

#include <cerrno>
#include <utility>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

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

    const int backedUp = backupFile(transaction, destination);
    if (backedUp != FileOk)
        return backedUp;
    // After a backup the name is free. Whatever is there now was planted.
    const Existing existing = transaction.backup ? Existing::Refuse : Existing::Truncate;
    const int error = openForWriting(destination, existing, UnfinishedMode, file);
    package.fileWasReplaced();
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
        if (file.isOpen())
            file_ = std::make_shared<PackageWindow>(std::move(file));
    }
    return file_;
}

void OpenPackage::fileWasReplaced()
{
    struct stat held = {};
    struct stat named = {};
    if (!file_ || fstat(file_->fd(), &held) != 0 || stat(archive_.path().c_str(), &named) != 0 ||
        held.st_ino != named.st_ino || held.st_dev != named.st_dev)
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
