// Opening the plug-in on a service: configuration from the service's
// properties, the device tree and device information, then calibration
// bring-up queued on the high-priority global queue.
#include "plugin/VantishPlugIn.h"
#include "support/CFTypes.h"
#include "support/LittleEndian.h"
#include "support/Log.h"
#include "sysconfig/SysConfigCalibration.h"

#include <Tessary/Tessary.h>

#include <optional>
#include <span>

namespace {

using cf::bytesOf;
using cf::isData;
using cf::isNumber;

// A device-tree property found on the entry or one of its ancestors (retained), or null.
CFTypeRef copyDeviceTreeProperty(io_registry_entry_t entry, CFStringRef key)
{
    return IORegistryEntrySearchCFProperty(entry, kIOServicePlane, key, kCFAllocatorDefault,
                                           kIORegistryIterateRecursively | kIORegistryIterateParents);
}

// A service property read as int, or nothing when absent or not a number.
std::optional<int> serviceInt(IOHIDServiceRef service, CFStringRef key)
{
    return cf::intValue(IOHIDServiceGetProperty(service, key));
}

// The device-information answer for `question` compared with `expected`.
bool answerEquals(CFTypeRef answer, CFStringRef expected)
{
    return answer && CFGetTypeID(answer) == CFStringGetTypeID() && CFEqual(answer, expected);
}

} // namespace

