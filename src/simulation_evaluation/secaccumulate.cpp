// SECSimulator: the statistics of the accepted cases: accumulation, the stop criteria, the
// host-driven records, the merge of the workers and the completion of the results.
#include "simulation_evaluation/secsimulator.h"

#include "component/mcspassert.h"
#include "component/mcspcomponent.h"
#include "mccommon/mcmv.h"
#include "simulation_evaluation/secsimdetail.h"

#include <algorithm>
#include <cmath>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCMath_800::MCContStats;
using namespace detail;

// ---- Accumulation -----------------------------------------------------------------------------

void SECSimulator::AccumulateCase() {
    if (UsesSensitivity()) {
        AccumulateSensitivity();
    }
    AccumulateValues(fCase.fvInputs, fCase.fvValues, fCase.fCell, fCase.fRejections);
    if (fbAddedResults) {
        AccumulateAddedResults(fCase.fvInputs, fCase.fvValues, true);
    }
}

void SECSimulator::AccumulateValues(const std::vector<double>& inputs,
                                    const std::vector<double>& values, int cell, int rejections) {
    ++fSimCaseCount;
    fFilteredCaseCount += rejections;
    ++fValidCaseCount;

    // The covariates' moments come from the cross products at completion; only their extremes
    // are kept here.
    const std::size_t nCorrelated = fvCorrelated.size();
    for (std::size_t k = 0; k < nCorrelated; ++k) {
        const double x = inputs[static_cast<std::size_t>(fvCorrelated[k].fCasePos)];
        fvCovarMin[k] = x < fvCovarMin[k] ? x : fvCovarMin[k];
        fvCovarMax[k] = x > fvCovarMax[k] ? x : fvCovarMax[k];
        fvCombined[k] = x;
    }
    if (cell >= 0 && static_cast<std::size_t>(cell) < fvCellCounts.size()) {
        fvCellCounts[static_cast<std::size_t>(cell)] += 1.0;
    }
    for (std::size_t t = 0; t < fvTargets.size(); ++t) {
        fvCombined[nCorrelated + t] = values[static_cast<std::size_t>(fvTargets[t].fValuePos)];
    }
    fProvMeans.Update(fvCombined, 1.0);

    std::vector<SECContinuousTargetInfo>& cont = *fpContInfo;
    std::vector<SECCategoricalTargetInfo>& cat = *fpCatInfo;
    for (const Target& target : fvTargets) {
        const auto pos = static_cast<std::size_t>(target.fValuePos);
        const double v = values[pos];
        std::vector<MCScatterPlotData>* plots = nullptr;
        if (target.fbCategorical) {
            SECCategoricalTargetInfo& info = cat[static_cast<std::size_t>(target.fListIndex)];
            info.fCatStats.Update(v, 1.0);
            for (std::size_t k = 0; k < info.fvProbStats.size(); ++k) {
                const double p = values[pos + 1 + k];
                info.fvProbStats[k].Update(p);
                if (k < info.fvProbHistograms.size() && !MCMV::IsMissing(p)) {
                    info.fvProbHistograms[k].UpdateData(1.0, 1.0, p);
                }
            }
            plots = &info.fvScatterPlots;
        } else {
            SECContinuousTargetInfo& info = cont[static_cast<std::size_t>(target.fListIndex)];
            info.fContStats.Update(v);
            if (fbChartsReady) {
                info.fHistogram.UpdateData(1.0, 1.0, v);
            }
            if (fStopTails.fKind == StopKind::kTails && fStopTails.fTarget == target.fListIndex) {
                UpdateTailCount(v, info.fContStats);
            }
            plots = &info.fvScatterPlots;
        }
        for (std::size_t j = 0; j < plots->size(); ++j) {
            const auto input = static_cast<std::size_t>(fvOutputInputs[j]);
            (*plots)[j].UpdateData(1.0, 1.0, v, inputs[input]);
        }
    }
}

