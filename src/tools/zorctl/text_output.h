// How zorctl prints words for shells and for terminals.
#pragma once

#include <string>
#include <string_view>

/// `text` in single quotes, so that a shell takes it as one word.
[[nodiscard]] std::string shellQuoted(std::string_view text);

/// True when standard output is a terminal that may be coloured: NO_COLOR is unset or empty, and
/// TERM is not "dumb".
[[nodiscard]] bool outputIsColoured();

/// `text` in the ANSI colour `code` (31 red, 32 green, 33 yellow) if the output is coloured.
[[nodiscard]] std::string coloured(std::string_view text, int code);
