// The plan file writer: the written text is parsed again and checked for the exact elements,
// attributes, words and number forms of the format, and for the failures of the builders.
#include "planfile_testplans.h"

#include <gtest/gtest.h>

#include <xercesc/dom/DOMNamedNodeMap.hpp>

#include <algorithm>
#include <cctype>
#include <fstream>

using namespace planfile_test;
using MCXML_800::MCXMLReadWrite;
using xercesc::DOMElement;
using xercesc::DOMNode;

namespace {

// The written text parsed again, with lookups by element path.
class WrittenDoc {
public:
    explicit WrittenDoc(const std::string& text) : fText(text) {
        EXPECT_TRUE(fParser.ParseToDOM(text)) << fParser.GetErrorMessage();
    }

    const std::string& Text() const { return fText; }

    const DOMElement* Root() const {
        return fParser.GetDocument() ? fParser.GetDocument()->getDocumentElement() : nullptr;
    }

    //! The element at `path`, "A/B[2]/C" style (0-based indices, 0 when left out).
    const DOMElement* At(const std::string& path) const {
        const DOMElement* element = Root();
        std::size_t start = 0;
        while (element != nullptr && start < path.size()) {
            std::size_t end = path.find('/', start);
            if (end == std::string::npos) {
                end = path.size();
            }
            std::string step = path.substr(start, end - start);
            int index = 0;
            const std::size_t bracket = step.find('[');
            if (bracket != std::string::npos) {
                index = std::stoi(step.substr(bracket + 1));
                step = step.substr(0, bracket);
            }
            element = MCXML_800::GetFirstChildElmt(element, step);
            for (int i = 0; i < index && element != nullptr; ++i) {
                element = MCXML_800::GetNextSiblingElmt(element, step);
            }
            start = end + 1;
        }
        return element;
    }

    //! The attributes of the element at `path` as "name=value" in name order; "<none>" when
    //! there is no such element.
    std::string Attrs(const std::string& path) const {
        const DOMElement* element = At(path);
        if (element == nullptr) {
            return "<none>";
        }
        std::vector<std::string> entries;
        const xercesc::DOMNamedNodeMap* map = element->getAttributes();
        for (XMLSize_t i = 0; map != nullptr && i < map->getLength(); ++i) {
            entries.push_back(MCXML_800::ToUTF8(map->item(i)->getNodeName()) + "=" +
                              MCXML_800::ToUTF8(map->item(i)->getNodeValue()));
        }
        std::sort(entries.begin(), entries.end());
        std::string text;
        for (const std::string& entry : entries) {
            text += (text.empty() ? "" : " ") + entry;
        }
        return text;
    }

    //! Names of the child elements of the element at `path`, blank-separated.
    std::string Children(const std::string& path) const {
        std::string text;
        const DOMElement* element = At(path);
        for (const DOMElement* child = element ? MCXML_800::GetFirstChildElmt(element) : nullptr;
             child != nullptr; child = MCXML_800::GetNextSiblingElmt(child)) {
            text += (text.empty() ? "" : " ") + MCXML_800::ToUTF8(child->getTagName());
        }
        return text;
    }

private:
    std::string fText;
    MCXMLReadWrite fParser;
};

//! "yyyy.mm.dd h:mm" or "yyyy.mm.dd hh:mm".
bool IsTimeStamp(const std::string& text) {
    const std::string shape = text.size() == 15 ? "dddd.dd.dd d:dd" : "dddd.dd.dd dd:dd";
    if (text.size() != shape.size()) {
        return false;
    }
    for (std::size_t i = 0; i < text.size(); ++i) {
        const bool digit = std::isdigit(static_cast<unsigned char>(text[i])) != 0;
        if (shape[i] == 'd' ? !digit : text[i] != shape[i]) {
            return false;
        }
    }
    return true;
}

} // namespace

