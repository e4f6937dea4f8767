// One event-system host thread of the stress test: it opens plug-in instances
// on its sensor one after another and, for each, filters and copies events at
// full speed and sets client properties (overrides, lambda, rebuilds) while
// the instance's calibration runs on the queues, then releases the instance
// with its work still queued.
#pragma once

#include "stress/SyntheticUnit.h"

#include <IOKit/IOKitLib.h>
#include <IOKit/hid/IOHIDServiceFilterPlugIn.h>

#include <cstdint>
#include <mutex>
#include <string>
#include <vector>

namespace stress {

// Sizes of a run, scaled by VANTISH_STRESS_SCALE (1 = the full run).
struct Plan {
    unsigned hosts = 2;
    unsigned lifetimesPerHost = 12;
    unsigned eventsPerLifetime = 4200;
    unsigned rebuildsPerLifetime = 3;
    unsigned briefEvents = 3; // a brief lifetime follows each full one, released as soon as it is open

    static Plan scaled(double scale);
    unsigned events() const { return hosts * lifetimesPerHost * (eventsPerLifetime + briefEvents); }
    unsigned rebuilds() const { return hosts * lifetimesPerHost * rebuildsPerLifetime; }
    unsigned lifetimes() const { return 2 * hosts * lifetimesPerHost; }
};

// The factory store, emptied while any host wants it empty.
class StoreSwitch {
public:
    explicit StoreSwitch(std::string directory);
    void empty();
    void refill();

private:
    std::mutex mutex_;
    std::string directory_;
    unsigned emptyRequests_ = 0;
};

// What a host saw. Colours are told apart by their chromaticity.
struct Tally {
    unsigned events = 0, copies = 0, rebuilds = 0, lifetimes = 0;
    unsigned releasedWithWorkQueued = 0; // the host's release was not the last
    unsigned fromDefault = 0, fromSecond = 0, overridden = 0, withoutColour = 0;
    double largestDeviation = 0.0;   // from the chromaticity of the database the colour was matched to
    unsigned faultCount = 0;         // colours from no whole database, or missing
    std::vector<std::string> faults; // the first few of them

    void add(const Tally& other);
};

class Host {
public:
    // Sensor `index` of the device: its registry entry carries orientation
    // index + 1 and a calibration blob for it.
    Host(unsigned index, const Plan& plan, StoreSwitch& store);
    void run();
    const Tally& tally() const { return tally_; }

    static uint64_t registryID(unsigned index) { return 0x5000 + index; }

private:
    enum class Kind { Configuration, Factory, FactoryStoreLate };
    enum class Expect { DatabaseOrNone, Override, OverrideOrNone };

    void lifetime(unsigned number, unsigned events, unsigned rebuilds);
    void setProperty(const char* key, CFTypeRef value);
    void changeProperty(unsigned step);
    void rebuild(IOHIDServiceRef service, bool configuration);
    void filterOne();
    void copyOne();
    void check(const unit::EventColour& colour, Expect expect, bool copy);
    void fault(const std::string& text);

    unsigned index_;
    Plan plan_;
    StoreSwitch& store_;
    Tally tally_;
    std::array<float, unit::kChannels> counts_;
    void* plugin_ = nullptr; // the instance's interface pointer
    IOHIDServiceFilterPlugInInterface* table_ = nullptr;
    bool overrideOn_ = false;
};

} // namespace stress
