#include "host/vantish/OpenedUnit.h"

#include "host/inputs/EventInput.h"
#include "support/CFOwned.h"

#include <VantishPlatform/LogControl.h>

#include <iostream>
#include <stdexcept>

namespace vantish {

unsigned OpenedUnit::channelCount() const
{
    CFTypeRef value = IOHIDServiceGetProperty(unit->service(), CFSTR("NumberOfChannels"));
    int count = 0;
    if (value && CFGetTypeID(value) == CFNumberGetTypeID())
        CFNumberGetValue(static_cast<CFNumberRef>(value), kCFNumberIntType, &count);
    return count > 0 ? unsigned(count) : 0u;
}

std::unique_ptr<OpenedUnit> openUnit(const CommonOptions& common, const std::string& devicePath)
{
    auto opened = std::make_unique<OpenedUnit>();
    opened->description = host::loadDeviceDescription(devicePath);
    opened->bundle = std::make_unique<host::Bundle>(common.bundle);
    host::mapDevicePaths(common.bundle, common.state);
    opened->unit = std::make_unique<host::Unit>(opened->description);
    opened->session = std::make_unique<host::PlugInSession>(*opened->bundle, *opened->unit);
    opened->score = opened->session->match();
    if (opened->score <= 0)
        throw std::runtime_error(devicePath + ": the plug-in does not attach to this service (match score " +
                                 std::to_string(opened->score) + ")");
    opened->session->open();
    opened->session->waitForQueuedWork();
    return opened;
}

VPLogLevel logLevelOption(const CommonOptions& common, VPLogLevel fallback)
{
    static const std::map<std::string, VPLogLevel> levels = {{"off", VPLogLevel::Off},
                                                             {"error", VPLogLevel::Error},
                                                             {"default", VPLogLevel::Default},
                                                             {"info", VPLogLevel::Info},
                                                             {"debug", VPLogLevel::Debug}};
    return common.logLevel.empty() ? fallback : levels.at(common.logLevel);
}

void applyLogOption(const CommonOptions& common)
{
    VPLogSetEcho(true);
    VPLogSetLevel(logLevelOption(common, VPLogLevel::Error));
}

CFTypeRef clientPropertyValue(const nlohmann::json& value)
{
    return host::createPropertyValue(value, ".", "property value");
}

bool setProperty(OpenedUnit& opened, const std::string& key, const nlohmann::json& value, std::string& error)
{
    try {
        const CFOwned<CFTypeRef> cfValue(clientPropertyValue(value));
        const CFOwned<CFStringRef> cfKey(CFStringCreateWithCString(nullptr, key.c_str(), kCFStringEncodingUTF8));
        // A property key is a CF string: text that is not UTF-8 cannot be one.
        if (!cfKey) {
            error = "the key is not UTF-8 text";
            return false;
        }
        opened.session->setProperty(cfKey.get(), cfValue.get());
        return true;
    } catch (const std::exception& e) {
        error = e.what();
        return false;
    }
}

bool applyAssignments(OpenedUnit& opened, const std::vector<std::string>& assignments)
{
    for (const auto& assignment : assignments) {
        auto parsed = host::parseAssignment(assignment);
        std::string error;
        if (!parsed) {
            std::cerr << "vantish: --set " << assignment << ": expected KEY=VALUE\n";
            return false;
        }
        if (!setProperty(opened, parsed->first, parsed->second, error)) {
            std::cerr << "vantish: --set " << assignment << ": " << error << "\n";
            return false;
        }
    }
    return true;
}

} // namespace vantish
