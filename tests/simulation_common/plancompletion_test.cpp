// Completing a plan: categorical inputs aligned with the host's categories, the contingency
// table trimmed and encoded, and autofit inputs, correlations and the table taken from
// fitting results built by hand.
#include "component/mcspassert.h"
#include "distribution_fitting/dfcalgorithm.h"
#include "distribution_fitting/dfcoutputstats.h"
#include "mccommon/mcmv.h"
#include "mcxml/mcxml.h"
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/spcsettings.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <cmath>
#include <memory>
#include <string>
#include <vector>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCXML_800::IMCVariable;
using MCXML_800::MCCatNumEncoder;
using MCXML_800::MCCatVar;
using MCXML_800::MCScaleVar;
using MCXML_800::MCVarList;

namespace {

using Names = std::vector<std::string>;
using Probs = std::vector<double>;
using Rows = std::vector<std::vector<double>>;

// A rescaled probability is one sum and one division away from the quotient the test forms.
constexpr double kProbTol = 4 * mctest::kEps;

SimInputSpecs CatInput(const std::string& name, const Names& cats,
                       const std::vector<Probs>& probSets, bool isString = true) {
    SimInputSpecs input(true);
    input.SetVarName(name);
    input.SetVarLevel(kLevelCategorical);
    input.SetString(isString);
    for (const Probs& probs : probSets) {
        DistInfoElem* dist = input.GetDistribution(
            static_cast<std::size_t>(input.AddDistribution(kDistCategorical)));
        EXPECT_TRUE(dist->AddParameter("cats", cats));
        EXPECT_TRUE(dist->AddParameter("probs", probs));
    }
    return input;
}

SimInputSpecs NormalInput(const std::string& name, bool manual, double mean, double stddev) {
    SimInputSpecs input(manual);
    input.SetVarName(name);
    input.SetVarLevel(kLevelContinuous);
    DistInfoElem* dist =
        input.GetDistribution(static_cast<std::size_t>(input.AddDistribution(kDistNormal)));
    EXPECT_TRUE(dist->AddParameter("mean", mean));
    EXPECT_TRUE(dist->AddParameter("stddev", stddev));
    return input;
}

//! An autofit input with no distribution yet and the default candidates of `level`.
SimInputSpecs AutofitInput(const std::string& name, MeasureLevel level, bool isString = false) {
    SimInputSpecs input(false);
    input.SetVarName(name);
    input.SetVarLevel(level);
    input.SetString(isString);
    EXPECT_TRUE(input.SetDefaultAutofit(level));
    return input;
}

Names Categories(const SimInputSpecs& input, std::size_t d = 0) {
    Names cats;
    std::string name;
    input.GetDistribution(d)->GetParameterNameValue(0, name, cats);
    return cats;
}

Probs Probabilities(const SimInputSpecs& input, std::size_t d = 0) {
    Probs probs;
    std::string name;
    input.GetDistribution(d)->GetParameterNameValue(1, name, probs);
    return probs;
}

void ExpectProbs(const Probs& actual, const Probs& expected) {
    ASSERT_EQ(actual.size(), expected.size());
    for (std::size_t i = 0; i < expected.size(); ++i) {
        EXPECT_NEAR_TOL(actual[i], expected[i], kProbTol, kProbTol) << "position " << i;
    }
}

std::unique_ptr<IMCVariable> TextVar(const std::string& name, const Names& cats,
                                     int measure = IMCVariable::kNominalKind) {
    return std::make_unique<MCCatVar>(name, MCCatNumEncoder(cats), false, measure);
}

std::unique_ptr<IMCVariable> NumberVar(const std::string& name, const Probs& cats) {
    return std::make_unique<MCCatVar>(name, MCCatNumEncoder(cats), true, IMCVariable::kOrderedKind);
}

// ---- One categorical input against the host's categories ----------------------------------

struct AlignCase {
    const char* fName;      //!< test name
    Names fPlanCats;        //!< the plan's categories
    Probs fPlanProbs;       //!< their probabilities
    Names fHostTexts;       //!< the host's text categories; none for a numeric variable
    Probs fHostNumbers;     //!< the host's numeric categories
    Names fExpectCats;      //!< categories after alignment
    Probs fExpectProbs;     //!< probabilities after alignment
    Names fExpectUnmatched; //!< plan categories the host lacks
    bool fbExpectAllInvalid;
};

class AlignCategories : public ::testing::TestWithParam<AlignCase> {};

TEST_P(AlignCategories, FollowsTheHostCategories) {
    const AlignCase& c = GetParam();
    const bool isString = !c.fHostTexts.empty();
    SimInputSpecs input = CatInput("k", c.fPlanCats, {c.fPlanProbs}, isString);
    const std::unique_ptr<IMCVariable> var =
        isString ? TextVar("k", c.fHostTexts) : NumberVar("k", c.fHostNumbers);
    input.AdjustCategories(var.get());

    ASSERT_EQ(input.GetDistElementSize(), 1u);
    EXPECT_EQ(input.GetDistribution(0)->GetDistName(), "Categorical");
    EXPECT_EQ(Categories(input), c.fExpectCats);
    ExpectProbs(Probabilities(input), c.fExpectProbs);
    EXPECT_EQ(input.GetUnmatchedCagegories(), c.fExpectUnmatched);
    EXPECT_EQ(input.IsAllCategoriesInvalid(), c.fbExpectAllInvalid);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Table, AlignCategories, ::testing::Values(
    // b is gone: a and c keep their ratio and sum to 1 again; d is new with 0.
    AlignCase{"MissingCategoryRescales", {"a", "b", "c"}, {0.2, 0.3, 0.5}, {"a", "c", "d"}, {},
              {"a", "c", "d"}, {0.2 / 0.7, 0.5 / 0.7, 0.0}, {"b"}, false},
    AlignCase{"ExtraHostCategoryGetsZero", {"a", "b", "c"}, {0.2, 0.3, 0.5}, {"a", "b", "c", "d"},
              {}, {"a", "b", "c", "d"}, {0.2, 0.3, 0.5, 0.0}, {}, false},
    // Nothing matched: the sum is 0, so nothing is rescaled.
    AlignCase{"NoMatchLeavesZeros", {"a", "b", "c"}, {0.2, 0.3, 0.5}, {"x", "y"}, {},
              {"x", "y"}, {0.0, 0.0}, {"a", "b", "c"}, true},
    // The same categories in another order are left as the plan has them.
    AlignCase{"SameSetIsLeftAlone", {"c", "b", "a"}, {0.5, 0.3, 0.2}, {"a", "b", "c"}, {},
              {"c", "b", "a"}, {0.5, 0.3, 0.2}, {}, false},
    // Host numbers 2.0 and 1.0 are the texts "2" and "1"; the host's order wins.
    AlignCase{"NumbersMatchInDefaultForm", {"1", "2"}, {0.4, 0.6}, {}, {2.0, 1.0, 3.0},
              {"2", "1", "3"}, {0.6, 0.4, 0.0}, {}, false},
    AlignCase{"FractionalAndLargeNumbersMatch", {"0.1", "0.25", "1e+06"}, {0.4, 0.5, 0.1}, {},
              {0.25, 1e6, 0.1, 7.0}, {"0.25", "1e+06", "0.1", "7"}, {0.5, 0.1, 0.4, 0.0}, {},
              false},
    // Texts differ by case: no match is made by folding.
    AlignCase{"MatchIsExact", {"A", "b"}, {0.5, 0.5}, {"a", "b"}, {}, {"a", "b"}, {0.0, 1.0},
              {"A"}, false}),
    [](const ::testing::TestParamInfo<AlignCase>& row) { return std::string(row.param.fName); });
// clang-format on

TEST(AlignCategories, EveryDistributionIsAlignedAndTheFirstNamesTheUnmatched) {
    SimInputSpecs input = CatInput("k", {"a", "b", "c"}, {{0.2, 0.3, 0.5}, {0.5, 0.5, 0.0}});
    const std::unique_ptr<IMCVariable> var = TextVar("k", {"a", "c", "d"});
    input.AdjustCategories(var.get());

    ASSERT_EQ(input.GetDistElementSize(), 2u);
    EXPECT_EQ(Categories(input, 1), (Names{"a", "c", "d"}));
    // Only a (0.5) survives in the second set: rescaled to 1.
    ExpectProbs(Probabilities(input, 1), {1.0, 0.0, 0.0});
    EXPECT_EQ(input.GetUnmatchedCagegories(), (Names{"b"}));

    // Aligning again changes nothing and reports nothing unmatched.
    input.AdjustCategories(var.get());
    EXPECT_EQ(Categories(input, 0), (Names{"a", "c", "d"}));
    ExpectProbs(Probabilities(input, 0), {0.2 / 0.7, 0.5 / 0.7, 0.0});
    EXPECT_TRUE(input.GetUnmatchedCagegories().empty());
}

TEST(AlignCategories, NothingHappensWithoutAMatchingCategoricalVariable) {
    struct Case {
        const char* fWhat;
        SimInputSpecs fInput;
        std::unique_ptr<IMCVariable> fVar;
    };
    std::vector<Case> cases;
    cases.push_back({"no variable", CatInput("k", {"a"}, {{1.0}}), nullptr});
    cases.push_back(
        {"scale variable", CatInput("k", {"a"}, {{1.0}}), std::make_unique<MCScaleVar>("k")});
    cases.push_back({"string input, numeric variable", CatInput("k", {"1"}, {{1.0}}),
                     NumberVar("k", {1.0, 2.0})});
    cases.push_back({"numeric input, string variable", CatInput("k", {"a"}, {{1.0}}, false),
                     TextVar("k", {"a", "b"})});
    cases.push_back({"categories measured as scale", CatInput("k", {"a"}, {{1.0}}),
                     TextVar("k", {"a", "b"}, IMCVariable::kScaleKind)});
    cases.push_back({"first distribution not categorical", NormalInput("k", true, 0.0, 1.0),
                     TextVar("k", {"a", "b"})});
    for (Case& c : cases) {
        SCOPED_TRACE(c.fWhat);
        const std::string before = c.fInput.GetDistribution(0)->GetLabel();
        c.fInput.AdjustCategories(c.fVar.get());
        EXPECT_EQ(c.fInput.GetDistribution(0)->GetLabel(), before);
        EXPECT_TRUE(c.fInput.GetUnmatchedCagegories().empty());
        EXPECT_FALSE(c.fInput.IsAllCategoriesInvalid());
    }
}

// ---- The whole plan against the host's variables ---------------------------------------------

//! Factors k (a, b, c) and g (x, y) with a four-row table, a Normal input, and a categorical
//! input the host does not know.
SPCSettings TablePlan() {
    SPCSettings plan;
    plan.AddSimulationInput(CatInput("k", {"a", "b", "c"}, {{0.2, 0.3, 0.5}}));
    plan.AddSimulationInput(CatInput("g", {"x", "y"}, {{0.5, 0.5}}));
    plan.AddSimulationInput(NormalInput("n", true, 0.0, 1.0));
    plan.AddSimulationInput(CatInput("unknown", {"u"}, {{1.0}}));
    plan.SetCrstabsFactors({"k", "g"});
    plan.SetCrstabsMatrix({{"a", "x"}, {"b", "x"}, {"c", "y"}, {"b", "y"}});
    plan.SetCrstabsProbs({0.1, 0.2, 0.3, 0.4});
    return plan;
}

MCVarList TableVariables() {
    MCVarList vars;
    vars.Add(TextVar("k", {"a", "c", "d"}));
    vars.Add(TextVar("g", {"y", "x"}));
    vars.Add(std::make_unique<MCScaleVar>("n"));
    return vars;
}

TEST(AdjustCategoricals, RowsOfVanishedCategoriesGoAndTheRestIsRescaled) {
    SPCSettings plan = TablePlan();
    plan.AdjustCategoricals(TableVariables());

    EXPECT_EQ(Categories(*plan.GetSimInput("k")), (Names{"a", "c", "d"}));
    // g has the same categories in another order: left alone.
    EXPECT_EQ(Categories(*plan.GetSimInput("g")), (Names{"x", "y"}));
    EXPECT_EQ(Categories(*plan.GetSimInput("unknown")), (Names{"u"}));
    EXPECT_EQ(plan.GetSimInput("n")->GetDistribution(0)->GetLabel(), "mean=0 stddev=1");

    EXPECT_EQ(plan.GetCrstabsMatrix(), (std::vector<Names>{{"a", "x"}, {"c", "y"}}));
    ExpectProbs(plan.GetCrstabsProbs(), {0.1 / 0.4, 0.3 / 0.4});
}

TEST(AdjustCategoricals, CodesComputedBeforeAreRecomputedAfterwards) {
    SPCSettings plan = TablePlan();
    plan.EncodeCatValues();
    ASSERT_TRUE(plan.AreCategEncoded());
    EXPECT_EQ(plan.GetCrstabsEncod(),
              (std::vector<std::vector<int>>{{0, 0}, {1, 0}, {2, 1}, {1, 1}}));

    // Aligning moves c to position 1 and drops two rows: the old codes would point at the
    // wrong categories and rows.
    plan.AdjustCategoricals(TableVariables());
    EXPECT_FALSE(plan.AreCategEncoded());
    plan.EncodeCatValues();
    EXPECT_EQ(plan.GetCrstabsEncod(), (std::vector<std::vector<int>>{{0, 0}, {1, 1}}));

    // Aligning again changes nothing, and the codes stay.
    plan.AdjustCategoricals(TableVariables());
    EXPECT_TRUE(plan.AreCategEncoded());
}

TEST(EncodeCatValues, UnknownCategoryOrShortRowIsMinusOneAndEncodingHappensOnce) {
    SPCSettings plan = TablePlan();
    plan.SetCrstabsMatrix({{"a", "y"}, {"z", "x"}, {"c"}});
    plan.SetCrstabsProbs({0.5, 0.3, 0.2});
    plan.EncodeCatValues();
    EXPECT_TRUE(plan.AreCategEncoded());
    EXPECT_EQ(plan.GetCrstabsEncod(), (std::vector<std::vector<int>>{{0, 1}, {-1, 0}, {2, -1}}));

    plan.SetCrstabsMatrix({{"c", "y"}});
    plan.EncodeCatValues();
    EXPECT_EQ(plan.GetCrstabsEncod().size(), 3u) << "a second call does nothing";

    SPCSettings noFactors;
    noFactors.EncodeCatValues();
    EXPECT_TRUE(noFactors.AreCategEncoded());
}

TEST(EncodeCatValues, FactorWithoutInputOrFinalDistributionGivesMinusOne) {
    SPCSettings plan;
    plan.AddSimulationInput(CatInput("k", {"a", "b"}, {{0.5, 0.5}, {0.1, 0.9}}));
    plan.AddSimulationInput(CatInput("g", {"x", "y"}, {{0.5, 0.5}}));
    plan.SetCrstabsFactors({"k", "absent", "g"});
    plan.SetCrstabsMatrix({{"a", "q", "y"}});
    plan.SetCrstabsProbs({1.0});

    ClearLastAssertion();
    plan.EncodeCatValues();
    // k has two distributions and so no final one; "absent" is no input.
    EXPECT_EQ(plan.GetCrstabsEncod(), (std::vector<std::vector<int>>{{-1, -1, 1}}));
    EXPECT_FALSE(GetLastAssertion().empty());
    ClearLastAssertion();
}

// ---- Completion from fitting results ---------------------------------------------------------

//! Fitting results for covariates x, m, q and factor k; the host objects live as long as the
//! results.
class FittedResults {
public:
    FittedResults() {
        fVars.Add(std::make_unique<MCScaleVar>("x"));
        fVars.Add(std::make_unique<MCScaleVar>("m"));
        fVars.Add(std::make_unique<MCScaleVar>("q"));
        fVars.Add(TextVar("k", {"a", "b"}));
        for (int v = 0; v < 3; ++v) {
            EXPECT_GT(fSettings.AddCovariate(v, {kDistNormal, kDistGamma}, kLevelContinuous, false),
                      0);
        }
        EXPECT_GT(fSettings.AddFactor(3, 2, {kDistCategorical}, kLevelCategorical, false), 0);
        fSettings.SetUseCrosstabs(true);
        fpResults = std::make_unique<DFCOutputStats>(fSettings, fVars);

        SetBest(Covariate(0), kDistGamma, {"shape", "scale"}, {2.0, 3.0});
        SetBest(Covariate(1), kDistNormal, {"mean", "stddev"}, {7.0, 0.5});
        SetBest(Covariate(2), kDistNormal, {"mean", "stddev"}, {-1.0, 2.0});
        SetBest(Factor(0), kDistCategorical, {"a", "b"}, {0.4, 0.6});

        // Correlations of x, m, q: 0.5 (x, m), 0.2 (x, q), 0.1 (m, q).
        MCMath_800::MCSymMatrix& corr = fpResults->GetCorrMatrix();
        corr.SetIdentity(3);
        corr.SetElem(1, 0, 0.5);
        corr.SetElem(2, 0, 0.2);
        corr.SetElem(2, 1, 0.1);
        fpResults->GetCrstabsMatrix() = {{"a"}, {"b"}};
        fpResults->GetCrstabsProbs() = {0.4, 0.6};
    }

