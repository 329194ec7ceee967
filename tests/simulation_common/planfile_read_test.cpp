// The plan file reader: a rich plan written and read back field by field (with the points the
// format does not keep), the reading rules on small documents, a table of malformed and
// hostile documents that must all be refused, and completion against the host's variables.
#include "planfile_testplans.h"

#include "mctolerance.h"

#include <gtest/gtest.h>

#include <sys/resource.h>

#include <fstream>
#include <memory>
#include <sstream>

using namespace planfile_test;

namespace {

//! Reads `text` into `plan`.
bool Read(const std::string& text, SPCSettings& plan, MCPlanXMLHandler handler = {}) {
    SPCSettings* target = &plan;
    return handler.ParsePlanFile(text, target);
}

//! A plan document around `body`.
std::string Doc(const std::string& body) {
    return "<SimulationPlan xmlns=\"http://xml.mcsim.org/software/analytics/Norvane/xml/"
           "simulation\"><Header/>" +
           body + "</SimulationPlan>";
}

//! A SimulatedFields section with one field around `content` (the distribution and more).
std::string Field(const std::string& content, const std::string& attributes = "") {
    return "<SimulatedFields numberOfFields=\"1\"><SimulatedField name=\"x\" "
           "numberOfTargets=\"0\" " +
           attributes + ">" + content + "</SimulatedField></SimulatedFields>";
}

//! Values of parameter `i` of `dist`, as doubles.
std::vector<double> Numbers(const DistInfoElem& dist, std::size_t i) {
    std::string name;
    std::vector<double> values;
    dist.GetParameterNameValue(i, name, values);
    return values;
}

std::vector<std::string> Texts(const DistInfoElem& dist, std::size_t i) {
    std::string name;
    std::vector<std::string> values;
    dist.GetParameterNameValue(i, name, values);
    return values;
}

void ExpectSameNumbers(const std::vector<double>& actual, const std::vector<double>& expected) {
    ASSERT_EQ(actual.size(), expected.size());
    for (std::size_t i = 0; i < actual.size(); ++i) {
        // Numbers are written in their shortest round-trip form: they come back exactly.
        EXPECT_TRUE(mctest::Near(actual[i], expected[i], 0.0)) << "entry " << i;
    }
}

void ExpectSameDistribution(const DistInfoElem& actual, const DistInfoElem& expected) {
    EXPECT_EQ(actual.GetDistType(), expected.GetDistType());
    EXPECT_EQ(actual.GetDistName(), expected.GetDistName());
    ASSERT_EQ(actual.GetParameterSize(), expected.GetParameterSize());
    for (std::size_t i = 0; i < actual.GetParameterSize(); ++i) {
        std::string actualName;
        std::string expectedName;
        std::vector<MCDataValue> values;
        actual.GetParameterNameValue(i, actualName, values);
        expected.GetParameterNameValue(i, expectedName, values);
        EXPECT_EQ(actualName, expectedName);
        if (expectedName == "cats") {
            EXPECT_EQ(Texts(actual, i), Texts(expected, i));
        } else {
            ExpectSameNumbers(Numbers(actual, i), Numbers(expected, i));
        }
    }
}

template <typename Input> void ExpectSameLabels(const Input& actual, const Input& expected) {
    std::vector<double> actualNumbers;
    std::vector<double> expectedNumbers;
    std::vector<std::string> actualTexts;
    std::vector<std::string> expectedTexts;
    std::vector<std::string> actualLabels;
    std::vector<std::string> expectedLabels;
    actual.GetValueLabels(actualNumbers, actualLabels);
    expected.GetValueLabels(expectedNumbers, expectedLabels);
    ExpectSameNumbers(actualNumbers, expectedNumbers);
    EXPECT_EQ(actualLabels, expectedLabels);
    actual.GetValueLabels(actualTexts, actualLabels);
    expected.GetValueLabels(expectedTexts, expectedLabels);
    EXPECT_EQ(actualTexts, expectedTexts);
}

void ExpectSameSimInput(const SimInputSpecs& actual, const SimInputSpecs& expected) {
    SCOPED_TRACE(expected.GetVarName());
    EXPECT_EQ(actual.GetVarName(), expected.GetVarName());
    EXPECT_EQ(actual.GetMapVarName(), expected.GetMapVarName());
    EXPECT_EQ(actual.GetMeasurementLevel(), expected.GetMeasurementLevel());
    EXPECT_EQ(actual.GetValueType(), expected.GetValueType());
    EXPECT_EQ(actual.GetAssociatTargetNames(), expected.GetAssociatTargetNames());
    EXPECT_EQ(actual.GetOutput(), expected.GetOutput());
    EXPECT_EQ(actual.GetOutputFormat(), expected.GetOutputFormat());
    EXPECT_EQ(actual.IsManual(), expected.IsManual());
    EXPECT_EQ(actual.IsLocked(), expected.IsLocked());
    EXPECT_EQ(actual.GetAutofitNames(), expected.GetAutofitNames());
    EXPECT_TRUE(mctest::Near(actual.GetMinimum(), expected.GetMinimum(), 0.0));
    EXPECT_TRUE(mctest::Near(actual.GetMaximum(), expected.GetMaximum(), 0.0));
    ExpectSameLabels(actual, expected);
    ASSERT_EQ(actual.GetDistElementSize(), expected.GetDistElementSize());
    for (std::size_t k = 0; k < actual.GetDistElementSize(); ++k) {
        ExpectSameDistribution(*actual.GetDistribution(k), *expected.GetDistribution(k));
    }
}

void ExpectSameTarget(const SPCSettings::ModelFileTarget& actual,
                      const SPCSettings::ModelFileTarget& expected) {
    SCOPED_TRACE(expected.fName);
    EXPECT_EQ(actual.fName, expected.fName);
    EXPECT_EQ(actual.fMapName, expected.fMapName);
    EXPECT_EQ(actual.fOutputFormat, expected.fOutputFormat);
    EXPECT_EQ(actual.fbExcludeFromOutput, expected.fbExcludeFromOutput);
    EXPECT_EQ(actual.fComment, expected.fComment);
    EXPECT_EQ(actual.fbHasTargetFilter, expected.fbHasTargetFilter);
    EXPECT_TRUE(mctest::Near(actual.fFilterLow, expected.fFilterLow, 0.0));
    EXPECT_TRUE(mctest::Near(actual.fFilterHigh, expected.fFilterHigh, 0.0));
    EXPECT_EQ(actual.fbIncludeLow, expected.fbIncludeLow);
    EXPECT_EQ(actual.fbIncludeHigh, expected.fbIncludeHigh);
    EXPECT_EQ(actual.fMeasurementLevel, expected.fMeasurementLevel);
}

} // namespace

