#include "file_writing.h"

#include "file_codes.h"
#include "scoped.h"

#include <cerrno>

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

int closeWritten(ScopedFd& file)
{
    return close(file.release()) == 0 ? FileOk : writeErrorCode(errno);
}
