#include "exit_status.h"
#include "landed_files.h"
#include "package_layout.h"
#include "shown_text.h"
#include "subcommands.h"
#include "tool_output.h"

#include <iostream>
#include <set>

namespace {

/// One difference: "added", "removed", "changed" or "mode" of a place; or of a key in a property
/// file.
struct Difference {
    std::string what;
    std::string place;
    std::string key;
    std::string from;
    std::string to;
};

void compareKeys(const std::string& place, const LandedFile& from, const LandedFile& to,
                 std::vector<Difference>& differences)
{
    const auto old = propertiesOf(from.content);
    const auto now = propertiesOf(to.content);
    std::set<std::string> keys;
    for (const auto* const properties : {&old, &now}) {
        for (const auto& [key, value] : *properties)
            keys.insert(key);
    }
    for (const std::string& key : keys) {
        const auto was = old.find(key);
        const auto is = now.find(key);
        if (was == old.end())
            differences.push_back({"key-added", place, key, "", is->second});
        else if (is == now.end())
            differences.push_back({"key-removed", place, key, was->second, ""});
        else if (was->second != is->second)
            differences.push_back({"key-changed", place, key, was->second, is->second});
    }
}

std::vector<Difference> compare(const LandedFiles& from, const LandedFiles& to)
{
    std::vector<Difference> differences;
    std::set<std::string> places;
    for (const auto* const files : {&from, &to}) {
        for (const auto& [place, file] : *files)
            places.insert(place);
    }
    for (const std::string& place : places) {
        const auto was = from.find(place);
        const auto is = to.find(place);
        if (was == from.end()) {
            differences.push_back({"added", place, "", "", std::to_string(is->second.size)});
            continue;
        }
        if (is == to.end()) {
            differences.push_back({"removed", place, "", std::to_string(was->second.size), ""});
            continue;
        }
        if (was->second.sha256 != is->second.sha256) {
            differences.push_back({"changed", place, "", std::to_string(was->second.size),
                                   std::to_string(is->second.size)});
            compareKeys(place, was->second, is->second, differences);
        }
        if (was->second.unixMode != is->second.unixMode)
            differences.push_back(
                {"mode", place, "", octal(was->second.unixMode), octal(is->second.unixMode)});
    }
    return differences;
}

std::string lineOf(const Difference& difference)
{
    std::string line = difference.what + ": " + shown(difference.place);
    if (!difference.key.empty())
        line += ": " + shown(difference.key);
    if (difference.what == "added" || difference.what == "removed")
        return line;
    if (difference.what == "key-added")
        return line + "=" + shown(difference.to);
    if (difference.what == "key-removed")
        return line + "=" + shown(difference.from);
    return line + ": " + shown(difference.from) + " -> " + shown(difference.to);
}

Json asJson(const Difference& difference)
{
    Json json = {{"what", difference.what}, {"place", shown(difference.place)}};
    if (!difference.key.empty())
        json["key"] = shown(difference.key);
    json["from"] = shown(difference.from);
    json["to"] = shown(difference.to);
    return json;
}

} // namespace

int diffCommand(const DiffOptions& options)
{
    const auto from = openPackage(options.from);
    const auto to = openPackage(options.to);
    if (!from || !to)
        return ToolTrouble;
    const auto differences = compare(landedFiles(*from), landedFiles(*to));
    if (options.json) {
        Json list = Json::array();
        for (const Difference& difference : differences)
            list.push_back(asJson(difference));
        printJson({{"from", shown(options.from)},
                   {"to", shown(options.to)},
                   {"differences", std::move(list)}});
    } else {
        for (const Difference& difference : differences)
            std::cout << lineOf(difference) << '\n';
    }
    return differences.empty() ? ToolOk : ToolDiffers;
}
