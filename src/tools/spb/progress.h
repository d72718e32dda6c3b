// How far the work on a large tree or package has come, on a terminal.
#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <string>

/// Shows a percentage on standard error when that is a terminal and the work is large.
class Progress {
public:
    /// `doing` such as "packing"; the work is `count` entries of `total` bytes together.
    Progress(std::string doing, std::size_t count, std::uint64_t total);
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    /// Clears the line.
    ~Progress();

    void advance(std::uint64_t bytes);

private:
    std::string doing_;
    std::uint64_t total_;
    std::uint64_t done_ = 0;
    bool wanted_;
    std::chrono::steady_clock::time_point next_;
};
