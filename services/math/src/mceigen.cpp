#include "mcmath/mceigen.h"

#include "mcsymmatrixdense.h"

#include <Eigen/Cholesky>
#include <Eigen/Core>
#include <Eigen/Eigenvalues>

#include <cmath>

namespace MCMath_800 {

namespace {

using Dense = Eigen::MatrixXd;
using detail::FromDense;
using detail::ToDense;

//! P_S: the nearest matrix (Frobenius norm) whose eigenvalues are all at least eps,
//! V·max(Λ, eps)·Vᵀ. False when the eigen-solver fails.
bool ProjectEigenFloor(const Dense& a, double eps, Dense& out) {
    const Eigen::SelfAdjointEigenSolver<Dense> solver(a);
    if (solver.info() != Eigen::Success) {
        return false;
    }
    const Eigen::VectorXd lambda = solver.eigenvalues().cwiseMax(eps);
    out = solver.eigenvectors() * lambda.asDiagonal() * solver.eigenvectors().transpose();
    return true;
}

} // namespace

MCEigenValues::MCEigenValues(const MCSymMatrix& matrix, double tolerance, int maxIterations)
    : fMatrix(matrix), fTolerance(tolerance), fMaxIterations(maxIterations) {
    Dense a;
    if (matrix.GetNRows() < 1 || !ToDense(matrix, a)) {
        return;
    }
    const Eigen::SelfAdjointEigenSolver<Dense> solver(a, Eigen::EigenvaluesOnly);
    if (solver.info() != Eigen::Success) {
        return;
    }
    fEigenValues.assign(solver.eigenvalues().data(),
                        solver.eigenvalues().data() + solver.eigenvalues().size());
    fbValid = true;
}

bool MCEigenValues::GetPDHMatrix(double eps, MCSymMatrix& out, bool& adjusted) {
    fIterations = 0;
    if (!fbValid || !(eps > 0.0 && eps < 1.0)) {
        return false;
    }
    if (fEigenValues.front() >= eps) {
        out = fMatrix;
        adjusted = false;
        return true;
    }
    Dense a;
    if (!ToDense(fMatrix, a)) {
        return false;
    }
    // Higham (2002), Algorithm 3.3: alternate P_S and P_U with Dykstra's correction ΔS,
    // which is applied before P_S only (P_U is an affine projection and needs none).
    const Eigen::Index n = a.rows();
    Dense y = a;
    Dense dS = Dense::Zero(n, n);
    Dense x;
    for (int k = 0; k < fMaxIterations; ++k) {
        const Dense r = y - dS;
        if (!ProjectEigenFloor(r, eps, x)) {
            return false;
        }
        dS = x - r;
        const Dense yPrev = y;
        y = x;
        y.diagonal().setOnes();
        fIterations = k + 1;
        if ((y - yPrev).norm() <= fTolerance * y.norm()) {
            break;
        }
    }
    // Final floor: eigenvalues at least eps, then back to a unit diagonal.
    Dense floored;
    if (!ProjectEigenFloor(y, eps, floored)) {
        return false;
    }
    const Eigen::VectorXd invSqrtDiag = floored.diagonal().cwiseSqrt().cwiseInverse();
    Dense result = invSqrtDiag.asDiagonal() * floored * invSqrtDiag.asDiagonal();
    result.diagonal().setOnes();
    if (!result.allFinite() || Eigen::LLT<Dense>(result).info() != Eigen::Success) {
        return false;
    }
    MCSymMatrix repaired;
    FromDense(result, repaired);
    adjusted = !(repaired == fMatrix);
    out = repaired;
    return true;
}

} // namespace MCMath_800
