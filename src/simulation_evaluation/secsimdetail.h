// Constants and small numeric helpers that the simulator's scoring (secscoring.cpp) and its
// statistics (secaccumulate.cpp) share; not part of the component's interface.
#pragma once

#include "mccommon/mcmv.h"
#include "mcmath/mcaccumulators.h"
#include "mcmath/mcsymmatrix.h"

#include <algorithm>
#include <cmath>

namespace MCMCSP_800 {
namespace detail {

//! Cases a pilot run or the host-driven start-up looks at, and the valid cases it needs.
constexpr int kPilotCases = 2000;
constexpr int kPilotValid = 1000;
//! Weights a target needs before a stop criterion may end the run.
constexpr double kStopMinWeight = 1000.0;
//! The stop criteria's stored confidence level, which a tails criterion keeps.
constexpr double kTailsCiLevel = 0.95;

//! Pearson correlation C(a, b)/√(C(a, a)·C(b, b)); missing unless both diagonals are positive.
inline double CrossProductCorrelation(const MCMath_800::MCSymMatrix& c, int a, int b) {
    if (a >= c.GetNRows() || b >= c.GetNRows()) {
        return MCCommon_800::MCMV::Missing();
    }
    const double caa = c.GetElem(a, a);
    const double cbb = c.GetElem(b, b);
    if (!(caa > 0.0) || !(cbb > 0.0)) {
        return MCCommon_800::MCMV::Missing();
    }
    return std::clamp(c.GetElem(a, b) / std::sqrt(caa * cbb), -1.0, 1.0);
}

//! Standard error of the mean √(variance / n); 0 when it cannot be computed.
inline double StandardError(const MCMath_800::MCContStats& stats) {
    const double n = stats.GetSumFreqWeights();
    const double variance = stats.GetVariance();
    if (!(n > 0.0) || MCCommon_800::MCMV::IsMissing(variance)) {
        return 0.0;
    }
    return std::sqrt(variance / n);
}

} // namespace detail
} // namespace MCMCSP_800
