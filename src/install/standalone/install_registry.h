// The record of an installation, as the registry file holds it.
#pragma once

#include "version.h"

#include <string>

struct InstallRegistry {
    ZorVersion version;
    std::string buildDate;     ///< "YY/MM/DD", kept unchanged
    std::string exploiters;    ///< see exploiters.h
    std::string homeDirectory; ///< where the toolkit is installed
    std::string configRootDirectory;
};
