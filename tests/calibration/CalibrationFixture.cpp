#include "CalibrationFixture.h"

#include <sqlite3.h>

namespace ct {

Bytes makeXwCl(const XwClShape& shape)
{
    Bytes b(76 + 5080 * shape.entries);
    b.u8(4, 2).u8(5, 3).u8(10, shape.selector).u32(12, shape.chipID).u8(16, shape.deviceID).u8(74, shape.chipType);
    for (unsigned k = 0; k < shape.entries; ++k) {
        const size_t e = 76 + 5080 * k;
        b.u8(e + 4, shape.nChannels).u8(e + 5, shape.nGains);
        b.u16(e + 6, xwcl::iTime(k)).u16(e + 8, xwcl::aux1(k)).u16(e + 10, xwcl::aux2(k)).u16(e + 12, xwcl::aux3(k));
        for (unsigned i = 0; i < 4; ++i)
            b.u8(e + 14 + i, xwcl::gain(k, i));
        b.u16(e + 18, xwcl::fudge(k));
        for (unsigned c = 0; c < 6; ++c) {
            for (unsigned g = 0; g < 9; ++g)
                b.u16(e + 20 + 18 * c + 2 * g, xwcl::gainScale(k, c, g));
            b.u16(e + 128 + 2 * c, xwcl::paramA(k, c));
            b.i16(e + 140 + 2 * c, xwcl::offsetCounts(k, c));
            b.u8(e + 152 + c, xwcl::darkCounts(k, c));
            b.i8(e + 158 + c, xwcl::paramB(k, c));
            b.i32(e + 164 + 4 * c, xwcl::lux(k, c));
            b.i32(e + 188 + 4 * c, xwcl::cct(k, c));
            for (unsigned s = 0; s < 401; ++s)
                b.i16(e + 268 + 802 * c + 2 * s, xwcl::sample(k, c, s));
        }
    }
    return b;
}

Bytes makeXwCA(const XwCAShape& shape)
{
    Bytes b(9962);
    b.u8(4, shape.major).u8(5, shape.minor).text(16, shape.chipText).u8(28, shape.deviceID);
    b.u8(80, shape.nChannels).u8(81, shape.nGains).u16(82, shape.fudge);
    for (unsigned c = 0; c < 5; ++c) {
        for (unsigned g = 0; g < 9; ++g)
            b.u16(84 + 18 * c + 2 * g, xwca::gainScale(c, g));
        b.u16(192 + 2 * c, xwca::paramA(c));
        b.i16(204 + 2 * c, xwca::offsetCounts(c));
        b.u8(216 + c, xwca::darkCounts(c));
        b.i16(222 + 2 * c, xwca::paramB(c));
        b.i32(234 + 4 * c, xwca::lux(c));
        b.i32(258 + 4 * c, xwca::cct(c));
    }
    b.u8(282, shape.gainIndex).i16(284, shape.iTime);
    for (unsigned c = 0; c < 6; ++c)
        for (unsigned s = 0; s < 401; ++s)
            b.i32(338 + 1604 * c + 4 * s, xwca::sample(c, s));
    return b;
}

Bytes makeVD6287v3(uint8_t entryCount, bool unitRatios)
{
    Bytes b(10348);
    b.u8(4, 3).u8(5, 1).u8(10, 2);
    for (unsigned k = 0; k < 2; ++k) {
        const size_t o = 80 + 5134 * k;
        b.u8(o + 0, k).u8(o + 4, 5).u8(o + 5, 7).u8(o + 6, vd::gainIndex(k)).u32(o + 7, vd::blobWord(k));
        b.u16(o + 17, vd::valueA(k)).u16(o + 19, vd::valueB(k));
        for (unsigned j = 0; j < 5; ++j) {
            for (unsigned g = 0; g < 7; ++g)
                b.u16(o + 21 + 18 * j + 2 * g, unitRatios ? 16384 : vdRatio(k, j, g));
            // Only the low byte of the 16-bit slot counts.
            b.u8(o + 129 + 2 * j, vd::channelByte(k, j)).u8(o + 130 + 2 * j, 0x7F);
            b.i16(o + 141 + 2 * j, vd::channelFactor(k, j));
            b.i32(o + 153 + 4 * j, vd::lux(k, j));
            b.i32(o + 177 + 4 * j, vd::cct(k, j));
            b.u32(o + 205 + 4 * j, vd::channelValue(k, j));
        }
        b.u32(o + 201, vd::sharedValue(k));
        for (unsigned c = 0; c < 6; ++c)
            for (unsigned s = 0; s < 401; ++s)
                b.i16(o + 238 + 802 * c + 2 * s, vd::sample(k, c, s));
        b.u8(o + 5054, entryCount);
        for (unsigned m = 0; m < 7; ++m) {
            b.u16(o + 5055 + 2 * m, vd::table(k, 'A', m));
            b.u16(o + 5069 + 2 * m, vd::table(k, 'B', m));
            b.u16(o + 5083 + 2 * m, vd::table(k, 'C', m));
            b.u8(o + 5097 + m, uint8_t(vd::table(k, 'D', m)));
            b.u16(o + 5104 + 2 * m, vd::table(k, 'E', m));
            b.u16(o + 5118 + 2 * m, vd::table(k, 'F', m));
        }
    }
    return b;
}

namespace {

void exec(sqlite3* db, const std::string& sql)
{
    char* error = nullptr;
    ASSERT_EQ(sqlite3_exec(db, sql.c_str(), nullptr, nullptr, &error), SQLITE_OK) << (error ? error : "");
}

void writeReference(const std::filesystem::path& file, int sources)
{
    std::filesystem::remove(file);
    sqlite3* db = nullptr;
    ASSERT_EQ(sqlite3_open(file.c_str(), &db), SQLITE_OK);
    exec(db, "CREATE TABLE Info (version Single, sources Long)");
    exec(db, "INSERT INTO Info VALUES (1.5, " + std::to_string(sources) + ")");
    std::string columns = "ID Long, X Single, Y Single, Z Single";
    for (int s = 0; s < 401; ++s)
        columns += ", S" + std::to_string(s) + " Single";
    exec(db, "CREATE TABLE Spectra (" + columns + ")");
    exec(db, "BEGIN");
    for (int i = 0; i < sources; ++i) {
        std::string row = std::to_string(i) + ", " + std::to_string(10 + i) + ", " + std::to_string(20 + 2 * i) + ", " +
                          std::to_string(30 - i);
        // Smooth spectra that differ in slope from source to source.
        for (int s = 0; s < 401; ++s)
            row += ", " + std::to_string(1.0 + 0.01 * s * (i % 3) + 0.005 * (400 - s) * ((i + 1) % 2));
        exec(db, "INSERT INTO Spectra VALUES (" + row + ")");
    }
    exec(db, "COMMIT");
    sqlite3_close(db);
}

} // namespace

void writeReferenceDatabases(const std::filesystem::path& systemRoot, int sources)
{
    const auto bundle = systemRoot / "Vantish.plugin";
    std::filesystem::create_directories(bundle);
    writeReference(bundle / "bzlight.sqlite", sources);
    writeReference(bundle / "bzlight-02.sqlite", sources);
}

} // namespace ct
