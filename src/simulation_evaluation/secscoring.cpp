// SECSimulator: the score computer and the targets, the pilot and chart ranges, the sink and
// the case loop. The statistics of the accepted cases are in secaccumulate.cpp.
#include "simulation_evaluation/secsimulator.h"

#include "component/mcspassert.h"
#include "component/mcspcomponent.h"
#include "mccommon/mcmv.h"
#include "mcmath/mcdistfun.h"
#include "simulation_common/secreporter.h"
#include "simulation_evaluation/secsimdetail.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCMath_800::MCContStats;
using MCXML_800::IMCScoreComputer;
using MCXML_800::Value;
using namespace detail;

namespace {

const char* const kPrediction = "prediction";
const char* const kProbCategory = "probcategory";
const char* const kClusterId = "clustering-clusterid";

//! Bins of a target's histogram and of the axes of a scatter plot.
constexpr int kHistogramBins = 1000;
constexpr int kScatterBins = 200;
//! Scatter plots filled over all iterations of a run.
constexpr int kScatterBudget = 100;
//! Cases buffered before they are handed to a sink under the lock.
constexpr int kSinkBatch = 10000;
//! Cases between two advances of the shared progress counter.
constexpr std::int64_t kProgressStep = 1024;

bool IsCategoricalMeasure(const MCXML_800::IMCVariable* variable) {
    return variable != nullptr && (variable->GetMeasure() == 2 || variable->GetMeasure() == 3);
}

bool IsFiniteBound(double value) {
    return std::isfinite(value) && value > std::numeric_limits<double>::lowest() &&
           value < std::numeric_limits<double>::max();
}

} // namespace

// ---- Preparation ------------------------------------------------------------------------------

MCStatus SECSimulator::PrepareForSimulation() {
    ResetCaseValues();
    const double level = fpSettings->GetCiLevel();
    fCiZ = MCMath_800::MCDistFun::IdfNorm(level * 0.5 + 0.5, 0.0, 1.0);
    const MCStatus status = PrepareCorrelationModel();
    if (status.IsError()) {
        fStatus = status;
    }
    return status;
}

MCStatus SECSimulator::CreateScoreComputer(MCXML_800::IMCSPScoreFactory* factory) {
    if (factory == nullptr) {
        return MCStatus();
    }
    fpScoreComputer = factory->CreateScoreComputer();
    if (!fpScoreComputer) {
        return MCStatus(MCSPStatus::kNoData, false);
    }
    fpOutputStats->SetModelType(fpScoreComputer->GetModelType());
    return MCStatus();
}

MCStatus SECSimulator::PrepareScoring() {
    MCStatus status = PrepareGeneration();
    if (status.IsError()) {
        return status;
    }
    status = StartScoring();
    if (status.IsError()) {
        return fStatus = status;
    }
    status = ProcessTargetInfo();
    if (status.IsError()) {
        return fStatus = status;
    }
    if (fpTemplate != nullptr) {
        CopyTemplatesFrom(*fpTemplate);
        CreateChartAccumulators();
    }
    if (fpSink != nullptr && fpLock != nullptr) {
        fvSinkInputs.reserve(fvSimInputs.size() * kSinkBatch);
        fvSinkValues.reserve(static_cast<std::size_t>(fNValuesPerCase) * kSinkBatch);
    }
    return MCStatus();
}

