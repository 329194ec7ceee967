// The data dictionary and the record iterator over CSV files: measurement levels inferred and
// overridden, categories coded through the encoders, passes that repeat, and the messages for
// files that do not fit.
#include "hosttestfiles.h"

#include "common/hosterror.h"
#include "data/csvreader.h"
#include "data/csvrecorditer.h"
#include "data/datadictionary.h"
#include "mccommon/mcmv.h"
#include "mctolerance.h"
#include "simulation_common/mcspconst.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace {

using MCCommon_800::MCMV;
using MCHost::CsvRecordIter;
using MCHost::DataDictionary;
using MCHost::DataOptions;
using MCHost::HostError;
using namespace MCSPConst;

//! The message of the HostError that `f` throws, or "" when it throws none.
template <class F> std::string ErrorOf(F f) {
    try {
        f();
    } catch (const HostError& e) {
        return e.what();
    }
    return std::string();
}

//! The bits of `x`: what "the same value" means for records served two ways (a missing value,
//! -0 and 0 told apart).
std::uint64_t Bits(double x) {
    std::uint64_t bits = 0;
    std::memcpy(&bits, &x, sizeof bits);
    return bits;
}

//! Every record of one pass.
std::vector<std::vector<double>> ReadPass(CsvRecordIter& it) {
    std::vector<std::vector<double>> rows;
    while (it.HasMore()) {
        const MCXML_800::Record* r = it.NextRecord();
        if (!r) {
            break;
        }
        rows.push_back(r->GetAll());
    }
    return rows;
}

// ------------------------------------------------------------------------------------------
// Level inference: one column per case, the level and categories it must get.

struct LevelCase {
    const char* name;
    std::vector<std::string> cells; //!< the column's cells, one per row
    MeasureLevel level;
    std::vector<std::string> texts; //!< expected text categories
    std::vector<double> numbers;    //!< expected numeric categories
    int missing;                    //!< expected missing cells
};

class LevelInference : public ::testing::TestWithParam<LevelCase> {};

TEST_P(LevelInference, InfersLevelAndCategories) {
    const LevelCase& c = GetParam();
    hosttest::TempDir dir;
    // A second column keeps an empty cell from being an empty line; only x is used.
    std::string text = "x,row\n";
    for (std::size_t i = 0; i < c.cells.size(); ++i) {
        text += c.cells[i] + "," + std::to_string(i) + "\n";
    }
    DataOptions options;
    options.fvFields = {"x"};
    options.fMaxOrdinalValues = 4;
    const DataDictionary dict = DataDictionary::Build(dir.Write("d.csv", text), options);
    ASSERT_EQ(dict.GetFields().size(), 1u);
    const MCHost::DataField& f = dict.GetFields()[0];
    EXPECT_EQ(f.fLevel, c.level);
    EXPECT_EQ(f.fvTexts, c.texts);
    EXPECT_EQ(f.fvNumbers, c.numbers);
    EXPECT_EQ(f.fNMissing, c.missing);
    // The component reads the same level off the variable the dictionary made.
    EXPECT_EQ(MCMCSP_800::GetMCSPMeasureLevel(dict.GetVarList().GetVarAt(0)), c.level);
}

