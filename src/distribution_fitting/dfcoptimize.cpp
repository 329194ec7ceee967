// Maximum-likelihood optimisation of the iteratively fitted candidates.
#include "distribution_fitting/dfcalgorithm.h"

namespace MCMCSP_800 {

MCStatus DFCAlgorithm::OptimizeDistParams(MCCommon_800::MultiPassRecordIter& /*trainData*/) {
    return MCStatus(); // The moment estimates stand until the likelihood fits are added here.
}

} // namespace MCMCSP_800
