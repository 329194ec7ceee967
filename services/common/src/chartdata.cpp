#include "mccommon/chartdata.h"

namespace MCXML_800 {

double MCVariateData::GetStatistic(const std::string& name, double fallback) const {
    for (const auto& s : fStatistics) {
        if (s.first == name) {
            return s.second;
        }
    }
    return fallback;
}

} // namespace MCXML_800
