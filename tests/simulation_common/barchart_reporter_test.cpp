#include "simulation_common/mcspbarchartdata.h"
#include "simulation_common/secreporter.h"

#include "component/mcspassert.h"
#include "mccommon/mcmv.h"
#include "mctolerance.h"

#include <gtest/gtest.h>

#include <limits>

using namespace MCMCSP_800;

namespace {

struct CountCase {
    const char* name;
    double weight, value;
    bool accepted;
};

class BarChartUpdateTest : public ::testing::TestWithParam<CountCase> {};

TEST_P(BarChartUpdateTest, AcceptsOnlyPositionsAndPositiveWeights) {
    const CountCase& c = GetParam();
    MCBarChartData bars(3, false);
    ASSERT_TRUE(bars.UpdateData(1, 0));
    ClearLastAssertion();
    EXPECT_EQ(bars.UpdateData(c.weight, c.value), c.accepted);
    if (c.accepted) {
        EXPECT_EQ(GetLastAssertion(), "");
        EXPECT_EQ(bars.GetCategoryCounts()[static_cast<std::size_t>(c.value)],
                  c.value < 1 ? 1 + c.weight : c.weight);
        EXPECT_EQ(bars.GetTotalWeight(), 1 + c.weight);
    } else {
        EXPECT_NE(GetLastAssertion(), "");
        EXPECT_EQ(bars.GetCategoryCounts(), (std::vector<double>{1, 0, 0}));
        EXPECT_EQ(bars.GetTotalWeight(), 1.0);
    }
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Values, BarChartUpdateTest, ::testing::Values(
    CountCase{"TruncatedToLast", 1, 2.9, true}, CountCase{"FirstPosition", 2.5, 0, true},
    CountCase{"PastLast", 1, 3, false}, CountCase{"Negative", 1, -0.5, false},
    CountCase{"Missing", 1, MCCommon_800::MCMV::Missing(), false},
    CountCase{"ZeroWeight", 0, 1, false}, CountCase{"NegativeWeight", -2, 1, false},
    CountCase{"MissingWeight", MCCommon_800::MCMV::Missing(), 1, false}),
    [](const auto& p) { return std::string(p.param.name); });
// clang-format on

TEST(MCBarChartData, ProportionsAreDividedOnce) {
    MCBarChartData bars(3, true);
    ASSERT_TRUE(bars.UpdateData(1, 0));
    ASSERT_TRUE(bars.UpdateData(3, 2));
    const auto& record = bars.GenerateMCVariateData("colour", {"red", "green", "blue"});
    EXPECT_EQ(record.GetCount(), 4.0);
    ASSERT_EQ(record.fCoordinates.size(), 2u);
    EXPECT_EQ(record.fCoordinates[0].fKind, 2);
    EXPECT_EQ(record.fCoordinates[0].fLabel, "observed");
    EXPECT_EQ(record.fCoordinates[0].fVarName, "colour");
    EXPECT_EQ(record.fCoordinates[0].fCategories, (std::vector<std::string>{"red", "blue"}));
    EXPECT_EQ(record.fCoordinates[1].fKind, 1);
    EXPECT_EQ(record.fCoordinates[1].fLabel, "frequency");
    EXPECT_EQ(record.fCoordinates[1].fValues, (std::vector<double>{0.25, 0.75}));

    const auto& again = bars.GenerateMCVariateData("colour", {"red", "green", "blue"});
    EXPECT_EQ(&again, &record);
    EXPECT_EQ(again.fCoordinates[1].fValues, (std::vector<double>{0.25, 0.75}));
    EXPECT_EQ(bars.GetCategoryCounts(), (std::vector<double>{0.25, 0.0, 0.75}));
}

// Nothing counted: no 0 / 0, nothing charted.
TEST(MCBarChartData, EmptyProportionsStayZero) {
    MCBarChartData empty(2, true);
    const auto& record = empty.GenerateMCVariateData("v", {"a", "b"});
    EXPECT_EQ(empty.GetCategoryCounts(), (std::vector<double>{0.0, 0.0}));
    EXPECT_TRUE(record.fCoordinates[1].fValues.empty());
}

TEST(MCBarChartData, CallerErrorsStayDefined) {
    ClearLastAssertion();
    MCBarChartData none(0, false);
    EXPECT_EQ(GetLastAssertion(), "MCBarChartData constructor: nCats > 0");
    EXPECT_FALSE(none.UpdateData(1, 0));

    MCBarChartData bars(3, false);
    ASSERT_TRUE(bars.UpdateData(1, 2));
    const auto& record = bars.GenerateMCVariateData("v", {"a"}); // too few texts
    EXPECT_EQ(GetLastAssertion(), "MCBarChartData::GenerateMCVariateData: categs size OK");
    EXPECT_EQ(record.fCoordinates[0].fCategories, (std::vector<std::string>{""}));
    EXPECT_EQ(record.fCoordinates[1].fValues, (std::vector<double>{1.0}));
}

struct MeasureCase {
    const char* name;
    const char* measure;
    int expected;
};

class ReporterTest : public ::testing::TestWithParam<MeasureCase> {};

TEST_P(ReporterTest, AnswersByName) {
    SECReporter reporter;
    reporter.SetIterNum(3);
    reporter.SetRecordCount(500);
    const SECReporter copy(reporter);
    const MCCommon_800::ProgressReport& report = copy;
    EXPECT_EQ(report.DiscreteMeasure(GetParam().measure), GetParam().expected);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Measures, ReporterTest, ::testing::Values(
    MeasureCase{"Iteration", "iterNum", 3}, MeasureCase{"Records", "recordCount", 500},
    MeasureCase{"Unknown", "seed", -1}, MeasureCase{"CaseMatters", "RecordCount", -1}),
    [](const auto& p) { return std::string(p.param.name); });
// clang-format on

TEST(SECReporter, OffersNoScaleMeasure) {
    ClearLastAssertion();
    const SECReporter reporter;
    EXPECT_TRUE(MCCommon_800::MCMV::IsMissing(reporter.ScaleMeasure("iterNum")));
    EXPECT_NE(GetLastAssertion(), "");
    ClearLastAssertion();
    EXPECT_EQ(reporter.DiscreteMeasure(""), -1);
    EXPECT_EQ(GetLastAssertion(), "SECReporter::DiscreteMeasure: measureName is not empty");
}

} // namespace
