// A `vantish` device description of any content: parseDeviceDescription, then
// the unit it describes made real (registry entries, the service and its
// driver properties, boot arguments, device-information answers), and the
// plug-in matched and opened on it as the event system does, its queued
// calibration run, and one sample filtered.
//
// Input: the JSON text. Values may read files only inside the description's
// folder, which holds the files of data/devices/*/ and "blob.bin".
#include "common/FuzzSupport.h"
#include "common/PlainFiles.h"

#include "host/emulator/DeviceDescription.h"
#include "host/emulator/DriverSample.h"
#include "host/emulator/Unit.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/HIDHost.h>

#include <memory>
#include <optional>

namespace {

namespace fs = std::filesystem;

// The description is read as if it lay in a folder holding the files of the
// sample devices of data/ (registry blobs, store records) and "blob.bin", so
// that their descriptions find what they name.
const fs::path& descriptionFile()
{
    static const fs::path file = [] {
        const fs::path unit = fz::Workspace::get().root / "unit";
        fs::create_directories(unit);
        std::error_code ec;
        for (const auto& device : fs::directory_iterator(fs::path(VANTISH_SOURCE_DIR) / "data" / "devices", ec))
            fs::copy(device.path(), unit, fs::copy_options::recursive | fs::copy_options::overwrite_existing, ec);
        const uint8_t blob[] = {1, 0, 0, 0, 0x10, 0x20, 0x30, 0x40};
        fz::writeFile(unit / "blob.bin", blob);
        return unit / "device.json";
    }();
    return file;
}

std::optional<host::DeviceDescription> parse(const uint8_t* data, size_t size)
{
    const nlohmann::json json = nlohmann::json::parse(data, data + size, nullptr, false);
    if (json.is_discarded() || !fz::readsOnlyPlainFiles(json))
        return std::nullopt;
    try {
        return host::parseDeviceDescription(json, descriptionFile());
    } catch (const std::exception&) {
        return std::nullopt; // the command reports it and stops
    }
}

void runPlugIn(IOHIDServiceRef service)
{
    vt::PlugIn plugin(vt::PlugIn::AtRelease::RunQueuedWorkFirst);
    VantishPlugIn::match(&*plugin, service, 0);
    VantishPlugIn::open(&*plugin, service, 0);
    vt::runQueuedWork();

    ALSSampleRecord record;
    record.lux = 120.0f;
    record.sampleChannelCount = 4;
    record.channelValues = {100.0f, 180.0f, 60.0f, 350.0f, 40.0f, 5.0f};
    IOHIDEventRef event = host::createALSEvent(record, 1000);
    VantishPlugIn::filter(&*plugin, event);
    CFRelease(event);
}

// Puts back what a unit changes process-wide.
void resetDevice()
{
    const fz::Workspace& workspace = fz::Workspace::get();
    VPRegistryReset();
    VPQVTSetStoreDirectory(workspace.store.string());
    VPSetBootArgs(std::string());
    VPTessaryReset();
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    fz::Workspace::get().clear();
    const auto description = parse(data, size);
    if (!description)
        return 0;
    std::unique_ptr<host::Unit> unit;
    try {
        unit = std::make_unique<host::Unit>(*description);
    } catch (const std::exception&) {
        resetDevice();
        return 0;
    }
    runPlugIn(unit->service());
    unit.reset();
    resetDevice();
    return 0;
}
