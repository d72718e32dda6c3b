// Property files: text files of key=value lines, held as the list of their lines.
//
// Every operation works on the lines in place, so comments, blank lines, order and unknown keys
// survive a load and save untouched. The key of a line is the text before its first "=", trimmed;
// its value the text after it, trimmed; keys are compared exactly. For findLine() and the
// operations that set or clear, a line without "=" is a key as a whole. Files have a few hundred
// lines, so every operation is a plain scan.
#pragma once

#include <functional>
#include <string>
#include <vector>

struct PropertyFile {
    std::vector<std::string> lines; ///< without their newlines, otherwise as read

    /// Replaces `lines` by those of the file at `path`. Returns 0, or the `errno` of a failure,
    /// which is logged and leaves `lines` empty. A directory loads as no lines.
    [[nodiscard]] int load(const std::string& path);

    /// Replaces the file at `path` by the lines, each with a newline (replaceFile()). Returns 0, or
    /// the `errno` of a failed open, which is logged.
    ///
    /// Deliberate: a failing write is not reported. The file then keeps its old content.
    [[nodiscard]] int save(const std::string& path) const;

    /// The value of the first line with "=" whose key is `key`; empty if there is none.
    [[nodiscard]] std::string getValue(const std::string& key) const;

    /// The last line whose key is `key`, or null. It belongs to `lines`.
    [[nodiscard]] std::string* findLine(const std::string& key);
    [[nodiscard]] const std::string* findLine(const std::string& key) const;

    /// Makes every line whose key is `key` into `key`=`value`; returns their number. A missing line
    /// is not added.
    int setValue(const std::string& key, const std::string& value);

    /// As setValue(), for every line whose key contains `fragment`; each keeps its own key.
    int setValueWhereKeyContains(const std::string& fragment, const std::string& value);

    /// Replaces every line whose key contains `fragment` by an empty line; returns their number.
    int clearWhereKeyContains(const std::string& fragment);

    /// Replaces `old` by `replacement` in every line, as replaceEach() of text.h does; returns the
    /// number of replacements.
    int replaceText(const std::string& old, const std::string& replacement);

    /// Prints the lines on standard output. A diagnostic aid; no flow calls it.
    void dump() const;
};

/// Changes the lines of a property file.
using PropertyEdit = std::function<void(PropertyFile&)>;

/// Loads the property file at `path`, calls `edit` and saves the file. Returns 0 or the `errno` of
/// what failed, which is logged: if loading failed, `edit` was not called; in both cases the file
/// is unchanged.
[[nodiscard]] int editPropertyFile(const std::string& path, const PropertyEdit& edit);

/// editPropertyFile(), logged as a customization.
[[nodiscard]] int customizePropertyFile(const std::string& path, const PropertyEdit& edit);
