// Time stamps as text.
//
// Only localTimeStamp() is used by the installer itself: it heads the file index. The
// others complete the set. All of them give texts in the "C" locale.
#pragma once

#include <cstddef>
#include <ctime>
#include <string>

/// Formats `t` (seconds since the epoch) as UTC with the strftime() format `format`.
///
/// All `size` bytes of `buffer` are set to 0 first. Returns 0, also if the text does not fit (the
/// buffer is then as the C library leaves it); -1 if `buffer` is null, `size` is 0 (nothing is
/// written) or `t` cannot be broken down.
[[nodiscard]] int formatUtcTime(std::time_t t, char* buffer, std::size_t size, const char* format);

/// formatUtcTime() as "2022-12-02,10:11:12".
[[nodiscard]] int formatUtcTimeComma(std::time_t t, char* buffer, std::size_t size);

/// formatUtcTime() as "2022-12-02T10:11:12".
[[nodiscard]] int formatUtcTimeIso(std::time_t t, char* buffer, std::size_t size);

/// formatUtcTime() as "2022-12-02-10:11:12.000000"; the fraction is always zero.
[[nodiscard]] int formatUtcTimeMicro(std::time_t t, char* buffer, std::size_t size);

/// Writes the UTC time as "20221202101112", "_" and a number derived from `t`.
///
/// `size` is only compared with 0: the whole text and its final NUL (at most 43 bytes) are always
/// written. Returns 0, or -1 as formatUtcTime().
[[nodiscard]] int formatUniqueStamp(std::time_t t, char* buffer, std::size_t size);

/// The current time in seconds since the epoch.
[[nodiscard]] std::time_t currentTime();

/// The local time now as "2022-12-02T10:11:12"; empty if it cannot be formatted.
[[nodiscard]] std::string localTimeStamp();
