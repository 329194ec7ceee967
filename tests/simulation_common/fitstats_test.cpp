// The fitting statistics document written from fitting results built by hand: its tree, down
// to every attribute, for each goodness-of-fit choice, the missing-value rule, the sections
// that appear only when they apply, and the failures.
#include "distribution_fitting/dfcoutputstats.h"
#include "mccommon/mcmv.h"
#include "mcxml/mcxml.h"
#include "simulation_common/mcplanxmlhandler.h"

#include <gtest/gtest.h>

#include <xercesc/dom/DOMNamedNodeMap.hpp>

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

using namespace MCMCSP_800;
using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCXML_800::MCCatNumEncoder;
using MCXML_800::MCCatVar;
using MCXML_800::MCScaleVar;
using MCXML_800::MCVarList;
using xercesc::DOMElement;

namespace {

const double kMissing = MCMV::Missing();

//! `element` and everything below it in one line: the tag, its attributes in name order in
//! parentheses, its child elements in brackets.
std::string Tree(const DOMElement* element) {
    if (element == nullptr) {
        return "<none>";
    }
    std::string text = MCXML_800::ToUTF8(element->getTagName());
    std::vector<std::string> attrs;
    const xercesc::DOMNamedNodeMap* map = element->getAttributes();
    for (XMLSize_t i = 0; map != nullptr && i < map->getLength(); ++i) {
        attrs.push_back(MCXML_800::ToUTF8(map->item(i)->getNodeName()) + "=" +
                        MCXML_800::ToUTF8(map->item(i)->getNodeValue()));
    }
    std::sort(attrs.begin(), attrs.end());
    if (!attrs.empty()) {
        text += "(";
        for (std::size_t i = 0; i < attrs.size(); ++i) {
            text += (i == 0 ? "" : " ") + attrs[i];
        }
        text += ")";
    }
    std::string children;
    for (const DOMElement* child = MCXML_800::GetFirstChildElmt(element); child != nullptr;
         child = MCXML_800::GetNextSiblingElmt(child)) {
        children += (children.empty() ? "" : " ") + Tree(child);
    }
    return children.empty() ? text : text + "[" + children + "]";
}

//! The written text parsed again.
class Parsed {
public:
    explicit Parsed(const std::string& text) {
        EXPECT_TRUE(fParser.ParseToDOM(text)) << fParser.GetErrorMessage();
    }
    const DOMElement* Root() const {
        return fParser.GetDocument() ? fParser.GetDocument()->getDocumentElement() : nullptr;
    }
    //! Child `index` named `name` of `parent`.
    static const DOMElement* Child(const DOMElement* parent, const std::string& name,
                                   int index = 0) {
        const DOMElement* element = MCXML_800::GetFirstChildElmt(parent, name);
        for (int i = 0; i < index && element != nullptr; ++i) {
            element = MCXML_800::GetNextSiblingElmt(element, name);
        }
        return element;
    }
    //! The tree of `SimulatedField` number `index`.
    std::string Field(int index) const {
        return Tree(Child(Child(Root(), "SimulatedFields"), "SimulatedField", index));
    }

private:
    MCXML_800::MCXMLReadWrite fParser;
};

DFCOutputStats::DFCVarDistElement Element(DistType type, bool allowed, std::vector<double> params) {
    DFCOutputStats::DFCVarDistElement element(type, allowed);
    element.fDistParams = std::move(params);
    return element;
}

void SetEDF(DFCOutputStats::DFCVarDistElement& element, double ad, double adP, double ks,
            double ksP) {
    element.fADFit = ad;
    element.fADPValue = adP;
    element.fKSFit = ks;
    element.fKSPValue = ksP;
    // Written nowhere.
    element.fADZStar = 99.0;
    element.fKSDStat = 98.0;
}

//! Covariates c (continuous), o (ordinal), e (continuous, Empirical best) and n (correlations
//! only, no best fit); factor f with categories x and y. The host objects live as long as the
//! results.
class HandMadeResults {
public:
    HandMadeResults(GoodFitType gfType, bool exportCrosstabs) {
        for (const char* name : {"c", "o", "e", "n"}) {
            fVars.Add(std::make_unique<MCScaleVar>(name));
        }
        fVars.Add(
            std::make_unique<MCCatVar>("f", MCCatNumEncoder(std::vector<std::string>{"x", "y"})));
        EXPECT_GT(fSettings.AddCovariate(0, {kDistNormal, kDistLognormal, kDistGamma},
                                         kLevelContinuous, false),
                  0);
        EXPECT_GT(fSettings.AddCovariate(1, {kDistPoisson}, kLevelOrdinal, false), 0);
        EXPECT_GT(fSettings.AddCovariate(2, {kDistNormal}, kLevelContinuous, false), 0);
        EXPECT_GT(fSettings.AddCovariate(3, {kDistNormal}, kLevelContinuous, true), 0);
        EXPECT_GT(fSettings.AddFactor(4, 2, {kDistCategorical}, kLevelCategorical, false), 0);
        fSettings.SetGFType(gfType);
        fSettings.SetUseCrosstabs(true);
        fSettings.SetExportCrosstabs(exportCrosstabs);
        fpResults = std::make_unique<DFCOutputStats>(fSettings, fVars);

        std::vector<DFCOutputStats::DFCVarDistInfo>& covariates = fpResults->GetCovarDistInfo();
        DFCOutputStats::DFCVarDistInfo& c = covariates[0];
        c.fDistBestType = kDistNormal;
        c.fReportedElements.push_back(Element(kDistNormal, true, {10.0, 2.0}));
        SetEDF(c.fReportedElements.back(), 0.3, 0.5, 0.1, kMissing);
        c.fReportedElements.push_back(Element(kDistGamma, false, {25.0, 0.4}));
        SetEDF(c.fReportedElements.back(), 0.9, 0.2, 0.3, 0.1);
        c.fReportedElements.push_back(Element(kDistLognormal, true, {2.3, 0.2}));
        SetEDF(c.fReportedElements.back(), 1.25, 0.01, 0.2, 0.02);

        DFCOutputStats::DFCVarDistInfo& o = covariates[1];
        o.fDistBestType = kDistPoisson;
        o.fReportedElements.push_back(Element(kDistPoisson, true, {3.5}));
        o.fReportedElements.back().fChiSquareFit = 1.5;
        o.fReportedElements.back().fChiSquarePValue = 0.47;
        SetEDF(o.fReportedElements.back(), 0.7, 0.6, 0.5, 0.4);

        DFCOutputStats::DFCVarDistInfo& e = covariates[2];
        e.fDistBestType = kDistEmpirical;
        e.fReportedElements.push_back(
            Element(kDistEmpirical, true, {0.0, 10.0, 2.5, 0.2, kMissing, 0.8}));
        SetEDF(e.fReportedElements.back(), 0.05, 0.9, 0.07, 0.6);

        // f: the best fit's statistics differ from the reported element's own.
        DFCOutputStats::DFCVarDistInfo& f = fpResults->GetFactorDistInfo()[0];
        f.fDistBestType = kDistCategorical;
        f.fDistBestParamNames = {"x", "y"};
        f.fDistBestParams = {0.3, 0.7};
        f.fBestFitStat = 2.0;
        f.fBestFitPValue = 0.15;
        f.fReportedElements.push_back(Element(kDistCategorical, true, {0.25, 0.75}));
        f.fReportedElements.back().fDistParamNames = {"x", "y"};
        f.fReportedElements.back().fChiSquareFit = 2.5;

        MCMath_800::MCSymMatrix& corr = fpResults->GetCorrMatrix();
        corr.SetIdentity(4);
        corr.SetElem(1, 0, 0.25);
        corr.SetElem(2, 0, kMissing);
        corr.SetElem(3, 2, -0.5);
        fpResults->GetCrstabsMatrix() = {{"x"}, {"y"}};
        fpResults->GetCrstabsProbs() = {0.3, 0.7};
    }