INSTANTIATE_TEST_SUITE_P(
    Columns, LevelInference,
    ::testing::Values(
        LevelCase{"Text",
                  {"west", "east", "west", "north"},
                  kLevelCategorical,
                  {"east", "north", "west"},
                  {},
                  0},
        LevelCase{"FewWholeNumbers", {"3", "1", "2", "3", "1"}, kLevelOrdinal, {}, {1, 2, 3}, 0},
        LevelCase{"WholeInOtherSpellings",
                  {"1e2", "200", "+100", " 200 "},
                  kLevelOrdinal,
                  {},
                  {100, 200},
                  0},
        LevelCase{"NegativeWholeNumbers", {"-1", "0", "1"}, kLevelOrdinal, {}, {-1, 0, 1}, 0},
        LevelCase{"Decimals", {"1.5", "2", "2"}, kLevelContinuous, {}, {}, 0},
        LevelCase{"TooManyWholeValues", {"1", "2", "3", "4", "5"}, kLevelContinuous, {}, {}, 0},
        LevelCase{
            "NumbersAndText", {"1", "2", "many"}, kLevelCategorical, {"1", "2", "many"}, {}, 0},
        LevelCase{
            "MissingMarkers", {"NA", ".", "", "  ", "nan", "2", "4"}, kLevelOrdinal, {}, {2, 4}, 5},
        LevelCase{"OnlyMissing", {"NA", "."}, kLevelContinuous, {}, {}, 2},
        LevelCase{
            "QuotedText", {"\"a, b\"", "\"a, b\"", "c"}, kLevelCategorical, {"a, b", "c"}, {}, 0}),
    [](const auto& p) { return std::string(p.param.name); });

// ------------------------------------------------------------------------------------------
// Overrides, coding and passes.

const char* const kSales = "region,units,price,grade\n"
                           "west,3,2.5,1\n"
                           "east,1,NA,2\n"
                           "\"north\",2,4.25,1\n"
                           "west,3,.,3\n";

TEST(DataDictionary, OverridesReplaceInferredLevels) {
    hosttest::TempDir dir;
    DataOptions options;
    options.fLevels = {{"units", kLevelContinuous}, {"grade", kLevelCategorical}};
    const DataDictionary dict = DataDictionary::Build(dir.Write("s.csv", kSales), options);
    EXPECT_EQ(dict.GetFields()[1].fLevel, kLevelContinuous);
    EXPECT_FALSE(dict.GetFields()[1].fbInferred);
    EXPECT_EQ(dict.GetFields()[3].fLevel, kLevelCategorical);
    EXPECT_EQ(dict.GetFields()[3].fvNumbers, (std::vector<double>{1, 2, 3}));
    EXPECT_EQ(dict.GetFields()[2].fLevel, kLevelContinuous);
    EXPECT_TRUE(dict.GetFields()[2].fbInferred);
}

TEST(DataDictionary, RecordsCarryCodesForCategoriesAndNumbersOtherwise) {
    hosttest::TempDir dir;
    DataOptions options;
    options.fLevels = {{"grade", kLevelCategorical}};
    const std::string path = dir.Write("s.csv", kSales);
    const DataDictionary dict = DataDictionary::Build(path, options);
    CsvRecordIter it(dict);
    const auto rows = ReadPass(it);
    ASSERT_EQ(rows.size(), 4u);
    // region: east 0, north 1, west 2; units ordinal carries its numbers; grade coded 0..2.
    const std::vector<std::vector<double>> expected = {
        {2, 3, 2.5, 0}, {0, 1, MCMV::Missing(), 1}, {1, 2, 4.25, 0}, {2, 3, MCMV::Missing(), 2}};
    for (std::size_t r = 0; r < rows.size(); ++r) {
        ASSERT_EQ(rows[r].size(), 4u);
        for (std::size_t c = 0; c < 4; ++c) {
            EXPECT_NEAR_REL(rows[r][c], expected[r][c], 0.0) << "row " << r << " col " << c;
        }
    }
    // The encoders turn each code back into the cell it came from.
    const MCXML_800::MCCatNumEncoder* region = dict.GetVarList().GetVarAt(0)->GetCategorical();
    ASSERT_NE(region, nullptr);
    const char* cells[] = {"west", "east", "north", "west"};
    for (std::size_t r = 0; r < rows.size(); ++r) {
        EXPECT_EQ(region->GetCategoryText(static_cast<int>(rows[r][0])), cells[r]);
    }
    const MCXML_800::MCCatNumEncoder* grade = dict.GetVarList().GetVarAt(3)->GetCategorical();
    ASSERT_NE(grade, nullptr);
    EXPECT_EQ(grade->GetCategoryText(2), "3");
    EXPECT_EQ(dict.GetVarList().GetVarAt(0)->GetStorage(), MCXML_800::IMCVariable::kStringStorage);
    EXPECT_EQ(dict.GetVarList().GetVarAt(3)->GetStorage(), MCXML_800::IMCVariable::kNumericStorage);
}