    static void SetBest(DFCOutputStats::DFCVarDistInfo& record, DistType type, const Names& names,
                        const Probs& params) {
        record.fDistBestType = type;
        record.fDistBestName = DistType2String(type);
        record.fDistBestParamNames = names;
        record.fDistBestParams = params;
    }

    DFCOutputStats::DFCVarDistInfo& Covariate(std::size_t i) {
        return fpResults->GetCovarDistInfo()[i];
    }
    DFCOutputStats::DFCVarDistInfo& Factor(std::size_t i) {
        return fpResults->GetFactorDistInfo()[i];
    }
    const DFCOutputStats& Results() const { return *fpResults; }

private:
    MCVarList fVars;
    DFCSettings fSettings;
    std::unique_ptr<DFCOutputStats> fpResults;
};

//! Autofit x and k, manual m, a continuous manual z and a mapped w not in the results.
SPCSettings CompletionPlan() {
    SPCSettings plan;
    plan.AddSimulationInput(AutofitInput("x", kLevelContinuous));
    plan.AddSimulationInput(NormalInput("m", true, 100.0, 10.0));
    plan.AddSimulationInput(AutofitInput("k", kLevelCategorical, true));
    plan.AddSimulationInput(NormalInput("z", true, 0.0, 1.0));
    SimInputSpecs mapped = NormalInput("w", true, 0.0, 1.0);
    mapped.SetMapVarName("w_source");
    plan.AddSimulationInput(mapped);
    return plan;
}

TEST(SetDFCOutput, AutofitInputsTableAndCorrelationsAreTaken) {
    FittedResults fit;
    SPCSettings plan = CompletionPlan();
    plan.SetDFCOutput(fit.Results());

    const SimInputSpecs& x = *plan.GetSimInput("x");
    ASSERT_EQ(x.GetDistElementSize(), 1u);
    EXPECT_EQ(x.GetDistribution(0)->GetDistType(), kDistGamma);
    EXPECT_EQ(x.GetDistribution(0)->GetLabel(), "shape=2 scale=3");

    const SimInputSpecs& m = *plan.GetSimInput("m");
    ASSERT_EQ(m.GetDistElementSize(), 1u);
    EXPECT_EQ(m.GetDistribution(0)->GetLabel(), "mean=100 stddev=10");

    const SimInputSpecs& k = *plan.GetSimInput("k");
    ASSERT_EQ(k.GetDistElementSize(), 1u);
    EXPECT_EQ(k.GetDistribution(0)->GetDistType(), kDistCategorical);
    EXPECT_EQ(Categories(k), (Names{"a", "b"}));
    ExpectProbs(Probabilities(k), {0.4, 0.6});

    EXPECT_EQ(plan.GetCrstabsFactors(), (Names{"k"}));
    EXPECT_EQ(plan.GetCrstabsMatrix(), (std::vector<Names>{{"a"}, {"b"}}));
    EXPECT_EQ(plan.GetCrstabsProbs(), (Probs{0.4, 0.6}));

    // q is not a plan input: its row and column are left out, and x and m keep their own
    // correlation. z follows; w is mapped and k categorical.
    EXPECT_EQ(plan.GetCorrVarList(), (Names{"x", "m", "z"}));
    EXPECT_EQ(plan.GetCorrMatrix(), (Rows{{1.0, 0.5, 0.0}, {0.5, 1.0, 0.0}, {0.0, 0.0, 1.0}}));
}

TEST(SetDFCOutput, CorrelationsAlreadyInThePlanAreKept) {
    FittedResults fit;
    SPCSettings plan = CompletionPlan();
    plan.SetCorrMatrixCell("z", "x", 0.3);
    const Names vars = plan.GetCorrVarList();
    const Rows matrix = plan.GetCorrMatrix();

    plan.SetDFCOutput(fit.Results());
    EXPECT_EQ(plan.GetCorrVarList(), vars);
    EXPECT_EQ(plan.GetCorrMatrix(), matrix);
    EXPECT_EQ(plan.GetSimInput("x")->GetDistElementSize(), 1u) << "inputs are still filled";
}

TEST(SetDFCOutput, WithoutCrosstabsTheTableIsLeftAlone) {
    SPCSettings plan = CompletionPlan();
    DFCSettings settings;
    MCVarList vars;
    vars.Add(std::make_unique<MCScaleVar>("x"));
    EXPECT_GT(settings.AddCovariate(0, {kDistNormal}, kLevelContinuous, false), 0);
    DFCOutputStats results(settings, vars);
    FittedResults::SetBest(results.GetCovarDistInfo()[0], kDistNormal, {"mean", "stddev"},
                           {1.0, 2.0});
    plan.SetCrstabsFactors({"k"});
    plan.SetCrstabsMatrix({{"b"}});
    plan.SetCrstabsProbs({1.0});

    plan.SetDFCOutput(results);
    EXPECT_EQ(plan.GetCrstabsMatrix(), (std::vector<Names>{{"b"}}));
    // One covariate and no fitted correlations: x gets identity like the others.
    EXPECT_EQ(plan.GetCorrVarList(), (Names{"x", "m", "z"}));
    EXPECT_EQ(plan.GetCorrMatrix(), (Rows{{1.0, 0.0, 0.0}, {0.0, 1.0, 0.0}, {0.0, 0.0, 1.0}}));
}

TEST(SetDFCOutput, CrosstabsWithoutCellsLeaveTheTableAlone) {
    FittedResults fit;
    DFCOutputStats noCells = fit.Results();
    noCells.GetCrstabsMatrix().clear();
    noCells.GetCrstabsProbs().clear();
    SPCSettings plan = CompletionPlan();
    plan.SetDFCOutput(noCells);
    EXPECT_TRUE(plan.GetCrstabsFactors().empty());
    EXPECT_EQ(plan.GetSimInput("k")->GetDistElementSize(), 1u);
}

TEST(SetDFCOutput, NewTableForgetsOldCodes) {
    FittedResults fit;
    SPCSettings plan = CompletionPlan();
    plan.SetCrstabsFactors({"k"});
    plan.SetCrstabsMatrix({{"b"}});
    plan.SetCrstabsProbs({1.0});
    // k has no categories yet: its only code is -1.
    ClearLastAssertion();
    plan.EncodeCatValues();
    ClearLastAssertion();
    EXPECT_EQ(plan.GetCrstabsEncod(), (std::vector<std::vector<int>>{{-1}}));

    plan.SetDFCOutput(fit.Results());
    EXPECT_FALSE(plan.AreCategEncoded());
    plan.EncodeCatValues();
    EXPECT_EQ(plan.GetCrstabsEncod(), (std::vector<std::vector<int>>{{0}, {1}}));
}

TEST(SetDFCFieldDist, EmpiricalBestCarriesBoundsSpreadAndProportions) {
    FittedResults fit;
    FittedResults::SetBest(fit.Covariate(0), kDistEmpirical, {"min", "max", "stddev", "probs"},
                           {0.0, 10.0, 2.5, 0.2, 0.3, 0.5});
    SPCSettings plan = CompletionPlan();
    plan.SetDFCFieldDist(fit.Covariate(0));

    const SimInputSpecs& x = *plan.GetSimInput("x");
    ASSERT_EQ(x.GetDistElementSize(), 1u);
    const DistInfoElem& dist = *x.GetDistribution(0);
    EXPECT_EQ(dist.GetDistType(), kDistEmpirical);
    std::vector<std::string> names;
    Probs firstValues;
    dist.GetParameterNameValues(names, firstValues);
    EXPECT_EQ(names, (Names{"min", "max", "stddev", "probs"}));
    EXPECT_EQ(firstValues, (Probs{0.0, 10.0, 2.5, 0.2}));
    Probs probs;
    std::string name;
    dist.GetParameterNameValue(3, name, probs);
    EXPECT_EQ(probs, (Probs{0.2, 0.3, 0.5}));
}

TEST(SetDFCFieldDist, RecordsThatGiveNothing) {
    struct Case {
        const char* fWhat;
        std::string fInput;
        DistType fType;
        Names fNames;
        Probs fParams;
    };
    const std::vector<Case> cases = {
        {"manual input", "m", kDistGamma, {"shape", "scale"}, {2.0, 3.0}},
        {"manual input, Empirical best", "m", kDistEmpirical, {}, {0.0, 1.0, 0.5, 1.0}},
        {"no best distribution", "x", kDistUnknown, {}, {}},
        {"Empirical without proportions", "x", kDistEmpirical, {}, {0.0, 1.0, 0.5}},
    };
    for (const Case& c : cases) {
        SCOPED_TRACE(c.fWhat);
        FittedResults fit;
        DFCOutputStats::DFCVarDistInfo& record = fit.Covariate(c.fInput == "m" ? 1 : 0);
        FittedResults::SetBest(record, c.fType, c.fNames, c.fParams);
        SPCSettings plan = CompletionPlan();
        const SimInputSpecs before = *plan.GetSimInput(c.fInput);
        ClearLastAssertion();
        plan.SetDFCFieldDist(record);
        const SimInputSpecs& after = *plan.GetSimInput(c.fInput);
        ASSERT_EQ(after.GetDistElementSize(), before.GetDistElementSize());
        for (std::size_t d = 0; d < before.GetDistElementSize(); ++d) {
            EXPECT_EQ(after.GetDistribution(d)->GetLabel(), before.GetDistribution(d)->GetLabel());
        }
    }
    ClearLastAssertion();
}

TEST(GetCorrMatrixCellCollectionFrom, OneRowNoRecordsOrNoResults) {
    FittedResults fit;
    std::vector<SPCSettings::CorrMatrixCell> cells{{"stale", "stale", 9.0}};
    DFCOutputStats oneRow = fit.Results();
    oneRow.GetCorrMatrix().SetIdentity(1);
    EXPECT_TRUE(SPCSettings::GetCorrMatrixCellCollectionFrom(cells, &oneRow));
    EXPECT_TRUE(cells.empty());

    // More rows than covariate records: no names for the extra rows.
    cells.push_back({"stale", "stale", 9.0});
    DFCOutputStats tooLarge = fit.Results();
    tooLarge.GetCorrMatrix().SetIdentity(4);
    EXPECT_FALSE(SPCSettings::GetCorrMatrixCellCollectionFrom(cells, &tooLarge));
    EXPECT_TRUE(cells.empty());

    cells.push_back({"stale", "stale", 9.0});
    EXPECT_FALSE(SPCSettings::GetCorrMatrixCellCollectionFrom(cells, nullptr));
    EXPECT_TRUE(cells.empty());
}

} // namespace

