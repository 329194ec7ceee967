// Overflow-checked powers for likelihood code that exponentiates large arguments.
#pragma once

namespace MCMath_800 {

struct MCPower {
    //! The largest argument that exp accepts without overflow: ln(DBL_MAX) ≈ 709.78.
    static const double gMachineMaxExp;
    //! base^exponent into `out`; 0 on success, non-zero (and `out` untouched) when the result
    //! would overflow or is undefined (a negative base with a non-integral exponent, 0 to a
    //! negative power).
    static int Power(double base, double exponent, double& out);
};

} // namespace MCMath_800