TEST(DataDictionary, PassesRepeatTheSameRecords) {
    hosttest::TempDir dir;
    const DataDictionary dict = DataDictionary::Build(dir.Write("s.csv", kSales), DataOptions());
    CsvRecordIter it(dict);
    const auto first = ReadPass(it);
    EXPECT_FALSE(it.HasMore());
    ASSERT_EQ(it.Restart(), 0);
    const auto second = ReadPass(it);
    ASSERT_EQ(it.Restart(), 0);
    const auto third = ReadPass(it);
    EXPECT_EQ(it.GetPassCount(), 3);
    ASSERT_EQ(first.size(), 4u);
    for (const auto* pass : {&second, &third}) {
        ASSERT_EQ(pass->size(), first.size());
        for (std::size_t r = 0; r < first.size(); ++r) {
            for (std::size_t c = 0; c < first[r].size(); ++c) {
                EXPECT_NEAR_REL((*pass)[r][c], first[r][c], 0.0);
            }
        }
    }
    EXPECT_TRUE(it.GetError().empty());
}

TEST(DataDictionary, UsesOnlyTheChosenFieldsInFileOrder) {
    hosttest::TempDir dir;
    DataOptions options;
    options.fvFields = {"grade", "region"};
    const DataDictionary dict = DataDictionary::Build(dir.Write("s.csv", kSales), options);
    ASSERT_EQ(dict.GetVarList().Size(), 2);
    EXPECT_EQ(dict.GetVarList().GetVarAt(0)->GetName(), "region");
    EXPECT_EQ(dict.GetVarList().GetVarAt(1)->GetName(), "grade");
    CsvRecordIter it(dict);
    const auto rows = ReadPass(it);
    ASSERT_EQ(rows.size(), 4u);
    EXPECT_EQ(rows[3], (std::vector<double>{2, 3}));
}

TEST(DataDictionary, ReadsCrlfFilesWithByteOrderMark) {
    hosttest::TempDir dir;
    const DataDictionary dict =
        DataDictionary::Build(dir.Write("b.csv", "\xEF\xBB\xBF"
                                                 "name,v\r\n\"a\r\nb\",1.5\r\nc,2.5\r\n"),
                              DataOptions());
    EXPECT_EQ(dict.GetFields()[0].fName, "name");
    EXPECT_EQ(dict.GetFields()[0].fvTexts, (std::vector<std::string>{"a\r\nb", "c"}));
    CsvRecordIter it(dict);
    const auto rows = ReadPass(it);
    ASSERT_EQ(rows.size(), 2u);
    EXPECT_EQ(rows[1], (std::vector<double>{1, 2.5}));
}

TEST(DataDictionary, HeaderOnlyFileHasNoRows) {
    hosttest::TempDir dir;
    const DataDictionary dict = DataDictionary::Build(dir.Write("h.csv", "a,b\n"), DataOptions());
    EXPECT_EQ(dict.GetNRows(), 0);
    CsvRecordIter it(dict);
    EXPECT_FALSE(it.HasMore());
}

// ------------------------------------------------------------------------------------------
// The values kept from the first reading: passes served from them must hand out exactly the
// records that reading the file again gives.

//! Not a value: where a row's expected value is missing.
const double kNA = MCMV::Missing();

struct CacheCase {
    const char* name;
    std::string text;
    DataOptions options;
    std::vector<std::vector<double>> rows; //!< the records expected
};