TEST(PlanFileRead, RichPlanComesBackFieldByField) {
    const SPCSettings original = RichPlan();
    SPCSettings read;
    // Run and autofit settings are not in the file: the caller's values stay.
    read.SetSeed(7.0);
    read.SetAutoFitNCases(12);
    read.SetBins(33);
    MCPlanXMLHandler handler;
    SPCSettings* target = &read;
    ASSERT_TRUE(handler.ParsePlanFile(Written(original), target));
    EXPECT_EQ(handler.GetSPCSettings(), &read);
    EXPECT_TRUE(mctest::Near(read.GetSeed(), 7.0, 0.0));
    EXPECT_TRUE(read.UseRandomSeed());
    EXPECT_EQ(read.GetAutoFitNCases(), 12);
    EXPECT_EQ(read.GetAutoFitType(), kAndersonDarling);
    EXPECT_EQ(read.GetAutoFitMaxIterations(), 100);
    EXPECT_EQ(read.GetBins(), 33);

    // The points that the format does not keep, checked on their own, then aligned so that
    // everything else can be compared as a whole.
    SPCSettings expected = original;
    auto& readTargets = read.GetModelFileInfo().at(0).fvTargets;
    EXPECT_EQ(readTargets.at(2).fMeasurementLevel, kLevelContinuous); // level 0 written as 1
    expected.GetModelFileInfo()[0].fvTargets[2].fMeasurementLevel = kLevelContinuous;
    SimInputSpecs* demand = expected.GetSimInput("demand");
    EXPECT_EQ(read.GetSimInput("demand")->GetMeasurementLevel(), kLevelContinuous);
    EXPECT_EQ(read.GetSimInput("demand")->GetValueType(), IMCVariable::kNumericStorage);
    demand->SetVarLevel(kLevelContinuous);
    demand->SetValueType(IMCVariable::kNumericStorage);
    // A Negative binomial "type" other than 1.0 comes back as 2.0 (failures).
    const SimInputSpecs* claims = read.GetSimInput("claims");
    ASSERT_EQ(claims->GetDistElementSize(), 2u);
    for (std::size_t k = 0; k < 2; ++k) {
        EXPECT_EQ(Numbers(*claims->GetDistribution(k), 2), (std::vector<double>{2.0}));
    }
    SimInputSpecs claimsExpected =
        ParamInput("claims", true, kDistNegbinomial, {"thresh", "prob", "type"},
                   {{3.0, 0.4, 2.0}, {5.0, 0.25, 2.0}});
    claimsExpected.SetVarLevel(kLevelOrdinal);
    *expected.GetSimInput("claims") = claimsExpected;

    ASSERT_EQ(read.GetModelFileInfo().size(), expected.GetModelFileInfo().size());
    for (std::size_t f = 0; f < read.GetModelFileInfo().size(); ++f) {
        const auto& actualFile = read.GetModelFileInfo()[f];
        const auto& expectedFile = expected.GetModelFileInfo()[f];
        EXPECT_EQ(actualFile.fFilePath, expectedFile.fFilePath);
        EXPECT_EQ(actualFile.fbCustomModel, expectedFile.fbCustomModel);
        ASSERT_EQ(actualFile.fvTargets.size(), expectedFile.fvTargets.size());
        for (std::size_t t = 0; t < actualFile.fvTargets.size(); ++t) {
            ExpectSameTarget(actualFile.fvTargets[t], expectedFile.fvTargets[t]);
        }
    }

    ASSERT_EQ(read.GetSimulationInput().size(), expected.GetSimulationInput().size());
    for (std::size_t i = 0; i < read.GetSimulationInput().size(); ++i) {
        ExpectSameSimInput(read.GetSimulationInput()[i], expected.GetSimulationInput()[i]);
    }
    EXPECT_EQ(read.GetIterationIndex(), original.GetIterationIndex());
    EXPECT_EQ(read.GetIterationType(), original.GetIterationType());

    ASSERT_EQ(read.GetFixedInput().size(), expected.GetFixedInput().size());
    for (std::size_t i = 0; i < read.GetFixedInput().size(); ++i) {
        const FixedInputSpecs& actual = read.GetFixedInput()[i];
        const FixedInputSpecs& wanted = expected.GetFixedInput()[i];
        SCOPED_TRACE(wanted.GetVarName());
        EXPECT_EQ(actual.GetVarName(), wanted.GetVarName());
        EXPECT_EQ(actual.GetValueType(), wanted.GetValueType());
        EXPECT_EQ(actual.GetOutputFormat(), wanted.GetOutputFormat());
        EXPECT_EQ(actual.IsLocked(), wanted.IsLocked());
        EXPECT_EQ(actual.GetAssociatTargetNames(), wanted.GetAssociatTargetNames());
        EXPECT_EQ(actual.IsString(), wanted.IsString());
        std::vector<std::string> actualValues;
        std::vector<std::string> wantedValues;
        actual.GetInputValue(actualValues);
        wanted.GetInputValue(wantedValues);
        EXPECT_EQ(actualValues, wantedValues);
        ExpectSameLabels(actual, wanted);
    }

    EXPECT_EQ(read.GetCorrLocked(), expected.GetCorrLocked());
    EXPECT_EQ(read.GetCorrVarList(), expected.GetCorrVarList());
    ASSERT_EQ(read.GetCorrMatrix().size(), expected.GetCorrMatrix().size());
    for (std::size_t r = 0; r < read.GetCorrMatrix().size(); ++r) {
        ExpectSameNumbers(read.GetCorrMatrix()[r], expected.GetCorrMatrix()[r]);
    }
    EXPECT_TRUE(MCMV::IsMissing(read.GetCorrMatrix()[2][1]));

    EXPECT_EQ(read.GetCrstabsFactors(), expected.GetCrstabsFactors());
    EXPECT_EQ(read.GetCrstabsMatrix(), expected.GetCrstabsMatrix());
    ExpectSameNumbers(read.GetCrstabsProbs(), expected.GetCrstabsProbs());

    EXPECT_EQ(read.GetMaxCases(), 5000);
    ASSERT_EQ(read.GetStopCriteriaPointValueSize(), 1u);
    const auto& mean = read.GetStopCriteriaPointValue()[0];
    EXPECT_EQ(mean.fTargetName, "profit");
    EXPECT_EQ(mean.fUnit, kUnitPercent);
    EXPECT_TRUE(mctest::Near(mean.fThreshold, 1.0, 0.0));
    EXPECT_TRUE(mctest::Near(mean.fCiLevel, 0.95, 0.0));
    ASSERT_EQ(read.GetStopCriteriaTailsSize(), 2u);
    const auto& tail = read.GetStopCriteriaTails()[0];
    EXPECT_EQ(tail.fTargetName, "profit");
    EXPECT_TRUE(mctest::Near(tail.fThreshold, 500.0, 0.0));
    EXPECT_EQ(tail.fSide, kSideLeft);
    EXPECT_EQ(tail.fType, kTailPercentile);
    EXPECT_EQ(tail.fFrequency, 100);
    EXPECT_EQ(read.GetStopCriteriaTails()[1].fSide, kSideRight);
    EXPECT_EQ(read.GetStopCriteriaTails()[1].fType, kTailValue);

    // Written again, the plan gives the same document but for the time stamp.
    const std::string again = Written(read);
    const std::string first = Written(original);
    auto withoutStamp = [](std::string text) {
        const std::size_t at = text.find("autofitTimeStamp=\"");
        return text.erase(at, text.find('"', at + 18) - at);
    };
    EXPECT_EQ(withoutStamp(again), withoutStamp(first));
}

