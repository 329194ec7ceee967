// SECSimulator: the sensitivity measures of the continuous targets with respect to the
// covariates (the inputs of the correlated set).
//
// Delta measure (tornado bars). For covariate k with delta δ_k = s_k × d (d standard
// deviations), each accepted case is scored again with x_k + δ_k and with x_k − δ_k; the mean
// changes of target t are the two ends of k's bar. For a linear model t = Σ a_k x_k they are
// ±a_k δ_k exactly.
//
// A variant that cannot be evaluated (a shifted input outside its natural range, a failed or
// missing score, no acceptable further case) is skipped and counted per covariate; the base
// case is scored, accepted and accumulated exactly as with the measures off, and the further
// cases come from a stream of their own, so that asking for a measure never changes what it
// measures.
//
// Contribution to variance. With a second, independent case x', the record that takes x'_k for
// input k and the case's own values elsewhere gives Y_k. Cov(Y, Y_k) = Var(E[Y | x_−k]), so
// (V − Cov(Y, Y_k)) / V = E[Var(Y | x_−k)] / V, the share of the variance that input k accounts
// for together with its interactions (Sobol's total-effect index; Homma & Saltelli, 1996). For
// independent inputs of a linear model it is a_k² Var(x_k) / V.
//
// Cov(Y, Y_k) is estimated as mean((Y − c)(Y_k − c)) − (μ − c)² with c the target's pilot mean,
// not as mean(Y·Y_k) − μ²: the two agree when E[Y_k] = μ (independent inputs), but the raw
// products carry a noise that grows with μ²/V (sevenfold for a mean six standard deviations from
// 0), and with correlated inputs they make the share change when a constant is added to the
// target (the term μ·(E[Y_k] − μ)). Centring near μ removes both; Sobol' (2001, Math. Comput.
// Simul. 55) recommends subtracting an estimate of the mean before forming such products.
#include "simulation_evaluation/secsimulator.h"

#include "mccommon/mcmv.h"

#include <algorithm>
#include <cstdint>
#include <memory>
#include <utility>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCMath_800::MCContStats;

namespace {
//! Mixed into the base stream's seed to seed the further cases' stream (an odd constant of
//! the golden ratio, so that neighbouring seeds do not give neighbouring streams).
constexpr std::uint32_t kFurtherSeedMix = 0x9E3779B9u;
} // namespace

void SECSimulator::PrepareSensitivity() {
    fbDeltaMeasure = fpSettings->UseTornadoStddev();
    fbVarianceMeasure = fpSettings->TornadoVariance();
    fvContTargetPos.clear();
    for (const Target& target : fvTargets) {
        if (!target.fbCategorical) {
            fvContTargetPos.push_back(target.fValuePos);
        }
    }
    fvContCentre.assign(fvContTargetPos.size(), 0.0);
    const std::size_t nCovariates = fvCorrelated.size();
    const std::size_t cells = fvContTargetPos.size() * nCovariates;
    fvPosDiff.assign(cells, MCMV::Missing());
    fvNegDiff.assign(cells, MCMV::Missing());
    fvProducts.assign(cells, MCMV::Missing());
    fvWorkInputs.assign(fvSimInputs.size(), MCMV::Missing());
    fvWorkValues.assign(static_cast<std::size_t>(fNValuesPerCase), MCMV::Missing());
    fFurther.Reset(fvSimInputs.size(), fvCorrelated.size());
    fFurther.fvValues.assign(static_cast<std::size_t>(fNValuesPerCase), MCMV::Missing());
    for (SECContinuousTargetInfo& info : fpOutputStats->GetContTargetInfo()) {
        info.fvPositiveDelta.assign(nCovariates, MCMV::Missing());
        info.fvNegativeDelta.assign(nCovariates, MCMV::Missing());
        info.fvVarianceContrib.assign(nCovariates, MCMV::Missing());
        info.fvPositiveDeltaStats.assign(fbDeltaMeasure ? nCovariates : 0, MCContStats());
        info.fvNegativeDeltaStats.assign(fbDeltaMeasure ? nCovariates : 0, MCContStats());
        info.fvVarianceContribStats.assign(fbVarianceMeasure ? nCovariates : 0, MCContStats());
        info.fvDeltaSkipped.assign(fbDeltaMeasure ? nCovariates : 0, 0);
        info.fvVarianceSkipped.assign(fbVarianceMeasure ? nCovariates : 0, 0);
    }
}