// Tails criterion: it becomes active once the target has 1000 weights and the mean is known to
// within 0.95 % (h = z·√(variance/n) ≤ mean·0.95/100); the tail threshold is then mean + h. A
// value-type tail counts the values beyond the tail value from the start; a percentile-type
// tail, once active, counts the values above mean + h (upper tail) or below mean − h (lower
// tail).
void SECSimulator::UpdateTailCount(double value, const MCContStats& stats) {
    StopState& s = fStopTails;
    double h = 0.0;
    if (!s.fbActive && stats.GetSumFreqWeights() >= kStopMinWeight) {
        const double mean = stats.GetMean();
        h = s.fZ * StandardError(stats);
        if (mean * kTailsCiLevel / 100.0 >= h) {
            s.fbActive = true;
            s.fTailThreshold = mean + h;
            s.fTailHalfWidth = h;
        }
    }
    if (!s.fbPercentile) {
        if (s.fbUpper ? value > s.fThreshold : value < s.fThreshold) {
            ++s.fTailCount;
        }
    } else if (s.fbActive) {
        const double lower = s.fTailThreshold - 2.0 * s.fTailHalfWidth;
        if (s.fbUpper ? value > s.fTailThreshold : value < lower) {
            ++s.fTailCount;
        }
    }
}

bool SECSimulator::ShouldStop() {
    if (fSimCaseCount >= fCaseQuota) {
        return true;
    }
    if (fStopPoint.fKind == StopKind::kPointValue) {
        const MCContStats& stats =
            (*fpContInfo)[static_cast<std::size_t>(fStopPoint.fTarget)].fContStats;
        if (stats.GetSumFreqWeights() >= kStopMinWeight) {
            const double h = fStopPoint.fZ * StandardError(stats);
            // A percentage threshold is a share of the mean's size, whatever its sign.
            const double allowed = fStopPoint.fbPercent
                                       ? std::fabs(stats.GetMean()) * fStopPoint.fThreshold / 100.0
                                       : fStopPoint.fThreshold;
            if (allowed >= h) {
                fbStopped = true;
                return true;
            }
        }
    }
    if (fStopTails.fKind == StopKind::kTails && fStopTails.fbActive &&
        fStopTails.fTailCount >= fStopTails.fRequired) {
        fbStopped = true;
        return true;
    }
    return false;
}

// ---- Host-driven records ----------------------------------------------------------------------

MCStatus SECSimulator::UpdateStatsForRecord(const std::vector<double>& predictors,
                                            const std::vector<double>& targets, int recordIndex) {
    const bool shaped = predictors.size() == fvSimInputs.size() &&
                        targets.size() == static_cast<std::size_t>(fNValuesPerCase) &&
                        !fvTargets.empty();
    MCSP_ASSERT(shaped, "SECSimulator::UpdateStatsForRecord: one value per simulated input and "
                        "per target value");
    if (recordIndex < kPilotCases) {
        ++fStartRecords;
        if (shaped && fStartValid < kPilotValid && AreTargetsAccepted(targets)) {
            UpdateRangeStats(predictors, targets, fvStartInputStats, fvStartTargetStats);
            ++fStartValid;
        }
        if (fStartRecords == kPilotCases) {
            if (fStartValid < kPilotValid) {
                return fStatus = MCStatus(MCSPStatus::kNoValidCase, false);
            }
            FixChartRanges(fvStartInputStats, fvStartTargetStats);
            CreateChartAccumulators();
        }
        return MCStatus();
    }
    if (!shaped || !fbChartsReady) {
        ++fSimCaseCount;
        ++fInvalidCaseCount;
        return MCStatus();
    }
    if (MCMV::IsMissing(targets[static_cast<std::size_t>(fvTargets.front().fValuePos)])) {
        ++fSimCaseCount;
        ++fInvalidCaseCount;
    } else if (!AreTargetsAccepted(targets)) {
        ++fSimCaseCount;
        ++fFilteredCaseCount;
    } else {
        AccumulateValues(predictors, targets, fCase.fCell, fCase.fRejections);
        if (fbAddedResults) {
            AccumulateAddedResults(predictors, targets, false);
        }
    }
    return MCStatus();
}

// ---- Merge and completion ---------------------------------------------------------------------