TEST(PlanFileWrite, RootHeaderAndSectionsInOrder) {
    const WrittenDoc doc(Written(RichPlan()));
    EXPECT_EQ(doc.Text().rfind("<?xml version=\"1.0\" encoding=\"UTF-8\"", 0), 0u);
    EXPECT_EQ(doc.Text().find('\n'), std::string::npos) << "no pretty-print";

    const std::string ns = "http://xml.mcsim.org/software/analytics/Norvane/xml/simulation";
    const DOMElement* root = doc.Root();
    ASSERT_NE(root, nullptr);
    EXPECT_EQ(MCXML_800::ToUTF8(root->getTagName()), "SimulationPlan");
    EXPECT_EQ(MCXML_800::ToUTF8(root->getNamespaceURI()), ns);
    std::string value;
    ASSERT_TRUE(MCXML_800::GetAttribute(root, "xsi:schemaLocation", value));
    EXPECT_EQ(value, ns + " " + ns + "/simulationplan.xsd");
    ASSERT_TRUE(MCXML_800::GetAttribute(root, "xmlns:xsi", value));
    EXPECT_EQ(value, "http://www.w3.org/2001/XMLSchema-instance");
    ASSERT_TRUE(MCXML_800::GetAttribute(root, "version", value));
    EXPECT_EQ(value, "21.0.0.0");
    ASSERT_TRUE(MCXML_800::GetAttribute(root, "autofitTimeStamp", value));
    EXPECT_TRUE(IsTimeStamp(value)) << value;

    EXPECT_EQ(doc.Children(""),
              "Header ModelFiles SimulatedFields FixedFields CorrMatrix ContingencyTable Settings");
    EXPECT_EQ(doc.Attrs("Header"),
              "copyright=Copyright (C) 2026 the mcsim developers. All rights reserved.");
    EXPECT_EQ(doc.Attrs("Header/Application"), "name=Tessary Norvane Statistics version=21.0.0.0");
}

TEST(PlanFileWrite, EmptyPlanHoldsHeaderAndSettingsOnly) {
    const WrittenDoc doc(Written(SPCSettings()));
    EXPECT_EQ(doc.Children(""), "Header Settings");
    EXPECT_EQ(doc.Attrs("Settings"), "numberOfCriteria=0 simulatedCases=100000");
    EXPECT_EQ(doc.Children("Settings"), "");
}

TEST(PlanFileWrite, ModelFilesTargetsFiltersAndComments) {
    const WrittenDoc doc(Written(RichPlan()));
    EXPECT_EQ(doc.Attrs("ModelFiles"), "numberOfFiles=2");
    EXPECT_EQ(doc.Attrs("ModelFiles/ModelFile"),
              "customModels=no file=models/profit.xml numberOfTargets=4");
    EXPECT_EQ(doc.Attrs("ModelFiles/ModelFile/Target"),
              "excludeFromOutput=no mappedName=profit_pred measurementLevel=continuous "
              "name=profit outputFormat=F8.2");
    EXPECT_EQ(doc.Children("ModelFiles/ModelFile/Target"), "TargetFilter Comment");
    EXPECT_EQ(doc.Attrs("ModelFiles/ModelFile/Target/TargetFilter"),
              "high=1000000 includeHigh=yes includeLow=no low=0");
    const DOMElement* comment = doc.At("ModelFiles/ModelFile/Target/Comment");
    ASSERT_NE(comment, nullptr);
    EXPECT_EQ(MCXML_800::ToUTF8(comment->getTextContent()), "net profit <after tax> & fees");

    EXPECT_EQ(doc.Attrs("ModelFiles/ModelFile/Target[1]"),
              "excludeFromOutput=yes measurementLevel=categorical name=risk");
    EXPECT_EQ(doc.Children("ModelFiles/ModelFile/Target[1]"), "");
    // Level 0 is written as continuous.
    EXPECT_EQ(doc.Attrs("ModelFiles/ModelFile/Target[2]"),
              "excludeFromOutput=no measurementLevel=continuous name=score");
    // Only an upper bound.
    EXPECT_EQ(doc.Attrs("ModelFiles/ModelFile/Target[3]/TargetFilter"), "high=4.5 includeHigh=no");
    // A filter without bounds is an empty element.
    EXPECT_EQ(doc.Attrs("ModelFiles/ModelFile[1]"),
              "customModels=yes file=models/custom model.xml numberOfTargets=1");
    EXPECT_EQ(doc.Attrs("ModelFiles/ModelFile[1]/Target/TargetFilter"), "");
}

