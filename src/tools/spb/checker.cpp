#include "checker.h"

#include "package_layout.h"
#include "paths.h"
#include "progress.h"
#include "settings.h"
#include "shown_text.h"
#include "template_variables.h"

#include <algorithm>
#include <cerrno>
#include <numeric>

#include <sys/stat.h>

namespace {

constexpr std::string_view DefaultHome = "/opt/corvan/zor/";
constexpr std::size_t LongestIndexLine = 1023;         // the removal reads the index in such pieces
constexpr std::size_t Searched = std::size_t{1} << 20; // bytes of a file with placeholders

constexpr std::string_view ScannerControl = "bin/trawlcfg";
constexpr std::string_view FileScanner = "bin/trawlfs";
constexpr std::string_view Scripts[] = {"install/trawlcfg.sh", "install/rmdirs.sh"};

struct InstallerFile {
    std::string_view place;
    std::string_view text;
};
constexpr InstallerFile InstallerFiles[] = {
    {"install/zor_install.properties",
     "the installer writes this file itself, over the packed one"},
    {"config/SingleUserMode", "the next installation over this one runs in single-user mode"},
};

/// What the installer fills in: in a fresh installation, and in upgrades only.
struct FileWithPlaceholders {
    std::string_view place;
    std::vector<std::string> wanted;
    std::vector<std::string> alsoKnown;
    bool isScript; ///< "$(" begins the shell's own substitutions there
};

const std::vector<FileWithPlaceholders>& filesWithPlaceholders()
{
    static const std::vector<FileWithPlaceholders> files = {
        {MainProperties,
         {tokenZorDestDir, tokenZorCfgRoot, tokenFileSeparator, tokenScannerMode},
         {tokenCorvanCommonDir},
         false},
        {TraceProperties, {tokenZorDestDir, tokenZorCfgRoot}, {}, false},
        {Scripts[0], {tokenZorDestDir, tokenZorCfgRoot, tokenCorvanCommonDir}, {}, true},
        {Scripts[1], {tokenZorDestDir, tokenZorCfgRoot, tokenCorvanCommonDir}, {}, true},
    };
    return files;
}

/// The texts "$(name)" in `content`, sorted.
std::set<std::string> placeholdersIn(const std::string& content)
{
    std::set<std::string> found;
    for (std::size_t at = content.find("$("); at != std::string::npos;
         at = content.find("$(", at + 1)) {
        const std::size_t end = content.find_first_of("()\n", at + 2);
        if (end != std::string::npos && content[end] == ')')
            found.insert(content.substr(at, end + 1 - at));
    }
    return found;
}

std::string stepText(std::string_view code)
{
    if (code == "backup-blocked")
        return "replaces an entry, and its backup's place is taken by a directory";
    if (code == "dot-name")
        return "there is a directory where the file would be written";
    if (code == "duplicate")
        return "replaces an entry that lands at the same place";
    if (code == "missing-directory")
        return "no entry before it makes its directory, and the installer makes none";
    if (code == "name-too-long")
        return "a part of the path, or of its backup's, has over " +
               std::to_string(LongestComponent) + " bytes";
    if (code == "not-a-directory")
        return "a part of the path is a file";
    return "replaces a directory of the same name, which stays as a backup";
}

} // namespace

bool hasPlaceholders(std::string_view place)
{
    const auto& files = filesWithPlaceholders();
    return std::any_of(files.begin(), files.end(),
                       [&](const FileWithPlaceholders& file) { return file.place == place; });
}

Checker::Checker(const std::vector<ZipEntry>& entries,
                 std::function<HeaderDetails(std::size_t)> details, EntryReader read,
                 Findings& findings)
    : entries_(entries), details_(std::move(details)), read_(std::move(read)), findings_(findings)
{
    for (const ZipEntry& entry : entries_)
        places_.push_back(landingOf(entry.name).value_or(""));
}

int Checker::run(bool shown)
{
    if (entries_.empty())
        return 0;
    if (std::none_of(entries_.begin(), entries_.end(),
                     [](const ZipEntry& entry) { return entry.name.starts_with('/'); })) {
        findings_.add(
            "no-leading-slash", std::nullopt,
            "no entry's name begins with \"/\", which most tools strip: every entry would "
            "be passed over");
        return 0;
    }
    checkNames();
    checkExtraction(shown);
    if (target_.isFull())
        return EFBIG;
    checkBackupNames();
    checkRequiredFiles();
    checkPlaceholders();
    return 0;
}

