#include "common/PlugInHolder.h"

#include <IOKit/hid/IOHIDServiceFilterPlugIn.h>
#include <VantishPlatform/DispatchControl.h>

#include <cstdlib>

namespace vt {

VantishPlugIn* createPlugIn()
{
    auto* plugin =
        static_cast<VantishPlugIn*>(VantishPlugInFactory(kCFAllocatorDefault, kIOHIDServiceFilterPlugInTypeID));
    if (!plugin)
        std::abort();
    return plugin;
}

void runQueuedWork()
{
    do
        VPDispatchDrain();
    while (VPDispatchFireDelayed() != 0);
}

PlugIn::PlugIn(AtRelease atRelease) : p_(createPlugIn()), atRelease_(atRelease) {}

ULONG PlugIn::release()
{
    if (!p_)
        return 0;
    if (atRelease_ == AtRelease::RunQueuedWorkFirst)
        runQueuedWork();
    const ULONG left = p_->Release();
    p_ = nullptr;
    return left;
}

} // namespace vt