void VantishPlugIn::open(IOHIDServiceRef openedService, IOOptionBits options)
{
    (void) options;

    // 1. Which device-tree name the driver matched on.
    if (CFTypeRef matched = IOHIDServiceGetProperty(openedService, CFSTR("IONameMatched"))) {
        if (os_log_type_enabled(vantishLog(), OS_LOG_TYPE_INFO)) {
            CFStringRef description = CFCopyDescription(matched);
            VLOG_INFO("IONameMatched=%{public}s \n", CFStringGetCStringPtr(description, kCFStringEncodingUTF8));
            CFRelease(description);
        }
    } else {
        VLOG_INFO("Unknown IONameMatched\n");
    }

    // 2. Configuration members start afresh.
    unit_.orientation = 1;
    service_ = openedService;
    unit_.algoVersion = 0;
    unit_.smallDBVersion = 1.1f;
    databases_.setReady(false);
    unit_.numberOfChannels = 0;
    unit_.dbChannelCount = 0;
    unit_.spectrumSampleCount = 0;
    fit_.weightExponent = 2.0f;
    fit_.weightOffset = 0.00001f;
    unit_.channelRatioMitigation = 0;
    unit_.mitigationType = 0;
    unit_.chipType = 0;
    unit_.deviceColor = 0;
    unit_.isDravikOS = 0;
    calibration_.resetForOpen();

    // 3. Device information.
    if (CFTypeRef product = QyCopyAnswer(CFSTR("ProductName"), nullptr)) {
        if (answerEquals(product, CFSTR("Dravik OS"))) {
            unit_.isDravikOS = 1;
            VLOG_DEFAULT("Plugin is opening on Dravik OS.");
        }
        CFRelease(product);
    }
    if (CFTypeRef color = QyCopyAnswer(CFSTR("DeviceColor"), nullptr)) {
        if (answerEquals(color, CFSTR("1")))
            unit_.deviceColor = 1;
        else if (answerEquals(color, CFSTR("2")))
            unit_.deviceColor = 2;
        VLOG_INFO("DeviceColor is %d", int(unit_.deviceColor.load()));
        CFRelease(color);
    }

    // 4. The service's registry entry, for the device-tree reads.
    int64_t registryID = 0;
    if (CFTypeRef id = IOHIDServiceGetRegistryID(openedService); isNumber(id))
        CFNumberGetValue(static_cast<CFNumberRef>(id), kCFNumberSInt64Type, &registryID);
    if (registryID != 0) {
        io_service_t entry =
            IOServiceGetMatchingService(kIOMainPortDefault, IORegistryEntryIDMatching(uint64_t(registryID)));
        // The instance keeps one reference to its entry: the one it held is
        // given back, or, when the lookup found the same entry again, the new one.
        if (registryEntry_ && registryEntry_ == entry)
            IOObjectRelease(entry);
        else if (registryEntry_)
            IOObjectRelease(registryEntry_);
        registryEntry_ = entry;
    }

    // 5. Device-tree configuration.
    if (registryEntry_) {
        if (CFTypeRef value = copyDeviceTreeProperty(registryEntry_, CFSTR("IOHIDOrientationType"))) {
            // Shorter data than a 32-bit value is not an orientation; keep the default.
            if (isData(value))
                if (auto v = le::read<uint32_t>(bytesOf(value), 0))
                    unit_.orientation = *v;
            CFRelease(value);
        }
        if (CFTypeRef value = copyDeviceTreeProperty(registryEntry_, CFSTR("color-algo-override"))) {
            if (isData(value) && bytesOf(value).size() == 4) {
                unit_.colorAlgoOverride = bytesOf(value)[0];
                VLOG_INFO("Color algo override version = %hhu from EDT\n", unit_.colorAlgoOverride.load());
            }
            CFRelease(value);
        }
        if (CFTypeRef value = copyDeviceTreeProperty(registryEntry_, CFSTR("color-algo-lambda"))) {
            if (isData(value) && bytesOf(value).size() == 4) {
                const uint32_t v = le::get<uint32_t>(bytesOf(value), 0);
                if (v != 0) {
                    fit_.lambda = float(v / 100.0);
                    fit_.lambdaConfigured = 1;
                    VLOG_INFO("Setting color algo lambda = %f from EDT\n", double(fit_.lambda.load()));
                }
            }
            CFRelease(value);
        }
    }

    // 6. Service configuration.
    if (auto channels = serviceInt(openedService, CFSTR("NumberOfChannels"))) {
        unit_.numberOfChannels = uint32_t(*channels);
        unit_.dbChannelCount = *channels == 6 ? 5u : uint32_t(*channels);
    }
    if (CFTypeRef value = IOHIDServiceGetProperty(openedService, CFSTR("color-algo-lambda")); isNumber(value)) {
        float v = 0.0f;
        CFNumberGetValue(static_cast<CFNumberRef>(value), kCFNumberFloatType, &v);
        fit_.lambda = v;
        fit_.lambdaConfigured = 1;
        VLOG_INFO("Setting color algo lambda = %f from EDT\n", double(v));
    }
    if (auto mitigation = serviceInt(openedService, CFSTR("ChannelRatioMitigation"))) {
        unit_.mitigationType = uint32_t(*mitigation);
        unit_.channelRatioMitigation = *mitigation != 0;
        VLOG_INFO("Use channel ratio mitigation - %s, type = %d\n", *mitigation != 0 ? "YES" : "NO", *mitigation);
    }
    unit_.chipId = 0;
    if (auto id = serviceInt(openedService, CFSTR("chip_id"))) {
        unit_.chipId = uint32_t(*id);
        VLOG_INFO("ChipID is 0x%x\n", unsigned(*id));
    }
    unit_.sensorType = 0;
    if (auto type = serviceInt(openedService, CFSTR("ALSSensorType"))) {
        unit_.sensorType = uint32_t(*type);
        VLOG_INFO("Found sensor type = %d\n", *type);
    }

    // 7. Exactly one calibration block, on the high-priority queue.
    bool sysConfig = false;
    CFTypeRef sysConfigValue = IOHIDServiceGetProperty(openedService, CFSTR("SysConfigCalibration"));
    if (sysConfigValue && CFGetTypeID(sysConfigValue) == CFBooleanGetTypeID()) {
        sysConfig = CFBooleanGetValue(static_cast<CFBooleanRef>(sysConfigValue));
        VLOG_INFO("%s sysconfig calibration to calibrate sensor\n", sysConfig ? "Use" : "Don't use");
    }
    const bool spectrumToProcess =
        IOHIDServiceGetProperty(openedService, CFSTR("ALSCalibrationSpectrumToProcess")) == kCFBooleanTrue;

    dispatch_queue_t queue = dispatch_get_global_queue(DISPATCH_QUEUE_PRIORITY_HIGH, 0);
    if (sysConfig)
        host_.dispatchRetained(queue, [this] { processSysConfigCalibration(calibration_, true, true, true); });
    else if (spectrumToProcess)
        host_.dispatchRetained(queue, [this] { processSysConfigCalibration(calibration_, true, false, true); });
    else
        host_.dispatchRetained(queue, [this] { calibration_.runCalibrationBringUp(); });
}
