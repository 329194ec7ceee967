// The case sink: what reaches the file (header, labels, missing values, quoting, numbers that
// read back exactly), and that nothing is left behind when a run fails.
#include "hosttestfiles.h"

#include "data/csvreader.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"
#include "mctolerance.h"
#include "sinks/csvcasesink.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <sstream>

namespace {

using MCCommon_800::MCMV;
using MCHost::CsvCaseSink;
using MCHost::SinkColumn;

std::vector<std::vector<std::string>> ReadRows(const std::string& path) {
    std::istringstream in(hosttest::ReadFile(path));
    MCHost::CsvReader reader(in, path);
    std::vector<std::vector<std::string>> rows;
    std::vector<std::string> fields;
    while (reader.ReadRecord(fields)) {
        rows.push_back(fields);
    }
    return rows;
}

TEST(CsvCaseSink, WritesInputsTargetsLabelsAndMissingValues) {
    hosttest::TempDir dir;
    const std::string path = dir.File("cases.csv");
    CsvCaseSink sink(path,
                     {SinkColumn{"price", {}}, SinkColumn{"region, zone", {"north", "south"}}});
    sink.SetTargetLabels("band", {"thin", "wide \"x\""});
    sink.BeginData({"profit", "band"}, 0, 1);
    const double third = 1.0 / 3.0;
    sink.AddCase({25.5, 1}, {third, 1}, 0);
    sink.AddCase({MCMV::Missing(), 0}, {-1e-300, MCMV::Missing()}, 0);
    // Not yet in place: the rows sit in a temporary file.
    EXPECT_FALSE(std::filesystem::exists(path));
    ASSERT_TRUE(sink.Commit()) << sink.GetError();
    EXPECT_EQ(sink.GetNCases(), 2);
    EXPECT_EQ(dir.Count(), 1u);

    const auto rows = ReadRows(path);
    ASSERT_EQ(rows.size(), 3u);
    EXPECT_EQ(rows[0], (std::vector<std::string>{"price", "region, zone", "profit", "band"}));
    EXPECT_EQ(rows[1][1], "south");
    EXPECT_EQ(rows[1][3], "wide \"x\"");
    EXPECT_EQ(rows[2], (std::vector<std::string>{"", "north", rows[2][2], ""}));
    // Numbers read back to the very same double.
    double x = 0.0;
    ASSERT_TRUE(MCCommon_800::ParseDouble(rows[1][2], x));
    EXPECT_NEAR_REL(x, third, 0.0);
    ASSERT_TRUE(MCCommon_800::ParseDouble(rows[2][2], x));
    EXPECT_NEAR_REL(x, -1e-300, 0.0);
}

TEST(CsvCaseSink, AddsProbabilityAndIterationColumns) {
    hosttest::TempDir dir;
    const std::string path = dir.File("cases.csv");
    CsvCaseSink sink(path, {SinkColumn{"a", {}}});
    sink.BeginData({"pred"}, 2, 3);
    sink.BeginData({"ignored"}, 0, 1); // only the first call counts
    sink.AddCase({1}, {0, 0.25, 0.75}, 2);
    ASSERT_TRUE(sink.Commit()) << sink.GetError();
    const auto rows = ReadRows(path);
    ASSERT_EQ(rows.size(), 2u);
    EXPECT_EQ(rows[0], (std::vector<std::string>{"a", "pred", "probability_1", "probability_2",
                                                 "iteration"}));
    EXPECT_EQ(rows[1], (std::vector<std::string>{"1", "0", "0.25", "0.75", "2"}));
}

TEST(CsvCaseSink, LeavesNoFileWhenTheRunFails) {
    hosttest::TempDir dir;
    const std::string path = dir.File("cases.csv");
    {
        // A case of the wrong shape is a fault of the caller: the commit fails.
        CsvCaseSink sink(path, {SinkColumn{"a", {}}});
        sink.BeginData({"t"}, 0, 1);
        sink.AddCase({1}, {2}, 0);
        sink.AddCase({1, 2}, {3}, 0);
        EXPECT_FALSE(sink.Commit());
        EXPECT_NE(sink.GetError().find("case 2 has 2 inputs"), std::string::npos)
            << sink.GetError();
    }
    {
        // Nothing delivered at all.
        CsvCaseSink sink(path, {SinkColumn{"a", {}}});
        EXPECT_FALSE(sink.Commit());
    }
    {
        // Dropped without a commit (a cancelled run).
        CsvCaseSink sink(path, {SinkColumn{"a", {}}});
        sink.BeginData({"t"}, 0, 1);
        sink.AddCase({1}, {2}, 0);
    }
    EXPECT_EQ(dir.Count(), 0u);
}

TEST(CsvCaseSink, UnwritableFolderIsReported) {
    CsvCaseSink sink("/no/such/folder/cases.csv", {SinkColumn{"a", {}}});
    sink.BeginData({"t"}, 0, 1);
    sink.AddCase({1}, {2}, 0);
    EXPECT_FALSE(sink.Commit());
    EXPECT_EQ(sink.GetError().rfind("/no/such/folder/cases.csv: cannot create", 0), 0u)
        << sink.GetError();
}

} // namespace
