// Comparing the files that the installer edits: property files and scripts.
//
// Placeholders are filled in, an upgrade adds, blanks and carries settings over: what it would have
// made of the packaged file is no change of the owner's.
#pragma once

#include <string>
#include <vector>

struct Installation;

/// Which of the edited files one is.
enum class EditedFile { None, MainProperties, TraceProperties, Script };

[[nodiscard]] EditedFile editedFile(const std::string& path, const std::string& home);

/// The keys in which `installed`, the content of the property file `kind` of `found`, differs from
/// what the installer makes of `packaged`: those with another value, new ones and missing ones.
[[nodiscard]] std::vector<std::string> changedSettings(const Installation& found, EditedFile kind,
                                                       const std::string& packaged,
                                                       const std::string& installed);

/// Whether the script `installed` is what the installer makes of `packaged`.
[[nodiscard]] bool isScriptUnchanged(const Installation& found, const std::string& packaged,
                                     const std::string& installed);
