#include "simulation_evaluation/secsimulator.h"

#include "component/mcspassert.h"
#include "component/mcspcomponent.h"
#include "mccommon/display.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCMath_800::MCSymMatrix;

namespace {

//! Stand-ins for a null settings, plan or variable list: the simulator then has no inputs.
const SECSettings& DefaultSettings() {
    static const SECSettings settings;
    return settings;
}
const SPCSettings& EmptyPlan() {
    static const SPCSettings plan;
    return plan;
}
const MCXML_800::MCVarList& NoVariables() {
    static const MCXML_800::MCVarList variables;
    return variables;
}

double MissingUnless(bool has, double value) {
    return has ? value : MCMV::Missing();
}

} // namespace

// ---- Construction -----------------------------------------------------------------------------

SECSimulator::SECSimulator(const SECSettings* settings, const SPCSettings* plan,
                           const MCXML_800::MCVarList* variables, int iteration,
                           MCMath_800::MCURandom* sharedStream, double seedValue,
                           const MCSymMatrix* normalCorrelations)
    : fpSettings(settings), fpPlan(plan), fpVarList(variables), fIteration(iteration),
      fpStream(sharedStream), fpCancel(&fOwnCancel) {
    MCSP_ASSERT(settings != nullptr, "SECSimulator constructor: settings != 0");
    MCSP_ASSERT(plan != nullptr, "SECSimulator constructor: plan != 0");
    MCSP_ASSERT(variables != nullptr, "SECSimulator constructor: variables != 0");
    if (fpSettings == nullptr) {
        fpSettings = &DefaultSettings();
    }
    if (fpPlan == nullptr) {
        fpPlan = &EmptyPlan();
    }
    if (fpVarList == nullptr) {
        fpVarList = &NoVariables();
    }
    if (fpStream == nullptr) {
        fpOwnedStream = std::make_unique<MCMath_800::MCURandom>(
            SeedFromValue(seedValue, fpSettings->GetSeed()), true, true, nullptr);
        fpStream = fpOwnedStream.get();
    }
    fRandomValues.SetURNGPtr(fpStream);
    fOwnCancel.SetCancelPtr(fpSettings->GetCancelPointer());
    fpOutputStats = std::make_unique<SECOutputStats>(*fpSettings, *fpPlan, *fpVarList);

    BuildGenerationModel();

    if (normalCorrelations != nullptr) {
        fNormalCorr = *normalCorrelations;
        fbCorrModelPrepared = true;
    }
    ResetCaseValues();
}

SECSimulator::SECSimulator(const SECSimulator& master, double seedValue, WorkerTag)
    : fpSettings(master.fpSettings), fpPlan(master.fpPlan), fpVarList(master.fpVarList),
      fIteration(master.fIteration),
      fpOwnedStream(std::make_unique<MCMath_800::MCURandom>(
          SeedFromValue(seedValue, master.fpSettings->GetSeed()), true, true, nullptr)),
      fpStream(fpOwnedStream.get()), fpCancel(master.fpCancel),
      fvSimInputs(master.fvSimInputs), fvCorrelated(master.fvCorrelated),
      fvCategorical(master.fvCategorical), fvFixedInputs(master.fvFixedInputs),
      fCrosstab(master.fCrosstab), fbHasCrosstab(master.fbHasCrosstab),
      fNSensIterations(master.fNSensIterations), fSensIterName(master.fSensIterName),
      fbOpenRange(master.fbOpenRange), fTargetCorr(master.fTargetCorr),
      fbHasTargetCorr(master.fbHasTargetCorr), fNormalCorr(master.fNormalCorr),
      fbCorrModelPrepared(master.fbCorrModelPrepared),
      fbCorrelationFailed(master.fbCorrelationFailed), fCorrModelStatus(master.fCorrModelStatus),
      fCiZ(master.fCiZ), fpTemplate(&master) {
    fRandomValues.SetURNGPtr(fpStream);
    fOwnCancel.SetCancelPtr(fpSettings->GetCancelPointer());
    fpOutputStats = std::make_unique<SECOutputStats>(*fpSettings, *fpPlan, *fpVarList);
    SetResultNames();
    ResetCaseValues();
}