TEST(PlanFileWrite, SimulatedFieldAttributesAndParameterSets) {
    const WrittenDoc doc(Written(RichPlan()));
    EXPECT_EQ(doc.Attrs("SimulatedFields"), "numberOfFields=8");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField"),
              "autofitted=no excludeFromOutput=no locked=no mappedName=unit_price "
              "measurementLevel=continuous min=0 name=price numberOfTargets=2 "
              "outputFormat=F6.2 valueType=double");
    EXPECT_EQ(doc.Children("SimulatedFields/SimulatedField"),
              "DistNormal AssociatedTarget AssociatedTarget ValueLabels");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField/DistNormal"), "numberOfParamSets=2");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField/DistNormal/Parameters"),
              "mean=25 stddev=2.5");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField/DistNormal/Parameters[1]"),
              "mean=30 stddev=0.1");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField/AssociatedTarget[1]"), "name=risk");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField/ValueLabels/ValueLabel[1]"),
              "displayValue=top price value=99.5");

    // Level 0 and storage 0 are written as continuous and double; autofit candidates listed.
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField[1]"),
              "autofitted=yes excludeFromOutput=yes locked=yes max=2000 "
              "measurementLevel=continuous name=demand numberOfTargets=0 valueType=double");
    EXPECT_EQ(doc.Children("SimulatedFields/SimulatedField[1]/AutofitDistList"),
              "DistName DistName DistName DistName DistName DistName DistName DistName");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField[1]/AutofitDistList/DistName[7]"),
              "name=Exponential");

    // A Negative binomial's type goes on the distribution element.
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField[6]/DistNegbinomial"),
              "numberOfParamSets=2 type=failures");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField[6]/DistNegbinomial/Parameters[1]"),
              "prob=0.25 thresh=5");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField[7]"),
              "autofitted=no excludeFromOutput=no locked=yes measurementLevel=ordinal "
              "name=visits numberOfTargets=0 valueType=integer");
}

TEST(PlanFileWrite, NegativeBinomialCountingTrials) {
    SPCSettings plan;
    plan.AddSimulationInput(
        ParamInput("n", true, kDistNegbinomial, {"thresh", "prob", "type"}, {{2.0, 0.5, 1.0}}));
    const WrittenDoc doc(Written(plan));
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField/DistNegbinomial"),
              "numberOfParamSets=1 type=trials");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField/DistNegbinomial/Parameters"),
              "prob=0.5 thresh=2");
}

TEST(PlanFileWrite, CategoricalProbabilitiesOfAllDistributionsPerCategory) {
    const WrittenDoc doc(Written(RichPlan()));
    const std::string segment = "SimulatedFields/SimulatedField[3]/DistCategorical";
    EXPECT_EQ(doc.Attrs(segment), "numberOfCategories=2");
    EXPECT_EQ(doc.Attrs(segment + "/Category"), "value=a");
    EXPECT_EQ(doc.Attrs(segment + "/Category/Probability"), "value=0.2");
    EXPECT_EQ(doc.Attrs(segment + "/Category/Probability[1]"), "value=0.5");
    EXPECT_EQ(doc.Attrs(segment + "/Category[1]"), "value=b");
    EXPECT_EQ(doc.Attrs(segment + "/Category[1]/Probability"), "value=0.8");
    EXPECT_EQ(doc.Attrs(segment + "/Category[1]/Probability[1]"), "value=0.5");
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField[2]/ValueLabels/ValueLabel[1]"),
              "displayValue=Western value=west");
}

TEST(PlanFileWrite, CategoricalWithMismatchedDistributionsWritesZeros) {
    // The second distribution is no Categorical, the third lacks the last probability.
    SimInputSpecs input = CategoricalInput("k", {"x", "y"}, {{0.3, 0.7}});
    static_cast<void>(input.AddDistribution(kDistNormal));
    DistInfoElem* third =
        input.GetDistribution(static_cast<std::size_t>(input.AddDistribution(kDistCategorical)));
    ASSERT_TRUE(third->AddParameter("cats", std::vector<std::string>{"x", "y"}));
    ASSERT_TRUE(third->AddParameter("probs", std::vector<double>{1.0}));
    SPCSettings plan;
    plan.AddSimulationInput(input);
    const WrittenDoc doc(Written(plan));
    const std::string y = "SimulatedFields/SimulatedField/DistCategorical/Category[1]";
    EXPECT_EQ(doc.Children(y), "Probability Probability Probability");
    EXPECT_EQ(doc.Attrs(y + "/Probability"), "value=0.7");
    EXPECT_EQ(doc.Attrs(y + "/Probability[1]"), "value=0");
    EXPECT_EQ(doc.Attrs(y + "/Probability[2]"), "value=0");
}

TEST(PlanFileWrite, UserRangesAndEmpirical) {
    const WrittenDoc doc(Written(RichPlan()));
    const std::string ranges = "SimulatedFields/SimulatedField[4]/DistUserRanges";
    EXPECT_EQ(doc.Attrs(ranges), "numberOfIntervals=2");
    EXPECT_EQ(doc.Attrs(ranges + "/Interval[1]"), "max=20 min=10");
    EXPECT_EQ(doc.Attrs(ranges + "/Interval[1]/Probability"), "value=0.6");

    // The missing standard deviation is written as ".".
    const std::string empirical = "SimulatedFields/SimulatedField[5]/DistEmpirical";
    EXPECT_EQ(doc.Attrs(empirical), "max=100 min=0 nbins=3 stddev=.");
    EXPECT_EQ(doc.Children(empirical), "Probability Probability Probability");
    EXPECT_EQ(doc.Attrs(empirical + "/Probability[2]"), "value=0.7");
}

