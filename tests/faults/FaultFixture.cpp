#include "faults/FaultFixture.h"

#include "lightdb/LDBM.h"

#include <VantishPlatform/DeviceState.h>
#include <VantishPlatform/DispatchControl.h>
#include <VantishPlatform/HIDHost.h>
#include <VantishPlatform/Paths.h>

#include <mutex>

namespace faults {
namespace {

constexpr uint64_t kRegistryID = 0x7A0;

std::mutex hookMutex;
std::function<void(sqlite3*)> hookAction;

int onConnectionOpened(sqlite3* db, char**, const sqlite3_api_routines*)
{
    if (sqlite3_db_readonly(db, "main") != 0)
        return SQLITE_OK;
    std::function<void(sqlite3*)> action;
    {
        std::lock_guard lock(hookMutex);
        action = hookAction;
    }
    if (action)
        action(db);
    return SQLITE_OK;
}

void (*const kEntryPoint)() = reinterpret_cast<void (*)()>(&onConnectionOpened);

CFNumberRef intNumber(int value) { return CFNumberCreate(nullptr, kCFNumberIntType, &value); }

void publish(IOHIDServiceRef service, CFStringRef key, CFTypeRef value)
{
    VPServicePublishProperty(service, key, value);
    CFRelease(value);
}

} // namespace

WriterHook::WriterHook(std::function<void(sqlite3*)> action)
{
    {
        std::lock_guard lock(hookMutex);
        hookAction = std::move(action);
    }
    sqlite3_auto_extension(kEntryPoint);
}

WriterHook::~WriterHook()
{
    sqlite3_cancel_auto_extension(kEntryPoint);
    std::lock_guard lock(hookMutex);
    hookAction = nullptr;
}

StatementHook::StatementHook(std::string sqlPrefix, std::function<void()> action)
    : state_(std::make_shared<State>(State{std::move(sqlPrefix), std::move(action)})),
      hook_([state = state_](sqlite3* db) {
          auto onStatement = [](unsigned, void* context, void*, void* sql) {
              auto& s = *static_cast<State*>(context);
              if (!s.done && std::string(static_cast<const char*>(sql)).rfind(s.prefix, 0) == 0) {
                  s.done = true;
                  s.action();
              }
              return 0;
          };
          sqlite3_trace_v2(db, SQLITE_TRACE_STMT, onStatement, state.get());
      })
{
}

FaultTest::MemoryTemporaryFolder::MemoryTemporaryFolder() { unit::preferMemoryTemporaryFolder(); }

void FaultTest::SetUp()
{
    VPSetPathRoot("/System/Library/HIDPlugins", system_.str());
    VPSetPathRoot("/var/mobile", state_.str());
    unit::writeReferences(system_.path() / "Vantish.plugin");
    unit::writeFile(storeRecord(), unit::xwclRecord());
    VPQVTSetStoreDirectory(store_.str());

    VPRegistryReset();
    const io_registry_entry_t entry = VPRegistryCreateEntry(kRegistryID, 0);
    CFDataRef blob = unit::calibrationBlob(1).createData();
    VPRegistrySetProperty(entry, CFSTR("alsCalibration"), blob);
    CFRelease(blob);

    service_ = VPServiceCreate(kRegistryID);
    publish(service_, CFSTR("NumberOfChannels"), intNumber(unit::kChannels));
    publish(service_, CFSTR("ALSSensorType"), intNumber(eALSSensorType4ChannelA));
}

void FaultTest::TearDown()
{
    VPDispatchFireDelayed();
    VPDispatchDrain();
    releasePlugIn();
    CFRelease(service_);
    VPDispatchSetDelayMode(VPDelayMode::Real);
    VPQVTSetStoreDirectory("");
    VPQVTSetFailure("XwCA", 0);
    VPQVTSetFailure("XwCl", 0);
    VPTessaryReset();
    VPRegistryReset();
    VPClearPathRoots();
}

void FaultTest::open(Source source)
{
    releasePlugIn();
    VPServicePublishProperty(service_, CFSTR("SysConfigCalibration"),
                             source == Source::Configuration ? kCFBooleanTrue : kCFBooleanFalse);
    plugin_.emplace();
    (*plugin_)->open(service_, 0);
    VPDispatchDrain();
}

void FaultTest::releasePlugIn()
{
    plugin_.reset();
    VPDispatchDrain();
}

void FaultTest::rebuild(Source source)
{
    VPServicePublishProperty(service_, CFSTR("SysConfigCalibration"),
                             source == Source::Configuration ? kCFBooleanTrue : kCFBooleanFalse);
    (*plugin_)->setPropertyForClient(CFSTR("RebuildVelderDB"), kCFBooleanTrue, nullptr);
    VPDispatchDrain();
}

std::optional<unit::Chromaticity> FaultTest::colour()
{
    const vt::Event event = unit::createEvent(unit::countsUnder(550.0));
    (*plugin_)->filter(event.get(), false);
    return unit::colourOf(event.get()).chromaticity();
}

bool FaultTest::colourFrom(const unit::Reference& reference)
{
    const auto c = colour();
    return c && unit::distance(*c, reference.chromaticity()) < 1e-4;
}

bool FaultTest::cacheValidFor(const unit::Reference& r, float smallVersion)
{
    const BigDBType type = std::string(r.file) == unit::kSecondReference.file ? BigDBType02 : BigDBTypeDefault;
    LDBMInfo info;
    bool valid = false;
    if (LDBMInitialize(1, &info, &valid, type, smallVersion) != LDBMResult::Ok || !valid)
        return false;
    std::vector<float> xyz(3 * size_t(info.sources)), responses(unit::kChannels * size_t(info.sources));
    if (LDBMParseSmallDB(1, &info, xyz.data(), responses.data(), int(unit::kChannels)) != LDBMResult::Ok)
        return false;
    return xyz[0] == r.xyz[0] && xyz[size_t(info.sources)] == r.xyz[1];
}

void FaultTest::blockCacheFolder()
{
    std::filesystem::create_directories(cacheFolder().parent_path());
    std::filesystem::remove_all(cacheFolder());
    unit::writeFile(cacheFolder(), {'x'});
}

int FaultTest::crgb()
{
    CFTypeRef value = VPServiceCopyReceivedProperty(service_, CFSTR("crgb"));
    if (!value)
        return -1;
    int out = -2;
    CFNumberGetValue(static_cast<CFNumberRef>(value), kCFNumberIntType, &out);
    CFRelease(value);
    return out;
}

int FaultTest::receivedRecordSource()
{
    CFTypeRef value = VPServiceCopyReceivedProperty(service_, CFSTR("ALSCalibrationData"));
    if (!value)
        return -1;
    const auto* data = static_cast<CFDataRef>(value);
    const int source = CFDataGetLength(data) > 1 ? CFDataGetBytePtr(data)[1] : -2;
    CFRelease(value);
    return source;
}

size_t FaultTest::loggedStartingWith(const std::string& start)
{
    size_t n = 0;
    for (const auto& line : log_.lines())
        n += line.message.rfind(start, 0) == 0;
    return n;
}

} // namespace faults
