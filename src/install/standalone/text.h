// Trimming, and lists of names held in one text.
//
// In a name list each name has a "|" on both sides: "|bin/a||bin/b|". It is searched as a text,
// so a name that contains "|" can match across two names.
#pragma once

#include <string>
#include <string_view>

/// The characters that are trimmed from keys and values: blank, tab, newline, carriage return.
inline const std::string Blanks = " \t\n\r";

/// Precedes and follows every name of a name list.
inline const std::string ListSeparator = "|";

/// Removes every leading and trailing character of Blanks, in place.
///
/// Deliberate: a text of nothing but blanks is not changed. Registries depend on it: an empty
/// exploiter list reads back as one blank.
void trim(std::string& text);

/// Removes every trailing character of Blanks, in place; a text of nothing but blanks becomes
/// empty.
void trimRight(std::string& text);

/// Appends `name` between two separators to `list`.
void appendToNameList(std::string& list, std::string_view name);

/// True if `name` between two separators occurs in `list`.
[[nodiscard]] bool nameListContains(std::string_view list, std::string_view name);

/// The text before the first "=" of `line`, trimmed; without "=", the whole line, trimmed.
[[nodiscard]] std::string keyOfLine(const std::string& line);

/// The text after the first "=" of `line`, unchanged; empty without "=".
[[nodiscard]] std::string textAfterEquals(const std::string& line);

/// Replaces `old` by `replacement` until it does not occur in `text` any more; every search starts
/// at the beginning. Returns the number of replacements. `old` must not be empty or occur in
/// `replacement`: that would never end.
int replaceEach(std::string& text, const std::string& old, const std::string& replacement);
