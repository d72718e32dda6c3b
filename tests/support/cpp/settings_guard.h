// Puts the process-wide settings back, so that no test sees what another one has set.
#pragma once

#include <functional>

/// Saves every setting that can be written, and restores them all at its end.
class SettingsGuard {
public:
    SettingsGuard();
    SettingsGuard(const SettingsGuard&) = delete;
    SettingsGuard& operator=(const SettingsGuard&) = delete;
    ~SettingsGuard();

private:
    std::function<void()> restore_;
};