MCStatus SECSimulator::StartScoring() {
    fInputRecord.Clear();
    for (const SimInput& input : fvSimInputs) {
        const MCXML_800::IMCVariable* variable = fpVarList->GetVarAt(input.fVarIndex);
        fInputRecord.Add(variable != nullptr ? variable->GetName() : input.fName,
                         Value(MCMV::Missing()));
    }
    for (const FixedInput& input : fvFixedInputs) {
        const MCXML_800::IMCVariable* variable = fpVarList->GetVarAt(input.fVarIndex);
        const std::string& name = variable != nullptr ? variable->GetName() : input.fName;
        fInputRecord.Add(name, input.fbString ? Value(input.fText) : Value(input.fNumber));
    }
    MCSP_ASSERT(static_cast<std::size_t>(fInputRecord.Size()) ==
                    fvSimInputs.size() + fvFixedInputs.size(),
                "SECSimulator::StartScoring: input names are unique");
    fvLastCode.assign(fvSimInputs.size(), -1);

    fOutputRecord.Clear();
    fPredictedIndex = -1;
    fProbIndex = -1;
    if (!fpScoreComputer) {
        return MCStatus();
    }
    const MCStatus status = fpScoreComputer->PrepareOutputRecord(fInputRecord, fOutputRecord);
    if (status.IsError()) {
        return status;
    }
    // Of a predictive model only the prediction, its probabilities and a cluster identifier are
    // targets; a transformation's every field is one.
    if (fpScoreComputer->GetModelType() != IMCScoreComputer::kTransformsOnly) {
        for (int i = fOutputRecord.Size() - 1; i >= 0; --i) {
            const std::string name = fOutputRecord.GetName(i);
            if (name != kPrediction && name != kProbCategory && name != kClusterId) {
                fOutputRecord.Remove(name);
            }
        }
    }
    fPredictedIndex = fOutputRecord.IndexOf(kClusterId);
    if (fPredictedIndex < 0) {
        fPredictedIndex = fOutputRecord.IndexOf(kPrediction);
    }
    fProbIndex = fOutputRecord.IndexOf(kProbCategory);
    return MCStatus();
}

MCStatus SECSimulator::ProcessTargetInfo() {
    fvTargets.clear();
    fbHostDriven = false;
    fNValuesPerCase = 0;
    if (fpScoreComputer) {
        if (fPredictedIndex < 0) {
            // Every field of the score is read as a number; the computer's target variables
            // name the targets, one per field.
            fNValuesPerCase = fOutputRecord.Size();
            const int nTargets = fpScoreComputer->GetNTargets();
            MCSP_ASSERT(nTargets <= fNValuesPerCase,
                        "SECSimulator: the score has a field per target variable");
            for (int i = 0; i < std::min(nTargets, fNValuesPerCase); ++i) {
                const MCXML_800::IMCVariable* variable = fpScoreComputer->GetTargetVariable(i);
                MCSP_ASSERT(variable != nullptr, "SECSimulator: a target variable exists");
                Target target;
                target.fName = variable != nullptr ? variable->GetName() : fOutputRecord.GetName(i);
                target.fpVariable = variable;
                target.fbCategorical = IsCategoricalMeasure(variable);
                target.fValuePos = i;
                fvTargets.push_back(target);
            }
        } else {
            // One target, the prediction (or the cluster identifier).
            const MCXML_800::IMCVariable* variable = fpScoreComputer->GetNTargets() > 0
                                                         ? fpScoreComputer->GetTargetVariable(0)
                                                         : nullptr;
            Target target;
            target.fValuePos = 0;
            target.fpVariable = variable;
            fNValuesPerCase = 1;
            if (variable != nullptr) {
                target.fName = variable->GetName();
                target.fbCategorical = IsCategoricalMeasure(variable);
            } else {
                // A clustering model names no target: the plan's first model target.
                std::vector<SPCSettings::ModelFileTarget> planTargets;
                fpPlan->GetModelTargets(planTargets);
                target.fName = planTargets.empty() ? std::string(kClusterId) : planTargets[0].fName;
                target.fbCategorical = true;
            }
            const MCXML_800::MCCatNumEncoder* encoder =
                variable != nullptr ? variable->GetCategorical() : nullptr;
            if (target.fbCategorical && encoder != nullptr &&
                fpScoreComputer->GetAlgorithmName() != "COXREG") {
                for (int c = 0; c < encoder->GetNCategories(); ++c) {
                    target.fvLabels.push_back(encoder->GetCategoryText(c));
                }
                if (fProbIndex >= 0) {
                    target.fNProbs = encoder->GetNCategories();
                    fNValuesPerCase += target.fNProbs;
                }
            }
            fvTargets.push_back(target);
        }
    }
    return FinishTargetSetup();
}

