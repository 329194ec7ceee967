#include "cli/fitcommand.h"

#include "cli/commandline.h"
#include "cli/fitbootstrap.h"
#include "cli/fitjson.h"
#include "cli/fitoptions.h"
#include "cli/interrupt.h"
#include "cli/progress.h"
#include "cli/statustext.h"
#include "common/atomicfile.h"
#include "common/hosterror.h"
#include "data/csvrecorditer.h"
#include "data/datadictionary.h"
#include "distribution_fitting/dfcalgorithm.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"
#include "mcthread/mcthread.h"
#include "models/formulamodel.h"
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/spcsettings.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <iomanip>
#include <map>
#include <memory>
#include <set>
#include <sstream>
#include <thread>

namespace MCHost {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCHost::FormulaModel;
using MCMCSP_800::DFCAlgorithm;
using MCMCSP_800::DFCOutputStats;
using MCMCSP_800::DFCSettings;
using MCMCSP_800::SPCSettings;
using namespace MCSPConst;

namespace {

//! Candidates of a continuous field: every continuous family the fitting knows.
const std::vector<DistType> kContinuousCandidates = {
    kDistLognormal, kDistNormal, kDistTriangular, kDistUniform,
    kDistWeibull,   kDistGamma,  kDistBeta,       kDistExponential};
//! Candidates of an ordinal field: the discrete families tested by chi-square.
const std::vector<DistType> kOrdinalCandidates = {kDistBinomial, kDistNegbinomial, kDistPoisson};
//! Seed of the bootstrap's streams when --seed is not given.
constexpr std::uint32_t kDefaultBootstrapSeed = 20240917;
//! Level of the bootstrap's percentile intervals.
constexpr double kBootstrapLevel = 0.95;
//! Rows of the contingency table printed before the rest is summarised.
constexpr std::size_t kMaxTableRows = 24;
//! Above this many fitted fields the report is compact (a line per field, the strongest
//! correlations) unless --details asks for every candidate: thousands of fields would print
//! tens of megabytes that nobody reads, and --json keeps everything.
constexpr std::size_t kCompactFields = 20;
//! Pairs listed by the compact report's correlation summary.
constexpr std::size_t kCompactPairs = 10;
//! Values of a parameter list printed in full; longer lists show their ends.
constexpr std::size_t kMaxListValues = 8;

//! Thrown out of the data dictionary's reading when the user interrupts it.
struct ReadCancelled {};

// ------------------------------------------------------------------------------------------
// Options to settings

//! Reads the --level entries NAME=LEVEL and the --factors into one map; throws on a bad one.
std::map<std::string, MeasureLevel> CollectLevels(const FitOptions& options) {
    std::map<std::string, MeasureLevel> levels;
    for (const std::string& entry : options.fvLevels) {
        const std::size_t eq = entry.rfind('=');
        MeasureLevel level = kLevelUnknown;
        if (eq == std::string::npos || eq == 0 || !ParseMeasureLevel(entry.substr(eq + 1), level)) {
            throw UsageError("--level " + entry +
                             ": expected NAME=LEVEL with LEVEL continuous, ordinal or "
                             "categorical");
        }
        levels[entry.substr(0, eq)] = level;
    }
    for (const std::string& name : options.fvFactors) {
        const auto it = levels.find(name);
        if (it != levels.end() && it->second != kLevelCategorical) {
            throw UsageError("field '" + name + "' is a factor (--factors) and " +
                             MeasureLevelName(it->second) + " (--level) at once");
        }
        levels[name] = kLevelCategorical;
    }
    return levels;
}

char ParseDelimiter(const std::string& text) {
    if (text == "tab" || text == "\\t" || text == "\t") {
        return '\t';
    }
    if (text.size() != 1 || text[0] == '"' || text[0] == '\n' || text[0] == '\r') {
        throw UsageError("--delimiter " + text + ": expected one character (or 'tab')");
    }
    return text[0];
}

//! The file's separator and how it was chosen, with what the start of the file suggests.
struct CsvLayout {
    char fDelimiter = ',';  //!< the separator used
    bool fbGuessed = false; //!< found in the first rows, not given
    SeparatorGuess fGuess;  //!< what the first rows say, read with fDelimiter
};

//! --delimiter, or the separator found in the first rows of the file.
CsvLayout ChooseSeparator(const FitOptions& options) {
    CsvLayout layout;
    layout.fbGuessed = options.fDelimiter.empty();
    std::string candidates;
    if (layout.fbGuessed) {
        for (char c : kSeparatorCandidates) {
            // A decimal comma cannot also separate the fields.
            if (!(options.fbDecimalComma && c == ',')) {
                candidates += c;
            }
        }
    } else {
        candidates = std::string(1, ParseDelimiter(options.fDelimiter));
    }
    if (options.fbDecimalComma && candidates == ",") {
        throw UsageError("--decimal-comma: the comma cannot be the decimal mark and the "
                         "separator at once; give the file's separator with --delimiter");
    }
    layout.fGuess = GuessSeparator(ReadSeparatorSample(options.fDataPath), candidates);
    layout.fDelimiter = layout.fGuess.fDelimiter;
    return layout;
}

//! What to tell the user when the header reads as one field holding another separator; ""
//! when it does not.
std::string SeparatorAdvice(const CsvLayout& layout) {
    const char other = layout.fGuess.fInOneFieldHeader;
    if (other == 0) {
        return std::string();
    }
    return "the header reads as one field holding " + SeparatorName(other) +
           ": if that separates the fields, give --delimiter " +
           (other == '\t' ? std::string("tab") : "'" + std::string(1, other) + "'") +
           (other != ',' ? " (and --decimal-comma for numbers written 3,14)" : "");
}

//! "Normal, Gamma, ..." of `types`.
std::string FamilyList(const std::vector<DistType>& types) {
    std::string out;
    for (DistType t : types) {
        out += (out.empty() ? "" : ", ") + MCMCSP_800::DistType2String(t);
    }
    return out;
}

void AppendUnique(std::vector<std::string>& list, const std::string& name) {
    if (std::find(list.begin(), list.end(), name) == list.end()) {
        list.push_back(name);
    }
}

//! The fields to fit, in the order the user named them (file order by default).
std::vector<std::string> FieldsToFit(const FitOptions& options, const DataDictionary& dict) {
    std::vector<std::string> fields;
    if (options.fvFields.empty()) {
        for (const DataField& f : dict.GetFields()) {
            if (f.fName != options.fWeight) {
                fields.push_back(f.fName);
            }
        }
    } else {
        for (const std::string& name : options.fvFields) {
            AppendUnique(fields, name);
        }
    }
    for (const std::string& name : options.fvFactors) {
        AppendUnique(fields, name);
    }
    if (!options.fWeight.empty() &&
        std::find(fields.begin(), fields.end(), options.fWeight) != fields.end()) {
        throw HostError("field '" + options.fWeight +
                        "' is the frequency weight; it cannot be fitted as well");
    }
    return fields;
}

//! Fills the fitting settings from the options and the dictionary; throws on a field that
//! cannot take its role.
void FillSettings(const FitOptions& options, const DataDictionary& dict,
                  const std::vector<std::string>& fields, MCThread_800::IMCThreadFactory& threads,
                  DFCSettings& settings) {
    const FamilyFilter filter = ParseFamilyFilter(options.fvFamilies, options.fvExclude);
    for (const std::string& name : FilterFieldNames(filter)) {
        if (std::find(fields.begin(), fields.end(), name) == fields.end()) {
            throw HostError("--families/--exclude name field '" + name +
                            "', which is not among the fitted fields");
        }
    }
    const auto candidates = [&](const std::string& name, const std::vector<DistType>& all) {
        std::vector<DistType> kept = FilterCandidates(filter, name, all);
        if (kept.empty()) {
            throw HostError("--families/--exclude leave field '" + name +
                            "' no candidate family (its level allows " + FamilyList(all) + ")");
        }
        return kept;
    };
    for (const std::string& name : fields) {
        const int index = dict.FindField(name);
        const DataField& field = dict.GetFields()[static_cast<std::size_t>(index)];
        int added = -1;
        switch (field.fLevel) {
        case kLevelCategorical: {
            const int nCategories =
                static_cast<int>(field.fbText ? field.fvTexts.size() : field.fvNumbers.size());
            if (nCategories < 1) {
                throw HostError(
                    LocatedMessage(dict.GetPath(), 0, "field '" + name + "' has no values to fit"));
            }
            added = settings.AddFactor(index, nCategories, {kDistCategorical}, kLevelCategorical,
                                       false);
            break;
        }
        case kLevelOrdinal:
            added = settings.AddCovariate(index, candidates(name, kOrdinalCandidates),
                                          kLevelOrdinal, false);
            break;
        default:
            added = settings.AddCovariate(index, candidates(name, kContinuousCandidates),
                                          kLevelContinuous, false);
            break;
        }
        if (added < 0) {
            throw HostError("field '" + name + "' cannot be fitted");
        }
    }
    if (!options.fWeight.empty()) {
        const int index = dict.FindField(options.fWeight);
        const DataField& weight = dict.GetFields()[static_cast<std::size_t>(index)];
        // A categorical field's records carry category codes, not the numbers to count by.
        if (weight.fbText || weight.fLevel == kLevelCategorical) {
            throw HostError(LocatedMessage(dict.GetPath(), 0,
                                           "the weight field '" + options.fWeight + "' " +
                                               (weight.fbText ? "holds text" : "is categorical") +
                                               ", not numbers to count rows by"));
        }
        if (!settings.SetFrequencyWeightVar(index)) {
            throw HostError("field '" + options.fWeight + "' cannot be the frequency weight");
        }
    }
    settings.SetGFType(options.fTest == "ks" ? kKolmogorovSmirnov : kAndersonDarling);
    // Interactive mode computes both statistics; the best fit still follows the type.
    settings.SetInteractiveMode(options.fTest == "both");
    settings.SetUseCrosstabs(options.fbCrosstabs);
    settings.SetExportCrosstabs(options.fbCrosstabs);
    settings.SetNCases(options.fCases);
    settings.SetBins(options.fBins);
    int nThreads = options.fThreads;
    if (nThreads < 1) {
        nThreads = static_cast<int>(std::max(1u, std::thread::hardware_concurrency()));
    }
    settings.SetMaxThreadNum(nThreads);
    settings.SetThreadFactory(&threads);
}

// ------------------------------------------------------------------------------------------
// Printing the results

std::string Num(double x) {
    return MCMV::IsMissing(x) ? std::string("missing") : MCCommon_800::FormatDefault(x);
}

//! `x` in six significant digits, or in its shortest round-trip form with `exact`.
std::string ParamNum(double x, bool exact) {
    return exact && !MCMV::IsMissing(x) ? MCCommon_800::FormatRoundTrip(x) : Num(x);
}

//! Whether the distinct numbers of `values` print distinct with six significant digits. Where
//! they do not (a Triangular fitted to values near 10^6 would read "min = 1e+06, max = 1e+06")
//! the report writes each in its shortest round-trip form instead.
bool DistinctInSixDigits(const std::vector<double>& values) {
    for (std::size_t i = 0; i < values.size(); ++i) {
        for (std::size_t j = 0; j < i; ++j) {
            if (values[i] != values[j] && Num(values[i]) == Num(values[j])) {
                return false;
            }
        }
    }
    return true;
}

//! "name = value, ..." in parameter-name order. Values beyond the names belong to the last
//! name (the proportions of an empirical distribution); a long list shows its ends only.
std::string Params(const std::vector<std::string>& names, const std::vector<double>& values) {
    std::string out;
    const std::size_t nScalars = names.empty() ? 0 : std::min(names.size() - 1, values.size());
    // The plain numbers: the scalars, and the last name's value when it is a single one.
    const std::size_t nPlain = values.size() - nScalars == 1 ? values.size() : nScalars;
    const auto plainEnd = values.begin() + static_cast<std::ptrdiff_t>(nPlain);
    const bool exact = !DistinctInSixDigits(std::vector<double>(values.begin(), plainEnd));
    for (std::size_t i = 0; i < nScalars; ++i) {
        out += (i == 0 ? "" : ", ") + names[i] + " = " + ParamNum(values[i], exact);
    }
    if (nScalars == values.size()) {
        return out;
    }
    const std::size_t nList = values.size() - nScalars;
    std::string list;
    for (std::size_t i = nScalars; i < values.size(); ++i) {
        const std::size_t k = i - nScalars;
        if (nList > kMaxListValues && k >= kMaxListValues - 2 && k < nList - 2) {
            if (k == kMaxListValues - 2) {
                list += ", ...";
            }
            continue;
        }
        list += (k == 0 ? "" : ", ") + (nList == 1 ? ParamNum(values[i], exact) : Num(values[i]));
    }
    if (nList > 1 && names.size() >= 1) {
        list = "[" + list + "]" +
               (nList > kMaxListValues ? " (" + std::to_string(nList) + " values)" : std::string());
    }
    out += (out.empty() ? "" : ", ") + (names.empty() ? "" : names.back() + " = ") + list;
    return out;
}

//! The parameters of element `e` as the report shows them.
std::string ElementParams(const DFCOutputStats::DFCVarDistElement& e) {
    return Params(ReportParamNames(e.fDistType, e.fDistParamNames), e.fDistParams);
}

//! A p-value as what it is: a computed value ("0.213"), or what a table of critical values says
//! of it: a bound ("< 0.005", "> 0.25") or the interval between two levels ("0.025–0.05").
std::string PValueText(double p, double lower, double upper) {
    const bool hasLower = !MCMV::IsMissing(lower);
    const bool hasUpper = !MCMV::IsMissing(upper);
    if (!hasLower && !hasUpper) {
        return Num(p);
    }
    if (!hasLower) {
        return "< " + Num(upper);
    }
    if (!hasUpper) {
        return "> " + Num(lower);
    }
    return lower == upper ? Num(lower) : Num(lower) + "\u2013" + Num(upper);
}

//! The statistics an element holds, as "A-D 0.21 (p 0.85)"; "" when none.
std::string Stats(const DFCOutputStats::DFCVarDistElement& e) {
    std::string out;
    auto add = [&](const char* label, double stat, const std::string& p) {
        if (MCMV::IsMissing(stat)) {
            return;
        }
        out += (out.empty() ? "" : "; ") + std::string(label) + " " + Num(stat);
        if (p != "missing") {
            out += " (p " + p + ")";
        }
    };
    add("chi-square", e.fChiSquareFit, Num(e.fChiSquarePValue));
    if (!MCMV::IsMissing(e.fChiSquarePooled)) {
        add("pooled", e.fChiSquarePooled,
            Num(e.fChiSquarePooledPValue) + ", " + Num(e.fChiSquarePooledDF) + " df");
    }
    add("A-D", e.fADFit, PValueText(e.fADPValue, e.fADPValueLower, e.fADPValueUpper));
    add("K-S", e.fKSFit, PValueText(e.fKSPValue, e.fKSPValueLower, e.fKSPValueUpper));
    return out;
}

//! "lnL -654.5, AIC 1313, BIC 1318, AICc 1313", or why the log-likelihood is missing; "" for an
//! element without either (the Empirical).
std::string Likelihood(const DFCOutputStats::DFCVarDistElement& e) {
    if (!e.fLogLikReason.empty()) {
        return "lnL missing: " + e.fLogLikReason;
    }
    if (MCMV::IsMissing(e.fLogLikelihood)) {
        return "";
    }
    // Two decimals, not six significant digits: on a large field the criteria of two
    // candidates run to millions and differ in the units.
    const auto fixed = [](double x) {
        std::ostringstream os;
        os << std::fixed << std::setprecision(2) << x;
        return os.str();
    };
    std::string out = "lnL " + fixed(e.fLogLikelihood) + ", k " +
                      std::to_string(e.fNEstimatedParams) + ", AIC " + fixed(e.fAIC) + ", BIC " +
                      fixed(e.fBIC);
    if (!MCMV::IsMissing(e.fAICc)) {
        out += ", AICc " + fixed(e.fAICc);
    }
    return out;
}

//! One candidate's line: name, parameters, statistics and likelihood.
void PrintCandidate(std::ostream& out, const std::string& lead,
                    const DFCOutputStats::DFCVarDistElement& e) {
    out << lead << std::left << std::setw(12) << e.fDistName << std::right << " "
        << ElementParams(e);
    for (const std::string& part : {Stats(e), Likelihood(e)}) {
        if (!part.empty()) {
            out << "   " << part;
        }
    }
    out << "\n";
}

//! "  std errors shape 4.18, rate 0.00459; correlation 0.992", or why they are missing; nothing
//! for a candidate without them.
void PrintStdErrors(std::ostream& out, const DFCOutputStats::DFCVarDistElement& e) {
    const std::vector<std::string> names = ReportParamNames(e.fDistType, e.fDistParamNames);
    std::string list;
    std::vector<std::size_t> shown;
    for (std::size_t i = 0; i < e.fvStdErrors.size() && i < names.size(); ++i) {
        if (!MCMV::IsMissing(e.fvStdErrors[i])) {
            list += (list.empty() ? "" : ", ") + names[i] + " " + Num(e.fvStdErrors[i]);
            shown.push_back(i);
        }
    }
    const std::size_t n = e.fDistParams.size();
    if (shown.size() == 2 && e.fvParamCorrelations.size() == n * n) {
        // Three decimals: a correlation that is 0 at the maximum shows the Hessian's rounding.
        std::ostringstream r;
        const double rho = e.fvParamCorrelations[shown[0] * n + shown[1]];
        r << std::fixed << std::setprecision(3) << (std::fabs(rho) < 5e-4 ? 0.0 : rho);
        list += "; correlation " + r.str();
    }
    if (!e.fStdErrorReason.empty()) {
        list += (list.empty() ? "missing: " : " (") + e.fStdErrorReason + (list.empty() ? "" : ")");
    }
    if (!list.empty()) {
        out << "  std errors " << list << "\n";
    }
}

std::string StatisticName(MeasureLevel level, GoodFitType type) {
    if (level != kLevelContinuous) {
        return "chi-square";
    }
    return type == kKolmogorovSmirnov ? "Kolmogorov-Smirnov" : "Anderson-Darling";
}

//! The best fit's p-value as the report shows it: with its table bounds, from its element.
std::string BestPValueText(const DFCOutputStats::DFCVarDistInfo& info, GoodFitType type) {
    const auto k = static_cast<std::size_t>(info.fDistBestType);
    if (info.fMeasureLevel != kLevelContinuous || k >= info.fDistElements.size()) {
        return Num(info.fBestFitPValue);
    }
    const DFCOutputStats::DFCVarDistElement& e = info.fDistElements[k];
    return type == kKolmogorovSmirnov
               ? PValueText(info.fBestFitPValue, e.fKSPValueLower, e.fKSPValueUpper)
               : PValueText(info.fBestFitPValue, e.fADPValueLower, e.fADPValueUpper);
}

//! The best fit's parameters, test statistic and p-value, each after two spaces when present.
void WriteBestFitFigures(std::ostream& out, const DFCOutputStats::DFCVarDistInfo& info,
                         GoodFitType type) {
    const std::string params = Params(
        ReportParamNames(info.fDistBestType, info.fDistBestParamNames), info.fDistBestParams);
    if (!params.empty()) {
        out << "  " << params;
    }
    if (!MCMV::IsMissing(info.fBestFitStat)) {
        out << "  " << StatisticName(info.fMeasureLevel, type) << " " << Num(info.fBestFitStat);
    }
    if (!MCMV::IsMissing(info.fBestFitPValue)) {
        out << ", p-value " << BestPValueText(info, type);
    }
}

void PrintCovariate(std::ostream& out, const DFCOutputStats::DFCVarDistInfo& info,
                    const DFCSettings::VarInfoElem& allowed, const DataField& field,
                    GoodFitType type, const FitDecision& decision, FitRule order) {
    out << "\n" << info.fFittedVarName << "  (" << MeasureLevelName(info.fMeasureLevel);
    if (info.fMeasureLevel == kLevelOrdinal) {
        out << ", " << field.fvNumbers.size() << " distinct values";
    }
    out << ")\n";
    if (info.fDistBestType != kDistUnknown) {
        out << "  best fit   " << info.fDistBestName;
        WriteBestFitFigures(out, info, type);
        out << "\n";
        out << "  chosen by  " << decision.fRule << ": " << decision.fWhy << "\n";
        const auto k = static_cast<std::size_t>(info.fDistBestType);
        if (k < info.fDistElements.size()) {
            PrintStdErrors(out, info.fDistElements[k]);
        }
    } else {
        out << "  best fit   none in the results\n";
    }

    std::set<DistType> listed;
    if (!info.fReportedElements.empty()) {
        out << "  ranked candidates";
        if (order != FitRule::kComponent) {
            out << " (by " << FitRuleName(order) << ")";
        }
        out << "\n";
        int rank = 0;
        for (const auto& e : info.fReportedElements) {
            listed.insert(e.fDistType);
            std::ostringstream lead;
            lead << "    " << std::setw(2) << ++rank << ". ";
            PrintCandidate(out, lead.str(), e);
        }
    }
    bool header = false;
    std::vector<const DFCOutputStats::DFCVarDistElement*> dropped;
    for (const auto& e : info.fDistElements) {
        if (listed.count(e.fDistType) != 0 || !allowed.IsDistAllowed(e.fDistType)) {
            continue;
        }
        if (!e.fbDistAllowed) {
            dropped.push_back(&e);
            continue;
        }
        if (!header) {
            out << (listed.empty() ? "  candidates (no test statistic in the results)\n"
                                   : "  other candidates\n");
            header = true;
        }
        PrintCandidate(out, "        ", e);
    }
    if (!dropped.empty()) {
        out << "  dropped\n";
        for (const DFCOutputStats::DFCVarDistElement* e : dropped) {
            const std::string reason = MCMCSP_800::DFCDropReasonText(e->fDropReason);
            out << "        " << std::left << std::setw(12) << e->fDistName << std::right << " "
                << (reason.empty() ? "no reason recorded" : reason) << "\n";
        }
    }
}

//! The compact report's line of a field: name, level, best fit and its test.
void PrintFieldLine(std::ostream& out, const DFCOutputStats::DFCVarDistInfo& info,
                    GoodFitType type) {
    out << "  " << info.fFittedVarName << "  " << MeasureLevelName(info.fMeasureLevel) << "  ";
    if (info.fDistBestType == kDistUnknown) {
        out << "no fit\n";
        return;
    }
    out << info.fDistBestName;
    if (info.fMeasureLevel == kLevelCategorical) {
        out << " (" << info.fCategoryCounts.size() << " categories)\n";
        return;
    }
    WriteBestFitFigures(out, info, type);
    out << "\n";
}

//! The compact report's correlations: how many pairs, and the strongest in size.
void PrintCorrelationSummary(std::ostream& out, const DFCOutputStats& stats) {
    const auto& covariates = stats.GetCovarDistInfo();
    const auto& corr = stats.GetCorrMatrix();
    const int n = std::min(static_cast<int>(covariates.size()), corr.GetNRows());
    if (n < 2) {
        return;
    }
    std::vector<std::pair<double, std::pair<int, int>>> pairs;
    for (int i = 1; i < n; ++i) {
        for (int j = 0; j < i; ++j) {
            const double r = corr.GetElem(i, j);
            if (!MCMV::IsMissing(r)) {
                pairs.push_back({std::fabs(r), {i, j}});
            }
        }
    }
    const std::size_t shown = std::min(kCompactPairs, pairs.size());
    std::partial_sort(pairs.begin(), pairs.begin() + static_cast<std::ptrdiff_t>(shown),
                      pairs.end(), [](const auto& a, const auto& b) { return a.first > b.first; });
    out << "\ncorrelations: " << pairs.size() << " pairs (all in the plan), the " << shown
        << " largest in size\n";
    for (std::size_t k = 0; k < shown; ++k) {
        const auto [i, j] = pairs[k].second;
        std::ostringstream cell;
        cell << std::fixed << std::setprecision(3) << corr.GetElem(i, j);
        out << "  " << covariates[static_cast<std::size_t>(i)].fFittedVarName << " ~ "
            << covariates[static_cast<std::size_t>(j)].fFittedVarName << "  " << cell.str()
            << "\n";
    }
}

void PrintFactor(std::ostream& out, const DFCOutputStats::DFCVarDistInfo& info) {
    out << "\n"
        << info.fFittedVarName << "  (categorical, " << info.fCategoryCounts.size()
        << " categories seen)\n";
    if (info.fDistBestType == kDistUnknown) {
        out << "  best fit   none in the results\n";
        return;
    }
    out << "  best fit   " << info.fDistBestName << "\n";
    for (std::size_t c = 0; c < info.fDistBestParams.size(); ++c) {
        const std::string label =
            c < info.fDistBestParamNames.size() ? info.fDistBestParamNames[c] : Num(double(c));
        out << "    " << std::left << std::setw(20) << label << std::right << " "
            << Num(info.fDistBestParams[c]) << "\n";
    }
}

void PrintCorrelations(std::ostream& out, const DFCOutputStats& stats) {
    const auto& covariates = stats.GetCovarDistInfo();
    const auto& corr = stats.GetCorrMatrix();
    const int n = std::min(static_cast<int>(covariates.size()), corr.GetNRows());
    if (n < 2) {
        return;
    }
    out << "\ncorrelations\n";
    std::size_t width = 8;
    for (int i = 0; i < n; ++i) {
        width = std::max(width, covariates[static_cast<std::size_t>(i)].fFittedVarName.size());
    }
    width = std::min<std::size_t>(width, 16);
    for (int i = 0; i < n; ++i) {
        out << "  " << std::left << std::setw(static_cast<int>(width))
            << covariates[static_cast<std::size_t>(i)].fFittedVarName.substr(0, width)
            << std::right;
        for (int j = 0; j <= i; ++j) {
            std::ostringstream cell;
            const double r = corr.GetElem(i, j);
            if (MCMV::IsMissing(r)) {
                cell << "missing";
            } else {
                cell << std::fixed << std::setprecision(3) << r;
            }
            out << " " << std::setw(8) << cell.str();
        }
        out << "\n";
    }
}

void PrintCrosstabs(std::ostream& out, const DFCOutputStats& stats) {
    const auto& rows = stats.GetCrstabsMatrix();
    const auto& probs = stats.GetCrstabsProbs();
    if (rows.empty()) {
        return;
    }
    out << "\ncontingency table of the categorical fields (" << rows.size() << " cells)\n";
    for (std::size_t r = 0; r < rows.size() && r < kMaxTableRows; ++r) {
        std::string cell;
        for (const std::string& text : rows[r]) {
            cell += (cell.empty() ? "" : " x ") + text;
        }
        out << "  " << std::left << std::setw(36) << cell << std::right << " "
            << (r < probs.size() ? Num(probs[r]) : std::string("missing")) << "\n";
    }
    if (rows.size() > kMaxTableRows) {
        out << "  ... " << rows.size() - kMaxTableRows << " more cells\n";
    }
}

//! One line per bootstrapped candidate: its 95 % intervals and the bootstrap p-value.
void PrintBootstrap(std::ostream& out, const std::vector<FitBootstrap>& boots,
                    const DFCOutputStats& results, int replicates, std::uint32_t seed) {
    if (boots.empty()) {
        return;
    }
    out << "\nparametric bootstrap: " << replicates << " refits per candidate, seed " << seed
        << ", 95 % percentile intervals\n";
    for (const FitBootstrap& b : boots) {
        const DFCOutputStats::DFCVarDistElement* e = nullptr;
        for (const auto& info : results.GetCovarDistInfo()) {
            if (info.fFittedVarName == b.fField) {
                e = &info.fDistElements[static_cast<std::size_t>(b.fType)];
            }
        }
        if (!e) {
            continue;
        }
        const std::vector<std::string> names = ReportParamNames(b.fType, e->fDistParamNames);
        out << "  " << b.fField << " " << e->fDistName << " (" << b.fReplicates << " refits):";
        for (std::size_t j = 0; j < names.size() && j < b.fvLower.size(); ++j) {
            out << (j == 0 ? " " : ", ") << names[j] << " " << Num(b.fvLower[j]) << " to "
                << Num(b.fvUpper[j]);
        }
        if (!MCMV::IsMissing(b.fPValue)) {
            out << "; bootstrap p-value " << Num(b.fPValue);
        }
        out << "\n";
    }
}

void PrintWarnings(std::ostream& out, const std::vector<MCStatus>& warnings) {
    std::map<std::pair<long, bool>, int> counts;
    for (const MCStatus& s : warnings) {
        if (!s.IsOK()) {
            ++counts[{s.GetErrorCode(), s.IsWarning()}];
        }
    }
    if (counts.empty()) {
        return;
    }
    out << "\nwarnings\n";
    for (const auto& [key, count] : counts) {
        out << "  " << std::setw(4) << count << " x " << StatusText(MCStatus(key.first, key.second))
            << " (" << key.first << ")\n";
    }
}

// ------------------------------------------------------------------------------------------
// The plan and the statistics document

//! A --fixed entry NAME=VALUE.
struct FixedValue {
    std::string fName; //!< input name
    double fValue;     //!< its value
};

std::vector<FixedValue> ParseFixed(const std::vector<std::string>& entries) {
    std::vector<FixedValue> fixed;
    for (const std::string& entry : entries) {
        const std::size_t eq = entry.find('=');
        double value = 0.0;
        if (eq == std::string::npos || eq == 0 ||
            !MCCommon_800::ParseDouble(entry.substr(eq + 1), value) || !std::isfinite(value)) {
            throw UsageError("--fixed " + entry + ": expected NAME=NUMBER");
        }
        fixed.push_back(FixedValue{entry.substr(0, eq), value});
    }
    return fixed;
}

//! The model path as the plan records it: relative to the plan's folder when possible, so the
//! two files can move together.
std::string ModelPathForPlan(const std::string& modelPath, const std::string& planPath) {
    namespace fs = std::filesystem;
    std::error_code ec;
    const fs::path planDir = fs::absolute(fs::path(planPath), ec).parent_path();
    const fs::path model = fs::absolute(fs::path(modelPath), ec);
    if (ec) {
        return modelPath;
    }
    const fs::path relative = model.lexically_relative(planDir);
    return relative.empty() ? model.string() : relative.generic_string();
}

//! Builds the plan from the fitted fields and the results, with the model file and its
//! targets. Notes about the plan go to `err`.
SPCSettings BuildPlanOf(const FitOptions& options, const DataDictionary& dict,
                        const std::vector<std::string>& fields, const DFCOutputStats& results,
                        const FormulaModel* model) {
    SPCSettings plan;
    for (const std::string& name : fields) {
        const DataField& field = dict.GetFields()[static_cast<std::size_t>(dict.FindField(name))];
        MCMCSP_800::SimInputSpecs input(false);
        input.SetVarName(name);
        input.SetVarLevel(field.fLevel);
        input.SetValueType(field.fbText ? MCXML_800::IMCVariable::kStringStorage
                                        : MCXML_800::IMCVariable::kNumericStorage);
        static_cast<void>(input.SetDefaultAutofit());
        plan.AddSimulationInput(input);
    }
    for (const FixedValue& f : ParseFixed(options.fvFixed)) {
        if (plan.CheckExist(f.fName)) {
            throw HostError("--fixed " + f.fName + ": the field is already a simulated input");
        }
        plan.AddFixedInput(f.fName, std::vector<double>{f.fValue}, "");
    }
    plan.SetAutoFitNCases(options.fCases);
    plan.SetAutoFitType(options.fTest == "ks" ? kKolmogorovSmirnov : kAndersonDarling);
    plan.SetBins(options.fBins);
    plan.SetDFCOutput(results);
    if (model) {
        plan.SetModel(ModelPathForPlan(options.fModelPath, options.fPlanPath), false);
        for (const FormulaTarget& t : model->GetTargets()) {
            if (!options.fvTargets.empty() &&
                std::find(options.fvTargets.begin(), options.fvTargets.end(), t.fName) ==
                    options.fvTargets.end()) {
                continue;
            }
            SPCSettings::ModelFileTarget target;
            target.fName = t.fName;
            target.fMeasurementLevel = t.fbCategorical ? kLevelCategorical : kLevelContinuous;
            plan.AddModelTarget(target);
        }
    }
    return plan;
}

//! The plan of the fitted fields. A field for which no distribution was fitted is left out
//! (the plan reader refuses a simulated field without one, so such a plan could be written but
//! never simulated); its correlations go with it.
SPCSettings BuildPlan(const FitOptions& options, const DataDictionary& dict,
                      const std::vector<std::string>& fields, const DFCOutputStats& results,
                      const FormulaModel* model, std::ostream& err) {
    SPCSettings plan = BuildPlanOf(options, dict, fields, results, model);
    std::vector<std::string> kept;
    for (const MCMCSP_800::SimInputSpecs& input : plan.GetSimulationInput()) {
        if (input.GetDistElementSize() == 0) {
            err << "mcsim: note: no distribution could be fitted to field '" << input.GetVarName()
                << "'; the plan leaves it out\n";
        } else {
            kept.push_back(input.GetVarName());
        }
    }
    if (kept.size() == plan.GetSimulationInput().size()) {
        return plan;
    }
    if (kept.empty()) {
        throw HostError("no distribution could be fitted to any field; no plan is written");
    }
    return BuildPlanOf(options, dict, kept, results, model);
}

//! Reads the model and checks it against the plan's inputs; throws with the model's message.
FormulaModel LoadModelFor(const FitOptions& options, const std::vector<std::string>& fields) {
    FormulaModel model = FormulaModel::Load(options.fModelPath);
    std::vector<std::string> inputs = fields;
    for (const FixedValue& f : ParseFixed(options.fvFixed)) {
        inputs.push_back(f.fName);
    }
    const std::string problem = model.CheckInputs(inputs);
    if (!problem.empty()) {
        throw HostError(problem + "; the plan's inputs are the fitted fields and the --fixed "
                                  "inputs");
    }
    for (const std::string& name : options.fvTargets) {
        const auto& targets = model.GetTargets();
        if (std::none_of(targets.begin(), targets.end(),
                         [&](const FormulaTarget& t) { return t.fName == name; })) {
            throw HostError(
                LocatedMessage(options.fModelPath, 0,
                               "--targets names '" + name + "', which the model does not define"));
        }
    }
    return model;
}

//! Problems with the options that need no file, and output files that would replace an input
//! or each other or cannot be written: all before any work.
void CheckFitOptions(const FitOptions& options) {
    if (options.fPlanPath.empty() &&
        (!options.fModelPath.empty() || !options.fvTargets.empty() || !options.fvFixed.empty())) {
        throw UsageError("--model, --targets and --fixed describe the plan: add -o PLAN.xml");
    }
    if (options.fModelPath.empty() && !options.fvTargets.empty()) {
        throw UsageError("--targets needs --model");
    }
    if (options.fSeed >= 0 && options.fBootstrap == 0) {
        throw UsageError("--seed seeds the bootstrap's draws: add --bootstrap N");
    }
    static_cast<void>(CollectLevels(options));
    static_cast<void>(ParseFixed(options.fvFixed));
    static_cast<void>(ParseFamilyFilter(options.fvFamilies, options.fvExclude));
    // A rule by an EDF statistic needs that statistic computed.
    for (const auto& [option, text] :
         {std::pair<std::string, const std::string*>{"--choose", &options.fChoose},
          {"--rank", &options.fRank}}) {
        const FitRule rule = ParseFitRule(*text, option);
        if ((rule == FitRule::kAD && options.fTest == "ks") ||
            (rule == FitRule::kKS && options.fTest == "ad")) {
            throw UsageError(option + " " + *text + " needs --test " + *text + " or --test both");
        }
    }
    CheckOutputFiles({{"data file", options.fDataPath}, {"model file", options.fModelPath}},
                     {{"-o", options.fPlanPath},
                      {"--fit-stats", options.fFitStatsPath},
                      {"--json", options.fJsonPath}});
}

//! Builds the data dictionary; a failure, or a header of one field, that looks like the wrong
//! separator gets the advice to name the right one.
DataDictionary ReadDictionary(const FitOptions& options, const CsvLayout& layout,
                              const DataOptions& dataOptions, const DataProgress& progress,
                              std::ostream& err) {
    const std::string advice = SeparatorAdvice(layout);
    try {
        DataDictionary dict = DataDictionary::Build(options.fDataPath, dataOptions, progress);
        if (!advice.empty() && dict.GetNColumns() == 1) {
            err << "mcsim: note: " << LocatedMessage(options.fDataPath, 0, advice) << "\n";
        }
        if (!options.fbDecimalComma && !layout.fGuess.fDecimalCommaCell.empty()) {
            err << "mcsim: note: "
                << LocatedMessage(options.fDataPath, 0,
                                  "cells such as '" + layout.fGuess.fDecimalCommaCell +
                                      "' are read as text; give --decimal-comma if the comma "
                                      "is the decimal mark")
                << "\n";
        }
        return dict;
    } catch (const HostError& e) {
        if (advice.empty()) {
            throw;
        }
        throw HostError(std::string(e.what()) + "; " + advice);
    }
}

//! Writes the plan (with the choices made in `chosen`), the statistics document (the
//! component's `results` as they are) and the JSON text `json`, all or none. False, with
//! nothing written, when an interrupt came before the files were put in place.
bool WriteOutputs(const FitOptions& options, const DataDictionary& dict,
                  const std::vector<std::string>& fields, const DFCOutputStats& results,
                  const DFCOutputStats& chosen, const std::string& json, const FormulaModel* model,
                  InterruptWatcher& interrupt, std::ostream& out, std::ostream& err) {
    MCMCSP_800::MCPlanXMLHandler handler;
    std::string planXml;
    if (!options.fPlanPath.empty()) {
        const SPCSettings plan = BuildPlan(options, dict, fields, chosen, model, err);
        if (!handler.WritePlanFile(planXml, &plan)) {
            throw HostError(
                LocatedMessage(options.fPlanPath, 0, "the plan could not be turned into XML"));
        }
    }
    std::string statsXml;
    if (!options.fFitStatsPath.empty() && !handler.WriteFittingOutStats(statsXml, &results)) {
        throw HostError(LocatedMessage(options.fFitStatsPath, 0,
                                       "the fitting statistics could not be turned into XML"));
    }
    std::vector<std::unique_ptr<AtomicFileWriter>> writers;
    for (const auto& [path, xml] :
         {std::pair<const std::string*, const std::string*>{&options.fPlanPath, &planXml},
          {&options.fFitStatsPath, &statsXml},
          {&options.fJsonPath, &json}}) {
        if (path->empty()) {
            continue;
        }
        writers.push_back(std::make_unique<AtomicFileWriter>(*path));
        if (!writers.back()->IsOpen()) {
            throw HostError(writers.back()->GetError());
        }
        writers.back()->GetStream() << *xml;
    }
    OutputCommitScope commits;
    if (interrupt.IsCancelled()) {
        return false;
    }
    interrupt.Finish();
    for (std::size_t i = 0; i < writers.size(); ++i) {
        if (!writers[i]->Commit()) {
            // The files go in together or not at all.
            for (std::size_t k = 0; k < i; ++k) {
                std::remove(writers[k]->GetPath().c_str());
            }
            throw HostError(writers[i]->GetError());
        }
    }
    if (!options.fPlanPath.empty()) {
        out << "\nplan written to " << options.fPlanPath << "\n";
    }
    if (!options.fFitStatsPath.empty()) {
        out << "fitting statistics written to " << options.fFitStatsPath << "\n";
    }
    if (!options.fJsonPath.empty()) {
        out << "results written to " << options.fJsonPath << "\n";
    }
    return true;
}

} // namespace

CLI::App* AddFitCommand(CLI::App& app, FitOptions& options) {
    CLI::App* fit = app.add_subcommand(
        "fit", "Fit distributions to the fields of a CSV data file and print the results");
    fit->add_option("data", options.fDataPath, "CSV data file with a header row")->required();
    fit->add_option("--fields", options.fvFields,
                    "Fields to fit, comma-separated (default: every field but the weight)")
        ->delimiter(',')
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    fit->add_option("--factors", options.fvFactors,
                    "Fields to fit as categorical factors, comma-separated")
        ->delimiter(',')
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    fit->add_option("--weight", options.fWeight, "Frequency weight field");
    fit->add_option("--level", options.fvLevels,
                    "Measurement level of a field, NAME=continuous|ordinal|categorical "
                    "(repeatable)")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    fit->add_option("--test", options.fTest,
                    "Goodness-of-fit test for continuous fields: ad (Anderson-Darling), ks "
                    "(Kolmogorov-Smirnov) or both (best fit by Anderson-Darling)")
        ->check(CLI::IsMember({"ad", "ks", "both"}))
        ->capture_default_str();
    fit->add_flag("--details", options.fbDetails,
                  "Every field's candidates and the whole correlation matrix, however many "
                  "fields are fitted (above 20 the report is a line per field)");
    fit->add_flag("--crosstabs", options.fbCrosstabs,
                  "Fit the joint contingency table of the categorical fields");
    fit->add_option("--cases", options.fCases, "Use only the first N rows (0: all)")
        ->transform(WholeNumber(0, 2147483647))
        ->capture_default_str();
    fit->add_option("--bins", options.fBins, "Histogram bins of continuous fields")
        ->transform(WholeNumber(2, 100000))
        ->capture_default_str();
    fit->add_option("--threads", options.fThreads, "Worker threads (0: one per processor)")
        ->transform(WholeNumber(0, 1024))
        ->capture_default_str();
    fit->add_option("--delimiter", options.fDelimiter,
                    "Field separator of the file ('tab' for a tab; default: the one of comma, "
                    "semicolon, tab and pipe that splits the header and first rows evenly)");
    fit->add_flag("--decimal-comma", options.fbDecimalComma,
                  "Numbers are written with a decimal comma (3,14); the separator is then not "
                  "a comma");
    fit->add_option("--max-ordinal-values", options.fMaxOrdinalValues,
                    "Whole-number fields with at most this many distinct values are ordinal")
        ->transform(WholeNumber(1, 1000))
        ->capture_default_str();
    fit->add_option("--cache-mb", options.fCacheMegabytes,
                    "Megabytes for keeping the data in memory after its first reading (0: read "
                    "the file again for every data pass)")
        ->transform(WholeNumber(0, std::int64_t{1} << 30))
        ->capture_default_str();
    fit->add_option("-o,--output", options.fPlanPath,
                    "Write the simulation plan to this file (XML)");
    fit->add_option("--fit-stats", options.fFitStatsPath,
                    "Write the fitting statistics document to this file (XML)");
    fit->add_option("--model", options.fModelPath,
                    "Formula model file to record in the plan (needs -o)");
    fit->add_option("--targets", options.fvTargets,
                    "Model targets to record in the plan, comma-separated (default: all)")
        ->delimiter(',')
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    fit->add_option("--fixed", options.fvFixed,
                    "A fixed input of the plan, NAME=NUMBER (repeatable; needs -o)")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    fit->add_option("--json", options.fJsonPath,
                    "Write every candidate's results, the choices and why, as JSON to this file");
    fit->add_option("--families", options.fvFamilies,
                    "Candidate families, FIELD=Normal,Gamma for one field or Normal,Gamma for "
                    "every field (repeatable)")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    fit->add_option("--exclude", options.fvExclude,
                    "Families left out, FIELD=Uniform for one field or Uniform for every field "
                    "(repeatable)")
        ->expected(1)
        ->multi_option_policy(CLI::MultiOptionPolicy::TakeAll);
    fit->add_option("--choose", options.fChoose,
                    "Rule of the best fit written to the plan: ad, ks, aic or bic (default: the "
                    "fitting's own, the --test statistic; chi-square for count fields)");
    fit->add_option("--rank", options.fRank,
                    "Order of the report's candidates: ad, ks, aic or bic (default: as --test)");
    fit->add_option("--empirical-below", options.fEmpiricalBelow,
                    "The plan takes a field's observed distribution when its best fit's p-value "
                    "(or the upper end of its table interval) is below P (default: off)")
        ->check(CLI::Range(0.0, 1.0));
    fit->add_option("--bootstrap", options.fBootstrap,
                    "Parametric bootstrap: N refits of every candidate for percentile intervals "
                    "and p-values (default 0: off)")
        ->transform(WholeNumber(0, 100000))
        ->capture_default_str();
    fit->add_option("--seed", options.fSeed,
                    "Seed of the bootstrap's draws (default " +
                        std::to_string(kDefaultBootstrapSeed) + ")")
        ->transform(WholeNumber(0, 4294967295LL));
    return fit;
}

int RunFit(const FitOptions& options, std::ostream& out, std::ostream& err) {
    InterruptWatcher interrupt;
    ProgressBar progress(options.fbProgress);
    try {
        CheckFitOptions(options);
        const CsvLayout layout = ChooseSeparator(options);
        DataOptions dataOptions;
        dataOptions.fDelimiter = layout.fDelimiter;
        dataOptions.fbDecimalComma = options.fbDecimalComma;
        dataOptions.fLevels = CollectLevels(options);
        dataOptions.fMaxOrdinalValues = options.fMaxOrdinalValues;
        dataOptions.fMaxCacheBytes = options.fCacheMegabytes << 20;
        if (!options.fvFields.empty()) {
            dataOptions.fvFields = options.fvFields;
            for (const std::string& name : options.fvFactors) {
                AppendUnique(dataOptions.fvFields, name);
            }
            if (!options.fWeight.empty()) {
                AppendUnique(dataOptions.fvFields, options.fWeight);
            }
        }
        const std::string& path = options.fDataPath;
        const DataDictionary dict = ReadDictionary(
            options, layout, dataOptions,
            [&](std::uint64_t done, std::uint64_t total) {
                if (interrupt.IsCancelled()) {
                    throw ReadCancelled();
                }
                progress.Show("reading " + path, done, total);
            },
            err);
        progress.Clear();
        if (!options.fWeight.empty() && dict.FindField(options.fWeight) < 0) {
            throw HostError(
                LocatedMessage(path, 0, "unknown weight field '" + options.fWeight + "'"));
        }
        if (dict.GetNRows() == 0) {
            throw HostError(LocatedMessage(path, 0, "the file has a header but no data rows"));
        }
        const std::vector<std::string> fields = FieldsToFit(options, dict);
        if (fields.empty()) {
            throw HostError(LocatedMessage(path, 0, "there is no field to fit"));
        }
        // The model is read before the fitting, so a bad model costs no data passes.
        std::unique_ptr<FormulaModel> model;
        if (!options.fModelPath.empty()) {
            model = std::make_unique<FormulaModel>(LoadModelFor(options, fields));
        }

        MCThread_800::MCStdThreadFactory threads;
        DFCSettings settings;
        FillSettings(options, dict, fields, threads, settings);
        if (options.fbCrosstabs && settings.GetFactors().size() < 2) {
            err << "mcsim: note: --crosstabs needs at least two categorical fields; no "
                   "contingency table is fitted\n";
        }

        DFCAlgorithm algorithm(settings, dict.GetVarList());
        algorithm.SetCancelPtr(&interrupt);
        interrupt.SetTarget(&algorithm);
        CsvRecordIter records(dict);
        records.SetProgress([&](int pass, std::uint64_t done, std::uint64_t total) {
            progress.Show("fitting: data pass " + std::to_string(pass), done, total);
        });
        const MCStatus status = algorithm.BuildModel(records, nullptr);
        interrupt.SetTarget(nullptr);
        progress.Clear();

        if (!records.GetError().empty()) {
            err << "mcsim: " << records.GetError() << "\n";
            return 1;
        }
        if (status.GetErrorCode() == MCCommon_800::kCancelledCode || interrupt.IsCancelled()) {
            err << "mcsim: fit cancelled during data pass " << records.GetPassCount() << " after "
                << records.GetRecordsRead() << " rows; nothing was fitted or written\n";
            return ExitStatus::kInterrupted;
        }
        // Listwise deletion can leave nothing; say so rather than pass on the step's code.
        if (algorithm.GetNRecords() > 0 && algorithm.GetNValidRecords() == 0) {
            err << "mcsim: "
                << LocatedMessage(
                       path, 0,
                       "no row has a value in every fitted field" +
                           std::string(options.fWeight.empty() ? "" : " and a positive weight"))
                << "\n";
            return 1;
        }

        if (status.IsError()) {
            err << "mcsim: the fitting failed: " << StatusText(status) << " (code "
                << status.GetErrorCode() << ")\n";
            return 1;
        }
        DFCOutputStats* results = nullptr;
        if (algorithm.GetOutputStats(results).IsError() || !results) {
            err << "mcsim: the fitting produced no results\n";
            return 1;
        }
        out << "fitted " << fields.size() << (fields.size() == 1 ? " field" : " fields") << " of "
            << path;
        if (layout.fbGuessed && layout.fDelimiter != ',') {
            out << " (separator " << SeparatorName(layout.fDelimiter)
                << ", found in its first rows)";
        }
        out << ": " << algorithm.GetNRecords() << " rows read, " << algorithm.GetNValidRecords()
            << " used";
        if (algorithm.GetNInvalidRecords() > 0) {
            out << ", " << algorithm.GetNInvalidRecords()
                << " left out (a missing value in a fitted field"
                << (options.fWeight.empty() ? "" : " or no positive weight") << ")";
        }
        if (!options.fWeight.empty()) {
            out << "; total weight " << Num(algorithm.GetValidWeight());
        }
        out << "\n";

        // The choices work on a copy: the statistics document keeps the component's results.
        DFCOutputStats chosen(*results);
        const FitRule rank = ParseFitRule(options.fRank, "--rank");
        FitJsonRun run;
        run.fChoose = ParseFitRule(options.fChoose, "--choose");
        run.fRank = rank;
        run.fEmpiricalBelow =
            options.fEmpiricalBelow < 0.0 ? MCMV::Missing() : options.fEmpiricalBelow;
        run.fvDecisions =
            ApplyFitChoice(chosen, run.fChoose, run.fEmpiricalBelow, settings.GetGFType());
        RankReported(chosen, rank);
        const std::uint32_t seed =
            options.fSeed < 0 ? kDefaultBootstrapSeed : static_cast<std::uint32_t>(options.fSeed);
        if (options.fBootstrap > 0) {
            FitBootstrapRequest request;
            request.fReplicates = options.fBootstrap;
            request.fSeed = seed;
            request.fSampleSize =
                static_cast<std::int64_t>(std::llround(algorithm.GetValidWeight()));
            request.fThreads = settings.GetMaxThreadNum();
            request.fLevel = kBootstrapLevel;
            request.fCancelled = [&interrupt] { return interrupt.IsCancelled(); };
            progress.Show("bootstrap", 0, 0);
            run.fvBootstraps = RunFitBootstrap(*results, request, threads);
            progress.Clear();
            if (interrupt.IsCancelled()) {
                err << "mcsim: fit cancelled during the bootstrap; nothing was written\n";
                return ExitStatus::kInterrupted;
            }
        }

        const auto& covInfo = settings.GetCovariateInfoElems();
        const auto& covariates = chosen.GetCovarDistInfo();
        const bool compact =
            !options.fbDetails &&
            covariates.size() + chosen.GetFactorDistInfo().size() > kCompactFields;
        if (compact) {
            out << "\n" << covariates.size() + chosen.GetFactorDistInfo().size()
                << " fields, a line each (--details for every candidate, --json for all the "
                   "results)\n";
            for (const auto& info : covariates) {
                PrintFieldLine(out, info, settings.GetGFType());
            }
            for (const auto& info : chosen.GetFactorDistInfo()) {
                PrintFieldLine(out, info, settings.GetGFType());
            }
            PrintCorrelationSummary(out, chosen);
        }
        for (std::size_t i = 0; i < covariates.size() && !compact; ++i) {
            const int index = settings.GetCovariates()[i];
            PrintCovariate(out, covariates[i], covInfo[i],
                           dict.GetFields()[static_cast<std::size_t>(index)], settings.GetGFType(),
                           run.fvDecisions[i], rank);
        }
        for (const auto& info : chosen.GetFactorDistInfo()) {
            if (!compact) {
                PrintFactor(out, info);
            }
        }
        if (!compact) {
            PrintCorrelations(out, chosen);
        }
        PrintCrosstabs(out, chosen);
        PrintBootstrap(out, run.fvBootstraps, chosen, options.fBootstrap, seed);
        PrintWarnings(out, algorithm.GetWarnings());

        std::string json;
        if (!options.fJsonPath.empty()) {
            run.fDataPath = path;
            run.fRowsRead = algorithm.GetNRecords();
            run.fRowsUsed = algorithm.GetNValidRecords();
            run.fTotalWeight = algorithm.GetValidWeight();
            run.fWeightField = options.fWeight;
            run.fTest = options.fTest;
            run.fSeed = seed;
            run.fBootstrapReplicates = options.fBootstrap;
            json = FitResultsToJson(run, chosen, algorithm.GetWarnings()).dump(2) + "\n";
        }
        if (!WriteOutputs(options, dict, fields, *results, chosen, json, model.get(), interrupt,
                          out, err)) {
            err << "mcsim: interrupted after the fitting; the results are printed above, but "
                   "no file was written\n";
            return ExitStatus::kInterrupted;
        }
        return ExitStatus::kDone;
    } catch (const ReadCancelled&) {
        progress.Clear();
        err << "mcsim: cancelled while reading " << options.fDataPath
            << "; nothing was fitted or written\n";
        return ExitStatus::kInterrupted;
    } catch (...) {
        return ReportCommandFailure(progress, err);
    }
}

} // namespace MCHost
