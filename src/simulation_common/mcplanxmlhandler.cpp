// The plan file writer, the fitting statistics writer, the serialisation step and the
// handler's construction. The reader is in mcplanxmlreader.cpp.
#include "simulation_common/mcplanxmlhandler.h"

#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"
#include "mcxml/mcxmldocument.h"
#include "mcxml/mcxmlutil.h"

#include <xercesc/dom/DOMProcessingInstruction.hpp>
#include <xercesc/dom/DOMText.hpp>
#include <xercesc/util/PlatformUtils.hpp>
#include <xercesc/util/XMLChar.hpp>

#include <cstdio>
#include <limits>
#include <stdexcept>
#include <unordered_map>
#include <utility>

namespace MCMCSP_800 {

using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCXML_800::InsertElement;
using MCXML_800::ToUTF16;
using MCXML_800::UTF16String;
using xercesc::DOMElement;

namespace {

//! Namespace of the plan file; its path part is fixed by the format.
constexpr char kPlanNamespace[] = "http://xml.mcsim.org/software/analytics/Norvane/xml/simulation";
//! The W3C XML Schema instance namespace.
constexpr char kSchemaInstanceNamespace[] = "http://www.w3.org/2001/XMLSchema-instance";
//! File name of the plan schema, relative to the plan namespace.
constexpr char kPlanSchemaFile[] = "/simulationplan.xsd";
//! Version written on the root and on Application.
constexpr char kPlanVersion[] = "21.0.0.0";
constexpr char kApplicationName[] = "Tessary Norvane Statistics";
constexpr char kCopyright[] = "Copyright (C) 2026 the mcsim developers. All rights reserved.";

// Raised inside the writer when an element cannot be made or an attribute cannot be set (a
// text holding a character that XML cannot carry, a parameter name that is not an XML name).
// The document would silently lack the item and could not be read back, so the write fails;
// the entry point turns this into false.
class PlanWriteError : public std::runtime_error {
public:
    explicit PlanWriteError(const std::string& what) : std::runtime_error(what) {}
};

//! A new element of `parent`'s document, not yet attached.
DOMElement* NewElement(const DOMElement* parent, const std::string& name) {
    DOMElement* element =
        parent ? MCXML_800::CreateElement(parent->getOwnerDocument(), name) : nullptr;
    if (element == nullptr) {
        throw PlanWriteError("element " + name + " not created");
    }
    return element;
}

void Put(DOMElement* element, const std::string& name, const std::string& text) {
    if (!MCXML_800::SetAttribute(element, name, text)) {
        throw PlanWriteError("attribute " + name + " not set");
    }
}

void Put(DOMElement* element, const std::string& name, const char* text) {
    Put(element, name, std::string(text));
}

//! A number: integral values in plain notation, others in their shortest round-trip form.
void Put(DOMElement* element, const std::string& name, double value) {
    if (!MCXML_800::SetAttribute(element, name, value)) {
        throw PlanWriteError("attribute " + name + " not set");
    }
}

// The correlation cells are not made DOM nodes: a matrix of N variables has N(N+1)/2 cells
// and as nodes they take some twenty times their text. The CorrMatrix element gets a
// processing instruction as a place holder, and the cells' text replaces it in the
// serialised document (CorrCellWriter::Splice).
constexpr char kCorrCellsTarget[] = "mcsim-corr-cells";

//! `text` as an attribute value in the serialised document: the markup characters and the
//! blanks that attribute-value normalisation would turn into spaces as references.
std::string AttributeValueText(const std::string& text) {
    std::string out;
    out.reserve(text.size());
    for (const char c : text) {
        switch (c) {
        case '&':
            out += "&amp;";
            break;
        case '<':
            out += "&lt;";
            break;
        case '>':
            out += "&gt;";
            break;
        case '"':
            out += "&quot;";
            break;
        case '\t':
            out += "&#x9;";
            break;
        case '\n':
            out += "&#xA;";
            break;
        case '\r':
            out += "&#xD;";
            break;
        default:
            out += c;
        }
    }
    return out;
}

// The CorrCell elements' text, written into the serialised document in place of the place
// holder, so that the cells exist once, as the output's own text. Attributes come in the order
// the serialiser writes them. Each name goes once through the DOM (on a scratch element), so
// that a name XML cannot carry fails the write as it would as an attribute, and is written as
// the DOM holds it.
class CorrCellWriter {
public:
    explicit CorrCellWriter(DOMElement* scratch) : fpScratch(scratch) {}

    //! The cells of the triangle `rows` over `names` (GetCorrMatrixCellCollection's order);
    //! both must outlive the writer.
    void SetTriangle(const std::vector<std::string>& names,
                     const std::vector<std::vector<double>>& rows) {
        fpNames = &names;
        fpRows = &rows;
        fCells = 0;
        for (std::size_t r = 0; r < Rows(); ++r) {
            fCells += std::min(r + 1, rows[r].size());
        }
    }
    std::size_t GetCellCount() const { return fCells; }

