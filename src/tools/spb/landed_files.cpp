#include "landed_files.h"

#include "package_layout.h"
#include "progress.h"
#include "property_file.h"
#include "sha256.h"
#include "shown_text.h"
#include "text.h"
#include "tool_output.h"

namespace {

constexpr std::size_t MostContent = std::size_t{1} << 20;

bool isPropertyFile(std::string_view place)
{
    return place.ends_with(".properties");
}

LandedFile landedFile(const PackageFile& package, std::size_t number, const std::string& place)
{
    const ZipEntry& entry = package.entries()[number];
    const HeaderDetails& details = package.details(number);
    LandedFile file;
    file.mode = installedMode(place);
    file.unixMode = details.unixMode & 07777;
    if (place.ends_with('/'))
        return file;

    Sha256 hash;
    const EntryContent content = package.readEntry(entry, [&](const char* data, std::size_t size) {
        hash.add(data, size);
        if (isPropertyFile(place) && file.content.size() < MostContent)
            file.content.append(data, size);
        return true;
    });
    file.size = content.delivered;
    file.sha256 = hash.finish();
    file.sound = content.opened && content.isSound(entry) && (details.flags & EncryptedFlag) == 0;
    return file;
}

} // namespace

LandedFiles landedFiles(const PackageFile& package)
{
    std::uint64_t total = 0;
    for (const ZipEntry& entry : package.entries())
        total += entry.uncompressedSize;
    Progress progress("reading", package.entries().size(), total);

    LandedFiles files;
    for (std::size_t i = 0; i < package.entries().size(); ++i) {
        const auto place = landingOf(package.entries()[i].name);
        if (place)
            files[*place] = landedFile(package, i, *place);
        progress.advance(package.entries()[i].uncompressedSize);
    }
    return files;
}

std::unique_ptr<PackageFile> openPackage(const std::string& path)
{
    Findings findings;
    int error = 0;
    auto package = PackageFile::open(path, findings, error);
    if (!package) {
        complainOf(path, error);
        return nullptr;
    }
    if (!package->entries().empty())
        return package;
    for (const Finding& finding : findings.kept())
        complain(shown(path) + ": " + finding.line());
    return nullptr;
}

std::map<std::string, std::string> propertiesOf(const std::string& content)
{
    std::map<std::string, std::string> properties;
    for (std::size_t at = 0; at < content.size();) {
        const std::size_t end = std::min(content.find('\n', at), content.size());
        const std::string line = content.substr(at, end - at);
        at = end + 1;
        const std::string key = keyOfLine(line);
        if (line.find('=') == std::string::npos || key.starts_with('#'))
            continue;
        std::string value = textAfterEquals(line);
        trim(value);
        properties[key] = value;
    }
    return properties;
}
