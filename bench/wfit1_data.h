// The fitting workload W-FIT-1: 200,000 rows of seven fields drawn with a fixed seed, shared by
// the CSV generator (gen_wfit1) and the in-memory benchmark (fitting_wfit1_bench).
//
// Fields, in column order:
//   gamma    Gamma, shape 2.5, scale 4 (mean 10)
//   weibull  Weibull, shape 1.8, scale 5
//   normal   Normal, mean 100, standard deviation 15
//   share    Beta proportion, shapes 2 and 5
//   poisson  Poisson count, mean 4
//   negbin   negative binomial count of failures before the 3rd success, p = 0.4 (mean 4.5)
//   group    three categories "A", "B", "C" with probabilities 0.5, 0.3, 0.2
// Boost.Random draws every field from one 64-bit Mersenne Twister stream, row by row, so the
// data depend only on the seed and the Boost version. Continuous values are written with 9
// significant digits; the in-memory rows hold exactly the numbers the CSV text parses to.
#pragma once

#include <boost/random/beta_distribution.hpp>
#include <boost/random/discrete_distribution.hpp>
#include <boost/random/gamma_distribution.hpp>
#include <boost/random/mersenne_twister.hpp>
#include <boost/random/negative_binomial_distribution.hpp>
#include <boost/random/normal_distribution.hpp>
#include <boost/random/poisson_distribution.hpp>
#include <boost/random/weibull_distribution.hpp>

#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

namespace wfit1 {

inline constexpr std::uint64_t kSeed = 20261206;
inline constexpr long kRows = 200000;
inline constexpr int kNFields = 7;
inline const char* const kFieldNames[kNFields] = {"gamma",   "weibull", "normal", "share",
                                                  "poisson", "negbin",  "group"};
inline const char* const kGroupTexts[3] = {"A", "B", "C"};

//! One row; `group` is the category code 0, 1 or 2.
struct Row {
    double values[kNFields - 1];
    int group;
};

//! Draws the rows in order.
class Generator {
public:
    Generator() : fEngine(kSeed), fGroup({0.5, 0.3, 0.2}) {}

    //! The next row, its continuous values rounded to 9 significant digits as in the CSV.
    Row Next() {
        Row row{};
        row.values[0] = Round9(fGamma(fEngine));
        row.values[1] = Round9(fWeibull(fEngine));
        row.values[2] = Round9(fNormal(fEngine));
        row.values[3] = Round9(fBeta(fEngine));
        row.values[4] = static_cast<double>(fPoisson(fEngine));
        row.values[5] = static_cast<double>(fNegBin(fEngine));
        row.group = fGroup(fEngine);
        return row;
    }

    //! `x` printed with 9 significant digits, the CSV form.
    static std::string Format9(double x) {
        char text[32];
        std::snprintf(text, sizeof text, "%.9g", x);
        return text;
    }

private:
    static double Round9(double x) { return std::strtod(Format9(x).c_str(), nullptr); }

    boost::random::mt19937_64 fEngine;
    boost::random::gamma_distribution<double> fGamma{2.5, 4.0};
    boost::random::weibull_distribution<double> fWeibull{1.8, 5.0};
    boost::random::normal_distribution<double> fNormal{100.0, 15.0};
    boost::random::beta_distribution<double> fBeta{2.0, 5.0};
    boost::random::poisson_distribution<int> fPoisson{4.0};
    boost::random::negative_binomial_distribution<int> fNegBin{3, 0.4};
    boost::random::discrete_distribution<int> fGroup;
};

} // namespace wfit1
