// The mcsim command: the reference host's way into the component.
//
//   mcsim fit DATA.csv [options]   fit distributions to the fields of a CSV file
//
// Every subcommand answers --help.
#include "cli/fitcommand.h"
#include "component/mcspcomponent.h"

#include <CLI/CLI.hpp>

#include <iostream>

int main(int argc, char** argv) {
    CLI::App app("mcsim: Monte Carlo simulation from fitted distributions", "mcsim");
    app.require_subcommand(1);
    app.set_version_flag("--version", MCMCSP_800::GetComponentVersionText());

    MCHost::FitOptions fitOptions;
    CLI::App* fit = MCHost::AddFitCommand(app, fitOptions);

    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& e) {
        return app.exit(e);
    }
    if (fit->parsed()) {
        return MCHost::RunFit(fitOptions, std::cout, std::cerr);
    }
    return 1;
}
