#include "stress/Host.h"

#include "common/PlugInHolder.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/HIDHost.h>

#include <algorithm>
#include <cmath>
#include <cstdio>

namespace stress {
namespace {

// How far a colour may lie from the chromaticity of its database. The fit
// reproduces it to float rounding; a blend of two databases lies far off.
constexpr double kTolerance = 1e-4;
constexpr size_t kFaultsKept = 10;
constexpr unsigned kPropertyInterval = 64; // events between two client properties
constexpr unsigned kCopyInterval = 4;      // events between two copies

constexpr unit::Chromaticity kOverride{0.3127, 0.3290};
constexpr double kOverrideLuminance = 150.0;

CFNumberRef intNumber(int value) { return CFNumberCreate(nullptr, kCFNumberIntType, &value); }
CFNumberRef floatNumber(float value) { return CFNumberCreate(nullptr, kCFNumberFloatType, &value); }
CFNumberRef doubleNumber(double value) { return CFNumberCreate(nullptr, kCFNumberDoubleType, &value); }

CFArrayRef numberArray(const std::vector<CFNumberRef>& numbers)
{
    CFArrayRef array = CFArrayCreate(nullptr, reinterpret_cast<const void**>(const_cast<CFNumberRef*>(numbers.data())),
                                     CFIndex(numbers.size()), &kCFTypeArrayCallBacks);
    for (CFNumberRef n : numbers)
        CFRelease(n);
    return array;
}

CFStringRef key(const char* text) { return CFStringCreateWithCString(nullptr, text, kCFStringEncodingUTF8); }

void publish(IOHIDServiceRef service, const char* name, CFTypeRef value)
{
    CFStringRef k = key(name);
    VPServicePublishProperty(service, k, value);
    CFRelease(k);
    if (value && value != kCFBooleanTrue && value != kCFBooleanFalse)
        CFRelease(value);
}

std::string describe(const unit::EventColour& colour)
{
    char text[160];
    std::snprintf(text, sizeof text, "colour space %ld, XYZ %.6g %.6g %.6g", colour.colourSpace, colour.xyz[0],
                  colour.xyz[1], colour.xyz[2]);
    return text;
}

} // namespace

Plan Plan::scaled(double scale)
{
    Plan plan;
    auto at = [scale](unsigned full, unsigned least) { return std::max(least, unsigned(std::lround(full * scale))); };
    plan.lifetimesPerHost = at(plan.lifetimesPerHost, 3);
    plan.eventsPerLifetime = at(plan.eventsPerLifetime, 120);
    return plan;
}

StoreSwitch::StoreSwitch(std::string directory) : directory_(std::move(directory))
{
    VPQVTSetStoreDirectory(directory_);
}

void StoreSwitch::empty()
{
    std::lock_guard lock(mutex_);
    if (emptyRequests_++ == 0)
        VPQVTSetStoreDirectory("");
}

void StoreSwitch::refill()
{
    std::lock_guard lock(mutex_);
    if (--emptyRequests_ == 0)
        VPQVTSetStoreDirectory(directory_);
}

void Tally::add(const Tally& other)
{
    events += other.events;
    copies += other.copies;
    rebuilds += other.rebuilds;
    lifetimes += other.lifetimes;
    releasedWithWorkQueued += other.releasedWithWorkQueued;
    fromDefault += other.fromDefault;
    fromSecond += other.fromSecond;
    overridden += other.overridden;
    withoutColour += other.withoutColour;
    faultCount += other.faultCount;
    largestDeviation = std::max(largestDeviation, other.largestDeviation);
    for (const auto& f : other.faults)
        if (faults.size() < kFaultsKept)
            faults.push_back(f);
}

Host::Host(unsigned index, const Plan& plan, StoreSwitch& store)
    : index_(index), plan_(plan), store_(store), counts_(unit::countsUnder(520.0 + 40.0 * index))
{
}

// Lifetimes take turns: calibrated from the registry (its cache written by a
// queued task), from the factory store, and from a store that is empty at
// open (bring-up falls back to the default and the store is retried; the
// retries wait until the firing thread lets them run). The store comes back
// while the instance is in use, or only after the host has let go of it.
// Every lifetime is followed by a brief one, released as soon as it is open.
void Host::run()
{
    for (unsigned n = 0; n < plan_.lifetimesPerHost; ++n) {
        lifetime(n, plan_.eventsPerLifetime, plan_.rebuildsPerLifetime);
        lifetime(n + 1, plan_.briefEvents, 0);
    }
}

void Host::lifetime(unsigned number, unsigned events, unsigned rebuilds)
{
    const Kind kind = Kind((number + index_) % 3);
    IOHIDServiceRef service = VPServiceCreate(registryID(index_));
    publish(service, "NumberOfChannels", intNumber(unit::kChannels));
    publish(service, "ALSSensorType", intNumber(eALSSensorType4ChannelA));
    if (number % 2)
        publish(service, "color-algo-lambda", floatNumber(0.05f)); // normalised databases
    bool configuration = kind == Kind::Configuration;
    if (configuration)
        publish(service, number % 4 < 2 ? "SysConfigCalibration" : "ALSCalibrationSpectrumToProcess", kCFBooleanTrue);
    bool storeEmpty = kind == Kind::FactoryStoreLate;
    const unsigned refillAt = number % 2 ? events : events / 4;
    if (storeEmpty)
        store_.empty();

    plugin_ = vt::createPlugIn();
    table_ = *static_cast<IOHIDServiceFilterPlugInInterface**>(plugin_);
    table_->open(plugin_, service, 0);
    overrideOn_ = false;

    // The first rebuild comes right after open, against bring-up on its queue.
    auto rebuildDue = [&](unsigned e) {
        for (unsigned r = 0; r < rebuilds; ++r)
            if (e == (r == 0 ? 1 : r * events / rebuilds))
                return true;
        return false;
    };
    for (unsigned e = 0; e < events; ++e) {
        if (storeEmpty && e == refillAt) {
            store_.refill();
            storeEmpty = false;
        }
        if (rebuildDue(e)) {
            configuration = !configuration;
            rebuild(service, configuration);
        }
        if (e % kPropertyInterval == 0)
            changeProperty(e / kPropertyInterval + number);
        filterOne();
        if (e % kCopyInterval == 0)
            copyOne();
    }

    // The host lets go of the instance and the service; queued work may still
    // hold the instance and run afterwards.
    if (table_->Release(plugin_) > 0)
        ++tally_.releasedWithWorkQueued;
    CFRelease(service);
    if (storeEmpty)
        store_.refill();
    ++tally_.lifetimes;
}

void Host::setProperty(const char* name, CFTypeRef value)
{
    CFStringRef k = key(name);
    table_->setPropertyForClient(plugin_, k, value, nullptr);
    CFRelease(k);
    CFRelease(value);
}

void Host::changeProperty(unsigned step)
{
    switch (step % 8) {
    case 0:
        setProperty("ColorAlgoLambda", floatNumber(0.0f));
        break;
    case 1:
        setProperty("ColorAlgoLambda", floatNumber(0.05f));
        break;
    case 2: {
        std::vector<CFNumberRef> channels;
        for (float c : counts_)
            channels.push_back(intNumber(int(1.5f * c)));
        setProperty("RGBCOverride", numberArray(channels));
        break;
    }
    case 3:
        setProperty("RGBCOverride", intNumber(0));
        break;
    case 4:
        setProperty("ChromaticityOverride", numberArray({doubleNumber(kOverride.x), doubleNumber(kOverride.y),
                                                         doubleNumber(kOverrideLuminance)}));
        overrideOn_ = true;
        break;
    case 5:
        setProperty("ChromaticityOverride", intNumber(0));
        overrideOn_ = false;
        break;
    case 6:
        setProperty("ChannelRatioMitigationType", intNumber(2));
        break;
    case 7:
        setProperty("ColorAlgoLambda", floatNumber(1.0f));
        break;
    }
}

// Alternates between the registry calibration (the default reference) and
// the factory record (the second reference).
void Host::rebuild(IOHIDServiceRef service, bool configuration)
{
    publish(service, "SysConfigCalibration", configuration ? kCFBooleanTrue : kCFBooleanFalse);
    CFStringRef k = key("RebuildVelderDB");
    table_->setPropertyForClient(plugin_, k, kCFBooleanTrue, nullptr);
    CFRelease(k);
    ++tally_.rebuilds;
}

void Host::filterOne()
{
    const vt::Event event = unit::createEvent(counts_);
    table_->filter(plugin_, event.get());
    check(unit::colourOf(event.get()), overrideOn_ ? Expect::Override : Expect::DatabaseOrNone, false);
    ++tally_.events;
}

// A copied event gets the last colour; the override applies once colour is on.
void Host::copyOne()
{
    const vt::Event event = vt::createALSEvent(nullptr);
    table_->filterCopyEvent(plugin_, event.get());
    check(unit::colourOf(event.get()), overrideOn_ ? Expect::OverrideOrNone : Expect::DatabaseOrNone, true);
    ++tally_.copies;
}

void Host::check(const unit::EventColour& colour, Expect expect, bool copy)
{
    const std::string what = copy ? "copied" : "filtered";
    const auto xy = colour.chromaticity();
    if (!xy) {
        // No colour: an event the filter left alone, or a copy before the
        // first colour. A filtered event with a colour space but no colour is
        // neither.
        const bool untouched = colour.colourSpace == 0 || copy;
        if (expect == Expect::Override || !untouched)
            fault(what + " event without the colour expected: " + describe(colour));
        ++tally_.withoutColour;
        return;
    }
    const double toOverride = unit::distance(*xy, kOverride);
    if (expect != Expect::DatabaseOrNone) {
        if (toOverride > kTolerance || std::fabs(colour.xyz[1] - kOverrideLuminance) > 1e-3)
            fault(what + " event without the override: " + describe(colour));
        ++tally_.overridden;
        return;
    }
    const double toDefault = unit::distance(*xy, unit::kDefaultReference.chromaticity());
    const double toSecond = unit::distance(*xy, unit::kSecondReference.chromaticity());
    const double nearest = std::min(toDefault, toSecond);
    if (nearest > kTolerance || std::fabs(colour.xyz[1] / unit::kLux - 1.0) > 1e-4) {
        fault(what + " event with a colour of no whole database: " + describe(colour));
        return;
    }
    tally_.largestDeviation = std::max(tally_.largestDeviation, nearest);
    ++(toDefault < toSecond ? tally_.fromDefault : tally_.fromSecond);
}

void Host::fault(const std::string& text)
{
    if (tally_.faultCount++ < kFaultsKept)
        tally_.faults.push_back("host " + std::to_string(index_) + ": " + text);
}

} // namespace stress
