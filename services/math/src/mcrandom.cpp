#include "mcmath/mcrandom.h"

#include "mcsymmatrixdense.h"

#include "mccommon/mcmv.h"

#include <Eigen/Cholesky>
#include <Eigen/Core>
#include <boost/random/normal_distribution.hpp>

#include <algorithm>
#include <cmath>
#include <random>

namespace MCMath_800 {

using MCCommon_800::MCMV;

namespace {

//! 2^-53 and 2^-52: the spacing of the half-open and the open uniform grids.
constexpr double kTwoPowMinus53 = 1.0 / 9007199254740992.0;
constexpr double kTwoPowMinus52 = 1.0 / 4503599627370496.0;
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

//! True when every entry of `f` above the diagonal is exactly 0.
bool IsLowerTriangular(const DenseMatrix& f) {
    for (Eigen::Index i = 0; i < f.rows(); ++i) {
        for (Eigen::Index j = i + 1; j < f.cols(); ++j) {
            if (f(i, j) != 0.0) {
                return false;
            }
        }
    }
    return true;
}

//! The words of a stream as a Boost.Random engine over the full 64-bit range, so that Boost's
//! distributions draw from the stream (the engine's own words or the host's source alike).
class WordEngine {
public:
    using result_type = std::uint64_t;
    explicit WordEngine(MCURandom& stream) : fStream(stream) {}
    static constexpr result_type min() { return 0; }
    static constexpr result_type max() { return ~result_type{0}; }
    result_type operator()() { return fStream.GetWord(); }

private:
    MCURandom& fStream; //!< the stream, borrowed for one draw
};

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
    fbLowerFactor = false;
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
    fbLowerFactor = IsLowerTriangular(f);
    fMeans = means;
    fScale = scale;
    fbIndependent = false;
    fZ.assign(static_cast<std::size_t>(n), 0.0);
    fN = n;
    return true;
}

// Boost's ziggurat (see the header): stateless, so one distribution object per draw costs
// nothing and a copy of the generator never carries a half-used pair.
double MCRandomValues::NextStdNormal() {
    WordEngine engine(*fpURNG);
    return boost::random::normal_distribution<double>()(engine);
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
    // x_i = m_i + scale·Σ_j F_ij·z_j over j ≤ i for a lower-triangular F, every j otherwise.
    for (std::size_t i = 0; i < n; ++i) {
        const double* row = fFactor.data() + i * n;
        const std::size_t end = fbLowerFactor ? i + 1 : n;
        double s = 0.0;
        for (std::size_t j = 0; j < end; ++j) {
            s += row[j] * fZ[j];
        }
        values[i] = fMeans[i] + fScale * s;
    }
    return true;
}

} // namespace MCMath_800
