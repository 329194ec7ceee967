#include "simulation_evaluation/secnorta.h"

#include "component/mcspcomponent.h"
#include "mccommon/mcmv.h"
#include "mcmath/mcaccumulators.h"
#include "mcmath/mceigen.h"

#include <algorithm>
#include <cmath>
#include <vector>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;

namespace {

//! Tolerance and iteration limit of the eigen-decomposition behind the repair, and the
//! smallest eigenvalue the repaired matrix keeps.
constexpr double kEigenTolerance = 1e-12;
constexpr int kEigenIterations = 30;
constexpr double kRepairEpsilon = 1e-6;

} // namespace

namespace {

//! The common random numbers of one pair (see the header): the independent standard normals
//! (z0_k, z1_k) of its draws and the first input's transformed values T0(z0_k), which do not
//! depend on r. The pair (z0, r·z0 + √(1 − r²)·z1) is the product of the 2 x 2 Cholesky
//! factor with (z0, z1), so each estimate of g only transforms the second coordinate again.
struct PairSample {
    std::vector<double> fZ0;
    std::vector<double> fZ1;
    std::vector<double> fY0;
};

//! Draws the sample from `stream` restarted at `seed`; false when a transformed value is
//! missing (g is then missing for every r).
bool DrawPairSample(const SECInputGenerator& first, int nPairs, MCMath_800::MCURandom& stream,
                    std::uint32_t seed, PairSample& sample) {
    MCMath_800::MCRandomValues normal;
    normal.SetURNGPtr(&stream);
    if (nPairs < 2 || !normal.SetParamNormal(2)) {
        return false;
    }
    stream.SetSeed(seed);
    const auto n = static_cast<std::size_t>(nPairs);
    sample.fZ0.resize(n);
    sample.fZ1.resize(n);
    sample.fY0.resize(n);
    std::vector<double> z(2);
    for (std::size_t k = 0; k < n; ++k) {
        if (!normal.GetRandom(z)) {
            return false;
        }
        sample.fZ0[k] = z[0];
        sample.fZ1[k] = z[1];
        sample.fY0[k] = SECTransform(first, z[0]);
        if (MCMV::IsMissing(sample.fY0[k])) {
            return false;
        }
    }
    return true;
}

//! g(r) over a drawn sample.
double SampleCorrelation(const PairSample& sample, const SECInputGenerator& second, double r) {
    if (!(r >= -1.0 && r <= 1.0)) {
        return MCMV::Missing();
    }
    const double c = std::sqrt(1.0 - r * r);
    MCMath_800::MCProvMeans accumulator(2, true);
    double transformed[2];
    for (std::size_t k = 0; k < sample.fZ0.size(); ++k) {
        transformed[0] = sample.fY0[k];
        transformed[1] = SECTransform(second, r * sample.fZ0[k] + c * sample.fZ1[k]);
        if (MCMV::IsMissing(transformed[1]) || !accumulator.Update(transformed, 2, 1.0)) {
            return MCMV::Missing();
        }
    }
    const MCMath_800::MCSymMatrix& xprods = accumulator.GetXProds();
    const double v0 = xprods.GetElem(0, 0);
    const double v1 = xprods.GetElem(1, 1);
    if (!(v0 > 0.0) || !(v1 > 0.0)) {
        return MCMV::Missing();
    }
    return xprods.GetElem(0, 1) / std::sqrt(v1 * v0);
}

} // namespace

double SECNortaPairCorrelation(const SECInputGenerator& first, const SECInputGenerator& second,
                               double r, int nPairs, MCMath_800::MCURandom& stream,
                               std::uint32_t seed) {
    if (!(r >= -1.0 && r <= 1.0)) {
        return MCMV::Missing();
    }
    PairSample sample;
    if (!DrawPairSample(first, nPairs, stream, seed, sample)) {
        return MCMV::Missing();
    }
    return SampleCorrelation(sample, second, r);
}

