#include "mcmath/mcmathfun.h"

#include "mcmath/mcdistfun.h"

#include "mccommon/mcmv.h"

#include <boost/math/special_functions/digamma.hpp>
#include <boost/math/special_functions/trigamma.hpp>

#include <algorithm>
#include <cmath>

namespace MCMath_800 {

using MCCommon_800::MCMV;

// Boost's digamma: rational minimax approximations on [1, 2] and the asymptotic series for
// large x, with the reflection ψ(1 − x) − ψ(x) = π·cot(πx) for negative x.
double MCMathFun::Digamma(double x) {
    const double r = boost::math::digamma(x, MCMathPolicy());
    return std::isfinite(r) ? r : MCMV::Missing();
}

// Boost's trigamma: rational approximations for small x, the asymptotic series for large x,
// and the reflection ψ'(1 − x) + ψ'(x) = π²/sin²(πx) for negative x.
double MCMathFun::Trigamma(double x) {
    const double r = boost::math::trigamma(x, MCMathPolicy());
    return std::isfinite(r) ? r : MCMV::Missing();
}

int MCMathFun::BinSearch(const std::vector<double>& table, int lo, int hi, double u,
                         bool bRightClosed) {
    if (std::isnan(u) || lo < 0 || hi <= lo || static_cast<std::size_t>(hi) >= table.size()) {
        return lo;
    }
    const double* first = table.data() + lo + 1;
    const double* last = table.data() + hi + 1;
    const double top = table[static_cast<std::size_t>(hi)];
    const double bottom = table[static_cast<std::size_t>(lo)];
    if (!(top > bottom)) {
        return lo + 1;
    }
    // Clamp u into the table's range. Comparing with <= and >= keeps the ends inside a cell
    // of positive width for both conventions; within the range, upper_bound gives cells
    // [t_i, t_(i+1)) and lower_bound cells (t_i, t_(i+1)]. Every search stops at or before
    // table[hi], which exceeds u, so the result never passes hi.
    const double* pos = nullptr;
    if (u >= top) {
        pos = std::lower_bound(first, last, top);
    } else if (u <= bottom) {
        pos = std::upper_bound(first, last, bottom);
    } else if (bRightClosed) {
        pos = std::lower_bound(first, last, u);
    } else {
        pos = std::upper_bound(first, last, u);
    }
    return static_cast<int>(pos - table.data());
}

} // namespace MCMath_800
