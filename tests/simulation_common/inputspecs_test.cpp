// Simulated and fixed input fields: distributions, autofit candidates, the effective level,
// value labels, the stepped fixed values and value semantics.
#include "mccommon/display.h"
#include "simulation_common/simulatespecs.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <sstream>

using namespace MCMCSP_800;
using namespace MCSPConst;

namespace {

DistType AsType(int t) {
    return static_cast<DistType>(t);
}

std::string DisplayText(const SimInputSpecs& input) {
    std::ostringstream os;
    MCDisplay_800::ScopedOutStream redirect(os);
    input.Display();
    return os.str();
}

} // namespace

TEST(SimInputSpecs, DistributionsAreAddedForKnownTypesOnly) {
    SimInputSpecs input(true);
    EXPECT_EQ(input.GetFinalDistType(), kDistUnknown);
    EXPECT_EQ(input.GetFinalDistribution(), nullptr);
    EXPECT_EQ(input.AddDistribution(AsType(16)), -1);
    EXPECT_EQ(input.AddDistribution(AsType(-1)), -1);
    EXPECT_EQ(input.GetDistElementSize(), 0u);

    EXPECT_EQ(input.AddDistribution("DistNormal"), 0);
    EXPECT_EQ(input.GetDistribution(0)->GetDistType(), kDistNormal);
    EXPECT_EQ(input.GetDistribution(0)->GetDistName(), "Normal");
    EXPECT_EQ(input.GetFinalDistribution(), input.GetDistribution(0));
    EXPECT_EQ(input.AddDistribution(kDistUnknown), 1);
    EXPECT_EQ(input.GetDistribution(1)->GetDistName(), "Unknown");
    EXPECT_EQ(input.AddDistribution("no such name"), 2);
    EXPECT_EQ(input.GetDistribution(2)->GetDistType(), kDistUnknown);
    EXPECT_EQ(input.GetDistribution(3), nullptr);

    // Several distributions: no final one, but the first one's type is reported.
    EXPECT_EQ(input.GetFinalDistribution(), nullptr);
    EXPECT_EQ(input.GetFinalDistType(), kDistNormal);
}

TEST(SimInputSpecs, FinalCategoriesComeFromAFirstCategorical) {
    SimInputSpecs input(true);
    std::vector<std::string> cats{"untouched"};
    input.GetFinalCategories(cats);
    EXPECT_EQ(cats, std::vector<std::string>{"untouched"});
    input.AddDistribution(kDistCategorical);
    ASSERT_TRUE(input.GetDistribution(0)->AddParameter("cats", std::vector<std::string>{"a", "b"}));
    EXPECT_TRUE(input.IsFinalCategoricalDist());
    input.GetFinalCategories(cats);
    EXPECT_EQ(cats, (std::vector<std::string>{"a", "b"}));
}

TEST(SimInputSpecsAutofit, DefaultCandidatesByLevel) {
    SimInputSpecs continuous(false);
    EXPECT_TRUE(continuous.SetDefaultAutofit(kLevelContinuous));
    EXPECT_EQ(continuous.GetAutofitNames(),
              (std::vector<std::string>{"Lognormal", "Normal", "Triangular", "Uniform", "Weibull",
                                        "Gamma", "Beta", "Exponential"}));

    SimInputSpecs ordinal(false);
    ordinal.SetVarLevel(kLevelOrdinal);
    EXPECT_TRUE(ordinal.SetDefaultAutofit());
    EXPECT_EQ(ordinal.GetAutofitTypes(),
              (std::vector<DistType>{kDistBinomial, kDistNegbinomial, kDistPoisson}));

    // Raised flags stay raised; an unknown level raises nothing.
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
// Effective measurement level.

namespace {

struct LevelCase {
    const char* label;
    bool manual;
    bool text;
    MeasureLevel own;
    std::vector<DistType> candidates;
    std::vector<DistType> distributions;
    MeasureLevel expected;
};

std::ostream& operator<<(std::ostream& os, const LevelCase& c) {
    return os << c.label;
}

class EffectiveLevel : public ::testing::TestWithParam<LevelCase> {};

} // namespace

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

namespace {
constexpr MeasureLevel kCont = kLevelContinuous;
constexpr MeasureLevel kCat = kLevelCategorical;
constexpr MeasureLevel kOrd = kLevelOrdinal;
} // namespace

// (label, manual, stores texts, own level, candidates, distributions, expected)
INSTANTIATE_TEST_SUITE_P(
    Rules, EffectiveLevel,
    ::testing::Values(
        LevelCase{"ManualTextNoDistribution", true, true, kCont, {}, {}, kCat},
        LevelCase{"ManualNumberKeepsOwnLevel", true, false, kOrd, {}, {}, kOrd},
        LevelCase{
            "ManualFirstDistDecides", true, false, kCat, {}, {kDistNormal, kDistPoisson}, kCont},
        LevelCase{
            "ManualIgnoresCandidates", true, false, kCont, {kDistNormal}, {kDistPoisson}, kOrd},
        LevelCase{
            "AutofitLowestCandidate", false, false, kCont, {kDistNormal, kDistBinomial}, {}, kOrd},
        LevelCase{"AutofitBernoulliIsNone", false, false, kCont, {kDistBernoulli}, {}, kCont},
        LevelCase{"AutofitUsesDistribution", false, true, kCont, {}, {kDistCategorical}, kCat},
        LevelCase{"EmpiricalHasNoCategory", false, false, kOrd, {}, {kDistEmpirical}, kOrd},
        LevelCase{"EmpiricalTextIsCategorical", true, true, kOrd, {}, {kDistEmpirical}, kCat},
        LevelCase{"UserRangesIsContinuous", true, true, kCat, {}, {kDistUserRanges}, kCont}),
    [](const ::testing::TestParamInfo<LevelCase>& row) { return std::string(row.param.label); });

// ---------------------------------------------------------------------------------------------

TEST(SimInputSpecs, BoundsAreSetOnlyAwayFromTheExtremes) {
    SimInputSpecs input(true);
    EXPECT_FALSE(input.HasMinimum());
    EXPECT_FALSE(input.HasMaximum());
    EXPECT_EQ(input.GetMinimum(), -1.7976931348623157e308);
    EXPECT_EQ(input.GetMaximum(), 1.7976931348623157e308);
    input.SetMinimum(0.0);
    EXPECT_TRUE(input.HasMinimum());
    EXPECT_FALSE(input.HasMaximum());
    const std::string text = DisplayText(input);
    EXPECT_NE(text.find("The Minimum has been set and the value is: 0\n"), std::string::npos);
    EXPECT_EQ(text.find("The Maximum has been set"), std::string::npos);
    EXPECT_EQ(text.rfind("End of display SimInputSpecs object\n"),
              text.size() - std::string("End of display SimInputSpecs object\n").size());
}

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