SECSimulator::~SECSimulator() = default;

std::uint32_t SECSimulator::SeedFromValue(double seedValue, std::uint32_t settingsSeed) {
    if (!(seedValue >= 0.0) || !std::isfinite(seedValue)) {
        return settingsSeed;
    }
    const double whole = std::floor(seedValue * 4294967295.0);
    return static_cast<std::uint32_t>(std::fmod(whole, 4294967296.0));
}

void SECSimulator::BuildGenerationModel() {
    const std::vector<SimInputSpecs>& inputs = fpPlan->GetSimulationInput();
    for (std::size_t i = 0; i < inputs.size(); ++i) {
        AddSimulatedInput(inputs[i], static_cast<int>(i));
    }
    BuildFixedInputs();
    BuildCrosstab();
    BuildTargetCorrelations();
    SetResultNames();
}

void SECSimulator::SetResultNames() {
    std::vector<std::string> predictors;
    std::vector<std::string> factors;
    std::vector<std::string> covariates;
    for (const SimInput& input : fvSimInputs) {
        predictors.push_back(input.fName);
        (input.fbCategorical ? factors : covariates).push_back(input.fName);
    }
    fpOutputStats->SetPredictorNames(predictors);
    fpOutputStats->SetFactorNames(factors);
    fpOutputStats->SetCovariateNames(covariates);
    fpOutputStats->SetSensIteraName(fSensIterName);
}

void SECSimulator::NoteSensitivityInput(const std::string& name, std::size_t count) {
    if (fSensIterName.empty() && count > 1) {
        fSensIterName = name;
        fNSensIterations = static_cast<int>(count);
    }
}

std::size_t SECSimulator::IterationIndex(std::size_t count) const {
    const auto index = static_cast<std::size_t>(std::max(fIteration, 0));
    MCSP_ASSERT(index < count, "SECSimulator: the iteration index lies inside the sensitivity "
                               "input's list");
    return std::min(index, count - 1);
}

const DistInfoElem* SECSimulator::ChooseDistribution(const SimInputSpecs& specs) {
    if (const DistInfoElem* final = specs.GetFinalDistribution()) {
        return final;
    }
    const std::size_t count = specs.GetDistElementSize();
    if (count == 0) {
        return nullptr;
    }
    // Several candidates and no final choice: the sensitivity input; iteration i uses
    // distribution i.
    NoteSensitivityInput(specs.GetVarName(), count);
    return specs.GetDistribution(IterationIndex(count));
}

void SECSimulator::AddSimulatedInput(const SimInputSpecs& specs, int pos) {
    SimInput info;
    info.fName = specs.GetVarName();
    info.fVarIndex = fpVarList->FindVariable(info.fName);
    info.fTruncMin = MissingUnless(specs.HasMinimum(), specs.GetMinimum());
    info.fTruncMax = MissingUnless(specs.HasMaximum(), specs.GetMaximum());
    info.fAcceptLow = MCMV::IsMissing(info.fTruncMin) ? -std::numeric_limits<double>::infinity()
                                                      : info.fTruncMin;
    info.fAcceptHigh = MCMV::IsMissing(info.fTruncMax) ? std::numeric_limits<double>::infinity()
                                                       : info.fTruncMax;
    info.fbOutput = specs.GetOutput();
    const DistInfoElem* dist = ChooseDistribution(specs);
    MCSP_ASSERT(dist != nullptr, "SECSimulator: a simulated input has a distribution");
    info.fDistType = dist != nullptr ? dist->GetDistType() : MCSPConst::kDistUnknown;
    if (info.fDistType == MCSPConst::kDistCategorical) {
        AddCategoricalInput(specs, dist, pos, info);
    } else {
        AddCorrelatedInput(specs, dist, pos, info);
    }
    // Truncation narrows a finite natural bound; a bound left crossing the other is dropped.
    if (!MCMV::IsMissing(info.fLower) && !MCMV::IsMissing(info.fTruncMin) &&
        info.fTruncMin > info.fLower) {
        info.fLower = info.fTruncMin;
    }
    if (!MCMV::IsMissing(info.fUpper) && !MCMV::IsMissing(info.fTruncMax) &&
        info.fTruncMax < info.fUpper) {
        info.fUpper = info.fTruncMax;
    }
    if (!MCMV::IsMissing(info.fLower) && !MCMV::IsMissing(info.fUpper) &&
        info.fLower >= info.fUpper) {
        info.fUpper = MCMV::Missing();
    }
    if (MCMV::IsMissing(info.fLower) || MCMV::IsMissing(info.fUpper)) {
        fbOpenRange = true;
    }
    fvSimInputs.push_back(info);
}

