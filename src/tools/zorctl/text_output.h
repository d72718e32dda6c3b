// How names and values are shown: on one line, without control characters.
//
// Names come from other users' files and from packages. A newline could forge a line of a report,
// an escape sequence could drive the administrator's terminal.
#pragma once

#include <string>
#include <string_view>

/// `bytes` for a line of text: control characters and what is not UTF-8 as "\n", "\t", "\r" or
/// "\xNN". A backslash stays as it is, so that both functions can be applied one after the other.
[[nodiscard]] std::string shown(std::string_view bytes);

/// `bytes` for a JSON string, which must be UTF-8: bytes that are not become "\xNN". Control
/// characters stay: JSON escapes them itself.
[[nodiscard]] std::string jsonText(std::string_view bytes);

/// `text` in single quotes, so that a shell takes it as one word.
[[nodiscard]] std::string shellQuoted(std::string_view text);

/// True when standard output is a terminal that may be coloured: NO_COLOR is unset or empty, and
/// TERM is not "dumb".
[[nodiscard]] bool outputIsColoured();

/// `text` in the ANSI colour `code` (31 red, 32 green, 33 yellow) if the output is coloured.
[[nodiscard]] std::string coloured(std::string_view text, int code);
