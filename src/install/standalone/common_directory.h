// The Corvan common directory, which several products of the house share.
//
// It is named by the line "corvan_common_dir=<directory>" of the setting file
// "/etc/kel/corvan/common/cfg/log.properties"; "/usr/kel/corvan/common" without one.
#pragma once

#include <string>

extern const std::string KeyCorvanCommonDir; ///< "corvan_common_dir"

/// The setting file.
[[nodiscard]] std::string commonSettingPath();

/// The common directory.
///
/// Unless `readOnly`, a missing setting file is written with the default, with the directories that
/// lead to it: not journalled, so they outlive a rollback. Failures are not reported. A setting
/// file that exists but cannot be read is left alone; the default applies.
[[nodiscard]] std::string readCommonDirectory(bool readOnly);
