// Fuzz target: the plan file reader on arbitrary document text.
//
// The bytes are read as a plan twice: by a handler without variables (read only) and by one
// with the variables of the bundled example data (read, then completed and validated against
// them). Whenever a read succeeds, the plan that GetSPCSettings returns is written again with
// WritePlanFile, and written text is read once more. Nothing may crash, leak an exception,
// touch memory it does not own or run into undefined behaviour; whether each step succeeds
// is the document's business.
//
// The correlation cells of a text are read by a streaming parser; the same document read
// wholly through the DOM must give the same correlation variables and triangle. The host's
// plan checks run on every plan read and may only answer with their HostError.
#include "common/hosterror.h"
#include "data/inputlimits.h"
#include "data/planchecks.h"
#include "mccommon/mcmv.h"
#include "mccommon/variables.h"
#include "mcxml/mcxmlreadwrite.h"
#include "simulation_common/mcplanxmlhandler.h"
#include "simulation_common/spcsettings.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <memory>
#include <string>
#include <vector>

namespace {

using MCMCSP_800::MCPlanXMLHandler;
using MCMCSP_800::SPCSettings;

//! The fields of examples/data/sales.csv as the host's data dictionary describes them, plus
//! the fixed input of the example plan.
MCXML_800::MCVarList ExampleVariables() {
    using MCXML_800::IMCVariable;
    using MCXML_800::MCCatNumEncoder;
    using MCXML_800::MCCatVar;
    using MCXML_800::MCScaleVar;
    MCXML_800::MCVarList vars;
    vars.Add(std::make_unique<MCCatVar>(
        "region", MCCatNumEncoder(std::vector<std::string>{"east", "north", "south", "west"}),
        false, IMCVariable::kNominalKind));
    vars.Add(std::make_unique<MCCatVar>(
        "channel", MCCatNumEncoder(std::vector<std::string>{"online", "store"}), false,
        IMCVariable::kNominalKind));
    for (const char* name : {"unit_price", "unit_cost", "volume", "discount"}) {
        vars.Add(std::make_unique<MCScaleVar>(name));
    }
    vars.Add(std::make_unique<MCCatVar>(
        "returns", MCCatNumEncoder(std::vector<double>{0, 1, 2, 3, 4, 5, 6, 7, 8}), true,
        IMCVariable::kOrderedKind));
    vars.Add(std::make_unique<MCCatVar>("satisfaction",
                                        MCCatNumEncoder(std::vector<double>{1, 2, 3, 4, 5}), true,
                                        IMCVariable::kOrderedKind));
    return vars;
}

//! Reads `text`; when it reads, writes the plan and reads the written text back.
void ReadWriteRead(MCPlanXMLHandler& handler, const std::string& text) {
    SPCSettings plan;
    SPCSettings* target = &plan;
    if (!handler.ParsePlanFile(text, target)) {
        return;
    }
    const SPCSettings* read = handler.GetSPCSettings();
    if (read != &plan) {
        // A successful read hands back the caller's plan, nothing else.
        std::abort();
    }
    std::string written;
    if (!handler.WritePlanFile(written, read)) {
        return;
    }
    SPCSettings again;
    SPCSettings* againTarget = &again;
    MCPlanXMLHandler reader;
    static_cast<void>(reader.ParsePlanFile(written, againTarget));
}

//! Equal triangles, a missing value equal to a missing value.
bool SameTriangle(const std::vector<std::vector<double>>& a,
                  const std::vector<std::vector<double>>& b) {
    if (a.size() != b.size()) {
        return false;
    }
    for (std::size_t r = 0; r < a.size(); ++r) {
        if (a[r].size() != b[r].size()) {
            return false;
        }
        for (std::size_t c = 0; c < a[r].size(); ++c) {
            const bool missing = MCCommon_800::MCMV::IsMissing(a[r][c]);
            if (missing != MCCommon_800::MCMV::IsMissing(b[r][c]) ||
                (!missing && a[r][c] != b[r][c])) {
                return false;
            }
        }
    }
    return true;
}

//! Reads `text` as the host does (cells streamed, the rest as a DOM, the host's checks
//! around the reader) and, wholly through the DOM, compares the correlations.
void ReadAsHost(const std::string& text) {
    MCMCSP_800::MCPlanCorrCells cells;
    std::string rest;
    MCXML_800::MCXMLReadWrite xml;
    if (!cells.Read(text, rest) || !xml.ParseToDOM(rest)) {
        return;
    }
    SPCSettings streamed;
    SPCSettings* streamedTarget = &streamed;
    MCPlanXMLHandler handler;
    handler.SetCorrCells(&cells);
    try {
        MCHost::CheckXmlAttributeCounts(text, "fuzz.xml");
        const MCHost::PlanSource source("fuzz.xml", text);
        static_cast<void>(MCHost::CheckPlanDocument(xml.GetDocument(), source));
        if (handler.ParsePlanFile(xml.GetDocument(), streamedTarget)) {
            MCHost::CheckPlanValues(streamed, source);
        }
    } catch (const MCHost::HostError&) {
        // The checks' answer to a plan they refuse.
    }
    MCXML_800::MCXMLReadWrite whole;
    SPCSettings direct;
    SPCSettings* directTarget = &direct;
    SPCSettings again;
    SPCSettings* againTarget = &again;
    MCPlanXMLHandler domOnly;
    MCPlanXMLHandler streamOnly;
    if (whole.ParseToDOM(text) && domOnly.ParsePlanFile(whole.GetDocument(), directTarget) &&
        streamOnly.ParsePlanFile(text, againTarget) &&
        (direct.GetCorrVarList() != again.GetCorrVarList() ||
         !SameTriangle(direct.GetCorrMatrix(), again.GetCorrMatrix()))) {
        std::abort();
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    static const MCXML_800::MCVarList vars = ExampleVariables();
    const std::string text(reinterpret_cast<const char*>(data), size);
    MCPlanXMLHandler plain;
    ReadWriteRead(plain, text);
    MCPlanXMLHandler checked(vars, "fuzz", false);
    ReadWriteRead(checked, text);
    ReadAsHost(text);
    return 0;
}
