#include "installer_fixtures.h"
#include "interruption.h"
#include "process_limits.h"

#include <gtest/gtest.h>

#include <csignal>

#include <sys/wait.h>

namespace {

TEST(InterruptionTest, OnlyWhatCanBeUndoneIsInterrupted)
{
    EXPECT_TRUE(passesInChild([] {
        watchForSignals();
        (void)std::raise(SIGTERM);

        EXPECT_FALSE(isInterrupted());
        {
            const ScopedInterruptible interruptible;
            EXPECT_TRUE(isInterrupted());
        }
        EXPECT_FALSE(isInterrupted());
    }));
}

TEST(InterruptionTest, WithoutASignalNothingIsInterrupted)
{
    EXPECT_TRUE(passesInChild([] {
        watchForSignals();
        const ScopedInterruptible interruptible;

        EXPECT_FALSE(isInterrupted());
        endBySignal();
    }));
}

TEST(InterruptionTest, ASignalThatTheCallerIgnoresStaysIgnored)
{
    EXPECT_TRUE(passesInChild([] {
        (void)std::signal(SIGHUP, SIG_IGN);
        watchForSignals();
        const ScopedInterruptible interruptible;
        (void)std::raise(SIGHUP);

        EXPECT_FALSE(isInterrupted());
    }));
}

TEST(InterruptionTest, ACommandThatTheKeyboardKilledCountsAsASignal)
{
    for (const int status :
         {SIGINT, SIGQUIT, W_EXITCODE(128 + SIGINT, 0), W_EXITCODE(128 + SIGQUIT, 0)}) {
        EXPECT_TRUE(passesInChild([&] {
            const ScopedInterruptible interruptible;
            noteStatusOfCommand(status);
            EXPECT_TRUE(isInterrupted()) << status;
        }));
    }
}

TEST(InterruptionTest, AnyOtherEndOfACommandIsNoSignal)
{
    for (const int status : {0, SIGTERM, SIGKILL, W_EXITCODE(1, 0), W_EXITCODE(128 + SIGTERM, 0)}) {
        EXPECT_TRUE(passesInChild([&] {
            const ScopedInterruptible interruptible;
            noteStatusOfCommand(status);
            EXPECT_FALSE(isInterrupted()) << status;
        }));
    }
}

TEST(InterruptionDeathTest, TheProcessEndsByTheFirstSignal)
{
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_EXIT(
        {
            watchForSignals();
            (void)std::raise(SIGHUP);
            (void)std::raise(SIGINT);
            endBySignal();
        },
        ::testing::KilledBySignal(SIGHUP), "");
}

} // namespace
