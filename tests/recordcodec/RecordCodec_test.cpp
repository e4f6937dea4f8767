#include "host/recordcodec/RecordCodec.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <random>

namespace {

using recordcodec::Json;
using recordcodec::Kind;

std::vector<uint8_t> randomBytes(size_t size, unsigned seed)
{
    std::mt19937 rng(seed);
    std::vector<uint8_t> out(size);
    for (uint8_t& b : out)
        b = uint8_t(rng());
    return out;
}

// Decodes, passes the JSON through its text form, encodes.
std::vector<uint8_t> roundTrip(const std::vector<uint8_t>& bytes, std::optional<Kind> kind = std::nullopt)
{
    auto decoded = recordcodec::decode(bytes, kind);
    EXPECT_TRUE(decoded) << decoded.error;
    if (!decoded)
        return {};
    auto encoded = recordcodec::encode(Json::parse(decoded.value->dump()));
    EXPECT_TRUE(encoded) << encoded.error;
    return encoded ? *encoded.value : std::vector<uint8_t>{};
}

// Little-endian writer of the tests' own.
struct Writer {
    std::vector<uint8_t>& b;
    void u8(size_t at, unsigned v) { b.at(at) = uint8_t(v); }
    void u16(size_t at, unsigned v) { u8(at, v & 0xFF), u8(at + 1, v >> 8); }
    void u32(size_t at, uint32_t v) { u16(at, v & 0xFFFF), u16(at + 2, v >> 16); }
    void f32(size_t at, float v)
    {
        uint32_t bits;
        std::memcpy(&bits, &v, 4);
        u32(at, bits);
    }
};

TEST(RecordCodecTest, EveryFixedSizeRecordRoundTripsWhateverItsBytes)
{
    for (size_t size : {5156, 10236, 9962, 10440, 10348, 145, 193, 220, 776, 28163}) {
        SCOPED_TRACE(size);
        ASSERT_TRUE(recordcodec::kindForSize(size));
        const std::vector<uint8_t> bytes = randomBytes(size, unsigned(size));
        EXPECT_EQ(roundTrip(bytes), bytes);
    }
}

// An "alsCalibration" blob with a generic entry of 8 gains (orientation 1)
// and a VD6286 entry (orientation 3), revision 0.
std::vector<uint8_t> registryBlob()
{
    const size_t generic = 104 + 3236;
    const size_t vd6286 = 4156;
    std::vector<uint8_t> b = randomBytes(8 + generic + vd6286, 7);
    Writer w{b};
    w.u8(0, 0), w.u8(1, 1), w.u8(2, 2), w.u16(4, unsigned(b.size()));
    const size_t e0 = 8;
    w.u8(e0 + 2, 1), w.u8(e0 + 3, 0), w.u16(e0 + 4, unsigned(generic));
    w.u16(e0 + 8, 0x180), w.u8(e0 + 19, 4), w.u8(e0 + 20, 8);
    w.u16(e0 + 104 + 2, 401);
    w.u32(e0 + 108, 1500000);
    const size_t e1 = e0 + generic;
    w.u8(e1 + 2, 3), w.u8(e1 + 3, 3), w.u16(e1 + 4, unsigned(vd6286));
    w.u8(e1 + 19, 5), w.u8(e1 + 20, 5), w.u16(e1 + 98, 401);
    return b;
}

TEST(RecordCodecTest, RegistryBlobIsWalkedEntryByEntry)
{
    const std::vector<uint8_t> blob = registryBlob();
    auto decoded = recordcodec::decode(blob, Kind::AlsCalibration);
    ASSERT_TRUE(decoded) << decoded.error;
    const Json& fields = (*decoded.value)["fields"];
    const Json& generic = fields["entries"][0];
    EXPECT_EQ(generic["wordA"]["value"], 1.5);
    ASSERT_EQ(generic["channels"].size(), 4u);
    EXPECT_EQ(generic["channels"][0]["gains"]["raw"].size(), 8u);
    // Channel blocks of 20 bytes put the spectrum block at entry offset 104.
    EXPECT_EQ(generic["spectrum"]["nSamples"], 401);
    EXPECT_EQ(generic["spectrum"]["weights"]["raw"][0], 1500000);
    EXPECT_EQ(generic["spectrum"]["weights"]["value"][0], 1.5);
    EXPECT_EQ(generic["spectrum"]["samples"].size(), 401u * 4);
    const Json& vd6286 = fields["entries"][1];
    EXPECT_EQ(vd6286["chipType"], 3);
    EXPECT_EQ(vd6286["channels"].size(), 5u);
    EXPECT_EQ(vd6286["samples"].size(), 401u * 5);

    EXPECT_EQ(roundTrip(blob, Kind::AlsCalibration), blob);
}

TEST(RecordCodecTest, ArbitraryRegistryBytesRoundTrip)
{
    for (unsigned seed = 1; seed <= 20; ++seed) {
        std::vector<uint8_t> blob = randomBytes(600 + 97 * seed, seed);
        Writer w{blob};
        w.u8(2, seed % 6); // a few entries, of whatever sizes the bytes say
        EXPECT_EQ(roundTrip(blob, Kind::AlsCalibration), blob) << seed;
        EXPECT_EQ(roundTrip(blob, Kind::AlsAuxCalibration), blob) << seed;
    }
}

TEST(RecordCodecTest, AuxiliaryBlobCoefficientsAreConverted)
{
    std::vector<uint8_t> blob(8 + 2 * 56, 0);
    Writer w{blob};
    w.u8(2, 2);
    w.u8(8 + 2, 1), w.u16(8 + 4, 56), w.u32(8 + 40, uint32_t(-250000));
    w.u8(64 + 2, 3), w.u16(64 + 4, 56), w.u32(64 + 52, 2000000);
    auto decoded = recordcodec::decode(blob, Kind::AlsAuxCalibration);
    ASSERT_TRUE(decoded);
    const Json& entries = (*decoded.value)["fields"]["entries"];
    EXPECT_EQ(entries[0]["irCoefficients"]["value"][0], -0.25);
    EXPECT_EQ(entries[1]["orientation"], 3);
    EXPECT_EQ(entries[1]["irCoefficients"]["value"][3], 2.0);
}

TEST(RecordCodecTest, DriverRecordFieldsAreNamedAndConverted)
{
    std::vector<uint8_t> record(193, 0);
    Writer w{record};
    w.u8(0, 1), w.u32(1, 3), w.u16(10, 193), w.u16(12, 0x4000), w.u16(20, 62);
    w.f32(28 + 4, 0.0086f), w.f32(48, std::nanf(""));
    w.u16(68 + 1, uint16_t(-512)), w.u16(68 + 5, uint16_t(-3)), w.u16(68 + 7, 0x8000);
    auto decoded = recordcodec::decode(record);
    ASSERT_TRUE(decoded);
    const Json& f = (*decoded.value)["fields"];
    EXPECT_EQ((*decoded.value)["format"], "driver-5-channel");
    EXPECT_EQ(f["calibrationSource"], 3);
    EXPECT_EQ(f["fudge"]["raw"], 16384);
    EXPECT_EQ(f["fudge"]["value"], 1.0);
    EXPECT_EQ(f["aux3"], 62);
    EXPECT_EQ(f["luxCoeff"][1], double(0.0086f));
    EXPECT_EQ(f["cctCoeff"][0]["bits"], "0x7FC00000");
    EXPECT_EQ(f["channels"][0]["offsetCounts"]["value"], -2.0);
    EXPECT_EQ(f["channels"][0]["channelParamB"], -3);
    EXPECT_EQ(f["channels"][0]["gainScale"]["value"][0], 2.0);
    EXPECT_TRUE((*decoded.value)["unnamed"].empty()); // the layout names every byte
    EXPECT_EQ(roundTrip(record), record);
}

TEST(RecordCodecTest, FactoryRecordsKeepReservedBytes)
{
    std::vector<uint8_t> xwca = randomBytes(9962, 3);
    std::memcpy(xwca.data() + 16, "1A2B3C4D", 8);
    auto decoded = recordcodec::decode(xwca);
    ASSERT_TRUE(decoded);
    EXPECT_EQ((*decoded.value)["fields"]["chipID"]["text"], "1A2B3C4D");
    // Bytes 0 to 3 carry no field.
    const Json& first = (*decoded.value)["unnamed"][0];
    EXPECT_EQ(first["offset"], 0);
    EXPECT_EQ(first["hex"].get<std::string>().size(), 8u);

    std::vector<uint8_t> v1 = randomBytes(10440, 4);
    v1[80 + 137] = 0xFD;
    auto v1Decoded = recordcodec::decode(v1);
    ASSERT_TRUE(v1Decoded);
    EXPECT_EQ((*v1Decoded.value)["fields"]["blobs"][0]["channels"][0]["channelByte"], -3);
}

TEST(RecordCodecTest, EditedValuesAreEncodedFromRawOrConvertedForm)
{
    std::vector<uint8_t> record(145, 0);
    auto decoded = recordcodec::decode(record);
    ASSERT_TRUE(decoded);
    Json edited = *decoded.value;
    edited["fields"]["fudge"] = Json{{"value", 1.25}};
    edited["fields"]["luxCoeff"] = Json{{"raw", {1, 2, 3, 11658}}};
    edited["fields"]["channels"][2]["gainScale"].erase("raw");
    edited["fields"]["channels"][2]["gainScale"]["value"][8] = 0.5;
    auto encoded = recordcodec::encode(edited);
    ASSERT_TRUE(encoded) << encoded.error;
    const std::vector<uint8_t>& b = *encoded.value;
    EXPECT_EQ(b[12] | b[13] << 8, 0x5000);
    EXPECT_EQ(b[25 + 12] | b[25 + 13] << 8, 11658);
    EXPECT_EQ(b[49 + 48 + 6 + 16] | b[49 + 48 + 6 + 17] << 8, 0x2000);
}

TEST(RecordCodecTest, MalformedInputIsReportedNotGuessed)
{
    EXPECT_FALSE(recordcodec::decode(std::vector<uint8_t>(146)));
    EXPECT_FALSE(recordcodec::decode(std::vector<uint8_t>(146), Kind::Driver4Channel));
    EXPECT_TRUE(recordcodec::decode(std::vector<uint8_t>(3), Kind::AlsCalibration)); // what there is of the header

    auto decoded = recordcodec::decode(std::vector<uint8_t>(145));
    ASSERT_TRUE(decoded);
    Json tooLarge = *decoded.value;
    tooLarge["fields"]["nChannels"] = 300;
    auto encoded = recordcodec::encode(tooLarge);
    EXPECT_FALSE(encoded);
    EXPECT_EQ(encoded.error, "nChannels: value 300 does not fit the field");

    Json wrongSize = *decoded.value;
    wrongSize["size"] = 146;
    EXPECT_FALSE(recordcodec::encode(wrongSize));
    Json unknown = *decoded.value;
    unknown["format"] = "driver-7-channel";
    EXPECT_FALSE(recordcodec::encode(unknown));
    Json badUnnamed = *decoded.value;
    badUnnamed["unnamed"] = Json::array({Json{{"offset", 144}, {"hex", "0102"}}});
    EXPECT_FALSE(recordcodec::encode(badUnnamed));
}

} // namespace
