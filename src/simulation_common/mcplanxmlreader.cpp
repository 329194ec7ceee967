// The plan file reader: a SimulationPlan document into a caller's SPCSettings.
//
// Sections are found by name under the root, attributes by name, and every number is checked
// before it is used. A document is text from outside, so nothing in it is trusted to size an
// allocation: the counts it carries (numOfCrossProbValues, numOfCrossFactors, the number of
// parameter sets a Categorical expands into) are checked against what the document actually
// spells out before any list is built from them, and the structures a few elements can make
// grow quadratically (the correlation triangle, copies of the category list per distribution)
// are capped. Elements nested too deeply never reach the reader: the parser refuses them.
#include "simulation_common/mcplanxmlhandler.h"

#include "mccommon/mcmv.h"
#include "mcxml/mcxmlreadwrite.h"
#include "mcxml/mcxmlutil.h"

#include <xercesc/dom/DOMAttr.hpp>
#include <xercesc/dom/DOMNamedNodeMap.hpp>
#include <xercesc/dom/DOMNode.hpp>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <iterator>
#include <unordered_map>

namespace MCMCSP_800 {

using namespace MCSPConst;
using MCCommon_800::MCMV;
using MCXML_800::IMCVariable;
using xercesc::DOMElement;
using xercesc::DOMNode;

namespace {

// ---- Limits on what a document can make the reader allocate ---------------------------------

//! Entries of the correlation triangle a document may always create, whatever its number of
//! cells (about 1450 variables, 8 MiB of doubles). Beyond that, the triangle may not hold more
//! entries than the document has CorrCell elements, which a plan written by the writer
//! never exceeds (it lists every entry of the triangle).
constexpr std::size_t kMinCorrTriangleEntries = std::size_t{1} << 20;

//! Categories a contingency table may leave unspelled (rows times factors beyond the
//! CrossCategory elements present): a table is normally written in full.
constexpr std::size_t kMinUnspelledTableEntries = std::size_t{1} << 16;

//! Bytes that a Categorical or UserRanges field may expand into: each of its parameter sets
//! holds a copy of all categories or bounds. About 64 MiB; a field of 1000 categories of 20
//! characters can have some 1000 parameter sets.
constexpr std::size_t kMaxExpandedBytes = std::size_t{1} << 26;

//! Bytes counted per stored value, text or number, on top of a text's characters.
constexpr std::size_t kBytesPerValue = sizeof(MCDataValue);

// ---- Elements and attributes -----------------------------------------------------------------

DOMElement* First(const DOMNode* node, const char* name) {
    return MCXML_800::GetFirstChildElmt(node, std::string(name));
}

DOMElement* Next(const DOMNode* element, const char* name) {
    return MCXML_800::GetNextSiblingElmt(element, std::string(name));
}

DOMElement* FirstAny(const DOMNode* node) {
    return MCXML_800::GetFirstChildElmt(node);
}

DOMElement* NextAny(const DOMNode* element) {
    return MCXML_800::GetNextSiblingElmt(element);
}

std::size_t CountChildren(const DOMNode* node, const char* name) {
    std::size_t n = 0;
    for (DOMElement* e = First(node, name); e != nullptr; e = Next(e, name)) {
        ++n;
    }
    return n;
}

//! The element's name without prefix when the document was parsed with namespaces.
std::string ElementName(const DOMElement* element) {
    const XMLCh* local = element->getLocalName();
    return MCXML_800::ToUTF8(local != nullptr ? local : element->getNodeName());
}

//! The text of attribute `name` into `out`; false, with `out` untouched, when absent.
bool Text(const DOMElement* element, const char* name, std::string& out) {
    return MCXML_800::GetAttribute(element, std::string(name), out);
}

//! The text of attribute `name`, "" when absent.
std::string TextOr(const DOMElement* element, const char* name) {
    std::string text;
    static_cast<void>(Text(element, name, text));
    return text;
}

//! A required text that must not be empty.
bool RequiredName(const DOMElement* element, const char* name, std::string& out) {
    return Text(element, name, out) && !out.empty();
}

//! A "yes" or "no" attribute when present; any other text is an error.
bool ReadYesNo(const DOMElement* element, const char* name, bool& out) {
    std::string text;
    if (!Text(element, name, text)) {
        return true;
    }
    if (text != "yes" && text != "no") {
        return false;
    }
    out = text == "yes";
    return true;
}

bool ReadInt(const DOMElement* element, const char* name, int& out) {
    return MCXML_800::GetIntAttribute(element, std::string(name), 0, out) ==
           MCXML_800::kAttributeRead;
}

//! Whether a number read from the document may be the missing value ("." or "NaN").
enum class MissingValue { kAllowed, kRefused };

// A number with a finite value, or the missing value where the document form allows it
// ("number or ."). Infinities are never a plan value here: probabilities, correlations,
// thresholds and confidence levels must be finite.
bool ReadNumber(const DOMElement* element, const char* name, double& out, MissingValue missing) {
    double value = 0.0;
    if (MCXML_800::GetDoubleAttribute(element, std::string(name), value) !=
        MCXML_800::kAttributeRead) {
        return false;
    }
    if (std::isinf(value) || (MCMV::IsMissing(value) && missing == MissingValue::kRefused)) {
        return false;
    }
    out = value;
    return true;
}

//! A bound (field minimum and maximum, target filter): an infinity is a bound too, the
//! missing value is none.
bool ReadBound(const DOMElement* element, const char* name, double& out) {
    double value = 0.0;
    if (MCXML_800::GetDoubleAttribute(element, std::string(name), value) !=
            MCXML_800::kAttributeRead ||
        MCMV::IsMissing(value)) {
        return false;
    }
    out = value;
    return true;
}

//! A value written as it is stored (fixed values, labelled values): any double, missing and
//! infinities included.
bool ReadAnyNumber(const DOMElement* element, const char* name, double& out) {
    return MCXML_800::GetDoubleAttribute(element, std::string(name), out) ==
           MCXML_800::kAttributeRead;
}

// An xsd:double literal: a normal number gives its value, NaN the missing value; the
// infinities (and literals too large for a double, which the library classes as infinite) are
// refused. A text that is no such literal (also an empty or absent one) makes the library
// throw its NumberFormatException, which ends the read at the entry point.
bool ParseDoubleText(const XMLCh* text, double& out) {
    static const XMLCh kEmpty[] = {0};
    const MCXMLDouble number(text != nullptr ? text : kEmpty);
    switch (number.GetLiteralType()) {
    case xercesc::XMLAbstractDoubleFloat::Normal:
        out = number.GetValue();
        return true;
    case xercesc::XMLAbstractDoubleFloat::NaN:
        out = MCMV::Missing();
        return true;
    default:
        return false;
    }
}

bool AllFinite(const std::vector<double>& values) {
    return std::all_of(values.begin(), values.end(), [](double v) { return std::isfinite(v); });
}

// ---- Words ----------------------------------------------------------------------------------

// The host's storage words: 1 integer, 2 numeric ("double"), 3 string, 4 date, 5 time,
// 6 timestamp; any other word is no storage.
IMCVariable::VariableStorage StorageFromWord(const std::string& word) {
    static const std::pair<const char*, IMCVariable::VariableStorage> kWords[] = {
        {"string", IMCVariable::kStringStorage},   {"double", IMCVariable::kNumericStorage},
        {"integer", IMCVariable::kIntegerStorage}, {"date", IMCVariable::kDateStorage},
        {"time", IMCVariable::kTimeStorage},       {"timestamp", IMCVariable::kTimestampStorage},
    };
    for (const auto& entry : kWords) {
        if (word == entry.first) {
            return entry.second;
        }
    }
    return IMCVariable::kNoStorage;
}

// ---- Value labels ---------------------------------------------------------------------------

//! Reads `ValueLabels` of a simulated (`simulated`) or fixed field into `input`, whose value
//! storage is already known. An absent text counts as "" in a simulated field and is skipped
//! in a fixed one; lists of unequal length are then dropped by SetValueLabels.
bool ReadValueLabels(const DOMElement* field, MCValueLabels& input, bool isString, bool simulated) {
    const DOMElement* valueLabels = First(field, "ValueLabels");
    if (valueLabels == nullptr) {
        return true;
    }
    std::vector<std::string> texts;
    std::vector<double> numbers;
    std::vector<std::string> labels;
    for (DOMElement* label = First(valueLabels, "ValueLabel"); label != nullptr;
         label = Next(label, "ValueLabel")) {
        std::string text;
        if (isString) {
            if (Text(label, "value", text) || simulated) {
                texts.push_back(text);
            }
        } else {
            double value = 0.0;
            if (!ReadAnyNumber(label, "value", value)) {
                return false;
            }
            numbers.push_back(value);
        }
        text.clear();
        if (Text(label, "displayValue", text) || simulated) {
            labels.push_back(text);
        }
    }
    if (isString && !texts.empty()) {
        input.SetValueLabels(texts, labels);
    } else if (!isString && !numbers.empty()) {
        input.SetValueLabels(numbers, labels);
    }
    return true;
}

//! The names of the `AssociatedTarget` children; false when one has no name.
bool ReadAssociatedTargets(const DOMElement* field, std::vector<std::string>& names) {
    for (DOMElement* target = First(field, "AssociatedTarget"); target != nullptr;
         target = Next(target, "AssociatedTarget")) {
        std::string name;
        if (!RequiredName(target, "name", name)) {
            return false;
        }
        names.push_back(name);
    }
    return true;
}

// ---- Distributions --------------------------------------------------------------------------

//! Appends a distribution named `name` to `input` and returns it (valid until the next one).
DistInfoElem* AppendDistribution(SimInputSpecs& input, const std::string& name) {
    const int index = input.AddDistribution(name);
    return index < 0 ? nullptr : input.GetDistribution(static_cast<std::size_t>(index));
}

//! Column `k` of `rows`.
std::vector<double> Column(const std::vector<std::vector<double>>& rows, std::size_t k) {
    std::vector<double> column;
    column.reserve(rows.size());
    for (const std::vector<double>& row : rows) {
        column.push_back(row[k]);
    }
    return column;
}

// The probability rows of a Categorical or UserRanges element, one per category or interval,
// each holding one probability per parameter set. Rows must all have the first row's length
// (a shorter one would leave a parameter set without a probability for that category) and
// hold finite numbers. Returns the number of parameter sets through `nSets`.
bool CheckProbabilityRows(const std::vector<std::vector<double>>& rows, std::size_t& nSets) {
    nSets = rows.empty() ? 0 : rows.front().size();
    return std::all_of(rows.begin(), rows.end(), [nSets](const std::vector<double>& row) {
        return row.size() == nSets && AllFinite(row);
    });
}

//! True when `nSets` copies of a parameter set of `bytesPerSet` bytes stay within the cap.
bool ExpansionFits(std::size_t nSets, std::size_t bytesPerSet) {
    return bytesPerSet == 0 || nSets <= kMaxExpandedBytes / bytesPerSet;
}

// Empirical: one distribution with min, max, stddev and the bin proportions of its
// Probability children. The ok mark becomes the result of reading the proportions.
bool ReadEmpirical(const DOMElement* distElement, const std::string& name, SimInputSpecs& input,
                   bool& ok) {
    DistInfoElem* dist = AppendDistribution(input, name);
    double minimum = 0.0;
    double maximum = 0.0;
    if (dist == nullptr || !ReadNumber(distElement, "min", minimum, MissingValue::kAllowed) ||
        !ReadNumber(distElement, "max", maximum, MissingValue::kAllowed)) {
        return false;
    }
    // An absent or unreadable stddev is stored as missing.
    double stddev = MCMV::Missing();
    static_cast<void>(ReadNumber(distElement, "stddev", stddev, MissingValue::kAllowed));
    static_cast<void>(dist->AddParameter("min", minimum));
    static_cast<void>(dist->AddParameter("max", maximum));
    static_cast<void>(dist->AddParameter("stddev", stddev));
    std::vector<double> probs;
    ok = MCPlanXMLHandler::HandleProbabilityEle(distElement, probs);
    static_cast<void>(dist->AddParameter("probs", probs));
    return true;
}

// Categorical: each child is a category with one probability per parameter set; parameter
// set k becomes a distribution with all categories and the k-th probability of each.
bool ReadCategorical(const DOMElement* first, const std::string& name, SimInputSpecs& input,
                     bool ok) {
    std::vector<std::string> cats;
    std::vector<std::vector<double>> rows;
    std::size_t catBytes = 0;
    for (const DOMElement* category = ok ? first : nullptr; category != nullptr;
         category = NextAny(category)) {
        cats.push_back(TextOr(category, "value"));
        catBytes += cats.back().size() + kBytesPerValue;
        std::vector<double> row;
        if (!MCPlanXMLHandler::HandleProbabilityEle(category, row)) {
            return false;
        }
        rows.push_back(std::move(row));
    }
    std::size_t nSets = 0;
    if (!CheckProbabilityRows(rows, nSets) ||
        !ExpansionFits(nSets, catBytes + cats.size() * kBytesPerValue)) {
        return false;
    }
    for (std::size_t k = 0; k < nSets; ++k) {
        DistInfoElem* dist = AppendDistribution(input, name);
        if (dist == nullptr) {
            return false;
        }
        static_cast<void>(dist->AddParameter("cats", cats));
        static_cast<void>(dist->AddParameter("probs", Column(rows, k)));
    }
    return true;
}

// UserRanges: each child is an interval with min, max and one probability per parameter set.
// A bound that is not a finite number or NaN (an infinity) fails the read: the bound lists
// would otherwise differ in length and pair the wrong bounds.
bool ReadUserRanges(const DOMElement* first, const std::string& name, SimInputSpecs& input,
                    bool ok) {
    std::vector<double> mins;
    std::vector<double> maxs;
    std::vector<std::vector<double>> rows;
    for (const DOMElement* interval = ok ? first : nullptr; interval != nullptr;
         interval = NextAny(interval)) {
        double minimum = 0.0;
        double maximum = 0.0;
        if (!ParseDoubleText(MCXML_800::GetAttribute(interval, std::string("min")), minimum) ||
            !ParseDoubleText(MCXML_800::GetAttribute(interval, std::string("max")), maximum)) {
            return false;
        }
        mins.push_back(minimum);
        maxs.push_back(maximum);
        std::vector<double> row;
        if (!MCPlanXMLHandler::HandleProbabilityEle(interval, row)) {
            return false;
        }
        rows.push_back(std::move(row));
    }
    std::size_t nSets = 0;
    if (!CheckProbabilityRows(rows, nSets) ||
        !ExpansionFits(nSets, 3 * mins.size() * kBytesPerValue)) {
        return false;
    }
    for (std::size_t k = 0; k < nSets; ++k) {
        DistInfoElem* dist = AppendDistribution(input, name);
        if (dist == nullptr) {
            return false;
        }
        static_cast<void>(dist->AddParameter("min", mins));
        static_cast<void>(dist->AddParameter("max", maxs));
        static_cast<void>(dist->AddParameter("probs", Column(rows, k)));
    }
    return true;
}

// The attributes of a parameter set in the order of the distribution's parameters (Normal:
// mean, stddev; Triangular: min, max, mode), then any others in DOM order. Xerces-C lists the
// attributes of an element sorted by name, whatever their order in the text, and the
// simulator reads parameters by position: taken in DOM order a Triangular would come back as
// max, min, mode and a Gamma as scale, shape.
std::vector<const DOMNode*> ParameterAttributes(const DOMElement* set, DistType type) {
    std::vector<const DOMNode*> ordered;
    const xercesc::DOMNamedNodeMap* attributes = set->getAttributes();
    const XMLSize_t n = attributes != nullptr ? attributes->getLength() : 0;
    std::vector<std::string> names;
    GetDistributionParameterNames(type, names);
    for (const std::string& name : names) {
        if (const DOMNode* attribute =
                attributes != nullptr ? attributes->getNamedItem(MCXML_800::ToUTF16(name).c_str())
                                      : nullptr) {
            ordered.push_back(attribute);
        }
    }
    for (XMLSize_t i = 0; i < n; ++i) {
        const DOMNode* attribute = attributes->item(i);
        if (std::find(ordered.begin(), ordered.end(), attribute) == ordered.end()) {
            ordered.push_back(attribute);
        }
    }
    return ordered;
}

// Every other type: each child is one parameter set whose attributes are the parameters (see
// ParameterAttributes for their order). The Negative binomial's "thresh" is the threshold,
// any other attribute its probability, and its type comes from the distribution element: 1.0
// (trials) unless `type` is absent or "failures" (2.0).
bool ReadParameterSets(const DOMElement* distElement, const DOMElement* first, DistType type,
                       const std::string& name, SimInputSpecs& input, bool& ok) {
    std::string typeWord = "failures";
    static_cast<void>(Text(distElement, "type", typeWord));
    const double negBinType = typeWord == "failures" ? 2.0 : 1.0;

    for (const DOMElement* set = first; set != nullptr && ok; set = NextAny(set)) {
        DistInfoElem* dist = AppendDistribution(input, name);
        if (dist == nullptr) {
            return false;
        }
        double thresh = 0.0;
        double prob = 0.0;
        for (const DOMNode* attribute : ParameterAttributes(set, type)) {
            const std::string parameter = MCXML_800::ToUTF8(attribute->getNodeName());
            double value = 0.0;
            ok = ParseDoubleText(attribute->getNodeValue(), value);
            if (type == kDistNegbinomial) {
                if (!ok) {
                    break;
                }
                (parameter == "thresh" ? thresh : prob) = value;
            } else {
                static_cast<void>(dist->AddParameter(parameter, value));
                if (!ok) {
                    break;
                }
            }
        }
        if (type == kDistNegbinomial) {
            static_cast<void>(dist->AddParameter("thresh", thresh));
            static_cast<void>(dist->AddParameter("prob", prob));
            static_cast<void>(dist->AddParameter("type", negBinType));
        }
    }
    return true;
}

// The distribution of a simulated field: its first child element, named by the distribution
// (element name or distribution name). `ok` carries the field's ok mark in and out.
bool ReadDistribution(const DOMElement* distElement, SimInputSpecs& input, bool& ok) {
    const std::string name = ElementName(distElement);
    const DistType type = String2DistType(name);
    const DOMElement* first = FirstAny(distElement);
    if (first == nullptr && type != kDistEmpirical) {
        return false;
    }
    switch (type) {
    case kDistEmpirical:
        return ReadEmpirical(distElement, name, input, ok);
    case kDistCategorical:
        return ReadCategorical(first, name, input, ok);
    case kDistUserRanges:
        return ReadUserRanges(first, name, input, ok);
    default:
        return ReadParameterSets(distElement, first, type, name, input, ok);
    }
}

} // namespace

// ---------------------------------------------------------------------------------------------
// Entry points

bool MCPlanXMLHandler::ParsePlanFile(const xercesc::DOMDocument* doc, SPCSettings*& plan) {
    // The one catch site of this reader: the number-format exception of ParseDoubleText, DOM
    // and XML exceptions and allocation failures all end the read with false.
    try {
        return ParseDocument(doc, plan);
    } catch (...) {
        return false;
    }
}

// A text is read in two parts: the correlation cells through the streaming parser, the rest
// of the document (the cells blanked out) through the DOM, so that a large matrix never
// becomes a tree of nodes.
bool MCPlanXMLHandler::ParsePlanFile(const std::string& source, SPCSettings*& plan) {
    const MCPlanCorrCells* const previous = fpCorrCells;
    try {
        MCPlanCorrCells cells;
        std::string rest;
        if (!cells.Read(source, rest)) {
            return false;
        }
        MCXML_800::MCXMLReadWrite parser;
        static_cast<void>(parser.ParseToDOM(rest));
        const xercesc::DOMDocument* doc = parser.GetDocument();
        fpCorrCells = &cells;
        const bool read = doc != nullptr && ParseDocument(doc, plan);
        fpCorrCells = previous;
        return read;
    } catch (...) {
        fpCorrCells = previous;
        return false;
    }
}

bool MCPlanXMLHandler::ParsePlanFile(std::istream& source, SPCSettings*& plan) {
    try {
        if (!source.good()) {
            return false;
        }
        const std::string text((std::istreambuf_iterator<char>(source)),
                               std::istreambuf_iterator<char>());
        return !source.bad() && ParsePlanFile(text, plan);
    } catch (...) {
        return false;
    }
}

bool MCPlanXMLHandler::ParseDocument(const xercesc::DOMDocument* doc, SPCSettings*& plan) {
    if (doc == nullptr || plan == nullptr) {
        return false;
    }
    const DOMElement* root = doc->getDocumentElement();
    if (root == nullptr) {
        return false;
    }
    // Sections are read in this order whatever their order in the file; of a repeated
    // section only the first counts.
    using Reader = bool (MCPlanXMLHandler::*)(DOMElement*, SPCSettings*&);
    static const std::pair<const char*, Reader> kSections[] = {
        {"ModelFiles", &MCPlanXMLHandler::HandleModelFilesEle},
        {"SimulatedFields", &MCPlanXMLHandler::HandleSimulatedFields},
        {"FixedFields", &MCPlanXMLHandler::HandleFixedFieldElement},
        {"CorrMatrix", &MCPlanXMLHandler::HandleCorrMetrixElement},
        {"ContingencyTable", &MCPlanXMLHandler::HandleCrossTabMetrixElement},
        {"Settings", &MCPlanXMLHandler::HandleSettingsElement},
    };
    for (const auto& [name, reader] : kSections) {
        DOMElement* section = First(root, name);
        if (section != nullptr && !(this->*reader)(section, plan)) {
            return false;
        }
    }
    if (fHasVarList) {
        plan->CompleteVarInfo(fVarList);
        if (!plan->ValidateVarInfo(fVarList)) {
            return false;
        }
    }
    fSettings = plan;
    return true;
}

// ---------------------------------------------------------------------------------------------
// Sections

bool MCPlanXMLHandler::HandleModelFilesEle(DOMElement* modelFiles, SPCSettings*& plan) {
    int nFiles = 0;
    if (!ReadInt(modelFiles, "numberOfFiles", nFiles) ||
        First(modelFiles, "ModelFile") == nullptr) {
        return false;
    }
    for (DOMElement* file = First(modelFiles, "ModelFile"); file != nullptr;
         file = Next(file, "ModelFile")) {
        SPCSettings::ModelFileElem elem;
        elem.fFilePath = TextOr(file, "file");
        for (DOMElement* target = First(file, "Target"); target != nullptr;
             target = Next(target, "Target")) {
            SPCSettings::ModelFileTarget info;
            if (!HandleTargetElement(target, info)) {
                return false;
            }
            elem.fvTargets.push_back(std::move(info));
        }
        elem.fbCustomModel = TextOr(file, "customModels") == "yes";
        plan->AddModelFileInfo(elem);
    }
    return true;
}

bool MCPlanXMLHandler::HandleTargetElement(DOMElement* element,
                                           SPCSettings::ModelFileTarget& target) {
    if (!RequiredName(element, "name", target.fName)) {
        return false;
    }
    target.fMapName = TextOr(element, "mappedName");
    std::string text;
    if (Text(element, "excludeFromOutput", text)) {
        target.fbExcludeFromOutput = text == "yes";
    }
    if (Text(element, "outputFormat", text)) {
        target.fOutputFormat = text;
    }
    const std::string level = TextOr(element, "measurementLevel");
    target.fMeasurementLevel = level == "continuous"    ? kLevelContinuous
                               : level == "categorical" ? kLevelCategorical
                               : level == "ordinal"     ? kLevelOrdinal
                                                        : kLevelUnknown;

    if (const DOMElement* filter = First(element, "TargetFilter")) {
        target.fbHasTargetFilter = true;
        if (!ReadYesNo(filter, "includeLow", target.fbIncludeLow) ||
            !ReadYesNo(filter, "includeHigh", target.fbIncludeHigh)) {
            return false;
        }
        // An unreadable bound leaves the default: no bound on that side.
        double bound = 0.0;
        if (ReadBound(filter, "low", bound)) {
            target.fFilterLow = bound;
        }
        if (ReadBound(filter, "high", bound)) {
            target.fFilterHigh = bound;
        }
    }
    if (const DOMElement* comment = First(element, "Comment")) {
        if (const DOMNode* content = comment->getFirstChild()) {
            target.fComment = MCXML_800::ToUTF8(content->getNodeValue());
        }
    }
    return true;
}

bool MCPlanXMLHandler::HandleSimulatedFields(DOMElement* simulatedFields, SPCSettings*& plan) {
    int nFields = 0;
    if (!ReadInt(simulatedFields, "numberOfFields", nFields) ||
        First(simulatedFields, "SimulatedField") == nullptr) {
        return false;
    }
    for (DOMElement* field = First(simulatedFields, "SimulatedField"); field != nullptr;
         field = Next(field, "SimulatedField")) {
        SimInputSpecs input(false);
        if (!HandleSimulatedField(field, input)) {
            return false;
        }
        plan->AddSimulationInput(input);
    }
    return true;
}

bool MCPlanXMLHandler::HandleSimulatedField(DOMElement* field, SimInputSpecs& input) {
    std::string text;
    if (Text(field, "name", text)) {
        input.SetVarName(text);
    }
    const std::string level = TextOr(field, "measurementLevel");
    input.SetVarLevel(level == "continuous" ? kLevelContinuous
                      : level == "ordinal"  ? kLevelOrdinal
                                            : kLevelCategorical);
    input.SetAutofitted(TextOr(field, "autofitted") == "yes");
    input.SetLocked(TextOr(field, "locked") == "yes");
    input.SetValueType(StorageFromWord(TextOr(field, "valueType")));
    if (Text(field, "mappedName", text) && !text.empty()) {
        input.SetMapVarName(text);
    }
    double bound = 0.0;
    if (ReadBound(field, "min", bound)) {
        input.SetMinimum(bound);
    }
    if (ReadBound(field, "max", bound)) {
        input.SetMaximum(bound);
    }
    input.SetOutput(TextOr(field, "excludeFromOutput") != "yes");
    if (Text(field, "outputFormat", text)) {
        input.SetOutputFormat(text);
    }
    if (!ReadValueLabels(field, input, input.IsString(), true)) {
        return false;
    }

    // A field is marked failed when numberOfTargets is absent, unreadable or not a count;
    // an Empirical replaces the mark by the result of reading its proportions.
    int nTargets = 0;
    bool ok = !(MCXML_800::GetIntAttribute(field, std::string("numberOfTargets"), 0, nTargets) >
                MCXML_800::kAttributeRead);
    const DOMElement* distElement = FirstAny(field);
    if (distElement == nullptr || !ReadDistribution(distElement, input, ok) || !ok) {
        return false;
    }

    if (const DOMElement* list = First(field, "AutofitDistList")) {
        for (DOMElement* distName = First(list, "DistName"); distName != nullptr;
             distName = Next(distName, "DistName")) {
            if (Text(distName, "name", text)) {
                static_cast<void>(input.AddAutofitDist(text));
            }
        }
    }
    std::vector<std::string> targets;
    if (!ReadAssociatedTargets(field, targets)) {
        return false;
    }
    input.SetAssociatTargetNames(targets);
    return true;
}

bool MCPlanXMLHandler::HandleFixedFieldElement(DOMElement* fixedFields, SPCSettings*& plan) {
    int nFields = 0;
    if (!ReadInt(fixedFields, "numberOfFields", nFields) ||
        First(fixedFields, "FixedField") == nullptr) {
        return false;
    }
    for (DOMElement* field = First(fixedFields, "FixedField"); field != nullptr;
         field = Next(field, "FixedField")) {
        FixedInputSpecs input;
        std::string text;
        if (!RequiredName(field, "name", text)) {
            return false;
        }
        input.SetVarName(text);
        input.SetValueType(StorageFromWord(TextOr(field, "valueType")));
        if (Text(field, "outputFormat", text)) {
            input.SetOutputFormat(text);
        }
        if (Text(field, "locked", text)) {
            input.SetLocked(text == "yes");
        }
        const bool isString = input.GetValueType() == IMCVariable::kStringStorage;
        for (DOMElement* value = First(field, "Value"); value != nullptr;
             value = Next(value, "Value")) {
            if (isString) {
                if (Text(value, "value", text)) {
                    input.AddInputValue(text);
                }
            } else {
                double number = 0.0;
                if (!ReadAnyNumber(value, "value", number)) {
                    return false;
                }
                input.AddInputValue(number);
            }
        }
        std::vector<std::string> targets;
        if (!ReadAssociatedTargets(field, targets)) {
            return false;
        }
        input.SetAssociatTargetNames(targets);
        if (!ReadValueLabels(field, input, isString, false)) {
            return false;
        }
        plan->AddFixedInput(input);
    }
    return true;
}

namespace {

// The correlation triangle being read: each variable's position is found through a hash, so
// n cells cost O(n) (setting them one by one in the plan searches its variable list for each).
// Each new variable adds a row as long as the variable list, so the triangle is capped by the
// number of cells the document spells out. A plan that already holds correlations gets the
// cells one by one instead.
class CorrTriangle {
public:
    CorrTriangle(const SPCSettings& plan, std::size_t nCellElements)
        : fMaxEntries(std::max(kMinCorrTriangleEntries, nCellElements)),
          fbDirect(plan.GetCorrVarList().empty() && plan.GetCorrMatrix().empty()),
          fvVars(plan.GetCorrVarList()) {
        for (const std::string& name : fvVars) {
            fPositions.emplace(name, fPositions.size());
        }
    }