void Checker::checkNames()
{
    for (std::size_t i = 0; i < entries_.size(); ++i)
        checkName(i);
}

void Checker::checkName(std::size_t number)
{
    const ZipEntry& entry = entries_[number];
    const HeaderDetails details = details_(number);
    const std::string& wholeName = details.wholeName ? *details.wholeName : entry.name;
    if (details.wholeName)
        findings_.add("nul-in-name", wholeName, "is cut at its NUL: " + shown(entry.name));
    if (details.centralName)
        findings_.add("name-differs", wholeName,
                      "the central directory calls it " + shown(*details.centralName));

    const std::string& root = imageRoot();
    if (!places_[number].empty())
        checkPlace(places_[number]);
    else if (entry.name.starts_with(root) && entry.name != root)
        findings_.add("outside-package-directories", entry.name,
                      "is passed over: it is in no package directory");
    else if (!(endsWithSlash(entry.name) && root.starts_with(entry.name)))
        findings_.add("outside-image-root", entry.name,
                      "is passed over: its name does not begin with the image root");
}

void Checker::checkPlace(const std::string& place)
{
    const auto components = componentsOf(place);
    const std::string_view last = components.back();
    const bool leadsElsewhere =
        std::find(components.begin(), components.end(), "..") != components.end();
    if (leadsElsewhere)
        findings_.add("dot-dot-in-name", place, "leads to another directory than it seems");
    else if (last.empty() && !removalDeletes(place))
        findings_.add("directory-stays", place, "no removal deletes this directory");

    if (!last.empty() && place.find('\n') != std::string::npos)
        findings_.add(
            "newline-in-name", place,
            "its lines in the index of installed files name other files; no removal finds "
            "it");
    else if (!last.empty() && DefaultHome.size() + place.size() > LongestIndexLine)
        findings_.add("long-path", place,
                      "its path has more than " + std::to_string(LongestIndexLine) +
                          " bytes; no removal finds it");

    const std::size_t room = LongestComponent - BackupSuffix.size();
    if (last.size() > room && last.size() <= LongestComponent && !place.starts_with(XssDir))
        findings_.add("no-room-for-backup", place,
                      "has more than " + std::to_string(room) +
                          " bytes: an upgrade fails because its backup has no room");
}

/// The steps of the extraction, in their order.
void Checker::checkExtraction(bool shown)
{
    std::uint64_t total = 0;
    for (std::size_t i = 0; i < entries_.size(); ++i)
        total += places_[i].empty() ? 0 : entries_[i].uncompressedSize;
    Progress progress("checking", shown ? entries_.size() : 0, shown ? total : 0);

    const auto& dirs = packageDirs();
    std::vector<std::string> steps(dirs.begin(), dirs.end() - 1);
    steps.emplace_back(XssDir);
    steps.push_back(dirs.back());
    for (const std::string& step : steps) {
        const std::string prefix = imageRoot() + step;
        const bool again = step == XssDir;
        for (std::size_t i = 0; i < entries_.size() && !target_.isFull(); ++i) {
            if (!entries_[i].name.starts_with(prefix))
                continue;
            checkStep(i, again);
            progress.advance(again ? 0 : entries_[i].uncompressedSize);
        }
    }
}

void Checker::checkStep(std::size_t number, bool again)
{
    const std::string& place = places_[number];
    const bool isDir = endsWithSlash(place);
    const std::string_view code = isDir ? target_.makeDirectories(place) : target_.writeFile(place);
    // The second pass replaces every file of the first: only its failures are news.
    const bool isNews = !code.empty() && (!again || kindOf(code) == Kind::Fails);
    if (isNews && stepsFound_.emplace(code, place).second)
        findings_.add(code, place, stepText(code));
    if (!isDir && !again) {
        landed_.insert(place);
        checkFile(number);
    }
}

