# Reference numbers for the fit diagnostics: log-likelihoods and information criteria, EDF
# statistics over the values strictly inside a fitted support, and pooled chi-square tests.
#
# Computed with R and fitdistrplus (Debian r-cran-fitdistrplus), independently of the C++ code:
#   * fitdist(..., "mle") (the Exponential: "mme", the same estimate) on the Nile flows (norm, lnorm, gamma, weibull, exp, unif), the food
#     shares (beta) and the visit counts as repeated rows (pois): logLik, aic and bic from the
#     fit object; AICc = aic + 2k(k + 1)/(n - k - 1). The negative binomial of the visits is
#     evaluated at the parameters the fitting uses (r = 1, p = r/(r + mean)), gof_reference.inc.
#   * A² by Stephens' form -n - (1/n)·Σ(2i-1)·[ln u_i + ln(1-u_(n+1-i))] and
#     D = max(i/n - u_i, u_i - (i-1)/n) over the values strictly inside the support: the
#     Uniform (min, max) and the moment-matched Triangular (min, max, mode) of the Nile flows,
#     an 8-value sample under its Uniform, and 1, 2, 3 repeated 300, 400, 300 times under its
#     Triangular.
#   * Pearson's chi-square over adjacent bins pooled from the lowest value upwards until each
#     group's expected count reaches 5, a short last group joined to the one before
#     (Cochran 1954), with dpois/dnbinom, the upper tail as the last bin, and pchisq.
# Writes diag_reference.inc, included by fitdiagnostics_test.cpp.
#
# Usage: Rscript diag_make_reference.R   (in this folder)
suppressPackageStartupMessages(library(fitdistrplus))

num <- function(x) if (is.na(x)) "kMissing" else sprintf("%.17g", x)
vec <- function(x) paste0("{", paste(sapply(x, num), collapse = ", "), "}")

nile <- read.csv("gof_nile.csv")$volume
shares <- read.csv("gof_engel_share.csv")$share
visits <- read.csv("gof_mdvis_counts.csv")
visitRows <- rep(visits$visits, visits$households)

# Type codes of the plan: NegBin 1, LogNormal 3, Normal 4, Poisson 5, Triangular 6, Uniform 7,
# Weibull 8, Gamma 9, Beta 10, Exponential 11.
lik <- character(0)
addLik <- function(name, sample, type, ll, k, n) {
    aic <- 2 * k - 2 * ll
    bic <- k * log(n) - 2 * ll
    aicc <- if (n - k - 1 > 0) aic + 2 * k * (k + 1) / (n - k - 1) else NA
    lik <<- c(lik, sprintf("    {\"%s\", %d, %d, %s, %d, %s, %s, %s},", name, sample, type,
                           num(ll), k, num(aic), num(bic), num(aicc)))
}
fromFit <- function(name, sample, type, f) {
    stopifnot(abs(f$aic - (2 * length(f$estimate) - 2 * f$loglik)) < 1e-9 * abs(f$aic))
    addLik(name, sample, type, f$loglik, length(f$estimate), f$n)
}
fromFit("NileNormal", 0, 4, fitdist(nile, "norm"))
fromFit("NileLogNormal", 0, 3, fitdist(nile, "lnorm"))
fromFit("NileGamma", 0, 9, fitdist(nile, "gamma", start = list(shape = 30, rate = 0.03),
                                   control = list(reltol = 1e-14)))
fromFit("NileWeibull", 0, 8, fitdist(nile, "weibull", control = list(reltol = 1e-14)))
# The numerical search fails on flows near 1000 (a finite-difference Hessian); the moment
# estimate 1/mean is the maximum-likelihood one.
fromFit("NileExponential", 0, 11, fitdist(nile, "exp", method = "mme"))
fromFit("NileUniform", 0, 7, fitdist(nile, "unif"))
fromFit("SharesBeta", 1, 10, fitdist(shares, "beta", control = list(reltol = 1e-14)))
fromFit("VisitsPoisson", 2, 5, fitdist(visitRows, "pois"))
r <- 1
p <- r / (r + mean(visitRows))
addLik("VisitsNegBin", 2, 1, sum(dnbinom(visitRows, size = r, prob = p, log = TRUE)), 2,
       length(visitRows))

