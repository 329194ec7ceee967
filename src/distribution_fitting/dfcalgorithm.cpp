#include "distribution_fitting/dfcalgorithm.h"

#include "mccommon/display.h"
#include "mccommon/mcmv.h"
#include "mcmath/mcdistfun.h"

#include <algorithm>
#include <cmath>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MultiPassRecordIter;
using MCXML_800::Record;
using namespace MCSPConst;

namespace {

constexpr std::uint16_t Bit(DistType type) {
    return static_cast<std::uint16_t>(1u << type);
}

// Supports of the candidate distributions, as sets of type bits.
//! Whole numbers x ≥ 0.
constexpr std::uint16_t kCountTypes =
    Bit(kDistBinomial) | Bit(kDistNegbinomial) | Bit(kDistPoisson);
//! x > 0.
constexpr std::uint16_t kPositiveTypes = Bit(kDistLognormal) | Bit(kDistGamma);
//! x ≥ 0.
constexpr std::uint16_t kNonNegativeTypes = Bit(kDistWeibull) | Bit(kDistExponential);
//! 0 < x < 1.
constexpr std::uint16_t kUnitTypes = Bit(kDistBeta);
//! A value outside the support of one of these says the covariate is not a count.
constexpr std::uint16_t kDiscreteMarkTypes = kCountTypes | Bit(kDistLognormal);
//! Types whose likelihood needs Σ w·ln x.
constexpr std::uint16_t kLogSumTypes =
    Bit(kDistLognormal) | Bit(kDistWeibull) | Bit(kDistGamma) | Bit(kDistBeta);

//! Largest whole value a count distribution is tested on: the chi-square test compares the
//! counts of the values 0, 1, 2, ..., and the category counts stop at this value.
constexpr double kMaxCountValue = MCMath_800::MCCatStats::kMaxCategory;

//! The types (as bits) whose support excludes x. A count beyond kMaxCountValue is outside the
//! counts' support here, since it has no category to be counted in.
std::uint16_t UnsupportedTypes(double x) {
    std::uint16_t failed = 0;
    if (!(x >= 0.0 && x <= kMaxCountValue && x == std::round(x))) {
        failed |= kCountTypes;
    }
    if (!(x > 0.0)) {
        failed |= kPositiveTypes;
    }
    if (!(x >= 0.0)) {
        failed |= kNonNegativeTypes;
    }
    if (!(x > 0.0 && x < 1.0)) {
        failed |= kUnitTypes;
    }
    return failed;
}

//! Largest factor value that still has a category code (the code must be countable).
constexpr double kMaxFactorValue = MCMath_800::MCCatStats::kMaxCategory + 0.5;

//! Pearson's r = Cij / sqrt(Cii·Cjj) from sums of products of deviations. The square roots are
//! taken apart, so that tiny sums (weights near the smallest double) do not underflow to a zero
//! divisor and huge ones do not overflow. Missing when a field has no spread or a sum
//! overflowed; clamped to [-1, 1] against rounding.
double PearsonFromXProds(double cij, double cii, double cjj) {
    const double r = cij / (std::sqrt(cii) * std::sqrt(cjj));
    if (!(cii > 0.0) || !(cjj > 0.0) || !std::isfinite(r)) {
        return MCMV::Missing();
    }
    return std::clamp(r, -1.0, 1.0);
}

} // namespace

// ------------------------------------------------------------------------------------------
// Construction

