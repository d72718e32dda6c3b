// The whole input is an index of installed files: it is read and written again, and a removal
// deletes what it lists.
#include "file_index.h"
#include "fuzz_support.h"
#include "removal.h"

#include <cstring>
#include <set>
#include <sstream>
#include <string>

#include <sys/syscall.h>
#include <unistd.h>

namespace {

bool deletes = true; ///< false: unlink() only records the request
std::size_t deletions = 0;

} // namespace

// The installer's unlink() and libFuzzer's own: no file goes while an index is tried.
extern "C" int unlink(const char* path) noexcept
{
    if (deletes)
        return static_cast<int>(syscall(SYS_unlink, path));
    require(std::strlen(path) < 1024, "a listed file is deleted in pieces of at most 1023 bytes");
    require(std::strchr(path, '\n') == nullptr, "a deleted name is one line");
    ++deletions;
    return 0;
}

namespace {

/// The lines of an index that name files.
std::set<std::string> filesOf(const std::string& index)
{
    std::set<std::string> files;
    std::istringstream lines(index);
    for (std::string line; std::getline(lines, line);) {
        if (!line.empty() && line.front() != '#')
            files.insert(line);
    }
    return files;
}

void checkReadAndWrite(const std::string& path, const std::set<std::string>& expected)
{
    static const MemoryFile copy;
    std::set<std::string> files;
    readFileIndex(path, files);
    require(files == expected, "every line that is neither empty nor a comment is a file");

    writeFileIndex(copy.path(), files);
    std::set<std::string> again;
    readFileIndex(copy.path(), again);
    require(again == files, "a written index lists what was read");
}

void checkRemoval(const std::string& path)
{
    deletes = false;
    deletions = 0;
    const bool listed = removeListedFiles(&path);
    deletes = true;
    require(listed == (deletions != 0), "an index that lists something is recognized");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    static const MemoryFile file;
    silenceLog();
    file.write(data, size);
    const std::set<std::string> expected = filesOf(file.content());

    // A line of two bytes is a node of 64, in two sets.
    const ResourceBound bound(64 * KiB + 96 * size, 100);
    checkReadAndWrite(file.path(), expected);
    checkRemoval(file.path());
    return 0;
}