void SECSimulator::AddCategoricalInput(const SimInputSpecs& specs, const DistInfoElem* dist,
                                       int pos, SimInput& info) {
    CategoricalInput input;
    input.fCasePos = pos;
    SECCategoricalInput& sampler = input.fSampler;
    sampler.fName = info.fName;
    const MCXML_800::IMCVariable* variable = fpVarList->GetVarAt(info.fVarIndex);
    sampler.fbString = variable != nullptr
                           ? variable->GetStorage() == MCXML_800::IMCVariable::kStringStorage
                           : specs.IsString();
    std::vector<double> probs;
    if (MCSP_ASSERT(dist->GetParameterSize() == 2,
                    "SECSimulator: a Categorical distribution has 2 parameters")) {
        std::string name;
        dist->GetParameterNameValue(0, name, sampler.fvCategoryText);
        dist->GetParameterNameValue(1, name, probs);
    }
    for (const std::string& text : sampler.fvCategoryText) {
        double value = MCMV::Missing();
        if (!sampler.fbString && !MCCommon_800::ParseDouble(text, value)) {
            value = MCMV::Missing();
        }
        sampler.fvCategoryValues.push_back(value);
    }
    // The table exists only when categories and probabilities agree and the probabilities
    // are usable; without it every draw is missing and the case is rejected.
    if (probs.size() == sampler.fvCategoryText.size()) {
        SECBuildCumulativeTable(probs, sampler.fvCumTable);
    }
    MCSP_ASSERT(!sampler.fvCumTable.empty(),
                "SECSimulator: a Categorical input has one usable probability per category");
    const std::vector<std::string>& factors = fpPlan->GetCrstabsFactors();
    const auto it = std::find(factors.begin(), factors.end(), info.fName);
    sampler.fCrosstabColumn = it == factors.end() ? -1 : static_cast<int>(it - factors.begin());

    const auto nCategories = static_cast<double>(sampler.fvCategoryText.size());
    info.fbCategorical = true;
    info.fGroupIndex = static_cast<int>(fvCategorical.size());
    info.fLower = -0.5;
    info.fUpper = nCategories - 0.5;
    fvCategorical.push_back(std::move(input));
}

void SECSimulator::AddCorrelatedInput(const SimInputSpecs& specs, const DistInfoElem* dist, int pos,
                                      SimInput& info) {
    CorrelatedInput input;
    input.fCasePos = pos;
    SECInputGenerator& gen = input.fGenerator;
    gen.fName = info.fName;
    std::vector<double> params;
    const bool continuous = specs.GetMeasurementLevel() == MCSPConst::kLevelContinuous;
    const bool consistent = dist != nullptr && SECBuildStoredParams(*dist, continuous, params);
    MCSP_ASSERT(dist == nullptr || consistent,
                "SECSimulator: a distribution has the parameters its type needs");
    SECPrepareGenerator(info.fDistType, params, gen);
    MCSP_ASSERT(dist == nullptr || !consistent || gen.fbValid,
                "SECSimulator: a distribution's parameters lie inside their domain");

    input.fTornadoDelta = MCMV::Missing();
    if (gen.fbHasSensitivity) {
        if (fpSettings->UseTornadoStddev()) {
            input.fTornadoDelta = gen.fStdDev * fpSettings->GetTornadoDeltaStddev();
        }
        input.fbVarianceContrib = fpSettings->TornadoVariance();
    }
    info.fGroupIndex = static_cast<int>(fvCorrelated.size());
    info.fLower = gen.fLower;
    info.fUpper = gen.fUpper;
    fvCorrelated.push_back(std::move(input));
}

