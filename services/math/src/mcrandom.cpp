#include "mcmath/mcrandom.h"

#include "mcmath/mcdistfun.h"

#include "mcsymmatrixdense.h"

#include "mccommon/mcmv.h"

#include <Eigen/Cholesky>
#include <Eigen/Core>
#include <boost/math/constants/constants.hpp>
#include <boost/math/special_functions/erf.hpp>

#include <algorithm>
#include <cmath>
#include <random>

namespace MCMath_800 {

using MCCommon_800::MCMV;

namespace {

//! 2^-53 and 2^-52: the spacing of the half-open and the open uniform grids.
constexpr double kTwoPowMinus53 = 1.0 / 9007199254740992.0;
constexpr double kTwoPowMinus52 = 1.0 / 4503599627370496.0;
//! The 52 bits of a word that make the magnitude of a normal draw.
constexpr std::uint64_t kLow52 = (std::uint64_t{1} << 52) - 1;
//! A pivot of the semi-definite factorisation may fall this far below 0 (relative to the
//! largest diagonal entry) and still count as a rounding error of a zero pivot.
constexpr double kPivotTol = 1e-12;
//! F·Fᵀ must reproduce the matrix this closely (relative to the largest diagonal entry).
constexpr double kReproduceTol = 1e-10;

using DenseMatrix = Eigen::Matrix<double, Eigen::Dynamic, Eigen::Dynamic, Eigen::RowMajor>;
using detail::ToDense;

//! A factor F with F·Fᵀ = c: the Cholesky factor when c is positive definite, else the
//! pivoted LDLᵀ factor Pᵀ·L·D^(1/2) of a positive semi-definite c. False when c is neither.
bool CovarianceFactor(const DenseMatrix& c, DenseMatrix& f) {
    const Eigen::LLT<DenseMatrix> llt(c);
    if (llt.info() == Eigen::Success) {
        f = llt.matrixL();
        return true;
    }
    // LDLT reports a numerical issue for an exactly zero pivot, which is what a semi-definite
    // matrix has; the pivots and the reconstruction below decide instead.
    const Eigen::LDLT<DenseMatrix> ldlt(c);
    const double scale = std::max(c.diagonal().cwiseAbs().maxCoeff(), 1e-300);
    Eigen::VectorXd d = ldlt.vectorD();
    for (Eigen::Index k = 0; k < d.size(); ++k) {
        if (!(d(k) >= -kPivotTol * scale)) {
            return false;
        }
        d(k) = std::sqrt(std::max(d(k), 0.0));
    }
    const DenseMatrix lower = ldlt.matrixL();
    f = ldlt.transpositionsP().transpose() * (lower * d.asDiagonal());
    return f.allFinite() && (f * f.transpose() - c).cwiseAbs().maxCoeff() <= kReproduceTol * scale;
}

} // namespace

MCURandom::MCURandom(std::uint32_t seed, bool bUseSeed, bool bHalfOpen, IMCRandomSource* source)
    : fSeed(seed), fbHalfOpen(bHalfOpen), fpSource(source) {
    if (!bUseSeed) {
        std::random_device device;
        fSeed = static_cast<std::uint32_t>(device());
    }
    fEngine.seed(fSeed);
}

void MCURandom::SetSeed(std::uint32_t seed) {
    fSeed = seed;
    fEngine.seed(seed);
}

double MCURandom::GetRandom() {
    const std::uint64_t w = GetWord();
    if (fbHalfOpen) {
        return static_cast<double>(w >> 11) * kTwoPowMinus53;
    }
    return (static_cast<double>(w >> 12) + 0.5) * kTwoPowMinus52;
}

bool MCRandomValues::SetParamNormal() {
    return SetParamNormal(1);
}

bool MCRandomValues::SetParamNormal(int n) {
    if (n < 1) {
        fN = 0;
        return false;
    }
    fN = n;
    fbIndependent = true;
    fScale = 1.0;
    fMeans.assign(static_cast<std::size_t>(n), 0.0);
    fFactor.clear();
    fZ.assign(static_cast<std::size_t>(n), 0.0);
    return true;
}

bool MCRandomValues::SetParamNormal(const std::vector<double>& means, double scale,
                                    const MCSymMatrix& correlation) {
    fN = 0;
    const int n = correlation.GetNRows();
    if (n < 1 || means.size() != static_cast<std::size_t>(n) || !(scale > 0.0) ||
        !std::isfinite(scale) ||
        !std::all_of(means.begin(), means.end(), [](double m) { return std::isfinite(m); })) {
        return false;
    }
    DenseMatrix c;
    DenseMatrix f;
    if (!ToDense(correlation, c) || !CovarianceFactor(c, f)) {
        return false;
    }
    fFactor.assign(f.data(), f.data() + f.size());
    fMeans = means;
    fScale = scale;
    fbIndependent = false;
    fZ.assign(static_cast<std::size_t>(n), 0.0);
    fN = n;
    return true;
}

// Inversion of the normal distribution function on a symmetric grid (layout in the header):
// the magnitude comes from 52 bits through Φ⁻¹(u) = −√2·erfc⁻¹(2u) on (0, 1/2), where erfc⁻¹
// is accurate to a few ulp, and the sign from the top bit.
double MCRandomValues::NextStdNormal() {
    const std::uint64_t w = fpURNG->GetWord();
    const double u = (static_cast<double>((w >> 11) & kLow52) + 0.5) * kTwoPowMinus53;
    const double t =
        boost::math::constants::root_two<double>() * boost::math::erfc_inv(2.0 * u, MCMathPolicy());
    return (w >> 63) != 0 ? t : -t;
}

double MCRandomValues::GetRandom() {
    if (fpURNG == nullptr || fN != 1) {
        return MCMV::Missing();
    }
    const double z = NextStdNormal();
    return fbIndependent ? z : fMeans[0] + fScale * fFactor[0] * z;
}

bool MCRandomValues::GetRandom(std::vector<double>& values) {
    if (fpURNG == nullptr || fN < 1) {
        return false;
    }
    const auto n = static_cast<std::size_t>(fN);
    for (std::size_t i = 0; i < n; ++i) {
        fZ[i] = NextStdNormal();
    }
    values.resize(n);
    if (fbIndependent) {
        std::copy(fZ.begin(), fZ.end(), values.begin());
        return true;
    }
    for (std::size_t i = 0; i < n; ++i) {
        const double* row = fFactor.data() + i * n;
        double s = 0.0;
        for (std::size_t j = 0; j < n; ++j) {
            s += row[j] * fZ[j];
        }
        values[i] = fMeans[i] + fScale * s;
    }
    return true;
}

} // namespace MCMath_800
