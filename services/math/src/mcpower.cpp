#include "mcmath/mcpower.h"

#include <cfloat>
#include <cmath>

namespace MCMath_800 {

const double MCPower::gMachineMaxExp = std::log(DBL_MAX);

int MCPower::Power(double base, double exponent, double& out) {
    if (std::isnan(base) || std::isnan(exponent)) {
        return 1;
    }
    if (base < 0.0 && exponent != std::trunc(exponent)) {
        return 2;
    }
    if (base == 0.0) {
        if (exponent < 0.0) {
            return 3;
        }
        out = exponent == 0.0 ? 1.0 : 0.0;
        return 0;
    }
    // |base|^exponent overflows exactly when exponent * ln|base| exceeds ln(DBL_MAX).
    if (exponent * std::log(std::fabs(base)) > gMachineMaxExp) {
        return 4;
    }
    const double r = std::pow(base, exponent);
    if (!std::isfinite(r)) {
        return 4;
    }
    out = r;
    return 0;
}

} // namespace MCMath_800
