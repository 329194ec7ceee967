// `mcsim demo`: the bundled example end to end. It fits the distributions of
// examples/data/sales.csv and writes the plan (with examples/models/profit.model as its
// model), then simulates that plan and prints the results, showing the command lines that do
// the same by hand. The files go to a temporary folder that is removed afterwards, or to the
// folder given with --dir, which keeps them (the plan, the JSON results and the simulated
// cases).
#pragma once

#include <CLI/CLI.hpp>

#include <ostream>
#include <string>

namespace MCHost {

//! What the command line says about the demo.
struct DemoOptions {
    std::string fDir;         //!< folder for the files; "" for a temporary one
    std::string fExamplesDir; //!< the examples folder; "" for the source tree's
    int fCases = 20000;       //!< cases to simulate
    int fThreads = 2;         //!< worker threads of the fit and the simulation
};

//! Adds the `demo` subcommand to `app`, storing into `options`; returns it.
CLI::App* AddDemoCommand(CLI::App& app, DemoOptions& options);

//! Runs the demo. Returns the exit status of the first step that fails, else 0.
int RunDemo(const DemoOptions& options, std::ostream& out, std::ostream& err);

} // namespace MCHost
