#include "data/planchecks.h"

#include "common/hosterror.h"
#include "data/inputlimits.h"
#include "mccommon/mcmv.h"
#include "mccommon/numtext.h"
#include "mcxml/mcxmlreadwrite.h"
#include "mcxml/mcxmlutil.h"
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/mcspdistfamily.h"

#include <xercesc/dom/DOMElement.hpp>

#include <algorithm>
#include <cctype>
#include <cmath>
#include <unordered_map>
#include <unordered_set>

namespace MCHost {

using MCCommon_800::FormatDefault;
using MCCommon_800::MCMV;
using MCMCSP_800::DistInfoElem;
using MCMCSP_800::SimInputSpecs;
using MCMCSP_800::SPCSettings;
using MCSPConst::DistType;

namespace {

//! A text as it stands in an attribute value of the written document.
std::string XmlEscaped(const std::string& text) {
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
        default:
            out += c;
        }
    }
    return out;
}

//! The needle of an attribute `name="value"`.
std::string Attribute(const char* name, const std::string& value) {
    return std::string(name) + "=\"" + XmlEscaped(value) + "\"";
}

std::string LocalName(const xercesc::DOMElement* element) {
    const XMLCh* local = element->getLocalName();
    return MCXML_800::ToUTF8(local != nullptr ? local : element->getTagName());
}

const xercesc::DOMElement* Child(const xercesc::DOMElement* parent, const std::string& name) {
    for (const xercesc::DOMElement* e = parent->getFirstElementChild(); e != nullptr;
         e = e->getNextElementSibling()) {
        if (LocalName(e) == name) {
            return e;
        }
    }
    return nullptr;
}

std::string AttributeText(const xercesc::DOMElement* element, const char* name) {
    return MCXML_800::ToUTF8(element->getAttribute(MCXML_800::ToUTF16(name).c_str()));
}

// ---- The document ---------------------------------------------------------------------------

//! The major version: the digits before the first dot; "" when the text does not start so.
std::string MajorVersion(const std::string& version) {
    const std::size_t end = version.find('.');
    const std::string major = version.substr(0, end);
    const bool digits = !major.empty() && std::all_of(major.begin(), major.end(),
                                                      [](char c) { return c >= '0' && c <= '9'; });
    return digits ? major : std::string();
}

void CheckRoot(const xercesc::DOMElement* root, const PlanSource& source,
               std::vector<std::string>& warnings) {
    const std::string expectedSpace = MCMCSP_800::MCPlanXMLHandler::GetPlanNamespace();
    const std::string expectedVersion = MCMCSP_800::MCPlanXMLHandler::GetPlanVersion();
    if (const XMLCh* space = root->getNamespaceURI()) {
        const std::string found = MCXML_800::ToUTF8(space);
        if (found != expectedSpace) {
            throw HostError(source.Message("the plan is of the namespace '" + found +
                                               "'; this program reads plans of '" + expectedSpace +
                                               "'",
                                           "<SimulationPlan"));
        }
    }
    if (!root->hasAttribute(MCXML_800::ToUTF16("version").c_str())) {
        warnings.push_back(source.Message("the plan names no version; read as a version " +
                                              expectedVersion + " plan",
                                          "<SimulationPlan"));
        return;
    }
    const std::string found = AttributeText(root, "version");
    const std::string major = MajorVersion(found);
    if (major != MajorVersion(expectedVersion)) {
        throw HostError(
            source.Message("the plan is of version '" + found + "'; this program reads version " +
                               MajorVersion(expectedVersion) + " plans (" + expectedVersion + ")",
                           "<SimulationPlan"));
    }
}

//! The element names the reader knows, for the message about one it does not.
std::string KnownDistElements() {
    std::string list;
    for (int t = MCSPConst::kDistBinomial; t <= MCSPConst::kDistUserRanges; ++t) {
        list +=
            (list.empty() ? "" : ", ") + MCMCSP_800::DistType2EleString(static_cast<DistType>(t));
    }
    return list;
}

// Field names, simulated and fixed, each used once: the plan keeps only the first field of a
// name, so the check is on the document.
void CheckFieldNames(const xercesc::DOMElement* root, const PlanSource& source) {
    std::unordered_set<std::string> names;
    for (const char* section : {"SimulatedFields", "FixedFields"}) {
        const xercesc::DOMElement* fields = Child(root, section);
        for (const xercesc::DOMElement* field = fields ? fields->getFirstElementChild() : nullptr;
             field != nullptr; field = field->getNextElementSibling()) {
            const std::string name = AttributeText(field, "name");
            if (!names.insert(name).second) {
                throw HostError(source.Message("the field name '" + name + "' is used twice",
                                               Attribute("name", name),
                                               std::string("<") + section));
            }
        }
    }
}

