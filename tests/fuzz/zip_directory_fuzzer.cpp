// The whole input is an archive, whose directory is read.
#include "fuzz_support.h"
#include "zip_file.h"

#include <cstring>

namespace {

constexpr std::size_t MaxNameLength = 2048;

void checkEntries(const ZipFile& archive)
{
    for (const ZipEntry& entry : archive.entries()) {
        require(entry.name.size() <= MaxNameLength, "no name is longer than 2048 bytes");
        require(entry.name.find('\0') == std::string::npos, "a name is cut at its first NUL");
    }
    if (!archive.entries().empty()) {
        const ZipEntry& last = archive.entries().back();
        const ZipEntry* const found = archive.findEntry(last.name);
        require(found != nullptr && found->name == last.name, "a listed name is found");
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    static const MemoryFile file;
    file.write(data, size);

    // A central header of 46 bytes can name a local header that others name as well, with a name of
    // 2048 bytes.
    const ResourceBound bound(64 * KiB + 64 * size, 100);
    const ZipFile archive(file.path().c_str());
    checkEntries(archive);
    const int code = ZipFile::validate(file.path().c_str());
    require(code >= ZipOk && code <= ZipUnknownEntrySize, "the code is one of the reader's");
    require(code == ZipOk || archive.entries().empty(), "a code other than 0 leaves no entries");
    return 0;
}
