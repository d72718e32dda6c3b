// Surveying the installations of other users.
//
// Where another user decides what a path leads to, root looks with that user's rights and no
// others, in a process of its own that is given up when it takes too long: a link cannot make root
// read what its owner may not, and a file system that never answers cannot keep root waiting.
#pragma once

#include "json_report.h"
#include "survey.h"

/// The survey of `account`, as toJson() gives it; of an account that cannot be surveyed, one whose
/// health is "unknown".
[[nodiscard]] Json surveyOther(const Account& account);