bool SECSimulator::DrawFurtherCase() {
    if (!fpFurtherStream) {
        // Seeded from the base stream's seed, so a run stays reproducible for its seed, and
        // parameterised as the base normal generator.
        fpFurtherStream = std::make_unique<MCMath_800::MCURandom>(
            fpStream->GetSeed() ^ kFurtherSeedMix, true, true, nullptr);
        fFurtherValues = fRandomValues;
        fFurtherValues.SetURNGPtr(fpFurtherStream.get());
    }
    return !DrawAcceptedCase(fFurther, fFurtherValues, *fpFurtherStream, true).IsError();
}

void SECSimulator::ComputeCaseSensitivity() {
    const std::size_t nCovariates = fvCorrelated.size();
    const std::size_t nTargets = fvContTargetPos.size();
    const std::vector<double>& base = fCase.fvValues;
    // Differences of every continuous target from the case's own score; missing (skipped)
    // when the variant could not be scored.
    const auto record = [&](std::vector<double>& table, std::size_t k, bool scored) {
        for (std::size_t t = 0; t < nTargets; ++t) {
            const auto pos = static_cast<std::size_t>(fvContTargetPos[t]);
            table[t * nCovariates + k] = scored ? fvWorkValues[pos] - base[pos] : MCMV::Missing();
        }
    };
    // A shifted value outside the input's natural range is no value of its distribution (a
    // LogNormal below 0, a Beta outside [0, 1]); the model is not asked about it.
    const auto scoreShifted = [&](std::size_t k, double value) {
        const SECInputGenerator& gen = fvCorrelated[k].fGenerator;
        if ((!MCMV::IsMissing(gen.fLower) && value < gen.fLower) ||
            (!MCMV::IsMissing(gen.fUpper) && value > gen.fUpper)) {
            return false;
        }
        fvWorkInputs[static_cast<std::size_t>(fvCorrelated[k].fCasePos)] = value;
        return !ScoreInputs(fvWorkInputs, fvWorkValues).IsError();
    };

    fvWorkInputs = fCase.fvInputs;
    if (fbDeltaMeasure) {
        for (std::size_t k = 0; k < nCovariates; ++k) {
            const double delta = fvCorrelated[k].fTornadoDelta;
            if (MCMV::IsMissing(delta) || !(delta > 0.0)) {
                continue;
            }
            const auto pos = static_cast<std::size_t>(fvCorrelated[k].fCasePos);
            const double saved = fCase.fvInputs[pos];
            record(fvPosDiff, k, scoreShifted(k, saved + delta));
            record(fvNegDiff, k, scoreShifted(k, saved - delta));
            fvWorkInputs[pos] = saved;
        }
    }

    if (fbVarianceMeasure) {
        const bool further = DrawFurtherCase();
        for (std::size_t k = 0; k < nCovariates; ++k) {
            if (!fvCorrelated[k].fbVarianceContrib) {
                continue;
            }
            const auto pos = static_cast<std::size_t>(fvCorrelated[k].fCasePos);
            fvWorkInputs[pos] = fFurther.fvInputs[pos];
            const bool scored = further && !ScoreInputs(fvWorkInputs, fvWorkValues).IsError();
            for (std::size_t t = 0; t < nTargets; ++t) {
                const auto tpos = static_cast<std::size_t>(fvContTargetPos[t]);
                const double c = fvContCentre[t];
                fvProducts[t * nCovariates + k] =
                    scored ? (base[tpos] - c) * (fvWorkValues[tpos] - c) : MCMV::Missing();
            }
            fvWorkInputs[pos] = fCase.fvInputs[pos];
        }
    }
}

