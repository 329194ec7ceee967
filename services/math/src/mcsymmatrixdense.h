// Conversions between MCSymMatrix and Eigen's dense matrices, for the sources of the math
// services that hand a symmetric matrix to Eigen (not installed with the library).
#pragma once

#include "mcmath/mcsymmatrix.h"

#include <Eigen/Core>

#include <cmath>

namespace MCMath_800 {
namespace detail {

//! The full n x n matrix of `m`; false when an entry is not finite.
template <typename Dense> bool ToDense(const MCSymMatrix& m, Dense& out) {
    const int n = m.GetNRows();
    out.resize(n, n);
    for (int i = 0; i < n; ++i) {
        for (int j = 0; j <= i; ++j) {
            const double v = m.GetElem(i, j);
            if (!std::isfinite(v)) {
                return false;
            }
            out(i, j) = v;
            out(j, i) = v;
        }
    }
    return true;
}

//! `out` becomes the symmetric part (d + dᵀ)/2 of the square matrix d, so that rounding
//! asymmetries of a product do not pick a side.
template <typename Dense> void FromDense(const Dense& d, MCSymMatrix& out) {
    const auto n = static_cast<int>(d.rows());
    out.SetNRows(n);
    for (int i = 0; i < n; ++i) {
        for (int j = 0; j <= i; ++j) {
            out.SetElem(i, j, 0.5 * (d(i, j) + d(j, i)));
        }
    }
}

} // namespace detail
} // namespace MCMath_800