//! Options for one case: the fields used, the level overrides, tight category caps.
DataOptions Options(std::vector<std::string> fields, std::map<std::string, MeasureLevel> levels,
                    int maxCategories = 1000, int maxOrdinal = 20) {
    DataOptions options;
    options.fvFields = std::move(fields);
    options.fLevels = std::move(levels);
    options.fMaxCategories = maxCategories;
    options.fMaxOrdinalValues = maxOrdinal;
    return options;
}

//! The records of three passes over `dict`, and the iterator's error after them.
std::vector<std::vector<std::vector<double>>> ReadThreePasses(const DataDictionary& dict,
                                                              std::string& error) {
    CsvRecordIter it(dict);
    std::vector<std::vector<std::vector<double>>> passes;
    for (int pass = 0; pass < 3; ++pass) {
        if (pass > 0) {
            EXPECT_EQ(it.Restart(), 0);
        }
        passes.push_back(ReadPass(it));
        EXPECT_EQ(it.GetRecordsRead(), static_cast<std::int64_t>(passes.back().size()));
    }
    EXPECT_EQ(it.GetPassCount(), 3);
    error = it.GetError();
    return passes;
}

class CachedPasses : public ::testing::TestWithParam<CacheCase> {};

TEST_P(CachedPasses, HandOutWhatReadingTheFileAgainGives) {
    const CacheCase& c = GetParam();
    hosttest::TempDir dir;
    const std::string path = dir.Write("d.csv", c.text);
    DataOptions kept = c.options;
    DataOptions reread = c.options;
    reread.fMaxCacheBytes = 0;
    const DataDictionary withCache = DataDictionary::Build(path, kept);
    const DataDictionary withoutCache = DataDictionary::Build(path, reread);
    EXPECT_TRUE(withCache.HasCache());
    EXPECT_FALSE(withoutCache.HasCache());

    std::string cacheError;
    std::string fileError;
    const auto fromCache = ReadThreePasses(withCache, cacheError);
    const auto fromFile = ReadThreePasses(withoutCache, fileError);
    EXPECT_EQ(cacheError, "");
    EXPECT_EQ(fileError, "");
    ASSERT_EQ(fromCache.size(), fromFile.size());
    for (std::size_t pass = 0; pass < fromCache.size(); ++pass) {
        ASSERT_EQ(fromCache[pass].size(), c.rows.size()) << "pass " << pass;
        ASSERT_EQ(fromFile[pass].size(), c.rows.size()) << "pass " << pass;
        for (std::size_t r = 0; r < c.rows.size(); ++r) {
            ASSERT_EQ(fromCache[pass][r].size(), c.rows[r].size());
            ASSERT_EQ(fromFile[pass][r].size(), c.rows[r].size());
            for (std::size_t k = 0; k < c.rows[r].size(); ++k) {
                EXPECT_EQ(Bits(fromCache[pass][r][k]), Bits(fromFile[pass][r][k]))
                    << "pass " << pass << " row " << r << " field " << k;
                EXPECT_NEAR_REL(fromFile[pass][r][k], c.rows[r][k], 0.0)
                    << "pass " << pass << " row " << r << " field " << k;
            }
        }
    }
}

