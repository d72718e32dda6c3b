// Trimming, and lists of names held in one text.
//
// A name list frames each name with "|" on both sides: "|bin/a||bin/b|". It is searched as a text,
// so a name that itself holds "|" can match across two names.
#pragma once

#include <string>
#include <string_view>

/// The characters cut from keys and values: blank, tab, newline, carriage return.
inline const std::string Blanks = " \t\n\r";

/// Stands before and after every name of a name list.
inline const std::string ListSeparator = "|";

/// Cuts every leading and trailing character of Blanks, in place.
///
/// Deliberate: a text made only of blanks stays as it is; registries depend on it, since an empty
/// exploiter list reads back as one blank.
void trim(std::string& text);

/// Cuts every trailing character of Blanks, in place; a text made only of blanks becomes empty.
void trimRight(std::string& text);

/// Appends `name` in its frame to `list`.
void appendToNameList(std::string& list, std::string_view name);

/// True when `name` in its frame occurs in `list`.
[[nodiscard]] bool nameListContains(std::string_view list, std::string_view name);

/// What `line` holds before its first "=", trimmed; the whole line, trimmed, without one.
[[nodiscard]] std::string keyOfLine(const std::string& line);

/// What `line` holds after its first "=", as it stands; empty without one.
[[nodiscard]] std::string textAfterEquals(const std::string& line);

/// Replaces the first `old` in `text` by `replacement`, from the start of the text again and again,
/// until there is none; returns the number of replacements. `old` must not be empty and not occur
/// in `replacement`: that would never end.
int replaceEach(std::string& text, const std::string& old, const std::string& replacement);
