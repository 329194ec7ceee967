// The mcsim command: the reference host's way into the component.
//
//   mcsim fit DATA.csv [options]       fit distributions to the fields of a CSV file
//   mcsim simulate PLAN.xml [options]  simulate a plan with its model
//   mcsim demo [options]               the bundled example end to end
//
// Every subcommand answers --help. The exit status is 0, 1, 2, or 128 + the signal that ended
// the run (cli/commandline.h).
#include "cli/commandline.h"
#include "cli/democommand.h"
#include "cli/fitcommand.h"
#include "cli/simulatecommand.h"
#include "component/mcspcomponent.h"

#include <CLI/CLI.hpp>

#include <iostream>

int main(int argc, char** argv) {
    CLI::App app("mcsim: Monte Carlo simulation from fitted distributions", "mcsim");
    app.require_subcommand(1);
    app.set_version_flag("--version", MCMCSP_800::GetComponentVersionText());

    MCHost::FitOptions fitOptions;
    CLI::App* fit = MCHost::AddFitCommand(app, fitOptions);
    MCHost::SimulateOptions simulateOptions;
    CLI::App* simulate = MCHost::AddSimulateCommand(app, simulateOptions);
    MCHost::DemoOptions demoOptions;
    CLI::App* demo = MCHost::AddDemoCommand(app, demoOptions);
    for (CLI::App* command : {&app, fit, simulate, demo}) {
        command->footer(MCHost::kExitStatusHelp);
    }

    const int parsed = MCHost::ParseCommandLine(app, argc, argv, std::cout, std::cerr);
    if (parsed >= 0) {
        return parsed;
    }
    if (fit->parsed()) {
        return MCHost::RunFit(fitOptions, std::cout, std::cerr);
    }
    if (simulate->parsed()) {
        return MCHost::RunSimulate(simulateOptions, std::cout, std::cerr);
    }
    if (demo->parsed()) {
        return MCHost::RunDemo(demoOptions, std::cout, std::cerr);
    }
    return MCHost::ExitStatus::kUsage;
}
