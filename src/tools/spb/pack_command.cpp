#include "archive_writer.h"
#include "checker.h"
#include "exit_status.h"
#include "package_layout.h"
#include "shown_text.h"
#include "source_tree.h"
#include "subcommands.h"
#include "temporary_file.h"
#include "tool_output.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <climits>
#include <cstdlib>
#include <ctime>
#include <numeric>

#include <fcntl.h>
#include <sched.h>
#include <unistd.h>

namespace {

/// DOS time and date of SOURCE_DATE_EPOCH (UTC), or of the format's first day without it. False
/// when it is no number.
bool takeStamp(ArchiveOptions& options)
{
    constexpr std::time_t first = 315532800; // 1980-01-01 00:00:00
    const char* const text = std::getenv("SOURCE_DATE_EPOCH");
    if (text == nullptr)
        return true;
    const std::string digits(text);
    if (digits.empty() || digits.find_first_not_of("0123456789") != std::string::npos) {
        complain("SOURCE_DATE_EPOCH is no number of seconds: " + shown(digits));
        return false;
    }
    std::int64_t seconds = 0;
    constexpr std::int64_t last = 4354819198; // 2107-12-31 23:59:58
    if (std::from_chars(digits.data(), digits.data() + digits.size(), seconds).ec != std::errc())
        seconds = last;
    const auto moment = static_cast<std::time_t>(std::clamp<std::int64_t>(seconds, first, last));
    std::tm fields = {};
    (void)gmtime_r(&moment, &fields);
    options.time =
        static_cast<std::uint16_t>(fields.tm_hour << 11 | fields.tm_min << 5 | fields.tm_sec / 2);
    options.date = static_cast<std::uint16_t>((fields.tm_year - 80) << 9 |
                                              (fields.tm_mon + 1) << 5 | fields.tm_mday);
    return true;
}

unsigned processors()
{
    cpu_set_t set;
    if (sched_getaffinity(0, sizeof set, &set) != 0)
        return 1;
    return static_cast<unsigned>(std::clamp(CPU_COUNT(&set), 1, 64));
}

/// The path without links, as far as it exists; with a slash at its end.
std::string realDirectory(const std::string& path)
{
    char resolved[PATH_MAX];
    return realpath(path.c_str(), resolved) == nullptr ? "" : std::string(resolved) + "/";
}

/// Whether `output` is in one of the directories that are packed.
bool isInside(const std::string& output, const std::string& tree, const SourceTree& found)
{
    const std::size_t slash = output.rfind('/');
    const std::string parent =
        realDirectory(slash == std::string::npos ? "." : output.substr(0, slash + 1));
    return std::any_of(found.directories.begin(), found.directories.end(),
                       [&](const std::string& name) {
                           const std::string dir = realDirectory(tree + "/" + name);
                           return !dir.empty() && parent.starts_with(dir);
                       });
}

std::string absolute(const std::string& path)
{
    char directory[PATH_MAX];
    if (path.starts_with('/') || path == "-" || getcwd(directory, sizeof directory) == nullptr)
        return path;
    return std::string(directory) + "/" + path;
}

/// Entries as the installer will read them from the package that is made of `sources`.
std::vector<ZipEntry> plannedEntries(const std::vector<Source>& sources)
{
    std::vector<ZipEntry> entries;
    for (const Source& source : sources) {
        ZipEntry& entry = entries.emplace_back();
        entry.name = imageRoot() + source.relative;
        entry.uncompressedSize = entry.compressedSize = static_cast<std::uint32_t>(source.size);
        entry.method = Stored;
    }
    return entries;
}

/// Gives the check what it looks into of a file that is about to be packed; the rest is taken to be
/// what it is.
EntryContent readSource(const Source& source, const ZipEntry& entry, const ContentSink& sink)
{
    EntryContent content;
    content.opened = true;
    content.delivered = entry.uncompressedSize;
    content.crc = entry.crc32;
    if (!hasPlaceholders(source.relative))
        return content;
    const ScopedFd file(open(source.path.c_str(), O_RDONLY | O_CLOEXEC));
    std::vector<char> beginning(std::size_t{1} << 20);
    const ssize_t count = file.isOpen() ? read(file.get(), beginning.data(), beginning.size()) : 0;
    if (count > 0)
        (void)sink(beginning.data(), static_cast<std::size_t>(count));
    return content;
}

/// Checks what is going to be packed. True when it can be installed.
bool checkSources(const std::vector<Source>& sources, const PackOptions& options)
{
    Findings findings({options.accepted.begin(), options.accepted.end()});
    const std::vector<ZipEntry> entries = plannedEntries(sources);
    Checker checker(
        entries, [](std::size_t) { return HeaderDetails(); },
        [&](std::size_t number, const ContentSink& sink) {
            return readSource(sources[number], entries[number], sink);
        },
        findings);
    const int error = checker.run(false);
    for (const Finding& finding : findings.kept())
        complain(finding.line());
    if (error != 0)
        complainOf(options.tree, error);
    return error == 0 && findings.worst().value_or(Kind::Surprises) == Kind::Surprises;
}

int failed(const std::string& path, int error)
{
    complainOf(path, error);
    return ToolDiffers;
}

int writePackage(const std::vector<Source>& sources, const ArchiveOptions& archive,
                 const std::string& output)
{
    TemporaryFile file;
    int error = file.create(output);
    if (error != 0)
        return failed(output, error);
    ArchiveFailure failure;
    if (!writeArchive(file.fd(), sources, archive, failure)) {
        const std::string& path = failure.path.empty() ? output : failure.path;
        if (failure.error != 0)
            return failed(path, failure.error);
        complain(failure.path.empty() ? failure.reason : shown(path) + ": " + failure.reason);
        return ToolDiffers;
    }
    error = file.commit();
    if (error == EPIPE && output == "-") // whoever read it has seen enough
        return ToolDiffers;
    return error == 0 ? static_cast<int>(ToolOk) : failed(output, error);
}

} // namespace

int packCommand(const PackOptions& options)
{
    ArchiveOptions archive;
    archive.stored = options.stored;
    archive.threads = processors();

    SourceTree found;
    std::string unreadable;
    const int error = findSources(options.tree, found, unreadable);
    if (error != 0)
        return failed(unreadable, error);
    const std::string output = absolute(options.output);
    if (output != "-" && isInside(output, options.tree, found)) {
        complain(shown(output) + ": is inside a directory that is packed");
        return ToolDiffers;
    }
    if (!found.directories.empty()) {
        for (const std::string& name : found.leftOut)
            complain("note: " + shown(name) + " is no package directory and is left out");
    }
    const std::uint64_t total =
        std::accumulate(found.sources.begin(), found.sources.end(), std::uint64_t{0},
                        [](std::uint64_t sum, const Source& source) { return sum + source.size; });
    if (options.stored && total >= SizeLimit)
        found.reasons.emplace_back(PackageTooLarge); // known now; else while it is written
    for (const std::string& reason : found.reasons)
        complain(reason);
    if (!found.reasons.empty() || !takeStamp(archive))
        return ToolDiffers;
    if (!checkSources(found.sources, options))
        return ToolDiffers;
    return writePackage(found.sources, archive, output);
}
