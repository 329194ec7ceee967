// End-to-end runs of `mcsim simulate` and `mcsim demo` through the built command on the
// bundled examples: results against closed-form values, reproducibility, the case file, the
// JSON document, and broken inputs (one message, exit status 1, no output file).
//
// examples/plans/demand_plan.xml has closed-form answers (derived in its header comment):
// unit_margin ~ Normal(8, 2); E[revenue] = 20 * 1100 + rho * 2 * 147.196 with rho = -0.4;
// E[profit] = E[revenue] - 13200; E[bonus] = 45; P(volume_band = large) = 0.257143.
// Statistical checks allow 5 standard errors (a false failure about once in 1.7 million runs
// per check, and the seed is fixed). The correlation model estimates each normal correlation
// from 1000 pairs with a search tolerance of 0.01, so the simulated price-units correlation
// misses -0.4 by about 0.02 (one standard deviation over seeds); checks that depend on it
// allow kRhoSlack.
#include "hosttestfiles.h"

#include "mctolerance.h"

#include <nlohmann/json.hpp>

#include <gtest/gtest.h>

#include <boost/math/distributions/normal.hpp>

#include <algorithm>
#include <chrono>
#include <cmath>
#include <csignal>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <map>
#include <sstream>
#include <thread>

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#ifndef MCSIM_EXE
#error "MCSIM_EXE (the path of the mcsim command) is set by host/CMakeLists.txt"
#endif

