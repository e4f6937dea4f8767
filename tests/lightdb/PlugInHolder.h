// A plug-in instance made by the factory, released with the holder.
#pragma once

#include "plugin/VantishPlugIn.h"

namespace ldbtest {

class PlugInHolder {
public:
    PlugInHolder() : p_(static_cast<VantishPlugIn*>(VantishPlugInFactory(nullptr, kIOHIDServiceFilterPlugInTypeID))) {}
    ~PlugInHolder() { p_->Release(); }
    PlugInHolder(const PlugInHolder&) = delete;
    PlugInHolder& operator=(const PlugInHolder&) = delete;
    VantishPlugIn* operator->() const { return p_; }
    VantishPlugIn& operator*() const { return *p_; }

private:
    VantishPlugIn* p_;
};

} // namespace ldbtest