MCStatus SECSimulator::PrepareTargetInfo() {
    fvTargets.clear();
    fbHostDriven = true;
    fNValuesPerCase = 0;
    fStartRecords = 0;
    fStartValid = 0;
    fbChartsReady = false;
    std::vector<SPCSettings::ModelFileTarget> planTargets;
    fpPlan->GetModelTargets(planTargets);
    for (const SPCSettings::ModelFileTarget& planTarget : planTargets) {
        Target target;
        target.fName = planTarget.fName;
        target.fpVariable = fpVarList->GetVariable(planTarget.fName);
        MCSP_ASSERT(target.fpVariable != nullptr,
                    "SECSimulator::PrepareTargetInfo: each target is a variable of the host");
        target.fbCategorical = target.fpVariable != nullptr
                                   ? IsCategoricalMeasure(target.fpVariable)
                                   : planTarget.fMeasurementLevel != MCSPConst::kLevelContinuous &&
                                         planTarget.fMeasurementLevel != MCSPConst::kLevelUnknown;
        target.fValuePos = fNValuesPerCase++;
        const MCXML_800::MCCatNumEncoder* encoder =
            target.fpVariable != nullptr ? target.fpVariable->GetCategorical() : nullptr;
        if (target.fbCategorical && encoder != nullptr) {
            for (int c = 0; c < encoder->GetNCategories(); ++c) {
                target.fvLabels.push_back(encoder->GetCategoryText(c));
            }
            if (fpSettings->GetUseTargCatProbs()) {
                target.fNProbs = encoder->GetNCategories();
                fNValuesPerCase += target.fNProbs;
            }
        }
        fvTargets.push_back(target);
    }
    const MCStatus status = FinishTargetSetup();
    const std::size_t nInputs = fvSimInputs.size();
    fvStartInputStats.assign(nInputs, MCContStats());
    fvStartTargetStats.assign(fvTargets.size(), MCContStats());
    return status;
}

void SECSimulator::ApplyTargetFilter(Target& target) const {
    target.fbHasFilter = false;
    target.fFilterLow = std::numeric_limits<double>::lowest();
    target.fFilterHigh = std::numeric_limits<double>::max();
    std::vector<SPCSettings::ModelFileTarget> planTargets;
    fpPlan->GetModelTargets(planTargets);
    for (const SPCSettings::ModelFileTarget& planTarget : planTargets) {
        if (planTarget.fName != target.fName) {
            continue;
        }
        target.fbScatter = fpSettings->ScatterplotDisplay() && !planTarget.fbExcludeFromOutput;
        if (planTarget.fbHasTargetFilter) {
            target.fbHasFilter = true;
            target.fFilterLow = planTarget.fFilterLow;
            target.fFilterHigh = planTarget.fFilterHigh;
            target.fbIncludeLow = planTarget.fbIncludeLow;
            target.fbIncludeHigh = planTarget.fbIncludeHigh;
        }
        return;
    }
    target.fbScatter = fpSettings->ScatterplotDisplay();
}