    DFCOutputStats& Results() { return *fpResults; }

    std::string Write(bool selectedFitOnly) {
        MCPlanXMLHandler handler("tag", selectedFitOnly);
        std::string text;
        EXPECT_TRUE(handler.WriteFittingOutStats(text, fpResults.get()));
        return text;
    }

private:
    MCVarList fVars;
    DFCSettings fSettings;
    std::unique_ptr<DFCOutputStats> fpResults;
};

const char kCField[] = "SimulatedField(name=c)[Normal[Parameters(mean=10 stddev=2) %FITS1%] "
                       "Lognormal[Parameters(a=2.3 b=0.2) %FITS2%]]";

std::string Replace(std::string text, const std::string& from, const std::string& to) {
    return text.replace(text.find(from), from.size(), to);
}

} // namespace

TEST(FittingStatsDocument, WholeTreeWithAndersonDarling) {
    HandMadeResults fitted(kAndersonDarling, true);
    const std::string text = fitted.Write(false);
    EXPECT_EQ(text.rfind("<?xml version=\"1.0\" encoding=\"UTF-8\"", 0), 0u);
    EXPECT_EQ(text.find('\n'), std::string::npos) << "no pretty-print";
    // Fit attributes are set in the order name, value, p.
    EXPECT_NE(text.find("<Fit fitName=\"AnderDarling\" fitValue=\"0.3\" p=\"0.5\"/>"),
              std::string::npos);

    const Parsed doc(text);
    ASSERT_NE(doc.Root(), nullptr);
    EXPECT_EQ(Tree(doc.Root()).substr(0, 9), "FitStats[") << "no attributes on the root";
    EXPECT_EQ(doc.Root()->getNamespaceURI(), nullptr);

    std::string c = Replace(kCField, "%FITS1%",
                            "Fit(fitName=AnderDarling fitValue=0.3 p=0.5) "
                            "Fit(fitName=KolmogSmirn fitValue=0.1 p=.)");
    c = Replace(c, "%FITS2%",
                "Fit(fitName=AnderDarling fitValue=1.25 p=0.01) "
                "Fit(fitName=KolmogSmirn fitValue=0.2 p=0.02)");
    EXPECT_EQ(doc.Field(0), c);
    // An ordinal covariate is tested by chi-square.
    EXPECT_EQ(doc.Field(1), "SimulatedField(name=o)[Poisson[Parameters(mean=3.5) "
                            "Fit(fitName=ChiSquare fitValue=1.5 p=0.47)]]");
    EXPECT_EQ(doc.Field(2), "SimulatedField(name=e)[Empirical(max=10 min=0 nbins=3 stddev=2.5)"
                            "[Probability(value=0.2) Probability(value=.) Probability(value=0.8) "
                            "Fit(fitName=AnderDarling fitValue=0.05 p=0.9) "
                            "Fit(fitName=KolmogSmirn fitValue=0.07 p=0.6)]]");
    // n has no best fit; the factor follows the covariates, its best fit leading.
    EXPECT_EQ(doc.Field(3),
              "SimulatedField(name=f)[Categorical[Category(value=x)[Probability(value=0.3)] "
              "Category(value=y)[Probability(value=0.7)] Fit(fitName=ChiSquare fitValue=2 "
              "p=0.15)] Categorical[Category(value=x)[Probability(value=0.25)] "
              "Category(value=y)[Probability(value=0.75)] Fit(fitName=ChiSquare fitValue=2.5 "
              "p=.)]]");
    EXPECT_EQ(doc.Field(4), "<none>");

    EXPECT_EQ(Tree(Parsed::Child(doc.Root(), "CorrMatrix")),
              "CorrMatrix(locked=no numberOfCells=10)[CorrCell(colVar=c rowVar=c value=1) "
              "CorrCell(colVar=c rowVar=o value=0.25) CorrCell(colVar=o rowVar=o value=1) "
              "CorrCell(colVar=c rowVar=e value=.) CorrCell(colVar=o rowVar=e value=0) "
              "CorrCell(colVar=e rowVar=e value=1) CorrCell(colVar=c rowVar=n value=0) "
              "CorrCell(colVar=o rowVar=n value=0) CorrCell(colVar=e rowVar=n value=-0.5) "
              "CorrCell(colVar=n rowVar=n value=1)]");
    EXPECT_EQ(Tree(Parsed::Child(doc.Root(), "ContingencyTable")),
              "ContingencyTable(numOfCrossFactors=1 numOfCrossProbValues=2)"
              "[CrossFactors[Factor(name=f)] TableCell(probability=0.3)[CrossCategory(category=x)] "
              "TableCell(probability=0.7)[CrossCategory(category=y)]]");
    EXPECT_EQ(MCXML_800::ToUTF8(
                  MCXML_800::GetNextSiblingElmt(Parsed::Child(doc.Root(), "SimulatedFields"))
                      ->getTagName()),
              "CorrMatrix");
}