INSTANTIATE_TEST_SUITE_P(
    AwkwardFiles, CachedPasses,
    ::testing::Values(
        // Codes follow the byte order of the texts: B 0, a 1, b 2.
        CacheCase{"TextCategories",
                  "k,v\nb,1.5\nB,2.5\na,3.5\nb,4.5\n",
                  DataOptions(),
                  {{2, 1.5}, {0, 2.5}, {1, 3.5}, {2, 4.5}}},
        // Numbers read as categories: every spelling of 1 is the code of 1.
        CacheCase{"NumbersAsCategoriesUnderAnOverride",
                  "g,w\n3,1\n1,2\n 1.0,3\n1e0,4\n2,5\n",
                  Options({}, {{"g", kLevelCategorical}}),
                  {{2, 1}, {0, 2}, {0, 3}, {0, 4}, {1, 5}}},
        CacheCase{
            "OrdinalCarriesItsNumbers", "n\n4\n-2\n4\n+0\n", DataOptions(), {{4}, {-2}, {4}, {0}}},
        // -0 and 0 are one category, yet an ordinal record carries the number as written.
        CacheCase{"SignedZero", "z\n-0\n0\n1\n", DataOptions(), {{-0.0}, {0}, {1}}},
        CacheCase{"MissingCells",
                  "t,x\nNA,1\nq, .\n,NaN\n.,2.25\n\" NA \",inf\np,-INF\n",
                  DataOptions(),
                  {{kNA, 1}, {1, kNA}, {kNA, kNA}, {kNA, 2.25}, {kNA, kNA}, {0, kNA}}},
        // Numbers until the last row: the texts sorted as bytes give the codes.
        CacheCase{"TurnsToTextOnItsLastRow",
                  "m,x\n10,1\n9,2\n2.0,3\n10,4\nx,5\n",
                  DataOptions(),
                  {{0, 1}, {2, 2}, {1, 3}, {0, 4}, {3, 5}}},
        CacheCase{"CrlfAndByteOrderMark",
                  "\xEF\xBB\xBFk,v\r\nx,1\r\ny,2\r\n\r\nx,3\r\n",
                  DataOptions(),
                  {{0, 1}, {1, 2}, {0, 3}}},
        CacheCase{"QuotedDelimitersAndLineEnds",
                  "k,v\n\"a,b\",\"1\"\n\"say \"\"x\"\"\",2\n\"two\nlines\",3\n\"a,b\",4\n",
                  DataOptions(),
                  {{0, 1}, {1, 2}, {2, 3}, {0, 4}}},
        // Only the chosen fields are kept; the text column left out is never a category.
        CacheCase{"UnusedColumnsLeftOut",
                  "a,skip,b\n1.5,x,u\n2.5,y,v\n",
                  Options({"b", "a"}, {}),
                  {{1.5, 0}, {2.5, 1}}},
        // Past the cap of distinct texts (4 here) the rows are kept as numbers: a continuous
        // column, and a categorical one whose 3 numbers are spelled 6 ways.
        CacheCase{
            "MoreDistinctTextsThanTheCap",
            "c,g\n0.5,1\n1.5,1.0\nNA,2\n2.5,2.0\n3.5,3\n4.5,3.0\n0.5,\n5.5,1\n",
            Options({}, {{"g", kLevelCategorical}}, 3, 2),
            {{0.5, 0}, {1.5, 0}, {kNA, 1}, {2.5, 1}, {3.5, 2}, {4.5, 2}, {0.5, kNA}, {5.5, 0}}},
        CacheCase{"Semicolons",
                  "a;b\n1,5;x\n2,5;y\n",
                  [] {
                      DataOptions options;
                      options.fDelimiter = ';';
                      return options;
                  }(),
                  {{0, 0}, {1, 1}}}),
    [](const auto& p) { return std::string(p.param.name); });

TEST(CachedPasses, ABudgetSmallerThanTheDataDropsTheCacheAndStillReadsRight) {
    hosttest::TempDir dir;
    // 20,000 rows of a number, an ordinal and a text field: about 320 kB to keep, far beyond
    // 64 kB; a budget of one byte holds not even the first row.
    std::string text = "x,n,t\n";
    constexpr int kRows = 20000;
    for (int i = 0; i < kRows; ++i) {
        text += std::to_string(i) + ".25," + std::to_string(i % 5) + "," +
                (i % 3 == 0 ? "u" : "w") + "\n";
    }
    const std::string path = dir.Write("big.csv", text);
    for (const std::uint64_t budget : {std::uint64_t{64} << 10, std::uint64_t{1}}) {
        DataOptions options;
        options.fMaxCacheBytes = budget;
        const DataDictionary dict = DataDictionary::Build(path, options);
        EXPECT_FALSE(dict.HasCache()) << budget;
        CsvRecordIter it(dict);
        for (int pass = 0; pass < 2; ++pass) {
            if (pass > 0) {
                ASSERT_EQ(it.Restart(), 0);
            }
            const auto rows = ReadPass(it);
            ASSERT_EQ(rows.size(), static_cast<std::size_t>(kRows));
            for (int i = 0; i < kRows; i += 997) {
                const auto& r = rows[static_cast<std::size_t>(i)];
                EXPECT_EQ(r, (std::vector<double>{i + 0.25, static_cast<double>(i % 5),
                                                  i % 3 == 0 ? 0.0 : 1.0}))
                    << "row " << i;
            }
        }
        EXPECT_EQ(it.GetError(), "");
    }
    // A budget that holds it all keeps it.
    DataOptions roomy;
    roomy.fMaxCacheBytes = std::uint64_t{4} << 20;
    EXPECT_TRUE(DataDictionary::Build(path, roomy).HasCache());
}

