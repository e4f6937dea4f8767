#include "host/emulator/Unit.h"

#include "support/CFOwned.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/HIDHost.h>
#include <VantishPlatform/Paths.h>

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <map>
#include <set>

namespace fs = std::filesystem;

namespace host {

namespace {

void setProperties(const nlohmann::json& properties, const fs::path& folder, const std::string& where,
                   const std::function<void(CFStringRef, CFTypeRef)>& set)
{
    for (const auto& [key, value] : properties.items()) {
        const CFOwned<CFTypeRef> cfValue(createPropertyValue(value, folder, where + "." + key)); // may throw
        const CFOwned<CFStringRef> cfKey(CFStringCreateWithCString(nullptr, key.c_str(), kCFStringEncodingUTF8));
        set(cfKey.get(), cfValue.get());
    }
}

// Entries are created parents first; an entry naming a parent that is not
// described hangs from the root.
void createRegistry(const DeviceDescription& d)
{
    VPRegistryReset();
    std::set<uint64_t> described;
    for (const auto& e : d.registry)
        described.insert(e.id);
    std::set<uint64_t> created;
    std::map<uint64_t, io_registry_entry_t> handles;
    while (created.size() < d.registry.size()) {
        bool progress = false;
        for (size_t i = 0; i < d.registry.size(); ++i) {
            const auto& e = d.registry[i];
            if (created.count(e.id))
                continue;
            const bool parentReady = e.parent == 0 || !described.count(e.parent) || created.count(e.parent);
            if (!parentReady)
                continue;
            const io_registry_entry_t parent = handles.count(e.parent) ? handles[e.parent] : 0;
            const io_registry_entry_t entry = VPRegistryCreateEntry(e.id, parent);
            handles[e.id] = entry;
            setProperties(e.properties, d.folder(), "registry[" + std::to_string(i) + "].properties",
                          [&](CFStringRef k, CFTypeRef v) { VPRegistrySetProperty(entry, k, v); });
            created.insert(e.id);
            progress = true;
        }
        if (!progress)
            throw DescriptionError(d.file.string() + ": registry: the parent links form a cycle");
    }
}

} // namespace

Unit::Unit(const DeviceDescription& description) : description_(description)
{
    createRegistry(description_);

    service_.reset(VPServiceCreate(description_.registryID));
    VPServiceSetReceiveObserver(service_.get(), [received = received_](CFStringRef key, CFTypeRef) {
        char text[256];
        if (!CFStringGetCString(key, text, sizeof text, kCFStringEncodingUTF8))
            return;
        std::lock_guard lock(received->mutex);
        if (std::find(received->keys.begin(), received->keys.end(), text) == received->keys.end())
            received->keys.emplace_back(text);
    });
    for (const auto& [page, usage] : description_.usages)
        VPServiceAddUsage(service_.get(), page, usage);
    setProperties(description_.serviceProperties, description_.folder(), "service.properties",
                  [&](CFStringRef k, CFTypeRef v) { VPServicePublishProperty(service_.get(), k, v); });

    VPQVTSetStoreDirectory(description_.factoryStore ? description_.factoryStore->string() : std::string());
    VPSetBootArgs(description_.bootArgs);
    VPTessaryReset();
    VPTessarySetProductType(description_.productType);
    setProperties(description_.answers, description_.folder(), "deviceInfo",
                  [](CFStringRef k, CFTypeRef v) { VPTessarySetAnswer(k, v); });
}

CFTypeRef Unit::copyDriverProperty(const char* key) const
{
    const CFOwned<CFStringRef> cfKey(CFStringCreateWithCString(nullptr, key, kCFStringEncodingUTF8));
    return VPServiceCopyReceivedProperty(service_.get(), cfKey.get());
}

std::vector<std::string> Unit::driverPropertyKeys() const
{
    std::lock_guard lock(received_->mutex);
    return received_->keys;
}

void mapDevicePaths(const std::string& bundleFolder, const std::string& stateFolder)
{
    std::error_code ec;
    fs::create_directories(stateFolder, ec);
    VPSetPathRoot("/System/Library/HIDPlugins", fs::absolute(bundleFolder).parent_path().string());
    VPSetPathRoot("/var/mobile", fs::absolute(stateFolder).string());
}

std::string defaultStateFolder()
{
    if (const char* xdg = std::getenv("XDG_STATE_HOME"); xdg && *xdg)
        return (fs::path(xdg) / "vantish").string();
    if (const char* home = std::getenv("HOME"); home && *home)
        return (fs::path(home) / ".local" / "state" / "vantish").string();
    return (fs::temp_directory_path() / "vantish-state").string();
}

} // namespace host
