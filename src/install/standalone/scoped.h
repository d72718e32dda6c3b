// Guards: what they hold is given back when they leave their scope.
//
// A file that was written is closed by name on the good road, since the last block can fail there:
// `release()` it to std::fclose() or close() and look at the answer.
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

/// Owns a stdio stream; null when none is open.
using ScopedFile = std::unique_ptr<std::FILE, FileCloser>;

/// Owns a directory stream; null when none is open.
using ScopedDir = std::unique_ptr<DIR, DirCloser>;

/// Owns a file descriptor; -1 when none is open.
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

    /// Gives the descriptor up: the caller closes it.
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
