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
    for (const int error : {EAGAIN, ENOMEM}) {
        EXPECT_TRUE(passesInChild([&] {
            failSystemCall(SYS_clone, error);
            failSystemCall(SYS_clone3, error);
            failSystemCall(SYS_vfork, error);
            ASSERT_EQ(-1, runShell("true")) << error;
        }));
    }
}

TEST(ShellCommandTest, WithoutAShellTheStatusIsThatOfAMissingCommand)
{
    EXPECT_TRUE(passesInChild([] {
        failSystemCall(SYS_execve, ENOENT);
        ASSERT_EQ(127 << 8, runShell("true"));
    }));
}

TEST(ShellCommandTest, AnInterruptedWaitGoesOn)
{
    EXPECT_TRUE(passesInChild([] {
        beforeSystemCall({SYS_wait4}, 1, [] { return EINTR; });
        ASSERT_EQ(3 << 8, runShell("exit 3"));
    }));
}

TEST(ShellCommandTest, AFailedWaitIsMinus1)
{
    EXPECT_TRUE(passesInChild([] {
        failSystemCall(SYS_wait4, ECHILD);
        ASSERT_EQ(-1, runShell("true"));
    }));
}

} // namespace
