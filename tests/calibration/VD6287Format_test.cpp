#include "CalibrationFixture.h"

namespace {

using ct::Bytes;
namespace v = ct::vd;

class VD6287FormatTest : public ct::CalibrationTest {
protected:
    // Parses `bytes` directly; the record on success (empty on failure).
    std::vector<uint8_t> parse(const Bytes& bytes, bool* ok = nullptr)
    {
        CFDataRef data = bytes.data();
        CFOwned<CFDataRef> record = parts(*plugin).calibration().processQVTCalibrationVD6287_XwClv3(data);
        if (ok)
            *ok = bool(record);
        CFRelease(data);
        return ct::takeBytes(record.release());
    }

    std::vector<uint8_t> convert(const Bytes& v1)
    {
        CFDataRef data = v1.data();
        std::vector<uint8_t> v3 = ct::takeBytes(parts(*plugin).calibration().convertSorvelXwClv1Tov3(data));
        CFRelease(data);
        return v3;
    }
};

// A version-1 record whose every byte differs from its neighbours, with the
// fields a valid version-3 record needs and `count` in both blobs.
Bytes versionOne(uint8_t count)
{
    Bytes b(10440);
    for (size_t i = 0; i < b.size(); ++i)
        b.u8(i, uint8_t(i * 7 + 3));
    b.u8(10, 2);
    for (unsigned k = 0; k < 2; ++k) {
        const size_t o = 80 + 5180 * k;
        b.u8(o, k).u8(o + 4, 5).u8(o + 5, 7).u8(o + 5055, count);
        b.i8(o + 137, -3).i8(o + 138, 127).i8(o + 139, -128);
    }
    return b;
}

// The version-3 record the conversion table gives for `v1`.
Bytes convertedByTable(const Bytes& v1)
{
    Bytes b(10348);
    auto copy = [&](size_t to, size_t from, size_t n) {
        for (size_t i = 0; i < n; ++i)
            b.u8(to + i, v1.at(from + i));
    };
    auto rd16 = [&](size_t at) { return unsigned(v1.at(at) | v1.at(at + 1) << 8); };
    copy(0, 0, 80);
    for (unsigned k = 0; k < 2; ++k) {
        const size_t f = 80 + 5180 * k;
        const size_t t = 80 + 5134 * k;
        copy(t, f, 7);
        b.u32(t + 7, 0xFFFFFFFF);
        copy(t + 11, f + 9, 6);
        copy(t + 17, f + 19, 4);
        copy(t + 21, f + 23, 108);
        for (unsigned m = 0; m < 6; ++m)
            b.i16(t + 129 + 2 * m, int8_t(v1.at(f + 137 + m)));
        copy(t + 141, f + 143, 95);
        copy(t + 238, f + 239, 4812);
        copy(t + 5050, f + 5051, 4);
        const uint8_t count = v1.at(f + 5055);
        const unsigned entries = count == 255 ? 0 : count + 1;
        b.u8(t + 5054, entries);
        b.u16(t + 5069, rd16(f + 5064));
        for (unsigned m = 0; m < 4; ++m) {
            b.u16(t + 5055 + 2 * (m + 1), rd16(f + 5056 + 2 * m));
            b.u16(t + 5069 + 2 * (m + 1), rd16(f + 5064 + 2 * m));
        }
        for (unsigned m = 0; m < entries; ++m) {
            b.u16(t + 5083 + 2 * m, rd16(f + 5073));
            b.u8(t + 5097 + m, v1.at(f + 5072));
            b.u16(t + 5104 + 2 * m, rd16(f + 5077));
            b.u16(t + 5118 + 2 * m, rd16(f + 5075));
        }
        b.u8(t + 5132, v1.at(f + 5079));
    }
    return b;
}

Bytes expectedDriverRecord(uint8_t entries, bool unitRatios)
{
    Bytes b(776);
    for (unsigned k = 0; k < 2; ++k) {
        const size_t h = 388 * k;
        b.u8(h, 5).u8(h + 2, v::gainIndex(k) + 2).u32(h + 4, v::blobWord(k));
        b.f32(h + 8, float(v::valueA(k) / 100.0)).f32(h + 12, float(v::valueB(k) / 16384.0));
        for (unsigned j = 0; j < 5; ++j) {
            float t = 4.0f;
            b.f32(h + 16 + 40 * j, 1.0f).f32(h + 20 + 40 * j, 2.0f).f32(h + 24 + 40 * j, t);
            for (unsigned g = 0; g < 7; ++g) {
                t = float(double(t) * ((unitRatios ? 16384 : ct::vdRatio(k, j, g)) / 16384.0));
                b.f32(h + 28 + 40 * j + 4 * g, t);
            }
            b.u8(h + 216 + j, v::channelByte(k, j));
            b.f32(h + 224 + 4 * j, float(v::channelFactor(k, j) / 16384.0));
            b.f32(h + 244 + 4 * j, float(v::lux(k, j) / 65536.0));
            b.f32(h + 264 + 4 * j, float(v::cct(k, j) / 256.0));
            b.f32(h + 288 + 4 * j, float(v::channelValue(k, j) / 65536.0));
        }
        b.f32(h + 284, float(v::sharedValue(k) / 65536.0));
        b.u8(h + 308, entries);
        for (unsigned m = 0; m < entries; ++m) {
            b.u16(h + 310 + 2 * m, v::table(k, 'A', m)).u16(h + 324 + 2 * m, v::table(k, 'B', m));
            b.u16(h + 338 + 2 * m, v::table(k, 'C', m)).u8(h + 352 + m, uint8_t(v::table(k, 'D', m)) + 2);
            b.u16(h + 360 + 2 * m, v::table(k, 'E', m)).u16(h + 374 + 2 * m, v::table(k, 'F', m));
        }
    }
    return b;
}

TEST_F(VD6287FormatTest, ConversionFollowsTheTable)
{
    const Bytes v1 = versionOne(3);
    const std::vector<uint8_t> v3 = convert(v1);
    EXPECT_BYTES_EQ(v3, convertedByTable(v1).vec());

    // The cases that matter to the driver, spelled out for the first blob.
    EXPECT_EQ(ct::rd32(v3, 80 + 7), 0xFFFFFFFFu);
    EXPECT_EQ(v3.at(80 + 5054), 4);
    EXPECT_EQ(ct::rd16(v3, 80 + 129), 0xFFFD); // -3 sign-extended
    const auto v1At = [&](size_t at) { return ct::rd16(v1.vec(), 80 + at); };
    const uint16_t tableA[4] = {0, v1At(5056), v1At(5058), v1At(5060)};
    const uint16_t tableB[4] = {v1At(5064), v1At(5064), v1At(5066), v1At(5068)};
    for (unsigned m = 0; m < 4; ++m) {
        EXPECT_EQ(ct::rd16(v3, 80 + 5055 + 2 * m), tableA[m]);
        EXPECT_EQ(ct::rd16(v3, 80 + 5069 + 2 * m), tableB[m]);
        EXPECT_EQ(ct::rd16(v3, 80 + 5083 + 2 * m), v1At(5073)); // C to F: one value repeated
    }
    EXPECT_EQ(ct::rd16(v3, 80 + 5083 + 8), 0); // entries past the count stay zero
}

TEST_F(VD6287FormatTest, ConversionCountsBeyondTheTablesAreRejected)
{
    EXPECT_BYTES_EQ(convert(versionOne(255)), convertedByTable(versionOne(255)).vec());
    EXPECT_EQ(convert(versionOne(255)).at(80 + 5054), 0);
    EXPECT_EQ(convert(versionOne(6)).at(80 + 5054), 7);

    EXPECT_TRUE(convert(versionOne(7)).empty());
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "VD6287 v1 calibration blob 0 holds 8 table entries, at most 7 fit -> "
                                                "calibration will be skipped.\n"));
    EXPECT_TRUE(convert(Bytes(10348)).empty());
}

