// Simulation results: the state of results never completed, deep copies that share only the
// borrowed objects (under AddressSanitizer: no double free or dangling implementation), and the
// listing.
#include "simulation_evaluation/secoutputstats.h"

#include "mccommon/display.h"
#include "mccommon/variables.h"
#include "simulation_common/spcsettings.h"
#include "simulation_evaluation/secsettings.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <memory>
#include <sstream>
#include <string>
#include <vector>

using namespace MCMCSP_800;
using MCCommon_800::MCMV;
using MCMath_800::MCProvMeans;
using ModelType = MCXML_800::IMCScoreComputer::PMMLModelType;

namespace {

struct Borrowed {
    SECSettings settings;
    SPCSettings plan;
    MCXML_800::MCVarList variables;
};

//! The lines of the listing of `results`.
std::vector<std::string> Listing(const SECOutputStats& results) {
    std::ostringstream os;
    results.Display(os);
    std::istringstream in(os.str());
    std::vector<std::string> lines;
    for (std::string l; std::getline(in, l);) {
        lines.push_back(l);
    }
    return lines;
}

//! Position of the first line equal to `line`, or -1.
int LineAt(const std::vector<std::string>& lines, const std::string& line) {
    for (std::size_t i = 0; i < lines.size(); ++i) {
        if (lines[i] == line) {
            return static_cast<int>(i);
        }
    }
    return -1;
}

//! A continuous target with a filled histogram and scatter plot.
SECContinuousTargetInfo FilledTarget(const std::string& name, double value) {
    SECContinuousTargetInfo target;
    target.fName = name;
    target.fMean = value;
    target.fHistogram = MCHistogramData(10, 0.0, 10.0, true);
    static_cast<void>(target.fHistogram.UpdateData(1.0, 1.0, value));
    target.fvScatterPlots.emplace_back(4, 4, 0.0, 0.0, 10.0, 10.0, true);
    static_cast<void>(target.fvScatterPlots.back().UpdateData(1.0, 1.0, value, value));
    static_cast<void>(target.fContStats.Update(value));
    target.fvPearsonCorrs = {0.5, -0.25};
    return target;
}

} // namespace

TEST(SECOutputStatsCopy, IsDeepAndSharesOnlyBorrowedObjects) {
    Borrowed b;
    MCProvMeans provMeans(3, true);
    auto original = std::make_unique<SECOutputStats>(b.settings, b.plan, b.variables);
    original->SetSimCaseCount(10);
    original->SetProvMeansPtr(&provMeans);
    original->SetCovariateNames({"x", "y"});
    original->GetContTargetInfo().push_back(FilledTarget("profit", 3.0));
    original->GetSimulCorr().SetIdentity(2);
    original->GetCrstSimProbs() = {0.25, 0.75};

    SECOutputStats copy(*original);
    SECOutputStats assigned(b.settings, b.plan, b.variables);
    // Results never completed.
    EXPECT_TRUE(assigned.GetStopCriteria());
    EXPECT_EQ(assigned.GetModelType(), MCXML_800::IMCScoreComputer::kOther);
    EXPECT_EQ(assigned.GetModelType(), 17);
    EXPECT_EQ((std::vector<int>{assigned.GetSimCaseCount(), assigned.GetFilteredCaseCount(),
                                assigned.GetValidCaseCount(), assigned.GetInvalidCaseCount()}),
              std::vector<int>(4, 0));
    EXPECT_EQ(assigned.GetProvMeansPtr(), nullptr);
    EXPECT_TRUE(assigned.GetStatus().IsOK());
    EXPECT_TRUE(assigned.GetStatComputeWarnings().empty() && assigned.GetCrstSimProbs().empty());
    EXPECT_EQ(assigned.GetSimulCorr().GetNRows(), 0);
    EXPECT_TRUE(assigned.GetContTargetInfo().empty() && assigned.GetCateTargetInfo().empty());
    assigned = *original;

    // Change the original, then destroy it: the copies keep their own state.
    original->SetSimCaseCount(99);
    original->SetCovariateNames({});
    SECContinuousTargetInfo& target = original->GetContTargetInfo()[0];
    static_cast<void>(target.fHistogram.UpdateData(1.0, 1.0, 7.0));
    static_cast<void>(target.fvScatterPlots[0].UpdateData(1.0, 1.0, 7.0, 7.0));
    target.fvPearsonCorrs.clear();
    original->GetSimulCorr().SetElem(0, 1, 0.9);
    original->GetCrstSimProbs().clear();
    original.reset();

    for (const SECOutputStats* s : {&copy, &assigned}) {
        EXPECT_EQ(s->GetSimCaseCount(), 10);
        EXPECT_EQ(s->GetCovariateNames(), (std::vector<std::string>{"x", "y"}));
        ASSERT_EQ(s->GetContTargetInfo().size(), 1u);
        const SECContinuousTargetInfo& t = s->GetContTargetInfo()[0];
        EXPECT_NEAR_REL(t.fHistogram.GetTotalWeight(), 1.0, 0.0);
        EXPECT_EQ(t.fvPearsonCorrs.size(), 2u);
        EXPECT_EQ(s->GetSimulCorr().GetElem(0, 1), 0.0);
        EXPECT_EQ(s->GetCrstSimProbs().size(), 2u);
        // The borrowed objects are the same for all copies.
        EXPECT_EQ(s->GetProvMeansPtr(), &provMeans);
        EXPECT_EQ(s->GetSECSettings(), &b.settings);
        EXPECT_EQ(s->GetSPCSettings(), &b.plan);
        EXPECT_EQ(s->GetMCVarList(), &b.variables);
    }

    // The copies are independent of each other too; self-assignment keeps the state.
    copy.SetStopCriteria(false);
    EXPECT_TRUE(assigned.GetStopCriteria());
    SECOutputStats& same = assigned;
    assigned = same;
    EXPECT_EQ(assigned.GetSimCaseCount(), 10);
    EXPECT_EQ(assigned.GetContTargetInfo().size(), 1u);
}