void SECSimulator::BuildFixedInputs() {
    for (const FixedInputSpecs& specs : fpPlan->GetFixedInput()) {
        FixedInput input;
        input.fName = specs.GetVarName();
        input.fVarIndex = fpVarList->FindVariable(input.fName);
        const std::size_t count = specs.GetInputValueSize();
        if (count > 0) {
            NoteSensitivityInput(input.fName, count);
            // Only this iteration's value is read: a sensitivity input may have thousands.
            const std::size_t index = count > 1 ? IterationIndex(count) : 0;
            const MCDataValue& value = specs.GetInputValueAt(index);
            input.fbString = specs.IsString();
            input.fNumber = input.fbString ? MCMV::Missing() : value.GetAsNumeric();
            input.fText = value.GetAsString();
        } else {
            input.fNumber = MCMV::Missing();
        }
        fvFixedInputs.push_back(input);
    }
}

void SECSimulator::BuildCrosstab() {
    const std::vector<std::string>& factors = fpPlan->GetCrstabsFactors();
    if (factors.empty()) {
        return;
    }
    fCrosstab.fvFactors = factors;
    const std::vector<double>& probs = fpPlan->GetCrstabsProbs();
    const std::vector<std::vector<int>>& encoded = fpPlan->GetCrstabsEncod();
    const bool usableCodes =
        encoded.size() == probs.size() &&
        std::all_of(encoded.begin(), encoded.end(),
                    [&](const std::vector<int>& row) { return row.size() == factors.size(); });
    if (usableCodes) {
        fCrosstab.fvCodes = encoded;
    } else {
        // A plan whose table was not encoded yet: the code of each cell's category text among
        // the factor's categories (first exact match, −1 when absent), as the plan's encoding
        // does.
        const std::vector<std::vector<std::string>>& texts = fpPlan->GetCrstabsMatrix();
        for (const std::vector<std::string>& row : texts) {
            std::vector<int> codes(factors.size(), -1);
            for (std::size_t k = 0; k < factors.size() && k < row.size(); ++k) {
                for (const CategoricalInput& input : fvCategorical) {
                    const std::vector<std::string>& cats = input.fSampler.fvCategoryText;
                    const auto it = std::find(cats.begin(), cats.end(), row[k]);
                    if (input.fSampler.fName == factors[k] && it != cats.end()) {
                        codes[k] = static_cast<int>(it - cats.begin());
                    }
                }
            }
            fCrosstab.fvCodes.push_back(codes);
        }
    }
    fbHasCrosstab = fCrosstab.fvCodes.size() == probs.size() &&
                    SECBuildCumulativeTable(probs, fCrosstab.fvCumTable);
    MCSP_ASSERT(fbHasCrosstab, "SECSimulator: the contingency table has one code row and one "
                               "usable probability per cell");
    if (!fbHasCrosstab) {
        // Without a usable table each factor is drawn on its own.
        for (CategoricalInput& input : fvCategorical) {
            input.fSampler.fCrosstabColumn = -1;
        }
    }
}

double SECSimulator::PlanCorrelation(std::size_t a, std::size_t b) const {
    const std::vector<std::vector<double>>& rows = fpPlan->GetCorrMatrix();
    const std::size_t hi = std::max(a, b);
    const std::size_t lo = std::min(a, b);
    if (hi < rows.size() && lo < rows[hi].size()) {
        return rows[hi][lo];
    }
    if (lo < rows.size() && hi < rows[lo].size()) {
        return rows[lo][hi];
    }
    return MCMV::Missing();
}

