// What a run of the installer would do, worked out on a SimulatedTree.
//
// The decisions are the library's own: the parsing of the command line, the look at the registry,
// the steps of an extraction and of a removal. External commands are not run: a scanner control
// that is there is taken to succeed.
#pragma once

#include "forecast.h"
#include "planned_run.h"

/// Works out the run, which parseRun() accepted. The settings are those of the run afterwards.
[[nodiscard]] Forecast forecastRun(const PlannedRun& run);
