#include "simulation_common/simulatespecs.h"

#include "component/mcspassert.h"
#include "mccommon/display.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <algorithm>
#include <cmath>
#include <initializer_list>
#include <unordered_map>

namespace MCMCSP_800 {

using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCXML_800::IMCVariable;

namespace {

bool IsOneOf(const std::string& name, std::initializer_list<const char*> names) {
    return std::any_of(names.begin(), names.end(),
                       [&name](const char* candidate) { return name == candidate; });
}

//! Parameters whose values are positive: shapes, scales, Weibull's a, b, c, trials, stddev.
bool IsPositiveParameter(const std::string& name) {
    return IsOneOf(name, {"shape", "shape1", "shape2", "scale", "a", "b", "c", "n", "stddev"});
}

//! Valid types of each level: continuous, categorical, ordinal/discrete. Empirical and
//! UserRanges describe data already binned by the user and are never fitted or chosen.
bool IsContinuousFitType(DistType t) {
    return t == kDistLognormal || t == kDistNormal ||
           (t >= kDistTriangular && t <= kDistExponential);
}

bool IsOrdinalFitType(DistType t) {
    return t == kDistBinomial || t == kDistNegbinomial || t == kDistPoisson || t == kDistBernoulli;
}

//! The types of 0 to 11 (the ones the fitting can estimate) are the candidates it reports.
constexpr int kNFittedTypes = 12;

std::string JoinEntries(const std::vector<std::string>& entries) {
    std::string text;
    for (const std::string& entry : entries) {
        if (!text.empty()) {
            text += ' ';
        }
        text += entry;
    }
    return text;
}

} // namespace

// ---------------------------------------------------------------------------------------------
// MCDataValue

double MCDataValue::GetNumeric() const {
    if (const auto* d = std::get_if<double>(&fValue)) {
        return *d;
    }
    if (const auto* i = std::get_if<int>(&fValue)) {
        return static_cast<double>(*i);
    }
    MCSP_ASSERT(false, "MCDataValue::GetNumeric: type != kString");
    return MCMV::Missing();
}

int MCDataValue::GetInteger() const {
    if (const auto* i = std::get_if<int>(&fValue)) {
        return *i;
    }
    MCSP_ASSERT(false, "MCDataValue::GetInteger: type == kInteger");
    return 0;
}

const std::string& MCDataValue::GetString() const {
    if (const auto* s = std::get_if<std::string>(&fValue)) {
        return *s;
    }
    MCSP_ASSERT(false, "MCDataValue::GetString: type == kString");
    static const std::string kEmpty;
    return kEmpty;
}

double MCDataValue::GetAsNumeric() const {
    if (const auto* s = std::get_if<std::string>(&fValue)) {
        double value = MCMV::Missing();
        return MCCommon_800::ParseDouble(*s, value) ? value : MCMV::Missing();
    }
    return GetNumeric();
}

std::string MCDataValue::GetAsString() const {
    if (const auto* d = std::get_if<double>(&fValue)) {
        return MCCommon_800::FormatDefault(*d);
    }
    if (const auto* i = std::get_if<int>(&fValue)) {
        return std::to_string(*i);
    }
    return *std::get_if<std::string>(&fValue);
}

// ---------------------------------------------------------------------------------------------
// DistInfoElem

void DistInfoElem::SetDistType(DistType t) {
    fDistType = t;
    fDistName = DistType2String(t);
}

void DistInfoElem::SetDistName(const std::string& name) {
    fDistName = name;
    fDistType = String2DistType(name);
}

// Parameter checks. A name is legal when it is one of the parameter names of the element's
// type. Text values are never checked, but their name must be legal. Numeric values with an
// illegal name are stored unchecked (the plan reader keeps what it cannot place); with a legal
// name they are checked against the parameter's domain:
//
//   scalar form                                list form (every value)
//   shape*, scale, a, b, c, n, stddev, thresh:  shape*, scale, a, b, c, n, stddev: > 0
//     no check                                  thresh: >= 1
//   mean of Poisson: > 0                        mean of Poisson: > 0
//   prob of NegBin: (0, 1]                      prob (any type), NegBin's type: (0, 1]
//   prob (other types), probs: [0, 1]           probs (not Empirical): [0, 1]
//   anything else: no check                     anything else: no check
//
// The comparisons are written so that a NaN fails every bounded check.

bool DistInfoElem::CHKParam(const std::string& name) const {
    if (name.empty() || fDistType == kDistUnknown) {
        return false;
    }
    std::vector<std::string> legal;
    GetDistributionParameterNames(fDistType, legal);
    return std::find(legal.begin(), legal.end(), name) != legal.end();
}

bool DistInfoElem::CHKParam(const std::string& name, double value) const {
    if (!CHKParam(name)) {
        return true;
    }
    if (IsPositiveParameter(name) || name == "thresh") {
        return true;
    }
    if (name == "mean" && fDistType == kDistPoisson) {
        return value > 0.0;
    }
    if (name == "prob" && fDistType == kDistNegbinomial) {
        return value > 0.0 && value <= 1.0;
    }
    if (name == "prob" || name == "probs") {
        return value >= 0.0 && value <= 1.0;
    }
    return true;
}

bool DistInfoElem::CHKParam(const std::string& name, const std::vector<double>& values) const {
    if (!CHKParam(name)) {
        return true;
    }
    for (const double value : values) {
        bool ok = true;
        if (IsPositiveParameter(name)) {
            ok = value > 0.0;
        } else if (name == "thresh") {
            ok = value >= 1.0;
        } else if (name == "mean" && fDistType == kDistPoisson) {
            ok = value > 0.0;
        } else if (name == "prob" || fDistType == kDistNegbinomial) {
            ok = value > 0.0 && value <= 1.0;
        } else if (name == "probs" && fDistType != kDistEmpirical) {
            ok = value >= 0.0 && value <= 1.0;
        }
        if (!ok) {
            return false;
        }
    }
    return true;
}

bool DistInfoElem::AddParameter(const std::string& name, double value) {
    if (!CHKParam(name, value)) {
        return false;
    }
    fvParamNames.push_back(name);
    fvParamValues.emplace_back(value);
    fvValueCounts.push_back(1);
    return true;
}

bool DistInfoElem::AddParameter(const std::string& name, const std::string& value) {
    if (!CHKParam(name)) {
        return false;
    }
    fvParamNames.push_back(name);
    fvParamValues.emplace_back(value);
    fvValueCounts.push_back(1);
    return true;
}

bool DistInfoElem::AddParameter(const std::string& name, const std::vector<double>& values) {
    if (!CHKParam(name, values)) {
        return false;
    }
    fvParamNames.push_back(name);
    for (const double value : values) {
        fvParamValues.emplace_back(value);
    }
    fvValueCounts.push_back(values.size());
    return true;
}

bool DistInfoElem::AddParameter(const std::string& name, const std::vector<std::string>& values) {
    if (!CHKParam(name)) {
        return false;
    }
    fvParamNames.push_back(name);
    for (const std::string& value : values) {
        fvParamValues.emplace_back(value);
    }
    fvValueCounts.push_back(values.size());
    return true;
}

std::size_t DistInfoElem::GetParamValueSize() const {
    return fvParamNames.empty() ? 0 : fvParamValues.size() / fvParamNames.size();
}

std::size_t DistInfoElem::GetParamValueSize(std::size_t i) const {
    return i < fvValueCounts.size() ? static_cast<std::size_t>(fvValueCounts[i]) : 0;
}

std::size_t DistInfoElem::GetParameterPos(std::size_t i) const {
    if (i >= fvValueCounts.size()) {
        return 0;
    }
    std::size_t pos = 0;
    for (std::size_t k = 0; k < i; ++k) {
        pos += static_cast<std::size_t>(fvValueCounts[k]);
    }
    return pos;
}

MCDataValue DistInfoElem::GetFirstValue(std::size_t i) const {
    const std::size_t pos = GetParameterPos(i);
    if (i < fvValueCounts.size() && fvValueCounts[i] > 0 && pos < fvParamValues.size()) {
        return fvParamValues[pos];
    }
    return MCDataValue(MCMV::Missing());
}

void DistInfoElem::GetParameterNameValue(std::size_t i, std::string& name, double& value) const {
    if (i >= fvParamNames.size()) {
        return;
    }
    name = fvParamNames[i];
    value = GetFirstValue(i).GetAsNumeric();
}

void DistInfoElem::GetParameterNameValue(std::size_t i, std::string& name,
                                         std::string& value) const {
    if (i >= fvParamNames.size()) {
        return;
    }
    name = fvParamNames[i];
    value = GetParamValueSize(i) > 0 ? GetFirstValue(i).GetAsString() : std::string();
}

void DistInfoElem::GetParameterNameValue(std::size_t i, std::string& name,
                                         std::vector<MCDataValue>& values) const {
    values.clear();
    if (i >= fvParamNames.size()) {
        return;
    }
    name = fvParamNames[i];
    const std::size_t pos = GetParameterPos(i);
    const std::size_t end = std::min(pos + GetParamValueSize(i), fvParamValues.size());
    values.assign(fvParamValues.begin() + static_cast<std::ptrdiff_t>(pos),
                  fvParamValues.begin() + static_cast<std::ptrdiff_t>(end));
}

void DistInfoElem::GetParameterNameValue(std::size_t i, std::string& name,
                                         std::vector<double>& values) const {
    std::vector<MCDataValue> raw;
    GetParameterNameValue(i, name, raw);
    values.clear();
    for (const MCDataValue& v : raw) {
        values.push_back(v.GetAsNumeric());
    }
}

void DistInfoElem::GetParameterNameValue(std::size_t i, std::string& name,
                                         std::vector<std::string>& values) const {
    std::vector<MCDataValue> raw;
    GetParameterNameValue(i, name, raw);
    values.clear();
    for (const MCDataValue& v : raw) {
        values.push_back(v.GetAsString());
    }
}

void DistInfoElem::GetParameterNameValues(std::vector<std::string>& names,
                                          std::vector<double>& values) const {
    names = fvParamNames;
    values.clear();
    for (std::size_t i = 0; i < fvParamNames.size(); ++i) {
        values.push_back(GetFirstValue(i).GetAsNumeric());
    }
}

void DistInfoElem::GetParameterNameValues(std::vector<std::string>& names,
                                          std::vector<MCDataValue>& values) const {
    names = fvParamNames;
    values.clear();
    for (std::size_t i = 0; i < fvParamNames.size(); ++i) {
        values.push_back(GetFirstValue(i));
    }
}

// The label pairs each name with a value in the default stream form. List distributions show
// one entry per category or interval; when the element breaks its own shape (which its
// builders never do) the assertion reports it and only the complete entries are shown.
std::string DistInfoElem::GetLabel() const {
    const std::size_t nElem = fvParamNames.size();
    std::vector<std::string> entries;
    std::string name;

    if (fDistType == kDistCategorical) {
        MCSP_ASSERT(nElem == 2, "nElem == 2");
        std::vector<std::string> cats;
        std::vector<std::string> probs;
        GetParameterNameValue(0, name, cats);
        GetParameterNameValue(1, name, probs);
        MCSP_ASSERT(cats.size() == probs.size(), "cats.size() == probs.size()");
        for (std::size_t k = 0; k < std::min(cats.size(), probs.size()); ++k) {
            entries.push_back(cats[k] + "=" + probs[k]);
        }
        return JoinEntries(entries);
    }

    if (fDistType == kDistUserRanges) {
        MCSP_ASSERT(nElem == 3, "nElem == 3");
        std::vector<std::string> mins;
        std::vector<std::string> maxs;
        std::vector<std::string> probs;
        GetParameterNameValue(0, name, mins);
        GetParameterNameValue(1, name, maxs);
        GetParameterNameValue(2, name, probs);
        MCSP_ASSERT(mins.size() == maxs.size() && maxs.size() == probs.size(),
                    "mins.size() == maxs.size() && maxs.size() == probs.size()");
        const std::size_t n = std::min({mins.size(), maxs.size(), probs.size()});
        for (std::size_t k = 0; k < n; ++k) {
            entries.push_back(mins[k] + "-" + maxs[k] + "=" + probs[k]);
        }
        return JoinEntries(entries);
    }

    if (fDistType == kDistEmpirical) {
        MCSP_ASSERT(nElem == 4, "nElem == 4");
        for (std::size_t i = 0; i < std::min<std::size_t>(nElem, 2); ++i) {
            entries.push_back(fvParamNames[i] + "=" + GetFirstValue(i).GetAsString());
        }
        return JoinEntries(entries);
    }

    if (fDistType == kDistNegbinomial) {
        MCSP_ASSERT(nElem == 3, "nElem == 3");
        for (std::size_t i = 0; i < std::min<std::size_t>(nElem, 2); ++i) {
            const std::string shown = fvParamNames[i] == "thresh" ? "threshold" : fvParamNames[i];
            entries.push_back(shown + "=" + GetFirstValue(i).GetAsString());
        }
        const bool trials = nElem > 2 && GetFirstValue(2).GetAsNumeric() == 1.0;
        return JoinEntries(entries) + (trials ? "(Trials)" : "(Failures)");
    }

    for (std::size_t i = 0; i < nElem; ++i) {
        entries.push_back(fvParamNames[i] + "=" + GetFirstValue(i).GetAsString());
    }
    return JoinEntries(entries);
}

void DistInfoElem::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("Start of display DistInfoElem object",
                       "End of display DistInfoElem object");
    DisplayS("The distribution name:", fDistName);
    for (std::size_t i = 0; i < fvParamNames.size(); ++i) {
        std::string name;
        std::vector<MCDataValue> values;
        GetParameterNameValue(i, name, values);
        DisplayS("parameter:", name);
        const bool allNumeric = std::all_of(values.begin(), values.end(), [](const MCDataValue& v) {
            return v.GetType() != MCDataValue::kString;
        });
        if (values.size() == 1) {
            if (allNumeric) {
                DisplayD("value:", values[0].GetNumeric());
            } else {
                DisplayS("value:", values[0].GetString());
            }
        } else if (allNumeric) {
            std::vector<double> numbers;
            GetParameterNameValue(i, name, numbers);
            DisplayDV("value:", numbers);
        } else {
            std::vector<std::string> texts;
            GetParameterNameValue(i, name, texts);
            DisplaySV("value:", texts);
        }
    }
}

