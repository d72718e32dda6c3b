// Real files for tests: a fresh directory, whole files in and out, and what the installer logs.
#pragma once

#include <sstream>
#include <string>
#include <vector>

#include <sys/types.h>

/// A fresh directory below the system's temporary one; deleted with everything in it at the end.
class TempDir {
public:
    TempDir();
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;
    ~TempDir();

    [[nodiscard]] const std::string& path() const { return path_; }

    /// The path of `name` in the directory.
    std::string operator/(const std::string& name) const { return path_ + "/" + name; }

private:
    std::string path_;
};

/// Makes the file at `path` hold exactly `content`; fails the test when it can't.
void writeFile(const std::string& path, const std::string& content);

/// The whole content of the file at `path`; fails the test when it can't be read.
std::string readFile(const std::string& path);

/// Creates `path` and every missing directory above it.
void makeDirectories(const std::string& path);

/// The permission bits of `path`, links followed; fails the test when there is nothing.
mode_t modeOf(const std::string& path);

/// Everything below `path` as sorted lines "d 0755 a/b", "f 0644 a/b/c", "l a/link".
std::vector<std::string> treeOf(const std::string& path);

/// Catches what goes to `logstream` while it lives.
class LogCapture {
public:
    LogCapture();
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;
    ~LogCapture();

    [[nodiscard]] std::string text() const { return stream_.str(); }

private:
    std::ostringstream stream_;
    std::ostream* previous_;
};