DFCAlgorithm::DFCAlgorithm(const DFCSettings& settings, const MCXML_800::MCVarList& variables)
    : fSettings(settings), fpVarList(&variables), fOutputStats(settings, variables),
      fGFType(settings.GetGFType()), fbUseCrosstabs(settings.GetUseCrosstabs()),
      fbInteractiveMode(settings.GetInteractiveMode()),
      fbComputeAD(fGFType == kAndersonDarling || fbInteractiveMode),
      fbComputeKS(fGFType == kKolmogorovSmirnov || fbInteractiveMode),
      fMaxThreadNum(settings.GetMaxThreadNum()), fMemCacheKB(settings.GetMemCacheKB()),
      fpThreadFactory(settings.GetThreadFactory()),
      fNFactors(static_cast<int>(settings.GetFactorInfoElems().size())),
      fNCovariates(static_cast<int>(settings.GetCovariateInfoElems().size())),
      fWeightVar(settings.GetFrequencyWeightVar()), fNCasesLimit(settings.GetNCases()),
      fbThreeParamWeibull(GetDebugOptimizerSwitches().fbThreeParamWeibull) {
    fCancelInfo.SetCancelPtr(settings.GetCancelPointer());

    const auto nc = static_cast<std::size_t>(fNCovariates);
    const auto nf = static_cast<std::size_t>(fNFactors);
    if (fbUseCrosstabs && fNFactors >= 2) {
        fpFactorTables = std::make_unique<MCMath_800::MCFactorTables>();
        static_cast<void>(fpFactorTables->SetModelEffectFactors(fSettings.GetFactors()));
    }
    for (const DFCSettings::VarInfoElem& info : fSettings.GetCovariateInfoElems()) {
        const bool continuous = info.fMeasureLevel == kLevelContinuous;
        fvbContinuous.push_back(continuous);
        fvbDiscreteMark.push_back(!continuous);
    }
    fvFactorValues.assign(nf, -1.0);
    fvFactorCodes.assign(nf, 0);
    fvCovariateValues.assign(nc, 0.0);
    fvpCatStatsCovars.resize(nc);
    fvpHistograms.resize(nc);
    for (std::size_t f = 0; f < nf; ++f) {
        fvpCatStatsFactors.push_back(std::make_unique<MCMath_800::MCCatStats>());
    }
    if (fNCovariates > 0) {
        fpProvMeans = std::make_unique<MCMath_800::MCProvMeans>(fNCovariates, true);
    }
    for (std::vector<double>* v :
         {&fvMeans, &fvVariances, &fvVariancesW, &fvRanges, &fvModes, &fvSumLogX, &fvMeanLogX,
          &fvGeoMeans, &fvSumSqLogDev, &fvVarLogX, &fvSumLog1MinusX, &fvSumX, &fvSumLogGammaX1,
          &fvSumX2, &fvMeanX2, &fvSumX4, &fvMeanX4}) {
        v->assign(nc, 0.0);
    }
    for (std::vector<double>* v : {&fvMinimums, &fvMaximums, &fvRanges, &fvModes, &fvMeanLogX,
                                   &fvGeoMeans, &fvVarLogX, &fvMeanX2, &fvMeanX4}) {
        v->assign(nc, MCMV::Missing());
    }
    fvAllowedMask.assign(nc, 0);
}

DFCAlgorithm::~DFCAlgorithm() = default;

// ------------------------------------------------------------------------------------------
// The contract toward the host

MCStatus DFCAlgorithm::BuildModel(MultiPassRecordIter& trainData, MultiPassRecordIter* /*unused*/) {
    if (fbModelBuilt) {
        return fStatus;
    }
    fWarnings.ClearWarnings();
    if (fbBuildRan) {
        return fStatus;
    }
    fbBuildRan = true;
    MCStatus status;
    try {
        status = RunBuildSteps(trainData);
    } catch (...) {
        status = MCStatus(MCSPStatus::kLowExpectedOrException, false);
    }
    fStatus = status;
    fbModelBuilt = !status.IsError();
    return status;
}

MCStatus DFCAlgorithm::RunBuildSteps(MultiPassRecordIter& trainData) {
    if (!trainData.HasMore()) {
        return MCStatus(MCSPStatus::kNoData, false);
    }
    // A step's warning joins the run's warnings; an error ends the build.
    const auto goesOn = [this](const MCStatus& status) {
        if (status.IsWarning()) {
            fWarnings.AddWarning(status, 0);
        }
        return !status.IsError();
    };
    MCStatus status = fSettings.IsValidSettings();
    if (!goesOn(status)) {
        return status;
    }
    status = fSettings.DoubleCheckSettings();
    if (!goesOn(status)) {
        return status;
    }
    for (const MCStatus& warning : fSettings.GetWarningMessages().GetWarnings(false)) {
        fWarnings.AddWarning(warning, 0);
        if (warning.IsError()) {
            return warning;
        }
    }
    if (status = ComputeBasicStats(trainData); !goesOn(status)) {
        return status;
    }
    if (status = SetInitialDistParams(); !goesOn(status)) {
        return status;
    }
    if (status = OptimizeDistParams(trainData); !goesOn(status)) {
        return status;
    }
    if (status = ComputeChiSquare(); !goesOn(status)) {
        return status;
    }
    if (trainData.Restart() != 0) {
        return MCStatus(MCSPStatus::kNoData, false);
    }
    if (status = PerformFitGoodness(trainData); !goesOn(status)) {
        return status;
    }
    if (status = fOutputStats.GetStatus(); !goesOn(status)) {
        return status;
    }
    for (const MCStatus& warning : fOutputStats.GetStatComputeWarnings()) {
        fWarnings.AddWarning(warning, 0);
    }
    return status;
}

