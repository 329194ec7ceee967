// Bad data through `mcsim fit`: a table of small CSV files, each with one kind of trouble (NaN
// and infinities, numbers near the ends of the double range, a field with no value, one row, a
// constant field, a category seen once, weights that are zero, negative or huge), and what the
// command must do with it. Either it fits and exits with 0, and then nothing it prints or writes
// holds a NaN or an infinity and the plan it writes reads back against the file's variables; or
// it exits with 1 and one message that names the trouble. It never crashes.
#include "hosttestfiles.h"

#include "data/datadictionary.h"
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/spcsettings.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cctype>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <string>
#include <sys/wait.h>
#include <vector>

#ifndef MCSIM_EXE
#error "MCSIM_EXE (the path of the mcsim command) is set by host/CMakeLists.txt"
#endif

namespace {

using hosttest::CommandRun;

CommandRun Mcsim(const std::vector<std::string>& args, const hosttest::TempDir& dir) {
    return hosttest::RunMcsim(args, dir.File("stderr.txt"));
}

//! The first word of `text` that spells a NaN or an infinity ("nan", "inf", "infinity" in any
//! case, also signed), or "" when there is none.
std::string NonFiniteWord(const std::string& text) {
    const auto isWordChar = [](char c) {
        return std::isalnum(static_cast<unsigned char>(c)) != 0 || c == '_';
    };
    for (std::size_t i = 0; i < text.size();) {
        if (!isWordChar(text[i])) {
            ++i;
            continue;
        }
        std::size_t end = i;
        std::string lower;
        while (end < text.size() && isWordChar(text[end])) {
            lower += static_cast<char>(std::tolower(static_cast<unsigned char>(text[end++])));
        }
        if (lower == "nan" || lower == "inf" || lower == "infinity") {
            const bool signedWord = i > 0 && (text[i - 1] == '-' || text[i - 1] == '+') &&
                                    (i == 1 || !isWordChar(text[i - 2]));
            const std::size_t start = signedWord ? i - 1 : i;
            return text.substr(start, end - start);
        }
        i = end;
    }
    return std::string();
}

//! `n` lines "a,k,g" of ordinary rows: a continuous value, a small count, a category.
std::string Rows(int n, int start = 0) {
    std::string rows;
    for (int i = start; i < start + n; ++i) {
        const double a = 10.0 + 3.0 * std::sin(1.7 * i) + 0.01 * i;
        rows += std::to_string(a) + "," + std::to_string((i * 7) % 5) + "," +
                std::string(1, static_cast<char>('p' + i % 3)) + "\n";
    }
    return rows;
}

struct BadCsv {
    const char* name;
    std::string data;                 //!< the file
    std::vector<std::string> options; //!< after `fit FILE`
    int status;                       //!< 0 fitted, 1 refused
    const char* what = "";            //!< for 1: words of the message
};

class McsimFitBadData : public ::testing::TestWithParam<BadCsv> {};

TEST_P(McsimFitBadData, FitsWithoutNonFiniteNumbersOrRefusesWithAMessage) {
    const BadCsv& c = GetParam();
    hosttest::TempDir dir;
    const std::string data = dir.Write("in.csv", c.data);
    const std::string plan = dir.File("plan.xml");
    const std::string stats = dir.File("fit.xml");
    std::vector<std::string> args = {"fit", data, "--test", "both",        "--threads",
                                     "2",   "-o", plan,     "--fit-stats", stats};
    args.insert(args.end(), c.options.begin(), c.options.end());
    const CommandRun run = Mcsim(args, dir);
    ASSERT_NE(run.status, -1) << "the command did not exit normally\n" << run.err;
    ASSERT_EQ(run.status, c.status) << run.out << run.err;
    if (c.status != 0) {
        EXPECT_EQ(run.out, "");
        EXPECT_EQ(run.err.rfind("mcsim: ", 0), 0u) << run.err;
        EXPECT_NE(run.err.find(c.what), std::string::npos) << run.err;
        EXPECT_EQ(std::count(run.err.begin(), run.err.end(), '\n'), 1) << run.err;
        EXPECT_FALSE(std::filesystem::exists(plan));
        return;
    }
    EXPECT_EQ(NonFiniteWord(run.out), "") << run.out;
    const std::string planText = hosttest::ReadFile(plan);
    const std::string statsText = hosttest::ReadFile(stats);
    EXPECT_EQ(NonFiniteWord(planText), "") << planText;
    EXPECT_EQ(NonFiniteWord(statsText), "") << statsText;

    // The plan reads back against the variables the host makes of the same file.
    MCHost::DataOptions options;
    const MCHost::DataDictionary dict = MCHost::DataDictionary::Build(data, options);
    MCMCSP_800::MCPlanXMLHandler handler(dict.GetVarList(), "", false);
    MCMCSP_800::SPCSettings read;
    MCMCSP_800::SPCSettings* target = &read;
    EXPECT_TRUE(handler.ParsePlanFile(planText, target)) << planText;
}

const std::string kHeader = "a,k,g\n";
const std::string kWeightHeader = "a,k,g,w\n";

//! Ordinary rows with a weight column: `weights` in order, then 1.
std::string WeightedRows(const std::vector<std::string>& weights, int n = 30) {
    std::string rows;
    std::string plain = Rows(n);
    std::size_t pos = 0;
    for (int i = 0; i < n; ++i) {
        const std::size_t end = plain.find('\n', pos);
        rows += plain.substr(pos, end - pos) + "," +
                (static_cast<std::size_t>(i) < weights.size() ? weights[static_cast<std::size_t>(i)]
                                                              : std::string("1")) +
                "\n";
        pos = end + 1;
    }
    return rows;
}

INSTANTIATE_TEST_SUITE_P(
    Files, McsimFitBadData,
    ::testing::Values(
        // Cells that are not finite numbers count as missing: their rows are left out.
        BadCsv{"NaNAndInfinities",
               kHeader + Rows(30) + "NaN,1,p\ninf,2,q\n-inf,3,r\n1e309,1,p\n-Infinity,2,q\n",
               {},
               0},
        BadCsv{"NearDoubleMax", kHeader + Rows(30) + "1e308,1,p\n-1e308,2,q\n", {}, 0},
        BadCsv{"AllNearDoubleMax",
               kHeader + "1.0e308,1,p\n1.1e308,2,q\n1.2e308,3,r\n1.5e308,1,p\n1.7e308,2,q\n"
                         "1.3e308,0,r\n",
               {},
               0},
        BadCsv{"LargestAndSmallestDoubles",
               kHeader + Rows(30) + "1.7976931348623157e308,1,p\n4.9e-324,2,q\n",
               {},
               0},
        BadCsv{"HugeWholeNumber", kHeader + Rows(30) + "5,100000000000000000000,p\n", {}, 0},
        // A field without any value: no row can be used, unless the field is left out.
        BadCsv{"FieldAllMissing",
               "a,k,g,m\n1.5,1,p,NA\n2.5,2,q,\n3.5,3,r,.\n",
               {},
               1,
               "no row has a value in every fitted field"},
        BadCsv{"FieldAllMissingLeftOut",
               "a,k,g,m\n1.5,1,p,NA\n2.5,2,q,\n3.5,3,r,.\n4.5,1,p,NaN\n",
               {"--fields", "a,k,g"},
               0},
        BadCsv{"SingleRow", kHeader + "2.5,1,p\n", {}, 0},
        BadCsv{"TwoRows", kHeader + "2.5,1,p\n3.5,2,q\n", {}, 0},
        BadCsv{"ConstantFields", kHeader + "4.25,3,p\n4.25,3,p\n4.25,3,p\n4.25,3,p\n", {}, 0},
        BadCsv{"CategoryWithOneCase", kHeader + Rows(30) + "12.5,2,lonely\n", {}, 0},
        BadCsv{"OrdinalValueWithOneCase", kHeader + Rows(30) + "12.5,19,p\n", {}, 0},
        // Weights: rows without a positive weight are left out; a total beyond the double
        // range stops the fitting.
        BadCsv{"WeightZerosAndNegatives",
               kWeightHeader + WeightedRows({"0", "-1", "2", "-0.5", "0", "3"}),
               {"--weight", "w"},
               0},
        BadCsv{"WeightAllZeroOrNegative",
               kWeightHeader + WeightedRows(std::vector<std::string>(30, "-2")),
               {"--weight", "w"},
               1,
               "positive weight"},
        BadCsv{"WeightMissingAndInfinite",
               kWeightHeader + WeightedRows({"NA", "inf", "NaN", "1e309"}),
               {"--weight", "w"},
               0},
        BadCsv{"WeightNearDoubleMax",
               kWeightHeader + WeightedRows({"1e308", "1e308", "1e308"}),
               {"--weight", "w"},
               1,
               "the fitting failed"}),
    [](const auto& p) { return std::string(p.param.name); });

} // namespace
