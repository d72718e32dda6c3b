#include "shown_text.h"

#include <algorithm>
#include <cstdint>
#include <iterator>

namespace {

struct Range {
    std::uint32_t first;
    std::uint32_t last;
};

/// Characters that do not show: controls, blanks other than the space, marks of direction, private
/// and unassigned ones. In ascending order.
constexpr Range Hidden[] = {
    {0x00, 0x1f},       {0x7f, 0xa0},       {0xad, 0xad},       {0x600, 0x605},
    {0x61c, 0x61c},     {0x6dd, 0x6dd},     {0x70f, 0x70f},     {0x115f, 0x1160},
    {0x1680, 0x1680},   {0x17b4, 0x17b5},   {0x180b, 0x180f},   {0x2000, 0x200f},
    {0x2028, 0x202f},   {0x205f, 0x206f},   {0x3000, 0x3000},   {0x3164, 0x3164},
    {0xd800, 0xf8ff},   {0xfdd0, 0xfdef},   {0xfe00, 0xfe0f},   {0xfeff, 0xfeff},
    {0xffa0, 0xffa0},   {0xfff0, 0xfffb},   {0xfffe, 0xffff},   {0x1bca0, 0x1bca3},
    {0x1d173, 0x1d17a}, {0x1fffe, 0x1ffff}, {0x2fffe, 0x2ffff}, {0x3fffe, 0x10ffff},
};

bool isHidden(std::uint32_t c)
{
    const auto* const range = std::find_if(std::begin(Hidden), std::end(Hidden),
                                           [&](const Range& r) { return c <= r.last; });
    return range != std::end(Hidden) && c >= range->first;
}

/// A character and the bytes that it takes; no bytes when they begin no valid character.
struct Decoded {
    std::uint32_t character = 0;
    std::size_t size = 0;
};

Decoded decode(std::string_view bytes)
{
    const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(bytes[i]); };
    const unsigned char first = byte(0);
    if (first < 0x80)
        return {first, 1};
    if (first < 0xc2 || first > 0xf4)
        return {};

    const std::size_t size = first < 0xe0 ? 2 : first < 0xf0 ? 3 : 4;
    if (bytes.size() < size)
        return {};
    std::uint32_t c = first & (0x7fu >> size);
    for (std::size_t i = 1; i < size; ++i) {
        if ((byte(i) & 0xc0) != 0x80)
            return {};
        c = c << 6 | (byte(i) & 0x3fu);
    }
    const std::uint32_t smallest[] = {0x80, 0x800, 0x10000};
    if (c < smallest[size - 2] || c > 0x10ffff || (c >= 0xd800 && c <= 0xdfff))
        return {};
    return {c, size};
}

std::string hex(std::uint32_t number, int digits)
{
    std::string text;
    for (int shift = 4 * (digits - 1); shift >= 0; shift -= 4)
        text += "0123456789abcdef"[number >> shift & 15];
    return text;
}

std::string escaped(std::uint32_t c)
{
    switch (c) {
    case '\t':
        return "\\t";
    case '\n':
        return "\\n";
    case '\r':
        return "\\r";
    default:
        return c <= 0xff ? "\\x" + hex(c, 2) : c <= 0xffff ? "\\u" + hex(c, 4) : "\\U" + hex(c, 8);
    }
}

/// `bytes` with what is not valid UTF-8 escaped, and what does not show if `hidden`.
std::string withEscapes(std::string_view bytes, bool hidden)
{
    std::string text;
    while (!bytes.empty()) {
        const Decoded next = decode(bytes);
        const std::size_t size = std::max<std::size_t>(next.size, 1);
        if (next.size == 0)
            text += "\\x" + hex(static_cast<unsigned char>(bytes[0]), 2);
        else if (hidden && isHidden(next.character))
            text += escaped(next.character);
        else
            text += bytes.substr(0, size);
        bytes.remove_prefix(size);
    }
    return text;
}

} // namespace

std::string shown(std::string_view bytes)
{
    return withEscapes(bytes, true);
}

std::string jsonText(std::string_view bytes)
{
    return withEscapes(bytes, false);
}

bool isUtf8(std::string_view bytes)
{
    while (!bytes.empty()) {
        const Decoded next = decode(bytes);
        if (next.size == 0)
            return false;
        bytes.remove_prefix(next.size);
    }
    return true;
}
