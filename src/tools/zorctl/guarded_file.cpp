#include "guarded_file.h"

#include "file_codes.h"
#include "file_writing.h"

#include <cerrno>

#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

ReadState stateOfError(int error)
{
    return error == ENOENT || error == ENOTDIR ? ReadState::Missing : ReadState::Unreadable;
}

} // namespace

GuardedText readGuarded(const std::string& path, std::size_t limit)
{
    // A FIFO is looked at, not opened: its writer would notice.
    struct stat status = {};
    if (stat(path.c_str(), &status) != 0)
        return {stateOfError(errno), {}};
    if (!S_ISREG(status.st_mode))
        return {ReadState::NotRegular, {}};
    const ScopedFd file(open(path.c_str(), O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    if (!file.isOpen())
        return {stateOfError(errno), {}};
    if (fstat(file.get(), &status) != 0)
        return {ReadState::Unreadable, {}};
    if (!S_ISREG(status.st_mode)) // exchanged since
        return {ReadState::NotRegular, {}};

    GuardedText result{ReadState::Read, {}};
    char block[16384];
    for (;;) {
        const ssize_t count = read(file.get(), block, sizeof block);
        if (count < 0)
            return {ReadState::Unreadable, {}};
        if (count == 0)
            return result;
        if (result.text.size() + static_cast<std::size_t>(count) > limit)
            return {ReadState::TooLarge, {}};
        result.text.append(block, static_cast<std::size_t>(count));
    }
}

const char* readStateName(ReadState state)
{
    switch (state) {
    case ReadState::Read:
        return "read";
    case ReadState::Missing:
        return "missing";
    case ReadState::Unreadable:
        return "unreadable";
    case ReadState::NotRegular:
        return "not-regular";
    case ReadState::TooLarge:
        return "too-large";
    }
    return "unreadable";
}

MemoryFile::MemoryFile(std::string_view bytes)
    : file_(memfd_create("zorctl", MFD_CLOEXEC)), path_("/proc/self/fd/none")
{
    if (file_.isOpen() && writeAll(file_.get(), bytes.data(), bytes.size()) == FileOk)
        path_ = "/proc/self/fd/" + std::to_string(file_.get());
}