// ---------------------------------------------------------------------------------------------
// MCValueLabels

void MCValueLabels::SetValueLabels(const std::vector<double>& values,
                                   const std::vector<std::string>& labels) {
    if (values.empty() || values.size() != labels.size()) {
        return;
    }
    fvNumLabelValues = values;
    fvValueLabels = labels;
}

void MCValueLabels::SetValueLabels(const std::vector<std::string>& values,
                                   const std::vector<std::string>& labels) {
    if (values.empty() || values.size() != labels.size()) {
        return;
    }
    fvStrLabelValues = values;
    fvValueLabels = labels;
}

void MCValueLabels::GetValueLabels(std::vector<double>& values,
                                   std::vector<std::string>& labels) const {
    values = fvNumLabelValues;
    labels = fvValueLabels;
}

void MCValueLabels::GetValueLabels(std::vector<std::string>& values,
                                   std::vector<std::string>& labels) const {
    values = fvStrLabelValues;
    labels = fvValueLabels;
}

// The two value lists share one label list, so after labels of the other kind were set a
// value may have no label of its own: it then has none ("").
std::string MCValueLabels::GetValueLabel(double value) const {
    const auto it = std::find(fvNumLabelValues.begin(), fvNumLabelValues.end(), value);
    const auto k = static_cast<std::size_t>(it - fvNumLabelValues.begin());
    return it != fvNumLabelValues.end() && k < fvValueLabels.size() ? fvValueLabels[k]
                                                                    : std::string();
}

