#include "mcmath/mceigen.h"
#include "mcmath/mcsymmatrix.h"

#include "mctolerance.h"

#include <Eigen/Cholesky>
#include <Eigen/Eigenvalues>

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <vector>

using MCMath_800::MCEigenValues;
using MCMath_800::MCSymMatrix;

namespace {

//! The matrix of dimension n from its lower triangle, row by row.
MCSymMatrix Matrix(int n, const std::vector<double>& lower) {
    MCSymMatrix m(n);
    std::size_t k = 0;
    for (int i = 0; i < n; ++i) {
        for (int j = 0; j <= i; ++j) {
            m.SetElem(i, j, lower[k++]);
        }
    }
    return m;
}

Eigen::MatrixXd Dense(const MCSymMatrix& m) {
    const int n = m.GetNRows();
    Eigen::MatrixXd d(n, n);
    for (int i = 0; i < n; ++i) {
        for (int j = 0; j < n; ++j) {
            d(i, j) = m.GetElem(i, j);
        }
    }
    return d;
}

double MinEigenValue(const MCSymMatrix& m) {
    return Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd>(Dense(m)).eigenvalues().minCoeff();
}

//! The simple repair the projections must beat: clip the eigenvalues at eps, rescale to a
//! unit diagonal.
Eigen::MatrixXd ClipAndRescale(const MCSymMatrix& m, double eps) {
    const Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd> s(Dense(m));
    const Eigen::MatrixXd c = s.eigenvectors() * s.eigenvalues().cwiseMax(eps).asDiagonal() *
                              s.eigenvectors().transpose();
    const Eigen::VectorXd d = c.diagonal().cwiseSqrt().cwiseInverse();
    return d.asDiagonal() * c * d.asDiagonal();
}

TEST(MCEigenValues, KnownSpectra) {
    // [[2, 1], [1, 2]]: 1 and 3. Equicorrelation ρ in 3 dimensions: 1 − ρ twice, 1 + 2ρ.
    // Tridiagonal (−1, 2, −1) of order 4: 2 − 2cos(kπ/5), k = 1..4.
    const MCEigenValues a(Matrix(2, {2, 1, 2}), 1e-12, 30);
    ASSERT_TRUE(a.IsValid());
    EXPECT_NEAR_REL(a.GetEigenValues()[0], 1.0, 1e-14);
    EXPECT_NEAR_REL(a.GetEigenValues()[1], 3.0, 1e-14);

    const MCEigenValues b(Matrix(3, {1, 0.4, 1, 0.4, 0.4, 1}), 1e-12, 30);
    ASSERT_EQ(b.GetEigenValues().size(), 3u);
    EXPECT_NEAR_REL(b.GetEigenValues()[0], 0.6, 1e-14);
    EXPECT_NEAR_REL(b.GetEigenValues()[1], 0.6, 1e-14);
    EXPECT_NEAR_REL(b.GetEigenValues()[2], 1.8, 1e-14);

    const MCEigenValues c(Matrix(4, {2, -1, 2, 0, -1, 2, 0, 0, -1, 2}), 1e-12, 30);
    const double pi = std::acos(-1.0);
    for (int k = 1; k <= 4; ++k) {
        EXPECT_NEAR_TOL(c.GetEigenValues()[static_cast<std::size_t>(k - 1)],
                        2.0 - 2.0 * std::cos(k * pi / 5.0), 1e-14, 1e-15);
    }
}

TEST(MCEigenValues, PositiveDefiniteInputIsReturnedUntouched) {
    const MCSymMatrix q = Matrix(3, {1, 0.5, 1, -0.2, 0.3, 1});
    MCEigenValues eigen(q, 1e-12, 30);
    MCSymMatrix out;
    bool adjusted = true;
    ASSERT_TRUE(eigen.GetPDHMatrix(1e-6, out, adjusted));
    EXPECT_FALSE(adjusted);
    EXPECT_TRUE(out == q);
    EXPECT_EQ(eigen.GetIterations(), 0);
}

TEST(MCEigenValues, HighamsExampleReachesThePublishedNearestCorrelationMatrix) {
    // Higham (2002), section 4: the nearest correlation matrix to [[1, 1, 0], [1, 1, 1],
    // [0, 1, 1]] has off-diagonal entries 0.7607, 0.1573, 0.7607 (four digits published).
    MCEigenValues eigen(Matrix(3, {1, 1, 1, 0, 1, 1}), 1e-12, 200);
    MCSymMatrix out;
    bool adjusted = false;
    ASSERT_TRUE(eigen.GetPDHMatrix(1e-6, out, adjusted));
    EXPECT_TRUE(adjusted);
    EXPECT_NEAR(out.GetElem(1, 0), 0.7607, 5e-5);
    EXPECT_NEAR(out.GetElem(2, 0), 0.1573, 5e-5);
    EXPECT_NEAR(out.GetElem(2, 1), 0.7607, 5e-5);
    EXPECT_LT(eigen.GetIterations(), 200);
}

struct RepairCase {
    const char* fName;
    MCSymMatrix fMatrix;
};

class RepairOfIndefinite : public ::testing::TestWithParam<RepairCase> {};

TEST_P(RepairOfIndefinite, GivesANearbyPositiveDefiniteCorrelationMatrix) {
    const MCSymMatrix& q = GetParam().fMatrix;
    const double eps = 1e-6;
    // The simulation's settings: tolerance 1e-12, at most 30 projections.
    MCEigenValues eigen(q, 1e-12, 30);
    MCSymMatrix out;
    bool adjusted = false;
    ASSERT_TRUE(eigen.GetPDHMatrix(eps, out, adjusted));
    EXPECT_TRUE(adjusted);
    const int n = q.GetNRows();
    ASSERT_EQ(out.GetNRows(), n);
    for (int i = 0; i < n; ++i) {
        EXPECT_EQ(out.GetElem(i, i), 1.0);
        for (int j = 0; j < i; ++j) {
            EXPECT_LE(std::fabs(out.GetElem(i, j)), 1.0);
        }
    }
    EXPECT_GT(MinEigenValue(out), 0.5 * eps);
    EXPECT_EQ(Eigen::LLT<Eigen::MatrixXd>(Dense(out)).info(), Eigen::Success);
    // Near the input: no farther than the plain clip-and-rescale repair, up to the order of
    // eps (rescaling pushes the clipped matrix's eigenvalues a little below eps, so it lies
    // in a slightly larger set than the projections' result).
    const double distance = (Dense(out) - Dense(q)).norm();
    const double clipDistance = (ClipAndRescale(q, eps) - Dense(q)).norm();
    EXPECT_LE(distance, clipDistance + 10.0 * eps) << distance - clipDistance;
    // The repaired matrix is accepted as it is by a second repair.
    MCEigenValues again(out, 1e-12, 30);
    MCSymMatrix twice;
    bool adjustedAgain = true;
    ASSERT_TRUE(again.GetPDHMatrix(0.5 * eps, twice, adjustedAgain));
    EXPECT_FALSE(adjustedAgain);
}

INSTANTIATE_TEST_SUITE_P(
    Matrices, RepairOfIndefinite,
    ::testing::Values(
        // Three variables pairwise estimated with incompatible signs.
        RepairCase{"IncompatibleSigns", Matrix(3, {1, 0.9, 1, 0.9, -0.9, 1})},
        // Slightly indefinite, as the copula estimates usually are.
        RepairCase{"SlightlyIndefinite", Matrix(3, {1, 0.95, 1, 0.7, 0.95, 1})},
        // Semi-definite: two identical variables.
        RepairCase{"SemiDefinite", Matrix(2, {1, 1, 1})},
        // Positive definite but numerically singular: smallest eigenvalue 1e-9 < eps.
        RepairCase{"NearlySingular", Matrix(2, {1, 1.0 - 1e-9, 1})},
        // Six variables with a block of contradicting correlations.
        RepairCase{"SixVariables", Matrix(6, {1,   0.8, 1,    0.8, -0.7, 1,   0.1, 0.2, 0.3, 1, 0.5,
                                              0.5, 0.5, -0.6, 1,   0.9,  0.9, 0.9, 0.1, 0.2, 1})}),
    [](const ::testing::TestParamInfo<RepairCase>& paramInfo) { return paramInfo.param.fName; });

TEST(MCEigenValues, NoRepairForUnusableInput) {
    const double nan = std::numeric_limits<double>::quiet_NaN();
    MCSymMatrix out = Matrix(1, {7.0});
    bool adjusted = true;

    MCEigenValues withNaN(Matrix(2, {1, nan, 1}), 1e-12, 30);
    EXPECT_FALSE(withNaN.IsValid());
    EXPECT_FALSE(withNaN.GetPDHMatrix(1e-6, out, adjusted));

    MCEigenValues empty(MCSymMatrix(), 1e-12, 30);
    EXPECT_FALSE(empty.GetPDHMatrix(1e-6, out, adjusted));

    MCEigenValues fine(Matrix(2, {1, 0.5, 1}), 1e-12, 30);
    EXPECT_FALSE(fine.GetPDHMatrix(0.0, out, adjusted));
    EXPECT_FALSE(fine.GetPDHMatrix(1.0, out, adjusted));
    EXPECT_FALSE(fine.GetPDHMatrix(nan, out, adjusted));

    // Failures leave the caller's values alone.
    EXPECT_EQ(out.GetNRows(), 1);
    EXPECT_EQ(out.GetElem(0, 0), 7.0);
    EXPECT_TRUE(adjusted);
}

} // namespace
