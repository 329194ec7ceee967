// Simulated and fixed input fields: distributions, autofit candidates, the effective level,
// value labels, the stepped fixed values and value semantics.
#include "simulation_common/simulatespecs.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>

using namespace MCMCSP_800;
using namespace MCSPConst;

namespace {

DistType AsType(int t) {
    return static_cast<DistType>(t);
}

// Types outside the vocabulary are refused; unknown names give an Unknown element. With several
// distributions there is no final one, but the first one's type is reported; the final
// categories come from a first categorical.
TEST(SimInputSpecs, DistributionsAreAddedForKnownTypesOnly) {
    SimInputSpecs input(true);
    std::vector<std::string> cats{"untouched"};
    input.GetFinalCategories(cats);
    EXPECT_EQ(cats, std::vector<std::string>{"untouched"});
    EXPECT_EQ(input.AddDistribution(AsType(16)), -1);
    EXPECT_EQ(input.AddDistribution(AsType(-1)), -1);
    EXPECT_EQ(input.AddDistribution("DistCategorical"), 0);
    ASSERT_TRUE(input.GetDistribution(0)->AddParameter("cats", std::vector<std::string>{"a", "b"}));
    EXPECT_EQ(input.GetFinalDistribution(), input.GetDistribution(0));
    EXPECT_TRUE(input.IsFinalCategoricalDist());
    input.GetFinalCategories(cats);
    EXPECT_EQ(cats, (std::vector<std::string>{"a", "b"}));
    EXPECT_EQ(input.AddDistribution("no such name"), 1);
    EXPECT_EQ(input.GetDistribution(1)->GetDistType(), kDistUnknown);
    EXPECT_EQ(input.GetDistribution(2), nullptr);
    EXPECT_EQ(input.GetFinalDistribution(), nullptr);
    EXPECT_EQ(input.GetFinalDistType(), kDistCategorical);
}

// The defaults follow the level; raised flags stay raised; an unknown level raises nothing.
TEST(SimInputSpecsAutofit, DefaultCandidatesAccumulateByLevel) {
    SimInputSpecs ordinal(false);
    ordinal.SetVarLevel(kLevelOrdinal);
    EXPECT_TRUE(ordinal.SetDefaultAutofit());
    EXPECT_EQ(ordinal.GetAutofitTypes(),
              (std::vector<DistType>{kDistBinomial, kDistNegbinomial, kDistPoisson}));
    EXPECT_TRUE(ordinal.SetDefaultAutofit(kLevelCategorical));
    EXPECT_EQ(ordinal.GetAutofitTypes(), (std::vector<DistType>{kDistBinomial, kDistNegbinomial,
                                                                kDistCategorical, kDistPoisson}));
    SimInputSpecs unknown(false);
    EXPECT_FALSE(unknown.SetDefaultAutofit(kLevelUnknown));
    EXPECT_FALSE(unknown.SetDefaultAutofit(static_cast<MeasureLevel>(4)));
    EXPECT_TRUE(unknown.GetAutofitTypes().empty());
}

TEST(SimInputSpecsAutofit, SingleCandidatesMustBeFittable) {
    for (int t = -1; t <= 16; ++t) {
        SimInputSpecs input(false);
        EXPECT_EQ(input.AddAutofitDist(AsType(t)), t >= 0 && t <= 12) << t;
        // Bernoulli is accepted but never reported as a candidate.
        const bool reported = t >= 0 && t <= 11;
        EXPECT_EQ(input.HasAutofitTypeDist(AsType(t)), reported) << t;
        EXPECT_EQ(input.GetAutofitTypes().size(), reported ? 1u : 0u) << t;
    }
    SimInputSpecs input(false);
    EXPECT_FALSE(input.AddAutofitDist("normal"));
    EXPECT_TRUE(input.AddAutofitDist("DistGamma"));
    EXPECT_TRUE(input.HasAutofitTypeDist("Gamma"));
}

TEST(SimInputSpecsAutofit, CandidateListsMustShareOneCategory) {
    MeasureLevel level = kLevelCategorical;
    SimInputSpecs input(false);
    EXPECT_FALSE(input.SetAutofitDist(std::vector<DistType>{kDistNormal, kDistPoisson}, level));
    EXPECT_EQ(level, kLevelUnknown);
    EXPECT_FALSE(input.SetAutofitDist(std::vector<std::string>{"Normal", "Nrml"}, level));
    EXPECT_TRUE(input.GetAutofitTypes().empty());

    EXPECT_TRUE(input.SetAutofitDist(std::vector<std::string>{"Poisson", "DistBinomial"}, level));
    EXPECT_EQ(level, kLevelOrdinal);
    EXPECT_EQ(input.GetAutofitNames(), (std::vector<std::string>{"Binomial", "Poisson"}));
}

// ---------------------------------------------------------------------------------------------
// Effective measurement level: candidates, then distributions, then the storage decide.

struct LevelCase {
    const char* label;
    bool manual, text; //!< manual distribution; stores texts
    MeasureLevel own;
    std::vector<DistType> candidates, distributions;
    MeasureLevel expected;
};

class EffectiveLevel : public ::testing::TestWithParam<LevelCase> {};

TEST_P(EffectiveLevel, FollowsCandidatesThenDistributionsThenStorage) {
    const LevelCase& c = GetParam();
    SimInputSpecs input(c.manual);
    input.SetString(c.text);
    input.SetVarLevel(c.own);
    for (const DistType t : c.candidates) {
        ASSERT_TRUE(input.AddAutofitDist(t));
    }
    for (const DistType t : c.distributions) {
        ASSERT_GE(input.AddDistribution(t), 0);
    }
    EXPECT_EQ(SimInputSpecs::GetEffectMeasurementLevel(input), c.expected);
}

constexpr MeasureLevel kCont = kLevelContinuous;
constexpr MeasureLevel kCat = kLevelCategorical;
constexpr MeasureLevel kOrd = kLevelOrdinal;

// clang-format off
const LevelCase kLevelCases[] = {
    {"ManualTextNoDistribution", true, true, kCont, {}, {}, kCat},
    {"ManualNumberKeepsOwnLevel", true, false, kOrd, {}, {}, kOrd},
    {"ManualFirstDistDecides", true, false, kCat, {}, {kDistNormal, kDistPoisson}, kCont},
    {"ManualIgnoresCandidates", true, false, kCont, {kDistNormal}, {kDistPoisson}, kOrd},
    {"AutofitLowestCandidate", false, false, kCont, {kDistNormal, kDistBinomial}, {}, kOrd},
    {"AutofitBernoulliIsNone", false, false, kCont, {kDistBernoulli}, {}, kCont},
    {"AutofitUsesDistribution", false, true, kCont, {}, {kDistCategorical}, kCat},
    {"EmpiricalHasNoCategory", false, false, kOrd, {}, {kDistEmpirical}, kOrd},
    {"EmpiricalTextIsCategorical", true, true, kOrd, {}, {kDistEmpirical}, kCat},
    {"UserRangesIsContinuous", true, true, kCat, {}, {kDistUserRanges}, kCont}};
// clang-format on
INSTANTIATE_TEST_SUITE_P(Rules, EffectiveLevel, ::testing::ValuesIn(kLevelCases),
                         [](const auto& row) { return std::string(row.param.label); });

// ---------------------------------------------------------------------------------------------

TEST(SimInputSpecs, ValueLabelsNeedMatchingLists) {
    SimInputSpecs input(true);
    input.SetValueLabels(std::vector<double>{1, 2, 2}, {"one", "two", "deux"});
    input.SetValueLabels(std::vector<double>{7, 8, 9}, {"seven", "eight"});
    input.SetValueLabels(std::vector<double>{}, {});
    EXPECT_EQ(input.GetValueLabel(2.0), "two");
    EXPECT_EQ(input.GetValueLabel(8.0), "");
    EXPECT_EQ(input.GetValueLabel(std::string("1")), "");

    // Texts share the label list: a number past its end has no label rather than a stray read.
    input.SetValueLabels(std::vector<std::string>{"x"}, {"ex"});
    EXPECT_EQ(input.GetValueLabel(std::string("x")), "ex");
    EXPECT_EQ(input.GetValueLabel(2.0), "");
}

TEST(SimInputSpecs, CopiesAreIndependent) {
    SimInputSpecs original(false);
    original.AddDistribution(kDistNormal);
    ASSERT_TRUE(original.GetDistribution(0)->AddParameter("mean", 1.0));
    ASSERT_TRUE(original.AddAutofitDist(kDistGamma));
    original.SetValueLabels(std::vector<double>{1}, {"one"});
    const SimInputSpecs copy = original;

    ASSERT_TRUE(original.GetDistribution(0)->AddParameter("stddev", 2.0));
    ASSERT_TRUE(original.AddAutofitDist(kDistBeta));
    original.SetValueLabels(std::vector<double>{1}, {"uno"});
    EXPECT_EQ(copy.GetDistribution(0)->GetLabel(), "mean=1");
    EXPECT_EQ(copy.GetAutofitTypes(), std::vector<DistType>{kDistGamma});
    EXPECT_EQ(copy.GetValueLabel(1.0), "one");
}

// ---------------------------------------------------------------------------------------------
// Fixed inputs.

TEST(FixedInputSpecs, SteppedValuesIncludeBothEnds) {
    FixedInputSpecs fixed;
    fixed.SetFixedInput(0, 10, 3);
    // Refused: too few steps, an empty or reversed range, a bound that is not a number.
    fixed.SetFixedInput(0, 10, 1);
    fixed.SetFixedInput(5, 5, 3);
    fixed.SetFixedInput(10, 0, 3);
    fixed.SetFixedInput(0, std::nan(""), 3);
    // Appended to what is there; the ends are exact even where the steps round.
    fixed.SetFixedInput(0.1, 0.7, 7);
    std::vector<double> values;
    fixed.GetInputValue(values);
    ASSERT_EQ(values.size(), 10u);
    EXPECT_EQ(std::vector<double>(values.begin(), values.begin() + 3),
              (std::vector<double>{0, 5, 10}));
    EXPECT_EQ(values[3], 0.1);
    EXPECT_EQ(values[9], 0.7);
    for (std::size_t i = 1; i < 6; ++i) {
        EXPECT_NEAR_TOL(values[3 + i], 0.1 + 0.1 * static_cast<double>(i), 0, 4 * mctest::kEps);
    }

    // The widest range steps without overflowing.
    const double big = std::numeric_limits<double>::max();
    FixedInputSpecs wide;
    wide.SetFixedInput(-big, big, 5);
    values.clear();
    wide.GetInputValue(values);
    ASSERT_EQ(values.size(), 5u);
    EXPECT_EQ(values[0], -big);
    EXPECT_EQ(values[2], 0.0);
    EXPECT_NEAR_REL(values[3], big / 2, 4 * mctest::kEps);
    EXPECT_EQ(values[4], big);
}

TEST(FixedInputSpecs, KindFollowsTheFirstValue) {
    FixedInputSpecs fixed;
    EXPECT_FALSE(fixed.IsNumeric() || fixed.IsString());
    fixed.AddInputValue(std::string("low"));
    fixed.AddInputValue(5.0);
    EXPECT_TRUE(fixed.IsString());
    std::vector<std::string> texts{"kept"};
    fixed.GetInputValue(texts);
    EXPECT_EQ(texts, (std::vector<std::string>{"kept", "low", "5"}));

    fixed.SetInputValue(std::vector<double>{2.5});
    const FixedInputSpecs copy = fixed;
    fixed.SetInputValue(std::vector<std::string>{"a", "b"});
    EXPECT_TRUE(copy.IsNumeric());
    EXPECT_EQ(copy.GetInputValueSize(), 1u);
}

} // namespace
