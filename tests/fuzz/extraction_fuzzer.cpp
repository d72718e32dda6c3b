// The whole input is a package: it is extracted into an empty directory and rolled back again.
//
// The image root is "/" here, so that entries are called "/bin/x" and not by a long name that the
// fuzzer would have to keep. Names are used unchanged, ".." included, so archives with such
// ones are left out: they would leave the directory. All others stay in it.
#include "assertion_trap.h"
#include "extraction.h"
#include "file_codes.h"
#include "fuzz_support.h"
#include "registry.h"
#include "settings.h"
#include "transaction.h"
#include "zip_file.h"

#include <filesystem>
#include <memory>

#include <unistd.h>

namespace fs = std::filesystem;

namespace {

/// More than that is not written for one input: a thousandth of it can be enough to deflate to it,
/// and time would only show how fast the disk is.
constexpr std::size_t MaxContent = 4096 * KiB;

std::string makeDirectory()
{
    std::string name = (fs::temp_directory_path() / "wzorinst-fuzz-XXXXXX").string();
    require(mkdtemp(name.data()) != nullptr, "a directory can be made");
    return name;
}

/// Reads an entry to its end, as the extraction does. False when the program would end on it or
/// when, together with `content`, it is too much; `content` grows by its size.
bool canBeExtracted(const ZipFile& archive, const ZipEntry& entry, std::size_t& content)
{
    const std::unique_ptr<InputStream> stream(archive.getInputStream(&entry));
    if (!stream)
        return true;
    static char block[8192];
    for (;;) {
        const int count = readBlock(*stream, block, sizeof block);
        if (count == AssertionStruck || content > MaxContent)
            return false;
        if (count <= 0)
            return true;
        content += static_cast<std::size_t>(count);
    }
}

bool canBeExtracted(const ZipFile& archive)
{
    std::size_t content = 0;
    for (const ZipEntry& entry : archive.entries()) {
        if (entry.name.find("..") != std::string::npos || !canBeExtracted(archive, entry, content))
            return false;
    }
    return true;
}

void extractAndRollBack(const std::string& package, const std::string& directory, bool fresh)
{
    FileTransaction transaction;
    InstallRegistry installation;
    installation.homeDirectory = directory + "/home";
    const std::string index = directory + "/index/ZOR_files";

    const int code = extractPackage(package, transaction, installation, fresh, &index);

    require(code >= FileOk && code <= CannotChangeMode, "the code is one of the file operations'");
    require(zor_file_handle == nullptr, "the transient index is closed");
    const bool hasIndex = access(index.c_str(), F_OK) == 0;
    require(code != FileOk || hasIndex, "a success leaves an index");
    require(code == FileOk || !hasIndex, "a failure leaves no index");
    if (hasIndex)
        (void)unlink(index.c_str()); // not journalled
    (void)rollback(transaction);
    require(fs::is_empty(directory), "a rollback leaves nothing of an installation");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    static const MemoryFile file;
    static const std::string directory = makeDirectory();
    silenceLog();
    spbFileRoot = "/";
    file.write(data, size);
    if (!canBeExtracted(ZipFile(file.path().c_str())))
        return 0;

    // A name of 2048 bytes can name a thousand directories, each of which the journal names
    // with its whole path.
    const ResourceBound bound(1024 * KiB + KiB * size, 2000);
    extractAndRollBack(file.path(), directory, size % 2 == 0);
    return 0;
}
