#include "simulation_evaluation/secfirstorder.h"

#include "mccommon/mcmv.h"

#include <algorithm>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;

void SECFirstOrderIndices::Reset(const std::vector<int>& bins, const std::vector<double>& centres) {
    fvCentres = centres;
    fvOffsets.clear();
    fvNBins.clear();
    std::size_t cells = 0;
    for (const int b : bins) {
        fvOffsets.push_back(cells);
        fvNBins.push_back(static_cast<std::size_t>(std::max(b, 0)));
        cells += fvNBins.back();
    }
    fvCounts.assign(cells, 0.0);
    fvSums.assign(cells * centres.size(), 0.0);
}

bool SECFirstOrderIndices::Merge(const SECFirstOrderIndices& other) {
    if (other.fvNBins != fvNBins || other.fvCentres != fvCentres) {
        return false;
    }
    for (std::size_t i = 0; i < fvCounts.size(); ++i) {
        fvCounts[i] += other.fvCounts[i];
    }
    for (std::size_t i = 0; i < fvSums.size(); ++i) {
        fvSums[i] += other.fvSums[i];
    }
    return true;
}

double SECFirstOrderIndices::Index(std::size_t input, std::size_t target, double sst) const {
    if (input >= fvOffsets.size() || target >= fvCentres.size() || !(sst > 0.0)) {
        return MCMV::Missing();
    }
    const std::size_t nTargets = fvCentres.size();
    const std::size_t first = fvOffsets[input];
    double n = 0.0;
    double total = 0.0;
    double bins = 0.0;
    for (std::size_t b = 0; b < fvNBins[input]; ++b) {
        const double count = fvCounts[first + b];
        if (count > 0.0) {
            n += count;
            total += fvSums[(first + b) * nTargets + target];
            bins += 1.0;
        }
    }
    if (bins < 2.0 || n <= bins) {
        return MCMV::Missing();
    }
    // SSB from the bin means' deviations from the overall mean (both relative to the centre).
    const double mean = total / n;
    double ssb = 0.0;
    for (std::size_t b = 0; b < fvNBins[input]; ++b) {
        const double count = fvCounts[first + b];
        if (count > 0.0) {
            const double d = fvSums[(first + b) * nTargets + target] / count - mean;
            ssb += count * d * d;
        }
    }
    ssb = std::min(ssb, sst);
    const double msw = (sst - ssb) / (n - bins);
    const double s1 = (ssb - (bins - 1.0) * msw) / sst;
    return std::min(1.0, std::max(0.0, s1));
}

} // namespace MCMCSP_800
