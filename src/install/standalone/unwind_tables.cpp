// Finds the unwind tables of a piece of code, for the C++ runtime that a shipped binary contains.
//
// The runtime calls `_dl_find_object`, which the GNU C library has only since 2.35. This one uses
// `dl_iterate_phdr`, which every version has, so that the binary also starts on 2.34, the first
// version with 64-bit times. It is linked only into shipped binaries: a process that uses the
// machine's C++ runtime already has the function.

#include <cstddef>

#include <dlfcn.h>
#include <link.h>

namespace {

struct Search {
    ElfW(Addr) address;
    ElfW(Addr) tables = 0;
};

/// Stores the tables of the loaded `object` if it contains the address; 1 then ends the walk.
int examine(dl_phdr_info* object, std::size_t, void* data)
{
    auto& search = *static_cast<Search*>(data);
    bool inside = false;
    ElfW(Addr) tables = 0;
    for (ElfW(Half) i = 0; i < object->dlpi_phnum; ++i) {
        const ElfW(Phdr)& segment = object->dlpi_phdr[i];
        const ElfW(Addr) begin = object->dlpi_addr + segment.p_vaddr;
        // Unsigned: an address below `begin` wraps round to one far beyond the segment.
        if (segment.p_type == PT_LOAD && search.address - begin < segment.p_memsz)
            inside = true;
        if (segment.p_type == DLFO_EH_SEGMENT_TYPE)
            tables = begin;
    }
    if (!inside)
        return 0;
    search.tables = tables;
    return 1;
}

} // namespace

/// Sets `dlfo_eh_frame`, all that the runtime reads on x86, to the table index of the object that
/// contains `address`. Returns 0, or -1 if there is no such object or it has no index.
// NOLINTNEXTLINE(readability-identifier-naming): the C library's name
extern "C" [[gnu::visibility("hidden")]] int _dl_find_object(void* address,
                                                             dl_find_object* result) noexcept
{
    Search search = {reinterpret_cast<ElfW(Addr)>(address)};
    (void)dl_iterate_phdr(examine, &search); // finding nothing leaves `tables` at 0
    *result = {};
    // NOLINTNEXTLINE(performance-no-int-to-ptr): program headers hold addresses as numbers
    result->dlfo_eh_frame = reinterpret_cast<void*>(search.tables);
    return search.tables != 0 ? 0 : -1;
}