TEST(PlanFileRead, StreamFormAndCallerPlanIsAddedTo) {
    SPCSettings plan;
    plan.AddFixedInput("kept", std::vector<double>{1.0}, "");
    std::istringstream stream(Written(ExamplePlan()));
    MCPlanXMLHandler handler;
    SPCSettings* target = &plan;
    ASSERT_TRUE(handler.ParsePlanFile(stream, target));
    EXPECT_NE(plan.GetFixedInput("kept"), nullptr);
    EXPECT_NE(plan.GetFixedInput("discount"), nullptr);
    EXPECT_EQ(plan.GetSimulationInput().size(), 3u);

    std::istringstream bad;
    bad.setstate(std::ios::failbit);
    EXPECT_FALSE(handler.ParsePlanFile(bad, target));
    SPCSettings* none = nullptr;
    EXPECT_FALSE(handler.ParsePlanFile(Written(ExamplePlan()), none));
}

TEST(PlanFileRead, ShippedExamplePlanReads) {
    std::ifstream file(ExamplePlanPath(), std::ios::binary);
    ASSERT_TRUE(file.good()) << ExamplePlanPath();
    SPCSettings plan;
    MCPlanXMLHandler handler;
    SPCSettings* target = &plan;
    ASSERT_TRUE(handler.ParsePlanFile(file, target));
    EXPECT_EQ(plan.GetModelFile(), "../models/order_profit.model");
    const SPCSettings example = ExamplePlan();
    ASSERT_EQ(plan.GetSimulationInput().size(), example.GetSimulationInput().size());
    for (std::size_t i = 0; i < plan.GetSimulationInput().size(); ++i) {
        ExpectSameSimInput(plan.GetSimulationInput()[i], example.GetSimulationInput()[i]);
    }
    EXPECT_EQ(plan.GetSimInput("volume")->GetDistribution(0)->GetLabel(),
              "min=800 max=1500 mode=1000");
    EXPECT_EQ(plan.GetCorrVarList(), (std::vector<std::string>{"unit_price", "volume"}));
    EXPECT_EQ(plan.GetStopCriteriaPointValueSize(), 1u);
}

