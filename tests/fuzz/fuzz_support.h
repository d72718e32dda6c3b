// Helpers of the fuzz targets: untrusted bytes as a file, checks, and a bound on memory and time.
#pragma once

#include <cstddef>
#include <cstdint>
#include <ctime>
#include <string>

inline constexpr std::size_t KiB = 1024;

/// A file without a directory: it lives in memory and goes with the object.
class MemoryFile {
public:
    MemoryFile();
    MemoryFile(const MemoryFile&) = delete;
    MemoryFile& operator=(const MemoryFile&) = delete;
    ~MemoryFile();

    /// A path by which the file can be opened any number of times, for reading and writing.
    [[nodiscard]] const std::string& path() const { return path_; }

    /// Makes the file hold exactly these bytes.
    void write(const void* data, std::size_t size) const;

    /// The whole content.
    [[nodiscard]] std::string content() const;

private:
    int fd_;
    std::string path_;
};

/// Makes the input a finding, with `rule` as its headline, when `holds` is false.
void require(bool holds, const char* rule);

/// Makes the input a finding when, while this lives, the heap ever grows by more than `bytes`, or
/// when it has lived for more than `milliseconds` of processor time.
///
/// The limits of libFuzzer itself are the same for every input and its clock is that of the wall.
/// These are chosen by the input's size and do not depend on what else the machine does. Only one
/// lives at a time. An input that never ends is libFuzzer's to find.
class ResourceBound {
public:
    ResourceBound(std::size_t bytes, int milliseconds);
    ResourceBound(const ResourceBound&) = delete;
    ResourceBound& operator=(const ResourceBound&) = delete;
    ~ResourceBound();

private:
    std::clock_t end_;
};

/// Sends what the installer logs nowhere.
void silenceLog();