TEST(PlanFileWrite, UserRangesWithUnequalBoundsKeepOnlyTheCount) {
    SimInputSpecs input(true);
    input.SetVarName("r");
    DistInfoElem* dist =
        input.GetDistribution(static_cast<std::size_t>(input.AddDistribution(kDistUserRanges)));
    ASSERT_TRUE(dist->AddParameter("min", std::vector<double>{0.0, 1.0}));
    ASSERT_TRUE(dist->AddParameter("max", std::vector<double>{1.0}));
    ASSERT_TRUE(dist->AddParameter("probs", std::vector<double>{0.5, 0.5}));
    SPCSettings plan;
    plan.AddSimulationInput(input);
    const WrittenDoc doc(Written(plan));
    EXPECT_EQ(doc.Attrs("SimulatedFields/SimulatedField/DistUserRanges"), "numberOfIntervals=1");
    EXPECT_EQ(doc.Children("SimulatedFields/SimulatedField/DistUserRanges"), "");
}

TEST(PlanFileWrite, FieldWithoutDistributionStartsWithItsTargets) {
    SimInputSpecs input(false);
    input.SetVarName("later");
    input.SetAssociatTargetNames({"t"});
    EXPECT_TRUE(input.SetDefaultAutofit(kLevelOrdinal));
    SPCSettings plan;
    plan.AddSimulationInput(input);
    const WrittenDoc doc(Written(plan));
    EXPECT_EQ(doc.Children("SimulatedFields/SimulatedField"), "AssociatedTarget AutofitDistList");
}

TEST(PlanFileWrite, FixedFieldsCorrelationsTableAndCriteria) {
    const WrittenDoc doc(Written(RichPlan()));
    EXPECT_EQ(doc.Attrs("FixedFields"), "numberOfFields=2");
    EXPECT_EQ(doc.Attrs("FixedFields/FixedField"),
              "locked=no name=discount numberOfTargets=0 numberOfValues=1 outputFormat=F4.2 "
              "valueType=double");
    EXPECT_EQ(doc.Attrs("FixedFields/FixedField/Value"), "value=0.1");
    EXPECT_EQ(doc.Children("FixedFields/FixedField[1]"),
              "Value Value AssociatedTarget ValueLabels");
    EXPECT_EQ(doc.Attrs("FixedFields/FixedField[1]/Value[1]"), "value=store & co");
    EXPECT_EQ(doc.Attrs("FixedFields/FixedField[1]/ValueLabels/ValueLabel"),
              "displayValue=Online value=web");

    EXPECT_EQ(doc.Attrs("CorrMatrix"), "locked=yes numberOfCells=6");
    EXPECT_EQ(doc.Attrs("CorrMatrix/CorrCell"), "colVar=price rowVar=price value=1");
    EXPECT_EQ(doc.Attrs("CorrMatrix/CorrCell[1]"), "colVar=price rowVar=demand value=-0.35");
    EXPECT_EQ(doc.Attrs("CorrMatrix/CorrCell[4]"), "colVar=demand rowVar=visits value=.");

    EXPECT_EQ(doc.Attrs("ContingencyTable"), "numOfCrossFactors=2 numOfCrossProbValues=3");
    EXPECT_EQ(doc.Children("ContingencyTable"), "CrossFactors TableCell TableCell TableCell");
    EXPECT_EQ(doc.Attrs("ContingencyTable/CrossFactors/Factor[1]"), "name=segment");
    EXPECT_EQ(doc.Attrs("ContingencyTable/TableCell[1]"), "probability=0.3");
    EXPECT_EQ(doc.Attrs("ContingencyTable/TableCell[1]/CrossCategory[1]"), "category=b");

    EXPECT_EQ(doc.Attrs("Settings"), "numberOfCriteria=3 simulatedCases=5000");
    EXPECT_EQ(doc.Attrs("Settings/Criteria"), "target=profit type=point_value");
    EXPECT_EQ(doc.Attrs("Settings/Criteria/PointValue"),
              "confidenceLevel=95 parameter=mean threshold=1 unit=percent");
    EXPECT_EQ(doc.Attrs("Settings/Criteria[1]"), "target=profit type=tail");
    EXPECT_EQ(doc.Attrs("Settings/Criteria[1]/Tail"),
              "frequency=100 side=left threshold=500 type=percentile");
    EXPECT_EQ(doc.Attrs("Settings/Criteria[2]/Tail"),
              "frequency=25 side=right threshold=4 type=value");
}