TEST(PlanFileRead, OnlyAHeaderOrAnotherRootReadsAsNothing) {
    SPCSettings plan;
    EXPECT_TRUE(Read(Doc(""), plan));
    EXPECT_TRUE(Read("<Other><Unknown/></Other>", plan));
    EXPECT_TRUE(plan.GetSimulationInput().empty());
    EXPECT_TRUE(plan.GetModelFileInfo().empty());
    EXPECT_EQ(plan.GetMaxCases(), 100000);
}

TEST(PlanFileRead, SectionsAreFoundByNameAndOnlyTheFirstCounts) {
    SPCSettings plan;
    ASSERT_TRUE(Read(Doc("<Settings simulatedCases=\"10\" numberOfCriteria=\"0\"/>"
                         "<Settings simulatedCases=\"bad\" numberOfCriteria=\"0\"/>" +
                         Field("<Normal><Parameters mean=\"1\" stddev=\"2\"/></Normal>")),
                     plan));
    EXPECT_EQ(plan.GetMaxCases(), 10);
    ASSERT_NE(plan.GetSimInput("x"), nullptr);
    EXPECT_EQ(plan.GetSimInput("x")->GetFinalDistType(), kDistNormal);
}

TEST(PlanFileRead, ParameterSetsBecomeDistributions) {
    SPCSettings plan;
    ASSERT_TRUE(Read(Doc(Field("<DistNormal><Parameters mean=\"0\" stddev=\"1\"/>"
                               "<Parameters mean=\"5\" stddev=\"NaN\"/></DistNormal>")),
                     plan));
    const SimInputSpecs* x = plan.GetSimInput("x");
    ASSERT_EQ(x->GetDistElementSize(), 2u);
    EXPECT_EQ(x->GetMeasurementLevel(), kLevelCategorical); // no level given
    EXPECT_TRUE(x->IsManual());                             // autofitted is not "yes"
    EXPECT_EQ(Numbers(*x->GetDistribution(1), 0), (std::vector<double>{5.0}));
    EXPECT_TRUE(MCMV::IsMissing(Numbers(*x->GetDistribution(1), 1).at(0)));
    EXPECT_EQ(plan.GetIterationIndex(), 0);
    EXPECT_EQ(plan.GetIterationType(), SPCSettings::kIterManualInput);
}

TEST(PlanFileRead, ParametersComeInTheOrderOfTheDistribution) {
    // The DOM lists attributes by name; the simulator reads parameters by position.
    SPCSettings plan;
    ASSERT_TRUE(Read(Doc(Field("<DistTriangular><Parameters mode=\"2\" zeta=\"9\" max=\"3\" "
                               "min=\"1\"/></DistTriangular>")),
                     plan));
    const DistInfoElem* triangular = plan.GetSimInput("x")->GetDistribution(0);
    ASSERT_EQ(triangular->GetParameterSize(), 4u);
    EXPECT_EQ(triangular->GetLabel(), "min=1 max=3 mode=2 zeta=9");

    SPCSettings gamma;
    ASSERT_TRUE(
        Read(Doc(Field("<DistGamma><Parameters scale=\"4\" shape=\"0.5\"/></DistGamma>")), gamma));
    EXPECT_EQ(gamma.GetSimInput("x")->GetDistribution(0)->GetLabel(), "shape=0.5 scale=4");
}

TEST(PlanFileRead, NegativeBinomialTypeComesFromTheElement) {
    SPCSettings plan;
    ASSERT_TRUE(Read(Doc(Field("<DistNegbinomial type=\"trials\">"
                               "<Parameters prob=\"0.3\" thresh=\"4\"/></DistNegbinomial>")),
                     plan));
    const DistInfoElem* trials = plan.GetSimInput("x")->GetDistribution(0);
    ASSERT_EQ(trials->GetParameterSize(), 3u);
    EXPECT_EQ(trials->GetLabel(), "threshold=4 prob=0.3(Trials)");

    SPCSettings other;
    ASSERT_TRUE(Read(Doc(Field("<DistNegbinomial><Parameters thresh=\"4\" p=\"0.3\"/>"
                               "</DistNegbinomial>")),
                     other));
    EXPECT_EQ(Numbers(*other.GetSimInput("x")->GetDistribution(0), 2), (std::vector<double>{2.0}));
}

TEST(PlanFileRead, CategoricalProbabilityColumnsBecomeDistributions) {
    SPCSettings plan;
    ASSERT_TRUE(Read(Doc(Field("<DistCategorical>"
                               "<Category value=\"a\"><Probability value=\"0.2\"/>"
                               "<Probability value=\"0.6\"/></Category>"
                               "<Category value=\"b\"><Probability value=\"0.8\"/>"
                               "<Probability value=\"0.4\"/></Category></DistCategorical>",
                               "valueType=\"string\"")),
                     plan));
    const SimInputSpecs* x = plan.GetSimInput("x");
    ASSERT_EQ(x->GetDistElementSize(), 2u);
    EXPECT_EQ(x->GetDistribution(0)->GetLabel(), "a=0.2 b=0.8");
    EXPECT_EQ(x->GetDistribution(1)->GetLabel(), "a=0.6 b=0.4");
}

