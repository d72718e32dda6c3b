#include "sample_bytes.h"

#include <iterator>
#include <random>

std::string noiseBytes(std::size_t size, std::uint32_t seed)
{
    std::mt19937 random(seed);
    std::string bytes(size, '\0');
    std::uint32_t number = 0;
    for (std::size_t i = 0; i < size; ++i) {
        number = i % 4 == 0 ? static_cast<std::uint32_t>(random()) : number >> 8;
        bytes[i] = static_cast<char>(number & 0xFFU);
    }
    return bytes;
}

std::string textBytes(std::size_t size, std::uint32_t seed)
{
    static const char* const words[] = {"scanner",    "of ", "the hardware", "=",  "0",
                                        "\nproperty", ",",   "    ",         "\n", "volume "};
    std::mt19937 random(seed);
    std::string bytes;
    bytes.reserve(size + 32);
    while (bytes.size() < size) {
        if (random() % 64 == 0)
            bytes.append(random() % 1000, '-');
        bytes += words[random() % std::size(words)];
    }
    bytes.resize(size);
    return bytes;
}
