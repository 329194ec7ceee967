// Writes the fitting workload W-FIT-1 (see wfit1_data.h) as CSV with a header row.
//
//   gen_wfit1 OUT.csv [ROWS]      ROWS defaults to 200000; the first rows of a longer file are
//                                 the rows of a shorter one.
#include "wfit1_data.h"

#include <cstdio>
#include <cstdlib>

int main(int argc, char** argv) {
    if (argc < 2 || argc > 3) {
        std::fprintf(stderr, "usage: %s OUT.csv [ROWS]\n", argv[0]);
        return 2;
    }
    const long rows = argc == 3 ? std::strtol(argv[2], nullptr, 10) : wfit1::kRows;
    if (rows < 1) {
        std::fprintf(stderr, "%s: ROWS must be a positive whole number\n", argv[0]);
        return 2;
    }
    std::FILE* out = std::fopen(argv[1], "w");
    if (!out) {
        std::perror(argv[1]);
        return 1;
    }
    for (int f = 0; f < wfit1::kNFields; ++f) {
        std::fprintf(out, "%s%c", wfit1::kFieldNames[f], f + 1 < wfit1::kNFields ? ',' : '\n');
    }
    wfit1::Generator generator;
    for (long r = 0; r < rows; ++r) {
        const wfit1::Row row = generator.Next();
        for (int f = 0; f < wfit1::kNFields - 1; ++f) {
            std::fprintf(out, "%s,", wfit1::Generator::Format9(row.values[f]).c_str());
        }
        std::fprintf(out, "%s\n", wfit1::kGroupTexts[row.group]);
    }
    if (std::fclose(out) != 0) {
        std::perror(argv[1]);
        return 1;
    }
    return 0;
}