TEST(PlanFileRead, CorrelationCellsWithMissingOrNoValue) {
    SPCSettings plan;
    ASSERT_TRUE(Read(Doc("<CorrMatrix numberOfCells=\"3\">"
                         "<CorrCell rowVar=\"a\" colVar=\"b\" value=\".\"/>"
                         "<CorrCell rowVar=\"c\" colVar=\"a\"/>"
                         "<CorrCell rowVar=\"c\" colVar=\"b\" value=\"0.5\"/></CorrMatrix>"),
                     plan));
    EXPECT_FALSE(plan.GetCorrLocked());
    EXPECT_EQ(plan.GetCorrVarList(), (std::vector<std::string>{"b", "a", "c"}));
    EXPECT_TRUE(MCMV::IsMissing(plan.GetCorrMatrix()[1][0]));
    EXPECT_EQ(plan.GetCorrMatrix()[2], (std::vector<double>{0.5, 0.0, 1.0}));
}

TEST(PlanFileRead, CriteriaRules) {
    const auto criteria = [](const std::string& pointValue, const std::string& tail) {
        return Doc("<Settings simulatedCases=\"1\" numberOfCriteria=\"2\">"
                   "<Criteria target=\"t\" type=\"point_value\"><PointValue threshold=\"2\" "
                   "unit=\"value\" " +
                   pointValue + "/></Criteria><Criteria target=\"t\" type=\"tail\"><Tail " + tail +
                   "/></Criteria></Settings>");
    };
    SPCSettings plan;
    ASSERT_TRUE(
        Read(criteria("confidenceLevel=\"100\"", "side=\"Left\" type=\"Percentile\""), plan));
    EXPECT_TRUE(mctest::Near(plan.GetStopCriteriaPointValue()[0].fCiLevel, 1.0, 0.0));
    const auto& tail = plan.GetStopCriteriaTails()[0];
    EXPECT_EQ(tail.fSide, kSideRight);
    EXPECT_EQ(tail.fType, kTailValue);
    EXPECT_TRUE(MCMV::IsMissing(tail.fThreshold));
    EXPECT_EQ(tail.fFrequency, 0);

    for (const char* level : {"100.5", "-1", "NaN", "INF"}) {
        SPCSettings refused;
        EXPECT_FALSE(Read(criteria(std::string("confidenceLevel=\"") + level + "\"", ""), refused))
            << level;
    }
}

TEST(PlanFileRead, ProbabilityHelperAddsOnlyACompleteList) {
    MCXML_800::MCXMLReadWrite parser;
    ASSERT_TRUE(parser.ParseToDOM("<E><Probability value=\"0.25\"/><Probability value=\".\"/>"
                                  "<Probability value=\"x\"/></E>"));
    const xercesc::DOMElement* element = parser.GetDocument()->getDocumentElement();
    DistInfoElem dist;
    dist.SetDistType(kDistEmpirical);
    DistInfoElem* pointer = &dist;
    std::vector<double> probs;
    EXPECT_FALSE(MCPlanXMLHandler::HandleProbabilityEle(element, pointer, "probs", probs));
    ASSERT_EQ(probs.size(), 2u);
    EXPECT_TRUE(MCMV::IsMissing(probs[1]));
    EXPECT_EQ(dist.GetParameterSize(), 0u);

    ASSERT_TRUE(parser.ParseToDOM("<E><Probability value=\"0.25\"/><Other/></E>"));
    probs.clear();
    EXPECT_TRUE(MCPlanXMLHandler::HandleProbabilityEle(parser.GetDocument()->getDocumentElement(),
                                                       pointer, "probs", probs));
    EXPECT_EQ(Numbers(dist, 0), (std::vector<double>{0.25}));
}

// ---- Malformed and hostile documents: every one is refused --------------------------------

struct BadDocument {
    const char* name;
    std::string text;
};

class PlanFileHostile : public ::testing::TestWithParam<BadDocument> {};

TEST_P(PlanFileHostile, IsRefused) {
    SPCSettings plan;
    MCPlanXMLHandler handler;
    SPCSettings* target = &plan;
    EXPECT_FALSE(handler.ParsePlanFile(GetParam().text, target));
    EXPECT_EQ(handler.GetSPCSettings(), nullptr);
}

