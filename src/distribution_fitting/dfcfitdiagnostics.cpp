#include "distribution_fitting/dfcfitdiagnostics.h"

#include "mccommon/mcmv.h"
#include "simulation_common/mcspdistfamily.h"

#include <Eigen/Cholesky>
#include <Eigen/Core>

#include <algorithm>
#include <cmath>

namespace MCMCSP_800 {

using MCCommon_800::MCMV;
using namespace MCSPConst;

namespace {

//! Relative step of the first difference quotient; the second uses half of it.
constexpr double kRelativeStep = 1e-3;
//! Smallest relative step tried when a larger one leaves the parameter space.
constexpr double kSmallestStep = 1e-6;

//! The second derivatives of ln L in the estimated parameters `idx` at `params`, by central
//! differences with steps h_j = η·|θ_j| (η·1 at θ_j = 0):
//!   H_jj(h) = [L(θ + h_j e_j) - 2L(θ) + L(θ - h_j e_j)] / h_j²
//!   H_jk(h) = [L(θ + h_j e_j + h_k e_k) - L(θ + h_j e_j - h_k e_k)
//!              - L(θ - h_j e_j + h_k e_k) + L(θ - h_j e_j - h_k e_k)] / (4 h_j h_k)
//! both with an error c·h² + O(h⁴), removed by Richardson's extrapolation
//! H = (4·H(h/2) - H(h))/3 (Richardson 1911; Dennis and Schnabel 1983, sec. 5.6). With
//! η = 1e-3, the rounding error of a sum of n terms of size c is about c·ε/η² ≈ 1e-10·c
//! relative, the truncation error O(η⁴): far inside the 1e-3 asked of a standard error.
//! False when a perturbed vector is invalid even at the smallest step, or ln L is not finite.
bool DifferenceHessian(const std::vector<double>& params, const std::vector<std::size_t>& idx,
                       const std::function<double(const std::vector<double>&)>& logLik,
                       const std::function<bool(const std::vector<double>&)>& isValid,
                       Eigen::MatrixXd& hessian) {
    const std::size_t m = idx.size();
    double eta = kRelativeStep;
    std::vector<double> step(m);
    bool ok = false;
    while (!ok && eta >= kSmallestStep) {
        ok = true;
        for (std::size_t j = 0; j < m && ok; ++j) {
            const double theta = params[idx[j]];
            step[j] = eta * (theta != 0.0 ? std::fabs(theta) : 1.0);
            for (double sign : {-1.0, 1.0}) {
                std::vector<double> p = params;
                p[idx[j]] = theta + sign * step[j];
                ok = ok && isValid(p);
            }
        }
        if (!ok) {
            eta /= 10.0;
        }
    }
    if (!ok) {
        return false;
    }
    const double l0 = logLik(params);
    if (!std::isfinite(l0)) {
        return false;
    }
    bool finite = true;
    const auto at = [&](std::size_t j, double dj, std::size_t k, double dk) {
        std::vector<double> p = params;
        p[idx[j]] += dj;
        p[idx[k]] += dk;
        const double l = logLik(p);
        finite = finite && std::isfinite(l);
        return l;
    };
    const auto estimate = [&](double scale) {
        Eigen::MatrixXd h(m, m);
        for (std::size_t j = 0; j < m; ++j) {
            const double hj = step[j] * scale;
            h(j, j) = (at(j, hj, j, 0.0) - 2.0 * l0 + at(j, -hj, j, 0.0)) / (hj * hj);
            for (std::size_t k = 0; k < j; ++k) {
                const double hk = step[k] * scale;
                h(j, k) = (at(j, hj, k, hk) - at(j, hj, k, -hk) - at(j, -hj, k, hk) +
                           at(j, -hj, k, -hk)) /
                          (4.0 * hj * hk);
                h(k, j) = h(j, k);
            }
        }
        return h;
    };
    const Eigen::MatrixXd coarse = estimate(1.0);
    const Eigen::MatrixXd fine = estimate(0.5);
    hessian = (4.0 * fine - coarse) / 3.0;
    return finite && hessian.allFinite();
}

} // namespace

std::vector<bool> RegularMLParams(DistType type, const std::vector<double>& params,
                                  std::string& reason) {
    reason.clear();
    std::vector<bool> estimated(params.size(), false);
    const auto mark = [&](std::initializer_list<std::size_t> which) {
        for (std::size_t i : which) {
            if (i < estimated.size()) {
                estimated[i] = true;
            }
        }
    };
    switch (type) {
    case kDistNormal:
    case kDistLognormal:
    case kDistGamma:
    case kDistBeta:
        mark({0, 1});
        break;
    case kDistExponential:
    case kDistPoisson:
        mark({0});
        break;
    case kDistWeibull:
        mark({0, 1});
        if (params.size() > 2 && params[2] != 0.0) {
            reason = "the location is set below the sample minimum, not estimated by maximum "
                     "likelihood; the errors of scale and shape are conditional on it";
        }
        break;
    case kDistBinomial:
        mark({1});
        reason = "n is a moment estimate held fixed; the error of p is conditional on it";
        break;
    case kDistNegbinomial:
        mark({1});
        reason = "the threshold is a whole number held fixed; the error of p is conditional on "
                 "it";
        break;
    case kDistUniform:
        reason = "the endpoints are the sample extremes, not a regular maximum-likelihood "
                 "estimate";
        break;
    case kDistTriangular:
        reason = "the endpoints are the sample extremes and the mode a moment estimate, not a "
                 "regular maximum-likelihood estimate";
        break;
    default:
        reason = "no parametric family";
        break;
    }
    return estimated;
}

DFCStdErrors ComputeStdErrors(const std::vector<double>& params, const std::vector<bool>& estimated,
                              const std::function<double(const std::vector<double>&)>& logLik,
                              const std::function<bool(const std::vector<double>&)>& isValid) {
    const std::size_t k = params.size();
    DFCStdErrors out;
    out.fvStdErrors.assign(k, MCMV::Missing());
    out.fvCorrelations.assign(k * k, MCMV::Missing());
    std::vector<std::size_t> idx;
    for (std::size_t i = 0; i < k && i < estimated.size(); ++i) {
        if (estimated[i]) {
            idx.push_back(i);
        }
    }
    if (idx.empty()) {
        return out;
    }
    Eigen::MatrixXd hessian;
    if (!DifferenceHessian(params, idx, logLik, isValid, hessian)) {
        out.fReason = "the log-likelihood is not finite near the estimate";
        return out;
    }
    const Eigen::MatrixXd information = -hessian;
    const Eigen::LLT<Eigen::MatrixXd> llt(information);
    if (llt.info() != Eigen::Success) {
        out.fReason = "the observed information is not positive definite: the estimate is not "
                      "an interior maximum";
        return out;
    }
    const Eigen::MatrixXd cov =
        llt.solve(Eigen::MatrixXd::Identity(information.rows(), information.cols()));
    for (std::size_t a = 0; a < idx.size(); ++a) {
        out.fvStdErrors[idx[a]] = std::sqrt(cov(a, a));
    }
    for (std::size_t a = 0; a < idx.size(); ++a) {
        for (std::size_t b = 0; b < idx.size(); ++b) {
            out.fvCorrelations[idx[a] * k + idx[b]] =
                a == b ? 1.0 : cov(a, b) / std::sqrt(cov(a, a) * cov(b, b));
        }
    }
    return out;
}

void ComputeSampleQuantiles(const DFCSortedSample& sample, std::vector<double>& quantiles,
                            std::vector<double>& probs) {
    quantiles.assign(kDFCPlotPoints, MCMV::Missing());
    probs.assign(kDFCPlotPoints, MCMV::Missing());
    const double total = sample.fTotalWeight;
    if (sample.fN == 0 || !(total > 0.0)) {
        return;
    }
    // Runs of equal values: every position whose target p_i·W the run's cumulative weight
    // reaches takes the run's value, and the EDF there is that cumulative weight over W. A
    // relative slack of 1e-12 keeps a target that equals a sum of weights from rounding past it.
    int next = 0;
    double cum = 0.0;
    std::size_t i = 0;
    while (i < sample.fN && next < kDFCPlotPoints) {
        const double value = sample.fValue(i);
        while (i < sample.fN && sample.fValue(i) == value) {
            cum += sample.fWeight(i);
            ++i;
        }
        const bool last = i == sample.fN;
        while (next < kDFCPlotPoints &&
               (last || (next + 1.0) / (kDFCPlotPoints + 1.0) * total <= cum * (1.0 + 1e-12))) {
            quantiles[static_cast<std::size_t>(next)] = value;
            probs[static_cast<std::size_t>(next)] = std::min(cum / total, 1.0);
            ++next;
        }
    }
}

void SetFitDiagnostics(DFCOutputStats::DFCVarDistElement& element, const DFCSortedSample& sample,
                       const std::function<double(const std::vector<double>&)>& logLik) {
    const MCSPDistFamily* family = MCSPFindDistFamily(element.fDistType);
    const std::vector<double>& params = element.fDistParams;
    if (!family || !family->HasDensity(params)) {
        return;
    }
    std::string reason;
    const std::vector<bool> estimated = RegularMLParams(element.fDistType, params, reason);
    const DFCStdErrors se =
        ComputeStdErrors(params, estimated, logLik,
                         [family](const std::vector<double>& p) { return family->HasDensity(p); });
    element.fvStdErrors = se.fvStdErrors;
    element.fvParamCorrelations = se.fvCorrelations;
    element.fStdErrorReason = se.fReason.empty() ? reason : se.fReason;

    ComputeSampleQuantiles(sample, element.fvPlotSampleQuantiles, element.fvPlotSampleProbs);
    element.fvPlotFittedQuantiles.assign(kDFCPlotPoints, MCMV::Missing());
    element.fvPlotFittedProbs.assign(kDFCPlotPoints, MCMV::Missing());
    for (int i = 0; i < kDFCPlotPoints; ++i) {
        const auto ui = static_cast<std::size_t>(i);
        element.fvPlotFittedQuantiles[ui] =
            family->fQuantile(params.data(), (i + 1.0) / (kDFCPlotPoints + 1.0));
        const double x = element.fvPlotSampleQuantiles[ui];
        if (!MCMV::IsMissing(x)) {
            element.fvPlotFittedProbs[ui] = family->fCdf(params.data(), x);
        }
    }
}

} // namespace MCMCSP_800
