// The whole input is a registry: it is parsed, written and parsed again.
#include "file_codes.h"
#include "fuzz_support.h"
#include "registry.h"
#include "text.h"

namespace {

/// What a written value reads back as: one made only of blanks is not trimmed, so the blank that
/// the writer puts after "=" stays.
std::string readBack(const std::string& value)
{
    return value.find_first_not_of(Blanks) == std::string::npos ? " " + value : value;
}

/// The registry has always shown numbers of 2^31 and more as negative ones, which do not parse.
bool isWritable(const ZorVersion& version)
{
    const std::uint32_t limit = 0x80000000U;
    return version.major < limit && version.minor < limit && version.release < limit &&
           version.level < limit;
}

void checkWriteBack(const InstallRegistry& registry)
{
    static const MemoryFile file;
    FileTransaction transaction;
    transaction.backup = false;
    require(writeRegistry(transaction, file.path(), registry) == FileOk, "a registry is written");

    InstallRegistry again;
    const int code = parseRegistry(file.path(), &again);
    if (!isWritable(registry.version)) {
        require(code == RegistryBadVersion, "a negative number is no version");
        return;
    }
    require(code == RegistryOk, "a written registry parses");
    ZorVersion version = registry.version;
    version.fifth = 0;
    require(compareVersions(again.version, version) == 0, "four numbers of the version are kept");
    require(again.buildDate == readBack(registry.buildDate), "the build date is kept");
    require(again.homeDirectory == readBack(registry.homeDirectory), "the home is kept");
    require(again.exploiters == readBack(registry.exploiters), "the exploiters are kept");
    require(again.configRootDirectory == readBack(registry.configRootDirectory),
            "the configuration root is kept");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    static const MemoryFile file;
    file.write(data, size);

    const ResourceBound bound(64 * KiB + 16 * size, 100);
    InstallRegistry registry;
    const int code = parseRegistry(file.path(), &registry);
    require(code == RegistryOk || code == RegistryIncomplete || code == RegistryBadVersion,
            "a readable registry is whole, incomplete or of a bad version");
    require(parseRegistry(file.path(), nullptr) == code, "a check gives the code of a reading");
    if (code == RegistryOk)
        checkWriteBack(registry);
    return 0;
}
