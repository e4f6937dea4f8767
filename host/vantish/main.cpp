// vantish: run the colour ambient-light filter plug-in on a described unit,
// as the HID event system would.
#include "host/vantish/Commands.h"

#include "host/emulator/Bundle.h"
#include "host/emulator/Unit.h"

#include <CLI/CLI.hpp>

#include <VantishPlatform/LogControl.h>

#include <iostream>
#include <map>

int main(int argc, char** argv)
{
    CLI::App app{"vantish - run the Vantish colour ambient-light filter plug-in on a unit.\n\n"
                 "The plug-in bundle is loaded through its registration as the HID event system loads it,\n"
                 "opened on a unit described in JSON, and fed ambient-light events. With no command,\n"
                 "vantish runs the demo: the built-in sample unit evaluated against the built-in test lights.",
                 "vantish"};
    vantish::CommonOptions common;
    common.bundle = host::defaultBundleFolder();
    common.state = host::defaultStateFolder();
    app.add_option("--bundle", common.bundle, "Plug-in bundle folder (holding Info.json)")->capture_default_str();
    app.add_option("--state", common.state, "State folder for the per-chip database caches")->capture_default_str();
    app.add_option("--log", common.logLevel,
                   "Also print the plug-in's log at this level: off, error, default, info, debug")
        ->check(CLI::IsMember({"off", "error", "default", "info", "debug"}));
    app.require_subcommand(0, 1);
    app.set_help_all_flag("--help-all", "Print the help of every command and exit");

    std::map<CLI::App*, vantish::Runner> runners;
    auto add = [&](const char* name, const char* help, auto&& adder) {
        CLI::App* sub = app.add_subcommand(name, help);
        runners[sub] = adder(*sub, common);
    };
    add("open", "Open the plug-in on a unit and show the configuration and calibration it brought up",
        vantish::addOpenCommand);
    add("run", "Feed light samples through the plug-in on a unit and print the colour clients receive",
        vantish::addRunCommand);
    add("calib", "Decode calibration records to JSON and encode them back", vantish::addCalibCommand);
    add("synth", "Synthesise the samples a unit's sensor would report under a light (CSV for run)",
        vantish::addSynthCommand);
    add("eval", "Measure the plug-in's colour accuracy on a unit over a set of lights, beside a global matrix",
        vantish::addEvalCommand);
    add("demo", "Evaluate the built-in sample unit against the built-in test lights and write a report",
        vantish::addDemoCommand);
    add("lightdb", "Inspect light database files", vantish::addLightdbCommand);

    CLI11_PARSE(app, argc, argv);

    for (auto& [sub, run] : runners)
        if (sub->parsed())
            return run();
    // No command: the demonstration.
    CLI::App defaultApp;
    auto run = vantish::addDemoCommand(defaultApp, common);
    return run();
}
