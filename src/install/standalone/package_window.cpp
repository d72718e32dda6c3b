#include "package_window.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <utility>

#include <sys/stat.h>
#include <unistd.h>

namespace {

constexpr std::size_t SmallestRead = std::size_t{4} * 1024;
constexpr std::size_t LargestReadAhead = std::size_t{256} * 1024;

/// A gap that costs less to read than another system call. Between two entries there is a header.
constexpr std::int64_t SmallGap = 4096;

/// Whether the file goes on to `end`.
bool reaches(int fd, std::int64_t end)
{
    struct stat status = {};
    return fstat(fd, &status) == 0 && status.st_size >= end;
}

} // namespace

const unsigned char* PackageWindow::bytes(std::int64_t at, std::size_t size)
{
    if (!holds(at, size) && !moveTo(at, size))
        return nullptr;
    return buffer_.get() + (at - start_);
}

bool PackageWindow::holds(std::int64_t at, std::size_t size) const
{
    return buffer_ && at >= start_ && at - start_ <= static_cast<std::int64_t>(held_) &&
           size <= held_ - static_cast<std::size_t>(at - start_);
}

/// Moves the start of the window to `at`, keeps what is already read and reads the rest.
bool PackageWindow::moveTo(std::int64_t at, std::size_t size)
{
    // A header may claim any size: allocate only for data that exists.
    if (size > LargestReadAhead && !reaches(file_.get(), at + static_cast<std::int64_t>(size)))
        return false;

    const std::int64_t end = start_ + static_cast<std::int64_t>(held_);
    const bool goesOn = held_ != 0 && at >= start_ && at <= end + SmallGap;
    readAhead_ = goesOn ? std::min(2 * readAhead_, LargestReadAhead) : SmallestRead;
    const std::size_t wanted = std::max(size, readAhead_);

    const std::size_t kept = goesOn && at < end ? static_cast<std::size_t>(end - at) : 0;
    if (kept != 0)
        std::memmove(buffer_.get(), buffer_.get() + (at - start_), kept);
    start_ = at;
    held_ = kept;
    if (!makeRoom(wanted))
        return false;

    while (held_ < size) {
        const ssize_t count = pread(file_.get(), buffer_.get() + held_, wanted - held_,
                                    start_ + static_cast<std::int64_t>(held_));
        if (count <= 0)
            return false;
        held_ += static_cast<std::size_t>(count);
    }
    return true;
}

/// Resizes the buffer to `size` bytes and keeps its content.
bool PackageWindow::makeRoom(std::size_t size)
{
    if (size <= capacity_)
        return true;
    if (held_ == 0)
        buffer_.reset(); // first, so that the old and the new one never exist together
    std::unique_ptr<unsigned char[]> larger(new (std::nothrow) unsigned char[size]);
    if (!larger) {
        held_ = 0; // drop everything; the caller uses another way to read
        buffer_.reset();
        capacity_ = 0;
        return false;
    }
    if (held_ != 0)
        std::memcpy(larger.get(), buffer_.get(), held_);
    buffer_ = std::move(larger);
    capacity_ = size;
    return true;
}
