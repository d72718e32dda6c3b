// Exceptions in a program that is linked like the one that ships.
#include <gtest/gtest.h>

#include <cstdlib>
#include <stdexcept>
#include <string>

#include <dlfcn.h>
#include <sys/mman.h>

namespace {

struct CountsItsEnd {
    int& ends;
    ~CountsItsEnd() { ++ends; }
};

[[gnu::noinline]] void throwFromDepth(int depth, int& ends)
{
    const CountsItsEnd guard{ends};
    if (depth == 0)
        throw std::runtime_error("from below");
    throwFromDepth(depth - 1, ends);
}

int throwingOrder(const void*, const void*)
{
    throw std::runtime_error("from the order");
}

} // namespace

TEST(UnwindTest, AnExceptionIsCaughtAndEndsWhatItLeaves)
{
    int ends = 0;
    std::string caught;

    try {
        throwFromDepth(9, ends);
    } catch (const std::runtime_error& error) {
        caught = error.what();
    }

    EXPECT_EQ("from below", caught);
    EXPECT_EQ(10, ends);
}

TEST(UnwindTest, AnExceptionPassesThroughTheCLibrary)
{
    int numbers[] = {2, 1};

    EXPECT_THROW(std::qsort(numbers, 2, sizeof numbers[0], throwingOrder), std::runtime_error);
}

TEST(UnwindTest, CodeOfTheProgramAndOfTheCLibraryHasDifferentTables)
{
    dl_find_object program = {};
    dl_find_object library = {};

    ASSERT_EQ(0, _dl_find_object(reinterpret_cast<void*>(&throwFromDepth), &program));
    ASSERT_EQ(0, _dl_find_object(reinterpret_cast<void*>(&std::qsort), &library));

    EXPECT_NE(nullptr, program.dlfo_eh_frame);
    EXPECT_NE(nullptr, library.dlfo_eh_frame);
    EXPECT_NE(program.dlfo_eh_frame, library.dlfo_eh_frame);
}

TEST(UnwindTest, MemoryThatNoFileIsLoadedToHasNoTables)
{
    void* const memory = mmap(nullptr, 4096, PROT_READ, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    ASSERT_NE(MAP_FAILED, memory);
    dl_find_object result = {};

    EXPECT_EQ(-1, _dl_find_object(memory, &result));
    EXPECT_EQ(nullptr, result.dlfo_eh_frame);
    (void)munmap(memory, 4096);
}

TEST(UnwindTest, TheNullAddressHasNoTables)
{
    dl_find_object result = {};

    EXPECT_EQ(-1, _dl_find_object(nullptr, &result));
}