std::string MCValueLabels::GetValueLabel(const std::string& value) const {
    const auto it = std::find(fvStrLabelValues.begin(), fvStrLabelValues.end(), value);
    const auto k = static_cast<std::size_t>(it - fvStrLabelValues.begin());
    return it != fvStrLabelValues.end() && k < fvValueLabels.size() ? fvValueLabels[k]
                                                                    : std::string();
}

// ---------------------------------------------------------------------------------------------
// SimInputSpecs

SimInputSpecs::SimInputSpecs(bool manual) : fbManual(manual), fbRequireAutofitting(!manual) {}

void SimInputSpecs::SetString(bool isString) {
    fValueType = isString ? IMCVariable::kStringStorage : IMCVariable::kNumericStorage;
}

void SimInputSpecs::SetAutofitted(bool autofit) {
    fbRequireAutofitting = autofit;
    fbManual = !autofit;
}

int SimInputSpecs::AddDistribution(DistType t) {
    if (t < kDistBinomial || t > kDistUnknown) {
        return -1;
    }
    DistInfoElem element;
    element.SetDistType(t);
    fvDistributions.push_back(std::move(element));
    return static_cast<int>(fvDistributions.size() - 1);
}

int SimInputSpecs::AddDistribution(const std::string& name) {
    return AddDistribution(String2DistType(name));
}

