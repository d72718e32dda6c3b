#include "progress.h"

#include "tool_output.h"

#include <algorithm>
#include <iostream>

#include <unistd.h>

namespace {

constexpr std::size_t ManyEntries = 1000;
constexpr std::uint64_t ManyBytes = std::uint64_t{64} << 20;
constexpr std::chrono::milliseconds Interval{100};
constexpr const char* ClearToEnd = "\033[K";

} // namespace

Progress::Progress(std::string doing, std::size_t count, std::uint64_t total)
    : doing_(std::move(doing)), total_(total),
      wanted_((count >= ManyEntries || total >= ManyBytes) && isatty(STDERR_FILENO) == 1)
{
}

Progress::~Progress()
{
    if (wanted_)
        std::cerr << '\r' << ClearToEnd << std::flush;
}

void Progress::advance(std::uint64_t bytes)
{
    done_ += bytes;
    const auto now = std::chrono::steady_clock::now();
    if (!wanted_ || now < next_)
        return;
    next_ = now + Interval;
    std::cerr << '\r' << toolName << ": " << doing_ << ", "
              << 100 * done_ / std::max<std::uint64_t>(total_, 1) << " %" << ClearToEnd
              << std::flush;
}
