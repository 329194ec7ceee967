// The distribution element: its parameter checks as one table, the positions of list values,
// the label of each distribution shape (also when the shape is broken), and value semantics.
#include "component/mcspassert.h"
#include "mccommon/mcmv.h"
#include "simulation_common/simulatespecs.h"

#include <gtest/gtest.h>

#include <limits>
#include <utility>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;

namespace {

//! Collects every assertion raised while it lives.
struct AssertionLog {
    AssertionLog() : fPrevious(SetAssertionHandler(&Record)) { Texts().clear(); }
    ~AssertionLog() { SetAssertionHandler(fPrevious); }
    static std::vector<std::string>& Texts() {
        static std::vector<std::string> texts;
        return texts;
    }
    static void Record(const char* text, const char*, int) { Texts().push_back(text); }
    AssertionHandler fPrevious;
};

using Numbers = std::vector<double>;
using Texts = std::vector<std::string>;

//! An element of type `t` with numeric parameters (one value: the scalar form), each of which
//! must be accepted.
DistInfoElem Make(DistType t, const std::vector<std::pair<const char*, Numbers>>& numbers) {
    DistInfoElem e;
    e.SetDistType(t);
    for (const auto& [name, values] : numbers) {
        EXPECT_TRUE(values.size() == 1 ? e.AddParameter(name, values[0])
                                       : e.AddParameter(name, values))
            << name;
    }
    return e;
}

DistInfoElem MakeCategorical(const Texts& cats, const Numbers& probs) {
    DistInfoElem e;
    e.SetDistType(kDistCategorical);
    EXPECT_TRUE(e.AddParameter("cats", cats));
    EXPECT_TRUE(e.AddParameter("probs", probs));
    return e;
}

const double kNaN = std::numeric_limits<double>::quiet_NaN();

// ---------------------------------------------------------------------------------------------
// Parameter checks: (distribution, name, form, value or list, accepted).

enum class Form { kScalar, kList, kText, kTextList };

struct ParamCase {
    const char* label;
    DistType type;
    const char* name;
    Form form;
    std::vector<double> values;
    bool accepted;
};

class ParameterCheck : public ::testing::TestWithParam<ParamCase> {};

} // namespace

TEST_P(ParameterCheck, AcceptsOrRefusesWithoutSideEffects) {
    const ParamCase& c = GetParam();
    DistInfoElem e;
    e.SetDistType(c.type);
    ASSERT_TRUE(e.AddParameter("unrelated", 1.0)); // an unknown name is kept unchecked
    const std::size_t before = e.GetParameterSize();
    bool accepted = false;
    std::size_t count = 1;
    switch (c.form) {
    case Form::kScalar:
        accepted = e.AddParameter(c.name, c.values.at(0));
        break;
    case Form::kList:
        accepted = e.AddParameter(c.name, c.values);
        count = c.values.size();
        break;
    case Form::kText:
        accepted = e.AddParameter(c.name, std::string("x"));
        break;
    case Form::kTextList:
        accepted = e.AddParameter(c.name, std::vector<std::string>{"x", "y"});
        count = 2;
        break;
    }
    EXPECT_EQ(accepted, c.accepted);
    EXPECT_EQ(e.GetParameterSize(), before + (accepted ? 1 : 0));
    if (accepted) {
        EXPECT_EQ(e.GetParamValueSize(before), count);
    }
}

