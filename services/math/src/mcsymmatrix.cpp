#include "mcmath/mcsymmatrix.h"

#include <algorithm>

namespace MCMath_800 {

void MCSymMatrix::SetNRows(int n) {
    fN = std::max(0, n);
    const auto un = static_cast<std::size_t>(fN);
    fData.assign(un * (un + 1) / 2, 0.0);
}

bool MCSymMatrix::GetRow(int i, std::vector<double>& row) const {
    if (i < 0 || i >= fN) {
        return false;
    }
    row.resize(static_cast<std::size_t>(fN));
    for (int j = 0; j < fN; ++j) {
        row[static_cast<std::size_t>(j)] = GetElem(i, j);
    }
    return true;
}

void MCSymMatrix::Reset() { std::fill(fData.begin(), fData.end(), 0.0); }

void MCSymMatrix::SetIdentity(int n) {
    SetNRows(n);
    for (int i = 0; i < fN; ++i) {
        SetElem(i, i, 1.0);
    }
}

void MCSymMatrix::Scale(double factor) {
    for (double& v : fData) {
        v *= factor;
    }
}

bool MCSymMatrix::Multiply(const std::vector<double>& x, std::vector<double>& y) const {
    if (x.size() != static_cast<std::size_t>(fN)) {
        return false;
    }
    y.assign(x.size(), 0.0);
    for (int i = 0; i < fN; ++i) {
        double s = 0.0;
        for (int j = 0; j < fN; ++j) {
            s += GetElem(i, j) * x[static_cast<std::size_t>(j)];
        }
        y[static_cast<std::size_t>(i)] = s;
    }
    return true;
}

} // namespace MCMath_800
