#include "host/vantish/OpenedUnit.h"

#include <VantishPlatform/LogControl.h>

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

void applyLogOption(const CommonOptions& common)
{
    static const std::map<std::string, VPLogLevel> levels = {{"off", VPLogLevel::Off},
                                                             {"error", VPLogLevel::Error},
                                                             {"default", VPLogLevel::Default},
                                                             {"info", VPLogLevel::Info},
                                                             {"debug", VPLogLevel::Debug}};
    VPLogSetEcho(true);
    VPLogSetLevel(common.logLevel.empty() ? VPLogLevel::Error : levels.at(common.logLevel));
}

CFTypeRef clientPropertyValue(const nlohmann::json& value)
{
    return host::createPropertyValue(value, ".", "property value");
}

} // namespace vantish
