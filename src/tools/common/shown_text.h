// Names and other foreign bytes as text that is safe to print.
#pragma once

#include <string>
#include <string_view>

/// `bytes` as valid UTF-8 on one line, for terminals and JSON.
///
/// What does not belong to a valid character becomes "\xff"; control characters become "\n",
/// "\x1b" and so on; characters that show nothing, change the direction of writing or are no
/// characters become "\u202e" or "\U000e0001". Everything else, the backslash too, stays as it is.
[[nodiscard]] std::string shown(std::string_view bytes);

/// `bytes` for JSON, which escapes control characters itself: only what is not valid UTF-8 becomes
/// "\xff", everything else stays as it is.
[[nodiscard]] std::string jsonText(std::string_view bytes);

/// True when `bytes` are valid UTF-8 as a whole.
[[nodiscard]] bool isUtf8(std::string_view bytes);