// Numbers under an unknown name are kept unchecked, texts are refused; the scalar form checks
// only some ranges, the list form all.
// clang-format off
INSTANTIATE_TEST_SUITE_P(Rules, ParameterCheck, ::testing::Values(
    ParamCase{"NoTypeNumber", kDistUnknown, "mean", Form::kScalar, {-1}, true},
    ParamCase{"NoTypeText", kDistUnknown, "mean", Form::kText, {}, false},
    ParamCase{"ForeignNameNumber", kDistNormal, "prob", Form::kList, {5}, true},
    ParamCase{"EmptyNameNumber", kDistNormal, "", Form::kScalar, {1}, true},
    ParamCase{"ForeignNameText", kDistNormal, "prob", Form::kText, {}, false},
    ParamCase{"NameIsCaseSensitive", kDistCategorical, "Cats", Form::kTextList, {}, false},
    ParamCase{"LegalText", kDistNormal, "mean", Form::kText, {}, true},
    ParamCase{"TextsAreNotRangeChecked", kDistCategorical, "probs", Form::kTextList, {}, true},
    ParamCase{"ScalarShapeUnchecked", kDistGamma, "shape", Form::kScalar, {-1}, true},
    ParamCase{"ScalarThreshUnchecked", kDistNegbinomial, "thresh", Form::kScalar, {0.5}, true},
    ParamCase{"PoissonMeanZero", kDistPoisson, "mean", Form::kScalar, {0}, false},
    ParamCase{"PoissonMeanHalf", kDistPoisson, "mean", Form::kScalar, {0.5}, true},
    ParamCase{"NegBinProbOne", kDistNegbinomial, "prob", Form::kScalar, {1}, true},
    ParamCase{"NegBinProbZero", kDistNegbinomial, "prob", Form::kScalar, {0}, false},
    ParamCase{"NegBinTypeUnchecked", kDistNegbinomial, "type", Form::kScalar, {2}, true},
    ParamCase{"BinomialProbZero", kDistBinomial, "prob", Form::kScalar, {0}, true},
    ParamCase{"BernoulliProbNegative", kDistBernoulli, "prob", Form::kScalar, {-0.1}, false},
    ParamCase{"BernoulliProbNaN", kDistBernoulli, "prob", Form::kScalar, {kNaN}, false},
    ParamCase{"EmpiricalScalarProbs", kDistEmpirical, "probs", Form::kScalar, {2}, false},
    ParamCase{"EmptyListPasses", kDistNormal, "stddev", Form::kList, {}, true},
    ParamCase{"ListShape", kDistGamma, "shape", Form::kList, {-1}, false},
    ParamCase{"ListWeibullC", kDistWeibull, "c", Form::kList, {1, 0}, false},
    ParamCase{"ListStddevNaN", kDistNormal, "stddev", Form::kList, {kNaN}, false},
    ParamCase{"ListSecondValueFails", kDistNormal, "stddev", Form::kList, {1, -1}, false},
    ParamCase{"ListThreshBelowOne", kDistNegbinomial, "thresh", Form::kList, {0.5}, false},
    ParamCase{"ListThreshOne", kDistNegbinomial, "thresh", Form::kList, {1}, true},
    ParamCase{"ListPoissonMean", kDistPoisson, "mean", Form::kList, {2, 0}, false},
    ParamCase{"ListBinomialProbZero", kDistBinomial, "prob", Form::kList, {0}, false},
    ParamCase{"ListNegBinType", kDistNegbinomial, "type", Form::kList, {2}, false},
    ParamCase{"ListNegBinTypeTrials", kDistNegbinomial, "type", Form::kList, {1}, true},
    ParamCase{"CategoricalProbs", kDistCategorical, "probs", Form::kList, {0, 1}, true},
    ParamCase{"CategoricalProbsAboveOne", kDistCategorical, "probs", Form::kList, {0.5, 2}, false},
    ParamCase{"EmpiricalProbsUnchecked", kDistEmpirical, "probs", Form::kList, {0.5, 2}, true},
    ParamCase{"UserRangesProbs", kDistUserRanges, "probs", Form::kList, {1.1}, false}),
    [](const ::testing::TestParamInfo<ParamCase>& row) { return std::string(row.param.label); });
// clang-format on

// ---------------------------------------------------------------------------------------------

// Out of range, the scalar forms leave their outputs and the list forms clear the values.
TEST(DistInfoElem, ValuesAreFoundByPosition) {
    DistInfoElem e = Make(kDistUserRanges, {{"min", {0, 10, 20}}, {"max", {10, 20, 30}}});
    ASSERT_TRUE(e.AddParameter("probs", Numbers{0.2, 0.3, 0.5}));
    EXPECT_EQ(e.GetParamValueSize(3), 0u);
    std::string name;
    Numbers values{99};
    e.GetParameterNameValue(1, name, values);
    EXPECT_EQ(name, "max");
    EXPECT_EQ(values, (Numbers{10, 20, 30}));
    Numbers firsts;
    Texts names;
    e.GetParameterNameValues(names, firsts);
    EXPECT_EQ(names, (Texts{"min", "max", "probs"}));
    EXPECT_EQ(firsts, (Numbers{0, 10, 0.2}));
    name = "kept";
    double first = -1;
    e.GetParameterNameValue(3, name, first);
    e.GetParameterNameValue(3, name, values);
    EXPECT_TRUE(name == "kept" && first == -1 && values.empty());
}

// An empty list must not hand out the next parameter's value. Numbers read as texts in the
// default stream form; texts read as numbers when they are.
TEST(DistInfoElem, EmptyParametersAndForeignKindsReadSafely) {
    const DistInfoElem e = Make(kDistEmpirical, {{"min", {}}, {"max", {9}}});
    std::string name;
    double value = 0;
    std::string text = "stale";
    e.GetParameterNameValue(0, name, value);
    e.GetParameterNameValue(0, name, text);
    EXPECT_TRUE(MCMV::IsMissing(value));
    EXPECT_EQ(text, "");
    DistInfoElem cat = Make(kDistCategorical, {{"cats", {1, 2.5}}});
    ASSERT_TRUE(cat.AddParameter("probs", Texts{"0.25", "x"}));
    Texts texts;
    Numbers numbers;
    cat.GetParameterNameValue(0, name, texts);
    cat.GetParameterNameValue(1, name, numbers);
    EXPECT_EQ(texts, (Texts{"1", "2.5"}));
    ASSERT_EQ(numbers.size(), 2u);
    EXPECT_EQ(numbers[0], 0.25);
    EXPECT_TRUE(MCMV::IsMissing(numbers[1]));
}