void SECSimulator::BuildTargetCorrelations() {
    if (fpPlan->GetCorrMatrix().empty()) {
        return;
    }
    const std::vector<std::string>& corrVars = fpPlan->GetCorrVarList();
    const int n = static_cast<int>(fvCorrelated.size());
    std::vector<int> positions(fvCorrelated.size(), -1);
    bool allFound = corrVars.size() == fvCorrelated.size();
    for (std::size_t i = 0; i < fvCorrelated.size(); ++i) {
        const auto it =
            std::find(corrVars.begin(), corrVars.end(), fvCorrelated[i].fGenerator.fName);
        positions[i] = it == corrVars.end() ? -1 : static_cast<int>(it - corrVars.begin());
        allFound = allFound && positions[i] >= 0;
    }
    MCSP_ASSERT(allFound, "SECSimulator: the correlation variables are the inputs of the "
                          "correlated set");
    fbHasTargetCorr = n > 0;
    fTargetCorr.SetIdentity(n);
    for (int i = 1; i < n; ++i) {
        for (int j = 0; j < i; ++j) {
            if (positions[static_cast<std::size_t>(i)] < 0 ||
                positions[static_cast<std::size_t>(j)] < 0) {
                continue; // an input the list does not name: uncorrelated
            }
            double rho =
                PlanCorrelation(static_cast<std::size_t>(positions[static_cast<std::size_t>(i)]),
                                static_cast<std::size_t>(positions[static_cast<std::size_t>(j)]));
            // A correlation the plan could not state (missing) imposes none.
            if (MCMV::IsMissing(rho)) {
                rho = 0.0;
            }
            fTargetCorr.SetElem(i, j, rho);
        }
    }
}

// ---- Workers and thread tasks -----------------------------------------------------------------

std::unique_ptr<SECSimulator> SECSimulator::CreateWorker(double seedValue) const {
    return std::unique_ptr<SECSimulator>(new SECSimulator(*this, seedValue, WorkerTag()));
}

void SECSimulator::SetNortaPairs(const std::vector<SECNortaPair>& pairs,
                                 std::shared_ptr<const std::vector<SECNortaMargin>> margins) {
    fvNortaPairs = pairs;
    fpNortaMargins = std::move(margins);
    fbNortaTask = true;
}

void SECSimulator::SetCancelInfo(MCMath_800::MCCancelInfo* cancel) {
    fpCancel = cancel != nullptr ? cancel : &fOwnCancel;
}

MCStatus SECSimulator::GetOutputStats(SECOutputStats*& out) {
    out = fpOutputStats.get();
    return MCStatus();
}

void SECSimulator::RunTask() {
    try {
        fStatus = fbNortaTask ? RunNortaPairs() : RunCaseLoop();
    } catch (...) {
        fStatus = MCStatus(MCSPStatus::kLowExpectedOrException, false);
    }
}

MCStatus SECSimulator::RunNortaPairs() {
    const MCStatus cancelled(MCSPStatus::kCancelled, false);
    for (SECNortaPair& pair : fvNortaPairs) {
        if (fpCancel->WillCancel()) {
            return cancelled;
        }
        const std::vector<SECNortaMargin>& margins = *fpNortaMargins;
        const SECNortaSearchResult result = SECNortaNormalCorrelation(
            margins[static_cast<std::size_t>(pair.fRow)],
            margins[static_cast<std::size_t>(pair.fCol)], pair.fTarget, fpCancel);
        if (result.fbCancelled) {
            return cancelled;
        }
        // A missing result does not end the list: the other pairs keep theirs, and the
        // combination gives this one a fallback value.
        pair.fNormalCorr = result.fNormalCorr;
        pair.fGLow = result.fGLow;
        pair.fGHigh = result.fGHigh;
        pair.fbUnreachable = result.fbUnreachable;
        pair.fbComputed = true;
    }
    return MCStatus();
}

// ---- Correlation model ------------------------------------------------------------------------

