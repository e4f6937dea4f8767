// Loading a service-filter plug-in bundle the way the event system does: read
// its registration, load its library, call the factory registered for the
// service-filter type, and keep only the filter interface it hands back.
#pragma once

#include <IOKit/hid/IOHIDServiceFilterPlugIn.h>

#include <memory>
#include <string>

namespace host {

// The filter interface of one plug-in instance. The pointer is the instance;
// every call goes through its function table.
using FilterInterface = IOHIDServiceFilterPlugInInterface**;

class Bundle {
public:
    // Loads the bundle folder (the one holding Info.json). Throws
    // std::runtime_error with a message naming what is wrong.
    explicit Bundle(const std::string& folder);
    ~Bundle();
    Bundle(const Bundle&) = delete;
    Bundle& operator=(const Bundle&) = delete;

    const std::string& folder() const { return folder_; }
    const std::string& factoryName() const { return factoryName_; }

    // A new instance's filter interface (one reference, owned by the caller),
    // or null when the factory or the interface query declines.
    FilterInterface createFilter() const;

private:
    using Factory = void* (*) (CFAllocatorRef, CFUUIDRef);
    std::string folder_;
    std::string factoryName_;
    void* library_ = nullptr;
    Factory factory_ = nullptr;
};

// The bundle that ships with the vantish command (VANTISH_BUNDLE, or next to
// the program in the build or install tree).
std::string defaultBundleFolder();

} // namespace host
