#include "descriptors.h"

#include "scoped.h"

#include <cstdlib>

#include <dirent.h>
#include <fcntl.h>
#include <linux/close_range.h>
#include <unistd.h>

namespace {

constexpr int FirstPrivate = 3;

/// Fallback for systems where close_range() cannot set the flag: before Linux 5.11.
void closeOnExecOneByOne()
{
    const ScopedDir open(opendir("/proc/self/fd"));
    if (!open)
        return;
    while (const dirent* entry = readdir(open.get())) {
        const long fd = std::strtol(entry->d_name, nullptr, 10); // 0 for "." and ".."
        if (fd >= FirstPrivate)
            (void)fcntl(static_cast<int>(fd), F_SETFD,
                        FD_CLOEXEC); // it is open, so this cannot fail
    }
}

} // namespace

void openStandardDescriptors()
{
    for (int fd = 0; fd < FirstPrivate; ++fd) {
        // Takes the lowest free number, which is `fd`.
        if (fcntl(fd, F_GETFD) < 0)
            (void)open("/dev/null", O_RDWR); // if this fails, writes fail as before
    }
}

void secureDescriptors()
{
    openStandardDescriptors();
    if (close_range(FirstPrivate, ~0U, CLOSE_RANGE_CLOEXEC) != 0)
        closeOnExecOneByOne();
}
