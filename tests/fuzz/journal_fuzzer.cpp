// The whole input is a saved journal: it is loaded, saved and loaded again.
#include "file_codes.h"
#include "fuzz_support.h"
#include "transaction.h"

#include <algorithm>

namespace {

bool isSound(const JournalEntry& entry)
{
    const bool known =
        entry.kind == BackedUp || entry.kind == Created || entry.kind == DirectoryCreated;
    return known && !entry.path.empty() && entry.path.find('\n') == std::string::npos;
}

bool isSame(const JournalEntry& a, const JournalEntry& b)
{
    return a.kind == b.kind && a.path == b.path;
}

/// No path of a file system holds a NUL; a saved one ends there.
bool holdsNul(const JournalEntry& entry)
{
    return entry.path.find('\0') != std::string::npos;
}

void checkSaveAndLoad(const FileTransaction& transaction)
{
    static const MemoryFile copy;
    require(saveJournal(transaction, copy.path()) == FileOk, "a journal is saved");
    FileTransaction again;
    require(loadJournal(again, copy.path()) == FileOk, "a saved journal is loaded");
    require(std::equal(transaction.journal.begin(), transaction.journal.end(),
                       again.journal.begin(), again.journal.end(), isSame),
            "a saved journal is loaded as it was");
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size)
{
    static const MemoryFile file;
    file.write(data, size);

    // A line of four bytes is an entry of 40, held twice and a half while the journal grows, in
    // two journals.
    const ResourceBound bound(64 * KiB + 64 * size, 100);
    FileTransaction transaction;
    const int code = loadJournal(transaction, file.path());
    require(code == FileOk || code == CannotRead, "a readable journal is whole or malformed");
    const auto& journal = transaction.journal;
    require(std::all_of(journal.begin(), journal.end(), isSound),
            "an entry is of a known kind and has a path of one line");
    if (std::none_of(journal.begin(), journal.end(), holdsNul))
        checkSaveAndLoad(transaction);
    return 0;
}