MCStatus SECSimulator::PrepareCorrelationModel() {
    if (fbCorrModelPrepared) {
        return fCorrModelStatus;
    }
    const int n = static_cast<int>(fvCorrelated.size());
    if (!fbHasTargetCorr || n < 2) {
        if (fbHasTargetCorr && n == 1) {
            fNormalCorr = fTargetCorr;
        }
        fbCorrModelPrepared = true;
        fCorrModelStatus = MCStatus();
        return fCorrModelStatus;
    }

    // Each input prepared once; every pair (i, j), j < i, then costs a small fixed amount of
    // work and its result does not depend on how the pairs are split below.
    auto margins = std::make_shared<std::vector<SECNortaMargin>>(fvCorrelated.size());
    for (std::size_t k = 0; k < fvCorrelated.size(); ++k) {
        if (fpCancel->WillCancel()) {
            return MCStatus(MCSPStatus::kCancelled, false);
        }
        (void)SECPrepareNortaMargin(fvCorrelated[k].fGenerator, (*margins)[k]);
    }
    std::vector<SECNortaPair> pairs;
    for (int i = 1; i < n; ++i) {
        for (int j = 0; j < i; ++j) {
            SECNortaPair pair;
            pair.fRow = i;
            pair.fCol = j;
            pair.fTarget = fTargetCorr.GetElem(i, j);
            pair.fNormalCorr = MCMV::Missing();
            pairs.push_back(pair);
        }
    }
    const int nPairs = static_cast<int>(pairs.size());
    const std::vector<int> bounds = SECSplitPairs(nPairs, fpSettings->GetMaxThreadNum());
    std::vector<std::unique_ptr<SECSimulator>> workers;
    std::vector<MCThread_800::IMCThreadTask*> tasks;
    for (std::size_t s = 0; s + 1 < bounds.size(); ++s) {
        workers.push_back(CreateWorker(-1.0));
        workers.back()->SetNortaPairs(
            std::vector<SECNortaPair>(pairs.begin() + bounds[s], pairs.begin() + bounds[s + 1]),
            margins);
        tasks.push_back(workers.back().get());
    }
    MCThread_800::IMCThreadFactory* factory = fpSettings->GetThreadFactory();
    if (factory != nullptr) {
        std::unique_ptr<MCThread_800::IMCThreadGroup> group =
            factory->CreateThreadGroup(static_cast<int>(tasks.size()));
        group->Run(tasks);
    } else {
        for (MCThread_800::IMCThreadTask* task : tasks) {
            task->RunTask(); // no host threads: the slices one after the other
        }
    }
    if (fpCancel->IsCancel()) {
        return MCStatus(MCSPStatus::kCancelled, false);
    }
    for (const auto& worker : workers) {
        if (worker->GetStatus().IsError()) {
            return worker->GetStatus();
        }
    }
    fCorrModelStatus = CombineNortaNormalCorrs(workers);
    fbCorrModelPrepared = true;
    return fCorrModelStatus;
}

bool SECSimulator::AdoptCorrelationModel(const SECSimulator& other) {
    if (fbCorrModelPrepared || !other.fbCorrModelPrepared || other.fCorrModelStatus.IsError() ||
        fvCorrelated.size() != other.fvCorrelated.size() ||
        fbHasTargetCorr != other.fbHasTargetCorr) {
        return false;
    }
    for (std::size_t k = 0; k < fvCorrelated.size(); ++k) {
        const SECInputGenerator& a = fvCorrelated[k].fGenerator;
        const SECInputGenerator& b = other.fvCorrelated[k].fGenerator;
        if (a.fName != b.fName || a.fDistType != b.fDistType || a.fvParams != b.fvParams ||
            a.fbContinuousEmpirical != b.fbContinuousEmpirical) {
            return false;
        }
    }
    const int n = fTargetCorr.GetNRows();
    if (n != other.fTargetCorr.GetNRows()) {
        return false;
    }
    for (int i = 0; i < n; ++i) {
        for (int j = 0; j <= i; ++j) {
            const double a = fTargetCorr.GetElem(i, j);
            const double b = other.fTargetCorr.GetElem(i, j);
            if (a != b && !(MCMV::IsMissing(a) && MCMV::IsMissing(b))) {
                return false;
            }
        }
    }
    fNormalCorr = other.fNormalCorr;
    fvNortaPairs = other.fvNortaPairs;
    fbCorrelationFailed = other.fbCorrelationFailed;
    fCorrModelStatus = other.fCorrModelStatus;
    fbCorrModelPrepared = true;
    return true;
}