    //! Sets one cell; false when the triangle would grow beyond the cap.
    bool Set(const std::string& rowVar, const std::string& colVar, double value,
             SPCSettings& plan) {
        const std::size_t nVars = fvVars.size() + (fPositions.count(rowVar) == 0 ? 1 : 0) +
                                  (colVar != rowVar && fPositions.count(colVar) == 0 ? 1 : 0);
        if (nVars * (nVars + 1) / 2 > fMaxEntries) {
            return false;
        }
        // The column variable is registered first, as the plan does.
        const std::size_t c = PositionOf(colVar);
        const std::size_t r = PositionOf(rowVar);
        if (!fbDirect) {
            plan.SetCorrMatrixCell(rowVar, colVar, value);
        } else if (r != c) {
            fvvRows[std::max(r, c)][std::min(r, c)] = value;
        }
        return true;
    }

    //! Hands the triangle to the plan.
    void Finish(SPCSettings& plan) {
        if (!fbDirect || fvVars.empty()) {
            return;
        }
        plan.SetCorrVarList(fvVars);
        for (std::vector<double>& row : fvvRows) {
            plan.AddCorrMatrixRow(row);
            row = std::vector<double>();
        }
    }

private:
    std::size_t PositionOf(const std::string& name) {
        const auto [it, added] = fPositions.emplace(name, fvVars.size());
        if (added) {
            fvVars.push_back(name);
            if (fbDirect) {
                fvvRows.emplace_back(fvVars.size(), 0.0);
                fvvRows.back().back() = 1.0;
            }
        }
        return it->second;
    }

