// The I/O registry: entries with a registry ID, a parent and properties,
// addressed by handles. One lock guards the whole registry.
#include <IOKit/IOKitLib.h>
#include <VantishPlatform/HIDHost.h>

#include <cstring>
#include <map>
#include <mutex>

const mach_port_t kIOMainPortDefault = MACH_PORT_NULL;

namespace {

CFStringRef entryIDKey() { return CFSTR("IORegistryEntryID"); }

struct Entry {
    uint64_t id;
    io_registry_entry_t parent;
    CFMutableDictionaryRef properties;
    int outstanding = 0;
};

class Registry {
public:
    io_registry_entry_t create(uint64_t id, io_registry_entry_t parent)
    {
        std::lock_guard lock(mutex_);
        if ((parent && !entries_.count(parent)) || find(id))
            return IO_OBJECT_NULL;
        // Handles keep counting across resets, so a stale handle never names a new entry.
        io_registry_entry_t handle = nextHandle_++;
        entries_[handle] = Entry{id, parent, newDictionary()};
        return handle;
    }

    void setProperty(io_registry_entry_t handle, CFStringRef key, CFTypeRef value)
    {
        std::lock_guard lock(mutex_);
        Entry* entry = at(handle);
        if (!entry || !key)
            return;
        if (value)
            CFDictionarySetValue(entry->properties, key, value);
        else
            CFDictionaryRemoveValue(entry->properties, key);
    }

    // Retained, or null. With `throughParents` the nearest ancestor holding
    // the key answers when the entry itself does not.
    CFTypeRef copyProperty(io_registry_entry_t handle, CFStringRef key, bool throughParents)
    {
        std::lock_guard lock(mutex_);
        if (!key)
            return nullptr;
        for (Entry* entry = at(handle); entry; entry = throughParents ? at(entry->parent) : nullptr) {
            if (CFTypeRef value = CFDictionaryGetValue(entry->properties, key))
                return CFRetain(value);
        }
        return nullptr;
    }

    // Takes a reference on the entry with this registry ID; 0 when none.
    io_registry_entry_t match(uint64_t id)
    {
        std::lock_guard lock(mutex_);
        io_registry_entry_t handle = find(id);
        if (handle)
            ++entries_[handle].outstanding;
        return handle;
    }

    bool entryID(io_registry_entry_t handle, uint64_t& id)
    {
        std::lock_guard lock(mutex_);
        Entry* entry = at(handle);
        if (entry)
            id = entry->id;
        return entry;
    }

    bool retain(io_registry_entry_t handle)
    {
        std::lock_guard lock(mutex_);
        Entry* entry = at(handle);
        if (entry)
            ++entry->outstanding;
        return entry;
    }

    // False for an unknown handle or one without a reference to give back.
    bool release(io_registry_entry_t handle)
    {
        std::lock_guard lock(mutex_);
        Entry* entry = at(handle);
        if (!entry || entry->outstanding == 0)
            return false;
        --entry->outstanding;
        return true;
    }

    int outstanding(io_registry_entry_t handle)
    {
        std::lock_guard lock(mutex_);
        Entry* entry = at(handle);
        return entry ? entry->outstanding : 0;
    }

    void reset()
    {
        std::lock_guard lock(mutex_);
        for (auto& [handle, entry] : entries_)
            CFRelease(entry.properties);
        entries_.clear();
    }

private:
    static CFMutableDictionaryRef newDictionary()
    {
        return CFDictionaryCreateMutable(kCFAllocatorDefault, 0, &kCFTypeDictionaryKeyCallBacks,
                                         &kCFTypeDictionaryValueCallBacks);
    }

    Entry* at(io_registry_entry_t handle)
    {
        auto it = entries_.find(handle);
        return it == entries_.end() ? nullptr : &it->second;
    }

    io_registry_entry_t find(uint64_t id) const
    {
        for (const auto& [handle, entry] : entries_)
            if (entry.id == id)
                return handle;
        return IO_OBJECT_NULL;
    }

    std::mutex mutex_;
    std::map<io_registry_entry_t, Entry> entries_;
    io_registry_entry_t nextHandle_ = 0x1000;
};

Registry& registry()
{
    static auto* instance = new Registry;
    return *instance;
}

// The service plane is the only one there is.
bool isServicePlane(const char* plane) { return plane && std::strcmp(plane, kIOServicePlane) == 0; }

} // namespace

CFMutableDictionaryRef IORegistryEntryIDMatching(uint64_t entryID)
{
    CFMutableDictionaryRef matching = CFDictionaryCreateMutable(kCFAllocatorDefault, 1, &kCFTypeDictionaryKeyCallBacks,
                                                                &kCFTypeDictionaryValueCallBacks);
    CFNumberRef id = CFNumberCreate(kCFAllocatorDefault, kCFNumberSInt64Type, &entryID);
    CFDictionarySetValue(matching, entryIDKey(), id);
    CFRelease(id);
    return matching;
}

io_service_t IOServiceGetMatchingService(mach_port_t, CFDictionaryRef matching)
{
    if (!matching)
        return IO_OBJECT_NULL;
    io_service_t service = IO_OBJECT_NULL;
    auto id = static_cast<CFNumberRef>(CFDictionaryGetValue(matching, entryIDKey()));
    uint64_t entryID = 0;
    if (id && CFGetTypeID(id) == CFNumberGetTypeID() && CFNumberGetValue(id, kCFNumberSInt64Type, &entryID))
        service = registry().match(entryID);
    CFRelease(matching);
    return service;
}

// Only a search that is both recursive and towards the parents leaves the
// entry; any other option set reads the entry's own property.
CFTypeRef IORegistryEntrySearchCFProperty(io_registry_entry_t entry, const char* plane, CFStringRef key, CFAllocatorRef,
                                          IOOptionBits options)
{
    if (!isServicePlane(plane))
        return nullptr;
    constexpr IOOptionBits towardsParents = kIORegistryIterateRecursively | kIORegistryIterateParents;
    return registry().copyProperty(entry, key, (options & towardsParents) == towardsParents);
}

CFTypeRef IORegistryEntryCreateCFProperty(io_registry_entry_t entry, CFStringRef key, CFAllocatorRef, IOOptionBits)
{
    return registry().copyProperty(entry, key, false);
}

kern_return_t IORegistryEntryGetRegistryEntryID(io_registry_entry_t entry, uint64_t* entryID)
{
    uint64_t id = 0;
    if (!entryID || !registry().entryID(entry, id))
        return KERN_INVALID_ARGUMENT;
    *entryID = id;
    return KERN_SUCCESS;
}

kern_return_t IOObjectRetain(io_object_t object)
{
    return registry().retain(object) ? KERN_SUCCESS : KERN_INVALID_ARGUMENT;
}

kern_return_t IOObjectRelease(io_object_t object)
{
    return registry().release(object) ? KERN_SUCCESS : KERN_INVALID_ARGUMENT;
}

io_registry_entry_t VPRegistryCreateEntry(uint64_t entryID, io_registry_entry_t parent)
{
    return registry().create(entryID, parent);
}

void VPRegistrySetProperty(io_registry_entry_t entry, CFStringRef key, CFTypeRef value)
{
    registry().setProperty(entry, key, value);
}

int VPRegistryOutstandingReferences(io_registry_entry_t entry) { return registry().outstanding(entry); }

void VPRegistryReset() { registry().reset(); }
