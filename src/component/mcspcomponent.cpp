#include "component/mcspcomponent.h"

namespace MCMCSP_800 {

const std::string& GetComponentVersionText() {
    static const std::string kVersion =
        "Simulation Component Ver. 1.0 Copyright (C) 2026 the mcsim developers. "
        "All rights reserved.";
    return kVersion;
}

MCCommon_800::IMCAlgorithm* SPCFactory::CreateMCAlgorithm(MCXML_800::MCSettings& /*settings*/,
                                                          MCXML_800::MCVarList& /*variables*/) {
    fStatus = MCStatus();
    return nullptr;
}

MCCommon_800::IMCAlgorithm* SECFactory::CreateMCAlgorithm(MCXML_800::MCSettings& /*settings*/,
                                                          MCXML_800::MCVarList& /*variables*/) {
    fStatus = MCStatus();
    return nullptr;
}

} // namespace MCMCSP_800

namespace MCSPComponentDisplay_800 {

using namespace MCDisplay_800;

void DisplayStatus(const std::string& title, const MCCommon_800::MCStatus& status) {
    DisplayText(title);
    DisplayB("IsError", status.IsError());
    DisplayI("error code", status.GetErrorCode());
    DisplayText(title);
}

void DisplayVStatus(const std::string& title,
                    const std::vector<MCCommon_800::MCStatus>& statuses) {
    DisplayI(title + "  size", static_cast<long long>(statuses.size()));
    for (std::size_t i = 0; i < statuses.size(); ++i) {
        DisplayText("");
        DisplayI("index", static_cast<long long>(i));
        DisplayB("IsError", statuses[i].IsError());
        DisplayI("error code", statuses[i].GetErrorCode());
        DisplayText(title);
    }
}

} // namespace MCSPComponentDisplay_800