TEST(SECOutputStatsDisplay, SectionsInOrderAroundEachTarget) {
    Borrowed b;
    SECOutputStats results(b.settings, b.plan, b.variables);
    results.SetSimCaseCount(12);
    results.SetModelType(MCXML_800::IMCScoreComputer::kTransformsOnly);
    results.GetContTargetInfo().push_back(FilledTarget("profit", 3.0));
    SECCategoricalTargetInfo category;
    category.fName = "risk";
    category.fvCategoryValues = {0.0, 1.0};
    results.GetCateTargetInfo().push_back(category);

    std::ostringstream outer;
    MCDisplay_800::ScopedOutStream redirect(outer);
    const std::vector<std::string> lines = Listing(results);
    EXPECT_TRUE(outer.str().empty());

    const std::vector<std::string> order = {
        "SECOutputStats display start",
        "Simulated case count: 12",
        "Start of display output information for all continuous target",
        "The count of simulated cases 12",
        "The model type TransformsOnly",
        "Start display for continuous target variable: profit",
        "Target mean value: 3",
        "Pearson correlations: 0.5 -0.25",
        "End display for continuous target variable: profit",
        "End of display output information for all continuous target",
        "Start of display output information for all categorical target",
        "Start display for categorical target variable: risk",
        "Target category values: 0 1",
        "Case counts for clasters:",
        "End display for categorical target variable: risk",
        "End of display output information for all categorical target",
        "SECOutputStats display end",
    };
    int previous = -1;
    for (const std::string& line : order) {
        const int at = LineAt(lines, line);
        EXPECT_GT(at, previous) << line;
        previous = at;
    }
    EXPECT_EQ(lines.back(), "SECOutputStats display end");
}

struct ModelWordCase {
    int type;
    const char* word;
};

class SECOutputStatsModelWord : public ::testing::TestWithParam<ModelWordCase> {};

TEST_P(SECOutputStatsModelWord, ListsTheModelTypeWord) {
    Borrowed b;
    SECOutputStats results(b.settings, b.plan, b.variables);
    results.SetModelType(static_cast<ModelType>(GetParam().type));
    EXPECT_GE(LineAt(Listing(results), std::string("The model type ") + GetParam().word), 0);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Words, SECOutputStatsModelWord, ::testing::Values(
    ModelWordCase{0, "Association"}, ModelWordCase{6, "Regression"}, ModelWordCase{11, "Tree"},
    ModelWordCase{17, "Other"}, ModelWordCase{18, "unrecognized"},
    ModelWordCase{31, "unrecognized"}));
// clang-format on
