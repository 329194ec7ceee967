// Generation kernels of the simulation: how one input's distribution is prepared from the plan,
// and how a standard normal draw z (or a uniform u) becomes that input's value.
//
// SECSimulator builds one SECInputGenerator per simulated input of the correlated set (every
// type but Categorical) and one SECCategoricalInput per categorical input, then, per case,
// maps each component of the correlated normal vector through SECTransform (the NORTA step,
// "normal to anything": x = F⁻¹(Φ(z)), Cario & Nelson 1997) and draws the categorical values
// from cumulative tables. These are free functions over plain vectors so that each piece can
// be tested on its own; nothing here allocates per draw.
//
// Speed. The continuous types whose transform needs Φ and a quantile (Uniform, Triangular,
// Weibull, Gamma, Beta, Exponential) get a table of x = F⁻¹(Φ(z)) in z when they are prepared
// (MCNormalScoreTable: quintic Hermite pieces, each checked against the exact transform to
// 1e-12 relative, or to 1e-12 of the standard deviation for the linear scales of the Uniform and
// the Triangular). A draw inside the table costs a polynomial and at most one exp instead of
// an erfc and a quantile; beyond |z| = 8 and in any interval the check left out the transform
// is computed exactly. Normal and LogNormal are closed forms in z and need no table; the
// count types are inverted exactly through a prepared table of their distribution function
// (any mean; no normal approximation), Empirical and UserRanges by their exact cell search.
//
// Stored parameter vectors, by type (MCSPConst::DistType), in the order of the type's
// parameter names:
//   0 Binomial n, p                  1 NegBin r, p, t (t = 1: trials, values shifted by r)
//   3 LogNormal a, b (x = a·e^(b·z))  4 Normal mean, sd          5 Poisson λ
//   6 Triangular min a, max b, mode c 7 Uniform a, b              8 Weibull a (scale), b, c
//   9 Gamma shape k, rate β          10 Beta α, β                11 Exponential rate θ
//  12 Bernoulli p                    13 Empirical min, max, sd, f, p0 … pK−1 (f = 1 continuous)
//  14 UserRanges lo0 … loK−1, hi0 … hiK−1, p0 … pK−1
// The Gamma's second plan parameter is named "scale" but acts as a rate everywhere in the
// component (density β^k·x^(k−1)·e^(−βx)/Γ(k)), and so does the Exponential's.
#pragma once

#include "mcmath/mcquantile.h"
#include "simulation_common/mcspconst.h"
#include "simulation_common/mcspdistfamily.h"
#include "simulation_common/simulatespecs.h"

#include <string>
#include <variant>
#include <vector>