MCStatus SECSimulator::FinishTargetSetup() {
    SECOutputStats& results = *fpOutputStats;
    std::vector<SECContinuousTargetInfo>& cont = results.GetContTargetInfo();
    std::vector<SECCategoricalTargetInfo>& cat = results.GetCateTargetInfo();
    cont.clear();
    cat.clear();
    const std::size_t nCorrelated = fvCorrelated.size();
    for (Target& target : fvTargets) {
        ApplyTargetFilter(target);
        target.fChartMin = IsFiniteBound(target.fFilterLow) ? target.fFilterLow : MCMV::Missing();
        target.fChartMax = IsFiniteBound(target.fFilterHigh) ? target.fFilterHigh : MCMV::Missing();
        if (target.fbCategorical) {
            if (!target.fvLabels.empty()) {
                target.fChartMin = -0.5;
                target.fChartMax = static_cast<double>(target.fvLabels.size()) - 0.5;
            }
            target.fListIndex = static_cast<int>(cat.size());
            SECCategoricalTargetInfo info;
            info.fName = target.fName;
            const MCXML_800::MCCatNumEncoder* encoder =
                target.fpVariable != nullptr ? target.fpVariable->GetCategorical() : nullptr;
            for (std::size_t c = 0; c < target.fvLabels.size(); ++c) {
                const double number = encoder != nullptr
                                          ? encoder->GetCategoryNumber(static_cast<int>(c))
                                          : MCMV::Missing();
                info.fvCategoryValues.push_back(MCMV::IsMissing(number) ? static_cast<double>(c)
                                                                        : number);
            }
            info.fvProbStats.assign(static_cast<std::size_t>(target.fNProbs), MCContStats());
            info.fvPearsonCorrs.assign(nCorrelated, MCMV::Missing());
            cat.push_back(std::move(info));
        } else {
            target.fListIndex = static_cast<int>(cont.size());
            SECContinuousTargetInfo info;
            info.fName = target.fName;
            info.fvPearsonCorrs.assign(nCorrelated, MCMV::Missing());
            cont.push_back(std::move(info));
        }
    }
    results.GetCovarStats().assign(nCorrelated, MCContStats());
    fpCovarStats = &results.GetCovarStats();
    fvCovarMin.assign(nCorrelated, std::numeric_limits<double>::infinity());
    fvCovarMax.assign(nCorrelated, -std::numeric_limits<double>::infinity());
    fpContInfo = &cont;
    fpCatInfo = &cat;
    fProvMeans = MCMath_800::MCProvMeans(static_cast<int>(nCorrelated + fvTargets.size()), true);
    fvCombined.assign(nCorrelated + fvTargets.size(), MCMV::Missing());
    fCase.fvValues.assign(static_cast<std::size_t>(fNValuesPerCase), MCMV::Missing());
    fvCellCounts.assign(fbHasCrosstab ? fCrosstab.fvCumTable.size() - 1 : 0, 0.0);
    fSimCaseCount = fFilteredCaseCount = fValidCaseCount = fInvalidCaseCount = 0;
    fbStopped = false;

    fvOutputInputs.clear();
    fvInputChartMin.clear();
    fvInputChartMax.clear();
    for (std::size_t i = 0; i < fvSimInputs.size(); ++i) {
        if (fvSimInputs[i].fbOutput) {
            fvOutputInputs.push_back(static_cast<int>(i));
        }
        fvInputChartMin.push_back(fvSimInputs[i].fLower);
        fvInputChartMax.push_back(fvSimInputs[i].fUpper);
    }
    ApplyScatterBudget();
    SetupStopCriteria();
    PrepareSensitivity();
    return MCStatus();
}

// Scatter-plot budget: at most 100 plots over all iterations of a run. With p plots per
// iteration, iterations below 100 div p keep all of theirs, the next keeps 100 mod p, the rest
// none.
void SECSimulator::ApplyScatterBudget() {
    const auto nScatterTargets = std::count_if(fvTargets.begin(), fvTargets.end(),
                                               [](const Target& t) { return t.fbScatter; });
    const int plots = static_cast<int>(nScatterTargets) * static_cast<int>(fvOutputInputs.size());
    fScatterBudget = plots;
    if (plots == 0 || plots * fNSensIterations <= kScatterBudget) {
        return;
    }
    const int fullIterations = kScatterBudget / plots;
    if (fIteration < fullIterations) {
        fScatterBudget = plots;
    } else if (fIteration == fullIterations) {
        fScatterBudget = kScatterBudget % plots;
    } else {
        fScatterBudget = 0;
    }
    if (fScatterBudget < plots) {
        fWarnings.AddWarning(MCStatus(MCSPStatus::kScatterPlotsLimited, true));
    }
}

