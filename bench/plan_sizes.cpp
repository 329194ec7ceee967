// The plan file's reading and writing on their own, for bench/sizes.sh, which times and
// measures this program under /usr/bin/time:
//
//   plan_sizes read PLAN.xml            reads the plan as `mcsim simulate` does (the file read
//                                       once, the correlation cells streamed, the checks)
//   plan_sizes write PLAN.xml OUT.xml   reads it, then writes it again with the plan writer
//
// Prints the plan's simulated fields, correlation variables and, for write, the bytes written.
#include "data/planchecks.h"
#include "simulation_common/mcplanxmlhandler.h"

#include <fstream>
#include <iostream>
#include <string>
#include <vector>

int main(int argc, char** argv) {
    const std::string what = argc > 2 ? argv[1] : "";
    if (!(what == "read" || (what == "write" && argc > 3))) {
        std::cerr << "usage: plan_sizes read PLAN.xml | write PLAN.xml OUT.xml\n";
        return 2;
    }
    try {
        std::vector<std::string> warnings;
        MCMCSP_800::SPCSettings plan = MCHost::ReadPlanFile(argv[2], warnings);
        std::cout << plan.GetSimulationInput().size() << " fields, "
                  << plan.GetCorrVarList().size() << " correlated";
        if (what == "write") {
            std::string text;
            MCMCSP_800::MCPlanXMLHandler writer;
            if (!writer.WritePlanFile(text, &plan)) {
                std::cerr << "plan_sizes: the plan could not be written\n";
                return 1;
            }
            std::ofstream(argv[3], std::ios::binary) << text;
            std::cout << ", " << text.size() << " bytes written";
        }
        std::cout << "\n";
    } catch (const std::exception& e) {
        std::cerr << "plan_sizes: " << e.what() << "\n";
        return 1;
    }
    return 0;
}