struct FitChoice {
    const char* fName;
    GoodFitType fType;
    bool fbSelectedOnly;
    const char* fNormalFits; //!< the Fit elements of c's Normal candidate
};

class FittingStatsFitChoice : public ::testing::TestWithParam<FitChoice> {};

TEST_P(FittingStatsFitChoice, ContinuousFieldsGetTheChosenTestFirst) {
    const FitChoice& choice = GetParam();
    HandMadeResults fitted(choice.fType, true);
    const Parsed doc(fitted.Write(choice.fbSelectedOnly));
    const std::string field = doc.Field(0);
    const std::string normal = field.substr(0, field.find(" Lognormal"));
    EXPECT_EQ(normal, "SimulatedField(name=c)[Normal[Parameters(mean=10 stddev=2) " +
                          std::string(choice.fNormalFits) + "]");
    // The chi-square field is the same whatever the choice.
    EXPECT_EQ(doc.Field(1), "SimulatedField(name=o)[Poisson[Parameters(mean=3.5) "
                            "Fit(fitName=ChiSquare fitValue=1.5 p=0.47)]]");
}

INSTANTIATE_TEST_SUITE_P(
    Table, FittingStatsFitChoice,
    ::testing::Values(FitChoice{"AndersonDarlingBoth", kAndersonDarling, false,
                                "Fit(fitName=AnderDarling fitValue=0.3 p=0.5) "
                                "Fit(fitName=KolmogSmirn fitValue=0.1 p=.)"},
                      FitChoice{"AndersonDarlingOnly", kAndersonDarling, true,
                                "Fit(fitName=AnderDarling fitValue=0.3 p=0.5)"},
                      FitChoice{"KolmogorovSmirnovBoth", kKolmogorovSmirnov, false,
                                "Fit(fitName=KolmogSmirn fitValue=0.1 p=.) "
                                "Fit(fitName=AnderDarling fitValue=0.3 p=0.5)"},
                      FitChoice{"KolmogorovSmirnovOnly", kKolmogorovSmirnov, true,
                                "Fit(fitName=KolmogSmirn fitValue=0.1 p=.)"}),
    [](const ::testing::TestParamInfo<FitChoice>& row) { return std::string(row.param.fName); });

