// Registry calibration up to the driver: blob checks, the entry for the
// plug-in's orientation, and the 145- and 193-byte records set on the service.
#include "SysConfigFixture.h"

#include <gtest/gtest.h>

using namespace sctest;

namespace {

using RegistryCalibration = SysConfigTest;

TEST_F(RegistryCalibration, NeedsARegistryEntryAndDataBlob)
{
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), false, true, true)); // nothing published
    int64_t notData = 7;
    publishValue("alsCalibration", CFNumberCreate(nullptr, kCFNumberSInt64Type, &notData));
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), false, true, true));

    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    IOObjectRelease(parts(*plugin_).registryEntry());
    parts(*plugin_).registryEntry() = 0;
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), false, true, true));
    EXPECT_EQ(VPServiceReceivedCount(service_, CFSTR("ALSCalibrationData")), 0u);
}

TEST_F(RegistryCalibration, RejectsBadHeaders)
{
    const Bytes whole = blob({GenericEntry{}.bytes()});
    const std::string size = std::to_string(whole.size()), oneMore = std::to_string(whole.size() + 1);
    const std::pair<Bytes, std::string> cases[] = {
        {Bytes(7).u8(1, 1), "Need at least header size bytes. Actual: 7, Expected: 8\n"},
        {blob({GenericEntry{}.bytes()}, 0, 2), "unsupported calibration version: 2\n"},
        {blob({GenericEntry{}.bytes()}, 0, 1, uint16_t(whole.size() + 1)),
         "Insufficient calibration data size. Actual: " + size + ", Expected: " + oneMore + "\n"},
    };
    for (const auto& [bytes, error] : cases) {
        vt::LogCapture log;
        publish("alsCalibration", bytes);
        EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, true)) << error;
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, error));
    }
    EXPECT_EQ(VPServiceReceivedCount(service_, CFSTR("ALSCalibrationData")), 0u);
}

TEST_F(RegistryCalibration, GenericRecordFromTheEntry)
{
    vt::LogCapture log;
    const Bytes b = blob({GenericEntry{}.bytes()});
    publish("alsCalibration", b);
    parts(*plugin_).unit().colorAlgoOverride = 5; // beats the entry's algorithm 3
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, false));
    EXPECT_EQ(parts(*plugin_).unit().algoVersion.load(), 5);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO,
                             "supported calibration version 1,0 with size " + std::to_string(b.size()) + "\n"));
    EXPECT_TRUE(
        log.contains(OS_LOG_TYPE_INFO, "Found calibration for orientation = 1, senzorType = 2, chipType = 0 \n"));

    const auto r = receivedRecord();
    ASSERT_EQ(r.size(), 145u);
    EXPECT_EQ(r[0], 1);
    EXPECT_EQ(u32At(r, 1), 1u); // configuration-supplied
    EXPECT_EQ(u32At(r, 5), 0u); // chip type
    EXPECT_EQ(r[9], 1);         // entry count
    EXPECT_EQ(u16At(r, 10), 145);
    EXPECT_EQ(u16At(r, 12), 0x8000); // 0x200 / 256 = 2.0 in Q2.14
    EXPECT_EQ(u16At(r, 14), 250);
    EXPECT_EQ(u16At(r, 16), 100);
    EXPECT_EQ(u16At(r, 18), 99);
    EXPECT_EQ(r[20], 9);
    EXPECT_EQ(r[21], 8);
    EXPECT_EQ(r[22], 7);
    EXPECT_EQ(r[23], 4);
    EXPECT_EQ(r[24], 9);
    for (size_t k = 0; k < 4; ++k)
        EXPECT_EQ(i32At(r, 25 + 4 * k), 65536) << k;
    EXPECT_EQ(u32At(r, 41), 0x12340000u);
    EXPECT_EQ(u32At(r, 45), 0xABCD0000u);
    for (size_t c = 0; c < 4; ++c) {
        const size_t o = 49 + 24 * c;
        EXPECT_EQ(r[o], 3 + c);
        EXPECT_EQ(u16At(r, o + 1), 384); // 1.500 (1.501, ...) x 256, truncated
        EXPECT_EQ(u16At(r, o + 3), 0);
        EXPECT_EQ(r[o + 5], 7);
        for (size_t k = 0; k < 9; ++k)
            EXPECT_EQ(u16At(r, o + 6 + 2 * k), 16384 + 4096 * k) << c << "," << k;
    }
    EXPECT_EQ(parts(*plugin_).unit().numberOfChannels.load(), 4u);
    EXPECT_EQ(parts(*plugin_).unit().dbChannelCount.load(), 4u);
}