DistInfoElem* SimInputSpecs::GetDistribution(std::size_t i) {
    return i < fvDistributions.size() ? &fvDistributions[i] : nullptr;
}

const DistInfoElem* SimInputSpecs::GetDistribution(std::size_t i) const {
    return i < fvDistributions.size() ? &fvDistributions[i] : nullptr;
}

const DistInfoElem* SimInputSpecs::GetFinalDistribution() const {
    return fvDistributions.size() == 1 ? &fvDistributions[0] : nullptr;
}

DistType SimInputSpecs::GetFinalDistType() const {
    return fvDistributions.empty() ? kDistUnknown : fvDistributions[0].GetDistType();
}

void SimInputSpecs::GetFinalCategories(std::vector<std::string>& cats) const {
    if (fvDistributions.empty() || fvDistributions[0].GetDistType() != kDistCategorical) {
        return;
    }
    std::string name;
    fvDistributions[0].GetParameterNameValue(0, name, cats);
}

// Categories are matched by exact text. The host's numeric categories are taken in the
// default stream form (six significant digits), which is how the plan keeps numeric
// categories, so a plan category "1" matches a host category 1.0. For each distribution the
// probability of a matched category moves to the host's position and a host category the
// plan lacked gets 0. When plan categories are missing from the data, the probabilities that
// remain are divided by their sum S so that they again sum to 1; nothing is rescaled when
// S = 0 (no category matched) or S >= 1. The unmatched list and the all-invalid flag describe
// the first distribution, whose categories every other distribution shares.
void SimInputSpecs::AdjustCategories(const IMCVariable* var) {
    if (var == nullptr || fvDistributions.empty() ||
        fvDistributions[0].GetDistType() != kDistCategorical) {
        return;
    }
    const MCXML_800::MCCatNumEncoder* view = var->GetCategorical();
    const int kind = var->GetMeasure();
    if (view == nullptr || IsString() != (var->GetStorage() == IMCVariable::kStringStorage) ||
        (kind != IMCVariable::kNominalKind && kind != IMCVariable::kOrderedKind)) {
        return;
    }
    std::vector<std::string> hostCats;
    // Each plan category is found through a hash: K categories cost O(K), not O(K²). The
    // first of two equal host categories keeps the code, as a search from the front would.
    std::unordered_map<std::string, std::size_t> hostIndex;
    for (int k = 0; k < view->GetNCategories(); ++k) {
        hostCats.push_back(view->GetCategoryText(k));
        hostIndex.emplace(hostCats.back(), hostCats.size() - 1);
    }

    fvUnmatchedCategories.clear();
    for (std::size_t d = 0; d < fvDistributions.size(); ++d) {
        DistInfoElem& dist = fvDistributions[d];
        std::string catsName = "cats";
        std::string probsName = "probs";
        std::vector<std::string> planCats;
        std::vector<double> planProbs;
        dist.GetParameterNameValue(0, catsName, planCats);
        dist.GetParameterNameValue(1, probsName, planProbs);

        std::vector<double> probs(hostCats.size(), 0.0);
        double sum = 0.0;
        for (std::size_t i = 0; i < planCats.size(); ++i) {
            const auto it = hostIndex.find(planCats[i]);
            const double p = i < planProbs.size() ? planProbs[i] : 0.0;
            if (it != hostIndex.end()) {
                // Adding rather than storing keeps the sum right should the plan list a
                // category twice.
                probs[it->second] += p;
                sum += p;
            } else if (d == 0) {
                fvUnmatchedCategories.push_back(planCats[i]);
            }
        }
        fbAllCategoriesInvalid = planCats.size() == fvUnmatchedCategories.size();
        if (fvUnmatchedCategories.empty() && planCats.size() == hostCats.size()) {
            continue;
        }
        if (!fvUnmatchedCategories.empty() && sum > 0.0 && sum < 1.0) {
            for (double& p : probs) {
                p /= sum;
            }
        }
        DistInfoElem adjusted;
        adjusted.SetDistType(kDistCategorical);
        static_cast<void>(adjusted.AddParameter(catsName, hostCats));
        static_cast<void>(adjusted.AddParameter(probsName, probs));
        dist = std::move(adjusted);
    }
}

