// The evaluation behind `vantish eval` and `vantish demo`.
#pragma once

#include "host/vantish/Commands.h"

#include <string>
#include <vector>

namespace vantish {

struct EvalOptions {
    std::string device;
    std::vector<std::string> spectra; // files or folders; empty: the built-in test lights
    std::string report;               // the HTML report to write; empty: none
    double lux = 100.0;
    std::vector<std::string> sets; // client properties set before the first reading
    std::string format = "text";   // text (table and summary) or json
};

// Prints the table and the summary, writes the report. 0 when the lights were
// evaluated, 1 when the plug-in gave no colour for any of them, 2 when
// nothing could be evaluated.
int runEvaluation(const CommonOptions& common, const EvalOptions& options);

} // namespace vantish
