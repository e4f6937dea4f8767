// A described unit made real on the platform stand-in: its registry entries,
// its HID service with the driver's properties, its factory-data store, boot
// arguments and device-information answers. One unit exists at a time (the
// registry and the store are process-wide).
#pragma once

#include "host/emulator/DeviceDescription.h"
#include "support/CFOwned.h"

#include <IOKit/hid/IOHIDService.h>

#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace host {

class Unit {
public:
    explicit Unit(const DeviceDescription& description);
    Unit(const Unit&) = delete;
    Unit& operator=(const Unit&) = delete;

    const DeviceDescription& description() const { return description_; }
    IOHIDServiceRef service() const { return service_.get(); }

    // What the plug-in handed the driver under `key` (retained), or null.
    CFTypeRef copyDriverProperty(const char* key) const;
    // Every key the plug-in handed the driver a value for, in the order of the first.
    std::vector<std::string> driverPropertyKeys() const;

private:
    struct ReceivedKeys {
        std::mutex mutex;
        std::vector<std::string> keys;
    };

    DeviceDescription description_;
    CFOwned<IOHIDServiceRef> service_; // released too when the constructor fails after making it
    std::shared_ptr<ReceivedKeys> received_ = std::make_shared<ReceivedKeys>(); // written on the setter's thread
};

// Maps the device's fixed paths: the system folder onto the bundle's parent,
// the state folder onto `stateFolder` (created when missing).
void mapDevicePaths(const std::string& bundleFolder, const std::string& stateFolder);
// The user's state folder for caches ($XDG_STATE_HOME/vantish or ~/.local/state/vantish).
std::string defaultStateFolder();

} // namespace host