namespace {

std::string Criteria(const std::string& inner) {
    return Doc("<Settings simulatedCases=\"1\" numberOfCriteria=\"1\">" + inner + "</Settings>");
}

std::string PointValue(const std::string& attributes) {
    return Criteria("<Criteria target=\"t\" type=\"point_value\"><PointValue " + attributes +
                    "/></Criteria>");
}

std::string Table(const std::string& counts, const std::string& content) {
    return Doc("<ContingencyTable " + counts + ">" + content + "</ContingencyTable>");
}

const char kTwoCells[] = "<CrossFactors><Factor name=\"a\"/></CrossFactors>"
                         "<TableCell probability=\"0.5\"><CrossCategory category=\"x\"/>"
                         "</TableCell><TableCell probability=\"0.5\">"
                         "<CrossCategory category=\"y\"/></TableCell>";

std::string Normal(const std::string& parameters) {
    return Doc(Field("<DistNormal><Parameters " + parameters + "/></DistNormal>"));
}

std::string Category(const std::string& probabilities) {
    return Doc(Field("<DistCategorical><Category value=\"a\">" + probabilities +
                     "</Category></DistCategorical>"));
}

std::string Nested(int depth) {
    std::string open;
    std::string close;
    for (int i = 0; i < depth; ++i) {
        open += "<n>";
        close += "</n>";
    }
    return Doc(Field("<DistNormal><Parameters mean=\"0\" stddev=\"1\">" + open + close +
                     "</Parameters></DistNormal>"));
}

// Cells each naming two new variables: the triangle grows with the square of the cells.
std::string CorrelationExplosion(int nCells) {
    std::string cells;
    for (int i = 0; i < nCells; ++i) {
        cells += "<CorrCell rowVar=\"r" + std::to_string(i) + "\" colVar=\"c" + std::to_string(i) +
                 "\" value=\"0\"/>";
    }
    return Doc("<CorrMatrix numberOfCells=\"1\">" + cells + "</CorrMatrix>");
}

// One long category and many parameter sets: every set would copy the category.
std::string CategoryExplosion() {
    std::string probabilities;
    for (int i = 0; i < 100; ++i) {
        probabilities += "<Probability value=\"1\"/>";
    }
    return Doc(Field("<DistCategorical><Category value=\"" + std::string(1 << 20, 'c') + "\">" +
                     probabilities + "</Category></DistCategorical>"));
}

std::vector<BadDocument> BadDocuments() {
    const std::string good = Written(ExamplePlan());
    return {
        // Not a plan document at all.
        {"Empty", ""},
        {"NotXML", "this is not XML"},
        {"Truncated", good.substr(0, good.size() / 2)},
        {"Doctype", "<!DOCTYPE p [<!ENTITY e \"x\">]><SimulationPlan>&e;</SimulationPlan>"},
        {"NestedTooDeep", Nested(400)},
        // Model files and targets.
        {"ModelFilesWithoutFile", Doc("<ModelFiles numberOfFiles=\"1\"/>")},
        {"ModelFilesWithoutCount", Doc("<ModelFiles><ModelFile/></ModelFiles>")},
        {"TargetWithoutName",
         Doc("<ModelFiles numberOfFiles=\"1\"><ModelFile><Target/></ModelFile></ModelFiles>")},
        {"FilterIncludeLowTrue",
         Doc("<ModelFiles numberOfFiles=\"1\"><ModelFile><Target name=\"t\"><TargetFilter "
             "low=\"0\" includeLow=\"true\"/></Target></ModelFile></ModelFiles>")},
        // Simulated fields.
        {"SimulatedFieldsWithoutField", Doc("<SimulatedFields numberOfFields=\"0\"/>")},
        {"FieldWithoutDistribution", Doc(Field("<AssociatedTarget name=\"t\"/>"))},
        {"FieldStartingWithItsCandidates",
         Doc(Field("<AutofitDistList><DistName name=\"Normal\"/></AutofitDistList>"
                   "<DistNormal><Parameters mean=\"0\" stddev=\"1\"/></DistNormal>"))},
        {"FieldWithoutTargetCount",
         Doc("<SimulatedFields numberOfFields=\"1\"><SimulatedField name=\"x\"><DistNormal>"
             "<Parameters mean=\"0\" stddev=\"1\"/></DistNormal></SimulatedField>"
             "</SimulatedFields>")},
        {"DistributionWithoutParameters", Doc(Field("<DistNormal/>"))},
        {"ParameterINF", Normal("mean=\"INF\" stddev=\"1\"")},
        {"ParameterOverflowing", Normal("mean=\"1e400\" stddev=\"1\"")},
        {"ParameterNotANumber", Normal("mean=\"ten\" stddev=\"1\"")},
        {"ParameterEmpty", Normal("mean=\"\" stddev=\"1\"")},
        {"ParameterMissingDot", Normal("mean=\".\" stddev=\"1\"")},
        {"NegBinProbabilityNotANumber",
         Doc(Field("<DistNegbinomial><Parameters thresh=\"1\" prob=\"p\"/></DistNegbinomial>"))},
        {"CategoryProbabilityNotANumber", Category("<Probability value=\"x\"/>")},
        {"CategoryProbabilityNaN", Category("<Probability value=\"NaN\"/>")},
        {"CategoryProbabilityINF", Category("<Probability value=\"INF\"/>")},
        {"CategoryRowsOfUnequalLength",
         Doc(Field("<DistCategorical><Category value=\"a\"><Probability value=\"0.5\"/>"
                   "<Probability value=\"0.5\"/></Category><Category value=\"b\">"
                   "<Probability value=\"0.5\"/></Category></DistCategorical>"))},
        {"CategoryCopiesBeyondTheCap", CategoryExplosion()},
        {"IntervalMaxINF", Doc(Field("<DistUserRanges><Interval min=\"0\" max=\"INF\"><Probability "
                                     "value=\"1\"/></Interval></DistUserRanges>"))},
        {"IntervalWithoutMin",
         Doc(Field("<DistUserRanges><Interval max=\"1\"><Probability value=\"1\"/></Interval>"
                   "</DistUserRanges>"))},
        {"EmpiricalWithoutMax", Doc(Field("<DistEmpirical min=\"0\" stddev=\"1\"/>"))},
        {"EmpiricalMinINF", Doc(Field("<DistEmpirical min=\"-INF\" max=\"1\"/>"))},
        {"EmpiricalProbabilityINF",
         Doc(Field("<DistEmpirical min=\"0\" max=\"1\"><Probability value=\"INF\"/>"
                   "</DistEmpirical>"))},
        {"AssociatedTargetWithoutName",
         Doc(Field("<DistNormal><Parameters mean=\"0\"/></DistNormal><AssociatedTarget/>"))},
        {"NumericValueLabelWithoutValue",
         Doc(Field("<DistNormal><Parameters mean=\"0\"/></DistNormal>"
                   "<ValueLabels><ValueLabel displayValue=\"d\"/></ValueLabels>"))},
        // Fixed fields.
        {"FixedFieldsWithoutField", Doc("<FixedFields numberOfFields=\"0\"/>")},
        {"FixedFieldWithoutName",
         Doc("<FixedFields numberOfFields=\"1\"><FixedField><Value value=\"1\"/></FixedField>"
             "</FixedFields>")},
        {"FixedNumericValueNotANumber",
         Doc("<FixedFields numberOfFields=\"1\"><FixedField name=\"f\" valueType=\"double\">"
             "<Value value=\"one\"/></FixedField></FixedFields>")},
        // Correlations.
        {"CorrMatrixLockedMaybe", Doc("<CorrMatrix numberOfCells=\"0\" locked=\"maybe\"/>")},
        {"CorrCellWithoutRow",
         Doc("<CorrMatrix numberOfCells=\"1\"><CorrCell colVar=\"a\" value=\"1\"/></CorrMatrix>")},
        {"CorrCellNotANumber", Doc("<CorrMatrix numberOfCells=\"1\"><CorrCell rowVar=\"a\" "
                                   "colVar=\"b\" value=\"high\"/></CorrMatrix>")},
        {"CorrCellINF", Doc("<CorrMatrix numberOfCells=\"1\"><CorrCell rowVar=\"a\" colVar=\"b\" "
                            "value=\"INF\"/></CorrMatrix>")},
        {"CorrelationTriangleBeyondTheCap", CorrelationExplosion(1000)},
        // Contingency table.
        {"TableMoreProbabilitiesThanCells",
         Table("numOfCrossFactors=\"1\" numOfCrossProbValues=\"3\"", kTwoCells)},
        {"TableHugeProbabilityCount",
         Table("numOfCrossFactors=\"1\" numOfCrossProbValues=\"2000000000\"", kTwoCells)},
        {"TableHugeFactorCount",
         Table("numOfCrossFactors=\"2000000000\" numOfCrossProbValues=\"2\"", kTwoCells)},
        {"TableHugeFactorCountNoCells",
         Table("numOfCrossFactors=\"2000000000\" numOfCrossProbValues=\"0\"", "")},
        {"TableCountsBeyondInt",
         Table("numOfCrossFactors=\"1\" numOfCrossProbValues=\"1e12\"", kTwoCells)},
        {"TableNegativeCount",
         Table("numOfCrossFactors=\"-1\" numOfCrossProbValues=\"2\"", kTwoCells)},
        {"TableMoreFactorsThanCount",
         Table("numOfCrossFactors=\"1\" numOfCrossProbValues=\"0\"",
               "<CrossFactors><Factor name=\"a\"/><Factor name=\"b\"/></CrossFactors>")},
        {"TableMoreCategoriesThanFactors",
         Table("numOfCrossFactors=\"1\" numOfCrossProbValues=\"1\"",
               "<TableCell probability=\"1\"><CrossCategory category=\"x\"/>"
               "<CrossCategory category=\"y\"/></TableCell>")},
        {"TableCellWithoutProbability",
         Table("numOfCrossFactors=\"1\" numOfCrossProbValues=\"1\"",
               "<TableCell><CrossCategory category=\"x\"/></TableCell>")},
        {"TableProbabilityNaN", Table("numOfCrossFactors=\"1\" numOfCrossProbValues=\"1\"",
                                      "<TableCell probability=\"NaN\"><CrossCategory "
                                      "category=\"x\"/></TableCell>")},
        // Settings and criteria.
        {"SettingsWithoutCases", Doc("<Settings numberOfCriteria=\"0\"/>")},
        {"SettingsCasesNotAnInteger",
         Doc("<Settings simulatedCases=\"10.5\" numberOfCriteria=\"0\"/>")},
        {"CriteriaWithoutTarget", Criteria("<Criteria type=\"tail\"><Tail/></Criteria>")},
        {"CriteriaOfOtherType", Criteria("<Criteria target=\"t\" type=\"median\"/>")},
        {"PointValueMissing", Criteria("<Criteria target=\"t\" type=\"point_value\"/>")},
        {"PointValueWithoutUnit", PointValue("threshold=\"1\" confidenceLevel=\"95\"")},
        {"PointValueUnitCapitalised",
         PointValue("threshold=\"1\" unit=\"Percent\" confidenceLevel=\"95\"")},
        {"PointValueThresholdNaN",
         PointValue("threshold=\"NaN\" unit=\"value\" confidenceLevel=\"95\"")},
    };
}

} // namespace

