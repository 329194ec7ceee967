#!/usr/bin/Rscript
# W-FIT-1 with R's fitdistrplus: the work `mcsim fit DATA.csv` does, end to end from the CSV file.
#
#   Rscript wfit1_fitdistrplus.R DATA.csv OUT.json
#
# Per column, as mcsim's fitting does it (and as wfit1_scipy.py does):
#   * a text column is categorical: its category proportions;
#   * whole numbers >= 0 with at most 20 distinct values are ordinal: Poisson and negative
#     binomial by fitdist(method = "mle") (Binomial only when the variance is below the mean,
#     n from the moments and fixed), each tested by the chi-square statistic over the bins
#     0..max with the upper tail in the last bin; the smallest statistic is the best;
#   * any other column is continuous: every candidate whose support holds the data (lnorm,
#     gamma and weibull need x > 0, exp x >= 0, beta 0 < x < 1) fitted by
#     fitdist(method = "mle"), plus a triangular distribution (defined below: endpoints fixed
#     at the sample extremes widened by 1e-9 of the range, the mode by Brent's method), then
#     the Anderson-Darling A^2 of each fit on the sorted column; the smallest A^2 is the best.
# The Pearson correlations of the numeric columns are computed as well.
#
# Parameters are written in mcsim's parameterisation (Gamma's second parameter and the
# Exponential's parameter are rates; LogNormal's a is exp(meanlog); NegBin's prob is
# size / (size + mu)). Prints one line with the seconds spent; OUT.json holds the fits.
suppressPackageStartupMessages(library(fitdistrplus))

kMaxOrdinalValues <- 20

# Triangular density and distribution function on [min, max] with the given mode.
dtriang <- function(x, min, max, mode, log = FALSE) {
    d <- ifelse(x < min | x > max, 0,
                ifelse(x < mode, 2 * (x - min) / ((max - min) * (mode - min)),
                       ifelse(x == mode, 2 / (max - min),
                              2 * (max - x) / ((max - min) * (max - mode)))))
    if (log) log(d) else d
}
ptriang <- function(q, min, max, mode) {
    ifelse(q <= min, 0,
           ifelse(q >= max, 1,
                  ifelse(q <= mode, (q - min)^2 / ((max - min) * (mode - min)),
                         1 - (max - q)^2 / ((max - min) * (max - mode)))))
}

# A^2 = -n + sum_i [ (2i-1)/n (ln(1-u_i) - ln u_i) - 2 ln(1-u_i) ] over the sorted sample's
# fitted distribution function values u; as in mcsim, u outside (0, 1) adds nothing.
anderson_darling <- function(u) {
    n <- length(u)
    i <- seq_len(n)
    ok <- u > 0 & u < 1
    l1 <- log1p(-u[ok])
    -n + sum((2 * i[ok] - 1) / n * (l1 - log(u[ok])) - 2 * l1)
}

fit_continuous <- function(x) {
    xs <- sort(x)
    lo <- xs[1]
    hi <- xs[length(xs)]
    fits <- list()
    add <- function(name, params, cdf) {
        fits[[name]] <<- list(params = params, stat = anderson_darling(cdf(xs)))
    }
    try_fit <- function(...) tryCatch(fitdist(...), error = function(e) NULL)

    f <- fitdist(x, "norm", method = "mle")
    add("Normal", list(mean = f$estimate[["mean"]], stddev = f$estimate[["sd"]]),
        function(v) pnorm(v, f$estimate[["mean"]], f$estimate[["sd"]]))
    f <- fitdist(x, "unif", method = "mle")
    add("Uniform", list(min = f$estimate[["min"]], max = f$estimate[["max"]]),
        function(v) punif(v, f$estimate[["min"]], f$estimate[["max"]]))
    if (hi > lo) {
        d <- 1e-9 * (hi - lo)
        a <- lo - d
        b <- hi + d
        mode0 <- min(max(3 * mean(x) - lo - hi, a + d), b - d)
        f <- try_fit(x, "triang", method = "mle", start = list(mode = mode0),
                     fix.arg = list(min = a, max = b), optim.method = "Brent",
                     lower = a, upper = b)
        if (!is.null(f)) {
            m <- f$estimate[["mode"]]
            add("Triangular", list(min = lo, max = hi, mode = m),
                function(v) ptriang(v, a, b, m))
        }
    }
    if (lo > 0) {
        f <- fitdist(x, "lnorm", method = "mle")
        ml <- f$estimate[["meanlog"]]
        sl <- f$estimate[["sdlog"]]
        add("Lognormal", list(a = exp(ml), b = sl), function(v) plnorm(v, ml, sl))
        f <- try_fit(x, "gamma", method = "mle")
        if (!is.null(f)) {
            sh <- f$estimate[["shape"]]
            ra <- f$estimate[["rate"]]
            add("Gamma", list(shape = sh, scale = ra), function(v) pgamma(v, sh, ra))
        }
        f <- try_fit(x, "weibull", method = "mle")
        if (!is.null(f)) {
            k <- f$estimate[["shape"]]
            s <- f$estimate[["scale"]]
            add("Weibull", list(a = s, b = k, c = 0), function(v) pweibull(v, k, s))
        }
    }
    if (lo >= 0) {
        f <- try_fit(x, "exp", method = "mle")
        if (!is.null(f)) {
            r <- f$estimate[["rate"]]
            add("Exponential", list(scale = r), function(v) pexp(v, r))
        }
    }
    if (lo > 0 && hi < 1) {
        f <- try_fit(x, "beta", method = "mle")
        if (!is.null(f)) {
            s1 <- f$estimate[["shape1"]]
            s2 <- f$estimate[["shape2"]]
            add("Beta", list(shape1 = s1, shape2 = s2), function(v) pbeta(v, s1, s2))
        }
    }
    fits
}

