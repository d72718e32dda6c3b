// The whole input is a package that spb looks at: it is checked, its files are hashed, and it is
// unpacked.
//
// The image root is "/" here, so that entries are called "/bin/x" and not by a long name that the
// fuzzer would have to keep.
#include "checker.h"
#include "fuzz_support.h"
#include "landed_files.h"
#include "package_layout.h"
#include "settings.h"
#include "subcommands.h"

#include <cstdlib>
#include <filesystem>
#include <iostream>

namespace fs = std::filesystem;

namespace {

/// What an input may unpack to: a thousandth of it can be enough to deflate to it, and time would
/// only show how fast the disk is.
constexpr std::uint64_t MostContent = 4096 * KiB;

/// An empty directory, in which packages are unpacked into "target".
std::string workDirectory()
{
    std::string name = (fs::temp_directory_path() / "wzorinst-fuzz-XXXXXX").string();
    require(mkdtemp(name.data()) != nullptr, "a directory can be made");
    return name;
}

void silence()
{
    silenceLog();
    std::cout.rdbuf(nullptr);
    std::cerr.rdbuf(nullptr);
    interp.clear(); // the image root becomes "/"
    spbFileRoot.clear();
}

void checkFindings(const PackageFile& package, const Findings& findings)
{
    require(!package.entries().empty() || findings.worst() == Kind::Fails,
            "where the installer finds no package, a finding says so");
    for (const Finding& finding : findings.kept())
        require(finding.line().find('\n') == std::string::npos, "a finding is one line");
}

void unpack(const std::string& path, const std::string& work)
{
    (void)extractCommand({path, work + "/target"});
    for (const auto& entry : fs::directory_iterator(work))
        require(entry.path().filename() == "target", "nothing is written outside of the target");
    fs::remove_all(work + "/target");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    static const bool silent = (silence(), true);
    static const MemoryFile file;
    static const std::string work = workDirectory();
    (void)silent;
    file.write(data, size);

    std::uint64_t content = 0;
    {
        // A central header of 46 bytes can name a local header that others name as well, with a
        // name of 2048 bytes: the name, the place and some findings about it are kept.
        const ResourceBound bound(2048 * KiB + 1024 * size, 2000);
        Findings findings;
        int error = 0;
        const auto package = PackageFile::open(file.path(), findings, error);
        require(package != nullptr, "a regular file can be looked at");
        require(checkPackage(*package, findings) == 0, "a small package has no million entries");
        checkFindings(*package, findings);
        for (const auto& [place, landed] : landedFiles(*package))
            content += landed.size;
    }
    if (content <= MostContent)
        unpack(file.path(), work);
    return 0;
}