// Each plan below makes the writer fail; the output string keeps its previous content.
struct BadPlan {
    const char* name;
    SPCSettings plan;
};

class PlanFileWriteFailure : public ::testing::TestWithParam<BadPlan> {};

TEST_P(PlanFileWriteFailure, ReturnsFalseAndKeepsTheOutput) {
    MCPlanXMLHandler handler;
    std::string out = "previous";
    EXPECT_FALSE(handler.WritePlanFile(out, &GetParam().plan));
    EXPECT_EQ(out, "previous");
}

namespace {

std::vector<BadPlan> BadPlans() {
    std::vector<BadPlan> plans;
    auto add = [&plans](const char* name, SPCSettings plan) {
        plans.push_back(BadPlan{name, std::move(plan)});
    };
    SPCSettings plan;
    plan.SetCrstabsFactors({"a", "b"});
    plan.SetCrstabsMatrix({{"x", "y"}});
    plan.SetCrstabsProbs({0.5, 0.5});
    add("TableWithMoreProbabilitiesThanRows", plan);

    plan = SPCSettings();
    plan.SetCrstabsFactors({"a", "b"});
    plan.SetCrstabsMatrix({{"x", "y"}, {"x"}});
    plan.SetCrstabsProbs({0.5, 0.5});
    add("TableRowShorterThanTheFactors", plan);

    // Texts that XML 1.0 cannot carry: the item would silently vanish from the document.
    plan = SPCSettings();
    SPCSettings::ModelFileTarget target = Target(std::string("bad\x01name"), kLevelContinuous);
    plan.AddModelTarget(target);
    add("TargetNameWithControlCharacter", plan);

    plan = SPCSettings();
    target = Target("t", kLevelContinuous);
    target.fComment = "bad\x07 comment";
    plan.AddModelTarget(target);
    add("CommentWithControlCharacter", plan);

    plan = SPCSettings();
    plan.AddSimulationInput(CategoricalInput("k", {"ok", std::string("\x02")}, {{0.5, 0.5}}));
    add("CategoryWithControlCharacter", plan);

    plan = SPCSettings();
    plan.AddSimulationInput(ParamInput("p", true, kDistNormal, {"mean", "not a name"}, {{0, 1}}));
    add("ParameterNameThatIsNoXMLName", plan);

    plan = SPCSettings();
    plan.AddFixedInput("f", std::vector<std::string>{std::string("a\x1f")}, "");
    add("FixedTextWithControlCharacter", plan);
    return plans;
}

} // namespace

INSTANTIATE_TEST_SUITE_P(Plans, PlanFileWriteFailure, ::testing::ValuesIn(BadPlans()),
                         [](const ::testing::TestParamInfo<BadPlan>& row) {
                             return std::string(row.param.name);
                         });

TEST(PlanFileWrite, NullPlanFails) {
    MCPlanXMLHandler handler;
    std::string out = "previous";
    EXPECT_FALSE(handler.WritePlanFile(out, nullptr));
    EXPECT_EQ(out, "previous");
}

TEST(PlanFileWrite, TimeStampHasNoLeadingZeroHour) {
    std::tm when{};
    when.tm_year = 2012 - 1900;
    when.tm_mon = 2;
    when.tm_mday = 5;
    when.tm_hour = 9;
    when.tm_min = 7;
    EXPECT_EQ(MCPlanXMLHandler::FormatTimeStamp(when), "2012.03.05 9:07");
    when.tm_hour = 14;
    when.tm_min = 5;
    EXPECT_EQ(MCPlanXMLHandler::FormatTimeStamp(when), "2012.03.05 14:05");
    when.tm_mon = 11;
    when.tm_mday = 31;
    when.tm_hour = 0;
    when.tm_min = 0;
    EXPECT_EQ(MCPlanXMLHandler::FormatTimeStamp(when), "2012.12.31 0:00");
}

// Regenerates examples/plans/profit_plan.xml:
//   test_simulation_common --gtest_also_run_disabled_tests
//                          --gtest_filter=PlanFileExample.DISABLED_Regenerate
TEST(PlanFileExample, DISABLED_Regenerate) {
    const std::string text = Written(ExamplePlan());
    std::ofstream file(ExamplePlanPath(), std::ios::binary);
    ASSERT_TRUE(file.good()) << ExamplePlanPath();
    file << text << '\n';
}
