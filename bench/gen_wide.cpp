// The wide inputs of bench/sizes.sh, written with a fixed seed:
//
//   gen_wide csv OUT.csv COLUMNS ROWS     COLUMNS correlated numeric fields x0.. of ROWS rows:
//                                         x_j = m_j + s_j·(0.6·z + 0.8·e_j) with one common
//                                         normal z per row (every pair correlates at 0.36),
//                                         every third field exp() of that (positive, skewed)
//   gen_wide model OUT.model              the model y = x0 + x1 of the plans below
//   gen_wide categorical OUT.xml K        a plan with x0, x1 ~ Normal and c, a Categorical of
//                                         K equally likely text categories "k0".."k{K-1}"
//   gen_wide matrix OUT.xml N             a plan of N Normal inputs x0.. with the correlation
//                                         matrix 0.5^|i−j| (positive definite), every cell of
//                                         its triangle written: N(N+1)/2 CorrCell elements
//
// The plans name "wide.model" beside them as their model. Only the standard library is used,
// so the files do not depend on the code they measure.
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iostream>
#include <random>
#include <string>

namespace {

const char kHeader[] =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
    "<SimulationPlan version=\"21.0.0.0\" "
    "xmlns=\"http://xml.mcsim.org/software/analytics/Norvane/xml/simulation\">\n"
    "<ModelFiles numberOfFiles=\"1\"><ModelFile customModels=\"no\" file=\"wide.model\" "
    "numberOfTargets=\"1\"><Target excludeFromOutput=\"no\" measurementLevel=\"continuous\" "
    "name=\"y\"/></ModelFile></ModelFiles>\n";

const char kFooter[] = "<Settings numberOfCriteria=\"0\" simulatedCases=\"10000\"/>\n"
                       "</SimulationPlan>\n";

void NormalField(std::ostream& out, const std::string& name, double mean, double sd) {
    out << "<SimulatedField autofitted=\"no\" excludeFromOutput=\"no\" locked=\"no\" "
           "measurementLevel=\"continuous\" name=\""
        << name
        << "\" numberOfTargets=\"0\" valueType=\"double\"><DistNormal "
           "numberOfParamSets=\"1\"><Parameters mean=\""
        << mean << "\" stddev=\"" << sd << "\"/></DistNormal></SimulatedField>\n";
}

int Csv(const std::string& path, long columns, long rows) {
    std::ofstream out(path);
    std::mt19937_64 engine(20261206);
    std::normal_distribution<double> normal;
    for (long j = 0; j < columns; ++j) {
        out << (j ? "," : "") << 'x' << j;
    }
    out << '\n';
    char cell[32];
    for (long r = 0; r < rows; ++r) {
        const double z = normal(engine);
        for (long j = 0; j < columns; ++j) {
            const double u = 0.6 * z + 0.8 * normal(engine);
            const double x = j % 3 == 2 ? std::exp(0.5 * u) : 10.0 + j % 7 + (1.0 + j % 5) * u;
            std::snprintf(cell, sizeof cell, "%.6g", x);
            out << (j ? "," : "") << cell;
        }
        out << '\n';
    }
    return out ? 0 : 1;
}

int Categorical(const std::string& path, long k) {
    std::ofstream out(path);
    out << kHeader << "<SimulatedFields numberOfFields=\"3\">\n";
    NormalField(out, "x0", 10, 2);
    NormalField(out, "x1", 5, 1);
    out << "<SimulatedField autofitted=\"no\" excludeFromOutput=\"no\" locked=\"no\" "
           "measurementLevel=\"categorical\" name=\"c\" numberOfTargets=\"0\" "
           "valueType=\"string\"><DistCategorical numberOfCategories=\""
        << k << "\">\n";
    const double p = 1.0 / static_cast<double>(k);
    for (long i = 0; i < k; ++i) {
        out << "<Category value=\"k" << i << "\"><Probability value=\"" << p
            << "\"/></Category>\n";
    }
    out << "</DistCategorical></SimulatedField>\n</SimulatedFields>\n" << kFooter;
    return out ? 0 : 1;
}

int Matrix(const std::string& path, long n) {
    std::ofstream out(path);
    out << kHeader << "<SimulatedFields numberOfFields=\"" << n << "\">\n";
    for (long i = 0; i < n; ++i) {
        NormalField(out, "x" + std::to_string(i), 10, 2);
    }
    out << "</SimulatedFields>\n<CorrMatrix locked=\"no\" numberOfCells=\"" << n * (n + 1) / 2
        << "\">\n";
    char value[32];
    for (long r = 0; r < n; ++r) {
        for (long c = 0; c <= r; ++c) {
            std::snprintf(value, sizeof value, "%.6g", std::pow(0.5, static_cast<double>(r - c)));
            out << "<CorrCell colVar=\"x" << c << "\" rowVar=\"x" << r << "\" value=\"" << value
                << "\"/>\n";
        }
    }
    out << "</CorrMatrix>\n" << kFooter;
    return out ? 0 : 1;
}

} // namespace

int main(int argc, char** argv) {
    const std::string what = argc > 2 ? argv[1] : "";
    const long n = argc > 3 ? std::atol(argv[3]) : 0;
    if (what == "csv" && argc > 4) {
        return Csv(argv[2], n, std::atol(argv[4]));
    }
    if (what == "model") {
        std::ofstream out(argv[2]);
        out << "y = x0 + x1\n";
        return out ? 0 : 1;
    }
    if (what == "categorical" && n > 0) {
        return Categorical(argv[2], n);
    }
    if (what == "matrix" && n > 0) {
        return Matrix(argv[2], n);
    }
    std::cerr << "usage: gen_wide csv OUT.csv COLUMNS ROWS | model OUT.model | categorical "
                 "OUT.xml K | matrix OUT.xml N\n";
    return 2;
}