MCStatus
SECSimulator::MergeStatsFromThreads(const std::vector<std::unique_ptr<SECSimulator>>& workers) {
    SECOutputStats& results = *fpOutputStats;
    std::vector<MCContStats>& covarStats = results.GetCovarStats();
    std::vector<SECContinuousTargetInfo>& cont = results.GetContTargetInfo();
    std::vector<SECCategoricalTargetInfo>& cat = results.GetCateTargetInfo();
    MCStatus status;
    std::vector<std::vector<const MCHistogramData*>> contHists(cont.size());
    std::vector<std::vector<std::vector<const MCScatterPlotData*>>> contPlots(cont.size());
    std::vector<std::vector<std::vector<const MCHistogramData*>>> catHists(cat.size());
    std::vector<std::vector<std::vector<const MCScatterPlotData*>>> catPlots(cat.size());

    for (const auto& worker : workers) {
        SECOutputStats& w = *worker->fpOutputStats;
        const std::vector<MCContStats>& wCovar = w.GetCovarStats();
        const std::vector<SECContinuousTargetInfo>& wCont = w.GetContTargetInfo();
        const std::vector<SECCategoricalTargetInfo>& wCat = w.GetCateTargetInfo();
        if (wCovar.size() != covarStats.size() || wCont.size() != cont.size() ||
            wCat.size() != cat.size() || !fProvMeans.Merge(worker->fProvMeans) ||
            (fbAddedResults && !fFirstOrder.Merge(worker->fFirstOrder))) {
            status = MCStatus(MCSPStatus::kMergeFailed, false);
            continue;
        }
        for (std::size_t k = 0; k < fvCovarMin.size() && k < worker->fvCovarMin.size(); ++k) {
            fvCovarMin[k] = std::min(fvCovarMin[k], worker->fvCovarMin[k]);
            fvCovarMax[k] = std::max(fvCovarMax[k], worker->fvCovarMax[k]);
        }
        for (std::size_t t = 0; t < cont.size(); ++t) {
            SECContinuousTargetInfo& to = cont[t];
            const SECContinuousTargetInfo& from = wCont[t];
            to.fContStats.Pool(from.fContStats);
            to.fQuantiles.Merge(from.fQuantiles);
            const auto pool = [](std::vector<MCContStats>& a, const std::vector<MCContStats>& b) {
                for (std::size_t k = 0; k < a.size() && k < b.size(); ++k) {
                    a[k].Pool(b[k]);
                }
            };
            pool(to.fvPositiveDeltaStats, from.fvPositiveDeltaStats);
            pool(to.fvNegativeDeltaStats, from.fvNegativeDeltaStats);
            pool(to.fvVarianceContribStats, from.fvVarianceContribStats);
            const auto add = [](std::vector<std::int64_t>& a, const std::vector<std::int64_t>& b) {
                for (std::size_t k = 0; k < a.size() && k < b.size(); ++k) {
                    a[k] += b[k];
                }
            };
            add(to.fvDeltaSkipped, from.fvDeltaSkipped);
            add(to.fvVarianceSkipped, from.fvVarianceSkipped);
            contHists[t].push_back(&from.fHistogram);
            contPlots[t].resize(to.fvScatterPlots.size());
            for (std::size_t j = 0; j < to.fvScatterPlots.size() && j < from.fvScatterPlots.size();
                 ++j) {
                contPlots[t][j].push_back(&from.fvScatterPlots[j]);
            }
        }
        for (std::size_t t = 0; t < cat.size(); ++t) {
            SECCategoricalTargetInfo& to = cat[t];
            const SECCategoricalTargetInfo& from = wCat[t];
            to.fCatStats.Pool(from.fCatStats);
            for (std::size_t k = 0; k < to.fvProbStats.size() && k < from.fvProbStats.size(); ++k) {
                to.fvProbStats[k].Pool(from.fvProbStats[k]);
            }
            catHists[t].resize(to.fvProbHistograms.size());
            for (std::size_t k = 0;
                 k < to.fvProbHistograms.size() && k < from.fvProbHistograms.size(); ++k) {
                catHists[t][k].push_back(&from.fvProbHistograms[k]);
            }
            catPlots[t].resize(to.fvScatterPlots.size());
            for (std::size_t j = 0; j < to.fvScatterPlots.size() && j < from.fvScatterPlots.size();
                 ++j) {
                catPlots[t][j].push_back(&from.fvScatterPlots[j]);
            }
        }
        fSimCaseCount += worker->fSimCaseCount;
        fFilteredCaseCount += worker->fFilteredCaseCount;
        fValidCaseCount += worker->fValidCaseCount;
        fInvalidCaseCount += worker->fInvalidCaseCount;
        for (std::size_t c = 0; c < fvCellCounts.size() && c < worker->fvCellCounts.size(); ++c) {
            fvCellCounts[c] += worker->fvCellCounts[c];
        }
        fbStopped = fbStopped || worker->fbStopped;
        fScoreCount += worker->fScoreCount;
    }
    const auto keep = [&status](const MCStatus& s) {
        if (s.IsError()) {
            status = MCStatus(MCSPStatus::kMergeFailed, false);
        }
    };
    for (std::size_t t = 0; t < cont.size(); ++t) {
        keep(cont[t].fHistogram.AddObjects(contHists[t]));
        for (std::size_t j = 0; j < contPlots[t].size(); ++j) {
            keep(cont[t].fvScatterPlots[j].AddObjects(contPlots[t][j]));
        }
    }
    for (std::size_t t = 0; t < cat.size(); ++t) {
        for (std::size_t k = 0; k < catHists[t].size(); ++k) {
            keep(cat[t].fvProbHistograms[k].AddObjects(catHists[t][k]));
        }
        for (std::size_t j = 0; j < catPlots[t].size(); ++j) {
            keep(cat[t].fvScatterPlots[j].AddObjects(catPlots[t][j]));
        }
    }
    return status;
}