TEST_F(RegistryCalibration, EightGainsLayBlocksTwentyBytesApart)
{
    GenericEntry entry;
    entry.nGains = 8;
    entry.nChannels = 3;
    entry.weights[0] = 250000;
    entry.weights[1] = -500000;
    entry.weights[2] = 1500000;
    entry.weights[3] = 2000000;
    Bytes e = entry.bytes();
    ASSERT_EQ(entry.spectrumOffset(), 24u + 20 * 3);
    publish("alsCalibration", blob({e}));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, false));

    const auto r = receivedRecord();
    ASSERT_EQ(r.size(), 145u);
    EXPECT_EQ(r[23], 3);
    EXPECT_EQ(r[24], 8);
    EXPECT_EQ(i32At(r, 25), 16384);
    EXPECT_EQ(i32At(r, 29), -32768);
    EXPECT_EQ(i32At(r, 33), 98304);
    EXPECT_EQ(i32At(r, 37), 131072);
    for (size_t c = 0; c < 3; ++c) {
        EXPECT_EQ(r[49 + 24 * c], 3 + c);
        EXPECT_EQ(u16At(r, 49 + 24 * c + 6 + 2 * 7), 16384 + 4096 * 7);
        EXPECT_EQ(u16At(r, 49 + 24 * c + 6 + 2 * 8), 0); // no ninth gain
    }
    for (size_t o = 49 + 24 * 3; o < 145; ++o)
        EXPECT_EQ(r[o], 0) << o; // the unused fourth block
    EXPECT_EQ(parts(*plugin_).unit().numberOfChannels.load(), 3u);

    // With four channels the spectrum block starts at 104, the lux words at 108.
    GenericEntry four;
    four.nGains = 8;
    four.weights[0] = 3000000;
    ASSERT_EQ(four.spectrumOffset(), 104u);
    publish("alsCalibration", blob({four.bytes()}));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, false));
    EXPECT_EQ(i32At(receivedRecord(), 25), 196608);
}

TEST_F(RegistryCalibration, TheEntryForThePlugInsOrientationIsUsed)
{
    vt::LogCapture log;
    GenericEntry first, second;
    second.orientation = 3;
    second.sensorType = 1;
    second.words[1] = 4321;
    publish("alsCalibration", blob({first.bytes(), second.bytes()}));
    parts(*plugin_).unit().orientation = 3;
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, false));
    EXPECT_TRUE(log.contains("Found calibration for orientation = 3, senzorType = 1, chipType = 0 \n"));
    const auto r = receivedRecord();
    ASSERT_EQ(r.size(), 145u);
    EXPECT_EQ(r[9], 2);
    EXPECT_EQ(u16At(r, 14), 4321);
}

TEST_F(RegistryCalibration, NoEntryForTheOrientationDoesNothing)
{
    vt::LogCapture log;
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    parts(*plugin_).unit().orientation = 2;
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, true));
    EXPECT_EQ(VPServiceReceivedCount(service_, CFSTR("ALSCalibrationData")), 0u);
    EXPECT_FALSE(anyLineContaining(log, "nSources"));
    EXPECT_EQ(parts(*plugin_).databases().snapshot().db, nullptr);
}

TEST_F(RegistryCalibration, RefusedRecordSkipsTheDatabase)
{
    vt::LogCapture log;
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    VPServiceRefuseProperty(service_, CFSTR("ALSCalibrationData"), true);
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), false, true, true));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Failed to set ALS calibration data."));
    EXPECT_FALSE(anyLineContaining(log, "nSources"));
    EXPECT_EQ(parts(*plugin_).databases().snapshot().db, nullptr);
}

TEST_F(RegistryCalibration, HostileGenericEntriesAreRejected)
{
    auto expectRejected = [&](const Bytes& b, const std::string& errorPart) {
        vt::LogCapture log;
        publish("alsCalibration", b);
        EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), false, true, true)) << errorPart;
        EXPECT_TRUE(anyLineContaining(log, errorPart, OS_LOG_TYPE_ERROR)) << errorPart;
    };
    GenericEntry tooManyChannels;
    tooManyChannels.nChannels = 5;
    expectRejected(blob({tooManyChannels.bytes()}), "declares 5 channels and 9 gains");
    GenericEntry tooManyGains;
    tooManyGains.nGains = 10;
    expectRejected(blob({tooManyGains.bytes()}), "declares 4 channels and 10 gains");

    // The entry claims its natural size but the blob stops inside the spectrum block.
    Bytes truncated = blob({GenericEntry{}.bytes()});
    truncated.resize(truncated.size() - 100);
    truncated.u16(4, uint16_t(truncated.size()));
    expectRejected(truncated, "3348 bytes run past the end of the data (3256 bytes)");
    // Or the entry says it is smaller than its spectrum block.
    GenericEntry shortEntry;
    shortEntry.entrySize = 200;
    Bytes shortBlob = blob({shortEntry.bytes()});
    shortBlob.resize(8 + 200);
    shortBlob.u16(4, uint16_t(shortBlob.size()));
    expectRejected(shortBlob, "too short for its channel blocks and spectrum block");

    GenericEntry zero;
    zero.entrySize = 0;
    zero.orientation = 2;
    expectRejected(blob({zero.bytes(), GenericEntry{}.bytes()}), "entry size 0 is smaller than its subheader");
    EXPECT_EQ(VPServiceReceivedCount(service_, CFSTR("ALSCalibrationData")), 0u);
}

