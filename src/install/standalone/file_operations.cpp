#include "file_operations.h"

#include "file_writing.h"
#include "paths.h"
#include "scoped.h"
#include "sound_entry.h"

#include <cerrno>
#include <cstdio>
#include <memory>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr mode_t NewFileMode = 0666;
constexpr mode_t NewDirectoryMode = 0777;
constexpr int CreateOnly = O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC;
constexpr int CopyBlockSize = 4096;
constexpr int ExtractBlockSize = 8192;

ScopedFd openForWriting(const std::string& path)
{
    return ScopedFd(open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, NewFileMode));
}

/// True when the last file of the journal took the place of another.
bool lastReplacedAnother(const FileTransaction& transaction)
{
    const auto& journal = transaction.journal;
    return journal.size() >= 2 && journal[journal.size() - 2].kind == BackedUp;
}

/// Opens `destination` for a file that is extracted from `archive`, its old content backed up;
/// returns 0, or the code of what failed.
///
/// Into a new installation hardly anything is in the way, so creating it comes first, and looking
/// at what is there only when that fails, whatever the reason: the second road tells it. Where the
/// last file replaced another, this one is expected to as well.
int openDestination(FileTransaction& transaction, const ZipFile& archive,
                    const std::string& destination, ScopedFd& file)
{
    if (!lastReplacedAnother(transaction))
        file = ScopedFd(open(destination.c_str(), CreateOnly, NewFileMode));
    if (file.isOpen())
        return FileOk;

    const int backedUp = backupFile(transaction, destination);
    if (backedUp != FileOk)
        return backedUp;
    file = openForWriting(destination);
    archive.fileWasReplaced();
    return file.isOpen() ? FileOk : CannotOpenForWriting;
}

int copyContent(int source, int destination)
{
    char block[CopyBlockSize];
    for (;;) {
        const ssize_t count = read(source, block, sizeof block);
        if (count < 0)
            return CannotRead;
        if (count == 0)
            return FileOk;
        const int code = writeAll(destination, block, static_cast<std::size_t>(count));
        if (code != FileOk)
            return code;
    }
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

int createIfMissing(FileTransaction& transaction, const std::string& path, mode_t mode)
{
    if (path.empty() || pathExists(path))
        return FileOk;
    if (makeDirectory(path, mode) != 0)
        return CannotCreateDirectory;
    record(transaction, DirectoryCreated, path);
    return FileOk;
}

/// Writes `entry`, which lies in the open archive `source`, to the new file `destination`.
int writeEntry(const ZipFile& archive, const ZipEntry& entry, int source, int destination)
{
    const int copied = copySoundEntry(source, entry, destination);
    if (copied != EntryNotSound)
        return copied;

    // Damaged: what is left of it is what its stream delivers in blocks of ExtractBlockSize.
    // A device has nothing to take back, and says EINVAL.
    if (lseek(destination, 0, SEEK_SET) != 0 || (ftruncate(destination, 0) != 0 && errno != EINVAL))
        return writeErrorCode(errno);
    const std::unique_ptr<InputStream> stream(archive.getInputStream(&entry));
    return stream ? writeContent(*stream, destination) : CannotOpenForReading;
}

} // namespace

int copyFile(const std::string& source, const std::string& destination)
{
    const ScopedFd in(open(source.c_str(), O_RDONLY | O_CLOEXEC));
    if (!in.isOpen())
        return CannotOpenForReading;
    ScopedFd out = openForWriting(destination);
    if (!out.isOpen())
        return CannotOpenForWriting;

    const int code = copyContent(in.get(), out.get());
    return code != FileOk ? code : closeWritten(out);
}

int backupFile(FileTransaction& transaction, const std::string& path)
{
    if (!transaction.backup || pathIsMissing(path))
        return FileOk;

    const std::string backup = backupName(path);
    if (renameat2(AT_FDCWD, path.c_str(), AT_FDCWD, backup.c_str(), RENAME_NOREPLACE) != 0) {
        (void)unlink(backup.c_str()); // of an older run; if it stays, the rename tells
        if (std::rename(path.c_str(), backup.c_str()) != 0)
            return CannotRename;
    }

    // Only now: an entry without its backup would have nothing to restore.
    record(transaction, BackedUp, path);
    return FileOk;
}

int backupCopy(FileTransaction& transaction, const std::string& path)
{
    const std::string backup = backupName(path);
    const int code = copyFile(path, backup);
    if (code != FileOk) {
        (void)unlink(backup.c_str()); // a partial copy restores nothing
        return code;
    }
    record(transaction, BackedUp, path);
    record(transaction, Created, path);
    return FileOk;
}

int extractFile(FileTransaction& transaction, const ZipFile& archive, const ZipEntry& entry,
                const std::string& destination, mode_t mode)
{
    const auto source = archive.openEntry(&entry);
    if (!source)
        return CannotOpenForReading;

    ScopedFd file(-1);
    const int opened = openDestination(transaction, archive, destination, file);
    if (opened != FileOk)
        return opened;
    record(transaction, Created, destination); // before its first byte: a rollback finds it

    const int code = writeEntry(archive, entry, source->get(), file.get());
    if (code != FileOk)
        return code;
    if (mode != 0)
        (void)fchmod(file.get(), mode); // the content is what counts
    return closeWritten(file);
}

int copyFileWithBackup(FileTransaction& transaction, const std::string& source,
                       const std::string& destination)
{
    const int backedUp = backupFile(transaction, destination);
    if (backedUp != FileOk)
        return backedUp;
    const int code = copyFile(source, destination);
    if (code != FileOk)
        return code;
    record(transaction, Created, destination);
    return FileOk;
}

int setFileMode(FileTransaction& /*transaction*/, const std::string& path, mode_t mode)
{
    return chmod(path.c_str(), mode) == 0 ? FileOk : CannotChangeMode;
}

int makeDirectory(const std::string& path, mode_t mode)
{
    return mkdir(path.c_str(), mode != 0 ? mode : NewDirectoryMode);
}

int removeDirectory(const std::string& path)
{
    return rmdir(path.c_str());
}

int createPath(FileTransaction& transaction, const std::string& path, mode_t mode)
{
    // Shallowest first, so that a rollback removes the deepest first.
    for (std::size_t slash = path.find('/'); slash != std::string::npos;
         slash = path.find('/', slash + 1)) {
        const int code = createIfMissing(transaction, path.substr(0, slash), mode);
        if (code != FileOk)
            return code;
    }
    return FileOk;
}

int createFullPath(FileTransaction& transaction, const std::string& path, mode_t mode, int* counter)
{
    if (counter != nullptr)
        *counter = 0;
    const int code = createPath(transaction, path, mode);
    if (code != FileOk || path.empty() || endsWithSlash(path))
        return code;
    return createIfMissing(transaction, path, mode);
}