TEST(FittingStatsDocument, WithoutExportEmpiricalHasBoundsOnlyAndNoTable) {
    HandMadeResults fitted(kAndersonDarling, false);
    const Parsed doc(fitted.Write(true));
    EXPECT_EQ(doc.Field(2), "SimulatedField(name=e)[Empirical(max=10 min=0)"
                            "[Fit(fitName=AnderDarling fitValue=0.05 p=0.9)]]");
    EXPECT_EQ(Tree(Parsed::Child(doc.Root(), "ContingencyTable")), "<none>");
    EXPECT_NE(Parsed::Child(doc.Root(), "CorrMatrix"), nullptr);
}

TEST(FittingStatsDocument, NoBestFitAndOneCovariateGiveAnEmptyFieldList) {
    MCVarList vars;
    vars.Add(std::make_unique<MCScaleVar>("c"));
    DFCSettings settings;
    EXPECT_GT(settings.AddCovariate(0, {kDistNormal}, kLevelContinuous, false), 0);
    settings.SetExportCrosstabs(true); // no factor records: still no table
    DFCOutputStats results(settings, vars);
    results.GetCovarDistInfo()[0].fReportedElements.push_back(
        Element(kDistNormal, true, {0.0, 1.0}));
    results.GetCorrMatrix().SetIdentity(1);

    MCPlanXMLHandler handler;
    std::string text;
    ASSERT_TRUE(handler.WriteFittingOutStats(text, &results));
    EXPECT_EQ(Tree(Parsed(text).Root()), "FitStats[SimulatedFields]");
}

TEST(FittingStatsDocument, SameResultsGiveTheSameText) {
    HandMadeResults fitted(kKolmogorovSmirnov, true);
    EXPECT_EQ(fitted.Write(false), fitted.Write(false));
}

TEST(FittingStatsDocument, FailuresLeaveTheOutputAlone) {
    HandMadeResults fitted(kAndersonDarling, true);
    MCPlanXMLHandler handler;
    std::string text = "previous";
    EXPECT_FALSE(handler.WriteFittingOutStats(text, nullptr));
    EXPECT_EQ(text, "previous");

    // A table whose probabilities do not match its rows cannot be written.
    fitted.Results().GetCrstabsProbs().push_back(0.0);
    EXPECT_FALSE(handler.WriteFittingOutStats(text, &fitted.Results()));
    EXPECT_EQ(text, "previous");
    fitted.Results().GetCrstabsProbs().pop_back();

    // A category text that XML cannot carry.
    fitted.Results().GetFactorDistInfo()[0].fDistBestParamNames[0] = std::string("x\x01", 2);
    EXPECT_FALSE(handler.WriteFittingOutStats(text, &fitted.Results()));
    EXPECT_EQ(text, "previous");
}