void SECSimulator::SetupStopCriteria() {
    fStopPoint = StopState();
    fStopTails = StopState();
    const auto findTarget = [this](const std::string& name) {
        for (const Target& target : fvTargets) {
            if (target.fName == name && !target.fbCategorical) {
                return target.fListIndex;
            }
        }
        return -1;
    };
    const std::vector<SPCSettings::StopCriteriaPointValue>& points =
        fpPlan->GetStopCriteriaPointValue();
    if (!points.empty()) {
        const SPCSettings::StopCriteriaPointValue& c = points[0];
        fStopPoint.fTarget = findTarget(c.fTargetName);
        if (fStopPoint.fTarget >= 0) {
            fStopPoint.fKind = StopKind::kPointValue;
            fStopPoint.fZ = MCMath_800::MCDistFun::IdfNorm(c.fCiLevel * 0.5 + 0.5, 0.0, 1.0);
            fStopPoint.fThreshold = c.fThreshold;
            fStopPoint.fbPercent = c.fUnit == MCSPConst::kUnitPercent;
        }
    }
    const std::vector<SPCSettings::StopCriteriaTails>& tails = fpPlan->GetStopCriteriaTails();
    if (!tails.empty()) {
        const SPCSettings::StopCriteriaTails& c = tails[0];
        fStopTails.fTarget = findTarget(c.fTargetName);
        if (fStopTails.fTarget >= 0) {
            fStopTails.fKind = StopKind::kTails;
            fStopTails.fRequired = c.fFrequency;
            fStopTails.fThreshold = c.fThreshold;
            fStopTails.fbPercentile = c.fType == MCSPConst::kTailPercentile;
            fStopTails.fbUpper =
                fStopTails.fbPercentile ? c.fThreshold >= 50.0 : c.fSide == MCSPConst::kSideRight;
            fStopTails.fZ = MCMath_800::MCDistFun::IdfNorm(kTailsCiLevel * 0.5 + 0.5, 0.0, 1.0);
        }
    }
}

// ---- Scoring ----------------------------------------------------------------------------------

MCStatus SECSimulator::ScoreInputs(const std::vector<double>& inputs,
                                   std::vector<double>& values) {
    // Numeric inputs as numbers; a categorical input as its category: the label for a string
    // variable, the category's number otherwise.
    for (std::size_t i = 0; i < fvSimInputs.size(); ++i) {
        const SimInput& input = fvSimInputs[i];
        Value& value = fInputRecord[static_cast<int>(i)];
        const double x = inputs[i];
        if (!input.fbCategorical) {
            value.SetReal(x);
            continue;
        }
        const SECCategoricalInput& sampler =
            fvCategorical[static_cast<std::size_t>(input.fGroupIndex)].fSampler;
        const bool known = !MCMV::IsMissing(x) && x >= 0.0 &&
                           x < static_cast<double>(sampler.fvCategoryText.size());
        const int code = known ? static_cast<int>(x) : -1;
        // A category already in the record is not written again (a text would be copied).
        if (code >= 0 && code == fvLastCode[i]) {
            continue;
        }
        fvLastCode[i] = code;
        const auto c = static_cast<std::size_t>(std::max(code, 0));
        if (sampler.fbString) {
            value.SetString(known ? sampler.fvCategoryText[c] : std::string());
        } else {
            value.SetReal(known ? sampler.fvCategoryValues[c] : MCMV::Missing());
        }
    }
    ++fScoreCount;
    const MCStatus status = fpScoreComputer->ScoreRecord(fInputRecord, fOutputRecord);
    if (status.IsError()) {
        std::fill(values.begin(), values.end(), MCMV::Missing());
        return status;
    }
    ReadScore(values);
    return status;
}