INSTANTIATE_TEST_SUITE_P(Documents, PlanFileHostile, ::testing::ValuesIn(BadDocuments()),
                         [](const ::testing::TestParamInfo<BadDocument>& row) {
                             return std::string(row.param.name);
                         });

TEST(PlanFileRead, HugeTableCountIsRefusedBeforeAllocating) {
    // 20 million rows of one factor would take about 700 MB if the count sized the lists.
    rusage before{};
    ASSERT_EQ(getrusage(RUSAGE_SELF, &before), 0);
    SPCSettings plan;
    EXPECT_FALSE(
        Read(Table("numOfCrossFactors=\"1\" numOfCrossProbValues=\"20000000\"", kTwoCells), plan));
    rusage after{};
    ASSERT_EQ(getrusage(RUSAGE_SELF, &after), 0);
    EXPECT_LT(after.ru_maxrss - before.ru_maxrss, 100L * 1024) << "peak grew by KiB";
}

TEST(PlanFileRead, ThousandsOfFieldsAreRead) {
    std::string fields;
    for (int i = 0; i < 3000; ++i) {
        fields += "<SimulatedField name=\"x" + std::to_string(i) +
                  "\" numberOfTargets=\"0\"><DistPoisson><Parameters mean=\"2\"/>"
                  "</DistPoisson></SimulatedField>";
    }
    SPCSettings plan;
    ASSERT_TRUE(Read(
        Doc("<SimulatedFields numberOfFields=\"3000\">" + fields + "</SimulatedFields>"), plan));
    EXPECT_EQ(plan.GetSimulationInput().size(), 3000u);
}

