// The Corvan common directory, which several Corvan products share.
//
// The line "corvan_common_dir=<directory>" of the setting file
// "/etc/kel/corvan/common/cfg/log.properties" names it; the default is "/usr/kel/corvan/common".
#pragma once

#include <string>

extern const std::string KeyCorvanCommonDir; ///< "corvan_common_dir"

/// The setting file.
[[nodiscard]] std::string commonSettingPath();

/// The common directory.
///
/// Unless `readOnly`, a missing setting file is created with the default, together with its
/// directories. They are not journalled, so a rollback does not delete them. Failures are not
/// reported. A setting file that exists but cannot be read is not changed; the default applies.
[[nodiscard]] std::string readCommonDirectory(bool readOnly);
