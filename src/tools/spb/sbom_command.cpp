#include "exit_status.h"
#include "landed_files.h"
#include "package_layout.h"
#include "sha256.h"
#include "shown_text.h"
#include "subcommands.h"
#include "tool_output.h"

namespace {

/// A name-based UUID: 128 bits of the digest, marked as a UUID of a kind of its own (version 8).
std::string uuidOf(const std::string& digest)
{
    std::string uuid = digest.substr(0, 32);
    uuid[12] = '8';
    uuid[16] = "89ab"[static_cast<unsigned char>(uuid[16]) & 3];
    for (const std::size_t at : {8U, 13U, 18U, 23U})
        uuid.insert(at, "-");
    return uuid;
}

Json sha256Hash(const std::string& digest)
{
    Json list = Json::array();
    list.push_back({{"alg", "SHA-256"}, {"content", digest}});
    return list;
}

} // namespace

int sbomCommand(const FileOptions& options)
{
    const auto package = openPackage(options.file);
    if (!package)
        return ToolTrouble;
    std::string digest;
    const int error = sha256OfFile(package->fd(), digest);
    if (error != 0) {
        complainOf(options.file, error);
        return ToolTrouble;
    }

    const LandedFiles files = landedFiles(*package);
    Json components = Json::array();
    for (const auto& [place, file] : files) {
        if (!place.ends_with('/'))
            components.push_back({{"type", "file"},
                                  {"bom-ref", shown(place)},
                                  {"name", shown(place)},
                                  {"hashes", sha256Hash(file.sha256)}});
    }
    Json toolkit = {{"type", "application"}, {"bom-ref", "package"}, {"name", "ZOR"}};
    const auto main = files.find(std::string(MainProperties));
    if (main != files.end()) {
        const auto properties = propertiesOf(main->second.content);
        const auto version = properties.find("version");
        if (version != properties.end())
            toolkit["version"] = shown(version->second);
    }
    toolkit["hashes"] = sha256Hash(digest);

    printJson({{"bomFormat", "CycloneDX"},
               {"specVersion", "1.5"},
               {"serialNumber", "urn:uuid:" + uuidOf(digest)},
               {"version", 1},
               {"metadata", {{"component", std::move(toolkit)}}},
               {"components", std::move(components)}});
    return ToolOk;
}
