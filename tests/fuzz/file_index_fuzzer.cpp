// The whole input is an index of installed files: it is read and written again, and a removal
// deletes what it lists.
#include "file_index.h"
#include "fuzz_support.h"
#include "removal.h"
#include "settings.h"

#include <cstring>
#include <set>
#include <sstream>
#include <string>
#include <utility>

#include <sys/syscall.h>
#include <unistd.h>

namespace {

bool deletes = true; ///< false: unlinkat() only looks at the request

} // namespace

// The installer's unlinkat() and the C library's own: no file goes while an index is tried.
extern "C" int unlinkat(int directory, const char* name, int flags) noexcept
{
    if (deletes)
        return static_cast<int>(syscall(SYS_unlinkat, directory, name, flags));
    require(std::strlen(name) < 1024, "a listed file is deleted in pieces of at most 1023 bytes");
    require(std::strchr(name, '\n') == nullptr, "a deleted name is one line");
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
    std::ostringstream log;
    std::ostream* const previous = std::exchange(logstream, &log);
    deletes = false;
    const bool listed = removeListedFiles(&path);
    deletes = true;
    logstream = previous;
    require(listed == !log.view().empty(), "an index that lists something is recognized");
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