    std::size_t fMaxEntries;                                 //!< cap on the triangle's entries
    bool fbDirect;                                           //!< built here, handed over at the end
    std::vector<std::string> fvVars;                         //!< variables in order
    std::unordered_map<std::string, std::size_t> fPositions; //!< name -> position in fvVars
    std::vector<std::vector<double>> fvvRows;                //!< the triangle's rows
};

} // namespace

bool MCPlanXMLHandler::HandleCorrMetrixElement(DOMElement* corrMatrix, SPCSettings*& plan) {
    int nCells = 0;
    if (!ReadInt(corrMatrix, "numberOfCells", nCells)) {
        return false;
    }
    std::string text;
    if (Text(corrMatrix, "locked", text)) {
        if (text != "yes" && text != "no") {
            return false;
        }
        plan->SetCorrLocked(text == "yes");
    }
    if (fpCorrCells != nullptr && fpCorrCells->HasMatrix()) {
        // The cells came through the streaming parser; the element here has none.
        if (!fpCorrCells->AreCellsReadable()) {
            return false;
        }
        CorrTriangle triangle(*plan, fpCorrCells->GetCellElementCount());
        const std::vector<std::string>& names = fpCorrCells->GetNames();
        for (const MCPlanCorrCells::Cell& cell : fpCorrCells->GetCells()) {
            if (!triangle.Set(names[cell.fRow], names[cell.fCol], cell.fValue, *plan)) {
                return false;
            }
        }
        triangle.Finish(*plan);
        return true;
    }
    CorrTriangle triangle(*plan, CountChildren(corrMatrix, "CorrCell"));
    for (DOMElement* cell = First(corrMatrix, "CorrCell"); cell != nullptr;
         cell = Next(cell, "CorrCell")) {
        std::string rowVar;
        std::string colVar;
        if (!RequiredName(cell, "rowVar", rowVar) || !RequiredName(cell, "colVar", colVar)) {
            return false;
        }
        if (!Text(cell, "value", text)) {
            continue;
        }
        double value = MCMV::Missing();
        if (text != "." && !ReadNumber(cell, "value", value, MissingValue::kAllowed)) {
            return false;
        }
        if (!triangle.Set(rowVar, colVar, value, *plan)) {
            return false;
        }
    }
    triangle.Finish(*plan);
    return true;
}

// The counts give the table's shape, but only what the document spells out is built: the
// number of TableCell elements must equal the probability count, and neither a factor list
// nor the rows may be longer than the Factor and CrossCategory elements present make
// plausible. A table with more named factors or categories than its factor count is refused.
bool MCPlanXMLHandler::HandleCrossTabMetrixElement(DOMElement* table, SPCSettings*& plan) {
    int nFactors = 0;
    int nProbs = 0;
    if (!ReadInt(table, "numOfCrossFactors", nFactors) ||
        !ReadInt(table, "numOfCrossProbValues", nProbs) || nFactors < 0 || nProbs < 0) {
        return false;
    }
    const std::size_t nF = static_cast<std::size_t>(nFactors);
    const std::size_t nP = static_cast<std::size_t>(nProbs);
    const DOMElement* crossFactors = First(table, "CrossFactors");
    const std::size_t nFactorElements =
        crossFactors != nullptr ? CountChildren(crossFactors, "Factor") : 0;
    std::size_t nCells = 0;
    std::size_t maxCategories = 0;
    std::size_t totalCategories = 0;
    for (DOMElement* cell = First(table, "TableCell"); cell != nullptr;
         cell = Next(cell, "TableCell")) {
        const std::size_t n = CountChildren(cell, "CrossCategory");
        maxCategories = std::max(maxCategories, n);
        totalCategories += n;
        ++nCells;
    }
    if (nCells != nP || maxCategories > nF ||
        (nF > 0 && nF > std::max(nFactorElements, maxCategories)) ||
        (nF > 0 && nP > std::max(totalCategories, kMinUnspelledTableEntries) / nF)) {
        return false;
    }

    if (crossFactors != nullptr) {
        std::vector<std::string> factors(nF);
        std::size_t position = 0;
        for (DOMElement* factor = First(crossFactors, "Factor"); factor != nullptr;
             factor = Next(factor, "Factor")) {
            std::string name;
            if (!Text(factor, "name", name)) {
                continue;
            }
            if (position == nF) {
                return false;
            }
            factors[position++] = name;
        }
        plan->SetCrstabsFactors(factors);
    }

    std::vector<std::vector<std::string>> rows;
    std::vector<double> probs;
    rows.reserve(nP);
    probs.reserve(nP);
    for (DOMElement* cell = First(table, "TableCell"); cell != nullptr;
         cell = Next(cell, "TableCell")) {
        std::vector<std::string> row(nF);
        std::size_t position = 0;
        for (DOMElement* category = First(cell, "CrossCategory"); category != nullptr;
             category = Next(category, "CrossCategory")) {
            row[position++] = TextOr(category, "category");
        }
        double probability = 0.0;
        if (!ReadNumber(cell, "probability", probability, MissingValue::kRefused)) {
            return false;
        }
        rows.push_back(std::move(row));
        probs.push_back(probability);
    }
    plan->SetCrstabsMatrix(rows);
    plan->SetCrstabsProbs(probs);
    return true;
}

bool MCPlanXMLHandler::HandleSettingsElement(DOMElement* settings, SPCSettings*& plan) {
    int maxCases = 0;
    int nCriteria = 0;
    if (!ReadInt(settings, "simulatedCases", maxCases)) {
        return false;
    }
    plan->SetMaxCases(maxCases);
    if (!ReadInt(settings, "numberOfCriteria", nCriteria)) {
        return false;
    }
    for (DOMElement* criteria = First(settings, "Criteria"); criteria != nullptr;
         criteria = Next(criteria, "Criteria")) {
        std::string target;
        std::string type;
        if (!RequiredName(criteria, "target", target) || !RequiredName(criteria, "type", type)) {
            return false;
        }
        if (type == "point_value") {
            const DOMElement* pointValue = First(criteria, "PointValue");
            double threshold = 0.0;
            double level = 0.0;
            if (pointValue == nullptr ||
                !ReadNumber(pointValue, "threshold", threshold, MissingValue::kRefused)) {
                return false;
            }
            const std::string unit = TextOr(pointValue, "unit");
            if (unit != "value" && unit != "percent") {
                return false;
            }
            // The level is written as a percentage and kept as a fraction.
            if (!ReadNumber(pointValue, "confidenceLevel", level, MissingValue::kRefused) ||
                level < 0.0 || level > 100.0) {
                return false;
            }
            plan->SetStopCriteriaMean(target, threshold,
                                      unit == "percent" ? kUnitPercent : kUnitValue, level / 100.0);
        } else if (type == "tail") {
            const DOMElement* tail = First(criteria, "Tail");
            if (tail == nullptr) {
                return false;
            }
            // An absent or unreadable threshold is stored as missing, a frequency as 0.
            double threshold = MCMV::Missing();
            static_cast<void>(ReadNumber(tail, "threshold", threshold, MissingValue::kRefused));
            int frequency = 0;
            static_cast<void>(ReadInt(tail, "frequency", frequency));
            plan->SetStopCriteriaTails(
                target, threshold, TextOr(tail, "side") == "left" ? kSideLeft : kSideRight,
                TextOr(tail, "type") == "percentile" ? kTailPercentile : kTailValue, frequency);
        } else {
            return false;
        }
    }
    return true;
}

// ---------------------------------------------------------------------------------------------
// Probabilities

bool MCPlanXMLHandler::HandleProbabilityEle(const DOMElement* parent, std::vector<double>& probs) {
    for (DOMElement* probability = First(parent, "Probability"); probability != nullptr;
         probability = Next(probability, "Probability")) {
        double value = 0.0;
        if (!ReadNumber(probability, "value", value, MissingValue::kAllowed)) {
            return false;
        }
        probs.push_back(value);
    }
    return true;
}

bool MCPlanXMLHandler::HandleProbabilityEle(const DOMElement* parent, DistInfoElem*& dist,
                                            const std::string& name, std::vector<double>& probs) {
    const bool read = HandleProbabilityEle(parent, probs);
    if (read && !probs.empty() && dist != nullptr) {
        static_cast<void>(dist->AddParameter(name, probs));
    }
    return read;
}

} // namespace MCMCSP_800
