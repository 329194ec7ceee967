// The parametric bootstrap of `mcsim fit --bootstrap N`: for every fitted candidate of every
// continuous or count field, N samples of the field's size drawn from the fitted distribution,
// each fitted again by the component exactly as the data were (a one-field run of DFCAlgorithm
// over the sample), give percentile intervals of the parameters and, where the statistic's
// p-value is only bounded by a table or missing, a bootstrap p-value.
//
// Replicate r of candidate (field i, family t) draws from its own stream, seeded from (seed, i,
// t, r): the results do not depend on the number of threads or on their scheduling.
#pragma once

#include "cli/fitjson.h"
#include "distribution_fitting/dfcoutputstats.h"
#include "mcthread/mcthread.h"

#include <cstdint>
#include <functional>
#include <vector>

namespace MCHost {

//! What a bootstrap run needs besides the results.
struct FitBootstrapRequest {
    int fReplicates = 0;              //!< N refits per candidate
    std::uint32_t fSeed = 0;          //!< seed of every stream
    std::int64_t fSampleSize = 0;     //!< values per drawn sample (the rows the fit used)
    int fThreads = 1;                 //!< worker threads
    double fLevel = 0.95;             //!< level of the percentile intervals
    std::function<bool()> fCancelled; //!< true once the user interrupts (may be empty)
};

//! The bootstrap of every parametric candidate of the covariates of `results` that is still a
//! candidate, on `threads`.
std::vector<FitBootstrap> RunFitBootstrap(const MCMCSP_800::DFCOutputStats& results,
                                          const FitBootstrapRequest& request,
                                          MCThread_800::IMCThreadFactory& threads);

//! u in (0, 1) from 53 random bits: (k + 1/2)/2^53, never 0 or 1.
double UnitFromBits(std::uint64_t bits);

//! The percentile interval [q_(1-level)/2, q_(1+level)/2] of `values` (sorted in place) by
//! linear interpolation between order statistics (Hyndman and Fan 1996, definition 7).
void PercentileInterval(std::vector<double>& values, double level, double& lower, double& upper);

} // namespace MCHost
