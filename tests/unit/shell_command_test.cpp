#include "process_limits.h"
#include "shell_command.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <csignal>

#include <sys/syscall.h>
#include <sys/wait.h>

namespace {

TEST(ShellCommandTest, ReturnsTheRawStatus)
{
    EXPECT_EQ(0, runShell("true"));
    EXPECT_EQ(3 << 8, runShell("exit 3"));
    EXPECT_EQ(32512, runShell("/no/such/program 2>/dev/null"));
    EXPECT_EQ(SIGTERM, runShell("kill -TERM $$"));
}

TEST(ShellCommandTest, ASignalToTheInstallerAloneIsNotLost)
{
    static volatile std::sig_atomic_t met = 0;
    EXPECT_TRUE(passesInChild([] {
        (void)std::signal(SIGINT, [](int) { met = 1; });
        ASSERT_EQ(0, runShell("kill -INT $PPID"));
        ASSERT_EQ(1, met);
    }));
}

TEST(ShellCommandTest, WithoutAProcessTheStatusIsMinus1)
{
    EXPECT_TRUE(passesInChild([] {
        failSystemCall(SYS_clone, EAGAIN);
        failSystemCall(SYS_clone3, EAGAIN);
        failSystemCall(SYS_vfork, EAGAIN);
        ASSERT_EQ(-1, runShell("true"));
    }));
}

} // namespace