MCStatus DFCAlgorithm::GetOutputStats(DFCOutputStats*& out) {
    return HandOutResults(&fOutputStats, out);
}

DFCOutputStats::DFCVarDistInfo& DFCAlgorithm::GetOutCovarVarInfo(int covariate) {
    return fOutputStats.GetCovarDistInfo()[static_cast<std::size_t>(covariate)];
}

DFCOutputStats::DFCVarDistElement& DFCAlgorithm::GetOutCovarDistInfo(int covariate, DistType type) {
    return GetOutCovarVarInfo(covariate).fDistElements[static_cast<std::size_t>(type)];
}

DFCOutputStats::DFCVarDistInfo& DFCAlgorithm::GetOutFactorVarInfo(int factor) {
    return fOutputStats.GetFactorDistInfo()[static_cast<std::size_t>(factor)];
}

DFCOutputStats::DFCVarDistElement& DFCAlgorithm::GetOutFactorDistInfo(int factor, DistType type) {
    return GetOutFactorVarInfo(factor).fDistElements[static_cast<std::size_t>(type)];
}

DFCMomentInputs DFCAlgorithm::GetCovariateMoments(int covariate) const {
    const auto i = static_cast<std::size_t>(covariate);
    return DFCMomentInputs{fvMeans[i],    fvVariances[i], fvVariancesW[i], fvMinimums[i],
                           fvMaximums[i], fvModes[i],     fvGeoMeans[i],   fvVarLogX[i]};
}

void DFCAlgorithm::Display(std::ostream& os) const {
    MCDisplay_800::ScopedOutStream redirect(os);
    MCDisplay_800::DisplayFrame frame("DFCAlgorithm display start", "DFCAlgorithm display end");
    fpVarList->Display();
    // This algorithm is never built through a component or model builder.
    MCDisplay_800::DisplayText("Both component and Model builder pointers are 0");
}

// ------------------------------------------------------------------------------------------
// Reading one record

bool DFCAlgorithm::GetRecordValues(const Record& record, bool update) {
    bool valid = true;
    fWeight = 1.0;
    if (fWeightVar >= 0) {
        fWeight = record[static_cast<std::size_t>(fWeightVar)];
        // An infinite weight would make every moment infinite: it is as unusable as a
        // missing one.
        if (!std::isfinite(fWeight) || fWeight <= 0.0) {
            valid = false;
            fWeight = 0.0;
        }
    }
    const std::vector<int>& covariates = fSettings.GetCovariates();
    for (int i = 0; valid && i < fNCovariates; ++i) {
        const double x = record[static_cast<std::size_t>(covariates[static_cast<std::size_t>(i)])];
        fvCovariateValues[static_cast<std::size_t>(i)] = x;
        // Missing, and also infinite: no moment or support check can use an infinite value.
        valid = std::isfinite(x);
    }
    const std::vector<int>& factors = fSettings.GetFactors();
    for (int f = 0; valid && f < fNFactors; ++f) {
        const double v = record[static_cast<std::size_t>(factors[static_cast<std::size_t>(f)])];
        fvFactorValues[static_cast<std::size_t>(f)] = v;
        // A value beyond the largest countable category has no code either (and converting
        // it to int would overflow).
        valid = !MCMV::IsMissing(v) && v > -0.5 && v < kMaxFactorValue;
        if (valid) {
            fvFactorCodes[static_cast<std::size_t>(f)] = static_cast<int>(v + 0.5);
        }
    }
    if (update) {
        if (valid) {
            ++fNValid;
            fValidWeight += fWeight;
        } else {
            ++fNInvalid;
            fInvalidWeight += fWeight;
        }
        ++fNRecords;
        fTotalWeight += fWeight;
        if (valid) {
            UpdateCovariateChecks();
        }
    }
    return valid;
}

