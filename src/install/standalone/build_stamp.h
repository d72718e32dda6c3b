// The build stamp: identifies the build of the toolkit that this installer belongs to.
//
// "22/12/02zor_9.2.30.0000" is the build date in its first eight characters, the product word, "_"
// and the version.
#pragma once

#include "version.h"

#include <string>

/// The stamp of this installer.
extern const std::string zorBuildStamp;

/// The version after the "_" of `stamp`; 2.1.0.0 if there is no usable one (the first number above
/// 0, a second one present, none negative). The fifth number is always 0.
[[nodiscard]] ZorVersion stampVersion(const std::string& stamp);

/// The build date at the start of `stamp`; empty if `stamp` is not longer than nine characters or
/// its third and sixth characters are not "/".
[[nodiscard]] std::string stampBuildDate(const std::string& stamp);