    //! Replaces the place holder in the serialised `out` by the cells; false without one.
    bool Splice(std::string& out) {
        const std::string open = std::string("<?") + kCorrCellsTarget;
        const std::size_t at = out.find(open);
        const std::size_t end = at == std::string::npos ? at : out.find("?>", at);
        if (end == std::string::npos) {
            return false;
        }
        // About 60 bytes a cell for short names, so the text is rarely moved as it grows.
        std::string spliced;
        spliced.reserve(out.size() + 60 * fCells);
        spliced.append(out, 0, at);
        const std::vector<std::vector<double>>& rows = *fpRows;
        for (std::size_t r = 0; r < Rows(); ++r) {
            for (std::size_t c = 0; c <= r && c < rows[r].size(); ++c) {
                AppendCell(spliced, (*fpNames)[r], (*fpNames)[c], rows[r][c]);
            }
        }
        spliced.append(out, end + 2, std::string::npos);
        out.swap(spliced);
        return true;
    }

private:
    std::size_t Rows() const {
        return fpRows == nullptr ? 0 : std::min(fpRows->size(), fpNames->size());
    }

    void AppendCell(std::string& text, const std::string& rowVar, const std::string& colVar,
                    double value) {
        text += "<CorrCell colVar=\"";
        text += NameText(colVar);
        text += "\" rowVar=\"";
        text += NameText(rowVar);
        text += "\" value=\"";
        text += MCMV::IsMissing(value) ? std::string(".") : MCCommon_800::FormatRoundTrip(value);
        text += "\"/>";
    }

    const std::string& NameText(const std::string& name) {
        auto it = fWritten.find(name);
        if (it == fWritten.end()) {
            Put(fpScratch, "name", name);
            const std::string held = MCXML_800::ToUTF8(MCXML_800::GetAttribute(fpScratch, "name"));
            it = fWritten.emplace(name, AttributeValueText(held)).first;
        }
        return it->second;
    }

