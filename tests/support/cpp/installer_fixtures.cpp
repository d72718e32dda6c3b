#include "installer_fixtures.h"

#include "settings.h"

#include <csignal>
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

InterruptionAt::InterruptionAt(const std::string& text) : previous_(logstream)
{
    watchForSignals();
    buffer_.awaited = text;
    logstream = &stream_;
    if (text.empty())
        (void)std::raise(SIGTERM);
}

InterruptionAt::~InterruptionAt()
{
    logstream = previous_;
}

std::streamsize InterruptionAt::Buffer::xsputn(const char* text, std::streamsize size)
{
    log.append(text, static_cast<std::size_t>(size));
    if (!awaited.empty() && log.find(awaited) != std::string::npos) {
        awaited.clear();
        (void)std::raise(SIGTERM);
    }
    return size;
}

InterruptionAt::Buffer::int_type InterruptionAt::Buffer::overflow(int_type character)
{
    const char text = traits_type::to_char_type(character);
    return xsputn(&text, 1) == 1 ? character : traits_type::eof();
}

std::string journalText(const FileTransaction& transaction)
{
    std::string text;
    for (const JournalEntry& entry : transaction.journal)
        text += std::to_string(entry.kind) + " " + entry.path + "\n";
    return text;
}
