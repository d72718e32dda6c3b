#include "installer_fixtures.h"

#include <cstdlib>
#include <filesystem>

namespace {

bool onMachineOfItsOwn()
{
    return std::getenv("WZOR_SANDBOX") != nullptr;
}

void clearFixedPlaces()
{
    for (const char* const path : {"/etc/zor", "/etc/kel", "/usr/kel", "/opt/corvan", "/root/.zor",
                                   "/root/corvan", "/home/ann", "/usr/sbin/selinuxenabled"})
        std::filesystem::remove_all(path);
}

} // namespace

VariableGuard::VariableGuard(const char* name) : name_(name)
{
    const char* const value = std::getenv(name);
    if (value != nullptr)
        value_ = value;
}

VariableGuard::~VariableGuard()
{
    if (value_)
        (void)setenv(name_, value_->c_str(), 1);
    else
        (void)unsetenv(name_);
}

InstallerTest::InstallerTest()
{
    (void)unsetenv("LD_LIBRARY_PATH");
}

void MachineTest::SetUp()
{
    ASSERT_TRUE(onMachineOfItsOwn()) << "this test runs under tests/support/sandbox only";
    clearFixedPlaces();
}

void MachineTest::TearDown()
{
    if (onMachineOfItsOwn())
        clearFixedPlaces();
}

std::string journalText(const FileTransaction& transaction)
{
    std::string text;
    for (const JournalEntry& entry : transaction.journal)
        text += std::to_string(entry.kind) + " " + entry.path + "\n";
    return text;
}
