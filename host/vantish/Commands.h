// The vantish command's subcommands. Each registers its options on the CLI11
// app and returns the exit code when it runs.
#pragma once

#include <functional>
#include <string>

// The CLI11 parser is included only by the files that register options.
namespace CLI {
class App;
}

namespace vantish {

// Options every subcommand shares.
struct CommonOptions {
    std::string bundle;   // the plug-in bundle folder
    std::string state;    // the state folder (per-chip caches)
    std::string logLevel; // default, info, debug, error, off
};

// Registers a subcommand; `run` is called when it was chosen.
using Runner = std::function<int()>;
Runner addOpenCommand(CLI::App& app, const CommonOptions& common);
Runner addRunCommand(CLI::App& app, const CommonOptions& common);
Runner addCalibCommand(CLI::App& app, const CommonOptions& common);
Runner addSynthCommand(CLI::App& app, const CommonOptions& common);
Runner addEvalCommand(CLI::App& app, const CommonOptions& common);
Runner addDemoCommand(CLI::App& app, const CommonOptions& common);
Runner addLightdbCommand(CLI::App& app, const CommonOptions& common);

// The built-in sample device used when no device is named.
std::string defaultDevice();

} // namespace vantish