void DFCAlgorithm::UpdateCovariateChecks() {
    const double w = fWeight;
    for (int i = 0; i < fNCovariates; ++i) {
        const auto ui = static_cast<std::size_t>(i);
        const double x = fvCovariateValues[ui];
        const std::uint16_t failed = UnsupportedTypes(x) & fvAllowedMask[ui];
        if (failed != 0) {
            for (int k = 0; k < kNFitDistTypes; ++k) {
                if (failed & Bit(static_cast<DistType>(k))) {
                    DropCovarDist(i, static_cast<DistType>(k), kDropSupport);
                }
            }
            if (failed & kDiscreteMarkTypes) {
                fvbDiscreteMark[ui] = false;
            }
        }
        if (MCMV::IsMissing(fvMinimums[ui])) {
            fvMinimums[ui] = x;
            fvMaximums[ui] = x;
        } else if (x < fvMinimums[ui]) {
            fvMinimums[ui] = x;
        } else if (x > fvMaximums[ui]) {
            fvMaximums[ui] = x;
        }
        const std::uint16_t mask = fvAllowedMask[ui];
        if (mask & kLogSumTypes) {
            fvSumLogX[ui] += w * std::log(x);
        }
        if (mask & Bit(kDistBeta)) {
            fvSumLog1MinusX[ui] += w * std::log1p(-x);
        }
        if (mask & Bit(kDistNegbinomial)) {
            fvSumLogGammaX1[ui] += w * MCMath_800::MCDistFun::norvanednlgam(x + 1.0);
        }
    }
}

void DFCAlgorithm::DropCovarDist(int covariate, DistType type, DFCDropReason reason) {
    fvAllowedMask[static_cast<std::size_t>(covariate)] &= static_cast<std::uint16_t>(~Bit(type));
    DFCOutputStats::DFCVarDistElement& element = GetOutCovarDistInfo(covariate, type);
    element.fbDistAllowed = false;
    element.fDropReason = reason;
    fWarnings.AddWarning(MCStatus(MCSPStatus::kDistDropped, true), 0);
}

// ------------------------------------------------------------------------------------------
// The two descriptive passes

template <class OnValid>
MCStatus DFCAlgorithm::RunPass(MultiPassRecordIter& trainData, bool update, OnValid onValid) {
    std::int64_t ordinal = 0;
    while (trainData.HasMore()) {
        if (fCancelInfo.WillCancel()) {
            return MCStatus(MCSPStatus::kCancelled, false);
        }
        // Records beyond the case limit would not be used: the pass ends there.
        if (fNCasesLimit >= 1 && ordinal >= fNCasesLimit) {
            break;
        }
        const Record* record = trainData.NextRecord();
        if (!record) {
            return MCStatus(MCSPStatus::kNoData, false);
        }
        ++ordinal;
        if (GetRecordValues(*record, update)) {
            onValid();
        }
    }
    return MCStatus();
}

MCStatus DFCAlgorithm::ComputeBasicStats(MultiPassRecordIter& trainData) {
    if (!trainData.HasMore()) {
        return MCStatus(MCSPStatus::kNoData, false);
    }
    // The elements start with the settings' flags; the masks mirror them during the passes.
    const std::vector<DFCSettings::VarInfoElem>& covInfo = fSettings.GetCovariateInfoElems();
    for (int i = 0; i < fNCovariates; ++i) {
        const auto ui = static_cast<std::size_t>(i);
        fvAllowedMask[ui] = 0;
        for (int k = 0; k < kNFitDistTypes; ++k) {
            const auto type = static_cast<DistType>(k);
            DFCOutputStats::DFCVarDistElement& element = GetOutCovarDistInfo(i, type);
            element.fbDistAllowed = element.fbDistAllowed && covInfo[ui].IsDistAllowed(type);
            if (element.fbDistAllowed) {
                fvAllowedMask[ui] |= Bit(type);
            }
        }
    }

    MCStatus status = RunPass(trainData, true, [this]() {
        if (fpProvMeans) {
            static_cast<void>(fpProvMeans->Update(fvCovariateValues.data(), fNCovariates, fWeight));
        }
        if (fpFactorTables) {
            static_cast<void>(fpFactorTables->UpdateCodes(fvFactorCodes));
        }
    });
    if (status.IsError()) {
        return status;
    }
    // Without a single usable record there is nothing to describe or fit.
    if (fNValid == 0) {
        return MCStatus(MCSPStatus::kNoData, false);
    }
    // Weights whose sum overflows (frequency weights near the largest double) leave W, and
    // with it every mean, count and proportion, without a value: the fitting cannot go on.
    if (!std::isfinite(fValidWeight) || !std::isfinite(fTotalWeight)) {
        return MCStatus(MCSPStatus::kLowExpectedOrException, false);
    }
    FinishFirstPass();
    if (fpFactorTables) {
        fNCells = fpFactorTables->CreateParameterIndices(0);
        fvCellWeights.assign(static_cast<std::size_t>(fNCells), 0.0);
    }

    if (trainData.Restart() != 0) {
        return MCStatus(MCSPStatus::kNoData, false);
    }
    status = RunPass(trainData, false, [this]() { UpdateSecondPass(); });
    if (status.IsError()) {
        return status;
    }
    FinishSecondPass();
    return MCStatus();
}

