#include "text_output.h"

#include <cstdio>
#include <cstdlib>

#include <unistd.h>

namespace {

std::string escapedByte(unsigned char byte)
{
    char text[5];
    (void)std::snprintf(text, sizeof text, "\\x%02x", byte);
    return text;
}

/// How many bytes the UTF-8 character at `at` has; 0 for anything that is not a valid one.
std::size_t utf8Length(std::string_view bytes, std::size_t at)
{
    const auto byte = [&](std::size_t i) { return static_cast<unsigned char>(bytes[i]); };
    const unsigned char first = byte(at);
    if (first < 0x80)
        return 1;
    const std::size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
    if (first < 0xC2 || first > 0xF4 || at + length > bytes.size())
        return 0;
    // Overlong forms, surrogates and what is beyond the last character differ in the second byte.
    const unsigned char least = first == 0xE0 ? 0xA0 : first == 0xF0 ? 0x90 : 0x80;
    const unsigned char most = first == 0xED ? 0x9F : first == 0xF4 ? 0x8F : 0xBF;
    if (byte(at + 1) < least || byte(at + 1) > most)
        return 0;
    for (std::size_t i = 2; i < length; ++i) {
        if ((byte(at + i) & 0xC0) != 0x80)
            return 0;
    }
    return length;
}

/// True for C0 and C1 control characters, the character `character` being valid UTF-8.
bool isControl(std::string_view character)
{
    const auto first = static_cast<unsigned char>(character[0]);
    if (character.size() == 1)
        return first < 0x20 || first == 0x7F;
    return first == 0xC2 && static_cast<unsigned char>(character[1]) < 0xA0;
}

std::string escapedControl(std::string_view character)
{
    switch (character[0]) {
    case '\n':
        return "\\n";
    case '\t':
        return "\\t";
    case '\r':
        return "\\r";
    default:
        break;
    }
    std::string text;
    for (const char c : character)
        text += escapedByte(static_cast<unsigned char>(c));
    return text;
}

std::string withEscapes(std::string_view bytes, bool forTerminal)
{
    std::string text;
    for (std::size_t at = 0; at < bytes.size();) {
        const std::size_t length = utf8Length(bytes, at);
        if (length == 0) {
            text += escapedByte(static_cast<unsigned char>(bytes[at++]));
            continue;
        }
        const std::string_view character = bytes.substr(at, length);
        if (forTerminal && isControl(character))
            text += escapedControl(character);
        else
            text += character;
        at += length;
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

std::string shellQuoted(std::string_view text)
{
    std::string quoted = "'";
    for (const char c : text) {
        if (c == '\'')
            quoted += "'\\''";
        else
            quoted += c;
    }
    return quoted + "'";
}

bool outputIsColoured()
{
    const char* const refused = std::getenv("NO_COLOR");
    if (refused != nullptr && *refused != '\0')
        return false;
    const char* const terminal = std::getenv("TERM");
    return isatty(STDOUT_FILENO) == 1 && terminal != nullptr &&
           std::string_view(terminal) != "dumb";
}

std::string coloured(std::string_view text, int code)
{
    static const bool wanted = outputIsColoured();
    if (!wanted)
        return std::string(text);
    return "\033[" + std::to_string(code) + "m" + std::string(text) + "\033[0m";
}