void CheckDistElements(const xercesc::DOMElement* root, const PlanSource& source) {
    const xercesc::DOMElement* fields = Child(root, "SimulatedFields");
    if (fields == nullptr) {
        return;
    }
    for (const xercesc::DOMElement* field = fields->getFirstElementChild(); field != nullptr;
         field = field->getNextElementSibling()) {
        if (LocalName(field) != "SimulatedField") {
            continue;
        }
        const std::string name = AttributeText(field, "name");
        // The reader takes a field's first element as its distribution.
        const xercesc::DOMElement* dist = field->getFirstElementChild();
        const std::string fieldNeedle = Attribute("name", name);
        if (dist == nullptr) {
            throw HostError(source.Message("simulated field '" + name + "' has no distribution",
                                           fieldNeedle, "<SimulatedFields"));
        }
        const std::string element = LocalName(dist);
        if (MCMCSP_800::String2DistType(element) == MCSPConst::kDistUnknown) {
            throw HostError(source.Message("simulated field '" + name + "': <" + element +
                                               "> is not a distribution this program knows (" +
                                               KnownDistElements() + ")",
                                           "<" + element));
        }
    }
}

// ---- Values ---------------------------------------------------------------------------------

//! The domain of each family's parameters, in the plan's names, for the messages.
const char* DomainText(DistType type) {
    switch (type) {
    case MCSPConst::kDistBinomial:
        return "n a whole number >= 0 and prob in [0, 1]";
    case MCSPConst::kDistNegbinomial:
        return "thresh > 0 and prob in (0, 1]";
    case MCSPConst::kDistLognormal:
        return "a > 0 and b >= 0";
    case MCSPConst::kDistNormal:
        return "stddev >= 0";
    case MCSPConst::kDistPoisson:
        return "mean > 0";
    case MCSPConst::kDistTriangular:
        return "min < max and min <= mode <= max";
    case MCSPConst::kDistUniform:
        return "min <= max";
    case MCSPConst::kDistWeibull:
        return "a > 0 and b > 0";
    case MCSPConst::kDistGamma:
        return "shape > 0 and scale > 0";
    case MCSPConst::kDistBeta:
        return "shape1 > 0 and shape2 > 0";
    case MCSPConst::kDistExponential:
        return "scale > 0";
    case MCSPConst::kDistBernoulli:
        return "prob in [0, 1]";
    default:
        return "finite values";
    }
}

//! The values of list parameter `name` of `dist` (empty when it has none).
template <typename T> std::vector<T> ListParameter(const DistInfoElem& dist, const char* name) {
    std::vector<T> values;
    for (std::size_t i = 0; i < dist.GetParameterSize(); ++i) {
        std::string found;
        std::vector<T> list;
        dist.GetParameterNameValue(i, found, list);
        if (found == name) {
            return list;
        }
    }
    return values;
}

//! Probabilities of a table: finite, non-negative, not all zero. "" or the problem.
std::string ProbabilityProblem(const std::vector<double>& probs) {
    if (probs.empty()) {
        // The plan keeps no list that holds a negative or missing value.
        return "no valid probabilities: each must be a number >= 0, and not all 0";
    }
    double total = 0.0;
    for (const double p : probs) {
        if (MCMV::IsMissing(p) || !std::isfinite(p) || p < 0.0) {
            return "a probability of " +
                   (MCMV::IsMissing(p) ? std::string(".") : FormatDefault(p)) +
                   "; each must be a number >= 0";
        }
        total += p;
    }
    return total > 0.0 ? std::string() : std::string("every probability is 0");
}

//! One distribution of a parametric family: the parameters the family names, in the domain.
std::string ParametricProblem(const DistInfoElem& dist) {
    const MCMCSP_800::MCSPDistFamily* family = MCMCSP_800::MCSPFindDistFamily(dist.GetDistType());
    if (family == nullptr) {
        return std::string();
    }
    std::vector<std::string> names;
    std::vector<double> values;
    dist.GetParameterNameValues(names, values);
    std::vector<std::string> expected;
    MCMCSP_800::GetDistributionParameterNames(dist.GetDistType(), expected);
    if (names != expected) {
        std::string list;
        for (const std::string& n : expected) {
            list += (list.empty() ? "" : ", ") + n;
        }
        return "needs the parameters " + list;
    }
    const bool wholeTrials = dist.GetDistType() != MCSPConst::kDistBinomial ||
                             (std::isfinite(values[0]) && values[0] == std::floor(values[0]));
    if (!family->IsValid(values) || !wholeTrials) {
        return dist.GetLabel() + " is outside the family's domain (" +
               DomainText(dist.GetDistType()) + ")";
    }
    return std::string();
}