bool SimInputSpecs::SetDefaultAutofit(MeasureLevel level) {
    bool raised = false;
    for (int t = kDistBinomial; t < kNFittedTypes; ++t) {
        const auto type = static_cast<DistType>(t);
        if (CheckValidDist(type, level)) {
            fbAutofitDist[static_cast<std::size_t>(t)] = true;
            raised = true;
        }
    }
    return raised;
}

bool SimInputSpecs::AddAutofitDist(DistType t) {
    if (!CheckValidDist(t, GetDistTypeCategory(t))) {
        return false;
    }
    fbAutofitDist[static_cast<std::size_t>(t)] = true;
    return true;
}

bool SimInputSpecs::AddAutofitDist(const std::string& name) {
    const DistType t = String2DistType(name);
    return t != kDistUnknown && AddAutofitDist(t);
}

bool SimInputSpecs::HasAutofitTypeDist(DistType t) const {
    return t >= kDistBinomial && t < kNFittedTypes && fbAutofitDist[static_cast<std::size_t>(t)];
}

bool SimInputSpecs::HasAutofitTypeDist(const std::string& name) const {
    const DistType t = String2DistType(name);
    return t != kDistUnknown && HasAutofitTypeDist(t);
}

std::vector<DistType> SimInputSpecs::GetAutofitTypes() const {
    std::vector<DistType> types;
    for (int t = kDistBinomial; t < kNFittedTypes; ++t) {
        if (fbAutofitDist[static_cast<std::size_t>(t)]) {
            types.push_back(static_cast<DistType>(t));
        }
    }
    return types;
}

