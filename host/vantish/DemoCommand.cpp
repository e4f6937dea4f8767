// vantish demo (and vantish with no command): the evaluation of the built-in
// sample unit against the built-in test lights, with its report.
#include "host/vantish/Commands.h"
#include "host/vantish/EvalCommand.h"

#include <CLI/CLI.hpp>

#include <memory>

namespace vantish {

Runner addDemoCommand(CLI::App& app, const CommonOptions& common)
{
    auto options = std::make_shared<EvalOptions>();
    options->report = "vantish-report.html";
    app.add_option("--report", options->report, "Where to write the HTML report")->capture_default_str();
    app.footer([] {
        return "Runs `vantish eval` on the built-in sample unit (" + defaultDevice() +
               ")\nwith the built-in test lights: prints the table and the summary and writes the report.";
    });
    return [&common, options] {
        options->device = defaultDevice();
        return runEvaluation(common, *options);
    };
}

} // namespace vantish