//! A table of probabilities (Categorical, UserRanges, Empirical).
std::string TableProblem(const DistInfoElem& dist) {
    const std::string probs = ProbabilityProblem(ListParameter<double>(dist, "probs"));
    if (!probs.empty()) {
        return probs;
    }
    if (dist.GetDistType() == MCSPConst::kDistCategorical) {
        const auto cats = ListParameter<std::string>(dist, "cats");
        const std::size_t maxCategories = InputLimits::Get().fMaxCategories;
        if (cats.size() > maxCategories) {
            return "has " + std::to_string(cats.size()) + " categories, more than " +
                   std::to_string(maxCategories) + RaiseHint("MCSIM_MAX_CATEGORIES");
        }
        std::unordered_set<std::string> seen;
        for (const std::string& c : cats) {
            if (!seen.insert(c).second) {
                return "the category \"" + c + "\" is listed twice";
            }
        }
        return std::string();
    }
    const auto mins = ListParameter<double>(dist, "min");
    const auto maxs = ListParameter<double>(dist, "max");
    for (std::size_t i = 0; i < std::min(mins.size(), maxs.size()); ++i) {
        if (mins[i] > maxs[i]) {
            return "the range from " + FormatDefault(mins[i]) + " to " + FormatDefault(maxs[i]) +
                   " ends below its start";
        }
    }
    return std::string();
}

void CheckFields(const SPCSettings& plan, const PlanSource& source) {
    for (const SimInputSpecs& input : plan.GetSimulationInput()) {
        const std::string& name = input.GetVarName();
        const std::string needle = Attribute("name", name);
        for (const DistInfoElem& dist : input.GetAllDistribution()) {
            const bool table = MCMCSP_800::MCSPFindDistFamily(dist.GetDistType()) == nullptr;
            const std::string problem = table ? TableProblem(dist) : ParametricProblem(dist);
            if (!problem.empty()) {
                throw HostError(source.Message("simulated field '" + name + "' (" +
                                                   dist.GetDistName() + "): " + problem,
                                               needle, "<SimulatedFields"));
            }
        }
    }
}

void CheckCorrelations(const SPCSettings& plan, const PlanSource& source) {
    const std::vector<std::string>& vars = plan.GetCorrVarList();
    const auto& rows = plan.GetCorrMatrix();
    for (std::size_t r = 0; r < std::min(rows.size(), vars.size()); ++r) {
        for (std::size_t c = 0; c < r && c < rows[r].size(); ++c) {
            const double v = rows[r][c];
            if (MCMV::IsMissing(v) || (v >= -1.0 && v <= 1.0)) {
                continue;
            }
            throw HostError(source.Message(
                "the correlation of '" + vars[r] + "' and '" + vars[c] + "' is " +
                    FormatDefault(v) + "; a correlation lies between -1 and 1",
                Attribute("colVar", vars[c]) + " " + Attribute("rowVar", vars[r]), "<CorrMatrix"));
        }
    }
}

void CheckContingencyTable(const SPCSettings& plan, const PlanSource& source) {
    const std::vector<std::string>& factors = plan.GetCrstabsFactors();
    const auto& rows = plan.GetCrstabsMatrix();
    if (factors.empty() && rows.empty()) {
        return;
    }
    const auto refuse = [&](const std::string& what) {
        throw HostError(source.Message("the contingency table " + what, "<ContingencyTable"));
    };
    // The categories of each factor that is a Categorical field (others are refused when the
    // plan's fields are matched to its model).
    std::unordered_map<std::string, std::unordered_set<std::string>> categories;
    for (const SimInputSpecs& input : plan.GetSimulationInput()) {
        const DistInfoElem* dist = input.GetDistribution(0);
        if (dist != nullptr && dist->GetDistType() == MCSPConst::kDistCategorical) {
            const auto cats = ListParameter<std::string>(*dist, "cats");
            categories[input.GetVarName()] = {cats.begin(), cats.end()};
        }
    }
    std::unordered_set<std::string> seenFactors;
    for (const std::string& f : factors) {
        if (!seenFactors.insert(f).second) {
            refuse("names the factor '" + f + "' twice");
        }
    }
    std::unordered_set<std::string> seenRows;
    for (const std::vector<std::string>& row : rows) {
        std::string key;
        for (std::size_t j = 0; j < row.size() && j < factors.size(); ++j) {
            const auto it = categories.find(factors[j]);
            if (it != categories.end() && it->second.count(row[j]) == 0) {
                refuse("has the category \"" + row[j] + "\", which '" + factors[j] +
                       "' does not have");
            }
            key += row[j];
            key += '\0';
        }
        if (!seenRows.insert(key).second) {
            refuse("lists a combination of categories twice");
        }
    }
    const std::string probs = ProbabilityProblem(plan.GetCrstabsProbs());
    if (!probs.empty()) {
        refuse("has no usable probabilities: " + probs);
    }
}

