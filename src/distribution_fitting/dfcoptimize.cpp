// Maximum-likelihood optimisation of the iteratively fitted candidates (DFCAlgorithm::
// OptimizeDistParams): one worker task per (covariate, NegBin/Gamma/Beta) on the host's
// threads. NegBin and Gamma are solved by the root search of their accumulators, Beta by the
// math services' optimiser on its sufficient statistics. The Weibull is fitted later, in the
// goodness-of-fit step.
#include "distribution_fitting/dfcaccumstats.h"
#include "distribution_fitting/dfcalgorithm.h"
#include "distribution_fitting/dfcdatahandler.h"

#include <algorithm>
#include <memory>

namespace MCMCSP_800 {

using MCCommon_800::MultiPassRecordIter;
using namespace MCSPConst;

namespace {

//! Everything one optimisation task uses; it lives until the tasks have been collected.
struct DFCOptimJob {
    std::unique_ptr<DFCAccumStats> fpAccStats;             //!< the likelihood accumulator
    std::unique_ptr<MCWarnings> fpWarnings;                //!< the handler's warnings (Beta)
    std::unique_ptr<DFCDataHandler> fpHandler;             //!< the data handler (Beta)
    std::unique_ptr<MCMath_800::IMCOptimizer> fpOptimizer; //!< the optimiser (Beta)
    std::unique_ptr<DFCOptimThreadTask> fpTask;            //!< the worker task
};

//! The optimiser settings of the step: derivative level 2 (SLSQP on objective and scores,
//! Hessian at the estimate), convergence on the parameters, constraints applied and a start
//! outside its bounds moved inside them. The settings' iteration limit is not passed.
MCMath_800::MCOptimParams MakeOptimParams() {
    MCMath_800::MCOptimParams params;
    params.fDerivativeLevel = 2;
    params.fConvergenceRule = 1;
    params.fConstraintMode = 3;
    return params;
}

// Runs `tasks` on at most `maxThreads` threads of `factory`; with no factory, on the calling
// thread (the result is the same: every task writes only its own element).
void DFCRunTasks(MCThread_800::IMCThreadFactory* factory, int maxThreads,
                 const std::vector<MCThread_800::IMCThreadTask*>& tasks) {
    if (tasks.empty()) {
        return;
    }
    if (!factory) {
        for (MCThread_800::IMCThreadTask* task : tasks) {
            task->RunTask();
        }
        return;
    }
    const int nThreads = std::min(static_cast<int>(tasks.size()), std::max(1, maxThreads));
    std::unique_ptr<MCThread_800::IMCThreadGroup> group = factory->CreateThreadGroup(nThreads);
    group->Run(tasks);
}

} // namespace

MCStatus DFCAlgorithm::OptimizeDistParams(MultiPassRecordIter& /*trainData*/) {
    const MCMath_800::MCOptimParams optimParams = MakeOptimParams();
    const std::vector<int>& covariates = fSettings.GetCovariates();
    std::vector<DFCOptimJob> jobs;
    for (int i = 0; i < fNCovariates; ++i) {
        const auto ui = static_cast<std::size_t>(i);
        const std::vector<int> fitVars{covariates[ui]};
        const std::vector<double> means{fvMeans[ui]};
        const std::vector<double> dispersions{fvVariances[ui]};
        for (const DistType type : {kDistNegbinomial, kDistGamma, kDistBeta}) {
            DFCOutputStats::DFCVarDistElement& element = GetOutCovarDistInfo(i, type);
            if (!element.fbDistAllowed || element.fDistParams.size() < 2) {
                continue;
            }
            std::vector<double>& params = element.fDistParams;
            DFCOptimJob job;
            if (type == kDistNegbinomial) {
                // The NegBin likelihood needs the category counts, which only a discrete
                // covariate has: a continuous covariate holding whole numbers loses it.
                const MCMath_800::MCCatStats* catStats = fvpCatStatsCovars[ui].get();
                if (!catStats) {
                    DropCovarDist(i, type, kDropNoCategoryCounts);
                    continue;
                }
                auto accum = std::make_unique<DFCAccumStatsNegBin>(
                    fSettings, params, fitVars, fValidWeight, means, dispersions);
                accum->SetCatStats(*catStats);
                job.fpAccStats = std::move(accum);
            } else if (type == kDistGamma) {
                auto accum = std::make_unique<DFCAccumStatsGamma>(fSettings, params, fitVars,
                                                                  fValidWeight, means, dispersions);
                accum->SetSumLogXi(fvSumLogX[ui]);
                job.fpAccStats = std::move(accum);
            } else {
                auto accum = std::make_unique<DFCAccumStatsBeta>(fSettings, params, fitVars,
                                                                 fValidWeight, means, dispersions);
                accum->SetSumLogXi(fvSumLogX[ui]);
                accum->SetSumLog1MinusXi(fvSumLog1MinusX[ui]);
                job.fpWarnings = std::make_unique<MCWarnings>();
                job.fpHandler =
                    std::make_unique<DFCDataHandler>(nullptr, &fCancelInfo, job.fpWarnings.get());
                job.fpOptimizer = MCMath_800::MCOptimFactory::OptimFactory(
                    job.fpHandler.get(), accum.get(), params, optimParams);
                job.fpAccStats = std::move(accum);
            }
            job.fpTask = std::make_unique<DFCOptimThreadTask>(i, type, job.fpAccStats.get(),
                                                              job.fpOptimizer.get());
            jobs.push_back(std::move(job));
        }
    }

    std::vector<MCThread_800::IMCThreadTask*> tasks;
    tasks.reserve(jobs.size());
    for (const DFCOptimJob& job : jobs) {
        tasks.push_back(job.fpTask.get());
    }
    DFCRunTasks(fpThreadFactory, fMaxThreadNum, tasks);

    // Collection in creation order, on this thread. A failed root search (NegBin, Gamma)
    // leaves the moment estimates, which are proper parameters of the family, in place.
    for (const DFCOptimJob& job : jobs) {
        const DFCOptimThreadTask& task = *job.fpTask;
        if (task.HasOptimizer()) {
            const MCStatus status = task.GetStatus();
            if (!status.IsOK()) {
                fWarnings.AddWarning(status, 0);
            }
            if (status.IsError()) {
                const int i = task.GetCovariate();
                fvAllowedMask[static_cast<std::size_t>(i)] &=
                    static_cast<std::uint16_t>(~(1u << task.GetDistType()));
                DFCOutputStats::DFCVarDistElement& element =
                    GetOutCovarDistInfo(i, task.GetDistType());
                element.fbDistAllowed = false;
                element.fDropReason = kDropFailedSearch;
            }
        }
        if (job.fpWarnings) {
            fWarnings.AddWarnings(*job.fpWarnings);
        }
    }
    if (fCancelInfo.IsCancel()) {
        return MCStatus(MCSPStatus::kCancelled, false);
    }
    return MCStatus();
}

} // namespace MCMCSP_800
