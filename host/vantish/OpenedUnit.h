// A unit with the plug-in opened on it and its bring-up finished: what every
// command that feeds events starts from.
#pragma once

#include "host/vantish/Commands.h"

#include "host/emulator/Bundle.h"
#include "host/emulator/PlugInSession.h"
#include "host/emulator/Unit.h"

#include <VantishPlatform/LogControl.h>

#include <memory>
#include <string>

namespace vantish {

struct OpenedUnit {
    host::DeviceDescription description;
    std::unique_ptr<host::Bundle> bundle;
    std::unique_ptr<host::Unit> unit;
    std::unique_ptr<host::PlugInSession> session;
    SInt32 score = 0;

    // The unit's channel count as its driver publishes it ("NumberOfChannels"), or 0.
    unsigned channelCount() const;
};

// Loads the description and the bundle, builds the unit, matches and opens
// the plug-in and waits for bring-up. Throws std::runtime_error (with a
// message naming the file) when any of it fails or the plug-in declines.
std::unique_ptr<OpenedUnit> openUnit(const CommonOptions& common, const std::string& devicePath);

// Applies the --log option: the plug-in's log on stderr from that level on
// (errors only when not given).
void applyLogOption(const CommonOptions& common);
// The level the --log option names, or `fallback` when it was not given.
VPLogLevel logLevelOption(const CommonOptions& common, VPLogLevel fallback);

// A CF value (caller releases) for a client property given in JSON.
CFTypeRef clientPropertyValue(const nlohmann::json& value);

// Sets a client property on the opened plug-in; false with `error` set when
// the key or value cannot be one.
bool setProperty(OpenedUnit& opened, const std::string& key, const nlohmann::json& value, std::string& error);

// The --set options (KEY=VALUE, VALUE in JSON), in order; false after one
// line on stderr for the first that cannot be set.
bool applyAssignments(OpenedUnit& opened, const std::vector<std::string>& assignments);

} // namespace vantish