//! The XML parser's "line L, column C: message" as "path:L:C: message".
std::string XmlErrorMessage(const std::string& path, const std::string& message) {
    // "line " digits ", column " digits ": " rest
    const auto digitsAt = [&message](std::size_t pos) {
        std::size_t end = pos;
        while (end < message.size() && std::isdigit(static_cast<unsigned char>(message[end]))) {
            ++end;
        }
        return end;
    };
    const std::string kLine = "line ";
    const std::string kColumn = ", column ";
    if (message.compare(0, kLine.size(), kLine) == 0) {
        const std::size_t lineEnd = digitsAt(kLine.size());
        if (lineEnd > kLine.size() && message.compare(lineEnd, kColumn.size(), kColumn) == 0) {
            const std::size_t columnStart = lineEnd + kColumn.size();
            const std::size_t columnEnd = digitsAt(columnStart);
            if (columnEnd > columnStart && message.compare(columnEnd, 2, ": ") == 0) {
                return path + ":" + message.substr(kLine.size(), lineEnd - kLine.size()) + ":" +
                       message.substr(columnStart, columnEnd - columnStart) +
                       ": not well-formed XML: " + message.substr(columnEnd + 2);
            }
        }
    }
    return LocatedMessage(path, 0, "not a readable XML document: " + message);
}

} // namespace

SPCSettings ReadPlanFile(const std::string& path, std::vector<std::string>& warnings) {
    const std::string text =
        ReadInputFile(path, "plan file", InputLimits::Get().fMaxPlanBytes, "MCSIM_MAX_PLAN_MB");
    CheckXmlAttributeCounts(text, path);
    // The correlation cells stream into a compact list; the rest of the text becomes a DOM.
    MCMCSP_800::MCPlanCorrCells cells;
    std::string rest;
    if (!cells.Read(text, rest)) {
        throw HostError(XmlErrorMessage(path, cells.GetErrorMessage()));
    }
    MCXML_800::MCXMLReadWrite xml;
    if (!xml.ParseToDOM(rest)) {
        throw HostError(XmlErrorMessage(path, xml.GetErrorMessage()));
    }
    const xercesc::DOMElement* root = xml.GetDocument()->getDocumentElement();
    const XMLCh* local = root->getLocalName() ? root->getLocalName() : root->getTagName();
    const std::string rootName = MCXML_800::ToUTF8(local);
    if (rootName != "SimulationPlan") {
        throw HostError(LocatedMessage(path, 0,
                                       "the document is a <" + rootName +
                                           ">, not a simulation plan (<SimulationPlan>)"));
    }
    const PlanSource source(path, text);
    warnings = CheckPlanDocument(xml.GetDocument(), source);
    SPCSettings plan;
    SPCSettings* target = &plan;
    MCMCSP_800::MCPlanXMLHandler handler;
    handler.SetCorrCells(&cells);
    if (!handler.ParsePlanFile(xml.GetDocument(), target)) {
        throw HostError(LocatedMessage(
            path, 0,
            "the plan reader refused the file: an element or attribute it requires is missing "
            "or holds a value it cannot read (as a simulated field without a distribution, or "
            "a number such as INF)"));
    }
    CheckPlanValues(plan, source);
    return plan;
}

std::string PlanSource::Message(const std::string& message, const std::string& needle,
                                const std::string& after) const {
    const std::size_t start = after.empty() ? 0 : fText.find(after);
    const std::size_t at = start == std::string::npos || needle.empty() ? std::string::npos
                                                                        : fText.find(needle, start);
    if (at == std::string::npos) {
        return LocatedMessage(fPath, 0, message);
    }
    const long line =
        1 +
        static_cast<long>(std::count(fText.begin(), fText.begin() + static_cast<long>(at), '\n'));
    return LocatedMessage(fPath, line, message);
}

std::vector<std::string> CheckPlanDocument(const xercesc::DOMDocument* doc,
                                           const PlanSource& source) {
    std::vector<std::string> warnings;
    const xercesc::DOMElement* root = doc->getDocumentElement();
    CheckRoot(root, source, warnings);
    CheckFieldNames(root, source);
    CheckDistElements(root, source);
    return warnings;
}

void CheckPlanValues(const SPCSettings& plan, const PlanSource& source) {
    CheckFields(plan, source);
    CheckCorrelations(plan, source);
    CheckContingencyTable(plan, source);
}

} // namespace MCHost
