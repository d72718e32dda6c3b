#include "file_writing.h"

#include "file_codes.h"
#include "scoped.h"

#include <cerrno>

#include <unistd.h>

int writeAll(int fd, const void* data, std::size_t size)
{
    const auto* rest = static_cast<const char*>(data);
    while (size != 0) {
        const ssize_t count = write(fd, rest, size);
        if (count <= 0)
            return writeErrorCode(count < 0 ? errno : EIO);
        rest += count;
        size -= static_cast<std::size_t>(count);
    }
    return FileOk;
}

int syncFile(int fd)
{
    if (fsync(fd) == 0 || errno == EINVAL || errno == EROFS || errno == ENOTSUP)
        return 0;
    return errno;
}

int closeWritten(ScopedFd& file)
{
    return close(file.release()) == 0 ? FileOk : writeErrorCode(errno);
}