# Chi-square over the bins 0..K-1 of the observed counts; the last bin takes the tail.
chi_square <- function(counts, p) {
    p[length(p)] <- 1 - sum(p[-length(p)])
    e <- p * sum(counts)
    ok <- p > 0
    sum((counts[ok] - e[ok])^2 / e[ok])
}

fit_ordinal <- function(x) {
    counts <- tabulate(x + 1)
    k <- seq_along(counts) - 1
    m <- mean(x)
    v <- var(x)
    fits <- list()
    f <- fitdist(x, "pois", method = "mle")
    lam <- f$estimate[["lambda"]]
    fits[["Poisson"]] <- list(params = list(mean = lam), stat = chi_square(counts, dpois(k, lam)))
    f <- tryCatch(fitdist(x, "nbinom", method = "mle"), error = function(e) NULL)
    if (!is.null(f)) {
        size <- f$estimate[["size"]]
        mu <- f$estimate[["mu"]]
        fits[["Negbinomial"]] <- list(params = list(thresh = size, prob = size / (size + mu)),
                                      stat = chi_square(counts, dnbinom(k, size = size, mu = mu)))
    }
    if (v < m) {
        n <- max(1, floor(m / (1 - v / m) + 0.5))
        if (n > 1 && length(counts) <= n + 1) {
            f <- fitdist(x, "binom", method = "mle", fix.arg = list(size = n),
                         start = list(prob = m / n))
            q <- f$estimate[["prob"]]
            fits[["Binomial"]] <- list(params = list(n = n, prob = q),
                                       stat = chi_square(counts, dbinom(k, n, q)))
        }
    }
    fits
}

# A small JSON writer: named lists become objects, unnamed vectors of length > 1 arrays.
to_json <- function(v) {
    if (is.null(v)) return("null")
    if (is.list(v) && !is.null(names(v))) {
        items <- mapply(function(n, x) paste0("\"", n, "\": ", to_json(x)), names(v), v)
        return(paste0("{", paste(items, collapse = ", "), "}"))
    }
    if (is.list(v)) return(paste0("[", paste(sapply(v, to_json), collapse = ", "), "]"))
    if (is.character(v)) {
        s <- paste0("\"", v, "\"")
    } else {
        s <- ifelse(is.finite(v), sprintf("%.17g", v), "null")
    }
    if (length(v) == 1) s else paste0("[", paste(s, collapse = ", "), "]")
}

main <- function() {
    args <- commandArgs(trailingOnly = TRUE)
    if (length(args) != 2) stop("usage: Rscript wfit1_fitdistrplus.R DATA.csv OUT.json")
    start <- proc.time()[["elapsed"]]
    data <- read.csv(args[1], stringsAsFactors = FALSE)
    fields <- list()
    numeric <- list()
    for (name in names(data)) {
        x <- data[[name]]
        if (is.character(x)) {
            tab <- table(x)
            fields[[name]] <- list(level = "categorical", best = "Categorical",
                                   candidates = list(Categorical = list(
                                       params = as.list(tab / sum(tab)), stat = NULL)))
            next
        }
        x <- as.numeric(x)
        numeric[[name]] <- x
        whole <- all(x == round(x)) && min(x) >= 0
        if (whole && length(unique(x)) <= kMaxOrdinalValues) {
            level <- "ordinal"
            fits <- fit_ordinal(x)
        } else {
            level <- "continuous"
            fits <- fit_continuous(x)
        }
        stats <- sapply(fits, function(f) f$stat)
        fields[[name]] <- list(level = level, best = names(fits)[which.min(stats)],
                               candidates = fits)
    }
    corr <- cor(do.call(cbind, numeric))
    seconds <- proc.time()[["elapsed"]] - start
    result <- list(tool = paste("fitdistrplus", packageVersion("fitdistrplus")),
                   fields = fields,
                   correlations = lapply(seq_len(nrow(corr)), function(i) corr[i, ]),
                   seconds = seconds)
    writeLines(to_json(result), args[2])
    cat(sprintf("fitdistrplus fit: %.3f s\n", seconds))
}

main()