void Checker::checkFile(std::size_t number)
{
    const ZipEntry& entry = entries_[number];
    const HeaderDetails details = details_(number);
    const std::string& place = places_[number];
    for (const InstallerFile& file : InstallerFiles) {
        if (file.place == place)
            findings_.add("installer-file", place, std::string(file.text));
    }
    if (S_ISLNK(details.unixMode))
        findings_.add("symbolic-link", place,
                      "is installed as a file that holds the link's target");
    if ((details.flags & EncryptedFlag) != 0)
        findings_.add("encrypted", place, "is installed as it is, not decrypted");

    if (entry.uncompressedSize == 0 || entry.compressedSize == 0)
        findings_.add("empty-file", place, "the installer cannot open an empty file");
    else if (entry.method != Stored && entry.method != Deflated)
        findings_.add("unsupported-method", place,
                      "method " + std::to_string(entry.method) +
                          " is neither stored (0) nor deflated (8)");
    else if (std::max({entry.uncompressedSize, entry.compressedSize, entry.dataOffset}) >=
             SizeLimit)
        findings_.add("size-2-gib", place,
                      "its size or place is 2 GiB or beyond: the installer reads other data, or "
                      "none");
    else
        checkData(number);
}

void Checker::checkData(std::size_t number)
{
    const ZipEntry& entry = entries_[number];
    const std::string& place = places_[number];
    std::string* const kept = hasPlaceholders(place) ? &contents_[place] : nullptr;
    if (kept != nullptr)
        kept->clear();
    const EntryContent content = read_(number, [&](const char* data, std::size_t size) {
        if (kept != nullptr && kept->size() < Searched)
            kept->append(data, size);
        return true;
    });

    // NOLINTNEXTLINE(bugprone-branch-clone): the texts of the same code differ
    if (content.beyondSize) {
        contents_.erase(place);
        findings_.add("inflates-beyond-size", place,
                      "inflates to more than its " + std::to_string(entry.uncompressedSize) +
                          " bytes: the installer aborts");
    } else if (content.delivered != entry.uncompressedSize) {
        findings_.add("size-mismatch", place,
                      "is installed with " + std::to_string(content.delivered) +
                          " bytes instead of " + std::to_string(entry.uncompressedSize));
    } else if (entry.method == Stored && entry.compressedSize != entry.uncompressedSize) {
        findings_.add("size-mismatch", place,
                      "is stored, but " + std::to_string(entry.compressedSize) +
                          " bytes are said to hold " + std::to_string(entry.uncompressedSize));
    } else if (content.crc != entry.crc32) {
        findings_.add("crc-mismatch", place, "is damaged; the installer does not notice");
    }
}

void Checker::checkBackupNames()
{
    for (const std::string& place : landed_) {
        if (place.ends_with(BackupSuffix) &&
            landed_.contains(place.substr(0, place.size() - BackupSuffix.size())))
            findings_.add("backup-name", place,
                          "is taken for a backup of its neighbour, and lost when that is replaced");
    }
}

void Checker::checkRequiredFiles()
{
    const auto require = [&](std::string_view place, std::string_view code, const char* text) {
        if (!target_.hasFile(place))
            findings_.add(code, std::string(place), text);
    };
    require(ScannerControl, "missing-scanner-control",
            "without the scanner control a shared installation fails");
    for (const std::string_view place : {MainProperties, TraceProperties})
        require(place, "missing-property-file", "without this property file an installation fails");
    require(FileScanner, "missing-file-scanner",
            "without the file-system scanner its service cannot be stopped");
    for (const std::string_view place : Scripts)
        require(place, "missing-script", "the installer looks for this script");
}

void Checker::checkPlaceholders()
{
    for (const FileWithPlaceholders& file : filesWithPlaceholders()) {
        const std::string place(file.place);
        const auto content = contents_.find(place);
        if (content == contents_.end() || content->second.empty())
            continue; // found above
        for (const std::string& placeholder : file.wanted) {
            if (content->second.find(placeholder) == std::string::npos)
                findings_.add("missing-placeholder", place,
                              placeholder + " does not occur, so nothing is filled in for it");
        }
        if (file.isScript)
            continue;
        for (const std::string& found : placeholdersIn(content->second)) {
            const auto knows = [&](const std::vector<std::string>& known) {
                return std::find(known.begin(), known.end(), found) != known.end();
            };
            if (!knows(file.wanted) && !knows(file.alsoKnown))
                findings_.add("unknown-placeholder", place,
                              shown(found) + " is no placeholder of this file and stays as it is");
        }
    }
}

int checkPackage(const PackageFile& package, Findings& findings)
{
    Checker checker(
        package.entries(), [&](std::size_t number) { return package.details(number); },
        [&](std::size_t number, const ContentSink& sink) {
            return package.readEntry(package.entries()[number], sink);
        },
        findings);
    return checker.run(true);
}
