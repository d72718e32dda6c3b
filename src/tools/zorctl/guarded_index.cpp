#include "guarded_index.h"

#include "file_index.h"
#include "guarded_file.h"

namespace {

constexpr std::size_t IndexLimit = std::size_t{64} << 20;

} // namespace

GuardedIndex readGuardedIndex(const std::string& path)
{
    const GuardedText text = readGuarded(path, IndexLimit);
    GuardedIndex index;
    index.state = readStateName(text.state);
    if (text.state != ReadState::Read)
        return index;
    index.header = text.text.substr(0, text.text.find('\n'));
    // Only a finished index has a time in its first line.
    const bool finished = index.header.find(" installed on ") != std::string::npos;
    index.state = finished ? "complete" : "interrupted";
    readFileIndex(MemoryFile(text.text).path(), index.files);
    return index;
}