TEST(CachedPasses, DoNotReadTheFileAgain) {
    hosttest::TempDir dir;
    const std::string path = dir.Write("gone.csv", kSales);
    const DataDictionary dict = DataDictionary::Build(path, DataOptions());
    ASSERT_TRUE(dict.HasCache());
    std::filesystem::remove(path);
    std::string error;
    const auto passes = ReadThreePasses(dict, error);
    EXPECT_EQ(error, "");
    for (const auto& pass : passes) {
        ASSERT_EQ(pass.size(), 4u);
        EXPECT_EQ(Bits(pass[3][2]), Bits(MCMV::Missing()));
        EXPECT_EQ(pass[3][0], 2.0);
    }
}

// ------------------------------------------------------------------------------------------
// Files that do not fit: each message names the file and, where there is one, the line.

struct BadFileCase {
    const char* name;
    std::string text;
    std::vector<std::string> fields;            //!< fields to use
    std::map<std::string, MeasureLevel> levels; //!< overrides
    const char* where;                          //!< the message's start after the folder
    const char* what;                           //!< words it must contain
};

class BadFiles : public ::testing::TestWithParam<BadFileCase> {};

TEST_P(BadFiles, NameFileAndLine) {
    const BadFileCase& c = GetParam();
    hosttest::TempDir dir;
    const std::string path = dir.Write("bad.csv", c.text);
    DataOptions options;
    options.fvFields = c.fields;
    options.fLevels = c.levels;
    options.fMaxCategories = 3;
    const std::string message =
        ErrorOf([&] { static_cast<void>(DataDictionary::Build(path, options)); });
    ASSERT_FALSE(message.empty());
    EXPECT_EQ(message.rfind(path + c.where, 0), 0u) << message;
    EXPECT_NE(message.find(c.what), std::string::npos) << message;
}

INSTANTIATE_TEST_SUITE_P(
    Files, BadFiles,
    ::testing::Values(
        BadFileCase{"TooFewFields",
                    "a,b,c\n1,2,3\n4,5\n",
                    {},
                    {},
                    ":3:",
                    "the row has 2 fields, the header has 3"},
        BadFileCase{"TooManyFields",
                    "a,b\n1,2\n3,4,5\n",
                    {},
                    {},
                    ":3:",
                    "the row has 3 fields, the header has 2"},
        BadFileCase{"UnterminatedQuote", "a,b\n1,\"2\n3,4\n", {}, {}, ":2:", "not closed"},
        BadFileCase{"EmptyFile", "", {}, {}, ": ", "header row"},
        BadFileCase{"UnnamedColumn", "a,,c\n1,2,3\n", {}, {}, ":1:", "column 2"},
        BadFileCase{"RepeatedName", "a,b,a\n1,2,3\n", {}, {}, ":1:", "columns 1 and 3"},
        BadFileCase{"UnknownField", "a,b\n1,2\n", {"a", "z"}, {}, ": ", "unknown field 'z'"},
        BadFileCase{"UnknownLevelField",
                    "a,b\n1,2\n",
                    {},
                    {{"q", kLevelOrdinal}},
                    ": ",
                    "unknown field 'q'"},
        BadFileCase{"TextCannotBeContinuous",
                    "a,b\n1,x\n2,y\n",
                    {},
                    {{"b", kLevelContinuous}},
                    ":2:",
                    "'b' holds text"},
        BadFileCase{"TooManyCategories", "a\nw\nx\ny\nz\n", {}, {}, ": ", "more than 3"}),
    [](const auto& p) { return std::string(p.param.name); });