void SECSimulator::ReadScore(std::vector<double>& values) {
    if (fPredictedIndex < 0) {
        for (int i = 0; i < fNValuesPerCase; ++i) {
            values[static_cast<std::size_t>(i)] = fOutputRecord[i].GetReal();
        }
        return;
    }
    const Target& target = fvTargets.front();
    const Value& prediction = fOutputRecord[fPredictedIndex];
    double value = MCMV::Missing();
    if (!target.fvLabels.empty()) {
        // A category prediction becomes the category's code.
        const MCXML_800::MCCatNumEncoder* encoder = target.fpVariable->GetCategorical();
        const int code = prediction.GetType() == Value::kString
                             ? encoder->Encode(prediction.GetString())
                             : encoder->Encode(prediction.GetReal());
        value = code >= 0 ? static_cast<double>(code) : MCMV::Missing();
    } else {
        value = prediction.GetReal();
    }
    values[0] = value;
    if (target.fNProbs > 0) {
        const Value& probs = fOutputRecord[fProbIndex];
        const bool isList = probs.GetType() == Value::kList;
        for (int k = 0; k < target.fNProbs; ++k) {
            values[static_cast<std::size_t>(1 + k)] =
                isList ? probs.GetListValue(target.fvLabels[static_cast<std::size_t>(k)])
                       : MCMV::Missing();
        }
    }
}

bool SECSimulator::AreTargetsAccepted(const std::vector<double>& values) const {
    for (const Target& target : fvTargets) {
        const double v = values[static_cast<std::size_t>(target.fValuePos)];
        // An infinite score (an overflow in the model) is as unusable as a missing one.
        if (!std::isfinite(v)) {
            return false;
        }
        if (!target.fbHasFilter) {
            continue;
        }
        if (v < target.fFilterLow || (v == target.fFilterLow && !target.fbIncludeLow) ||
            v > target.fFilterHigh || (v == target.fFilterHigh && !target.fbIncludeHigh)) {
            return false;
        }
    }
    return true;
}

MCStatus SECSimulator::DrawAndScoreCase() {
    return DrawAcceptedCase(fCase, fRandomValues, *fpStream, true);
}

// ---- Chart ranges -----------------------------------------------------------------------------

void SECSimulator::UpdateRangeStats(const std::vector<double>& inputs,
                                    const std::vector<double>& values,
                                    std::vector<MCContStats>& inputStats,
                                    std::vector<MCContStats>& targetStats) const {
    for (std::size_t i = 0; i < inputStats.size() && i < inputs.size(); ++i) {
        inputStats[i].Update(inputs[i]);
    }
    for (std::size_t t = 0; t < targetStats.size(); ++t) {
        const auto pos = static_cast<std::size_t>(fvTargets[t].fValuePos);
        if (pos < values.size()) {
            targetStats[t].Update(values[pos]);
        }
    }
}

// An open side of a chart range becomes the observed extreme widened by two standard errors of
// the mean, then is narrowed to the input's truncation bounds or the target's filter.
void SECSimulator::FixChartRanges(const std::vector<MCContStats>& inputStats,
                                  const std::vector<MCContStats>& targetStats) {
    const auto widen = [](const MCContStats& stats, double& low, double& high) {
        double minimum = MCMV::Missing();
        double maximum = MCMV::Missing();
        if (!stats.GetExtrema(minimum, maximum)) {
            return;
        }
        const double se = StandardError(stats);
        if (MCMV::IsMissing(low)) {
            low = minimum - 2.0 * se;
        }
        if (MCMV::IsMissing(high)) {
            high = maximum + 2.0 * se;
        }
    };
    for (std::size_t i = 0; i < fvSimInputs.size() && i < inputStats.size(); ++i) {
        double& low = fvInputChartMin[i];
        double& high = fvInputChartMax[i];
        widen(inputStats[i], low, high);
        const SimInput& input = fvSimInputs[i];
        if (!MCMV::IsMissing(input.fTruncMin) && !MCMV::IsMissing(low)) {
            low = std::max(low, input.fTruncMin);
        }
        if (!MCMV::IsMissing(input.fTruncMax) && !MCMV::IsMissing(high)) {
            high = std::min(high, input.fTruncMax);
        }
    }
    std::size_t contIndex = 0;
    for (std::size_t t = 0; t < fvTargets.size() && t < targetStats.size(); ++t) {
        Target& target = fvTargets[t];
        if (!target.fbCategorical && contIndex < fvContCentre.size()) {
            const double mean = targetStats[t].GetMean();
            fvContCentre[contIndex++] = MCMV::IsMissing(mean) ? 0.0 : mean;
        }
        widen(targetStats[t], target.fChartMin, target.fChartMax);
        if (IsFiniteBound(target.fFilterLow) && !MCMV::IsMissing(target.fChartMin)) {
            target.fChartMin = std::max(target.fChartMin, target.fFilterLow);
        }
        if (IsFiniteBound(target.fFilterHigh) && !MCMV::IsMissing(target.fChartMax)) {
            target.fChartMax = std::min(target.fChartMax, target.fFilterHigh);
        }
    }
}

