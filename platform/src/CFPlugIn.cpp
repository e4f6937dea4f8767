// Plug-in instance counting: how many instances each factory has alive,
// keyed by the factory UUID's value.
#include "CFObject.h"
#include "UUIDBytes.h"

#include <VantishPlatform/DeviceState.h>

#include <map>
#include <mutex>

namespace {

class InstanceCounts {
public:
    void add(const vp::UUIDBytes& factory)
    {
        std::lock_guard lock(mutex_);
        ++counts_[factory];
    }

    // False when the factory has no live instance to remove.
    bool remove(const vp::UUIDBytes& factory)
    {
        std::lock_guard lock(mutex_);
        auto it = counts_.find(factory);
        if (it == counts_.end())
            return false;
        if (--it->second == 0)
            counts_.erase(it);
        return true;
    }

    long count(const vp::UUIDBytes& factory)
    {
        std::lock_guard lock(mutex_);
        auto it = counts_.find(factory);
        return it == counts_.end() ? 0 : it->second;
    }

private:
    std::mutex mutex_;
    std::map<vp::UUIDBytes, long> counts_;
};

InstanceCounts& instanceCounts()
{
    static auto* counts = new InstanceCounts;
    return *counts;
}

} // namespace

void CFPlugInAddInstanceForFactory(CFUUIDRef factoryID)
{
    instanceCounts().add(vp::uuidBytes(factoryID, "CFPlugInAddInstanceForFactory"));
}

// Removing more instances than were added means an instance was torn down twice.
void CFPlugInRemoveInstanceForFactory(CFUUIDRef factoryID)
{
    if (!instanceCounts().remove(vp::uuidBytes(factoryID, "CFPlugInRemoveInstanceForFactory")))
        vp::fatal("CFPlugInRemoveInstanceForFactory", "no live instance for this factory");
}

long VPPlugInInstanceCount(CFUUIDRef factoryID)
{
    return instanceCounts().count(vp::uuidBytes(factoryID, "VPPlugInInstanceCount"));
}