SECNortaSearchResult SECNortaSearch(double rho, const std::function<double(double)>& g,
                                    MCMath_800::MCCancelInfo* cancel) {
    SECNortaSearchResult result;
    result.fNormalCorr = MCMV::Missing();
    const auto evaluate = [&](double r, double& value) {
        if (cancel != nullptr && cancel->WillCancel()) {
            result.fbCancelled = true;
            return false;
        }
        ++result.fEvaluations;
        value = g(r);
        return !MCMV::IsMissing(value);
    };
    if (MCMV::IsMissing(rho)) {
        return result;
    }
    double gLow = 0.0;
    double gHigh = 0.0;
    if (!evaluate(-1.0, gLow) || !evaluate(1.0, gHigh)) {
        return result;
    }
    // A target beyond what any normal correlation reaches: the nearest end of the normal
    // scale. (g(±1) are correlations of the transformed values, not normal correlations.)
    if (rho <= gLow) {
        result.fNormalCorr = -1.0;
        return result;
    }
    if (rho >= gHigh) {
        result.fNormalCorr = 1.0;
        return result;
    }
    double lo = -1.0;
    double hi = 1.0;
    for (;;) {
        const double r = 0.5 * (lo + hi);
        double gr = 0.0;
        if (!evaluate(r, gr)) {
            return result;
        }
        if (std::fabs(gr - rho) < SECGenerationConst::kNortaTolerance ||
            hi - lo < SECGenerationConst::kNortaTolerance) {
            result.fNormalCorr = r;
            return result;
        }
        if (rho > gr) {
            lo = r;
        } else {
            hi = r;
        }
    }
}

SECNortaSearchResult SECNortaNormalCorrelation(const SECInputGenerator& first,
                                               const SECInputGenerator& second, double rho,
                                               MCMath_800::MCURandom& stream, std::uint32_t seed,
                                               MCMath_800::MCCancelInfo* cancel) {
    SECNortaSearchResult result;
    if (rho == 0.0) {
        result.fNormalCorr = 0.0;
        return result;
    }
    if (first.fDistType == MCSPConst::kDistNormal && second.fDistType == MCSPConst::kDistNormal) {
        result.fNormalCorr = rho;
        return result;
    }
    // The sample is drawn once for the whole search (common random numbers).
    PairSample sample;
    const bool drawn =
        DrawPairSample(first, SECGenerationConst::kNortaSampleSize, stream, seed, sample);
    return SECNortaSearch(
        rho,
        [&](double r) { return drawn ? SampleCorrelation(sample, second, r) : MCMV::Missing(); },
        cancel);
}

std::vector<int> SECSplitPairs(int nPairs, int nSlices) {
    nPairs = std::max(nPairs, 0);
    nSlices = std::min(std::max(nSlices, 1), std::max(nPairs, 1));
    std::vector<int> bounds(1, 0);
    if (nPairs == 0) {
        return bounds;
    }
    const int base = nPairs / nSlices;
    const int larger = nPairs % nSlices;
    for (int s = 0; s < nSlices; ++s) {
        bounds.push_back(bounds.back() + base + (s < larger ? 1 : 0));
    }
    return bounds;
}

MCStatus SECCombineNormalCorrelations(int n, const std::vector<SECNortaPair>& pairs,
                                      MCMath_800::MCSymMatrix& normalCorr) {
    const MCStatus failed(MCSPStatus::kMergeFailed, false);
    normalCorr.SetNRows(0);
    if (n < 1) {
        return failed;
    }
    MCMath_800::MCSymMatrix q;
    q.SetIdentity(n);
    for (const SECNortaPair& pair : pairs) {
        if (pair.fRow < 0 || pair.fRow >= n || pair.fCol < 0 || pair.fCol >= n ||
            pair.fRow == pair.fCol) {
            return failed;
        }
        double value = pair.fNormalCorr;
        if (!pair.fbComputed || MCMV::IsMissing(value)) {
            value = std::clamp(pair.fTarget, -1.0, 1.0);
        }
        q.SetElem(pair.fRow, pair.fCol, value);
    }
    MCMath_800::MCEigenValues eigen(q, kEigenTolerance, kEigenIterations);
    MCMath_800::MCSymMatrix repaired;
    bool adjusted = false;
    if (!eigen.GetPDHMatrix(kRepairEpsilon, repaired, adjusted) || repaired.GetNRows() != n) {
        return failed;
    }
    normalCorr = repaired;
    return adjusted ? MCStatus(MCSPStatus::kCorrelationAdjusted, true) : MCStatus();
}

} // namespace MCMCSP_800
