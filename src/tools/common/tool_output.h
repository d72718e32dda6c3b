// What a companion tool prints: messages to standard error, results to standard output.
#pragma once

#include "json_value.h"

#include <string>
#include <string_view>

/// The name that begins every message on standard error; set by main().
extern std::string toolName;

/// Prints `message` on standard error, behind the tool's name.
void complain(std::string_view message);

/// complain() of what the system answered about `path`: "spb: PATH: No such file or directory".
void complainOf(std::string_view path, int error);

/// Prints `value` on standard output, indented, with a newline.
void printJson(const Json& value);

/// To be called last: `status`, once all output is written.
///
/// A reader that has gone away ends with `trouble` in silence; output that could not be written,
/// on a full disk say, ends with `trouble` and a message that names `what`.
[[nodiscard]] int finishOutput(int status, int trouble, std::string_view what);