// ---- Completion and validation against the host's variables --------------------------------

namespace {

MCXML_800::MCVarList ExampleVariables(bool withDiscount) {
    MCXML_800::MCVarList vars;
    for (const char* name : {"unit_price", "volume", "profit"}) {
        vars.Add(std::make_unique<MCXML_800::MCScaleVar>(name));
    }
    vars.Add(std::make_unique<MCXML_800::MCCatVar>(
        "region", MCXML_800::MCCatNumEncoder(std::vector<std::string>{"north", "south", "west"})));
    if (withDiscount) {
        vars.Add(std::make_unique<MCXML_800::MCScaleVar>("discount"));
    }
    return vars;
}

} // namespace

TEST(PlanFileRead, HandlerWithVariablesCompletesAndValidates) {
    SPCSettings example = ExamplePlan();
    example.GetModelFileInfo()[0].fvTargets[0].fMeasurementLevel = kLevelUnknown;
    const std::string text = Written(example);

    MCPlanXMLHandler handler(ExampleVariables(true), "tag", false);
    SPCSettings plan;
    SPCSettings* target = &plan;
    ASSERT_TRUE(handler.ParsePlanFile(text, target));
    // Written as continuous (level 0 is written so), then left alone by the completion.
    EXPECT_EQ(plan.GetModelFileInfo()[0].fvTargets[0].fMeasurementLevel, kLevelContinuous);

    // A fixed input the data lacks fails the read; the settings pointer stays unset.
    MCPlanXMLHandler strict(ExampleVariables(false), "tag", false);
    SPCSettings other;
    target = &other;
    EXPECT_FALSE(strict.ParsePlanFile(text, target));
    EXPECT_EQ(strict.GetSPCSettings(), nullptr);

    // A copy of the handler carries the variable list.
    MCPlanXMLHandler copy = strict;
    SPCSettings third;
    target = &third;
    EXPECT_FALSE(copy.ParsePlanFile(text, target));
}

TEST(PlanFileRead, CompletionFillsTargetsWithoutAWrittenLevel) {
    // A hand-written target without measurementLevel has level 0 until completed.
    const std::string text =
        Doc("<ModelFiles numberOfFiles=\"1\"><ModelFile file=\"m\"><Target name=\"region\"/>"
            "<Target name=\"absent\"/></ModelFile></ModelFiles>");
    MCPlanXMLHandler handler(ExampleVariables(false), "", false);
    SPCSettings plan;
    SPCSettings* target = &plan;
    ASSERT_TRUE(handler.ParsePlanFile(text, target));
    EXPECT_EQ(plan.GetModelFileInfo()[0].fvTargets[0].fMeasurementLevel, kLevelCategorical);
    EXPECT_EQ(plan.GetModelFileInfo()[0].fvTargets[1].fMeasurementLevel, kLevelUnknown);
}

TEST(PlanFileRead, EveryStorageWordComesBack) {
    for (const auto storage :
         {IMCVariable::kIntegerStorage, IMCVariable::kStringStorage, IMCVariable::kDateStorage,
          IMCVariable::kTimeStorage, IMCVariable::kTimestampStorage}) {
        SPCSettings plan;
        SimInputSpecs input = ParamInput("x", true, kDistNormal, {"mean", "stddev"}, {{1.0, 2.0}});
        input.SetValueType(storage);
        plan.AddSimulationInput(input);
        SPCSettings read;
        ASSERT_TRUE(Read(Written(plan), read));
        EXPECT_EQ(read.GetSimInput("x")->GetValueType(), storage);
    }
}
