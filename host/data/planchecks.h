// The host's checks of a plan file, so that a plan the command cannot simulate as written is
// refused before the run with one line naming the file, the line where it can be found, the
// field and the value, instead of failing inside the simulation.
//
// The component's reader takes a document's version and namespace as given and reads values
// as numbers; what they mean is checked here, in two steps around the reader:
//   - CheckPlanDocument, on the parsed document: the namespace and major version of the root
//     (another one is refused, none read with a warning) and the distribution elements of the
//     simulated fields (an element the reader does not know is refused);
//   - CheckPlanValues, on the plan read from it: each distribution's parameters inside its
//     family's domain (the family table), tables of probabilities with non-negative cells
//     that are not all zero, categories and field names each listed once, correlations in
//     [-1, 1], and a contingency table over the categories of its factors.
// Every look-up is hashed, so the checks are linear in the plan's size.
//
// ReadPlanFile reads a plan file as the command does, with both checks; plans that `mcsim fit`
// writes always pass. Besides, it keeps the cost of a large plan near the size of its text:
// the file is read once (a regular file of bounded size, inputlimits.h), its elements'
// attributes counted before the XML parser sees them, and the correlation cells streamed into
// a compact list (MCPlanCorrCells) while the rest of the document becomes a DOM.
#pragma once

#include "simulation_common/spcsettings.h"

#include <xercesc/dom/DOMDocument.hpp>

#include <string>
#include <vector>

namespace MCHost {

//! The plan file's name and text: a message names the file and, where the text shows it, the
//! line of the element concerned.
class PlanSource {
public:
    PlanSource(std::string path, const std::string& text) : fPath(std::move(path)), fText(text) {}

    //! "path:L: message" with L the line of the first occurrence of `needle` after the first
    //! of `after` (either may be ""); "path: message" when the text does not hold them.
    std::string Message(const std::string& message, const std::string& needle,
                        const std::string& after = std::string()) const;
    const std::string& GetPath() const { return fPath; }

private:
    std::string fPath;        //!< the plan file as the user named it
    const std::string& fText; //!< its text, owned by the caller
};

//! Checks the document's root and distribution elements; throws HostError for a plan of
//! another namespace or major version or with an unknown distribution element. Returns the
//! warnings to print (a plan that names no version).
std::vector<std::string> CheckPlanDocument(const xercesc::DOMDocument* doc,
                                           const PlanSource& source);

//! Checks the values of the plan read from `source`; throws HostError naming the first
//! problem.
void CheckPlanValues(const MCMCSP_800::SPCSettings& plan, const PlanSource& source);

//! Reads the plan file `path`. Throws HostError naming the file for a file that cannot be
//! read, is not XML, is not a simulation plan, that the reader refuses, or that the checks
//! refuse; sets `warnings` to the checks' warnings.
MCMCSP_800::SPCSettings ReadPlanFile(const std::string& path, std::vector<std::string>& warnings);

} // namespace MCHost