TEST_F(VD6287FormatTest, DriverRecordFromBothBlobs)
{
    parts(*plugin).unit().sensorType = 5;
    bool ok = false;
    EXPECT_BYTES_EQ(parse(ct::makeVD6287v3(5, false), &ok), expectedDriverRecord(5, false).vec());
    EXPECT_TRUE(ok);
    EXPECT_EQ(parts(*plugin).unit().sensorType.load(), 8u);
    EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 5u);
    EXPECT_EQ(parts(*plugin).unit().dbChannelCount.load(), 5u);
    EXPECT_FLOAT_EQ(parts(*plugin).unit().smallDBVersion.load(), 1.3f);
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_DEFAULT, "XwCl calibration version = v3.1\n"));
}

TEST_F(VD6287FormatTest, UnitGainRatiosGiveOneTwoFourThenFours)
{
    const std::vector<uint8_t> record = parse(ct::makeVD6287v3(7, true));
    EXPECT_BYTES_EQ(record, expectedDriverRecord(7, true).vec());
    const float want[10] = {1, 2, 4, 4, 4, 4, 4, 4, 4, 4};
    for (unsigned i = 0; i < 10; ++i)
        EXPECT_EQ(ct::rdf(record, 388 + 16 + 40 * 4 + 4 * i), want[i]) << i;
}