void DFCAlgorithm::FinishFirstPass() {
    const double w = fValidWeight;
    const std::vector<double> noMeans(static_cast<std::size_t>(fNCovariates), 0.0);
    const std::vector<double>& means = fpProvMeans ? fpProvMeans->GetMeans() : noMeans;
    fpXProds = fpProvMeans ? &fpProvMeans->GetXProds() : nullptr;
    MCMath_800::MCSymMatrix& corr = fOutputStats.GetCorrMatrix();
    corr.SetNRows(fNCovariates);

    for (int i = 0; i < fNCovariates; ++i) {
        const auto ui = static_cast<std::size_t>(i);
        const double m = means[ui];
        const double minimum = fvMinimums[ui];
        const double maximum = fvMaximums[ui];
        fvMeans[ui] = m;
        fvRanges[ui] = maximum - minimum;
        fvSumX[ui] = m * w;
        const double xprod = fpXProds->GetElem(i, i);
        // The unbiased variance needs W > 1; with less weight it does not exist. Nor does it
        // when the sum of squared deviations overflowed (values near both ends of the double
        // range): an infinite variance would pass for a number.
        const bool spread = std::isfinite(xprod);
        fvVariances[ui] = spread && w > 1.0 ? xprod / (w - 1.0) : MCMV::Missing();
        fvVariancesW[ui] = spread ? xprod / w : MCMV::Missing();
        corr.SetElem(i, i, 1.0);

        // Uniform and Triangular distribution functions divide by the range: one that
        // overflows leaves them without a usable distribution function.
        if (!std::isfinite(fvRanges[ui])) {
            for (const DistType type : {kDistTriangular, kDistUniform}) {
                if (fvAllowedMask[ui] & Bit(type)) {
                    DropCovarDist(i, type, kDropRangeOverflow);
                }
            }
        }
        const std::uint16_t mask = fvAllowedMask[ui];
        // A binomial's variance n·p·(1-p) is below its mean n·p.
        if ((mask & Bit(kDistBinomial)) && fvVariances[ui] >= m) {
            DropCovarDist(i, kDistBinomial, kDropOverDispersion);
        }
        // The negative binomial has a maximum-likelihood estimate only when the variance (divisor
        // W) exceeds the mean (Aragón, Eberly and Eberly 1992, "Existence and uniqueness of the
        // maximum likelihood estimator for the two-parameter negative binomial distribution",
        // Stat. Probab. Lett. 15, 375-379); below it the likelihood rises towards the Poisson
        // limit r → ∞, and any finite estimate would be an arbitrary point on the way.
        if ((mask & Bit(kDistNegbinomial)) && maximum > minimum && !(fvVariancesW[ui] > m)) {
            DropCovarDist(i, kDistNegbinomial, kDropUnderDispersion);
        }
        // Triangular moment match: mean = (min + max + mode)/3, so with the range r the mode
        // lies at min + r·t, t = 3·(mean - min)/r - 1, clamped to [min, max].
        if (mask & Bit(kDistTriangular)) {
            if (fvRanges[ui] == 0.0) {
                DropCovarDist(i, kDistTriangular, kDropNoVariance);
            } else {
                const double t = 3.0 * (m - minimum) / fvRanges[ui] - 1.0;
                fvModes[ui] =
                    t <= 0.0 ? minimum : (t >= 1.0 ? maximum : minimum + fvRanges[ui] * t);
            }
        }
        if (mask & Bit(kDistLognormal)) {
            fvMeanLogX[ui] = fvSumLogX[ui] / w;
            fvGeoMeans[ui] = std::exp(fvMeanLogX[ui]);
        }
        if (fvbContinuous[ui]) {
            if (maximum > minimum) {
                fvpHistograms[ui] =
                    std::make_unique<DFCHistogramData>(fSettings.GetBins(), minimum, maximum, true);
            }
        } else {
            fvpCatStatsCovars[ui] = std::make_unique<MCMath_800::MCCatStats>();
        }
    }
    // Pearson correlations from the cross products of deviations; a covariate without spread
    // correlates with nothing.
    for (int i = 0; i < fNCovariates; ++i) {
        for (int j = 0; j < i; ++j) {
            corr.SetElem(i, j,
                         PearsonFromXProds(fpXProds->GetElem(i, j), fpXProds->GetElem(i, i),
                                           fpXProds->GetElem(j, j)));
        }
    }
}

