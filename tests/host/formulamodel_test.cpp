// Formula models: reading the model file, the errors it must name by file and line (syntax,
// unknown names, division by zero), and scoring cases the way the simulation does: prepare
// the output record from the input record, then score case after case.
#include "common/hosterror.h"
#include "mccommon/mcmv.h"
#include "mctolerance.h"
#include "models/formulamodel.h"
#include "simulation_common/mcspconst.h"

#include <gtest/gtest.h>

#include <cmath>
#include <sstream>
#include <thread>

namespace {

using MCCommon_800::MCMV;
using MCCommon_800::MCStatus;
using MCHost::FormulaModel;
using MCHost::FormulaScoreFactory;
using MCHost::HostError;
using MCXML_800::IMCScoreComputer;
using MCXML_800::Value;
using MCXML_800::ValueRecord;
namespace HostStatus = MCHost::HostStatus;

FormulaModel Model(const std::string& text) {
    std::istringstream in(text);
    return FormulaModel::Parse(in, "m.model");
}

//! An input record with the given names and values, as the simulation builds it.
ValueRecord Inputs(const std::vector<std::pair<std::string, Value>>& values) {
    ValueRecord r;
    for (const auto& [name, value] : values) {
        r.Add(name, value);
    }
    return r;
}

const char* const kProfitModel = "# profit of an order\n"
                                 "levels channel \"online\" \"store\"\n"
                                 "\n"
                                 "revenue = price * volume\n"
                                 "profit = revenue - cost * volume - (channel == 0 ? 2 : 0)\n"
                                 "margin = profit / revenue   # a share\n"
                                 "category band = margin < 0.3 ? 0 : 1 labels \"thin\" \"wide\"\n";

TEST(FormulaModel, ScoresTargetsInOrderWithEarlierTargetsAndTextLevels) {
    FormulaScoreFactory factory(Model(kProfitModel));
    auto computer = factory.CreateScoreComputer();
    ValueRecord input = Inputs({{"price", Value(25.0)},
                                {"cost", Value(14.0)},
                                {"volume", Value(1000.0)},
                                {"channel", Value("online")}});
    ValueRecord output;
    ASSERT_TRUE(computer->PrepareOutputRecord(input, output).IsOK());
    // A transformation model lays out exactly its targets, in model order.
    ASSERT_EQ(output.Size(), 4);
    EXPECT_EQ(output.GetName(0), "revenue");
    EXPECT_EQ(output.GetName(3), "band");
    EXPECT_EQ(computer->GetModelType(), IMCScoreComputer::kTransformsOnly);
    EXPECT_EQ(computer->GetAlgorithmName(), "Transformation");

    struct Case {
        double price, cost, volume;
        const char* channel;
    };
    for (const Case& c :
         {Case{25, 14, 1000, "online"}, Case{10, 8, 500, "store"}, Case{12.5, 9.25, 3, "online"}}) {
        input[0].SetReal(c.price);
        input[1].SetReal(c.cost);
        input[2].SetReal(c.volume);
        input[3].SetString(c.channel);
        ASSERT_TRUE(computer->ScoreRecord(input, output).IsOK()) << factory.GetFirstError();
        const double revenue = c.price * c.volume;
        const double profit =
            revenue - c.cost * c.volume - (std::string(c.channel) == "online" ? 2.0 : 0.0);
        const double margin = profit / revenue;
        EXPECT_NEAR_REL(output[0].GetReal(), revenue, 4 * mctest::kEps);
        EXPECT_NEAR_REL(output[1].GetReal(), profit, 4 * mctest::kEps);
        EXPECT_NEAR_REL(output[2].GetReal(), margin, 16 * mctest::kEps);
        EXPECT_NEAR_REL(output[3].GetReal(), margin < 0.3 ? 0.0 : 1.0, 0.0);
    }
}

TEST(FormulaModel, InputsAreFoundAgainWhenTheRecordsLayoutChanges) {
    // Places found in one record are reused case after case; a record with the names in
    // another order, or the same record cleared and refilled so, must be read by name again.
    FormulaScoreFactory factory(Model("diff = a - b\n"));
    auto computer = factory.CreateScoreComputer();
    ValueRecord input = Inputs({{"a", Value(5.0)}, {"b", Value(3.0)}});
    ValueRecord output;
    ASSERT_TRUE(computer->PrepareOutputRecord(input, output).IsOK());
    ASSERT_TRUE(computer->ScoreRecord(input, output).IsOK());
    EXPECT_EQ(output[0].GetReal(), 2.0);
    const ValueRecord swapped = Inputs({{"b", Value(5.0)}, {"a", Value(3.0)}});
    ASSERT_TRUE(computer->ScoreRecord(swapped, output).IsOK());
    EXPECT_EQ(output[0].GetReal(), -2.0);
    input.Clear();
    input.Add("b", Value(1.0));
    input.Add("a", Value(10.0));
    ASSERT_TRUE(computer->ScoreRecord(input, output).IsOK());
    EXPECT_EQ(output[0].GetReal(), 9.0);
    input.Remove("b");
    input.Add("b", Value(4.0));
    ASSERT_TRUE(computer->ScoreRecord(input, output).IsOK());
    EXPECT_EQ(output[0].GetReal(), 6.0);
}

TEST(FormulaModel, TargetVariablesCarryLevelsAndLabels) {
    FormulaScoreFactory factory(Model(kProfitModel));
    auto computer = factory.CreateScoreComputer();
    ASSERT_EQ(computer->GetNTargets(), 4);
    EXPECT_EQ(MCMCSP_800::GetMCSPMeasureLevel(computer->GetTargetVariable(0)),
              MCSPConst::kLevelContinuous);
    const MCXML_800::IMCVariable* band = computer->GetTargetVariable(3);
    EXPECT_EQ(MCMCSP_800::GetMCSPMeasureLevel(band), MCSPConst::kLevelCategorical);
    ASSERT_NE(band->GetCategorical(), nullptr);
    EXPECT_EQ(band->GetCategorical()->GetCategoryText(1), "wide");
    EXPECT_EQ(computer->GetTargetVariable(4), nullptr);
    EXPECT_EQ(factory.GetModel().GetInputNames(),
              (std::vector<std::string>{"price", "volume", "cost", "channel"}));
}

// ------------------------------------------------------------------------------------------
// Model files that cannot be read.

struct BadModel {
    const char* name;
    const char* text;
    const char* where; //!< start of the message
    const char* what;  //!< words it must contain
};

class BadModels : public ::testing::TestWithParam<BadModel> {};

TEST_P(BadModels, NameFileAndLine) {
    const BadModel& c = GetParam();
    try {
        static_cast<void>(Model(c.text));
        FAIL() << "no error";
    } catch (const HostError& e) {
        const std::string message = e.what();
        EXPECT_EQ(message.rfind(c.where, 0), 0u) << message;
        EXPECT_NE(message.find(c.what), std::string::npos) << message;
    }
}

INSTANTIATE_TEST_SUITE_P(
    Files, BadModels,
    ::testing::Values(
        BadModel{"SyntaxError", "a = x\n\nb = x + * 2\n",
                 "m.model:3:", "syntax error in the expression of 'b' at column 9"},
        BadModel{"OpenParenthesis", "a = (x + 1\n", "m.model:1:", "syntax error"},
        BadModel{"AssignmentInside", "a = x = 2\n", "m.model:1:", "syntax error"},
        BadModel{"NoEquals", "a x + 1\n", "m.model:1:", "target = expression"},
        BadModel{"BadName", "2a = 1\n", "m.model:1:", "not a name"},
        BadModel{"EmptyExpression", "a =   # nothing\n", "m.model:1:", "is empty"},
        BadModel{"TwiceDefined", "a = 1\na = 2\n", "m.model:2:", "already defined on line 1"},
        BadModel{"CategoryWithoutLabels", "category c = x > 1\n", "m.model:1:", "labels"},
        BadModel{"CategoryOneLabel", "category c = 0 labels \"only\"\n",
                 "m.model:1:", "at least two labels"},
        BadModel{"OpenLabel", "category c = 0 labels \"a\" \"b\n", "m.model:1:", "closing quote"},
        BadModel{"RepeatedLabel", "category c = 0 labels \"a\" \"a\"\n",
                 "m.model:1:", "listed twice"},
        BadModel{"LevelsWithoutTexts", "levels ch\n", "m.model:1:", "lists no texts"},
        BadModel{"NoTarget", "# nothing here\n", "m.model: ", "no target"}),
    [](const auto& p) { return std::string(p.param.name); });

TEST(FormulaModel, ReadsCrlfCommentsAndLabelsHoldingHashes) {
    const FormulaModel model =
        Model("\xEF\xBB\xBF# head\r\ncategory c = x > 1 labels \"#1\" \"no, \"\"2\"\"\"\r\n"
              "category = x # a target named like the keyword\r\n");
    ASSERT_EQ(model.GetTargets().size(), 2u);
    EXPECT_EQ(model.GetTargets()[0].fvLabels, (std::vector<std::string>{"#1", "no, \"2\""}));
    EXPECT_EQ(model.GetTargets()[0].fLine, 2);
    EXPECT_EQ(model.GetTargets()[1].fName, "category");
    EXPECT_EQ(model.GetTargets()[1].fExpression, "x");
}

// ------------------------------------------------------------------------------------------
// Names that the inputs do not provide.

TEST(FormulaModel, UnknownNameIsNamedWithItsLine) {
    const FormulaModel model = Model("a = price * 2\nb = a + prise\n");
    const std::string message = model.CheckInputs({"price"});
    EXPECT_EQ(message.rfind("m.model:2:", 0), 0u) << message;
    EXPECT_NE(message.find("unknown name 'prise'"), std::string::npos) << message;
    EXPECT_EQ(model.CheckInputs({"price", "prise"}), "");

    // The same through the score computer: preparing fails and the factory keeps the message.
    FormulaScoreFactory factory(model);
    auto computer = factory.CreateScoreComputer();
    ValueRecord output;
    const MCStatus status = computer->PrepareOutputRecord(Inputs({{"price", Value(1.0)}}), output);
    EXPECT_EQ(status, MCStatus(HostStatus::kScoreInput, false));
    EXPECT_EQ(factory.GetFirstError(), message);
    // Scoring without a prepared model is refused, not a crash.
    EXPECT_EQ(computer->ScoreRecord(Inputs({{"price", Value(1.0)}}), output).GetErrorCode(),
              HostStatus::kScoreNotPrepared);
}

TEST(FormulaModel, LaterTargetsAndInputNamedTargetsAreRefused) {
    const FormulaModel model = Model("a = b + 1\nb = x\n");
    EXPECT_NE(model.CheckInputs({"x"}).find("before the line that defines it"), std::string::npos);
    const FormulaModel shadow = Model("x = x + 1\n");
    EXPECT_NE(shadow.CheckInputs({"x"}).find("has the name of an input"), std::string::npos);
}

// ------------------------------------------------------------------------------------------
// Cases that cannot be scored: the status, the message and missing targets, after which the
// computer scores the next case normally.

struct BadCase {
    const char* name;
    const char* model;
    double x;         //!< value of the input x that fails
    double good;      //!< a value that scores
    long code;        //!< expected status code
    const char* what; //!< words of the message
};

class BadCases : public ::testing::TestWithParam<BadCase> {};

TEST_P(BadCases, FailTheCaseOnly) {
    const BadCase& c = GetParam();
    FormulaScoreFactory factory(Model(std::string("ok = x + 1\n") + c.model));
    auto computer = factory.CreateScoreComputer();
    ValueRecord input = Inputs({{"x", Value(c.x)}});
    ValueRecord output;
    ASSERT_TRUE(computer->PrepareOutputRecord(input, output).IsOK());
    EXPECT_EQ(computer->ScoreRecord(input, output), MCStatus(c.code, false));
    const std::string message = factory.GetFirstError();
    EXPECT_EQ(message.rfind("m.model:2:", 0), 0u) << message;
    EXPECT_NE(message.find(c.what), std::string::npos) << message;
    EXPECT_NEAR_REL(output[0].GetReal(), c.x + 1, 0.0);
    EXPECT_TRUE(MCMV::IsMissing(output[1].GetReal()));
    EXPECT_EQ(factory.GetNErrors(), 1);

    input[0].SetReal(c.good);
    EXPECT_TRUE(computer->ScoreRecord(input, output).IsOK()) << factory.GetFirstError();
    EXPECT_FALSE(MCMV::IsMissing(output[1].GetReal()));
}

INSTANTIATE_TEST_SUITE_P(
    Evaluation, BadCases,
    ::testing::Values(BadCase{"DivisionByZero", "y = 10 / x\n", 0.0, 0.5,
                              HostStatus::kScoreEvaluation,
                              "division by zero in the expression of 'y' (with x = 0)"},
                      // The zero divisor is found even where the end result would be finite.
                      BadCase{"HiddenDivisionByZero", "y = 1 / (1 / x)\n", 0.0, 2.0,
                              HostStatus::kScoreEvaluation, "division by zero"},
                      BadCase{"ZeroOverZero", "y = x / x\n", 0.0, -1.0,
                              HostStatus::kScoreEvaluation, "division by zero"},
                      BadCase{"OutsideDomain", "y = ln(x - 1)\n", 0.0, 3.0,
                              HostStatus::kScoreEvaluation, "not a finite number"},
                      BadCase{"CategoryIndexOutOfRange", "category y = x * 4 labels \"a\" \"b\"\n",
                              0.75, 0.25, HostStatus::kScoreEvaluation, "not an index 0 to 1"}),
    [](const auto& p) { return std::string(p.param.name); });

TEST(FormulaModel, MissingInputsGiveMissingTargetsWithoutError) {
    FormulaScoreFactory factory(Model("y = 10 / x\nz = y + w\nc = w > 0 ? 1 : 2\n"));
    auto computer = factory.CreateScoreComputer();
    ValueRecord input = Inputs({{"x", Value(MCMV::Missing())}, {"w", Value(3.0)}});
    ValueRecord output;
    ASSERT_TRUE(computer->PrepareOutputRecord(input, output).IsOK());
    ASSERT_TRUE(computer->ScoreRecord(input, output).IsOK()) << factory.GetFirstError();
    EXPECT_TRUE(MCMV::IsMissing(output[0].GetReal()));
    EXPECT_TRUE(MCMV::IsMissing(output[1].GetReal()));
    EXPECT_NEAR_REL(output[2].GetReal(), 1.0, 0.0);
    // A missing numerator over a zero divisor is missing, not a division by zero.
    FormulaScoreFactory zero(Model("y = x / w\n"));
    auto c2 = zero.CreateScoreComputer();
    input[1].SetReal(0.0);
    ASSERT_TRUE(c2->PrepareOutputRecord(input, output).IsOK());
    EXPECT_TRUE(c2->ScoreRecord(input, output).IsOK());
    EXPECT_TRUE(MCMV::IsMissing(output[0].GetReal()));
}

TEST(FormulaModel, TextInputsNeedTheirLevels) {
    FormulaScoreFactory plain(Model("y = channel * 2\n"));
    auto computer = plain.CreateScoreComputer();
    ValueRecord input = Inputs({{"channel", Value("store")}});
    ValueRecord output;
    ASSERT_TRUE(computer->PrepareOutputRecord(input, output).IsOK());
    EXPECT_EQ(computer->ScoreRecord(input, output).GetErrorCode(), HostStatus::kScoreInput);
    EXPECT_NE(plain.GetFirstError().find("levels channel"), std::string::npos);
    // A text that reads as a number is that number.
    input[0].SetString("4");
    ASSERT_TRUE(computer->ScoreRecord(input, output).IsOK());
    EXPECT_NEAR_REL(output[0].GetReal(), 8.0, 0.0);

    FormulaScoreFactory levelled(Model("levels channel \"a\" \"b\"\ny = channel * 2\n"));
    auto c2 = levelled.CreateScoreComputer();
    input[0].SetString("b");
    ASSERT_TRUE(c2->PrepareOutputRecord(input, output).IsOK());
    ASSERT_TRUE(c2->ScoreRecord(input, output).IsOK());
    EXPECT_NEAR_REL(output[0].GetReal(), 2.0, 0.0);
    input[0].SetString("c");
    EXPECT_EQ(c2->ScoreRecord(input, output).GetErrorCode(), HostStatus::kScoreInput);
    EXPECT_EQ(levelled.GetFirstError().rfind("m.model:1:", 0), 0u) << levelled.GetFirstError();
}

TEST(FormulaModel, ComputersOfOneFactoryScoreInParallel) {
    // Each worker of the simulation scores on its own computer; results must not mix.
    FormulaScoreFactory factory(Model("y = sqrt(x) * k\nz = y / k\n"));
    constexpr int kThreads = 4;
    constexpr int kCases = 2000;
    std::vector<int> wrong(kThreads, 0);
    std::vector<std::thread> threads;
    for (int t = 0; t < kThreads; ++t) {
        threads.emplace_back([&, t] {
            auto computer = factory.CreateScoreComputer();
            ValueRecord input = Inputs({{"x", Value(0.0)}, {"k", Value(t + 1.0)}});
            ValueRecord output;
            if (!computer->PrepareOutputRecord(input, output).IsOK()) {
                wrong[static_cast<std::size_t>(t)] = kCases;
                return;
            }
            for (int i = 0; i < kCases; ++i) {
                input[0].SetReal(i);
                const bool ok = computer->ScoreRecord(input, output).IsOK() &&
                                output[0].GetReal() == std::sqrt(double(i)) * (t + 1.0) &&
                                std::fabs(output[1].GetReal() - std::sqrt(double(i))) <=
                                    4 * mctest::kEps * std::sqrt(double(i));
                wrong[static_cast<std::size_t>(t)] += ok ? 0 : 1;
            }
        });
    }
    for (std::thread& th : threads) {
        th.join();
    }
    EXPECT_EQ(wrong, std::vector<int>(kThreads, 0));
}

} // namespace