TEST_F(VD6287FormatTest, RecordsOutsideTheFormatAreRejected)
{
    struct Case {
        Bytes bytes;
        const char* message;
    };
    Bytes oneBlob = ct::makeVD6287v3();
    oneBlob.u8(10, 1);
    Bytes sameTypes = ct::makeVD6287v3();
    sameTypes.u8(80 + 5134, 0);
    Bytes fourChannels = ct::makeVD6287v3();
    fourChannels.u8(80 + 5134 + 4, 4);
    Bytes sixGains = ct::makeVD6287v3();
    sixGains.u8(80 + 5, 6);
    const Case cases[] = {
        {Bytes(10347), "QVT calibration size - 10347 != 10348\n"},
        {oneBlob, "Calibration num_blobs=1, expected=2\n"},
        {sameTypes, "Unexpected calibration blob types!\n"},
        {fourChannels, "Unexpected num_channels/num_gains!\n"},
        {sixGains, "Unexpected num_channels/num_gains!\n"},
        {ct::makeVD6287v3(8), "Calibration blob 0 holds 8 table entries, expected at most 7\n"},
    };
    parts(*plugin).unit().sensorType = 5;
    parts(*plugin).unit().numberOfChannels = 3;
    for (const Case& c : cases) {
        SCOPED_TRACE(c.message);
        bool ok = true;
        EXPECT_TRUE(parse(c.bytes, &ok).empty());
        EXPECT_FALSE(ok);
        EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, c.message));
    }
    EXPECT_EQ(parts(*plugin).unit().sensorType.load(), 5u);
    EXPECT_EQ(parts(*plugin).unit().numberOfChannels.load(), 3u);
}

TEST_F(VD6287FormatTest, VersionOneRecordIsConvertedOnLoad)
{
    writeStore("XwCA", versionOne(2).vec());
    ASSERT_TRUE(parts(*plugin).calibration().loadQVTCalibration(false));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_INFO, "QVT calibration data converted from v1 to v3. New size = 10348\n"));
    const std::vector<uint8_t> record = received("ALSCalibrationData");
    ASSERT_EQ(record.size(), 776u);
    EXPECT_EQ(ct::rd32(record, 4), 0xFFFFFFFFu);
    EXPECT_EQ(ct::rd32(record, 388 + 4), 0xFFFFFFFFu);
    EXPECT_EQ(record.at(308), 3);
    EXPECT_EQ(parts(*plugin).unit().sensorType.load(), 8u);

    // A count the tables cannot hold: the version-1 data matches no layout.
    writeStore("XwCA", versionOne(9).vec());
    EXPECT_FALSE(parts(*plugin).calibration().loadQVTCalibration(false));
    EXPECT_TRUE(log.contains(OS_LOG_TYPE_ERROR, "Failed to parse ALS calibration data."));
}

} // namespace
