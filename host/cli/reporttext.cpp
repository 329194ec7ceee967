// The readable report of `mcsim simulate` (WriteTextReport of report.h).
#include "cli/report.h"

#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <algorithm>
#include <cmath>
#include <iomanip>
#include <sstream>

namespace MCHost {

using MCCommon_800::MCMV;

namespace {

//! Rows of the text histogram asked for; the round row width makes it 10 to 20.
constexpr int kHistogramRows = 14;
//! Width of the longest histogram bar.
constexpr int kBarWidth = 40;
//! Pairs of inputs and contingency cells printed before the rest is summarised.
constexpr std::size_t kMaxPairs = 45;
constexpr std::size_t kMaxCells = 24;

std::string Num(double x) {
    return MCMV::IsMissing(x) ? std::string("missing") : MCCommon_800::FormatDefault(x);
}

//! `x` with `decimals` digits after the point ("missing" for the missing value).
std::string Fixed(double x, int decimals, bool sign = false) {
    if (MCMV::IsMissing(x)) {
        return "missing";
    }
    std::ostringstream os;
    os << std::fixed << std::setprecision(decimals) << (sign ? std::showpos : std::noshowpos) << x;
    return os.str();
}

//! Cells of one table row, left-aligned first column, the rest right-aligned.
void WriteRow(std::ostream& out, const std::string& indent, const std::vector<std::string>& cells,
              const std::vector<std::size_t>& widths) {
    out << indent;
    for (std::size_t i = 0; i < cells.size(); ++i) {
        if (i == 0) {
            out << std::left << std::setw(static_cast<int>(widths[i])) << cells[i] << std::right;
        } else {
            out << "  " << std::setw(static_cast<int>(widths[i])) << cells[i];
        }
    }
    out << "\n";
}

//! Prints `rows` (the first one the header) as aligned columns.
void WriteTable(std::ostream& out, const std::string& indent,
                const std::vector<std::vector<std::string>>& rows) {
    std::vector<std::size_t> widths;
    for (const auto& row : rows) {
        widths.resize(std::max(widths.size(), row.size()), 0);
        for (std::size_t i = 0; i < row.size(); ++i) {
            widths[i] = std::max(widths[i], row[i].size());
        }
    }
    for (const auto& row : rows) {
        WriteRow(out, indent, row, widths);
    }
}

std::string PercentText(double level) {
    return MCCommon_800::FormatDefault(level * 100.0) + "%";
}

void WriteHistogram(std::ostream& out, const ReportContinuousTarget& t) {
    const std::vector<HistogramRow> rows =
        GroupHistogram(t.fvBins, t.fMinimum, t.fMaximum, kHistogramRows);
    if (rows.empty()) {
        return;
    }
    double largest = 0.0;
    std::size_t lowerWidth = 0;
    std::size_t upperWidth = 0;
    for (const HistogramRow& r : rows) {
        largest = std::max(largest, r.fCount);
        lowerWidth = std::max(lowerWidth, Num(r.fLower).size());
        upperWidth = std::max(upperWidth, Num(r.fUpper).size());
    }
    out << "  histogram\n";
    for (const HistogramRow& r : rows) {
        const int bar =
            largest > 0.0 ? static_cast<int>(std::lround(r.fCount / largest * kBarWidth)) : 0;
        out << "    " << std::setw(static_cast<int>(lowerWidth)) << Num(r.fLower) << " to "
            << std::setw(static_cast<int>(upperWidth)) << Num(r.fUpper) << "  "
            << std::string(static_cast<std::size_t>(bar), '#')
            << std::string(static_cast<std::size_t>(kBarWidth - bar), ' ') << "  " << Num(r.fCount)
            << "\n";
    }
}

void WriteInputMeasures(std::ostream& out, const std::vector<ReportInputMeasures>& inputs,
                        const SimulationReport& report, bool continuous) {
    if (inputs.empty()) {
        return;
    }
    const bool delta = continuous && !MCMV::IsMissing(report.fTornadoDelta);
    const bool variance = continuous && report.fbVariance;
    const bool firstOrder =
        std::any_of(inputs.begin(), inputs.end(),
                    [](const ReportInputMeasures& m) { return !MCMV::IsMissing(m.fFirstOrder); });
    const std::string d = Num(report.fTornadoDelta);
    std::vector<std::vector<std::string>> rows;
    std::vector<std::string> header{"input", "correlation"};
    if (delta) {
        header.push_back("change at -" + d + " sd");
        header.push_back("change at +" + d + " sd");
    }
    if (variance) {
        header.push_back("variance share");
    }
    if (firstOrder) {
        header.push_back("first-order index");
    }
    rows.push_back(header);
    for (const ReportInputMeasures& m : inputs) {
        const auto figure = [](double x, int digits) {
            return MCMV::IsMissing(x) ? std::string("-") : Fixed(x, digits);
        };
        std::vector<std::string> row{m.fInput, figure(m.fCorrelation, 3)};
        if (delta) {
            row.push_back(MCMV::IsMissing(m.fDeltaNegative) ? "-" : Num(m.fDeltaNegative));
            row.push_back(MCMV::IsMissing(m.fDeltaPositive) ? "-" : Num(m.fDeltaPositive));
        }
        if (variance) {
            row.push_back(MCMV::IsMissing(m.fVarianceShare) ? "-" : Fixed(m.fVarianceShare, 3));
        }
        if (firstOrder) {
            row.push_back(figure(m.fFirstOrder, 3));
        }
        rows.push_back(std::move(row));
    }
    out << "  sensitivity to the simulated inputs\n";
    WriteTable(out, "    ", rows);
    // Cases a measure left out, so that a reader knows on how many cases each figure rests.
    for (const ReportInputMeasures& m : inputs) {
        const std::int64_t ds = delta ? m.fDeltaSkipped : 0;
        const std::int64_t vs = variance ? m.fVarianceSkipped : 0;
        if (ds > 0 || vs > 0) {
            out << "    " << m.fInput << ":";
            if (ds > 0) {
                out << " " << ds << " cases left out of the changes";
            }
            if (vs > 0) {
                out << (ds > 0 ? "," : "") << " " << vs << " cases left out of the variance share";
            }
            out << " (a shifted value outside the input's range, or a variant the model could not"
                << " score)";
            out << "\n";
        }
    }
}

void WriteContinuous(std::ostream& out, const ReportContinuousTarget& t,
                     const SimulationReport& report) {
    out << "\n" << t.fName << "  (continuous)\n";
    std::vector<std::vector<std::string>> rows{
        {"mean", Num(t.fMean),
         PercentText(report.fCiLevel) + " CI " + Num(t.fCiLower) + " to " + Num(t.fCiUpper)},
        {"std dev", Num(t.fStdDev), ""},
        {"minimum", Num(t.fMinimum), ""},
        {"maximum", Num(t.fMaximum), ""}};
    for (auto& row : rows) {
        if (row[2].empty()) {
            row.pop_back();
        }
    }
    WriteTable(out, "  ", rows);
    if (!t.fvPercentiles.empty() && t.fPercentileMethod == "histogram") {
        out << "  percentiles (read from the histogram, exact to within " << Num(t.fBinWidth)
            << ")\n   ";
        for (const ReportPercentile& p : t.fvPercentiles) {
            out << "  " << MCCommon_800::FormatDefault(p.fPercent) << "%: " << Num(p.fValue);
        }
        out << "\n";
    } else if (!t.fvPercentiles.empty()) {
        out << "  percentiles ("
            << (t.fPercentileMethod == "exact" ? "exact order statistics"
                                               : "from a summary, rank error at most 0.0001")
            << "; " << PercentText(report.fCiLevel)
            << " distribution-free interval, - where the cases cannot give an end)\n";
        std::vector<std::vector<std::string>> prows;
        for (const ReportPercentile& p : t.fvPercentiles) {
            const auto end = [](double x) {
                return MCMV::IsMissing(x) ? std::string("-") : Num(x);
            };
            prows.push_back({MCCommon_800::FormatDefault(p.fPercent) + "%", Num(p.fValue),
                             end(p.fLower) + " to " + end(p.fUpper)});
        }
        WriteTable(out, "    ", prows);
    }
    WriteHistogram(out, t);
    WriteInputMeasures(out, t.fvInputs, report, true);
}

void WriteCategorical(std::ostream& out, const ReportCategoricalTarget& t,
                      const SimulationReport& report) {
    out << "\n" << t.fName << "  (categorical)\n";
    const bool probabilities =
        std::any_of(t.fvCategories.begin(), t.fvCategories.end(),
                    [](const ReportCategory& c) { return !MCMV::IsMissing(c.fMeanProbability); });
    std::vector<std::vector<std::string>> rows;
    rows.push_back({"category", "cases", "share"});
    if (probabilities) {
        rows.back().push_back("mean probability");
    }
    for (const ReportCategory& c : t.fvCategories) {
        rows.push_back({c.fLabel, Num(c.fCount), Fixed(c.fShare, 4)});
        if (probabilities) {
            rows.back().push_back(Fixed(c.fMeanProbability, 4));
        }
    }
    WriteTable(out, "  ", rows);
    WriteInputMeasures(out, t.fvInputs, report, false);
}

//! The pairs worth a look: a planned correlation outside the attainable range, or a simulated
//! one more than 3 standard errors from the plan; the others are counted.
void WriteCorrelations(std::ostream& out, const ReportIteration& it) {
    if (it.fvCorrelations.empty()) {
        return;
    }
    std::vector<std::vector<std::string>> rows{
        {"inputs", "plan", "attainable", "normal scale", "simulated", ""}};
    std::size_t others = 0;
    for (const ReportCorrelation& c : it.fvCorrelations) {
        const bool off = !MCMV::IsMissing(c.fDeviation) && c.fDeviation > 3.0;
        if (!c.fbUnreachable && !off) {
            ++others;
            continue;
        }
        if (rows.size() > kMaxPairs) {
            continue;
        }
        const std::string range =
            MCMV::IsMissing(c.fLow) ? "-" : "[" + Fixed(c.fLow, 3) + ", " + Fixed(c.fHigh, 3) + "]";
        rows.push_back(
            {c.fFirst + " ~ " + c.fSecond, Fixed(c.fPlan, 3), range,
             MCMV::IsMissing(c.fNormal) ? "-" : Fixed(c.fNormal, 4), Fixed(c.fSimulated, 3),
             c.fbUnreachable ? "unreachable" : "off by " + Fixed(c.fDeviation, 1) + " se"});
    }
    out << "\ncorrelations of the simulated inputs\n";
    if (rows.size() > 1) {
        WriteTable(out, "  ", rows);
    }
    const std::size_t flagged = it.fvCorrelations.size() - others;
    if (flagged + 1 > rows.size()) {
        out << "  ... " << flagged + 1 - rows.size()
            << " more such pairs (all in the JSON results)\n";
    }
    out << "  " << others << (others == 1 ? " pair" : " pairs")
        << " within 3 standard errors of the plan or with none planned (all in the JSON results)\n";
}

void WriteCells(std::ostream& out, const ReportIteration& it) {
    if (it.fvCells.empty()) {
        return;
    }
    std::string factors;
    for (const std::string& f : it.fvFactors) {
        factors += (factors.empty() ? "" : " x ") + f;
    }
    out << "\ncontingency table of " << factors << "\n";
    std::vector<std::vector<std::string>> rows{{"cell", "plan", "simulated"}};
    for (std::size_t r = 0; r < it.fvCells.size() && r < kMaxCells; ++r) {
        std::string cell;
        for (const std::string& text : it.fvCells[r].fvCategories) {
            cell += (cell.empty() ? "" : " x ") + text;
        }
        rows.push_back({cell, Fixed(it.fvCells[r].fPlan, 4), Fixed(it.fvCells[r].fSimulated, 4)});
    }
    WriteTable(out, "  ", rows);
    if (it.fvCells.size() > kMaxCells) {
        out << "  ... " << it.fvCells.size() - kMaxCells
            << " more cells (all of them in the JSON results)\n";
    }
}

void WriteIteration(std::ostream& out, const ReportIteration& it, const SimulationReport& report) {
    if (report.fvIterations.size() > 1) {
        out << "\n=== iteration " << it.fIndex + 1 << " of " << report.fvIterations.size();
        if (!it.fVaryingInput.empty()) {
            out << ": " << it.fVaryingInput;
        }
        out << " ===\n";
    }
    out << "\ncases: " << it.fSimulated << " simulated, " << it.fValid << " valid, " << it.fInvalid
        << " invalid; " << it.fFiltered << " draws rejected by bounds or target filters\n";
    if (report.fbHasStopCriterion && !report.fbCancelled) {
        out << "stop criterion: "
            << (it.fbStopped ? "met, it ended the run" : "not met, the case limit ended the run")
            << "\n";
    }
    for (const ReportContinuousTarget& t : it.fvContinuous) {
        WriteContinuous(out, t, report);
    }
    for (const ReportCategoricalTarget& t : it.fvCategorical) {
        WriteCategorical(out, t, report);
    }
    WriteCorrelations(out, it);
    WriteCells(out, it);
}

} // namespace

void WriteTextReport(std::ostream& out, const SimulationReport& report) {
    out << "simulation of " << report.fPlanPath << " with the model " << report.fModelPath << "\n  "
        << report.fCases << " cases" << (report.fvIterations.size() > 1 ? " per iteration" : "")
        << ", seed " << report.fSeed << ", " << report.fThreads
        << (report.fThreads == 1 ? " thread" : " threads")
        << (report.fThreads < report.fThreadsRequested
                ? " (" + std::to_string(report.fThreadsRequested) +
                      " allowed; this plan runs on one)"
                : std::string())
        << ", " << PercentText(report.fCiLevel) << " confidence intervals";
    if (!MCMV::IsMissing(report.fTornadoDelta)) {
        out << ", tornado delta " << Num(report.fTornadoDelta) << " sd";
    }
    if (report.fbVariance) {
        out << ", contribution to variance";
    }
    out << "\n";
    if (report.fbCancelled) {
        out << "\nthe run was interrupted: the results below cover the cases simulated until "
               "then\n";
    }
    for (const ReportIteration& it : report.fvIterations) {
        WriteIteration(out, it, report);
    }
    if (!report.fvWarnings.empty()) {
        out << "\nwarnings\n";
        for (const ReportWarning& w : report.fvWarnings) {
            out << "  " << std::setw(4) << w.fCount << " x " << w.fText << " (" << w.fCode << ")\n";
        }
    }
    if (report.fModelErrors > 0) {
        out << "\nthe model failed on " << report.fModelErrors
            << (report.fModelErrors == 1 ? " case" : " cases")
            << "; the first: " << report.fFirstModelError << "\n";
    }
}

} // namespace MCHost