TEST(DataDictionary, MissingFileIsNamed) {
    const std::string message = ErrorOf(
        [] { static_cast<void>(DataDictionary::Build("/no/such/file.csv", DataOptions())); });
    EXPECT_EQ(message.rfind("/no/such/file.csv: cannot open", 0), 0u) << message;
}

TEST(CsvRecordIter, FileChangedBetweenPassesEndsThePassWithAMessage) {
    hosttest::TempDir dir;
    const std::string path = dir.Write("c.csv", "k,v\na,1\nb,2\n");
    // Without the kept values, so that each pass reads the file.
    DataOptions options;
    options.fMaxCacheBytes = 0;
    const DataDictionary dict = DataDictionary::Build(path, options);
    CsvRecordIter it(dict);
    EXPECT_EQ(ReadPass(it).size(), 2u);
    dir.Write("c.csv", "k,v\na,1\nzz,2\nb\n");
    ASSERT_EQ(it.Restart(), 0);
    ASSERT_TRUE(it.HasMore());
    EXPECT_NE(it.NextRecord(), nullptr);
    // The unknown category: the component sees a record it cannot fetch.
    ASSERT_TRUE(it.HasMore());
    EXPECT_EQ(it.NextRecord(), nullptr);
    EXPECT_EQ(it.GetError().rfind(path + ":3:", 0), 0u) << it.GetError();
    EXPECT_NE(it.GetError().find("'zz'"), std::string::npos);
    // A new pass starts clean and stops at the first bad row again.
    ASSERT_EQ(it.Restart(), 0);
    EXPECT_TRUE(it.GetError().empty());
    EXPECT_EQ(ReadPass(it).size(), 1u);
    EXPECT_FALSE(it.GetError().empty());
}

TEST(CsvRecordIter, ReportsProgressOncePerPassAtLeast) {
    hosttest::TempDir dir;
    std::string text = "v\n";
    for (int i = 0; i < 10000; ++i) {
        text += std::to_string(i % 7) + ".5\n";
    }
    const std::string path = dir.Write("p.csv", text);
    // Passes served from the kept values report the rows' share of the file, as reading
    // the file reports its bytes.
    for (const std::uint64_t budget : {DataOptions().fMaxCacheBytes, std::uint64_t{0}}) {
        DataOptions options;
        options.fMaxCacheBytes = budget;
        const DataDictionary dict = DataDictionary::Build(path, options);
        ASSERT_EQ(dict.HasCache(), budget > 0);
        CsvRecordIter it(dict);
        std::vector<std::pair<int, std::uint64_t>> reports;
        it.SetProgress([&](int pass, std::uint64_t done, std::uint64_t total) {
            EXPECT_EQ(total, text.size());
            reports.emplace_back(pass, done);
        });
        EXPECT_EQ(ReadPass(it).size(), 10000u);
        ASSERT_EQ(it.Restart(), 0);
        EXPECT_EQ(ReadPass(it).size(), 10000u);
        ASSERT_GE(reports.size(), 4u) << budget;
        EXPECT_EQ(reports.back(), (std::pair<int, std::uint64_t>{2, text.size()}));
        for (std::size_t i = 1; i < reports.size(); ++i) {
            EXPECT_TRUE(reports[i].first > reports[i - 1].first ||
                        reports[i].second >= reports[i - 1].second);
        }
    }
}

} // namespace
