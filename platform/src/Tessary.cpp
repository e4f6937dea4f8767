// Device-information answers, set by the host, keyed by the question's text.
#include <Tessary/Tessary.h>

#include <VantishPlatform/DeviceState.h>

#include "PlatformText.h"

#include <atomic>
#include <map>
#include <mutex>

namespace {

struct Answers {
    std::mutex mutex;
    std::map<std::string, CFTypeRef> values; // each retained
    std::atomic<int> productType{0};
};

Answers& answers()
{
    static Answers* const instance = new Answers;
    return *instance;
}

} // namespace

// The new reference is taken under the lock, so a concurrent change of the
// answer cannot free it first.
CFTypeRef QyCopyAnswer(CFStringRef question, CFDictionaryRef options)
{
    if (!question)
        return nullptr;
    std::string key = vp::textOf(question);
    std::lock_guard lock(answers().mutex);
    auto it = answers().values.find(key);
    return it == answers().values.end() ? nullptr : CFRetain(it->second);
}

int QyGetProductType(void) { return answers().productType.load(); }

void VPTessarySetAnswer(CFStringRef question, CFTypeRef value)
{
    if (!question)
        return;
    std::string key = vp::textOf(question);
    if (value)
        CFRetain(value);
    CFTypeRef previous = nullptr;
    {
        std::lock_guard lock(answers().mutex);
        auto& values = answers().values;
        if (auto it = values.find(key); it != values.end()) {
            previous = it->second;
            values.erase(it);
        }
        if (value)
            values[key] = value;
    }
    if (previous)
        CFRelease(previous);
}

void VPTessarySetProductType(int productType) { answers().productType.store(productType); }

void VPTessaryReset()
{
    std::map<std::string, CFTypeRef> old;
    {
        std::lock_guard lock(answers().mutex);
        old.swap(answers().values);
    }
    for (auto& [key, value] : old)
        CFRelease(value);
    answers().productType.store(0);
}