void SECSimulator::CopyTemplatesFrom(const SECSimulator& master) {
    fvInputChartMin = master.fvInputChartMin;
    fvInputChartMax = master.fvInputChartMax;
    if (master.fvContCentre.size() == fvContCentre.size()) {
        fvContCentre = master.fvContCentre;
    }
    MCSP_ASSERT(master.fvTargets.size() == fvTargets.size(),
                "SECSimulator: a worker's score has the master's targets");
    for (std::size_t t = 0; t < fvTargets.size() && t < master.fvTargets.size(); ++t) {
        fvTargets[t].fChartMin = master.fvTargets[t].fChartMin;
        fvTargets[t].fChartMax = master.fvTargets[t].fChartMax;
    }
}

void SECSimulator::CreateChartAccumulators() {
    std::vector<SECContinuousTargetInfo>& cont = fpOutputStats->GetContTargetInfo();
    std::vector<SECCategoricalTargetInfo>& cat = fpOutputStats->GetCateTargetInfo();
    int budget = fScatterBudget;
    for (const Target& target : fvTargets) {
        std::vector<MCScatterPlotData> plots;
        for (const int i : fvOutputInputs) {
            if (!target.fbScatter || budget <= 0) {
                break;
            }
            const SimInput& input = fvSimInputs[static_cast<std::size_t>(i)];
            int inputBins = kScatterBins;
            if (input.fbCategorical) {
                const auto nCats = fvCategorical[static_cast<std::size_t>(input.fGroupIndex)]
                                       .fSampler.fvCategoryText.size();
                inputBins = std::max(2, static_cast<int>(nCats));
            }
            plots.emplace_back(kScatterBins, inputBins, target.fChartMin,
                               fvInputChartMin[static_cast<std::size_t>(i)], target.fChartMax,
                               fvInputChartMax[static_cast<std::size_t>(i)], true);
            --budget;
        }
        if (target.fbCategorical) {
            SECCategoricalTargetInfo& info = cat[static_cast<std::size_t>(target.fListIndex)];
            info.fvProbHistograms.assign(static_cast<std::size_t>(target.fNProbs),
                                         MCHistogramData(kHistogramBins, 0.0, 1.0, true));
            info.fvScatterPlots = std::move(plots);
        } else {
            SECContinuousTargetInfo& info = cont[static_cast<std::size_t>(target.fListIndex)];
            info.fHistogram =
                MCHistogramData(kHistogramBins, target.fChartMin, target.fChartMax, true);
            info.fvScatterPlots = std::move(plots);
        }
    }
    fbChartsReady = true;
    PrepareAddedResults();
}

MCStatus SECSimulator::RunPilot() {
    std::vector<MCContStats> inputStats(fvSimInputs.size());
    std::vector<MCContStats> targetStats(fvTargets.size());
    int valid = 0;
    for (int i = 0; i < kPilotCases && valid < kPilotValid; ++i) {
        const MCStatus status = DrawAndScoreCase();
        if (status.GetErrorCode() == MCSPStatus::kAttemptsExhausted) {
            return fStatus = status;
        }
        if (status.IsError()) {
            continue;
        }
        UpdateRangeStats(fCase.fvInputs, fCase.fvValues, inputStats, targetStats);
        ++valid;
    }
    if (valid < kPilotValid) {
        return fStatus = MCStatus(MCSPStatus::kNoValidCase, false);
    }
    FixChartRanges(inputStats, targetStats);
    CreateChartAccumulators();
    ResetCaseValues();
    return MCStatus();
}

