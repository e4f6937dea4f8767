// vantish open DEVICE: match and open the plug-in on a unit, wait for its
// calibration bring-up, and report what it read, logged and handed the driver.
#include "host/vantish/Commands.h"

#include "host/emulator/Bundle.h"
#include "host/emulator/DataFolder.h"
#include "host/emulator/DriverSample.h"
#include "host/emulator/PlugInSession.h"
#include "host/emulator/Unit.h"
#include "support/CFOwned.h"

#include <VantishPlatform/LogControl.h>

#include <iostream>

namespace vantish {

namespace {

struct OpenOptions {
    std::string device;
};

const char* levelTag(os_log_type_t type)
{
    switch (type) {
    case OS_LOG_TYPE_ERROR:
    case OS_LOG_TYPE_FAULT:
        return "error";
    case OS_LOG_TYPE_INFO:
        return "info";
    case OS_LOG_TYPE_DEBUG:
        return "debug";
    default:
        return "default";
    }
}

void printLog(const std::vector<VPLogLine>& lines)
{
    for (const auto& line : lines) {
        std::string message = line.message;
        while (!message.empty() && (message.back() == '\n' || message.back() == ' '))
            message.pop_back();
        std::cout << "    [" << levelTag(line.type) << "] " << message << "\n";
    }
}

void printDriverProperty(const host::Unit& unit, const char* key)
{
    const CFOwned<CFTypeRef> value(unit.copyDriverProperty(key));
    if (!value) {
        std::cout << "    " << key << ": not set\n";
        return;
    }
    if (CFGetTypeID(value.get()) == CFDataGetTypeID()) {
        std::cout << "    " << key << ": " << CFDataGetLength(static_cast<CFDataRef>(value.get())) << " bytes\n";
    } else {
        const CFOwned<CFStringRef> description(CFCopyDescription(value.get()));
        std::cout << "    " << key << ": " << CFStringGetCStringPtr(description.get(), kCFStringEncodingUTF8) << "\n";
    }
}

int runOpen(const CommonOptions& common, const OpenOptions& options)
{
    try {
        const std::string devicePath = options.device.empty() ? defaultDevice() : options.device;
        host::DeviceDescription description = host::loadDeviceDescription(devicePath);
        host::Bundle bundle(common.bundle);
        host::mapDevicePaths(common.bundle, common.state);
        host::Unit unit(description);

        VPLogSetEcho(false);
        VPLogSetLevel(VPLogLevel::Info);
        VPLogStartCapture();

        std::cout << "Bundle  " << bundle.folder() << " (factory " << bundle.factoryName() << ")\n";
        std::cout << "Unit    " << description.name;
        if (!description.summary.empty())
            std::cout << " - " << description.summary;
        std::cout << "\n\n";

        host::PlugInSession session(bundle, unit);
        const SInt32 score = session.match();
        std::cout << "match   score " << score << (score > 0 ? " (attached)" : " (declined)") << "\n";
        printLog(VPLogTakeCaptured());
        if (score <= 0)
            return 1;

        session.open();
        std::cout << "open    configuration read from the service, device tree and device information\n";
        printLog(VPLogTakeCaptured());

        session.waitForQueuedWork();
        std::cout << "bring-up\n";
        printLog(VPLogTakeCaptured());

        std::cout << "driver received\n";
        printDriverProperty(unit, "ALSCalibrationData");
        printDriverProperty(unit, "ALSColorCalibration");
        printDriverProperty(unit, "crgb");

        // A client sees colour only once the per-chip database is ready: the
        // filter then marks every ALS event with a colour space.
        ALSSampleRecord probe;
        probe.sampleChannelCount = 6;
        probe.sampleOrientation = 1;
        probe.lux = probe.rawLux = 100.0f;
        probe.channelValues.fill(1000.0f);
        const CFOwned<IOHIDEventRef> event(host::createALSEvent(probe, 0));
        session.filter(event.get());
        const bool colour = IOHIDEventGetIntegerValue(event.get(), kIOHIDEventFieldAmbientLightColorSpace) != 0;
        VPLogTakeCaptured();
        std::cout << "colour  "
                  << (colour ? "on: the per-chip database is ready (dbReady)"
                             : "off: no per-chip database (dbReady is 0)")
                  << "\n";
        VPLogStopCapture();
        return 0;
    } catch (const std::exception& e) {
        std::cerr << "vantish: " << e.what() << "\n";
        return 2;
    }
}

} // namespace

std::string defaultDevice() { return (host::dataFolder() / "devices" / "xwca-t2" / "device.json").string(); }

Runner addOpenCommand(CLI::App& app, const CommonOptions& common)
{
    auto options = std::make_shared<OpenOptions>();
    app.add_option("device", options->device, "Device description (JSON); the built-in sample unit when omitted");
    return [&common, options] { return runOpen(common, *options); };
}

} // namespace vantish
