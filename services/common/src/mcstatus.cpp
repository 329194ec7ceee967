#include "mccommon/mcstatus.h"

#include <algorithm>

namespace MCCommon_800 {

void MCWarnings::AddWarning(const MCStatus& status, int destination) {
    fStatuses.push_back(status);
    fDestinations.push_back(destination);
}

void MCWarnings::AddWarnings(const MCWarnings& other) {
    if (&other == this) {
        const MCWarnings copy = other;
        AddWarnings(copy);
        return;
    }
    fStatuses.insert(fStatuses.end(), other.fStatuses.begin(), other.fStatuses.end());
    fDestinations.insert(fDestinations.end(), other.fDestinations.begin(),
                         other.fDestinations.end());
}

const std::vector<MCStatus>& MCWarnings::GetWarnings(bool /*all*/) const { return fStatuses; }

void MCWarnings::ClearWarnings() {
    fStatuses.clear();
    fDestinations.clear();
}

bool MCWarnings::HasCode(long code) const {
    return std::any_of(fStatuses.begin(), fStatuses.end(),
                       [code](const MCStatus& s) { return s.GetErrorCode() == code; });
}

} // namespace MCCommon_800