MCStatus
SECSimulator::CombineNortaNormalCorrs(const std::vector<std::unique_ptr<SECSimulator>>& workers) {
    fvNortaPairs.clear();
    for (const auto& worker : workers) {
        const std::vector<SECNortaPair>& done = worker->GetNortaPairs();
        fvNortaPairs.insert(fvNortaPairs.end(), done.begin(), done.end());
    }
    const MCStatus status = SECCombineNormalCorrelations(static_cast<int>(fvCorrelated.size()),
                                                         fvNortaPairs, fNormalCorr);
    if (status.IsError()) {
        // No usable matrix: drawing from it (or silently without it) would be wrong.
        fbCorrelationFailed = true;
        fNormalCorr.SetNRows(0);
        return status;
    }
    if (status.IsWarning()) {
        fWarnings.AddWarning(status);
    }
    for (const SECNortaPair& pair : fvNortaPairs) {
        if (pair.fbUnreachable) {
            fWarnings.AddWarning(MCStatus(MCSPStatus::kCorrelationUnreachable, true));
        }
    }
    return MCStatus();
}

// ---- Generation ---------------------------------------------------------------------------------

void SECSimulator::ResetCaseValues() {
    fCase.Reset(fvSimInputs.size(), fvCorrelated.size());
}

MCStatus SECSimulator::PrepareGeneration() {
    ResetCaseValues();
    fbGenerationPrepared = false;
    const MCStatus failed(MCSPStatus::kMergeFailed, false);
    const int n = static_cast<int>(fvCorrelated.size());
    if (fbHasTargetCorr && !fbCorrModelPrepared) {
        const MCStatus model = PrepareCorrelationModel();
        if (model.IsError()) {
            fPrepareStatus = model;
            return fStatus = model;
        }
    }
    if (fbCorrelationFailed) {
        fPrepareStatus = failed;
        return fStatus = failed;
    }
    bool ok = true;
    if (n == 1) {
        ok = fRandomValues.SetParamNormal();
    } else if (n > 1 && fNormalCorr.GetNRows() == 0) {
        ok = fRandomValues.SetParamNormal(n);
    } else if (n > 1) {
        ok = fNormalCorr.GetNRows() == n &&
             fRandomValues.SetParamNormal(std::vector<double>(static_cast<std::size_t>(n), 0.0),
                                          1.0, fNormalCorr);
    }
    if (!ok) {
        fPrepareStatus = failed;
        return fStatus = failed;
    }
    fbGenerationPrepared = true;
    fPrepareStatus = MCStatus();
    return fPrepareStatus;
}

MCStatus SECSimulator::GenerateAttempt(SECCase& c, MCMath_800::MCRandomValues& normals,
                                       MCMath_800::MCURandom& stream) const {
    if (!fbGenerationPrepared) {
        return fPrepareStatus.IsError() ? fPrepareStatus
                                        : MCStatus(MCSPStatus::kNormalGeneratorFailed, false);
    }
    // 1. The normal vector of the correlated set.
    bool ok = true;
    if (c.fvZ.size() == 1) {
        c.fvZ[0] = normals.GetRandom();
        ok = !MCMV::IsMissing(c.fvZ[0]);
    } else if (!c.fvZ.empty()) {
        ok = normals.GetRandom(c.fvZ);
    }
    if (!ok) {
        std::fill(c.fvInputs.begin(), c.fvInputs.end(), MCMV::Missing());
        std::fill(c.fvZ.begin(), c.fvZ.end(), MCMV::Missing());
        c.fCell = -1;
        return MCStatus(MCSPStatus::kNormalGeneratorFailed, false);
    }
    // 2. Each correlated input through its transform.
    for (std::size_t k = 0; k < fvCorrelated.size(); ++k) {
        const CorrelatedInput& input = fvCorrelated[k];
        c.fvInputs[static_cast<std::size_t>(input.fCasePos)] =
            SECTransform(input.fGenerator, c.fvZ[k]);
    }
    // 3. The contingency cell.
    c.fCell = fbHasCrosstab ? SECDrawCell(fCrosstab.fvCumTable, stream.GetRandom()) : -1;
    // 4. The categorical values: a factor takes its code in the chosen cell, any other input
    //    its own draw. A code of −1 (a cell naming a category the input lacks) leaves the value
    //    missing, so the attempt is rejected.
    for (const CategoricalInput& input : fvCategorical) {
        const int column = input.fSampler.fCrosstabColumn;
        int code = -1;
        if (column >= 0 && c.fCell >= 0) {
            code = fCrosstab.fvCodes[static_cast<std::size_t>(c.fCell)]
                                    [static_cast<std::size_t>(column)];
        } else {
            code = SECDrawCell(input.fSampler.fvCumTable, stream.GetRandom());
        }
        c.fvInputs[static_cast<std::size_t>(input.fCasePos)] =
            code >= 0 ? static_cast<double>(code) : MCMV::Missing();
    }
    return MCStatus();
}

