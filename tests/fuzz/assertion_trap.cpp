#include "assertion_trap.h"

#include "fuzz_support.h"
#include "zip_file.h"

#include <csetjmp>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

bool isSet = false;
std::jmp_buf mark;

} // namespace

// The name, the types and the missing exceptions are those of the C library's <assert.h>.
extern "C" [[noreturn]] void __assert_fail(const char* expression, const char* file,
                                           unsigned int line, const char* function) noexcept
{
    if (!isSet) {
        (void)std::fprintf(stderr, "%s:%u: %s: %s\n", file, line, function, expression);
        std::abort();
    }
    isSet = false;
    require(std::strcmp(expression, "available_ >= (unsigned) result") == 0,
            "the stream has one assertion");
    std::longjmp(mark, 1); // NOLINT(cert-err52-cpp): skips no destructor, see the header
}

int readBlock(InputStream& stream, char* buffer, int size)
{
    if (setjmp(mark) != 0) // NOLINT(cert-err52-cpp)
        return AssertionStruck;
    isSet = true;
    const int count = stream.read(buffer, size);
    isSet = false;
    return count;
}

int readByte(InputStream& stream)
{
    if (setjmp(mark) != 0) // NOLINT(cert-err52-cpp)
        return AssertionStruck;
    isSet = true;
    const int byte = stream.read();
    isSet = false;
    return byte;
}