TEST_F(RegistryCalibration, OpenOnAServiceThatAsksForIt)
{
    VPServicePublishProperty(service_, CFSTR("SysConfigCalibration"), kCFBooleanTrue);
    publish("alsCalibration", blob({GenericEntry{}.bytes()}));
    plugin_->open(service_, 0);
    VPDispatchDrain(); // the calibration block, then the cache write it queued
    EXPECT_EQ(receivedRecord().size(), 145u);
    EXPECT_EQ(parts(*plugin_).unit().numberOfChannels.load(), 4u);
    EXPECT_TRUE(std::filesystem::exists(cacheFile()));
    EXPECT_TRUE(parts(*plugin_).databases().isReady());
}

TEST_F(RegistryCalibration, VD6286EntryMustHoldTheWholeLayout)
{
    VD6286Entry entry;
    entry.entrySize = 4155;
    {
        vt::LogCapture log;
        publish("alsCalibration", blob({entry.bytes()}));
        EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, true));
        EXPECT_TRUE(
            log.contains(OS_LOG_TYPE_ERROR, "Calibration data are smaller than ALSCalibrationDataVD6286 structure."));
        EXPECT_FALSE(log.contains("Algo version: 2 NSamples: 401\n")); // no spectrum read either
    }
    entry.entrySize = 4156;
    vt::LogCapture log;
    publish("alsCalibration", blob({entry.bytes()}));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, false));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "ALSCalibrationDataVD6286 size: 4156, calibration data 4156."));
    EXPECT_TRUE(log.contains("Found calibration for orientation = 1, senzorType = 5, chipType = 3 \n"));
}

TEST_F(RegistryCalibration, VD6286Record)
{
    publish("alsCalibration", blob({VD6286Entry{}.bytes()}));
    EXPECT_TRUE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, false));
    const auto r = receivedRecord();
    ASSERT_EQ(r.size(), 193u);
    EXPECT_EQ(r[0], 1);
    EXPECT_EQ(u32At(r, 1), 1u);
    EXPECT_EQ(u32At(r, 5), 0u);
    EXPECT_EQ(r[9], 1);
    EXPECT_EQ(u16At(r, 10), 193);
    EXPECT_EQ(u16At(r, 12), 0xC000); // 0x300 / 256 = 3.0 in Q2.14
    EXPECT_EQ(u16At(r, 14), 200);
    EXPECT_EQ(u16At(r, 16), 50);
    EXPECT_EQ(u16At(r, 18), 40);
    EXPECT_EQ(u16At(r, 20), 0);
    EXPECT_EQ(r[22], 4);
    EXPECT_EQ(r[23], 5);
    EXPECT_EQ(r[24], 6);
    EXPECT_EQ(r[25], 0);
    EXPECT_EQ(r[26], 5);
    EXPECT_EQ(r[27], 5);
    EXPECT_FLOAT_EQ(f32At(r, 28), 0.5f);
    EXPECT_FLOAT_EQ(f32At(r, 32), 1.0f);
    EXPECT_FLOAT_EQ(f32At(r, 48), -7.0f);
    EXPECT_FLOAT_EQ(f32At(r, 64), 19.0f);
    for (size_t c = 0; c < 5; ++c) {
        const size_t o = 68 + 25 * c;
        EXPECT_EQ(r[o], 10 + c);
        EXPECT_EQ(u16At(r, o + 1), c < 4 ? 512 : 513); // 2.000 .. 2.004 x 256, truncated
        EXPECT_EQ(u16At(r, o + 3), 0);
        EXPECT_EQ(u16At(r, o + 5), 200 + c); // zero-extended
        for (size_t k = 0; k < 4; ++k)
            EXPECT_EQ(u16At(r, o + 7 + 2 * k), 0x8000);
        for (size_t k = 0; k < 5; ++k)
            EXPECT_EQ(u16At(r, o + 15 + 2 * k), (512 + 32 * k) * 64) << c << "," << k;
    }
    EXPECT_EQ(parts(*plugin_).unit().numberOfChannels.load(), 5u);
    EXPECT_EQ(parts(*plugin_).unit().dbChannelCount.load(), 5u);
}

TEST_F(RegistryCalibration, VD6286CountsBeyondTheRecordAreRejected)
{
    for (auto [channels, gains] : {std::pair{6, 5}, std::pair{5, 6}}) {
        vt::LogCapture log;
        VD6286Entry entry;
        Bytes e = entry.bytes();
        e.u8(19, uint8_t(channels)).u8(20, uint8_t(gains));
        publish("alsCalibration", blob({e}));
        EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, false));
        EXPECT_TRUE(anyLineContaining(log, "the record holds at most 5 and 5"));
    }
    // An entry that says 4156 bytes in a blob that holds fewer.
    Bytes shortBlob = blob({VD6286Entry{}.bytes()});
    shortBlob.resize(shortBlob.size() - 1);
    shortBlob.u16(4, uint16_t(shortBlob.size()));
    vt::LogCapture log;
    publish("alsCalibration", shortBlob);
    EXPECT_FALSE(processSysConfigCalibration(parts(*plugin_).calibration(), true, true, false));
    EXPECT_TRUE(anyLineContaining(log, "4156 bytes run past the end of the data"));
    EXPECT_EQ(VPServiceReceivedCount(service_, CFSTR("ALSCalibrationData")), 0u);
}

} // namespace