std::vector<std::string> SimInputSpecs::GetAutofitNames() const {
    std::vector<std::string> names;
    MapDistType2DistName(GetAutofitTypes(), names);
    return names;
}

bool SimInputSpecs::SetAutofitDist(const std::vector<DistType>& types, MeasureLevel& level) {
    if (!CheckValidDist(types)) {
        level = kLevelUnknown;
        return false;
    }
    for (const DistType t : types) {
        // The check leaves only types of a non-zero category, all within the table.
        fbAutofitDist[static_cast<std::size_t>(t)] = true;
    }
    level = types.empty() ? kLevelUnknown : GetDistTypeCategory(types.front());
    return true;
}

bool SimInputSpecs::SetAutofitDist(const std::vector<std::string>& names, MeasureLevel& level) {
    std::vector<DistType> types;
    MapDistName2DistType(names, types);
    return SetAutofitDist(types, level);
}

MeasureLevel SimInputSpecs::GetDistTypeCategory(DistType t) {
    if (IsOrdinalFitType(t)) {
        return kLevelOrdinal;
    }
    if (t == kDistCategorical) {
        return kLevelCategorical;
    }
    if (IsContinuousFitType(t) || t == kDistUserRanges) {
        return kLevelContinuous;
    }
    return kLevelUnknown;
}

bool SimInputSpecs::CheckValidDist(DistType t, MeasureLevel level) {
    switch (level) {
    case kLevelContinuous:
        return IsContinuousFitType(t);
    case kLevelCategorical:
        return t == kDistCategorical;
    case kLevelOrdinal:
        return IsOrdinalFitType(t);
    default:
        return false;
    }
}

bool SimInputSpecs::CheckValidDist(const std::vector<DistType>& types) {
    if (types.empty()) {
        return true;
    }
    const MeasureLevel first = GetDistTypeCategory(types.front());
    if (first == kLevelUnknown) {
        return false;
    }
    return std::all_of(types.begin(), types.end(),
                       [first](DistType t) { return GetDistTypeCategory(t) == first; });
}

// The effective level: the category of the lowest raised candidate of an autofit field, else
// that of its first distribution; a field without either is categorical when it stores texts
// and keeps its own level otherwise.
MeasureLevel SimInputSpecs::GetEffectMeasurementLevel(const SimInputSpecs& input) {
    MeasureLevel category = kLevelUnknown;
    const std::vector<DistType> candidates = input.GetAutofitTypes();
    if (input.IsAutofit() && !candidates.empty()) {
        category = GetDistTypeCategory(candidates.front());
    } else if (!input.fvDistributions.empty()) {
        category = GetDistTypeCategory(input.fvDistributions.front().GetDistType());
    }
    if (category != kLevelUnknown) {
        return category;
    }
    return input.IsString() ? kLevelCategorical : input.fMeasurementLevel;
}

