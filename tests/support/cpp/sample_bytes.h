// Contents of any size for test files, the same on every machine and in every run.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>

/// Bytes without a pattern, which no method compresses.
std::string noiseBytes(std::size_t size, std::uint32_t seed);

/// Lines of words, which compress well: matches of every length, near and far.
std::string textBytes(std::size_t size, std::uint32_t seed);
