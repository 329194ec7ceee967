// Bad data through the fitting driver: each row of the table is a small dataset with one
// kind of trouble (NaN, infinities, values near the ends of the double range, a field with no
// value at all, one row, a constant field, a category seen once, weights that are zero,
// negative or huge) and the outcome it must have: a build that succeeds, or the stated error
// code. A build that succeeds must leave results in which every number either is finite or is
// the missing value (never an infinity), probabilities and correlations within their ranges,
// best fits with finite parameters, and a plan completed from them that is written without a
// NaN or an infinity and reads back.
#include "distribution_fitting/dfcalgorithm.h"
#include "mccommon/mcmv.h"
#include "mcthread/mcthread.h"
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/spcsettings.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <memory>
#include <string>
#include <vector>

namespace {

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCXML_800::IMCVariable;

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();
constexpr double kInf = std::numeric_limits<double>::infinity();
constexpr double kMax = std::numeric_limits<double>::max();
constexpr double kDenorm = std::numeric_limits<double>::denorm_min();

//! The role of a column in a fitting run.
enum class Role { kContinuous, kOrdinal, kFactor, kWeight };

struct Column {
    std::string fName;
    Role fRole;
    std::vector<double> fValues;
};

//! One dataset and the outcome of fitting it: 0 for a build that must succeed, else the
//! error code it must end with.
struct BadData {
    const char* name;
    std::vector<Column> columns;
    long expectedError = 0;
    //! Valid records a successful build must count (-1: not checked).
    std::int64_t expectedValid = -1;
};

// ---- Columns ---------------------------------------------------------------------------------

//! n values of a skewed, positive continuous field: a fixed low-discrepancy sequence pushed
//! through an exponential so every continuous family has something to fit.
std::vector<double> Spread(int n, double scale = 1.0, double offset = 1.0) {
    std::vector<double> v;
    for (int i = 0; i < n; ++i) {
        const double u = std::fmod(0.5 + 0.6180339887498949 * i, 1.0);
        v.push_back(offset + scale * -std::log1p(-0.98 * u));
    }
    return v;
}

//! n whole counts 0..4, every value seen several times.
std::vector<double> Counts(int n) {
    std::vector<double> v;
    for (int i = 0; i < n; ++i) {
        v.push_back(static_cast<double>((i * 7) % 5));
    }
    return v;
}

//! n category codes 0..2.
std::vector<double> Codes(int n) {
    std::vector<double> v;
    for (int i = 0; i < n; ++i) {
        v.push_back(static_cast<double>(i % 3));
    }
    return v;
}

std::vector<double> Repeat(int n, double x) {
    return std::vector<double>(static_cast<std::size_t>(n), x);
}

//! `values` with value `x` at the positions `at`.
std::vector<double> With(std::vector<double> values, std::initializer_list<int> at, double x) {
    for (int i : at) {
        values[static_cast<std::size_t>(i)] = x;
    }
    return values;
}

Column Cont(const char* name, std::vector<double> v) {
    return Column{name, Role::kContinuous, std::move(v)};
}
Column Ord(const char* name, std::vector<double> v) {
    return Column{name, Role::kOrdinal, std::move(v)};
}
Column Fac(const char* name, std::vector<double> v) {
    return Column{name, Role::kFactor, std::move(v)};
}
Column Wt(std::vector<double> v) {
    return Column{"w", Role::kWeight, std::move(v)};
}

//! Three ordinary columns of n rows beside the column under test.
std::vector<Column> Ordinary(int n, Column tested) {
    std::vector<Column> columns = {Cont("x", Spread(n)), Ord("k", Counts(n)), Fac("g", Codes(n))};
    for (Column& c : columns) {
        if (c.fName == tested.fName) {
            c = std::move(tested);
            return columns;
        }
    }
    columns.push_back(std::move(tested));
    return columns;
}

// ---- One fitting run with everything the host keeps alive -------------------------------------

const std::vector<DistType> kContinuous = {kDistLognormal, kDistNormal,     kDistTriangular,
                                           kDistUniform,   kDistWeibull,    kDistGamma,
                                           kDistBeta,      kDistExponential};
const std::vector<DistType> kOrdinal = {kDistBinomial, kDistNegbinomial, kDistPoisson};

//! The categories of a column as the host's dictionary describes them: the distinct finite
//! values in ascending order (ordinal), or texts "c0", "c1", ... for codes (factor).
std::vector<double> DistinctValues(const std::vector<double>& values) {
    std::vector<double> out;
    for (double x : values) {
        if (std::isfinite(x) && std::find(out.begin(), out.end(), x) == out.end()) {
            out.push_back(x);
        }
    }
    std::sort(out.begin(), out.end());
    return out;
}

class BadDataRun {
public:
    explicit BadDataRun(const std::vector<Column>& columns, GoodFitType test = kAndersonDarling) {
        std::size_t n = 0;
        for (std::size_t c = 0; c < columns.size(); ++c) {
            const Column& col = columns[c];
            const int index = static_cast<int>(c);
            n = col.fValues.size();
            switch (col.fRole) {
            case Role::kContinuous:
            case Role::kWeight:
                fVars.Add(std::make_unique<MCXML_800::MCScaleVar>(col.fName));
                break;
            case Role::kOrdinal:
                fVars.Add(std::make_unique<MCXML_800::MCCatVar>(
                    col.fName, MCXML_800::MCCatNumEncoder(DistinctValues(col.fValues)), true,
                    IMCVariable::kOrderedKind));
                break;
            case Role::kFactor: {
                std::vector<std::string> texts;
                for (int k = 0; k < 3; ++k) {
                    texts.push_back("c" + std::to_string(k));
                }
                fVars.Add(std::make_unique<MCXML_800::MCCatVar>(col.fName,
                                                                MCXML_800::MCCatNumEncoder(texts),
                                                                false, IMCVariable::kNominalKind));
                break;
            }
            }
            switch (col.fRole) {
            case Role::kContinuous:
                EXPECT_GE(fSettings.AddCovariate(index, kContinuous, kLevelContinuous, false), 0);
                break;
            case Role::kOrdinal:
                EXPECT_GE(fSettings.AddCovariate(index, kOrdinal, kLevelOrdinal, false), 0);
                break;
            case Role::kFactor:
                EXPECT_GE(
                    fSettings.AddFactor(index, 3, {kDistCategorical}, kLevelCategorical, false), 0);
                break;
            case Role::kWeight:
                EXPECT_TRUE(fSettings.SetFrequencyWeightVar(index));
                break;
            }
        }
        for (std::size_t r = 0; r < n; ++r) {
            std::vector<double> row;
            for (const Column& col : columns) {
                row.push_back(col.fValues[r]);
            }
            fData.Add(MCXML_800::Record(row));
        }
        fSettings.SetGFType(test);
        fSettings.SetInteractiveMode(true); // both EDF statistics
        fSettings.SetUseCrosstabs(true);
        fSettings.SetExportCrosstabs(true);
        fSettings.SetMaxThreadNum(2);
        fSettings.SetThreadFactory(&fThreads);
        fpAlgorithm = std::make_unique<DFCAlgorithm>(fSettings, fVars);
    }