# EDF statistics over the interior values.
edf <- character(0)
addEdf <- function(name, u) {
    u <- sort(u)
    n <- length(u)
    i <- seq_len(n)
    a2 <- -n - sum((2 * i - 1) * (log(u) + log(1 - rev(u)))) / n
    d <- max(i / n - u, u - (i - 1) / n)
    edf <<- c(edf, sprintf("    {\"%s\", %s, %s, %s},", name, num(n), num(a2), num(d)))
}
ptri <- function(x, a, b, c) ifelse(x < c, (x - a)^2 / ((b - a) * (c - a)),
                                    1 - (b - x)^2 / ((b - a) * (b - c)))
interior <- function(x) x[x > min(x) & x < max(x)]
lo <- min(nile)
hi <- max(nile)
addEdf("NileUniform", (interior(nile) - lo) / (hi - lo))
t <- 3 * (mean(nile) - lo) / (hi - lo) - 1
mode <- if (t <= 0) lo else if (t >= 1) hi else lo + (hi - lo) * t
addEdf("NileTriangular", ptri(interior(nile), lo, hi, mode))
eight <- c(4.2, 1.3, 7.9, 5.1, 2.6, 6.4, 3.3, 5.8)
addEdf("EightUniform", (interior(eight) - 1.3) / (7.9 - 1.3))
three <- rep(c(1, 2, 3), c(300, 400, 300))
addEdf("ThreeValuesTriangular", ptri(interior(three), 1, 3, 2))

# Pooled chi-square.
chi <- character(0)
pooled <- function(name, counts, probs, q) {
    total <- sum(counts)
    e <- probs * total
    groups <- list()
    o <- 0; ee <- 0
    for (c in seq_along(counts)) {
        o <- o + counts[c]; ee <- ee + e[c]
        if (ee >= 5) { groups[[length(groups) + 1]] <- c(o, ee); o <- 0; ee <- 0 }
    }
    if (o > 0 || ee > 0) {
        g <- length(groups)
        groups[[g]] <- groups[[g]] + c(o, ee)
    }
    stat <- sum(sapply(groups, function(g) (g[1] - g[2])^2 / g[2]))
    df <- length(groups) - 1 - q
    chi <<- c(chi, sprintf("    {\"%s\", %s, %s, %s},", name, num(stat), num(df),
                           num(pchisq(stat, df, lower.tail = FALSE))))
}
# Every value from 0 to the largest, with the values no household has.
k <- 0:max(visits$visits)
counts <- tabulate(visitRows + 1, nbins = length(k))
last <- length(k)
lambda <- mean(visitRows)
pooled("VisitsPoisson", counts,
       c(dpois(k[-last], lambda), ppois(k[last] - 1, lambda, lower.tail = FALSE)), 1)
pooled("VisitsNegBin", counts,
       c(dnbinom(k[-last], size = r, prob = p),
         pnbinom(k[last] - 1, size = r, prob = p, lower.tail = FALSE)), 2)
small <- c(3, 7, 9, 6, 3, 2)
smallMean <- sum(0:5 * small) / sum(small)
pooled("SmallPoisson", small,
       c(dpois(0:4, smallMean), ppois(4, smallMean, lower.tail = FALSE)), 1)

out <- c(
    "// Generated by diag_make_reference.R (R with fitdistrplus); do not edit.",
    "// Needs kMissing in the including file.",
    "namespace diagref {",
    "//! Log-likelihood, k, AIC, BIC, AICc; sample 0 the Nile flows, 1 the food shares, 2 the visits.",
    "struct LikCase { const char* name; int sample; int type; double logLik; int k;",
    "                 double aic; double bic; double aicc; };",
    "const std::vector<LikCase> kLikCases = {", lik, "};",
    "//! A² and D over the values strictly inside the fitted support, and their number.",
    "struct EdfCase { const char* name; double n; double a2; double d; };",
    "const std::vector<EdfCase> kEdfCases = {", edf, "};",
    sprintf("const std::vector<double> kEight = %s;", vec(eight)),
    "//! Pooled chi-square: statistic, degrees of freedom, p-value.",
    "struct PooledCase { const char* name; double stat; double df; double p; };",
    "const std::vector<PooledCase> kPooledCases = {", chi, "};",
    "} // namespace diagref")
writeLines(out, "diag_reference.inc")
