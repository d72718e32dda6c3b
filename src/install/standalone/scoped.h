// Guards that release a resource at the end of their scope.
//
// On success, a file that was written is closed explicitly, since writing the last block can fail
// then: pass `release()` to std::fclose() or close() and check the result.
#pragma once

#include <cstdio>
#include <memory>
#include <utility>

#include <dirent.h>
#include <sys/stat.h>
#include <unistd.h>

struct FileCloser {
    void operator()(std::FILE* file) const { (void)std::fclose(file); }
};
struct DirCloser {
    void operator()(DIR* dir) const { (void)closedir(dir); }
};

/// Owns a stdio stream; null if none is open.
using ScopedFile = std::unique_ptr<std::FILE, FileCloser>;

/// Owns a directory stream; null if none is open.
using ScopedDir = std::unique_ptr<DIR, DirCloser>;

/// Owns a file descriptor; -1 if none is open.
class ScopedFd {
public:
    explicit ScopedFd(int fd) : fd_(fd) {}
    ScopedFd(ScopedFd&& other) noexcept : fd_(other.release()) {}
    ScopedFd(const ScopedFd&) = delete;
    ScopedFd& operator=(const ScopedFd&) = delete;
    ScopedFd& operator=(ScopedFd&& other) noexcept
    {
        std::swap(fd_, other.fd_);
        return *this;
    }
    ~ScopedFd()
    {
        if (isOpen())
            (void)::close(fd_);
    }

    [[nodiscard]] bool isOpen() const { return fd_ >= 0; }
    [[nodiscard]] int get() const { return fd_; }

    /// Gives up the descriptor: the caller closes it.
    [[nodiscard]] int release() { return std::exchange(fd_, -1); }

private:
    int fd_;
};

/// Sets the process umask and restores the previous one.
class ScopedUmask {
public:
    explicit ScopedUmask(mode_t mask) : previous_(umask(mask)) {}
    ScopedUmask(const ScopedUmask&) = delete;
    ScopedUmask& operator=(const ScopedUmask&) = delete;
    ~ScopedUmask() { (void)umask(previous_); }

private:
    mode_t previous_;
};