MCStatus SECSimulator::CompleteStats() {
    SECOutputStats& results = *fpOutputStats;
    results.SetSimCaseCount(fSimCaseCount);
    results.SetFilteredCaseCount(fFilteredCaseCount);
    results.SetValidCaseCount(fValidCaseCount);
    results.SetInvalidCaseCount(fInvalidCaseCount);
    results.SetProvMeansPtr(&fProvMeans);
    results.SetStopCriteria(fbStopped);
    if (fbHostDriven && fStartRecords < kPilotCases) {
        return fStatus = MCStatus(MCSPStatus::kBadStream, false);
    }
    if (fValidCaseCount < 1) {
        return fStatus = MCStatus(MCSPStatus::kNoValidCase, false);
    }

    const MCMath_800::MCSymMatrix& xprods = fProvMeans.GetXProds();
    const auto nCorrelated = static_cast<int>(fvCorrelated.size());
    std::vector<MCContStats>& covarStats = results.GetCovarStats();
    covarStats.assign(static_cast<std::size_t>(nCorrelated), MCContStats());
    for (int k = 0; k < nCorrelated && k < fProvMeans.GetNVars(); ++k) {
        const auto ku = static_cast<std::size_t>(k);
        covarStats[ku] = MCContStats::FromSummary(fProvMeans.GetSumWeights(), fProvMeans.GetCount(),
                                                  fProvMeans.GetMeans()[ku], xprods.GetElem(k, k),
                                                  fvCovarMin[ku], fvCovarMax[ku]);
    }
    std::vector<SECContinuousTargetInfo>& cont = results.GetContTargetInfo();
    std::vector<SECCategoricalTargetInfo>& cat = results.GetCateTargetInfo();
    for (std::size_t t = 0; t < fvTargets.size(); ++t) {
        const Target& target = fvTargets[t];
        const int column = nCorrelated + static_cast<int>(t);
        std::vector<double>* pearson = nullptr;
        if (target.fbCategorical) {
            SECCategoricalTargetInfo& info = cat[static_cast<std::size_t>(target.fListIndex)];
            info.fvCatCounts = info.fCatStats.GetCatCounts();
            info.fvMeanProbs.clear();
            for (const MCContStats& p : info.fvProbStats) {
                info.fvMeanProbs.push_back(p.GetMean());
            }
            pearson = &info.fvPearsonCorrs;
        } else {
            SECContinuousTargetInfo& info = cont[static_cast<std::size_t>(target.fListIndex)];
            const MCContStats& stats = info.fContStats;
            double minimum = MCMV::Missing();
            double maximum = MCMV::Missing();
            if (stats.GetExtrema(minimum, maximum)) {
                info.fMinimum = minimum;
                info.fMaximum = maximum;
            }
            info.fMean = stats.GetMean();
            const double variance = stats.GetVariance();
            info.fStdDev = MCMV::IsMissing(variance) ? MCMV::Missing() : std::sqrt(variance);
            if (!MCMV::IsMissing(variance) && !MCMV::IsMissing(fCiZ)) {
                const double half = fCiZ * StandardError(stats);
                info.fCiLower = info.fMean - half;
                info.fCiUpper = info.fMean + half;
            }
            pearson = &info.fvPearsonCorrs;
        }
        pearson->assign(static_cast<std::size_t>(nCorrelated), MCMV::Missing());
        for (int k = 0; k < nCorrelated; ++k) {
            (*pearson)[static_cast<std::size_t>(k)] = CrossProductCorrelation(xprods, k, column);
        }
    }
    CompleteSensitivity();
    CompleteAddedResults();

    // Simulated correlations of the covariates, at their places in the plan's correlation
    // variable order when the plan has one.
    const std::vector<std::string>& corrVars = fpPlan->GetCorrVarList();
    std::vector<int> place(static_cast<std::size_t>(nCorrelated));
    int dimension = nCorrelated;
    if (!corrVars.empty()) {
        dimension = static_cast<int>(corrVars.size());
        for (int k = 0; k < nCorrelated; ++k) {
            const std::string& name = fvCorrelated[static_cast<std::size_t>(k)].fGenerator.fName;
            const auto it = std::find(corrVars.begin(), corrVars.end(), name);
            place[static_cast<std::size_t>(k)] =
                it == corrVars.end() ? -1 : static_cast<int>(it - corrVars.begin());
        }
    } else {
        for (int k = 0; k < nCorrelated; ++k) {
            place[static_cast<std::size_t>(k)] = k;
        }
    }
    MCMath_800::MCSymMatrix& simulCorr = results.GetSimulCorr();
    simulCorr.SetNRows(dimension);
    for (int i = 0; i < dimension; ++i) {
        for (int j = 0; j <= i; ++j) {
            simulCorr.SetElem(i, j, MCMV::Missing());
        }
    }
    for (int a = 0; a < nCorrelated; ++a) {
        for (int b = 0; b <= a; ++b) {
            const int pa = place[static_cast<std::size_t>(a)];
            const int pb = place[static_cast<std::size_t>(b)];
            if (pa >= 0 && pb >= 0) {
                simulCorr.SetElem(pa, pb, CrossProductCorrelation(xprods, a, b));
            }
        }
    }

    // The correlation model's pairs with a target, with the correlation their cases show.
    std::vector<SECInputCorrelationPair>& corrPairs = results.GetInputCorrelationPairs();
    corrPairs.clear();
    for (const SECNortaPair& pair : fvNortaPairs) {
        if (pair.fTarget == 0.0 || MCMV::IsMissing(pair.fTarget)) {
            continue;
        }
        SECInputCorrelationPair entry;
        entry.fFirst = fvCorrelated[static_cast<std::size_t>(pair.fRow)].fGenerator.fName;
        entry.fSecond = fvCorrelated[static_cast<std::size_t>(pair.fCol)].fGenerator.fName;
        entry.fTarget = pair.fTarget;
        entry.fNormalCorr = pair.fNormalCorr;
        entry.fAttainableLow = pair.fGLow;
        entry.fAttainableHigh = pair.fGHigh;
        entry.fSimulated = CrossProductCorrelation(xprods, pair.fRow, pair.fCol);
        entry.fbUnreachable = pair.fbUnreachable;
        corrPairs.push_back(std::move(entry));
    }

    std::vector<double>& cellShares = results.GetCrstSimProbs();
    cellShares.clear();
    if (fbHasCrosstab) {
        for (const double count : fvCellCounts) {
            cellShares.push_back(count / static_cast<double>(fValidCaseCount));
        }
    }
    return MCStatus();
}

} // namespace MCMCSP_800