namespace MCMCSP_800 {

//! Constants of the generation model.
struct SECGenerationConst {
    //! Attempts per case before truncation by rejection gives up (code 390014).
    static constexpr int kMaxAttempts = 1000;
    //! Longest table of a count distribution function prepared per input (8 bytes an entry).
    static constexpr int kMaxCountTable = 1 << 16;
    //! The count table runs from the quantile of this probability to the complementary one:
    //! a draw beyond it (about 2 in 10^12) is inverted by the family's quantile.
    static constexpr double kCountTailMass = 1e-12;
};

//! One input of the correlated set, prepared for drawing: everything SECTransform needs.
//! Built once per input and copied into every worker; read-only while cases are drawn.
struct SECInputGenerator {
    std::string fName;                                       //!< input (variable) name
    MCSPConst::DistType fDistType = MCSPConst::kDistUnknown; //!< distribution type
    std::vector<double> fvParams;                            //!< stored parameter vector
    double fMean = 0.0;                                      //!< m: the input's mean
    double fStdDev = 0.0; //!< s: the input's standard deviation (tornado delta)
    double fLower = 0.0;  //!< lower end of the natural range; missing when unbounded
    double fUpper = 0.0;  //!< upper end of the natural range; missing when unbounded
    //! Cumulative table 0, p0, p0 + p1, …, 1.0 of the types that have one; empty otherwise.
    std::vector<double> fvCumTable;
    //! Binomial, NegBin and Poisson: F(k) for k = fCountBase, fCountBase + 1, … (see
    //! kCountTailMass), the prepared exact inverse; empty when it could not be built.
    std::vector<double> fvCountTable;
    double fCountBase = 0.0;  //!< the first whole number of fvCountTable
    double fCountBelow = 0.0; //!< F(fCountBase − 1), the mass below the table
    //! The family's row in the distribution-family table; null for Empirical and UserRanges.
    const MCSPDistFamily* fpFamily = nullptr;
    //! Empirical: values spread over each bin (continuous level) rather than the bin index.
    bool fbContinuousEmpirical = false;
    //! The type carries the tornado delta and the contribution-to-variance flag.
    bool fbHasSensitivity = false;
    //! Parameters usable; an unusable input draws missing values (every case is rejected).
    bool fbValid = false;
    //! Prepared quantile of a Gamma or Beta input.
    std::variant<std::monostate, MCMath_800::MCGammaQuantile, MCMath_800::MCBetaQuantile> fQuantile;
    //! The transform tabulated in z (see the note above); empty for the other types and for
    //! an unusable input.
    MCMath_800::MCNormalScoreTable fScoreTable;
};

//! One categorical simulated input: its categories and their cumulative table.
struct SECCategoricalInput {
    std::string fName;                       //!< input (variable) name
    std::vector<std::string> fvCategoryText; //!< category labels as in the plan
    //! Category values: the label read as a number, missing for a string variable.
    std::vector<double> fvCategoryValues;
    std::vector<double> fvCumTable; //!< 0, p0, p0 + p1, …, 1.0; empty when unusable
    bool fbString = false;          //!< the variable holds texts
    int fCrosstabColumn = -1;       //!< column in the contingency table, −1 when none
};

// ---- Preparing one input ------------------------------------------------------------------

//! The stored parameter vector of `dist` (layout above). `continuousLevel` is the Empirical's
//! f. False, with `params` cleared, when the distribution's parameters do not have the count,
//! the names or the list lengths its type needs (Categorical is handled elsewhere).
bool SECBuildStoredParams(const DistInfoElem& dist, bool continuousLevel,
                          std::vector<double>& params);

//! Prepares `gen` from its type and stored vector: m, s, natural range, cumulative table,
//! prepared quantile, table in z. Returns gen.fbValid: false when a parameter lies outside its
//! domain (then every draw is missing). The name is left as it is.
bool SECPrepareGenerator(MCSPConst::DistType type, const std::vector<double>& params,
                         SECInputGenerator& gen);

//! The cumulative table 0, p0/T, (p0 + p1)/T, …, 1.0 of `probs` with T their total. False,
//! with `table` cleared, when there are no probabilities, one is negative or not finite, or
//! T is not positive: such a table would give a cell a share other than its probability.
bool SECBuildCumulativeTable(const std::vector<double>& probs, std::vector<double>& table);

// ---- Drawing ------------------------------------------------------------------------------

//! The value of `gen` for the standard normal draw z: x = F⁻¹(Φ(z)) by the input's
//! transform, from the table in z where it has a value, else exactly. Missing when z is
//! missing, the generator is unusable, or the value overflows.
double SECTransform(const SECInputGenerator& gen, double z);
//! The same computed exactly, never from the table: the reference the table is built from
//! and checked against.
double SECTransformExact(const SECInputGenerator& gen, double z);

//! The support of a discrete input (Binomial, NegBin, Poisson, Bernoulli, Empirical of a
//! discrete level) as ascending values x_0 < x_1 < … and their distribution function
//! cdf[k] = P(X ≤ x_k), the last entry 1.0. Points whose probability underflows to 0 at the
//! ends are left out. False, with both vectors cleared, for a continuous or unusable input, or
//! when more than `maxPoints` points carry probability (a wide count such as Poisson(10^6):
//! the caller then treats the input as continuous).
bool SECDiscreteSupport(const SECInputGenerator& gen, std::size_t maxPoints,
                        std::vector<double>& values, std::vector<double>& cdf);

//! The cell of a cumulative table that holds u ∈ [0, 1): MCMathFun::BinSearch − 1. −1 for an
//! empty table.
int SECDrawCell(const std::vector<double>& table, double u);

} // namespace MCMCSP_800
