// SECCase: one simulated case as a value, the thing that flows through a simulation:
// generation fills its inputs (and their normal scores and contingency cell), scoring its
// values, the sensitivity measures read it, accumulation adds it to the statistics.
#pragma once

#include "mccommon/mcmv.h"

#include <cstddef>
#include <vector>

namespace MCMCSP_800 {

struct SECCase {
    //! One value per simulated input in plan order: a correlated input's drawn value, a
    //! categorical input's category index (for a contingency factor, its code in the cell).
    std::vector<double> fvInputs;
    std::vector<double> fvZ;      //!< normal score of each input of the correlated set
    std::vector<double> fvValues; //!< the values read from its score (targets, probabilities)
    int fCell = -1;               //!< contingency cell; −1 without a table or a draw
    int fRejections = 0;          //!< attempts rejected before it was accepted
    double fWeight = 1.0;         //!< frequency weight (a simulated case counts once)

    //! Every input and normal score missing, no cell, no rejection; the values keep their size.
    void Reset(std::size_t nInputs, std::size_t nCorrelated) {
        fvInputs.assign(nInputs, MCCommon_800::MCMV::Missing());
        fvZ.assign(nCorrelated, MCCommon_800::MCMV::Missing());
        fCell = -1;
        fRejections = 0;
    }
};

} // namespace MCMCSP_800
