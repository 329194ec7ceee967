// End-to-end runs of `mcsim fit` through the built command on the bundled example data and on
// broken inputs: exit status, what reaches standard output, and the one-line messages.
#include "hosttestfiles.h"

#include "data/csvreader.h"
#include "mctolerance.h"
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/spcsettings.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <cstdio>
#include <filesystem>
#include <map>
#include <sstream>
#include <sys/wait.h>

#ifndef MCSIM_EXE
#error "MCSIM_EXE (the path of the mcsim command) is set by host/CMakeLists.txt"
#endif

namespace {

const std::string kSales = std::string(MCSIM_EXAMPLES_DIR) + "/data/sales.csv";

using hosttest::CommandRun;

//! Runs mcsim with `args`, standard error to a file of `dir`.
CommandRun Mcsim(const std::vector<std::string>& args, const hosttest::TempDir& dir) {
    return hosttest::RunMcsim(args, dir.File("stderr.txt"));
}

//! The lines of `text` from the one starting with `first` up to the next empty line.
std::vector<std::string> Block(const std::string& text, const std::string& first) {
    std::istringstream in(text);
    std::vector<std::string> lines;
    std::string line;
    bool inside = false;
    while (std::getline(in, line)) {
        if (!inside && line.rfind(first, 0) == 0) {
            inside = true;
        }
        if (inside) {
            if (line.empty()) {
                break;
            }
            lines.push_back(line);
        }
    }
    return lines;
}

TEST(McsimFit, FitsTheExampleData) {
    hosttest::TempDir dir;
    const CommandRun run = Mcsim({"fit", kSales, "--crosstabs", "--threads", "2"}, dir);
    ASSERT_EQ(run.status, 0) << run.err;
    // Standard error is not a terminal here: no progress bar, no noise.
    EXPECT_EQ(run.err, "");
    for (const char* header :
         {"unit_price  (continuous)", "unit_cost  (continuous)", "volume  (continuous)",
          "returns  (ordinal", "satisfaction  (ordinal", "region  (categorical",
          "channel  (categorical", "store  (categorical", "correlations",
          "contingency table of the categorical fields"}) {
        EXPECT_NE(run.out.find(std::string("\n") + header), std::string::npos) << header;
    }

    // An independent count of the rows every fitted field has a value in, and of the regions
    // among them: the fitted categorical distribution must be these shares.
    std::istringstream in(hosttest::ReadFile(kSales));
    MCHost::CsvReader reader(in, kSales);
    std::vector<std::string> cells;
    ASSERT_TRUE(reader.ReadRecord(cells));
    int rows = 0;
    int valid = 0;
    std::map<std::string, int> regions;
    while (reader.ReadRecord(cells)) {
        ++rows;
        bool complete = true;
        for (const std::string& c : cells) {
            complete = complete && !(c.empty() || c == "NA" || c == ".");
        }
        if (complete) {
            ++valid;
            ++regions[cells[0]];
        }
    }
    EXPECT_NE(run.out.find(std::to_string(rows) + " rows read, " + std::to_string(valid) + " used"),
              std::string::npos)
        << run.out.substr(0, 200);
    const std::vector<std::string> block = Block(run.out, "region  (categorical");
    ASSERT_EQ(block.size(), 2 + regions.size());
    for (std::size_t i = 2; i < block.size(); ++i) {
        std::istringstream line(block[i]);
        std::string label;
        double share = 0.0;
        line >> label >> share;
        ASSERT_EQ(regions.count(label), 1u) << block[i];
        // Six significant digits are printed.
        EXPECT_NEAR_REL(share, regions[label] / double(valid), 1e-5) << label;
    }
}

TEST(McsimFit, SameRunSameOutput) {
    hosttest::TempDir dir;
    const std::vector<std::string> args = {"fit", kSales, "--threads", "3", "--test", "both"};
    const CommandRun first = Mcsim(args, dir);
    const CommandRun second = Mcsim(args, dir);
    ASSERT_EQ(first.status, 0) << first.err;
    EXPECT_EQ(first.out, second.out);
}

TEST(McsimFit, WeightLevelsAndFieldChoice) {
    hosttest::TempDir dir;
    const CommandRun run =
        Mcsim({"fit", kSales, "--fields", "unit_price,returns", "--weight", "satisfaction",
               "--level", "returns=continuous", "--cases", "1e2"},
              dir);
    ASSERT_EQ(run.status, 0) << run.err;
    EXPECT_NE(run.out.find("fitted 2 fields"), std::string::npos) << run.out;
    EXPECT_NE(run.out.find("100 rows read"), std::string::npos) << run.out;
    EXPECT_NE(run.out.find("total weight"), std::string::npos) << run.out;
    EXPECT_NE(run.out.find("\nreturns  (continuous)"), std::string::npos) << run.out;
    EXPECT_EQ(run.out.find("\nregion"), std::string::npos) << run.out;
}

TEST(McsimFit, FindsTheSeparatorAndReadsDecimalCommas) {
    hosttest::TempDir dir;
    std::string text = "price;region\n";
    for (int i = 0; i < 40; ++i) {
        text += std::to_string(10 + i % 7) + "," + std::to_string(i % 10) + ";" +
                (i % 3 == 0 ? "north" : "south") + "\n";
    }
    const std::string path = dir.Write("semi.csv", text);
    const CommandRun asText = Mcsim({"fit", path}, dir);
    ASSERT_EQ(asText.status, 0) << asText.err;
    EXPECT_NE(asText.out.find("(separator ';', found in its first rows)"), std::string::npos)
        << asText.out;
    EXPECT_NE(asText.out.find("\nprice  (categorical"), std::string::npos) << asText.out;
    EXPECT_NE(asText.err.find("cells such as '10,0' are read as text; give --decimal-comma"),
              std::string::npos)
        << asText.err;
    const CommandRun numbers = Mcsim({"fit", path, "--decimal-comma"}, dir);
    ASSERT_EQ(numbers.status, 0) << numbers.err;
    EXPECT_NE(numbers.out.find("\nprice  (continuous)"), std::string::npos) << numbers.out;
    EXPECT_EQ(numbers.err, "");
}

TEST(McsimFit, WideDataGetsALinePerFieldUnlessDetailsAreAsked) {
    hosttest::TempDir dir;
    std::string text;
    for (int c = 0; c < 25; ++c) {
        text += (c ? ",x" : "x") + std::to_string(c);
    }
    text += "\n";
    for (int r = 0; r < 60; ++r) {
        for (int c = 0; c < 25; ++c) {
            text += (c ? "," : "") + std::to_string((r * (c + 3)) % 17 + 0.013 * r + 0.5 * c);
        }
        text += "\n";
    }
    const std::string path = dir.Write("wide.csv", text);
    const CommandRun compact = Mcsim({"fit", path}, dir);
    ASSERT_EQ(compact.status, 0) << compact.err;
    EXPECT_NE(compact.out.find("25 fields, a line each"), std::string::npos) << compact.out;
    EXPECT_NE(compact.out.find("correlations: 300 pairs"), std::string::npos) << compact.out;
    EXPECT_EQ(compact.out.find("ranked candidates"), std::string::npos);
    EXPECT_LT(std::count(compact.out.begin(), compact.out.end(), '\n'), 50);
    const CommandRun details = Mcsim({"fit", path, "--details"}, dir);
    ASSERT_EQ(details.status, 0) << details.err;
    EXPECT_NE(details.out.find("ranked candidates"), std::string::npos);
}

TEST(McsimFit, HelpForTheCommandAndTheSubcommand) {
    hosttest::TempDir dir;
    const CommandRun top = Mcsim({"--help"}, dir);
    EXPECT_EQ(top.status, 0);
    EXPECT_NE(top.out.find("fit"), std::string::npos);
    EXPECT_NE(top.out.find("Exit status:\n  0    done\n"), std::string::npos) << top.out;
    const CommandRun fit = Mcsim({"fit", "--help"}, dir);
    EXPECT_EQ(fit.status, 0);
    EXPECT_NE(fit.out.find("143 by SIGTERM"), std::string::npos) << fit.out;
    for (const char* option : {"--fields", "--factors", "--weight", "--level", "--test",
                               "--crosstabs", "--cases", "--bins", "--threads"}) {
        EXPECT_NE(fit.out.find(option), std::string::npos) << option;
    }
}

struct BadRun {
    const char* name;
    std::string data;                 //!< content of the data file ("" : the example file)
    std::vector<std::string> options; //!< after `fit FILE`; "@NAME" is the file NAME of the test
    const char* what;                 //!< words of the message on standard error
    std::string model = "";           //!< a model file to record in a plan, "" none
    int status = 1;                   //!< exit status: 1 bad input, 2 usage error
};

class McsimFitErrors : public ::testing::TestWithParam<BadRun> {};

TEST_P(McsimFitErrors, OneMessageAndFailure) {
    const BadRun& c = GetParam();
    hosttest::TempDir dir;
    const std::string path = c.data.empty() ? kSales : dir.Write("in.csv", c.data);
    std::vector<std::string> args = {"fit", path};
    for (const std::string& option : c.options) {
        args.push_back(option[0] == '@' ? dir.File(option.substr(1)) : option);
    }
    if (!c.model.empty()) {
        args.insert(args.end(),
                    {"-o", dir.File("plan.xml"), "--model", dir.Write("m.model", c.model)});
    }
    const auto before = hosttest::Snapshot(dir);
    const CommandRun run = Mcsim(args, dir);
    EXPECT_EQ(run.status, c.status) << run.out;
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(hosttest::Snapshot(dir), before) << "an input changed or an output was left";
    EXPECT_EQ(run.err.rfind("mcsim: ", 0), 0u) << run.err;
    EXPECT_NE(run.err.find(c.what), std::string::npos) << run.err;
    EXPECT_EQ(std::count(run.err.begin(), run.err.end(), '\n'), 1) << run.err;
}

INSTANTIATE_TEST_SUITE_P(
    Inputs, McsimFitErrors,
    ::testing::Values(
        BadRun{"MalformedRow", "a,b\n1,2\n3\n", {}, "in.csv:3: the row has 1 fields"},
        BadRun{"UnterminatedQuote", "a,b\n1,\"2\n", {}, "in.csv:2: a quoted field is not closed"},
        BadRun{"HeaderOnly", "a,b\n", {}, "no data rows"},
        BadRun{"UnknownField", "", {"--fields", "unit_price,nope"}, "unknown field 'nope'"},
        BadRun{"TextWeight", "", {"--weight", "region"}, "holds text"},
        BadRun{"CategoricalWeight",
               "",
               {"--weight", "returns", "--level", "returns=categorical"},
               "is categorical"},
        BadRun{"TextAsContinuous", "", {"--level", "store=continuous"}, "can only be categorical"},
        BadRun{"WeightFitted",
               "",
               {"--fields", "unit_price", "--factors", "region", "--weight", "region"},
               "frequency weight"},
        BadRun{"NoValidRow", "a,b\n1,NA\nNA,2\n", {}, "no row has a value in every fitted field"},
        BadRun{"ModelSyntax", "", {}, "m.model:2: syntax error", "a = unit_price\nb = a +\n"},
        BadRun{"ModelUnknownName",
               "",
               {},
               "m.model:1: unknown name 'unit_prise'",
               "a = unit_prise * 2\n"},
        BadRun{"ModelUnknownTarget",
               "",
               {"--targets", "zz"},
               "does not define",
               "a = unit_price * 2\n"},
        BadRun{"OneFieldHeaderHoldingAnotherSeparator",
               "a;b\n1,5;2\n",
               {"--delimiter", ","},
               "the row has 2 fields, the header has 1; the header reads as one field holding "
               "';': if that separates the fields, give --delimiter ';'"},
        // Usage errors: found before the data is read.
        BadRun{"ModelWithoutPlan", "", {"--model", "m.model"}, "add -o PLAN.xml", "", 2},
        BadRun{"BadLevel", "", {"--level", "store=fuzzy"}, "--level store=fuzzy", "", 2},
        BadRun{"UnknownOption", "", {"--bogus"}, "--bogus; see 'mcsim fit --help'", "", 2},
        BadRun{"BinsOutOfRange",
               "",
               {"--bins", "1"},
               "--bins: 1 is out of range; expected a whole number from 2 to 100000",
               "",
               2},
        BadRun{"DecimalCommaAndCommaSeparator",
               "",
               {"--decimal-comma", "--delimiter", ","},
               "--decimal-comma: the comma cannot be the decimal mark and the separator",
               "",
               2},
        BadRun{"PlanOverTheData",
               "a,b\n1,2\n3,4\n",
               {"-o", "@in.csv"},
               "in.csv: this is the data file; choose another output file",
               "",
               2},
        BadRun{"TwoOutputsOneFile",
               "",
               {"-o", "@p.xml", "--fit-stats", "@p.xml"},
               "p.xml: this file is written by -o already",
               "",
               2},
        BadRun{"NoSuchFolder",
               "",
               {"-o", "@nodir/p.xml"},
               "nodir/p.xml: cannot create the file",
               "",
               2},
        BadRun{"JsonOverThePlan",
               "",
               {"-o", "@p.xml", "--json", "@p.xml"},
               "p.xml: this file is written by -o already",
               "",
               2},
        BadRun{"UnknownFamily",
               "",
               {"--families", "unit_price=Gauss"},
               "unknown family 'Gauss'",
               "",
               2},
        BadRun{"UnknownRule", "", {"--choose", "lnl"}, "--choose lnl: expected ad, ks, aic", "", 2},
        BadRun{"SeedWithoutBootstrap", "", {"--seed", "3"}, "add --bootstrap N", "", 2},
        BadRun{"RuleWithoutItsStatistic", "", {"--rank", "ks"}, "--rank ks needs --test ks", "", 2},
        BadRun{"FilterOfAnUnfittedField",
               "",
               {"--fields", "unit_price", "--exclude", "volume=Normal"},
               "name field 'volume', which is not among the fitted fields"},
        BadRun{"NoFamilyLeft",
               "",
               {"--fields", "returns", "--families", "Normal"},
               "leave field 'returns' no candidate family"}),
    [](const auto& p) { return std::string(p.param.name); });

TEST(McsimFit, WritesAPlanThatReadsBack) {
    hosttest::TempDir dir;
    const std::string plan = dir.File("plan.xml");
    const std::string stats = dir.File("fit.xml");
    const CommandRun run =
        Mcsim({"fit", kSales, "--crosstabs", "-o", plan, "--fit-stats", stats, "--model",
               std::string(MCSIM_EXAMPLES_DIR) + "/models/profit.model", "--targets",
               "profit,margin_band"},
              dir);
    ASSERT_EQ(run.status, 0) << run.err;
    // Only the two files: no temporary file is left beside them.
    EXPECT_EQ(dir.Count(), 3u); // plan, statistics and the captured standard error

    MCMCSP_800::SPCSettings read;
    MCMCSP_800::SPCSettings* pRead = &read;
    MCMCSP_800::MCPlanXMLHandler handler;
    ASSERT_TRUE(handler.ParsePlanFile(hosttest::ReadFile(plan), pRead));
    ASSERT_EQ(read.GetSimulationInput().size(), 8u);
    for (const auto& input : read.GetSimulationInput()) {
        EXPECT_EQ(input.GetDistElementSize(), 1u) << input.GetVarName();
    }
    const auto* region = read.GetSimInput("region");
    ASSERT_NE(region, nullptr);
    EXPECT_EQ(region->GetFinalDistType(), MCSPConst::kDistCategorical);
    std::vector<MCMCSP_800::SPCSettings::ModelFileTarget> targets;
    read.GetModelTargets(targets);
    ASSERT_EQ(targets.size(), 2u);
    EXPECT_EQ(targets[0].fName, "profit");
    EXPECT_EQ(targets[1].fMeasurementLevel, MCSPConst::kLevelCategorical);
    // The model is recorded relative to the plan's folder.
    EXPECT_TRUE(std::filesystem::exists(std::filesystem::path(dir.Path()) / read.GetModelFile()))
        << read.GetModelFile();
    EXPECT_EQ(read.GetCrstabsFactors(), (std::vector<std::string>{"region", "channel", "store"}));
    EXPECT_NE(hosttest::ReadFile(stats).find("<FitStats"), std::string::npos);
}

TEST(McsimFit, AFieldWithoutAFitIsLeftOutOfThePlan) {
    // tier is ordinal with fractional values: no distribution fits it, and a simulated field
    // without one would make the plan unreadable.
    hosttest::TempDir dir;
    const std::string plan = dir.File("plan.xml");
    const CommandRun run = Mcsim(
        {"fit",
         std::string(MCSIM_EXAMPLES_DIR) + "/../tests/distribution_fitting/data/fitting_sample.csv",
         "-o", plan},
        dir);
    ASSERT_EQ(run.status, 0) << run.err;
    EXPECT_NE(run.err.find("field 'tier'; the plan leaves it out"), std::string::npos) << run.err;
    MCMCSP_800::SPCSettings read;
    MCMCSP_800::SPCSettings* pRead = &read;
    MCMCSP_800::MCPlanXMLHandler handler;
    ASSERT_TRUE(handler.ParsePlanFile(hosttest::ReadFile(plan), pRead));
    EXPECT_EQ(read.GetSimInput("tier"), nullptr);
    EXPECT_FALSE(read.GetSimulationInput().empty());
}

TEST(McsimFit, MissingFileIsNamed) {
    hosttest::TempDir dir;
    const CommandRun run = Mcsim({"fit", dir.File("absent.csv")}, dir);
    EXPECT_EQ(run.status, 1);
    EXPECT_NE(run.err.find("absent.csv: cannot open the data file"), std::string::npos) << run.err;
}

// The report of the fit diagnostics on the inputs that once misled it: values near 10^6 that
// six digits cannot tell apart, a sample whose Uniform and Triangular end at its extremes (their
// A² over the values inside, never negative), under-dispersed counts (no negative binomial),
// rates named as rates, table p-values as bounds, and a reason for every dropped candidate.
TEST(McsimFit, ReportsDiagnosticsAndDropReasons) {
    hosttest::TempDir dir;
    std::string text = "x,c\n";
    const int counts[] = {0, 1, 1, 2, 2, 2, 3, 3, 4, 5};
    for (int i = 0; i < 1000; ++i) {
        text += (i < 300 ? "1000000.1" : (i < 700 ? "1000000.5" : "1000000.9")) + std::string(",") +
                std::to_string(counts[i % 10]) + "\n";
    }
    const CommandRun run = Mcsim({"fit", dir.Write("d.csv", text)}, dir);
    ASSERT_EQ(run.status, 0) << run.err;
    for (const char* part :
         {"Uniform      min = 1000000.1, max = 1000000.9   A-D 154.5",
          "lnL missing: the density is 0 at a sample value", ", rate = ", "(p < 0.005)",
          "Beta         a value lies outside the family's support",
          "Negbinomial  variance not above the mean", "; pooled ", "lnL -"}) {
        EXPECT_NE(run.out.find(part), std::string::npos) << part << "\n" << run.out;
    }
    EXPECT_EQ(run.out.find("A-D -"), std::string::npos) << run.out;
}

// --json, the choices and the bootstrap: the plan takes what --choose and --empirical-below
// say, the document says why and carries every candidate, the filters leave out what they name,
// and the bootstrap gives the same document with one thread or two.
TEST(McsimFit, JsonChoicesAndBootstrap) {
    hosttest::TempDir dir;
    const std::string data =
        std::string(MCSIM_EXAMPLES_DIR) + "/../tests/distribution_fitting/data/gof_nile.csv";
    const auto fit = [&](const std::vector<std::string>& extra, const std::string& json) {
        std::vector<std::string> args = {"fit", data, "--json", dir.File(json)};
        args.insert(args.end(), extra.begin(), extra.end());
        const CommandRun run = Mcsim(args, dir);
        EXPECT_EQ(run.status, 0) << run.err;
        return nlohmann::json::parse(hosttest::ReadFile(dir.File(json)));
    };
    // AIC prefers the Gamma of the Nile flows, A² the LogNormal.
    const auto byAic = fit({"--choose", "aic", "--exclude", "volume=Uniform"}, "aic.json");
    const auto& field = byAic["fields"][0];
    EXPECT_EQ(field["best"]["family"], "Gamma");
    EXPECT_EQ(field["best"]["rule"], "AIC");
    for (const auto& c : field["candidates"]) {
        EXPECT_NE(c["family"], "Uniform");
        if (c["family"] == "Gamma") {
            EXPECT_EQ(c["parameters"][1]["name"], "rate");
            EXPECT_GT(c["parameters"][1]["std_error"].get<double>(), 0.0);
            EXPECT_EQ(c["plots"]["qq"]["sample"].size(), 99u);
        }
        if (c["family"] == "Beta") {
            EXPECT_EQ(c["dropped_reason"], "a value lies outside the family's support");
        }
    }
    const CommandRun text = Mcsim({"fit", data, "--choose", "aic"}, dir);
    EXPECT_NE(text.out.find("chosen by  AIC: smallest AIC"), std::string::npos) << text.out;
    EXPECT_NE(text.out.find("std errors shape 4.18"), std::string::npos) << text.out;
    const auto byAd = fit({}, "ad.json");
    EXPECT_EQ(byAd["fields"][0]["best"]["family"], "Lognormal");

    // The LogNormal's p-value 0.2 is below 0.3: the plan takes the observed distribution.
    const std::string plan = dir.File("plan.xml");
    const auto fallback = fit({"--empirical-below", "0.3", "-o", plan}, "e.json");
    EXPECT_TRUE(fallback["fields"][0]["best"]["empirical_fallback"].get<bool>());
    MCMCSP_800::SPCSettings read;
    MCMCSP_800::SPCSettings* pRead = &read;
    MCMCSP_800::MCPlanXMLHandler handler;
    ASSERT_TRUE(handler.ParsePlanFile(hosttest::ReadFile(plan), pRead));
    EXPECT_EQ(read.GetSimInput("volume")->GetFinalDistType(), MCSPConst::kDistEmpirical);

    const auto one = fit({"--bootstrap", "40", "--seed", "7", "--threads", "1"}, "b1.json");
    const auto two = fit({"--bootstrap", "40", "--seed", "7", "--threads", "2"}, "b2.json");
    EXPECT_EQ(one, two);
    for (const auto& c : one["fields"][0]["candidates"]) {
        if (c["family"] == "Gamma") {
            EXPECT_EQ(c["bootstrap_replicates"], 40);
            const double shape = c["parameters"][0]["value"];
            EXPECT_LT(c["parameters"][0]["bootstrap_lower"].get<double>(), shape);
            EXPECT_GT(c["parameters"][0]["bootstrap_upper"].get<double>(), shape);
            EXPECT_FALSE(c["statistics"]["anderson_darling"]["bootstrap_p_value"].is_null());
        }
    }
}

} // namespace
