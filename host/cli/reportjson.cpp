#include "cli/reportjson.h"

#include "mccommon/mcmv.h"

#include <cmath>

namespace MCHost {

using Json = nlohmann::ordered_json;
using MCCommon_800::MCMV;

namespace {

//! A number, or null for the missing value (and anything not finite, which JSON cannot carry).
Json Number(double x) {
    if (MCMV::IsMissing(x) || !std::isfinite(x)) {
        return Json(nullptr);
    }
    return Json(x);
}

Json InputMeasures(const std::vector<ReportInputMeasures>& inputs, bool continuous) {
    Json list = Json::array();
    for (const ReportInputMeasures& m : inputs) {
        Json entry;
        entry["input"] = m.fInput;
        entry["correlation"] = Number(m.fCorrelation);
        if (continuous) {
            entry["first_order"] = Number(m.fFirstOrder);
            entry["delta_negative"] = Number(m.fDeltaNegative);
            entry["delta_positive"] = Number(m.fDeltaPositive);
            entry["variance_contribution"] = Number(m.fVarianceShare);
            // Cases the measure left out (null when it did not run).
            entry["delta_skipped"] = m.fDeltaSkipped >= 0 ? Json(m.fDeltaSkipped) : Json(nullptr);
            entry["variance_skipped"] =
                m.fVarianceSkipped >= 0 ? Json(m.fVarianceSkipped) : Json(nullptr);
        }
        list.push_back(std::move(entry));
    }
    return list;
}

Json Continuous(const ReportContinuousTarget& t, double ciLevel) {
    Json target;
    target["name"] = t.fName;
    target["mean"] = Number(t.fMean);
    target["std_dev"] = Number(t.fStdDev);
    target["ci"] =
        Json{{"level", ciLevel}, {"lower", Number(t.fCiLower)}, {"upper", Number(t.fCiUpper)}};
    target["min"] = Number(t.fMinimum);
    target["max"] = Number(t.fMaximum);
    Json percentiles = Json::array();
    for (const ReportPercentile& p : t.fvPercentiles) {
        percentiles.push_back(Json{{"percent", p.fPercent},
                                   {"value", Number(p.fValue)},
                                   {"ci_lower", Number(p.fLower)},
                                   {"ci_upper", Number(p.fUpper)}});
    }
    target["percentiles"] = std::move(percentiles);
    target["percentile_method"] = t.fPercentileMethod;
    Json bins = Json::array();
    for (const HistogramBin& b : t.fvBins) {
        bins.push_back(Json{{"lower", Number(b.fLower)},
                            {"upper", Number(b.fUpper)},
                            {"count", Number(b.fCount)},
                            {"mean", Number(b.fMean)}});
    }
    target["histogram"] = Json{{"bin_width", Number(t.fBinWidth)}, {"bins", std::move(bins)}};
    target["sensitivity"] = InputMeasures(t.fvInputs, true);
    return target;
}

Json Categorical(const ReportCategoricalTarget& t) {
    Json target;
    target["name"] = t.fName;
    Json categories = Json::array();
    for (const ReportCategory& c : t.fvCategories) {
        categories.push_back(Json{{"label", c.fLabel},
                                  {"value", Number(c.fValue)},
                                  {"count", Number(c.fCount)},
                                  {"share", Number(c.fShare)},
                                  {"mean_probability", Number(c.fMeanProbability)}});
    }
    target["categories"] = std::move(categories);
    target["sensitivity"] = InputMeasures(t.fvInputs, false);
    return target;
}

Json Iteration(const ReportIteration& it, const SimulationReport& report) {
    Json entry;
    entry["index"] = it.fIndex;
    entry["varying_input"] = it.fVaryingInput.empty() ? Json(nullptr) : Json(it.fVaryingInput);
    entry["counts"] = Json{{"simulated", it.fSimulated},
                           {"valid", it.fValid},
                           {"invalid", it.fInvalid},
                           {"filtered", it.fFiltered}};
    entry["stopped_by_criterion"] =
        report.fbHasStopCriterion && !report.fbCancelled ? Json(it.fbStopped) : Json(nullptr);
    Json continuous = Json::array();
    for (const ReportContinuousTarget& t : it.fvContinuous) {
        continuous.push_back(Continuous(t, report.fCiLevel));
    }
    entry["continuous_targets"] = std::move(continuous);
    Json categorical = Json::array();
    for (const ReportCategoricalTarget& t : it.fvCategorical) {
        categorical.push_back(Categorical(t));
    }
    entry["categorical_targets"] = std::move(categorical);
    Json pairs = Json::array();
    for (const ReportCorrelation& c : it.fvCorrelations) {
        pairs.push_back(Json{{"first", c.fFirst},
                             {"second", c.fSecond},
                             {"plan", Number(c.fPlan)},
                             {"simulated", Number(c.fSimulated)},
                             {"normal_scale", Number(c.fNormal)},
                             {"attainable_low", Number(c.fLow)},
                             {"attainable_high", Number(c.fHigh)},
                             {"unreachable", c.fbUnreachable}});
    }
    entry["input_correlations"] = std::move(pairs);
    if (it.fvFactors.empty()) {
        entry["contingency_table"] = nullptr;
    } else {
        Json cells = Json::array();
        for (const ReportCell& c : it.fvCells) {
            cells.push_back(Json{{"categories", c.fvCategories},
                                 {"plan", Number(c.fPlan)},
                                 {"simulated", Number(c.fSimulated)}});
        }
        entry["contingency_table"] = Json{{"factors", it.fvFactors}, {"cells", std::move(cells)}};
    }
    return entry;
}

//! The document without its iterations (a null in their place).
Json ReportToJsonWithout(const SimulationReport& report);

} // namespace

Json ReportToJson(const SimulationReport& report) {
    Json doc = ReportToJsonWithout(report);
    Json iterations = Json::array();
    for (const ReportIteration& it : report.fvIterations) {
        iterations.push_back(Iteration(it, report));
    }
    doc["iterations"] = std::move(iterations);
    return doc;
}

void WriteJsonReport(std::ostream& out, const SimulationReport& report) {
    const auto text = [](const Json& value) {
        return value.dump(2, ' ', false, nlohmann::json::error_handler_t::replace);
    };
    // The document with a marker where the iterations go; they are written one by one, each
    // indented as a member of the array at depth two.
    const std::string marker = "\\u0001iterations\\u0001";
    Json doc = ReportToJsonWithout(report);
    doc["iterations"] = "\x01iterations\x01";
    const std::string whole = text(doc);
    const std::size_t at = whole.find('"' + marker + '"');
    out << whole.substr(0, at);
    if (report.fvIterations.empty()) {
        out << "[]";
    } else {
        out << "[\n";
        for (std::size_t i = 0; i < report.fvIterations.size(); ++i) {
            const std::string one = text(Iteration(report.fvIterations[i], report));
            std::size_t start = 0;
            while (start <= one.size()) {
                const std::size_t end = std::min(one.find('\n', start), one.size());
                out << "    " << one.substr(start, end - start);
                if (end == one.size()) {
                    break;
                }
                out << "\n";
                start = end + 1;
            }
            out << (i + 1 < report.fvIterations.size() ? ",\n" : "\n");
        }
        out << "  ]";
    }
    out << whole.substr(at + marker.size() + 2) << "\n";
}

namespace {

Json ReportToJsonWithout(const SimulationReport& report) {
    Json doc;
    doc["format"] = "mcsim simulation results";
    doc["version"] = kResultsFormatVersion;
    doc["plan"] = report.fPlanPath;
    doc["model"] = report.fModelPath;
    doc["settings"] = Json{{"cases", report.fCases},
                           {"seed", report.fSeed},
                           {"threads", report.fThreads},
                           {"threads_requested", report.fThreadsRequested},
                           {"confidence_level", report.fCiLevel},
                           {"tornado_delta_sd", Number(report.fTornadoDelta)},
                           {"contribution_to_variance", report.fbVariance}};
    doc["status"] = report.fbCancelled ? "cancelled" : "completed";
    doc["iterations"] = nullptr; // in its place; filled by the callers
    Json warnings = Json::array();
    for (const ReportWarning& w : report.fvWarnings) {
        warnings.push_back(Json{{"code", w.fCode},
                                {"kind", w.fbWarning ? "warning" : "error"},
                                {"text", w.fText},
                                {"count", w.fCount}});
    }
    doc["warnings"] = std::move(warnings);
    doc["model_errors"] = Json{
        {"count", report.fModelErrors},
        {"first", report.fFirstModelError.empty() ? Json(nullptr) : Json(report.fFirstModelError)}};
    return doc;
}

} // namespace

} // namespace MCHost
