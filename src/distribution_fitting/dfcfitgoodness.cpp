// Goodness of fit of every candidate and the choice of the best fit.
#include "distribution_fitting/dfcalgorithm.h"

namespace MCMCSP_800 {

MCStatus DFCAlgorithm::ComputeChiSquare() {
    return MCStatus(); // No chi-square test is computed yet.
}

MCStatus DFCAlgorithm::PerformFitGoodness(MCCommon_800::MultiPassRecordIter& /*trainData*/) {
    return MCStatus(); // No EDF test is computed yet.
}

} // namespace MCMCSP_800