// ---- From data to a plan file and back -------------------------------------------------------

namespace {

//! price (continuous), units (a count), region and channel (categories) and a manual input's
//! field.
MCVarList SalesVariables() {
    MCVarList vars;
    vars.Add(std::make_unique<MCScaleVar>("price"));
    vars.Add(std::make_unique<MCScaleVar>("units"));
    vars.Add(TextVar("region", {"north", "south", "west"}));
    vars.Add(std::make_unique<MCScaleVar>("discount"));
    vars.Add(TextVar("channel", {"web", "store"}));
    return vars;
}

//! 240 deterministic cases: a skewed positive price, a small count, and two category codes.
MCCommon_800::MCMemoryRecordIter SalesData() {
    MCCommon_800::MCMemoryRecordIter data;
    for (int i = 0; i < 240; ++i) {
        const double u = (i + 0.5) / 240.0;
        const double price = 5.0 - 2.0 * std::log(1.0 - u) + 0.3 * std::sin(i);
        const double units = static_cast<double>((i * 7) % 5 + (i % 3));
        const double region = static_cast<double>((i / 7 + i % 2) % 3);
        const double channel = i % 4 == 0 ? 1.0 : 0.0;
        data.Add(MCXML_800::Record(std::vector<double>{price, units, region, 0.1, channel}));
    }
    return data;
}

} // namespace