void SECSimulator::AccumulateSensitivity() {
    const std::size_t nCovariates = fvCorrelated.size();
    std::vector<SECContinuousTargetInfo>& cont = fpOutputStats->GetContTargetInfo();
    for (std::size_t t = 0; t < cont.size(); ++t) {
        SECContinuousTargetInfo& info = cont[t];
        for (std::size_t k = 0; k < nCovariates; ++k) {
            const std::size_t cell = t * nCovariates + k;
            const double delta = fvCorrelated[k].fTornadoDelta;
            // A missing difference or product is a skipped evaluation: counted, and left out
            // (the two sides of a delta separately).
            if (fbDeltaMeasure && !MCMV::IsMissing(delta) && delta > 0.0) {
                const bool pos = !MCMV::IsMissing(fvPosDiff[cell]);
                const bool neg = !MCMV::IsMissing(fvNegDiff[cell]);
                if (pos) {
                    info.fvPositiveDeltaStats[k].Update(fvPosDiff[cell]);
                }
                if (neg) {
                    info.fvNegativeDeltaStats[k].Update(fvNegDiff[cell]);
                }
                info.fvDeltaSkipped[k] += (pos && neg) ? 0 : 1;
            }
            if (fbVarianceMeasure && fvCorrelated[k].fbVarianceContrib) {
                if (MCMV::IsMissing(fvProducts[cell])) {
                    ++info.fvVarianceSkipped[k];
                } else {
                    info.fvVarianceContribStats[k].Update(fvProducts[cell]);
                }
            }
        }
    }
}

void SECSimulator::CompleteSensitivity() {
    const std::size_t nCovariates = fvCorrelated.size();
    std::vector<SECContinuousTargetInfo>& cont = fpOutputStats->GetContTargetInfo();
    for (std::size_t t = 0; t < cont.size(); ++t) {
        SECContinuousTargetInfo& info = cont[t];
        const double variance = info.fContStats.GetVariance();
        const double offset =
            info.fContStats.GetMean() - (t < fvContCentre.size() ? fvContCentre[t] : 0.0);
        info.fvPositiveDelta.assign(nCovariates, MCMV::Missing());
        info.fvNegativeDelta.assign(nCovariates, MCMV::Missing());
        info.fvVarianceContrib.assign(nCovariates, MCMV::Missing());
        for (std::size_t k = 0; k < nCovariates; ++k) {
            const double delta = fvCorrelated[k].fTornadoDelta;
            if (fbDeltaMeasure && !MCMV::IsMissing(delta) && delta > 0.0 &&
                k < info.fvPositiveDeltaStats.size()) {
                info.fvPositiveDelta[k] = info.fvPositiveDeltaStats[k].GetMean();
                info.fvNegativeDelta[k] = info.fvNegativeDeltaStats[k].GetMean();
            }
            if (fbVarianceMeasure && fvCorrelated[k].fbVarianceContrib &&
                k < info.fvVarianceContribStats.size() && !MCMV::IsMissing(variance) &&
                variance > 0.0) {
                const double meanProduct = info.fvVarianceContribStats[k].GetMean();
                if (!MCMV::IsMissing(meanProduct)) {
                    info.fvVarianceContrib[k] =
                        (variance - (meanProduct - offset * offset)) / variance;
                }
            }
        }
    }
}

} // namespace MCMCSP_800

