// Fixtures of the tests that let the installer work on real files.
#pragma once

#include "interruption.h"
#include "scoped.h"
#include "settings_guard.h"
#include "test_files.h"
#include "transaction.h"

#include <gtest/gtest.h>

#include <optional>
#include <ostream>
#include <streambuf>
#include <string>

/// Restores a variable of the environment at its end.
class VariableGuard {
public:
    explicit VariableGuard(const char* name);
    VariableGuard(const VariableGuard&) = delete;
    VariableGuard& operator=(const VariableGuard&) = delete;
    ~VariableGuard();

private:
    const char* name_;
    std::optional<std::string> value_;
};

/// A directory and a transaction of the test's own, umask 022, no LD_LIBRARY_PATH, a caught log.
class InstallerTest : public ::testing::Test {
protected:
    InstallerTest();

    SettingsGuard settings;
    VariableGuard libraryPath{"LD_LIBRARY_PATH"};
    ScopedUmask mask{022};
    LogCapture log;
    TempDir dir;
    FileTransaction transaction;
};

/// For tests that reach fixed places of the machine (/etc/zor, /etc/kel, /usr/kel, /opt, homes).
///
/// They fail at once outside of tests/support/sandbox, which sets WZOR_SANDBOX. Each begins and
/// ends without any of those places.
class MachineTest : public InstallerTest {
protected:
    void SetUp() override;
    void TearDown() override;
};

/// Sends the running installation SIGTERM as soon as the log holds `text`, at once if that is
/// empty. For a child (passesInChild()) only: the signal stays recorded.
class InterruptionAt {
public:
    explicit InterruptionAt(const std::string& text);
    InterruptionAt(const InterruptionAt&) = delete;
    InterruptionAt& operator=(const InterruptionAt&) = delete;
    ~InterruptionAt();

    [[nodiscard]] const std::string& log() const { return buffer_.log; }

private:
    struct Buffer : std::streambuf {
        std::streamsize xsputn(const char* text, std::streamsize size) override;
        int_type overflow(int_type character) override;

        std::string awaited;
        std::string log;
    };

    ScopedInterruptible interruptible_;
    Buffer buffer_;
    std::ostream stream_{&buffer_};
    std::ostream* previous_;
};

/// The journal as lines of kind and path, "4 /opt/corvan\n".
std::string journalText(const FileTransaction& transaction);