    DOMElement* fpScratch;                                    //!< takes each name once
    const std::vector<std::string>* fpNames = nullptr;        //!< the variables
    const std::vector<std::vector<double>>* fpRows = nullptr; //!< the triangle
    std::size_t fCells = 0;                                   //!< cells of the triangle
    std::unordered_map<std::string, std::string> fWritten;    //!< name -> its attribute text
};

void PutCount(DOMElement* element, const std::string& name, std::size_t count) {
    Put(element, name, static_cast<double>(count));
}

void PutYesNo(DOMElement* element, const std::string& name, bool value) {
    Put(element, name, value ? "yes" : "no");
}

//! True when every character of `text` is one XML 1.0 can carry (section 2.2); a text node,
//! unlike an attribute, is not checked when it is made or written.
bool IsXMLText(const UTF16String& text) {
    for (std::size_t i = 0; i < text.size(); ++i) {
        const XMLCh c = text[i];
        if (c >= 0xD800 && c <= 0xDBFF && i + 1 < text.size() && text[i + 1] >= 0xDC00 &&
            text[i + 1] <= 0xDFFF) {
            ++i;
        } else if (!xercesc::XMLChar1_0::isXMLChar(c)) {
            return false;
        }
    }
    return true;
}

//! Appends `child` to `parent` where the format has no rule for a failed append.
void Append(DOMElement* parent, DOMElement* child) {
    if (!InsertElement(parent, child)) {
        throw PlanWriteError("element not appended");
    }
}

const char* LevelWord(MeasureLevel level) {
    switch (level) {
    case kLevelCategorical:
        return "categorical";
    case kLevelOrdinal:
        return "ordinal";
    default:
        return "continuous";
    }
}

//! Word of a value storage code (the host's codes: 1 integer, 2 numeric, 3 string, 4 date,
//! 5 time, 6 timestamp).
const char* StorageWord(int storage) {
    switch (storage) {
    case 3:
        return "string";
    case 1:
        return "integer";
    case 5:
        return "time";
    case 4:
        return "date";
    case 6:
        return "timestamp";
    default:
        return "double";
    }
}

bool IsStringWord(const char* word) {
    return std::string(word) == "string";
}

const char* UnitWord(UnitType unit) {
    return unit == kUnitPercent ? "percent" : "value";
}
const char* SideWord(SideType side) {
    return side == kSideLeft ? "left" : "right";
}
const char* TailWord(TailType type) {
    return type == kTailPercentile ? "percentile" : "value";
}

//! The Negative binomial counts trials exactly when its "type" parameter is 1.0.
const char* NegBinTypeWord(double type) {
    return type == 1.0 ? "trials" : "failures";
}

//! `ValueLabels` of a field whose storage word is `storageWord`, when it has labelled values
//! of that kind.
void AddValueLabels(DOMElement* field, const MCValueLabels& labelled, const char* storageWord) {
    std::vector<std::string> labels;
    std::vector<std::string> texts;
    std::vector<double> numbers;
    const bool isString = IsStringWord(storageWord);
    if (isString) {
        labelled.GetValueLabels(texts, labels);
    } else {
        labelled.GetValueLabels(numbers, labels);
    }
    const std::size_t n = isString ? texts.size() : numbers.size();
    if (n == 0) {
        return;
    }
    DOMElement* valueLabels = NewElement(field, "ValueLabels");
    for (std::size_t i = 0; i < n; ++i) {
        DOMElement* valueLabel = NewElement(field, "ValueLabel");
        if (isString) {
            Put(valueLabel, "value", texts[i]);
        } else {
            Put(valueLabel, "value", numbers[i]);
        }
        // Numeric and text values share one label list; a list set for the other kind may
        // be shorter.
        Put(valueLabel, "displayValue", i < labels.size() ? labels[i] : std::string());
        Append(valueLabels, valueLabel);
    }
    Append(field, valueLabels);
}

//! One `AssociatedTarget` per name.
void AddAssociatedTargets(DOMElement* field, const std::vector<std::string>& names) {
    for (const std::string& name : names) {
        DOMElement* target = NewElement(field, "AssociatedTarget");
        Put(target, "name", name);
        Append(field, target);
    }
}

//! Probabilities of a list distribution laid out for writing: row i holds the probability of
//! category (or interval) i in each distribution, 0 where a distribution lacks it.
std::vector<std::vector<double>> ProbabilityTable(const SimInputSpecs& input, DistType type,
                                                  std::size_t probsParam, std::size_t nRows) {
    const std::size_t nDists = input.GetDistElementSize();
    std::vector<std::vector<double>> table(nRows, std::vector<double>(nDists, 0.0));
    std::string name;
    std::vector<double> probs;
    for (std::size_t k = 0; k < nDists; ++k) {
        const DistInfoElem* dist = input.GetDistribution(k);
        if (dist == nullptr || dist->GetDistType() != type) {
            continue;
        }
        dist->GetParameterNameValue(probsParam, name, probs);
        for (std::size_t i = 0; i < nRows && i < probs.size(); ++i) {
            table[i][k] = probs[i];
        }
    }
    return table;
}

//! One `Probability` child of `parent` per value, as numbers.
void AddProbabilities(DOMElement* parent, const std::vector<double>& values) {
    for (const double value : values) {
        DOMElement* probability = NewElement(parent, "Probability");
        Put(probability, "value", value);
        Append(parent, probability);
    }
}

} // namespace

// ---------------------------------------------------------------------------------------------
// Construction

MCXMLDouble::MCXMLDouble(const XMLCh* text)
    : xercesc::XMLDouble(text, xercesc::XMLPlatformUtils::fgMemoryManager) {}

MCXMLDouble::~MCXMLDouble() = default;

MCPlanXMLHandler::MCPlanXMLHandler(const MCXML_800::MCVarList& vars, const std::string& tag,
                                   bool selectedFitOnly)
    : fSelectedFitOnly(selectedFitOnly), fTag(tag), fVarList(vars), fHasVarList(true) {}

MCPlanXMLHandler::MCPlanXMLHandler(const std::string& tag, bool selectedFitOnly)
    : fSelectedFitOnly(selectedFitOnly), fTag(tag) {}

MCPlanXMLHandler::MCPlanXMLHandler() : MCPlanXMLHandler(std::string(), false) {}

MCPlanXMLHandler::~MCPlanXMLHandler() = default;

// ---------------------------------------------------------------------------------------------
// Writing a plan

bool MCPlanXMLHandler::WritePlanFile(std::string& out, const SPCSettings* plan) {
    // The one catch site of the writer: XML and DOM exceptions of Xerces-C, allocation
    // failures and an attribute that could not be set all end the write with false.
    try {
        if (plan == nullptr) {
            return false;
        }
        MCXML_800::DOMDocumentPtr doc = MCXML_800::CreateDocument("", "SimulationPlan");
        if (!doc) {
            return false;
        }
        // Xerces-C 3 sets the document's encoding through its output: the serialisation
        // step writes UTF-8 and names it in the XML declaration.
        DOMElement* root = doc->getDocumentElement();

        // The namespace declarations are plain attributes of a root made without namespace.
        const std::string planNamespace = kPlanNamespace;
        root->setAttribute(ToUTF16("xmlns").c_str(), ToUTF16(planNamespace).c_str());
        root->setAttribute(ToUTF16("xmlns:xsi").c_str(), ToUTF16(kSchemaInstanceNamespace).c_str());
        root->setAttribute(ToUTF16("xsi:schemaLocation").c_str(),
                           ToUTF16(planNamespace + " " + planNamespace + kPlanSchemaFile).c_str());
        if (!MCXML_800::SetAttribute(root, "version", std::string(kPlanVersion)) ||
            !MCXML_800::SetAttribute(root, "autofitTimeStamp", GetCurrentTime())) {
            return false;
        }

        DOMElement* header = NewElement(root, "Header");
        Put(header, "copyright", kCopyright);
        DOMElement* application = NewElement(root, "Application");
        Put(application, "name", kApplicationName);
        Put(application, "version", kPlanVersion);
        if (!InsertElement(header, application) || !InsertElement(root, header)) {
            return false;
        }

        if (!plan->GetModelFileInfo().empty()) {
            DOMElement* modelFiles = NewElement(root, "ModelFiles");
            if (!CreateModelFilesEle(modelFiles, plan)) {
                return false;
            }
            static_cast<void>(InsertElement(root, modelFiles));
        }

        const std::vector<SimInputSpecs>& simInputs = plan->GetSimulationInput();
        if (!simInputs.empty()) {
            DOMElement* simulatedFields = NewElement(root, "SimulatedFields");
            PutCount(simulatedFields, "numberOfFields", simInputs.size());
            if (!AddSimulatedFieldsEle(simulatedFields, simInputs)) {
                return false;
            }
            static_cast<void>(InsertElement(root, simulatedFields));
        }

        const std::vector<FixedInputSpecs>& fixedInputs = plan->GetFixedInput();
        if (!fixedInputs.empty()) {
            DOMElement* fixedFields = NewElement(root, "FixedFields");
            if (!AddFixedFieldsEle(fixedFields, fixedInputs)) {
                return false;
            }
            static_cast<void>(InsertElement(root, fixedFields));
        }

        // The cells straight from the plan's triangle: no list of cells with copies of names.
        CorrCellWriter cells(NewElement(root, "CorrCell"));
        cells.SetTriangle(plan->GetCorrVarList(), plan->GetCorrMatrix());
        if (cells.GetCellCount() > 0) {
            DOMElement* corrMatrix = NewElement(root, "CorrMatrix");
            if (!AddCorrMetrixElement(corrMatrix, cells.GetCellCount(), plan->GetCorrLocked())) {
                return false;
            }
            static_cast<void>(InsertElement(root, corrMatrix));
        }

        if (!plan->GetCrstabsFactors().empty()) {
            DOMElement* table = NewElement(root, "ContingencyTable");
            if (!AddCrossTabMetrixElement(table, plan->GetCrstabsFactors(),
                                          plan->GetCrstabsMatrix(), plan->GetCrstabsProbs())) {
                return false;
            }
            static_cast<void>(InsertElement(root, table));
        }

        DOMElement* settings = NewElement(root, "Settings");
        if (!AddSettingsEle(settings, plan) || !InsertElement(root, settings)) {
            return false;
        }

        return WriteFromDOM(out, doc.get()) && (cells.GetCellCount() == 0 || cells.Splice(out));
    } catch (...) {
        return false;
    }
}

bool MCPlanXMLHandler::CreateModelFilesEle(DOMElement* modelFiles, const SPCSettings* plan) {
    const std::vector<SPCSettings::ModelFileElem>& files = plan->GetModelFileInfo();
    PutCount(modelFiles, "numberOfFiles", files.size());
    bool result = true;
    for (const SPCSettings::ModelFileElem& file : files) {
        DOMElement* modelFile = NewElement(modelFiles, "ModelFile");
        Put(modelFile, "file", file.fFilePath);
        PutCount(modelFile, "numberOfTargets", file.fvTargets.size());
        PutYesNo(modelFile, "customModels", file.fbCustomModel);
        for (const SPCSettings::ModelFileTarget& info : file.fvTargets) {
            DOMElement* target = NewElement(modelFile, "Target");
            if (!AddTargetElement(target, info)) {
                return false;
            }
            if (!InsertElement(modelFile, target)) {
                break;
            }
        }
        result = InsertElement(modelFiles, modelFile);
        if (!result) {
            break;
        }
    }
    return result;
}

bool MCPlanXMLHandler::AddTargetElement(DOMElement* target,
                                        const SPCSettings::ModelFileTarget& info) {
    Put(target, "name", info.fName);
    if (!info.fMapName.empty()) {
        Put(target, "mappedName", info.fMapName);
    }
    Put(target, "measurementLevel", LevelWord(info.fMeasurementLevel));
    PutYesNo(target, "excludeFromOutput", info.fbExcludeFromOutput);
    if (!info.fOutputFormat.empty()) {
        Put(target, "outputFormat", info.fOutputFormat);
    }
    bool result = true;
    if (info.fbHasTargetFilter) {
        // A bound at the extreme finite double means "no bound" and is not written.
        DOMElement* filter = NewElement(target, "TargetFilter");
        if (info.fFilterLow != std::numeric_limits<double>::lowest()) {
            Put(filter, "low", info.fFilterLow);
            PutYesNo(filter, "includeLow", info.fbIncludeLow);
        }
        if (info.fFilterHigh != std::numeric_limits<double>::max()) {
            Put(filter, "high", info.fFilterHigh);
            PutYesNo(filter, "includeHigh", info.fbIncludeHigh);
        }
        result = InsertElement(target, filter);
    }
    if (!info.fComment.empty()) {
        const UTF16String text = ToUTF16(info.fComment);
        if (!IsXMLText(text)) {
            throw PlanWriteError("comment not writable");
        }
        DOMElement* comment = NewElement(target, "Comment");
        comment->appendChild(target->getOwnerDocument()->createTextNode(text.c_str()));
        result = InsertElement(target, comment);
    }
    return result;
}

bool MCPlanXMLHandler::AddSimulatedFieldsEle(DOMElement* simulatedFields,
                                             const std::vector<SimInputSpecs>& inputs) {
    for (const SimInputSpecs& input : inputs) {
        DOMElement* field = NewElement(simulatedFields, "SimulatedField");
        const char* storageWord = StorageWord(static_cast<int>(input.GetValueType()));
        Put(field, "name", input.GetVarName());
        Put(field, "measurementLevel", LevelWord(input.GetMeasurementLevel()));
        Put(field, "valueType", storageWord);
        if (!input.GetMapVarName().empty()) {
            Put(field, "mappedName", input.GetMapVarName());
        }
        if (input.HasMinimum()) {
            Put(field, "min", input.GetMinimum());
        }
        if (input.HasMaximum()) {
            Put(field, "max", input.GetMaximum());
        }
        PutYesNo(field, "locked", input.IsLocked());
        PutYesNo(field, "autofitted", input.IsAutofit());
        PutYesNo(field, "excludeFromOutput", !input.GetOutput());
        if (!input.GetOutputFormat().empty()) {
            Put(field, "outputFormat", input.GetOutputFormat());
        }
        PutCount(field, "numberOfTargets", input.GetAssociatTargetNames().size());

        if (input.GetDistElementSize() > 0) {
            const DistType type = input.GetDistribution(0)->GetDistType();
            DOMElement* dist = NewElement(field, DistType2EleString(type));
            switch (type) {
            case kDistCategorical:
                static_cast<void>(AddCategoricalDist(dist, input));
                break;
            case kDistUserRanges:
                // Unequal bound lists leave only numberOfIntervals; the plan is still written.
                static_cast<void>(AddUserRangeDist(dist, input));
                break;
            case kDistEmpirical:
                AddEmpiricalDist(dist, input);
                break;
            default:
                AddParameterSets(dist, input);
                break;
            }
            Append(field, dist);
        }

        AddAssociatedTargets(field, input.GetAssociatTargetNames());

        const std::vector<std::string> autofitNames = input.GetAutofitNames();
        if (!autofitNames.empty()) {
            DOMElement* list = NewElement(field, "AutofitDistList");
            for (const std::string& name : autofitNames) {
                DOMElement* distName = NewElement(field, "DistName");
                Put(distName, "name", name);
                Append(list, distName);
            }
            Append(field, list);
        }

        AddValueLabels(field, input, storageWord);

        if (!InsertElement(simulatedFields, field)) {
            return false;
        }
    }
    return true;
}

// Categories come from distribution 0; every distribution of the field contributes one
// probability per category, matched by position (0 where it has none).
bool MCPlanXMLHandler::AddCategoricalDist(DOMElement*& distElement, const SimInputSpecs& input) {
    const DistInfoElem* first = input.GetDistribution(0);
    if (first == nullptr) {
        return false;
    }
    PutCount(distElement, "numberOfCategories", first->GetParamValueSize());
    std::vector<std::string> cats;
    std::string name;
    if (first->GetDistType() == kDistCategorical) {
        first->GetParameterNameValue(0, name, cats);
    }
    const std::vector<std::vector<double>> table =
        ProbabilityTable(input, kDistCategorical, 1, cats.size());
    for (std::size_t i = 0; i < cats.size(); ++i) {
        DOMElement* category = NewElement(distElement, "Category");
        Put(category, "value", cats[i]);
        AddProbabilities(category, table[i]);
        Append(distElement, category);
    }
    return true;
}

bool MCPlanXMLHandler::AddUserRangeDist(DOMElement*& distElement, const SimInputSpecs& input) {
    const DistInfoElem* first = input.GetDistribution(0);
    if (first == nullptr) {
        return false;
    }
    PutCount(distElement, "numberOfIntervals", first->GetParamValueSize());
    std::vector<double> mins;
    std::vector<double> maxs;
    std::string name;
    first->GetParameterNameValue(0, name, mins);
    first->GetParameterNameValue(1, name, maxs);
    if (mins.size() != maxs.size()) {
        return false;
    }
    const std::vector<std::vector<double>> table =
        ProbabilityTable(input, kDistUserRanges, 2, mins.size());
    for (std::size_t i = 0; i < mins.size(); ++i) {
        DOMElement* interval = NewElement(distElement, "Interval");
        Put(interval, "min", mins[i]);
        Put(interval, "max", maxs[i]);
        AddProbabilities(interval, table[i]);
        Append(distElement, interval);
    }
    return true;
}

// An Empirical field normally has one distribution; each further one sets the attributes
// again and appends its own bin proportions.
void MCPlanXMLHandler::AddEmpiricalDist(DOMElement* distElement, const SimInputSpecs& input) {
    std::string name;
    for (const DistInfoElem& dist : input.GetAllDistribution()) {
        double minimum = MCMV::Missing();
        double maximum = MCMV::Missing();
        double stddev = MCMV::Missing();
        std::vector<double> probs;
        dist.GetParameterNameValue(0, name, minimum);
        dist.GetParameterNameValue(1, name, maximum);
        dist.GetParameterNameValue(2, name, stddev);
        dist.GetParameterNameValue(3, name, probs);
        if (!SetDoubleAttribute(distElement, "min", minimum) ||
            !SetDoubleAttribute(distElement, "max", maximum) ||
            !SetDoubleAttribute(distElement, "stddev", stddev)) {
            throw PlanWriteError("Empirical bounds not set");
        }
        PutCount(distElement, "nbins", dist.GetParamValueSize(3));
        for (const double value : probs) {
            DOMElement* probability = NewElement(distElement, "Probability");
            if (!SetDoubleAttribute(probability, "value", value)) {
                throw PlanWriteError("attribute value not set");
            }
            Append(distElement, probability);
        }
    }
}

// One Parameters element per distribution, one attribute per parameter named by it. The
// Negative binomial's "type" goes on the distribution element as "trials" or "failures".
void MCPlanXMLHandler::AddParameterSets(DOMElement* distElement, const SimInputSpecs& input) {
    const std::vector<DistInfoElem>& dists = input.GetAllDistribution();
    const bool negBin = !dists.empty() && dists.front().GetDistType() == kDistNegbinomial;
    PutCount(distElement, "numberOfParamSets", dists.size());
    for (const DistInfoElem& dist : dists) {
        DOMElement* parameters = NewElement(distElement, "Parameters");
        for (std::size_t j = 0; j < dist.GetParameterSize(); ++j) {
            std::string name;
            double value = MCMV::Missing();
            dist.GetParameterNameValue(j, name, value);
            if (negBin && name == "type") {
                Put(distElement, "type", NegBinTypeWord(value));
            } else if (!SetDoubleAttribute(parameters, name, value)) {
                throw PlanWriteError("parameter " + name + " not set");
            }
        }
        Append(distElement, parameters);
    }
}

bool MCPlanXMLHandler::AddFixedFieldsEle(DOMElement* fixedFields,
                                         const std::vector<FixedInputSpecs>& inputs) {
    PutCount(fixedFields, "numberOfFields", inputs.size());
    for (const FixedInputSpecs& input : inputs) {
        DOMElement* field = NewElement(fixedFields, "FixedField");
        const char* storageWord = StorageWord(static_cast<int>(input.GetValueType()));
        Put(field, "name", input.GetVarName());
        Put(field, "valueType", storageWord);
        if (!input.GetOutputFormat().empty()) {
            Put(field, "outputFormat", input.GetOutputFormat());
        }
        PutCount(field, "numberOfValues", input.GetInputValueSize());
        PutCount(field, "numberOfTargets", input.GetAssociatTargetNames().size());
        PutYesNo(field, "locked", input.IsLocked());

        if (IsStringWord(storageWord)) {
            std::vector<std::string> values;
            input.GetInputValue(values);
            for (const std::string& value : values) {
                DOMElement* element = NewElement(field, "Value");
                Put(element, "value", value);
                Append(field, element);
            }
        } else {
            std::vector<double> values;
            input.GetInputValue(values);
            for (const double value : values) {
                DOMElement* element = NewElement(field, "Value");
                Put(element, "value", value);
                Append(field, element);
            }
        }
        AddAssociatedTargets(field, input.GetAssociatTargetNames());
        AddValueLabels(field, input, storageWord);
        Append(fixedFields, field);
    }
    return true;
}

bool MCPlanXMLHandler::AddCorrMetrixElement(DOMElement* corrMatrix, std::size_t nCells,
                                            bool locked) {
    PutCount(corrMatrix, "numberOfCells", nCells);
    PutYesNo(corrMatrix, "locked", locked);
    xercesc::DOMDocument* doc = corrMatrix->getOwnerDocument();
    return InsertElement(corrMatrix, doc->createProcessingInstruction(
                                         ToUTF16(kCorrCellsTarget).c_str(), ToUTF16("").c_str()));
}

bool MCPlanXMLHandler::AddCrossTabMetrixElement(DOMElement* table,
                                                const std::vector<std::string>& factors,
                                                const std::vector<std::vector<std::string>>& rows,
                                                const std::vector<double>& probs) {
    PutCount(table, "numOfCrossFactors", factors.size());
    if (probs.size() != rows.size()) {
        return false;
    }
    PutCount(table, "numOfCrossProbValues", probs.size());

    DOMElement* crossFactors = NewElement(table, "CrossFactors");
    for (const std::string& name : factors) {
        DOMElement* factor = NewElement(table, "Factor");
        Put(factor, "name", name);
        if (!InsertElement(crossFactors, factor)) {
            break;
        }
    }
    bool result = InsertElement(table, crossFactors);
    if (!result) {
        return false;
    }

    for (std::size_t r = 0; r < rows.size(); ++r) {
        if (rows[r].size() != factors.size()) {
            return false;
        }
        DOMElement* cell = NewElement(table, "TableCell");
        Put(cell, "probability", probs[r]);
        for (const std::string& category : rows[r]) {
            DOMElement* crossCategory = NewElement(table, "CrossCategory");
            Put(crossCategory, "category", category);
            Append(cell, crossCategory);
        }
        result = InsertElement(table, cell);
    }
    return result;
}

bool MCPlanXMLHandler::AddSettingsEle(DOMElement* settings, const SPCSettings* plan) {
    const std::vector<SPCSettings::StopCriteriaPointValue>& pointValues =
        plan->GetStopCriteriaPointValue();
    const std::vector<SPCSettings::StopCriteriaTails>& tails = plan->GetStopCriteriaTails();
    Put(settings, "simulatedCases", static_cast<double>(plan->GetMaxCases()));
    PutCount(settings, "numberOfCriteria", pointValues.size() + tails.size());

    bool result = true;
    for (const SPCSettings::StopCriteriaPointValue& criterion : pointValues) {
        DOMElement* criteria = NewElement(settings, "Criteria");
        Put(criteria, "target", criterion.fTargetName);
        if (criterion.fStatistic == kStatisticMean) {
            Put(criteria, "type", "point_value");
            DOMElement* pointValue = NewElement(settings, "PointValue");
            Put(pointValue, "parameter", "mean");
            Put(pointValue, "threshold", criterion.fThreshold);
            Put(pointValue, "unit", UnitWord(criterion.fUnit));
            // The level is kept as a fraction and written as a percentage: 0.95 as 95.
            Put(pointValue, "confidenceLevel", criterion.fCiLevel * 100.0);
            Append(criteria, pointValue);
        } else {
            Put(criteria, "type", "");
        }
        result = InsertElement(settings, criteria);
    }
    for (const SPCSettings::StopCriteriaTails& criterion : tails) {
        DOMElement* criteria = NewElement(settings, "Criteria");
        Put(criteria, "target", criterion.fTargetName);
        Put(criteria, "type", "tail");
        DOMElement* tail = NewElement(settings, "Tail");
        Put(tail, "threshold", criterion.fThreshold);
        Put(tail, "side", SideWord(criterion.fSide));
        Put(tail, "type", TailWord(criterion.fType));
        Put(tail, "frequency", static_cast<double>(criterion.fFrequency));
        Append(criteria, tail);
        result = InsertElement(settings, criteria);
    }
    return result;
}

bool MCPlanXMLHandler::SetDoubleAttribute(DOMElement* element, const std::string& name,
                                          double value) {
    if (MCMV::IsMissing(value)) {
        return MCXML_800::SetAttribute(element, name, std::string("."));
    }
    return MCXML_800::SetAttribute(element, name, value);
}

// ---------------------------------------------------------------------------------------------
// The fitting statistics document

namespace {

//! The covariates' correlation triangle of the fitting results and its variables, as
//! GetCorrMatrixCellCollectionFrom lists them: nothing for fewer than two rows or for a row
//! without a record.
void CovariateTriangle(const DFCOutputStats& results, std::vector<std::string>& names,
                       std::vector<std::vector<double>>& rows) {
    const MCMath_800::MCSymMatrix& matrix = results.GetCorrMatrix();
    const std::vector<DFCOutputStats::DFCVarDistInfo>& records = results.GetCovarDistInfo();
    const int n = matrix.GetNRows();
    if (n <= 1 || static_cast<std::size_t>(n) > records.size()) {
        return;
    }
    for (int r = 0; r < n; ++r) {
        std::vector<double> row;
        if (!matrix.GetRow(r, row)) {
            names.clear();
            rows.clear();
            return;
        }
        row.resize(std::min(row.size(), static_cast<std::size_t>(r) + 1));
        names.push_back(records[static_cast<std::size_t>(r)].fFittedVarName);
        rows.push_back(std::move(row));
    }
}

//! Parameter `i` of a fitted distribution, missing when the list is shorter.
double ParamAt(const std::vector<double>& params, std::size_t i) {
    return i < params.size() ? params[i] : MCMV::Missing();
}

//! One `Category` per position below `count`: `value` = the category text, one `Probability`
//! child holding its probability.
void AddFittedCategories(DOMElement* parent, const std::vector<std::string>& cats,
                         const std::vector<double>& probs, std::size_t count) {
    for (std::size_t i = 0; i < count; ++i) {
        DOMElement* category = NewElement(parent, "Category");
        Put(category, "value", i < cats.size() ? cats[i] : std::string());
        DOMElement* probability = NewElement(parent, "Probability");
        Put(probability, "value", ParamAt(probs, i));
        Append(category, probability);
        Append(parent, category);
    }
}

} // namespace

bool MCPlanXMLHandler::WriteFittingOutStats(std::string& out, const DFCOutputStats* results) {
    // The one catch site of this writer, as for the plan file.
    try {
        if (results == nullptr) {
            return false;
        }
        MCXML_800::DOMDocumentPtr doc = MCXML_800::CreateDocument("", "FitStats");
        if (!doc) {
            return false;
        }
        DOMElement* root = doc->getDocumentElement();
        const bool exportCrosstabs = results->GetSettings().GetExportCrosstabs();

        DOMElement* simulatedFields = NewElement(root, "SimulatedFields");
        if (!AddStatsInforEle(simulatedFields, results->GetCovarDistInfo(),
                              results->GetFactorDistInfo(), results->GetGFType(),
                              exportCrosstabs)) {
            return false;
        }
        bool result = InsertElement(root, simulatedFields);

        // A matrix that cannot be listed gives no cells, and then no CorrMatrix.
        std::vector<std::string> names;
        std::vector<std::vector<double>> rows;
        CovariateTriangle(*results, names, rows);
        CorrCellWriter cells(NewElement(root, "CorrCell"));
        cells.SetTriangle(names, rows);
        if (cells.GetCellCount() > 0) {
            DOMElement* corrMatrix = NewElement(root, "CorrMatrix");
            if (!AddCorrMetrixElement(corrMatrix, cells.GetCellCount(), false)) {
                return false;
            }
            result = InsertElement(root, corrMatrix) && result;
        }

        if (exportCrosstabs) {
            std::vector<std::string> factors;
            for (const DFCOutputStats::DFCVarDistInfo& record : results->GetFactorDistInfo()) {
                factors.push_back(record.fFittedVarName);
            }
            if (!factors.empty()) {
                DOMElement* table = NewElement(root, "ContingencyTable");
                if (!AddCrossTabMetrixElement(table, factors, results->GetCrstabsMatrix(),
                                              results->GetCrstabsProbs())) {
                    return false;
                }
                result = InsertElement(root, table) && result;
            }
        }

        return result && WriteFromDOM(out, doc.get()) &&
               (cells.GetCellCount() == 0 || cells.Splice(out));
    } catch (...) {
        return false;
    }
}

// A factor, or a covariate that is not continuous, is tested by chi-square; a continuous
// covariate by the chosen EDF test first and, unless only that one is wanted, the other.
bool MCPlanXMLHandler::AddStatsInforEle(
    DOMElement* simulatedFields, const std::vector<DFCOutputStats::DFCVarDistInfo>& covariates,
    const std::vector<DFCOutputStats::DFCVarDistInfo>& factors, GoodFitType gfType,
    bool exportCrosstabs) {
    const std::size_t nCovariates = covariates.size();
    bool result = true;
    for (std::size_t i = 0; i < nCovariates + factors.size() && result; ++i) {
        const bool isFactor = i >= nCovariates;
        const DFCOutputStats::DFCVarDistInfo& record =
            isFactor ? factors[i - nCovariates] : covariates[i];
        if (record.fDistBestType == kDistUnknown) {
            continue;
        }
        DOMElement* field = NewElement(simulatedFields, "SimulatedField");
        Put(field, "name", record.fFittedVarName);

        if (record.fDistBestType == kDistCategorical) {
            DOMElement* categorical = NewElement(field, "Categorical");
            AddFittedCategories(categorical, record.fDistBestParamNames, record.fDistBestParams,
                                record.fDistBestParamNames.size());
            if (!AddFitElement(categorical, "ChiSquare", record.fBestFitStat,
                               record.fBestFitPValue)) {
                return false;
            }
            Append(field, categorical);
        }

        const bool chiSquare = isFactor || record.fMeasureLevel != kLevelContinuous;
        for (const DFCOutputStats::DFCVarDistElement& element : record.fReportedElements) {
            if (!element.fbDistAllowed) {
                continue;
            }
            DOMElement* dist = NewElement(field, DistType2String(element.fDistType));
            AddFittedDistParams(dist, element, exportCrosstabs);
            bool fitsAdded = false;
            if (chiSquare) {
                fitsAdded = AddFitElement(dist, "ChiSquare", element.fChiSquareFit,
                                          element.fChiSquarePValue);
            } else if (gfType == kAndersonDarling) {
                fitsAdded = AddADFitStats(dist, element) &&
                            (fSelectedFitOnly || AddKSFitStats(dist, element));
            } else {
                fitsAdded = AddKSFitStats(dist, element) &&
                            (fSelectedFitOnly || AddADFitStats(dist, element));
            }
            if (!fitsAdded) {
                return false;
            }
            Append(field, dist);
        }
        result = InsertElement(simulatedFields, field);
    }
    return result;
}

bool MCPlanXMLHandler::AddADFitStats(DOMElement*& distElement,
                                     const DFCOutputStats::DFCVarDistElement& element) {
    return AddFitElement(distElement, "AnderDarling", element.fADFit, element.fADPValue);
}

bool MCPlanXMLHandler::AddKSFitStats(DOMElement*& distElement,
                                     const DFCOutputStats::DFCVarDistElement& element) {
    return AddFitElement(distElement, "KolmogSmirn", element.fKSFit, element.fKSPValue);
}

bool MCPlanXMLHandler::AddFitElement(DOMElement* parent, const std::string& fitName,
                                     double fitValue, double pValue) {
    DOMElement* fit = NewElement(parent, "Fit");
    Put(fit, "fitName", fitName);
    if (!SetDoubleAttribute(fit, "fitValue", fitValue) || !SetDoubleAttribute(fit, "p", pValue)) {
        throw PlanWriteError("fit statistics not set");
    }
    return InsertElement(parent, fit);
}

// Categorical: the candidate's categories with their probabilities. Empirical: its bounds,
// standard deviation and bin proportions when the contingency table is exported, otherwise
// only its bounds. Every other type: one Parameters child with an attribute per parameter.
void MCPlanXMLHandler::AddFittedDistParams(DOMElement* distElement,
                                           const DFCOutputStats::DFCVarDistElement& element,
                                           bool exportCrosstabs) {
    const std::vector<double>& params = element.fDistParams;
    const std::vector<std::string>& names = element.fDistParamNames;
    switch (element.fDistType) {
    case kDistCategorical:
        AddFittedCategories(distElement, names, params, params.size());
        break;
    case kDistEmpirical:
        if (exportCrosstabs) {
            if (!SetDoubleAttribute(distElement, "min", ParamAt(params, 0)) ||
                !SetDoubleAttribute(distElement, "max", ParamAt(params, 1)) ||
                !SetDoubleAttribute(distElement, "stddev", ParamAt(params, 2))) {
                throw PlanWriteError("Empirical bounds not set");
            }
            PutCount(distElement, "nbins", params.size() > 3 ? params.size() - 3 : 0);
            for (std::size_t i = 3; i < params.size(); ++i) {
                DOMElement* probability = NewElement(distElement, "Probability");
                if (!SetDoubleAttribute(probability, "value", params[i])) {
                    throw PlanWriteError("attribute value not set");
                }
                Append(distElement, probability);
            }
        } else {
            Put(distElement, names.size() > 0 ? names[0] : std::string("min"), ParamAt(params, 0));
            Put(distElement, names.size() > 1 ? names[1] : std::string("max"), ParamAt(params, 1));
        }
        break;
    default: {
        DOMElement* parameters = NewElement(distElement, "Parameters");
        for (std::size_t i = 0; i < names.size(); ++i) {
            Put(parameters, names[i], ParamAt(params, i));
        }
        Append(distElement, parameters);
        break;
    }
    }
}

// ---------------------------------------------------------------------------------------------
// Serialisation and time stamp

bool MCPlanXMLHandler::WriteFromDOM(std::string& out, const xercesc::DOMDocument* doc) {
    out.clear();
    std::string text;
    if (!MCXML_800::SerializeToUTF8(doc, text)) {
        return false;
    }
    out = std::move(text);
    return true;
}

const char* MCPlanXMLHandler::GetPlanVersion() {
    return kPlanVersion;
}

const char* MCPlanXMLHandler::GetPlanNamespace() {
    return kPlanNamespace;
}

std::string MCPlanXMLHandler::GetCurrentTime() {
    const std::time_t now = std::time(nullptr);
    std::tm local{};
    if (localtime_r(&now, &local) == nullptr) {
        return std::string();
    }
    return FormatTimeStamp(local);
}

std::string MCPlanXMLHandler::FormatTimeStamp(const std::tm& local) {
    char text[64];
    const int n = std::snprintf(text, sizeof(text), "%d.%02d.%02d %d:%02d", local.tm_year + 1900,
                                local.tm_mon + 1, local.tm_mday, local.tm_hour, local.tm_min);
    return n > 0 ? std::string(text, static_cast<std::size_t>(n)) : std::string();
}

} // namespace MCMCSP_800