void DFCAlgorithm::UpdateSecondPass() {
    const double w = fWeight;
    for (int i = 0; i < fNCovariates; ++i) {
        const auto ui = static_cast<std::size_t>(i);
        const double x = fvCovariateValues[ui];
        const std::uint16_t mask = fvAllowedMask[ui];
        if (mask & Bit(kDistWeibull)) {
            const double x2 = x * x;
            fvSumX2[ui] += w * x2;
            fvSumX4[ui] += w * x2 * x2;
        }
        if (mask & Bit(kDistLognormal)) {
            const double d = std::log(x) - fvMeanLogX[ui];
            fvSumSqLogDev[ui] += w * d * d;
        }
        if (fvpCatStatsCovars[ui]) {
            static_cast<void>(fvpCatStatsCovars[ui]->Update(x, w));
        }
        if (fvpHistograms[ui]) {
            static_cast<void>(fvpHistograms[ui]->UpdateData(w, 1.0, x));
        }
    }
    for (int f = 0; f < fNFactors; ++f) {
        const auto uf = static_cast<std::size_t>(f);
        static_cast<void>(fvpCatStatsFactors[uf]->Update(fvFactorValues[uf], w));
    }
    if (fpFactorTables) {
        const int cell = fpFactorTables->GetParameterIndices(fvFactorCodes, false)[0];
        if (cell >= 0 && cell < fNCells) {
            fvCellWeights[static_cast<std::size_t>(cell)] += w;
        }
    }
}

void DFCAlgorithm::FinishSecondPass() {
    const double w = fValidWeight;
    for (std::size_t i = 0; i < static_cast<std::size_t>(fNCovariates); ++i) {
        if (fvAllowedMask[i] & Bit(kDistWeibull)) {
            fvMeanX2[i] = fvSumX2[i] / w;
            fvMeanX4[i] = fvSumX4[i] / w;
        }
        if (fvAllowedMask[i] & Bit(kDistLognormal)) {
            fvVarLogX[i] = fvSumSqLogDev[i] / w;
        }
    }
    if (!fpFactorTables) {
        return;
    }
    std::vector<std::vector<std::string>>& rows = fOutputStats.GetCrstabsMatrix();
    std::vector<double>& probs = fOutputStats.GetCrstabsProbs();
    const std::vector<int>& factors = fSettings.GetFactors();
    std::vector<int> codes;
    for (int k = 0; k < fNCells; ++k) {
        static_cast<void>(fpFactorTables->GetParameterFactorValues(codes, 0, k));
        std::vector<std::string> row;
        row.reserve(static_cast<std::size_t>(fNFactors));
        for (std::size_t f = 0; f < codes.size(); ++f) {
            // The factor's own variable (by its variable index) names its categories.
            row.push_back(GetCategoryText(fpVarList->GetVarAt(factors[f]), codes[f]));
        }
        rows.push_back(std::move(row));
        probs.push_back(fvCellWeights[static_cast<std::size_t>(k)] / w);
    }
}

} // namespace MCMCSP_800