// ---- Sink and the case loop -------------------------------------------------------------------

void SECSimulator::SetSink(MCXML_800::SECAppDataProcess* sink, MCThread_800::IMCLock* lock) {
    fpSink = sink;
    fpLock = lock;
}

void SECSimulator::PassCaseToSink() {
    if (fpLock == nullptr) {
        fpSink->AddCase(fCase.fvInputs, fCase.fvValues, fIteration);
        return;
    }
    fvSinkInputs.insert(fvSinkInputs.end(), fCase.fvInputs.begin(), fCase.fvInputs.end());
    fvSinkValues.insert(fvSinkValues.end(), fCase.fvValues.begin(), fCase.fvValues.end());
    if (++fSinkCount >= kSinkBatch) {
        FlushSink();
    }
}

void SECSimulator::FlushSink() {
    if (fpSink == nullptr || fpLock == nullptr || fSinkCount == 0) {
        return;
    }
    const std::size_t nInputs = fCase.fvInputs.size();
    const auto nValues = static_cast<std::size_t>(fNValuesPerCase);
    std::vector<double> inputs(nInputs);
    std::vector<double> values(nValues);
    {
        MCThread_800::MCLockGuard guard(fpLock);
        for (std::size_t c = 0; c < static_cast<std::size_t>(fSinkCount); ++c) {
            std::copy_n(fvSinkInputs.begin() + static_cast<std::ptrdiff_t>(c * nInputs), nInputs,
                        inputs.begin());
            std::copy_n(fvSinkValues.begin() + static_cast<std::ptrdiff_t>(c * nValues), nValues,
                        values.begin());
            fpSink->AddCase(inputs, values, fIteration);
        }
    }
    fvSinkInputs.clear();
    fvSinkValues.clear();
    fSinkCount = 0;
}

MCStatus SECSimulator::RunCaseLoop() {
    const MCStatus prepared = PrepareScoring();
    if (prepared.IsError()) {
        return prepared;
    }
    MCStatus outcome;
    std::int64_t unreported = 0;
    SECReporter reporter;
    reporter.SetIterNum(fIteration);
    while (!ShouldStop() && !fpCancel->WillCancel()) {
        const MCStatus status = DrawAndScoreCase();
        if (!status.IsError() && UsesSensitivity() && fpScoreComputer) {
            ComputeCaseSensitivity();
        }
        if (status.GetErrorCode() == MCSPStatus::kAttemptsExhausted) {
            outcome = status;
            break;
        }
        if (!status.IsError() && fpSink != nullptr) {
            PassCaseToSink();
        }
        if (status.IsError()) {
            // One failed case does not end the run.
            ++fSimCaseCount;
            fFilteredCaseCount += fCase.fRejections;
            ++fInvalidCaseCount;
        } else {
            AccumulateCase();
        }
        if (fpRecordListener != nullptr) {
            reporter.SetRecordCount(fSimCaseCount);
            fpRecordListener->Report(reporter);
        }
        if (fpProgressCounter != nullptr && ++unreported == kProgressStep) {
            fpProgressCounter->fetch_add(unreported, std::memory_order_relaxed);
            unreported = 0;
        }
    }
    if (fpProgressCounter != nullptr) {
        fpProgressCounter->fetch_add(unreported, std::memory_order_relaxed);
    }
    FlushSink();
    return outcome;
}

// ---- Queries ----------------------------------------------------------------------------------

std::vector<std::string> SECSimulator::GetTargetNames() const {
    std::vector<std::string> names;
    for (const Target& target : fvTargets) {
        names.push_back(target.fName);
    }
    return names;
}

int SECSimulator::GetNProbabilities() const {
    int n = 0;
    for (const Target& target : fvTargets) {
        n += target.fNProbs;
    }
    return n;
}

bool SECSimulator::HasCategoricalTarget() const {
    return std::any_of(fvTargets.begin(), fvTargets.end(),
                       [](const Target& t) { return t.fbCategorical; });
}

} // namespace MCMCSP_800
