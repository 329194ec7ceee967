// The results of `mcsim simulate --json` as one JSON document (schema in README.md, "JSON
// results"): the settings, then per sensitivity iteration the case counts, per target the
// statistics, percentiles, histogram bins and sensitivity measures, the input correlations
// and the contingency cells, then the warnings. Keys keep the order written here; a missing
// value is null.
#pragma once

#include "cli/report.h"

#include <nlohmann/json.hpp>

#include <ostream>

namespace MCHost {

//! Version of the document's layout; raised when a key changes meaning or goes away.
inline constexpr int kResultsFormatVersion = 1;

//! The document of `report`.
nlohmann::ordered_json ReportToJson(const SimulationReport& report);

//! Writes ReportToJson(report) as text indented by two, one iteration at a time, so that a run
//! of thousands of sensitivity iterations never holds the whole document in memory. Texts that
//! are not valid UTF-8 get the replacement character.
void WriteJsonReport(std::ostream& out, const SimulationReport& report);

} // namespace MCHost
