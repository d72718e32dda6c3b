#include "file_operations.h"

#include "file_replacement.h"
#include "file_writing.h"
#include "safe_path.h"
#include "scoped.h"

#include <cerrno>
#include <cstdio>

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr mode_t NewDirectoryMode = 0777;
constexpr int CopyBlockSize = 4096;

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

/// Copies `source` to `destination`, both open, and closes the latter.
int copyAndClose(const ScopedFd& source, WritableFile& destination)
{
    const int code = copyContent(source.get(), destination.fd.get());
    if (destination.created)
        (void)fchmod(destination.fd.get(), underUmask(NewFileMode)); // the content is what counts
    return code != FileOk ? code : closeWritten(destination.fd);
}

/// Opens the two files of a copy. Returns 0, 1 or 2.
int openCopy(const std::string& source, const std::string& destination, ScopedFd& in,
             WritableFile& out)
{
    in = openPath(source, O_RDONLY);
    if (!in.isOpen())
        return CannotOpenForReading;
    const int error = openForWriting(destination, Existing::Truncate, UnfinishedMode, out);
    return error == 0 ? FileOk : CannotOpenForWriting;
}

/// Copies a file with its owner, group, mode and attributes, as far as the running user can pass
/// them on, and writes the copy to the disk.
int copyForRestoring(const std::string& source, const std::string& destination)
{
    ScopedFd in(-1);
    WritableFile out;
    int code = openCopy(source, destination, in, out);
    if (code == FileOk)
        code = copyContent(in.get(), out.fd.get());
    if (code != FileOk)
        return code;
    struct stat status = {};
    if (!copyAttributes(in.get(), out.fd.get()) && fstat(in.get(), &status) == 0)
        (void)fchmod(out.fd.get(), status.st_mode & ACCESSPERMS); // the content is what counts
    const int error = syncFile(out.fd.get());
    return error == 0 ? closeWritten(out.fd) : writeErrorCode(error);
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

} // namespace

int copyFile(const std::string& source, const std::string& destination)
{
    ScopedFd in(-1);
    WritableFile out;
    const int code = openCopy(source, destination, in, out);
    return code != FileOk ? code : copyAndClose(in, out);
}

int backupCopy(FileTransaction& transaction, const std::string& path)
{
    const std::string backup = backupName(path);
    const int code = copyForRestoring(path, backup);
    if (code != FileOk) {
        (void)unlinkPath(backup); // a partial copy restores nothing
        return code;
    }
    record(transaction, BackedUp, path);
    record(transaction, Created, path);
    return FileOk;
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

int setFileMode(const std::string& path, mode_t mode)
{
    return changeMode(path, mode) == ModeChange::Changed ? FileOk : CannotChangeMode;
}

int setFileMode(FileTransaction& /*transaction*/, const std::string& path, mode_t mode)
{
    return setFileMode(path, mode);
}

int makeDirectory(const std::string& path, mode_t mode)
{
    return createDirectoryPath(path, mode != 0 ? mode : NewDirectoryMode);
}

int removeDirectory(const std::string& path)
{
    return removeDirectoryPath(path);
}

int createPath(FileTransaction& transaction, const std::string& path, mode_t mode)
{
    const ScopedDirectoryReuse reuse;
    // Mostly, all but the last few directories exist: from the deepest upwards, the first that is
    // there proves all above it in one system call.
    std::size_t slash = path.rfind('/');
    while (slash != std::string::npos && !isPlainDirectory(path.substr(0, slash)))
        slash = slash != 0 ? path.rfind('/', slash - 1) : std::string::npos;

    // Shallowest first, so that a rollback removes the deepest first.
    for (slash = path.find('/', slash + 1); slash != std::string::npos;
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
    const ScopedDirectoryReuse reuse;
    const int code = createPath(transaction, path, mode);
    if (code != FileOk || endsWithSlash(path))
        return code;
    return createIfMissing(transaction, path, mode);
}
