// The JSON that zorctl prints, and the pieces that its subcommands share.
//
// Every report is one object whose member "schema" is the number of its format. A member is added
// without a new number; one that changes its meaning or goes away raises it. The schemas are in the
// directory "schema".
#pragma once

#include "json_value.h"
#include "shown_text.h"

#include <string>

struct Installation;

/// `names` as a list of texts.
template <typename Names>
[[nodiscard]] Json textList(const Names& names)
{
    Json list = Json::array();
    for (const std::string& name : names)
        list.push_back(jsonText(name));
    return list;
}

/// The head of the report of the subcommand `command`: schema number, names of the program.
[[nodiscard]] Json reportHead(const char* command, int schema);

/// `found` as the member of a report. A value that could not be determined is "unknown", one that
/// does not apply is null.
[[nodiscard]] Json toJson(const Installation& found);