namespace {

using Json = nlohmann::json;

const std::string kExamples = MCSIM_EXAMPLES_DIR;
const std::string kModel = kExamples + "/models/demand.model";
//! How far the simulated correlation of two inputs may miss the plan's: four standard
//! deviations of the correlation model's estimate.
constexpr double kRhoSlack = 0.08;

using hosttest::CommandRun;

//! Runs mcsim with `args`; standard error goes through a file outside `dir`'s listing checks.
CommandRun Mcsim(const std::vector<std::string>& args) {
    char errPath[] = "/tmp/mcsim_simulate_test_err_XXXXXX";
    const int fd = ::mkstemp(errPath);
    if (fd >= 0) {
        ::close(fd);
    }
    CommandRun run = hosttest::RunMcsim(args, errPath);
    std::remove(errPath);
    return run;
}

//! The example plan with its model named by an absolute path (so the copy may live anywhere)
//! and each `from` text replaced by its `to`.
std::string DemandPlan(const std::vector<std::pair<std::string, std::string>>& edits = {}) {
    std::string plan = hosttest::ReadFile(kExamples + "/plans/demand_plan.xml");
    std::vector<std::pair<std::string, std::string>> all{
        {"file=\"../models/demand.model\"", "file=\"" + kModel + "\""}};
    all.insert(all.end(), edits.begin(), edits.end());
    for (const auto& [from, to] : all) {
        const std::size_t at = plan.find(from);
        EXPECT_NE(at, std::string::npos) << from;
        if (at != std::string::npos) {
            plan.replace(at, from.size(), to);
        }
    }
    return plan;
}

const Json* FindByName(const Json& list, const std::string& name) {
    for (const Json& entry : list) {
        if (entry.at("name") == name) {
            return &entry;
        }
    }
    return nullptr;
}

std::vector<std::string> Lines(const std::string& text) {
    std::vector<std::string> lines;
    std::istringstream in(text);
    std::string line;
    while (std::getline(in, line)) {
        lines.push_back(line);
    }
    return lines;
}

TEST(McsimSimulate, ExamplePlanMatchesClosedForm) {
    hosttest::TempDir dir;
    const std::string json = dir.File("results.json");
    const int cases = 100000;
    const CommandRun run = Mcsim({"simulate", kExamples + "/plans/demand_plan.xml", "--cases",
                                  std::to_string(cases), "--threads", "2", "--json", json});
    ASSERT_EQ(run.status, 0) << run.err;
    EXPECT_EQ(run.err, "");
    const Json doc = Json::parse(hosttest::ReadFile(json));
    EXPECT_EQ(doc.at("status"), "completed");
    ASSERT_EQ(doc.at("iterations").size(), 1u);
    const Json& it = doc.at("iterations")[0];
    const Json& counts = it.at("counts");
    EXPECT_EQ(counts.at("simulated").get<int>(),
              counts.at("valid").get<int>() + counts.at("invalid").get<int>());
    EXPECT_EQ(counts.at("valid").get<int>(), cases);
    EXPECT_TRUE(it.at("stopped_by_criterion").is_null()); // the plan has no criterion

    const double n = cases;
    const Json* margin = FindByName(it.at("continuous_targets"), "unit_margin");
    ASSERT_NE(margin, nullptr);
    EXPECT_NEAR_TOL(margin->at("mean").get<double>(), 8.0, 0.0, 5.0 * 2.0 / std::sqrt(n));
    EXPECT_NEAR_TOL(margin->at("std_dev").get<double>(), 2.0, 0.0, 5.0 * 2.0 / std::sqrt(2 * n));
    // The interval is mean -+ z * sd / sqrt(n) with z the 97.5% normal quantile.
    const double halfWidth = 1.959964 * margin->at("std_dev").get<double>() / std::sqrt(n);
    EXPECT_NEAR_TOL(margin->at("ci").at("upper").get<double>() -
                        margin->at("ci").at("lower").get<double>(),
                    2.0 * halfWidth, 1e-3, 0.0);
    // Percentiles against the normal quantiles: sampling error sqrt(p(1-p)/n)/density, plus
    // one histogram bin.
    const boost::math::normal_distribution<double> normal(8.0, 2.0);
    const double binWidth = margin->at("histogram").at("bin_width").get<double>();
    for (const Json& p : margin->at("percentiles")) {
        const double q = p.at("percent").get<double>() / 100.0;
        const double exact = boost::math::quantile(normal, q);
        const double se = std::sqrt(q * (1 - q) / n) / boost::math::pdf(normal, exact);
        EXPECT_NEAR_TOL(p.at("value").get<double>(), exact, 0.0, 5.0 * se + binWidth) << q;
        // Order statistics of the cases, inside their distribution-free interval.
        EXPECT_LE(p.at("ci_lower").get<double>(), p.at("value").get<double>());
        EXPECT_GE(p.at("ci_upper").get<double>(), p.at("value").get<double>());
    }
    EXPECT_EQ(margin->at("percentile_method"), "exact");
    double binned = 0.0;
    for (const Json& b : margin->at("histogram").at("bins")) {
        binned += b.at("count").get<double>();
    }
    EXPECT_NEAR_TOL(binned, n, 0.0, 0.5);

    // E[price * units] = E[price] E[units] + rho sd(price) sd(units).
    const double sdUnits = std::sqrt(390000.0 / 18.0);
    const Json* revenue = FindByName(it.at("continuous_targets"), "revenue");
    const Json* profit = FindByName(it.at("continuous_targets"), "profit");
    ASSERT_TRUE(revenue && profit);
    const double seRevenue = revenue->at("std_dev").get<double>() / std::sqrt(n);
    const double rhoSlack = kRhoSlack * 2.0 * sdUnits;
    EXPECT_NEAR_TOL(revenue->at("mean").get<double>(), 22000.0 - 0.4 * 2.0 * sdUnits, 0.0,
                    5.0 * seRevenue + rhoSlack);
    EXPECT_NEAR_TOL(profit->at("mean").get<double>(), revenue->at("mean").get<double>() - 13200.0,
                    0.0, 5.0 * 12.0 * sdUnits / std::sqrt(n));
    const Json* bonus = FindByName(it.at("continuous_targets"), "bonus");
    ASSERT_NE(bonus, nullptr);
    EXPECT_NEAR_TOL(bonus->at("mean").get<double>(), 45.0, 0.0,
                    5.0 * 100.0 * std::sqrt(0.45 * 0.55 / n));

    const Json* band = FindByName(it.at("categorical_targets"), "volume_band");
    ASSERT_NE(band, nullptr);
    ASSERT_EQ(band->at("categories").size(), 2u);
    EXPECT_EQ(band->at("categories")[1].at("label"), "large");
    double total = 0.0;
    for (const Json& c : band->at("categories")) {
        total += c.at("count").get<double>();
    }
    EXPECT_NEAR_TOL(total, n, 0.0, 0.5);
    const double pLarge = 300.0 * 300.0 / (700.0 * 500.0);
    EXPECT_NEAR_TOL(band->at("categories")[1].at("share").get<double>(), pLarge, 0.0,
                    5.0 * std::sqrt(pLarge * (1 - pLarge) / n));

    ASSERT_EQ(it.at("input_correlations").size(), 1u);
    const Json& pair = it.at("input_correlations")[0];
    EXPECT_EQ(pair.at("plan").get<double>(), -0.4);
    EXPECT_NEAR_TOL(pair.at("simulated").get<double>(), -0.4, 0.0, kRhoSlack);
    EXPECT_LT(pair.at("attainable_low").get<double>(), -0.4);
    EXPECT_GT(pair.at("attainable_high").get<double>(), -0.4);
    EXPECT_FALSE(pair.at("unreachable").get<bool>());

    // The text report says the same.
    EXPECT_NE(run.out.find("volume_band  (categorical)"), std::string::npos);
    EXPECT_NE(run.out.find("1 pair within 3 standard errors"), std::string::npos);
}

// profit = (price - 12) * units: moving price by one standard deviation (2) moves profit by
// 2 * units, on average 2 * 1100; moving units by one (147.196) moves it by 147.196 * (price -
// 12), on average 147.196 * 8. The shifted values are scored as they are, so the means are
// exact up to the sampling error of E[units] and E[price].
TEST(McsimSimulate, TornadoDeltasMatchTheModel) {
    hosttest::TempDir dir;
    const std::string json = dir.File("results.json");
    const CommandRun run =
        Mcsim({"simulate", kExamples + "/plans/demand_plan.xml", "--cases", "20000", "--json", json,
               "--tornado-delta", "1", "--variance", "--percentiles", "10,90"});
    ASSERT_EQ(run.status, 0) << run.err;
    const Json doc = Json::parse(hosttest::ReadFile(json));
    EXPECT_EQ(doc.at("settings").at("tornado_delta_sd"), 1.0);
    const Json* profit = FindByName(doc.at("iterations")[0].at("continuous_targets"), "profit");
    ASSERT_NE(profit, nullptr);
    ASSERT_EQ(profit->at("percentiles").size(), 2u);
    EXPECT_EQ(profit->at("percentiles")[1].at("percent"), 90.0);
    std::map<std::string, Json> byInput;
    for (const Json& m : profit->at("sensitivity")) {
        byInput[m.at("input").get<std::string>()] = m;
    }
    // The categorical region has a first-order index only.
    ASSERT_EQ(byInput.size(), 3u);
    EXPECT_TRUE(byInput["region"].at("delta_positive").is_null());
    EXPECT_GE(byInput["region"].at("first_order").get<double>(), 0.0);
    const double sdUnits = std::sqrt(390000.0 / 18.0);
    EXPECT_NEAR_TOL(byInput["price"].at("delta_positive").get<double>(), 2200.0, 0.0,
                    5.0 * 2.0 * sdUnits / std::sqrt(20000.0));
    EXPECT_NEAR_TOL(byInput["price"].at("delta_negative").get<double>(), -2200.0, 0.0,
                    5.0 * 2.0 * sdUnits / std::sqrt(20000.0));
    // units + sd leaves [800, 1500] above 1353: those cases are left out and counted, and the
    // change is the mean margin of the others times sd (price and units are correlated, so a
    // little above 8·sd).
    EXPECT_NEAR_REL(byInput["units"].at("delta_positive").get<double>(), 8.0 * sdUnits, 0.05);
    EXPECT_GT(byInput["units"].at("delta_skipped").get<double>(), 1000.0);
    EXPECT_EQ(byInput["price"].at("delta_skipped"), 0);
    EXPECT_FALSE(byInput["units"].at("variance_contribution").is_null());
    EXPECT_NE(run.out.find("change at +1 sd"), std::string::npos);
}

TEST(McsimSimulate, SameSeedGivesIdenticalFilesAndThreadCountsAllRun) {
    hosttest::TempDir dir;
    const std::string plan = kExamples + "/plans/demand_plan.xml";
    std::vector<std::string> outputs;
    for (const char* name : {"a", "b"}) {
        const std::string json = dir.File(std::string(name) + ".json");
        const std::string cases = dir.File(std::string(name) + ".csv");
        const CommandRun run = Mcsim({"simulate", plan, "--cases", "3000", "--seed", "12345",
                                      "--threads", "3", "--json", json, "--cases-out", cases});
        ASSERT_EQ(run.status, 0) << run.err;
        outputs.push_back(hosttest::ReadFile(json) + hosttest::ReadFile(cases));
    }
    EXPECT_EQ(outputs[0], outputs[1]);

    const CommandRun other = Mcsim({"simulate", plan, "--cases", "3000", "--seed", "54321",
                                    "--threads", "3", "--json", dir.File("c.json")});
    ASSERT_EQ(other.status, 0) << other.err;
    EXPECT_NE(hosttest::ReadFile(dir.File("c.json")), hosttest::ReadFile(dir.File("a.json")));

    for (const char* threads : {"1", "4"}) {
        const CommandRun run = Mcsim({"simulate", plan, "--cases", "3001", "--threads", threads,
                                      "--json", dir.File("t.json")});
        ASSERT_EQ(run.status, 0) << run.err;
        const Json doc = Json::parse(hosttest::ReadFile(dir.File("t.json")));
        // The categorical volume_band has no predicted field: the run uses one thread.
        EXPECT_EQ(doc.at("settings").at("threads_requested").get<int>(), std::stoi(threads));
        EXPECT_EQ(doc.at("settings").at("threads").get<int>(), 1);
        EXPECT_EQ(doc.at("iterations")[0].at("counts").at("valid").get<int>(), 3001);
    }
    // A stop criterion runs on one thread whatever is asked: the header and the JSON say so.
    const CommandRun stop = Mcsim({"simulate", kExamples + "/plans/profit_plan.xml", "--threads",
                                   "2", "--json", dir.File("s.json")});
    ASSERT_EQ(stop.status, 0) << stop.err;
    const Json doc = Json::parse(hosttest::ReadFile(dir.File("s.json")));
    EXPECT_EQ(doc.at("settings").at("threads").get<int>(), 1);
    EXPECT_EQ(doc.at("settings").at("threads_requested").get<int>(), 2);
    EXPECT_NE(stop.out.find("1 thread (2 allowed"), std::string::npos) << stop.out;
}

TEST(McsimSimulate, CasesFileHoldsEveryCaseWithLabels) {
    hosttest::TempDir dir;
    const std::string cases = dir.File("cases.csv");
    const CommandRun run = Mcsim({"simulate", kExamples + "/plans/demand_plan.xml", "--cases",
                                  "4000", "--threads", "2", "--cases-out", cases});
    ASSERT_EQ(run.status, 0) << run.err;
    const std::vector<std::string> lines = Lines(hosttest::ReadFile(cases));
    ASSERT_EQ(lines.size(), 4001u);
    EXPECT_EQ(lines[0], "price,units,region,unit_margin,revenue,profit,bonus,volume_band");
    int north = 0;
    for (std::size_t i = 1; i < lines.size(); ++i) {
        std::vector<std::string> cells;
        std::istringstream row(lines[i]);
        std::string cell;
        while (std::getline(row, cell, ',')) {
            cells.push_back(cell);
        }
        ASSERT_EQ(cells.size(), 8u) << lines[i];
        EXPECT_TRUE(cells[2] == "north" || cells[2] == "south" || cells[2] == "west");
        EXPECT_TRUE(cells[7] == "regular" || cells[7] == "large");
        north += cells[2] == "north" ? 1 : 0;
    }
    EXPECT_NEAR_TOL(north / 4000.0, 0.45, 0.0, 5.0 * std::sqrt(0.45 * 0.55 / 4000.0));
    EXPECT_NE(run.out.find("4000 cases written to"), std::string::npos);
}

// A fixed input with three values makes three sensitivity iterations: profit drops by
// 1100 for each unit of cost.
TEST(McsimSimulate, SensitivityIterationsGetOneBlockEach) {
    hosttest::TempDir dir;
    const std::string plan = dir.Write(
        "sens.xml",
        DemandPlan({{"<Value value=\"12\"/>",
                     "<Value value=\"10\"/><Value value=\"12\"/><Value value=\"14\"/>"}}));
    const CommandRun run = Mcsim({"simulate", plan, "--cases", "5000", "--json", dir.File("r.json"),
                                  "--cases-out", dir.File("c.csv")});
    ASSERT_EQ(run.status, 0) << run.err;
    const Json doc = Json::parse(hosttest::ReadFile(dir.File("r.json")));
    ASSERT_EQ(doc.at("iterations").size(), 3u);
    std::vector<double> margins;
    for (const Json& it : doc.at("iterations")) {
        EXPECT_EQ(it.at("counts").at("valid").get<int>(), 5000);
        margins.push_back(
            FindByName(it.at("continuous_targets"), "unit_margin")->at("mean").get<double>());
    }
    EXPECT_EQ(doc.at("iterations")[2].at("varying_input"), "unit_cost = 14");
    EXPECT_NEAR_TOL(margins[0], 10.0, 0.0, 5.0 * 2.0 / std::sqrt(5000.0));
    EXPECT_NEAR_TOL(margins[2], 6.0, 0.0, 5.0 * 2.0 / std::sqrt(5000.0));
    EXPECT_NE(run.out.find("=== iteration 3 of 3: unit_cost = 14 ==="), std::string::npos);
    const std::vector<std::string> lines = Lines(hosttest::ReadFile(dir.File("c.csv")));
    ASSERT_EQ(lines.size(), 15001u);
    EXPECT_EQ(lines[0].substr(lines[0].rfind(',') + 1), "iteration");
}

// A 1% precision of the mean profit (sd about 2000, mean about 8700) at 95% needs about
// (1.96 * 2000 / 87)^2, some 2000 cases; the criterion is checked from 1000 cases on.
TEST(McsimSimulate, StopCriterionEndsTheRun) {
    hosttest::TempDir dir;
    const std::string plan = dir.Write(
        "stop.xml",
        DemandPlan(
            {{"<Settings numberOfCriteria=\"0\" simulatedCases=\"100000\"/>",
              "<Settings numberOfCriteria=\"1\" simulatedCases=\"100000\"><Criteria "
              "target=\"profit\" type=\"point_value\"><PointValue confidenceLevel=\"95\" "
              "parameter=\"mean\" threshold=\"1\" unit=\"percent\"/></Criteria></Settings>"}}));
    const CommandRun run = Mcsim({"simulate", plan, "--json", dir.File("r.json")});
    ASSERT_EQ(run.status, 0) << run.err;
    const Json it = Json::parse(hosttest::ReadFile(dir.File("r.json"))).at("iterations")[0];
    EXPECT_EQ(it.at("stopped_by_criterion"), true);
    const int valid = it.at("counts").at("valid").get<int>();
    EXPECT_GE(valid, 1000);
    EXPECT_LT(valid, 5000);
    const Json* profit = FindByName(it.at("continuous_targets"), "profit");
    const double width =
        profit->at("ci").at("upper").get<double>() - profit->at("mean").get<double>();
    EXPECT_LE(width, 0.01 * profit->at("mean").get<double>() * 1.001);
    EXPECT_NE(run.out.find("stop criterion: met"), std::string::npos);
}

TEST(McsimDemo, RunsTheBundledExampleAndKeepsItsFiles) {
    hosttest::TempDir dir;
    const std::string folder = dir.File("demo");
    const CommandRun run =
        Mcsim({"demo", "--dir", folder, "--cases", "3e3", "--examples", kExamples});
    ASSERT_EQ(run.status, 0) << run.err;
    EXPECT_NE(run.out.find("== step 2 of 2"), std::string::npos);
    EXPECT_NE(run.out.find("margin_band  (categorical)"), std::string::npos);
    const Json doc = Json::parse(hosttest::ReadFile(folder + "/results.json"));
    EXPECT_EQ(doc.at("iterations")[0].at("counts").at("valid").get<int>(), 3000);
    EXPECT_EQ(Lines(hosttest::ReadFile(folder + "/cases.csv")).size(), 3001u);
    EXPECT_TRUE(std::filesystem::exists(folder + "/sales_plan.xml"));
}

//! One broken input or misused option: the files to write, the extra arguments, the words of
//! the message and the exit status.
struct BadInput {
    std::string fName;                                                        //!< test name
    std::function<std::vector<std::string>(const hosttest::TempDir&)> fSetup; //!< args
    std::string fMessage; //!< expected in the message
    int fStatus = 1;      //!< 1 bad input, 2 usage error
};

std::ostream& operator<<(std::ostream& os, const BadInput& b) {
    return os << b.fName;
}

class McsimSimulateBadInput : public ::testing::TestWithParam<BadInput> {};

TEST_P(McsimSimulateBadInput, OneMessageNoOutput) {
    hosttest::TempDir dir;
    std::vector<std::string> args{"simulate"};
    for (const std::string& a : GetParam().fSetup(dir)) {
        args.push_back(a);
    }
    const auto before = hosttest::Snapshot(dir);
    for (const char* option : {"--json", "--cases-out"}) {
        if (std::find(args.begin(), args.end(), option) == args.end()) {
            args.insert(args.end(), {option, dir.File(std::string("out") + option)});
        }
    }
    const CommandRun run = Mcsim(args);
    EXPECT_EQ(run.status, GetParam().fStatus);
    EXPECT_EQ(run.out, "");
    EXPECT_EQ(run.err.find("mcsim: "), 0u) << run.err;
    EXPECT_NE(run.err.find(GetParam().fMessage), std::string::npos) << run.err;
    EXPECT_EQ(std::count(run.err.begin(), run.err.end(), '\n'), 1) << run.err;
    EXPECT_EQ(hosttest::Snapshot(dir), before) << "an input changed or an output was left";
}

//! `args` as they are, for inputs that are not files in the test's folder.
std::function<std::vector<std::string>(const hosttest::TempDir&)>
PlanArgs(std::vector<std::string> args) {
    return [args](const hosttest::TempDir&) { return args; };
}

//! The example plan in `dir` followed by `options`.
std::function<std::vector<std::string>(const hosttest::TempDir&)>
PlanThen(std::vector<std::string> options) {
    return [options](const hosttest::TempDir& d) {
        std::vector<std::string> args{d.Write("plan.xml", DemandPlan())};
        for (const std::string& o : options) {
            args.push_back(o[0] == '@' ? d.File(o.substr(1)) : o);
        }
        return args;
    };
}

//! A signal during a long run ends the command with 128 + the signal and leaves no output
//! and no temporary file; SIGINT first stops the workers and prints the results so far.
class McsimSignal : public ::testing::TestWithParam<std::pair<int, int>> {};

TEST_P(McsimSignal, EndsWithItsStatusAndLeavesNoFile) {
    const auto [signal, status] = GetParam();
    hosttest::TempDir dir;
    const std::string plan = dir.Write("plan.xml", DemandPlan());
    const auto before = hosttest::Snapshot(dir);
    std::vector<std::string> args{MCSIM_EXE,
                                  "simulate",
                                  plan,
                                  "--cases",
                                  "2e9",
                                  "--threads",
                                  "1",
                                  "--cases-out",
                                  dir.File("cases.csv"),
                                  "--json",
                                  dir.File("r.json")};
    std::vector<char*> argv;
    for (std::string& a : args) {
        argv.push_back(a.data());
    }
    argv.push_back(nullptr);
    posix_spawn_file_actions_t quiet;
    ::posix_spawn_file_actions_init(&quiet);
    ::posix_spawn_file_actions_addopen(&quiet, 1, "/dev/null", O_WRONLY, 0);
    ::posix_spawn_file_actions_addopen(&quiet, 2, "/dev/null", O_WRONLY, 0);
    pid_t pid = 0;
    ASSERT_EQ(::posix_spawn(&pid, MCSIM_EXE, &quiet, nullptr, argv.data(), environ), 0);
    ::posix_spawn_file_actions_destroy(&quiet);
    // The cases are being written once the case file's temporary file is there (bounded wait).
    bool running = false;
    for (int i = 0; i < 6000 && !running; ++i) {
        for (const auto& entry : std::filesystem::directory_iterator(dir.Path())) {
            running = running || entry.path().filename().string().rfind("cases.csv.tmp", 0) == 0;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    ::kill(pid, signal);
    int raw = 0;
    ASSERT_EQ(::waitpid(pid, &raw, 0), pid);
    EXPECT_TRUE(running);
    ASSERT_TRUE(WIFEXITED(raw)) << "ended by signal " << WTERMSIG(raw);
    EXPECT_EQ(WEXITSTATUS(raw), status);
    EXPECT_EQ(hosttest::Snapshot(dir), before) << "an output or temporary file was left";
}

INSTANTIATE_TEST_SUITE_P(Signals, McsimSignal,
                         ::testing::Values(std::pair{SIGINT, 130}, std::pair{SIGTERM, 143},
                                           std::pair{SIGHUP, 129}),
                         [](const auto& p) { return std::to_string(p.param.first); });

std::vector<std::string> PlanWith(const hosttest::TempDir& dir,
                                  const std::vector<std::pair<std::string, std::string>>& edits) {
    return {dir.Write("plan.xml", DemandPlan(edits))};
}

//! The example plan with a contingency table over 'region': two cells of probability `p`,
//! for "north" and for `category`.
std::vector<std::string> PlanWithTable(const hosttest::TempDir& dir, const std::string& p,
                                       const std::string& category) {
    const std::string cell = "<TableCell probability=\"" + p + "\"><CrossCategory category=\"";
    return PlanWith(dir, {{"<Settings ", "<ContingencyTable numOfCrossFactors=\"1\" "
                                         "numOfCrossProbValues=\"2\"><CrossFactors><Factor "
                                         "name=\"region\"/></CrossFactors>" +
                                             cell + "north\"/></TableCell>" + cell + category +
                                             "\"/></TableCell></ContingencyTable><Settings "}});
}

std::vector<std::string> PlanAndModel(const hosttest::TempDir& dir, const std::string& model) {
    return {dir.Write("plan.xml", DemandPlan()), "--model", dir.Write("bad.model", model)};
}

INSTANTIATE_TEST_SUITE_P(
    Table, McsimSimulateBadInput,
    ::testing::Values(
        BadInput{
            "MissingPlan",
            [](const hosttest::TempDir& d) { return std::vector<std::string>{d.File("none.xml")}; },
            "none.xml: cannot open the plan file"},
        BadInput{"MalformedXml",
                 [](const hosttest::TempDir& d) {
                     return std::vector<std::string>{
                         d.Write("plan.xml", "<SimulationPlan>\n<ModelFiles>\n</SimulationPlan>")};
                 },
                 "plan.xml:3:"},
        BadInput{"NotAPlan",
                 [](const hosttest::TempDir& d) {
                     return std::vector<std::string>{d.Write("plan.xml", "<FitStats/>")};
                 },
                 "not a simulation plan"},
        BadInput{"ReaderRefuses",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"simulatedCases=\"100000\"", "simulatedCases=\"many\""}});
                 },
                 "plan.xml: the plan reader refused the file"},
        BadInput{"CorrelationOfUnknownField",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"colVar=\"price\" rowVar=\"units\"",
                                          "colVar=\"price\" rowVar=\"cost\""}});
                 },
                 "the correlation matrix names 'cost'"},
        BadInput{"StopCriterionOnCategoricalTarget",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(
                         d, {{"<Settings numberOfCriteria=\"0\" simulatedCases=\"100000\"/>",
                              "<Settings numberOfCriteria=\"1\" simulatedCases=\"100000\">"
                              "<Criteria target=\"volume_band\" type=\"tail\"><Tail "
                              "threshold=\"1\" frequency=\"10\"/></Criteria></Settings>"}});
                 },
                 "a stop criterion names 'volume_band', which is not a continuous target"},
        BadInput{"MissingModel",
                 [](const hosttest::TempDir& d) {
                     return std::vector<std::string>{d.Write("plan.xml", DemandPlan()), "--model",
                                                     d.File("none.model")};
                 },
                 "none.model: cannot open the model file"},
        BadInput{"ModelSyntaxError",
                 [](const hosttest::TempDir& d) {
                     return PlanAndModel(d, "unit_margin = price * (units\n");
                 },
                 "bad.model:1: syntax error"},
        BadInput{"ModelNumberOverflows",
                 [](const hosttest::TempDir& d) {
                     return PlanAndModel(d, "unit_margin = 1e999 * price\n");
                 },
                 "bad.model:1: the number '1e999' in the expression of 'unit_margin' is not a "
                 "finite double"},
        BadInput{"ModelUnknownField",
                 [](const hosttest::TempDir& d) {
                     return PlanAndModel(d, "unit_margin = price\nrevenue = price * volume\n");
                 },
                 "bad.model:2: unknown name 'volume'"},
        BadInput{"TextInputWithoutLevels",
                 [](const hosttest::TempDir& d) {
                     return PlanAndModel(d, "unit_margin = price\nnorth = region == 0\n");
                 },
                 "bad.model:2: the model uses 'region', which holds text"},
        BadInput{"PlanTargetNotInModel",
                 [](const hosttest::TempDir& d) {
                     return PlanAndModel(d, "unit_margin = price - unit_cost\n");
                 },
                 "the plan names the target 'revenue'"},
        // Usage errors: found before the plan is simulated.
        BadInput{"UnknownOption", PlanThen({"--bogus"}), "--bogus; see 'mcsim simulate --help'", 2},
        BadInput{"CasesNotWhole", PlanThen({"--cases", "2.5"}),
                 "--cases: 2.5 is not a whole number; expected a whole number from 1 to", 2},
        BadInput{"PercentileZero", PlanThen({"--percentiles", "5,0"}),
                 "--percentiles 0: a percentile lies strictly between 0 and 100", 2},
        BadInput{"TornadoDeltaNan", PlanThen({"--tornado-delta", "nan"}),
                 "expected a number above 0 and at most 100, not 'nan'", 2},
        BadInput{"JsonOverThePlan", PlanThen({"--json", "@plan.xml"}),
                 "plan.xml: this is the plan file; choose another output file", 2},
        BadInput{"CasesOutIsALinkToTheModel",
                 [](const hosttest::TempDir& d) {
                     const std::string model = d.Write("m.model", hosttest::ReadFile(kModel));
                     std::filesystem::create_symlink(model, d.File("link.csv"));
                     return std::vector<std::string>{d.Write("plan.xml", DemandPlan()), "--model",
                                                     model, "--cases-out", d.File("link.csv")};
                 },
                 "link.csv: this is the model file", 2},
        BadInput{"TwoOutputsOneFile", PlanThen({"--json", "@r.out", "--cases-out", "@r.out"}),
                 "r.out: this file is written by --cases-out already", 2},
        BadInput{"UnwritableOutput", PlanThen({"--json", "@no/such/folder/r.json"}),
                 "r.json: cannot create the file", 2}),
    [](const ::testing::TestParamInfo<BadInput>& p) { return p.param.fName; });