TEST(DistInfoElem, LabelOfEachShape) {
    EXPECT_EQ(Make(kDistNormal, {{"mean", {10}}, {"stddev", {2}}}).GetLabel(), "mean=10 stddev=2");
    EXPECT_EQ(Make(kDistGamma, {{"shape", {1234567}}, {"scale", {0.1 + 0.2}}}).GetLabel(),
              "shape=1.23457e+06 scale=0.3");
    EXPECT_EQ(MakeCategorical({"a", "b"}, {0.25, 0.75}).GetLabel(), "a=0.25 b=0.75");
    EXPECT_EQ(Make(kDistUserRanges, {{"min", {0, 10}}, {"max", {10, 20}}, {"probs", {0.4, 0.6}}})
                  .GetLabel(),
              "0-10=0.4 10-20=0.6");
    EXPECT_EQ(Make(kDistEmpirical,
                   {{"min", {1.5}}, {"max", {}}, {"stddev", {0.5}}, {"probs", {0.5, 0.5}}})
                  .GetLabel(),
              "min=1.5 max=nan");
    EXPECT_EQ(Make(kDistNegbinomial, {{"thresh", {1}}, {"prob", {0.5}}, {"type", {1}}}).GetLabel(),
              "threshold=1 prob=0.5(Trials)");
    EXPECT_EQ(Make(kDistNegbinomial, {{"thresh", {3}}, {"prob", {0.2}}, {"type", {0}}}).GetLabel(),
              "threshold=3 prob=0.2(Failures)");
    EXPECT_EQ(DistInfoElem().GetLabel(), "");
}

TEST(DistInfoElem, BrokenShapesAreReportedAndLabelStaysInBounds) {
    AssertionLog log;
    EXPECT_EQ(MakeCategorical({"a", "b", "c"}, {0.25, 0.75}).GetLabel(), "a=0.25 b=0.75");
    EXPECT_EQ(log.Texts(), Texts{"cats.size() == probs.size()"});

    log.Texts().clear();
    DistInfoElem catsOnly;
    catsOnly.SetDistType(kDistCategorical);
    ASSERT_TRUE(catsOnly.AddParameter("cats", Texts{"a"}));
    EXPECT_EQ(catsOnly.GetLabel(), "");
    EXPECT_EQ(log.Texts(), (Texts{"nElem == 2", "cats.size() == probs.size()"}));

    log.Texts().clear();
    EXPECT_EQ(Make(kDistUserRanges, {{"min", {0, 10}}, {"max", {10}}}).GetLabel(), "");
    EXPECT_EQ(log.Texts(),
              (Texts{"nElem == 3", "mins.size() == maxs.size() && maxs.size() == probs.size()"}));

    log.Texts().clear();
    EXPECT_EQ(Make(kDistNegbinomial, {{"thresh", {2}}}).GetLabel(), "threshold=2(Failures)");
    EXPECT_EQ(Make(kDistEmpirical, {}).GetLabel(), "");
    EXPECT_EQ(log.Texts(), (Texts{"nElem == 3", "nElem == 4"}));
}

// Reading the wrong kind is reported and gives a neutral value, never garbage.
TEST(MCDataValue, ReadingTheWrongKindIsReported) {
    EXPECT_EQ(MCDataValue(" 2.5 ").GetAsNumeric(), 2.5);
    EXPECT_EQ(MCDataValue(1000000).GetAsString(), "1000000");
    AssertionLog log;
    EXPECT_TRUE(MCMV::IsMissing(MCDataValue("x").GetNumeric()));
    EXPECT_EQ(MCDataValue(2.5).GetInteger(), 0);
    EXPECT_EQ(MCDataValue(2.5).GetString(), "");
    EXPECT_EQ(log.Texts().size(), 3u);
}

TEST(DistInfoElem, CopiesDoNotFollowTheOriginal) {
    DistInfoElem element = MakeCategorical({"a", "b"}, {0.5, 0.5});
    const DistInfoElem copy = element;
    element.SetDistType(kDistNormal);
    ASSERT_TRUE(element.AddParameter("mean", 1.0));
    EXPECT_EQ(copy.GetDistType(), kDistCategorical);
    EXPECT_EQ(copy.GetLabel(), "a=0.5 b=0.5");
}
