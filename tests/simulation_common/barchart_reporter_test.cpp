#include "simulation_common/mcspbarchartdata.h"
#include "simulation_common/secreporter.h"

#include "component/mcspassert.h"
#include "mccommon/mcmv.h"

#include <gtest/gtest.h>

#include <limits>

using namespace MCMCSP_800;

namespace {

struct CountCase {
    double weight, value;
    bool accepted;
};

class BarChartUpdateTest : public ::testing::TestWithParam<CountCase> {};

// A value is the position of its category, truncated; a refused one asserts and changes nothing.
TEST_P(BarChartUpdateTest, AcceptsOnlyPositionsAndPositiveWeights) {
    const CountCase& c = GetParam();
    MCBarChartData bars(3, false);
    ASSERT_TRUE(bars.UpdateData(1, 0));
    ClearLastAssertion();
    EXPECT_EQ(bars.UpdateData(c.weight, c.value), c.accepted) << c.weight << ", " << c.value;
    EXPECT_EQ(GetLastAssertion().empty(), c.accepted);
    std::vector<double> expected{1, 0, 0};
    if (c.accepted) {
        expected[static_cast<std::size_t>(c.value)] += c.weight;
    }
    EXPECT_EQ(bars.GetCategoryCounts(), expected);
    EXPECT_EQ(bars.GetTotalWeight(), c.accepted ? 1 + c.weight : 1.0);
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Values, BarChartUpdateTest, ::testing::Values(
    CountCase{1, 2.9, true}, CountCase{2.5, 0, true}, CountCase{1, 3, false},
    CountCase{1, -0.5, false}, CountCase{1, MCCommon_800::MCMV::Missing(), false},
    CountCase{0, 1, false}, CountCase{-2, 1, false},
    CountCase{MCCommon_800::MCMV::Missing(), 1, false}));
// clang-format on

// Proportions are divided once, however often the record is asked for; empty categories are not
// charted, and nothing counted gives no 0 / 0.
TEST(MCBarChartData, ProportionsAreDividedOnce) {
    MCBarChartData bars(3, true);
    ASSERT_TRUE(bars.UpdateData(1, 0) && bars.UpdateData(3, 2));
    for (int call = 0; call < 2; ++call) {
        const auto& record = bars.GenerateMCVariateData("colour", {"red", "green", "blue"});
        EXPECT_EQ(record.GetCount(), 4.0);
        ASSERT_EQ(record.fCoordinates.size(), 2u);
        EXPECT_EQ(record.fCoordinates[0].fCategories, (std::vector<std::string>{"red", "blue"}));
        EXPECT_EQ(record.fCoordinates[1].fValues, (std::vector<double>{0.25, 0.75}));
    }
    EXPECT_EQ(bars.GetCategoryCounts(), (std::vector<double>{0.25, 0.0, 0.75}));

    MCBarChartData empty(2, true);
    EXPECT_TRUE(empty.GenerateMCVariateData("v", {"a", "b"}).fCoordinates[1].fValues.empty());
    EXPECT_EQ(empty.GetCategoryCounts(), (std::vector<double>{0.0, 0.0}));
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

// Measures are found by their exact names; an empty name asserts; there is no scale measure.
TEST(SECReporter, AnswersDiscreteMeasuresByExactName) {
    SECReporter reporter;
    reporter.SetIterNum(3);
    reporter.SetRecordCount(500);
    const SECReporter copy(reporter);
    const MCCommon_800::ProgressReport& report = copy;
    EXPECT_EQ(report.DiscreteMeasure("iterNum"), 3);
    EXPECT_EQ(report.DiscreteMeasure("recordCount"), 500);
    EXPECT_EQ(report.DiscreteMeasure("RecordCount"), -1);
    ClearLastAssertion();
    EXPECT_EQ(report.DiscreteMeasure(""), -1);
    EXPECT_EQ(GetLastAssertion(), "SECReporter::DiscreteMeasure: measureName is not empty");
    ClearLastAssertion();
    EXPECT_TRUE(MCCommon_800::MCMV::IsMissing(report.ScaleMeasure("iterNum")));
    EXPECT_NE(GetLastAssertion(), "");
}

} // namespace