// The plan checks: one line naming the file, the line, the field and the value.
INSTANTIATE_TEST_SUITE_P(
    PlanChecks, McsimSimulateBadInput,
    ::testing::Values(
        BadInput{"PlanIsADevice", PlanArgs({"/dev/zero"}),
                 "/dev/zero: the plan file is not a regular file"},
        BadInput{"UnknownDistribution",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"<DistNormal numberOfParamSets=\"1\"><Parameters "
                                          "mean=\"20\" stddev=\"2\"/></DistNormal>",
                                          "<DistPert><Parameters min=\"1\" mode=\"2\" "
                                          "max=\"3\"/></DistPert>"}});
                 },
                 "plan.xml:23: simulated field 'price': <DistPert> is not a distribution"},
        BadInput{"NegativeStddev",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"stddev=\"2\"", "stddev=\"-2\""}});
                 },
                 "plan.xml:22: simulated field 'price' (Normal): mean=20 stddev=-2 is outside "
                 "the family's domain (stddev >= 0)"},
        BadInput{"BinomialTrialsNotWhole",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"<DistNormal numberOfParamSets=\"1\"><Parameters "
                                          "mean=\"20\" stddev=\"2\"/></DistNormal>",
                                          "<DistBinomial><Parameters n=\"2.5\" "
                                          "prob=\"0.5\"/></DistBinomial>"}});
                 },
                 "'price' (Binomial): n=2.5 prob=0.5 is outside the family's domain (n a whole"},
        BadInput{"CorrelationAboveOne",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"value=\"-0.4\"", "value=\"1.5\""}});
                 },
                 "plan.xml:43: the correlation of 'units' and 'price' is 1.5; a correlation lies "
                 "between -1 and 1"},
        BadInput{"CategoryTwice",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"value=\"west\"", "value=\"north\""}});
                 },
                 "plan.xml:28: simulated field 'region' (Categorical): the category \"north\" "
                 "is listed twice"},
        BadInput{"NegativeProbability",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"value=\"0.2\"", "value=\"-0.2\""}});
                 },
                 "'region' (Categorical): no valid probabilities: each must be a number >= 0"},
        BadInput{"FieldNameTwice",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"name=\"unit_cost\"", "name=\"price\""}});
                 },
                 "plan.xml:37: the field name 'price' is used twice"},
        BadInput{"TableCategoryUnknown",
                 [](const hosttest::TempDir& d) { return PlanWithTable(d, "0.5", "east"); },
                 "the contingency table has the category \"east\", which 'region' does not have"},
        BadInput{"TableAllZero",
                 [](const hosttest::TempDir& d) { return PlanWithTable(d, "0", "south"); },
                 "the contingency table has no usable probabilities: every probability is 0"},
        BadInput{"OtherMajorVersion",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"version=\"21.0.0.0\"", "version=\"99.0\""}});
                 },
                 "plan.xml:11: the plan is of version '99.0'; this program reads version 21 "
                 "plans (21.0.0.0)"},
        BadInput{"OtherNamespace",
                 [](const hosttest::TempDir& d) {
                     return PlanWith(d, {{"xmlns=\"http://xml.mcsim.org/software/analytics/",
                                          "xmlns=\"urn:other/"}});
                 },
                 "the plan is of the namespace 'urn:other/"}),
    [](const ::testing::TestParamInfo<BadInput>& p) { return p.param.fName; });

} // namespace
