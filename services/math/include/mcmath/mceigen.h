// Eigenvalues of a symmetric matrix and the repair of a correlation matrix that is not
// positive definite.
//
// The simulation fills a matrix of normal correlations pair by pair; the pairs are estimated
// separately, so the whole need not be positive definite, and the normal generator needs a
// matrix that is. The caller decomposes the matrix and asks for its repair:
//     MCEigenValues eigen(q, 1e-12, 30);
//     if (eigen.GetPDHMatrix(1e-6, repaired, adjusted)) ...
//
// Eigenvalues: Eigen's SelfAdjointEigenSolver (Householder tridiagonalisation, then the
// implicit symmetric QR iteration), accurate to a few ulp of the largest eigenvalue.
//
// Repair: Higham's alternating projections with Dykstra's correction (N. J. Higham,
// "Computing the nearest correlation matrix — a problem from finance", IMA J. Numer. Anal.
// 22 (2002) 329–343, Algorithm 3.3 with unit weights), which converges to the correlation
// matrix nearest to the input in the Frobenius norm:
//     Y_0 = A, ΔS_0 = 0; for k = 1, 2, ...:
//         R_k = Y_(k−1) − ΔS_(k−1);  X_k = P_S(R_k);  ΔS_k = X_k − R_k;  Y_k = P_U(X_k)
// where P_U sets the diagonal to 1 and P_S projects onto the matrices whose eigenvalues are
// all at least eps (V·max(Λ, eps)·Vᵀ), so the limit is positive definite, not merely
// semi-definite. The iteration stops when ‖Y_k − Y_(k−1)‖_F ≤ tolerance·‖Y_k‖_F, or after
// maxIterations steps (the constructor's arguments; 0 steps leaves plain eigenvalue clipping
// and rescaling). Then a final floor makes the result
// positive definite whether or not the iteration converged: the eigenvalues of Y below eps are
// raised to eps, and the matrix is rescaled to a unit diagonal, D^(−1/2)·Y·D^(−1/2). The
// result is accepted when Eigen's Cholesky factorisation succeeds on it.
#pragma once

#include "mcmath/mcsymmatrix.h"

#include <vector>

namespace MCMath_800 {

//! The eigenvalues of a symmetric matrix, kept with a copy of the matrix for its repair.
class MCEigenValues {
public:
    //! Decomposes `matrix`. `tolerance` (relative change of an iterate) and `maxIterations`
    //! govern the iteration of GetPDHMatrix. The decomposition fails (IsValid false) for an
    //! empty matrix or one with an entry that is not finite.
    MCEigenValues(const MCSymMatrix& matrix, double tolerance, int maxIterations);

    //! The eigenvalues in ascending order; empty when the decomposition failed.
    const std::vector<double>& GetEigenValues() const { return fEigenValues; }
    //! The nearest positive-definite correlation matrix (method above) into `out`. When
    //! every eigenvalue of the input is at least eps, `out` is the input itself and
    //! `adjusted` false (this includes a positive-definite input with a diagonal other than
    //! 1, which is left as it is); otherwise `out` is the repaired matrix with unit diagonal
    //! and smallest eigenvalue about eps, and `adjusted` is true exactly when it differs from
    //! the input. An input that is positive definite but has an eigenvalue in (0, eps) is
    //! numerically singular and is repaired. False (out and adjusted untouched) when the
    //! decomposition failed, eps is not in (0, 1), or no positive-definite matrix came out.
    bool GetPDHMatrix(double eps, MCSymMatrix& out, bool& adjusted);
    //! The number of projection steps of the last repair (0 when none was needed).
    int GetIterations() const { return fIterations; }

    //! True when the decomposition succeeded.
    bool IsValid() const { return fbValid; }

private:
    MCSymMatrix fMatrix;              //!< copy of the input
    double fTolerance;                //!< stop of the projections: relative change
    int fMaxIterations;               //!< limit of the projections
    bool fbValid = false;             //!< the eigenvalues were computed
    std::vector<double> fEigenValues; //!< ascending eigenvalues of the input
    int fIterations = 0;              //!< projection steps of the last repair
};

} // namespace MCMath_800