void SimInputSpecs::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("Start of display SimInputSpecs object",
                       "End of display SimInputSpecs object");
    DisplayS("The input name:", fVarName);
    DisplayS("The input map name:", fMapVarName);
    DisplayS("The measurement level:", GetMeasureLevelDisplayWord(fMeasurementLevel));
    DisplayS("The output format:", fOutputFormat);
    DisplaySV("The associat targets:", fvAssociatTargetNames);
    DisplayB("The input field is string type:", IsString());
    DisplayB("Its output include:", fbOutput);
    if (IsAutofit()) {
        DisplayText("It is AUTOFIT.");
        std::vector<std::string> words;
        for (const DistType t : GetAutofitTypes()) {
            words.push_back(GetDistTypeDisplayWord(t));
        }
        DisplaySV("The distribution types for autofit:", words);
    } else {
        DisplayText("It is MANUAL.");
    }
    DisplayB("It is lock :", fbLocked);
    for (std::size_t i = 0; i < fvDistributions.size(); ++i) {
        DisplayI("The input distribution collection index", static_cast<long long>(i));
        fvDistributions[i].Display();
    }
    if (HasMinimum()) {
        DisplayD("The Minimum has been set and the value is:", fMinimum);
    }
    if (HasMaximum()) {
        DisplayD("The Maximum has been set and the value is:", fMaximum);
    }
}

// ---------------------------------------------------------------------------------------------
// FixedInputSpecs

void FixedInputSpecs::SetInputValue(const std::vector<double>& values) {
    fvInputValues.clear();
    for (const double value : values) {
        fvInputValues.emplace_back(value);
    }
}

void FixedInputSpecs::SetInputValue(const std::vector<std::string>& values) {
    fvInputValues.clear();
    for (const std::string& value : values) {
        fvInputValues.emplace_back(value);
    }
}

// Value i of n is low + i (high - low) / (n - 1); the ends are set exactly. When high - low
// overflows (bounds near the largest double) the same points are taken as the weighted mean
// low (1 - t) + high t, t = i / (n - 1), whose terms cannot overflow.
void FixedInputSpecs::SetFixedInput(double low, double high, int n) {
    if (!(high > low) || n < 2 || !std::isfinite(low) || !std::isfinite(high)) {
        return;
    }
    const double span = high - low;
    const double last = static_cast<double>(n - 1);
    fvInputValues.reserve(fvInputValues.size() + static_cast<std::size_t>(n));
    for (int i = 0; i < n; ++i) {
        double value = high;
        if (i == 0) {
            value = low;
        } else if (i < n - 1) {
            const double t = static_cast<double>(i) / last;
            value = std::isfinite(span) ? low + static_cast<double>(i) * span / last
                                        : low * (1.0 - t) + high * t;
        }
        fvInputValues.emplace_back(value);
    }
}

void FixedInputSpecs::GetInputValue(std::vector<double>& values) const {
    for (const MCDataValue& v : fvInputValues) {
        values.push_back(v.GetAsNumeric());
    }
}

void FixedInputSpecs::GetInputValue(std::vector<std::string>& values) const {
    for (const MCDataValue& v : fvInputValues) {
        values.push_back(v.GetAsString());
    }
}

bool FixedInputSpecs::IsNumeric() const {
    return !fvInputValues.empty() && fvInputValues.front().GetType() == MCDataValue::kNumeric;
}

bool FixedInputSpecs::IsString() const {
    return !fvInputValues.empty() && fvInputValues.front().GetType() == MCDataValue::kString;
}

void FixedInputSpecs::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("Start of display FixedInputSpecs object",
                       "End of display FixedInputSpecs object");
    DisplaySV("The associate targets :", fvAssociatTargetNames);
    DisplayS("The output format :", fOutputFormat);
    if (IsString()) {
        std::vector<std::string> texts;
        GetInputValue(texts);
        DisplaySV("The fixed values (string):", texts);
    } else {
        std::vector<double> numbers;
        GetInputValue(numbers);
        DisplayDV("The fixed values (numeric):", numbers);
    }
    DisplayB("It is lock :", fbLocked);
}

} // namespace MCMCSP_800