bool SECSimulator::AreInputsWithinBounds(const std::vector<double>& inputs) const {
    for (std::size_t i = 0; i < fvSimInputs.size(); ++i) {
        const double value = inputs[i];
        const SimInput& input = fvSimInputs[i];
        // A value that overflowed to infinity is as unusable as a missing one; an absent bound
        // is an infinite one.
        if (!std::isfinite(value) || value < input.fAcceptLow || value > input.fAcceptHigh) {
            return false;
        }
    }
    return true;
}

MCStatus SECSimulator::DrawCase() {
    return DrawAcceptedCase(fCase, fRandomValues, *fpStream, false);
}

MCStatus SECSimulator::DrawAcceptedCase(SECCase& c, MCMath_800::MCRandomValues& normals,
                                        MCMath_800::MCURandom& stream, bool score) {
    c.fRejections = 0;
    for (int attempt = 0; attempt < SECGenerationConst::kMaxAttempts; ++attempt) {
        MCStatus status = GenerateAttempt(c, normals, stream);
        if (status.IsError()) {
            return status;
        }
        // Inputs are checked before the case is scored: a case outside its truncation bounds is
        // rejected whatever its score.
        if (!AreInputsWithinBounds(c.fvInputs)) {
            ++c.fRejections;
            continue;
        }
        if (score && fpScoreComputer) {
            status = ScoreInputs(c.fvInputs, c.fvValues);
            if (status.IsError()) {
                return status;
            }
            if (!AreTargetsAccepted(c.fvValues)) {
                ++c.fRejections;
                continue;
            }
        }
        return MCStatus();
    }
    return MCStatus(MCSPStatus::kAttemptsExhausted, false);
}

MCStatus SECSimulator::SimulatePredictors(std::vector<double>& values) {
    if (values.size() != fvSimInputs.size()) {
        values.assign(fvSimInputs.size(), 0.0);
    }
    const MCStatus status = DrawCase();
    if (status.IsError()) {
        std::fill(values.begin(), values.end(), MCMV::Missing());
    } else {
        std::copy(fCase.fvInputs.begin(), fCase.fvInputs.end(), values.begin());
    }
    return status;
}

// ---- Display ------------------------------------------------------------------------------------

void SECSimulator::Display() const {
    using namespace MCDisplay_800;
    DisplayFrame frame("SECSimulator display start", "SECSimulator display end");
    DisplayI("Sensitivity iteration:", fIteration);
    DisplayI("Number of sensitivity iterations:", fNSensIterations);
    DisplayS("Sensitivity iteration input:", fSensIterName);
    DisplayI("Simulated inputs:", static_cast<long long>(fvSimInputs.size()));
    DisplayI("Correlated inputs:", static_cast<long long>(fvCorrelated.size()));
    DisplayI("Categorical inputs:", static_cast<long long>(fvCategorical.size()));
    DisplayI("Fixed inputs:", static_cast<long long>(fvFixedInputs.size()));
    DisplayB("Contingency table:", fbHasCrosstab);
    DisplayI("Normal correlation matrix rows:", fNormalCorr.GetNRows());
}

} // namespace MCMCSP_800