TEST(PlanFromFitting, FittedPlanIsWrittenAndReadBackComplete) {
    const MCVarList vars = SalesVariables();
    DFCSettings settings;
    ASSERT_GT(settings.AddCovariate(0, {kDistNormal, kDistGamma, kDistLognormal, kDistWeibull},
                                    kLevelContinuous, false),
              0);
    ASSERT_GT(settings.AddCovariate(1, {kDistPoisson, kDistBinomial}, kLevelOrdinal, false), 0);
    ASSERT_GT(settings.AddFactor(2, 3, {kDistCategorical}, kLevelCategorical, false), 0);
    ASSERT_GT(settings.AddFactor(4, 2, {kDistCategorical}, kLevelCategorical, false), 0);
    settings.SetUseCrosstabs(true);
    settings.SetExportCrosstabs(true);
    settings.SetBins(10);
    DFCAlgorithm algorithm(settings, vars);
    MCCommon_800::MCMemoryRecordIter data = SalesData();
    ASSERT_FALSE(algorithm.BuildModel(data, nullptr).IsError());
    DFCOutputStats* results = nullptr;
    ASSERT_FALSE(algorithm.GetOutputStats(results).IsError());
    ASSERT_NE(results, nullptr);

    SPCSettings plan;
    plan.AddSimulationInput(AutofitInput("price", kLevelContinuous));
    plan.AddSimulationInput(AutofitInput("units", kLevelOrdinal));
    plan.AddSimulationInput(AutofitInput("region", kLevelCategorical, true));
    plan.AddSimulationInput(AutofitInput("channel", kLevelCategorical, true));
    plan.AddSimulationInput(NormalInput("discount", true, 0.1, 0.02));
    plan.SetDFCOutput(*results);

    MCPlanXMLHandler writer;
    std::string text;
    ASSERT_TRUE(writer.WritePlanFile(text, &plan));
    MCPlanXMLHandler reader(vars, "", false);
    SPCSettings read;
    SPCSettings* target = &read;
    ASSERT_TRUE(reader.ParsePlanFile(text, target)) << text;

    const std::vector<const DFCOutputStats::DFCVarDistInfo*> records = {
        &results->GetCovarDistInfo()[0], &results->GetCovarDistInfo()[1],
        &results->GetFactorDistInfo()[0], &results->GetFactorDistInfo()[1]};
    for (const DFCOutputStats::DFCVarDistInfo* record : records) {
        SCOPED_TRACE(record->fFittedVarName);
        const SimInputSpecs* input = read.GetSimInput(record->fFittedVarName);
        ASSERT_NE(input, nullptr);
        EXPECT_TRUE(input->IsAutofit());
        ASSERT_EQ(input->GetDistElementSize(), 1u);
        EXPECT_EQ(input->GetDistribution(0)->GetDistType(), record->fDistBestType);
        std::vector<std::string> names;
        std::vector<double> values;
        input->GetDistribution(0)->GetParameterNameValues(names, values);
        if (record->fDistBestType == kDistCategorical) {
            EXPECT_EQ(Categories(*input), record->fDistBestParamNames);
            EXPECT_EQ(Probabilities(*input), record->fDistBestParams) << "read bit for bit";
        } else if (record->fDistBestType != kDistEmpirical) {
            EXPECT_EQ(names, record->fDistBestParamNames);
            EXPECT_EQ(values, record->fDistBestParams) << "read bit for bit";
        }
    }
    EXPECT_EQ(read.GetSimInput("discount")->GetDistribution(0)->GetLabel(), "mean=0.1 stddev=0.02");

    // The two covariates carry their fitted correlation; the manual input joins with identity.
    EXPECT_EQ(read.GetCorrVarList(), (Names{"price", "units", "discount"}));
    ASSERT_EQ(read.GetCorrMatrix().size(), 3u);
    EXPECT_EQ(read.GetCorrMatrix()[1][0], results->GetCorrMatrix().GetElem(1, 0));
    EXPECT_NE(read.GetCorrMatrix()[1][0], 0.0);

    // The table's rows name the fitted categories, so aligning keeps them and every code is
    // found.
    EXPECT_EQ(read.GetCrstabsFactors(), (Names{"region", "channel"}));
    ASSERT_EQ(read.GetCrstabsMatrix().size(), 6u);
    EXPECT_EQ(read.GetCrstabsMatrix(), results->GetCrstabsMatrix());
    read.AdjustCategoricals(vars);
    EXPECT_EQ(read.GetCrstabsMatrix(), results->GetCrstabsMatrix());
    read.EncodeCatValues();
    ASSERT_EQ(read.GetCrstabsEncod().size(), 6u);
    for (const std::vector<int>& codes : read.GetCrstabsEncod()) {
        ASSERT_EQ(codes.size(), 2u);
        EXPECT_GE(codes[0], 0);
        EXPECT_GE(codes[1], 0);
    }

    // The same results as a fitting statistics document: one field per fitted field.
    std::string stats;
    ASSERT_TRUE(writer.WriteFittingOutStats(stats, results));
    MCXML_800::MCXMLReadWrite parser;
    ASSERT_TRUE(parser.ParseToDOM(stats));
    const xercesc::DOMElement* fields =
        MCXML_800::GetFirstChildElmt(parser.GetDocument()->getDocumentElement(), "SimulatedFields");
    int nFields = 0;
    for (const xercesc::DOMElement* field = MCXML_800::GetFirstChildElmt(fields, "SimulatedField");
         field != nullptr; field = MCXML_800::GetNextSiblingElmt(field, "SimulatedField")) {
        ++nFields;
    }
    EXPECT_EQ(nFields, 4);
}