    MCStatus Build() { return fpAlgorithm->BuildModel(fData, nullptr); }
    DFCAlgorithm& Algorithm() { return *fpAlgorithm; }
    const MCXML_800::MCVarList& Vars() const { return fVars; }

private:
    MCThread_800::MCStdThreadFactory fThreads;
    MCXML_800::MCVarList fVars;
    DFCSettings fSettings;
    MCCommon_800::MCMemoryRecordIter fData;
    std::unique_ptr<DFCAlgorithm> fpAlgorithm;
};

// ---- What a successful build must leave -------------------------------------------------------

//! A number of the results: finite, or the missing value.
void ExpectNumber(double x, const std::string& what) {
    EXPECT_TRUE(MCMV::IsMissing(x) || std::isfinite(x)) << what << " = " << x;
}

void ExpectNumbers(const std::vector<double>& xs, const std::string& what) {
    for (std::size_t i = 0; i < xs.size(); ++i) {
        ExpectNumber(xs[i], what + "[" + std::to_string(i) + "]");
    }
}

void ExpectProbability(double p, const std::string& what) {
    EXPECT_TRUE(std::isfinite(p) && p >= 0.0 && p <= 1.0) << what << " = " << p;
}

//! A ranked or best candidate has parameters to be simulated from: all finite, except the
//! standard deviation of an Empirical distribution, which is missing where it does not exist
//! (less than two units of weight, or squared deviations beyond the double range).
void ExpectSimulable(DistType type, const std::vector<double>& params, const std::string& what) {
    for (std::size_t i = 0; i < params.size(); ++i) {
        const bool mayBeMissing = type == kDistEmpirical && i == 2;
        EXPECT_TRUE(std::isfinite(params[i]) || (mayBeMissing && MCMV::IsMissing(params[i])))
            << what << " parameter " << i << " = " << params[i];
    }
}

void CheckElement(const DFCOutputStats::DFCVarDistElement& e, const std::string& where) {
    const std::string what = where + " " + e.fDistName;
    ExpectNumbers(e.fInitParams, what + " start");
    ExpectNumbers(e.fDistParams, what + " params");
    for (double x : {e.fChiSquareFit, e.fADFit, e.fADZStar, e.fKSFit, e.fKSDStat}) {
        ExpectNumber(x, what + " statistic");
    }
    for (double p : {e.fChiSquarePValue, e.fADPValue, e.fKSPValue}) {
        if (!MCMV::IsMissing(p)) {
            ExpectProbability(p, what + " p-value");
        }
    }
}

void CheckInfo(const DFCOutputStats::DFCVarDistInfo& info) {
    const std::string& name = info.fFittedVarName;
    ExpectNumbers(info.fCategoryCounts, name + " category counts");
    for (const auto& e : info.fDistElements) {
        CheckElement(e, name);
    }
    for (const auto& e : info.fReportedElements) {
        CheckElement(e, name + " reported");
        ExpectSimulable(e.fDistType, e.fDistParams, name + " reported " + e.fDistName);
    }
    ExpectNumber(info.fBestFitStat, name + " best statistic");
    if (!MCMV::IsMissing(info.fBestFitPValue)) {
        ExpectProbability(info.fBestFitPValue, name + " best p-value");
    }
    if (info.fDistBestType == kDistUnknown) {
        return;
    }
    ASSERT_FALSE(info.fDistBestParams.empty()) << name;
    ExpectSimulable(info.fDistBestType, info.fDistBestParams, name + " best " + info.fDistBestName);
    if (info.fDistBestType == kDistCategorical) {
        double total = 0.0;
        for (double p : info.fDistBestParams) {
            ExpectProbability(p, name + " category probability");
            total += p;
        }
        EXPECT_NEAR_TOL(total, 1.0, 0.0, 1e-12) << name;
    }
}

void CheckResults(const DFCOutputStats& results) {
    for (const auto& info : results.GetCovarDistInfo()) {
        CheckInfo(info);
    }
    for (const auto& info : results.GetFactorDistInfo()) {
        CheckInfo(info);
    }
    const auto& corr = results.GetCorrMatrix();
    for (int i = 0; i < corr.GetNRows(); ++i) {
        for (int j = 0; j <= i; ++j) {
            const double r = corr.GetElem(i, j);
            if (!MCMV::IsMissing(r)) {
                EXPECT_TRUE(std::isfinite(r) && std::fabs(r) <= 1.0 + 1e-12)
                    << "correlation " << i << "," << j << " = " << r;
            }
        }
    }
    double total = 0.0;
    for (double p : results.GetCrstabsProbs()) {
        ExpectProbability(p, "contingency cell");
        total += p;
    }
    if (!results.GetCrstabsProbs().empty()) {
        EXPECT_NEAR_TOL(total, 1.0, 0.0, 1e-12);
    }
}

//! The plan the host builds from the results, as `mcsim fit -o` does: one autofit input per
//! fitted field, completed by SetDFCOutput, written, and read back against the variables.
void CheckPlan(const DFCOutputStats& results, const std::vector<Column>& columns,
               const MCXML_800::MCVarList& vars) {
    SPCSettings plan;
    for (const Column& c : columns) {
        if (c.fRole == Role::kWeight) {
            continue;
        }
        SimInputSpecs input(false);
        input.SetVarName(c.fName);
        const MeasureLevel level = c.fRole == Role::kContinuous ? kLevelContinuous
                                   : c.fRole == Role::kOrdinal  ? kLevelOrdinal
                                                                : kLevelCategorical;
        input.SetVarLevel(level);
        input.SetValueType(c.fRole == Role::kFactor ? IMCVariable::kStringStorage
                                                    : IMCVariable::kNumericStorage);
        EXPECT_TRUE(input.SetDefaultAutofit());
        plan.AddSimulationInput(input);
    }
    plan.SetDFCOutput(results);
    // A field without any fitted distribution is written without one, and such a plan is not
    // read (a simulated field needs its distribution): the host leaves the field out or gives it
    // one. Each such field is one whose fitting found no best distribution.
    std::size_t nWithout = 0;
    for (const SimInputSpecs& input : plan.GetSimulationInput()) {
        nWithout += input.GetDistElementSize() == 0 ? 1 : 0;
    }
    std::size_t nNoBest = 0;
    for (const auto* infos : {&results.GetCovarDistInfo(), &results.GetFactorDistInfo()}) {
        for (const auto& info : *infos) {
            nNoBest += info.fDistBestType == kDistUnknown ? 1 : 0;
        }
    }
    EXPECT_EQ(nWithout, nNoBest);
    MCPlanXMLHandler writer;
    std::string text;
    ASSERT_TRUE(writer.WritePlanFile(text, &plan));
    for (const char* word : {"NaN", "INF", "inf\"", "nan\""}) {
        const std::size_t at = text.find(word);
        EXPECT_EQ(at, std::string::npos)
            << word << " in ..." << text.substr(at < 200 ? 0 : at - 200, 260);
    }
    MCPlanXMLHandler reader(vars, "", false);
    SPCSettings read;
    SPCSettings* target = &read;
    EXPECT_EQ(reader.ParsePlanFile(text, target), nWithout == 0)
        << "the written plan does not read back:\n"
        << text.substr(text.find("<SimulatedFields"));
}

class FittingBadData : public ::testing::TestWithParam<BadData> {};

TEST_P(FittingBadData, DefinedResultOrClearError) {
    const BadData& c = GetParam();
    for (const GoodFitType test : {kAndersonDarling, kKolmogorovSmirnov}) {
        BadDataRun run(c.columns, test);
        const MCStatus status = run.Build();
        if (c.expectedError != 0) {
            EXPECT_TRUE(status.IsError()) << status.GetErrorCode();
            EXPECT_EQ(status.GetErrorCode(), c.expectedError);
            DFCOutputStats* results = nullptr;
            EXPECT_TRUE(run.Algorithm().GetOutputStats(results).IsError());
            EXPECT_EQ(results, nullptr);
            continue;
        }
        ASSERT_FALSE(status.IsError()) << "code " << status.GetErrorCode();
        if (c.expectedValid >= 0) {
            EXPECT_EQ(run.Algorithm().GetNValidRecords(), c.expectedValid);
        }
        ExpectNumber(run.Algorithm().GetValidWeight(), "valid weight");
        EXPECT_TRUE(std::isfinite(run.Algorithm().GetValidWeight()));
        DFCOutputStats* results = nullptr;
        ASSERT_FALSE(run.Algorithm().GetOutputStats(results).IsError());
        ASSERT_NE(results, nullptr);
        CheckResults(*results);
        CheckPlan(*results, c.columns, run.Vars());
        // The fitting statistics document is written as well.
        std::string stats;
        MCPlanXMLHandler handler;
        EXPECT_TRUE(handler.WriteFittingOutStats(stats, results));
    }
}

constexpr int kN = 40;

INSTANTIATE_TEST_SUITE_P(
    Table, FittingBadData,
    ::testing::Values(
        // Missing and non-finite values leave their rows out; the rest is fitted.
        BadData{"NaNInEveryRole",
                {Cont("x", With(Spread(kN), {1, 7}, kNaN)), Ord("k", With(Counts(kN), {2}, kNaN)),
                 Fac("g", With(Codes(kN), {3}, kNaN))},
                0,
                kN - 4},
        BadData{"InfinitiesInEveryRole",
                {Cont("x", With(With(Spread(kN), {1}, kInf), {2}, -kInf)),
                 Ord("k", With(Counts(kN), {3}, kInf)), Fac("g", With(Codes(kN), {4}, -kInf))},
                0,
                kN - 4},
        // Values at the ends of the double range: sums of squares overflow.
        BadData{"NearDoubleMaxBothSigns",
                Ordinary(kN, Cont("x", With(With(Spread(kN), {0, 5}, 1e308), {9, 11}, -1e308))), 0,
                kN},
        BadData{"AllNearDoubleMax", Ordinary(kN, Cont("x", Spread(kN, 1e306, 1.0e308))), 0, kN},
        BadData{"LargestFiniteValues", Ordinary(kN, Cont("x", With(Spread(kN), {0}, kMax))), 0, kN},
        BadData{"LowestFiniteValues", Ordinary(kN, Cont("x", With(Spread(kN), {0, 1}, -kMax))), 0,
                kN},
        BadData{"SubnormalValues", Ordinary(kN, Cont("x", Spread(kN, 1e-310, kDenorm))), 0, kN},
        BadData{"OrdinalNearDoubleMax", Ordinary(kN, Ord("k", With(Counts(kN), {0, 1}, 1e308))), 0,
                kN},
        BadData{"OrdinalHugeCounts", Ordinary(kN, Ord("k", With(Counts(kN), {0, 1, 2}, 4.0e15))), 0,
                kN},
        BadData{"OrdinalFractions", Ordinary(kN, Ord("k", With(Counts(kN), {0, 1, 2}, 2.5))), 0,
                kN},
        BadData{"FactorCodeOutOfRange",
                Ordinary(kN, Fac("g", With(With(Codes(kN), {0}, 1e308), {1}, -3.0))), 0, kN - 2},
        // A field without any value leaves no usable row.
        BadData{"ContinuousAllMissing", Ordinary(kN, Cont("x", Repeat(kN, kNaN))), 390002},
        BadData{"OrdinalAllMissing", Ordinary(kN, Ord("k", Repeat(kN, kNaN))), 390002},
        BadData{"FactorAllMissing", Ordinary(kN, Fac("g", Repeat(kN, kNaN))), 390002},
        BadData{"ContinuousAllInfinite", Ordinary(kN, Cont("x", Repeat(kN, kInf))), 390002},
        // Tiny datasets.
        BadData{"SingleRow", {Cont("x", {3.5}), Ord("k", {2.0}), Fac("g", {1.0})}, 0, 1},
        BadData{
            "TwoRows", {Cont("x", {3.5, 4.5}), Ord("k", {2.0, 3.0}), Fac("g", {1.0, 0.0})}, 0, 2},
        BadData{"TwoEqualRows",
                {Cont("x", {3.5, 3.5}), Ord("k", {2.0, 2.0}), Fac("g", {1.0, 1.0})},
                0,
                2},
        // No spread at all.
        BadData{"ConstantContinuous", Ordinary(kN, Cont("x", Repeat(kN, 7.25))), 0, kN},
        BadData{"ConstantZero", Ordinary(kN, Cont("x", Repeat(kN, 0.0))), 0, kN},
        BadData{"ConstantNegative", Ordinary(kN, Cont("x", Repeat(kN, -2.0))), 0, kN},
        BadData{"ConstantHuge", Ordinary(kN, Cont("x", Repeat(kN, 1e308))), 0, kN},
        BadData{"ConstantOrdinal", Ordinary(kN, Ord("k", Repeat(kN, 3.0))), 0, kN},
        BadData{"ConstantOrdinalZero", Ordinary(kN, Ord("k", Repeat(kN, 0.0))), 0, kN},
        BadData{"ConstantFactor", Ordinary(kN, Fac("g", Repeat(kN, 2.0))), 0, kN},
        // A category, or an ordinal value, seen in one row only.
        BadData{"FactorCategoryWithOneCase",
                Ordinary(kN, Fac("g", With(Repeat(kN, 0.0), {17}, 2.0))), 0, kN},
        BadData{"OrdinalValueWithOneCase", Ordinary(kN, Ord("k", With(Repeat(kN, 1.0), {5}, 4.0))),
                0, kN},
        // Frequency weights: zero and negative weights leave their rows out.
        BadData{"WeightsZeroAndNegative",
                Ordinary(kN, Wt(With(With(Repeat(kN, 2.0), {0, 1, 2}, 0.0), {3, 4}, -1.5))), 0,
                kN - 5},
        BadData{"WeightsAllZeroOrNegative", Ordinary(kN, Wt(With(Repeat(kN, 0.0), {1, 2}, -1.0))),
                390002},
        BadData{"WeightsMissingAndInfinite",
                Ordinary(kN, Wt(With(With(Repeat(kN, 1.0), {0}, kNaN), {1}, kInf))), 0, kN - 2},
        BadData{"WeightsBelowOneInTotal", Ordinary(kN, Wt(Repeat(kN, 0.01))), 0, kN},
        // A total weight beyond the double range is a clear error (the computation failed);
        // large weights whose total is finite are fitted.
        BadData{"WeightsNearDoubleMax", Ordinary(kN, Wt(With(Repeat(kN, 1.0), {0, 1}, 1e308))),
                390005},
        BadData{"WeightsAllNearDoubleMax", Ordinary(kN, Wt(Repeat(kN, 1e307))), 390005},
        BadData{"WeightsLargeWithFiniteTotal", Ordinary(kN, Wt(Repeat(kN, 1e306))), 0, kN},
        BadData{"LargeWeightsAndLargeValues",
                {Cont("x", Spread(kN, 1e300, 1e300)), Ord("k", Counts(kN)), Fac("g", Codes(kN)),
                 Wt(Repeat(kN, 1e306))},
                0,
                kN},
        BadData{"WeightsSubnormal", Ordinary(kN, Wt(Repeat(kN, kDenorm))), 0, kN}),
    [](const auto& p) { return std::string(p.param.name); });

// Values at both ends of the double range: the mean stays a number (moved by a convex
// combination where x - mean overflows), the sums of squared deviations overflow and the
// variances are missing, so no moment estimate is formed and no infinity reaches the results.
TEST(FittingBadData, OppositeEndsOfTheRangeKeepTheMeanAndLoseTheVariance) {
    const std::vector<double> x = {1e308, -1e308, 1e308, -1e308, 5.0, 1e308, -1e308, 2.0};
    BadDataRun run({Cont("x", x), Fac("g", Codes(static_cast<int>(x.size())))});
    ASSERT_FALSE(run.Build().IsError());
    const DFCMomentInputs m = run.Algorithm().GetCovariateMoments(0);
    // The exact mean is 7/8; each step rounds at the scale of the data, 1e308·eps ≈ 2e292.
    EXPECT_TRUE(std::isfinite(m.fMean)) << m.fMean;
    EXPECT_LT(std::fabs(m.fMean - 0.875), 8 * 1e308 * mctest::kEps) << m.fMean;
    EXPECT_TRUE(MCMV::IsMissing(m.fVariance));
    EXPECT_TRUE(MCMV::IsMissing(m.fVarianceW));
    EXPECT_EQ(m.fMinimum, -1e308);
    EXPECT_EQ(m.fMaximum, 1e308);
    DFCOutputStats* results = nullptr;
    ASSERT_FALSE(run.Algorithm().GetOutputStats(results).IsError());
    const auto& info = results->GetCovarDistInfo()[0];
    // Normal needs the variance; Uniform and Triangular need a finite range.
    for (const DistType type : {kDistNormal, kDistUniform, kDistTriangular}) {
        EXPECT_FALSE(info.fDistElements[static_cast<std::size_t>(type)].fbDistAllowed) << type;
    }
    EXPECT_EQ(info.fDistBestType, kDistEmpirical);
}

// A count too large to have a category is no count: the discrete candidates are dropped at
// once (they were tested bin by bin up to the largest value, some 2^31 bins, for minutes).
TEST(FittingBadData, CountsBeyondTheCategoriesDropTheDiscreteCandidates) {
    BadDataRun run({Ord("k", With(Counts(kN), {0}, 4.0e15)), Fac("g", Codes(kN))});
    ASSERT_FALSE(run.Build().IsError());
    DFCOutputStats* results = nullptr;
    ASSERT_FALSE(run.Algorithm().GetOutputStats(results).IsError());
    const auto& info = results->GetCovarDistInfo()[0];
    for (const DistType type : kOrdinal) {
        EXPECT_FALSE(info.fDistElements[static_cast<std::size_t>(type)].fbDistAllowed) << type;
    }
    EXPECT_EQ(info.fDistBestType, kDistUnknown);
}

} // namespace