namespace MCMCSP_800 {

namespace {
//! A discrete input with at most this many values gets a bin per value.
constexpr std::size_t kFirstOrderValueBins = 64;
} // namespace

void SECSimulator::PrepareAddedResults() {
    fbAddedResults = fpSettings->QuantilesAndIndices();
    if (!fbAddedResults) {
        return;
    }
    std::vector<int> bins(fvSimInputs.size(), SECFirstOrderIndices::kNormalScoreBins);
    fvFirstOrderValues.assign(fvSimInputs.size(), {});
    fvFirstOrderScore.assign(fvSimInputs.size(), -1);
    fvFirstOrderCats.assign(fvSimInputs.size(), 0);
    for (std::size_t i = 0; i < fvSimInputs.size(); ++i) {
        const SimInput& input = fvSimInputs[i];
        const auto group = static_cast<std::size_t>(input.fGroupIndex);
        if (input.fbCategorical) {
            fvFirstOrderCats[i] = fvCategorical[group].fSampler.fvCategoryText.size();
            bins[i] = static_cast<int>(fvFirstOrderCats[i]);
            continue;
        }
        std::vector<double> cdf;
        if (SECDiscreteSupport(fvCorrelated[group].fGenerator, kFirstOrderValueBins,
                               fvFirstOrderValues[i], cdf)) {
            bins[i] = static_cast<int>(fvFirstOrderValues[i].size());
        } else {
            fvFirstOrderScore[i] = input.fGroupIndex;
        }
    }
    fFirstOrder.Reset(bins, fvContCentre);
    fvFirstOrderBin.assign(fvSimInputs.size(), -1);
    fvFirstOrderY.assign(fvContTargetPos.size(), 0.0);
    for (SECContinuousTargetInfo& info : fpOutputStats->GetContTargetInfo()) {
        info.fQuantiles = SECQuantileSummary();
    }
}

void SECSimulator::AccumulateAddedResults(const std::vector<double>& inputs,
                                          const std::vector<double>& values, bool withScores) {
    std::vector<SECContinuousTargetInfo>& cont = *fpContInfo;
    for (std::size_t t = 0; t < fvContTargetPos.size(); ++t) {
        fvFirstOrderY[t] = values[static_cast<std::size_t>(fvContTargetPos[t])];
        cont[t].fQuantiles.Add(fvFirstOrderY[t]);
    }
    if (!withScores) {
        return;
    }
    for (std::size_t i = 0; i < fvSimInputs.size(); ++i) {
        const int score = fvFirstOrderScore[i];
        if (score >= 0) {
            fvFirstOrderBin[i] =
                SECFirstOrderIndices::NormalScoreBin(fCase.fvZ[static_cast<std::size_t>(score)]);
            continue;
        }
        const double x = inputs[i];
        int bin = -1;
        if (fvFirstOrderValues[i].empty()) {
            // A categorical input: its category index.
            bin = x >= 0.0 && x < static_cast<double>(fvFirstOrderCats[i]) ? static_cast<int>(x)
                                                                           : -1;
        } else {
            const std::vector<double>& support = fvFirstOrderValues[i];
            const auto it = std::lower_bound(support.begin(), support.end(), x);
            bin = it != support.end() && *it == x ? static_cast<int>(it - support.begin()) : -1;
        }
        fvFirstOrderBin[i] = bin;
    }
    fFirstOrder.Add(fvFirstOrderBin.data(), fvFirstOrderY.data());
}

void SECSimulator::CompleteAddedResults() {
    if (!fbAddedResults) {
        return;
    }
    std::vector<SECContinuousTargetInfo>& cont = fpOutputStats->GetContTargetInfo();
    for (std::size_t t = 0; t < cont.size(); ++t) {
        SECContinuousTargetInfo& info = cont[t];
        info.fvFirstOrder.assign(fvSimInputs.size(), MCMV::Missing());
        for (std::size_t i = 0; i < fvSimInputs.size(); ++i) {
            info.fvFirstOrder[i] = fFirstOrder.Index(i, t, info.fContStats.GetSumSqDev());
        }
    }
}

} // namespace MCMCSP_800
