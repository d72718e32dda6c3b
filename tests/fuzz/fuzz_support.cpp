#include "fuzz_support.h"

#include "settings.h"

#include <cstdio>
#include <cstdlib>
#include <ostream>

#include <sanitizer/allocator_interface.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

/// How much more the heap may grow; checked only while a ResourceBound exists.
std::ptrdiff_t heapAllowance = 0;
bool heapIsBounded = false;

void countAllocation(const volatile void* /*block*/, std::size_t size)
{
    if (!heapIsBounded)
        return;
    heapAllowance -= static_cast<std::ptrdiff_t>(size);
    require(heapAllowance >= 0, "memory stays in proportion to the input");
}

void countRelease(const volatile void* block)
{
    if (heapIsBounded && block != nullptr)
        heapAllowance += static_cast<std::ptrdiff_t>(
            __sanitizer_get_allocated_size(const_cast<const void*>(block)));
}

} // namespace

MemoryFile::MemoryFile()
    : fd_(memfd_create("input", MFD_CLOEXEC)), path_("/proc/self/fd/" + std::to_string(fd_))
{
    require(fd_ >= 0, "a file in memory can be made");
}

MemoryFile::~MemoryFile()
{
    (void)close(fd_);
}

void MemoryFile::write(const void* data, std::size_t size) const
{
    const bool written =
        ftruncate(fd_, 0) == 0 && pwrite(fd_, data, size, 0) == static_cast<ssize_t>(size);
    require(written, "the file in memory can be written");
}

std::string MemoryFile::content() const
{
    struct stat status = {};
    require(fstat(fd_, &status) == 0, "the file in memory has a size");
    std::string bytes(static_cast<std::size_t>(status.st_size), '\0');
    const ssize_t count = pread(fd_, bytes.data(), bytes.size(), 0);
    require(count == status.st_size, "the file in memory can be read");
    return bytes;
}

void require(bool holds, const char* rule)
{
    if (holds)
        return;
    heapIsBounded = false; // what follows reports
    (void)std::fprintf(stderr, "BROKEN RULE: %s\n", rule);
    std::abort();
}

ResourceBound::ResourceBound(std::size_t bytes, int milliseconds)
    : end_(std::clock() + milliseconds * (CLOCKS_PER_SEC / 1000))
{
    static const int hooked =
        __sanitizer_install_malloc_and_free_hooks(countAllocation, countRelease);
    require(hooked != 0, "allocations can be counted");
    heapAllowance = static_cast<std::ptrdiff_t>(bytes);
    heapIsBounded = true;
}

ResourceBound::~ResourceBound()
{
    heapIsBounded = false;
    require(std::clock() <= end_, "time stays in proportion to the input");
}

void silenceLog()
{
    static std::ostream nowhere(nullptr);
    logstream = &nowhere;
}
