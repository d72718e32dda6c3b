#include "exit_status.h"
#include "landed_files.h"
#include "package_layout.h"
#include "shown_text.h"
#include "subcommands.h"
#include "tool_output.h"

#include <algorithm>
#include <iomanip>
#include <iostream>

namespace {

constexpr const char* PassedOver = "(passed over)";

/// The number of characters of a valid UTF-8 text.
std::size_t lengthOf(const std::string& text)
{
    return static_cast<std::size_t>(
        std::count_if(text.begin(), text.end(), [](char c) { return (c & 0xc0) != 0x80; }));
}

void printText(const PackageFile& package)
{
    constexpr const char* heading = "lands at";
    std::size_t width = std::string_view(heading).size();
    std::vector<std::string> places;
    for (const ZipEntry& entry : package.entries()) {
        const auto place = landingOf(entry.name);
        places.push_back(place ? shown(*place) : PassedOver);
        width = std::max(width, lengthOf(places.back()));
    }

    std::cout << "mode        size  " << heading << std::string(width - 8, ' ') << "  entry\n";
    for (std::size_t i = 0; i < places.size() && std::cout; ++i) {
        const ZipEntry& entry = package.entries()[i];
        const auto place = landingOf(entry.name);
        std::cout << (place ? octal(installedMode(*place)) : "   -") << "  " << std::setw(10)
                  << entry.uncompressedSize << "  " << places[i]
                  << std::string(width - lengthOf(places[i]), ' ') << "  " << shown(entry.name)
                  << '\n';
    }
}

void printAsJson(const std::string& file, const PackageFile& package)
{
    Json entries = Json::array();
    for (const ZipEntry& entry : package.entries()) {
        const auto place = landingOf(entry.name);
        entries.push_back({{"name", shown(entry.name)},
                           {"place", place ? Json(shown(*place)) : Json()},
                           {"mode", place ? Json(octal(installedMode(*place))) : Json()},
                           {"size", entry.uncompressedSize}});
    }
    printJson({{"file", shown(file)}, {"entries", std::move(entries)}});
}

} // namespace

int listCommand(const FileOptions& options)
{
    const auto package = openPackage(options.file);
    if (!package)
        return ToolDiffers; // as it has always been
    if (options.json)
        printAsJson(options.file, *package);
    else
        printText(*package);
    return ToolOk;
}
