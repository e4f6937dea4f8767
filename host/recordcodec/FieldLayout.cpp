#include "host/recordcodec/FieldLayout.h"

#include "support/LittleEndian.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <limits>
#include <stdexcept>

namespace recordcodec {
namespace {

struct Range {
    int64_t min;
    int64_t max;
};

Range rangeOf(FieldType type)
{
    switch (type) {
    case FieldType::U8:
        return {0, 0xFF};
    case FieldType::I8:
        return {-0x80, 0x7F};
    case FieldType::U16:
        return {0, 0xFFFF};
    case FieldType::I16:
        return {-0x8000, 0x7FFF};
    case FieldType::U32:
        return {0, 0xFFFFFFFFll};
    case FieldType::I32:
        return {-0x80000000ll, 0x7FFFFFFF};
    default:
        return {0, 0};
    }
}

int64_t readInteger(FieldType type, std::span<const uint8_t> bytes, size_t at)
{
    switch (type) {
    case FieldType::U8:
        return le::get<uint8_t>(bytes, at);
    case FieldType::I8:
        return le::get<int8_t>(bytes, at);
    case FieldType::U16:
        return le::get<uint16_t>(bytes, at);
    case FieldType::I16:
        return le::get<int16_t>(bytes, at);
    case FieldType::U32:
        return le::get<uint32_t>(bytes, at);
    case FieldType::I32:
        return le::get<int32_t>(bytes, at);
    default:
        return 0;
    }
}

void writeInteger(FieldType type, std::span<uint8_t> bytes, size_t at, int64_t v)
{
    switch (type) {
    case FieldType::U8:
        le::put<uint8_t>(bytes, at, uint8_t(v));
        break;
    case FieldType::I8:
        le::put<int8_t>(bytes, at, int8_t(v));
        break;
    case FieldType::U16:
        le::put<uint16_t>(bytes, at, uint16_t(v));
        break;
    case FieldType::I16:
        le::put<int16_t>(bytes, at, int16_t(v));
        break;
    case FieldType::U32:
        le::put<uint32_t>(bytes, at, uint32_t(v));
        break;
    case FieldType::I32:
        le::put<int32_t>(bytes, at, int32_t(v));
        break;
    default:
        break;
    }
}

[[noreturn]] void fail(const Field& f, const std::string& why)
{
    throw std::runtime_error(pathText(f.path) + ": " + why);
}

// ---- Decoding ----------------------------------------------------------------

Json floatToJson(float v)
{
    if (std::isfinite(v))
        return double(v);
    uint32_t bits;
    std::memcpy(&bits, &v, 4);
    char text[16];
    std::snprintf(text, sizeof text, "0x%08X", bits);
    return Json{{"bits", text}};
}

Json elementToJson(const Field& f, std::span<const uint8_t> bytes, size_t i)
{
    const size_t at = f.offset + fieldTypeSize(f.type) * i;
    if (f.type == FieldType::F32)
        return floatToJson(le::get<float>(bytes, at));
    return readInteger(f.type, bytes, at);
}

Json textToJson(const Field& f, std::span<const uint8_t> bytes)
{
    const auto text = bytes.subspan(f.offset, f.count);
    for (uint8_t c : text)
        if (c < 0x20 || c > 0x7E)
            return Json{{"hex", hexOf(text)}};
    return Json{{"text", std::string(text.begin(), text.end())}};
}

// ---- Encoding ----------------------------------------------------------------

int64_t integerFrom(const Field& f, const Json& v)
{
    if (!v.is_number_integer())
        fail(f, "expected an integer, got " + v.dump());
    const Range r = rangeOf(f.type);
    const int64_t value = v.is_number_unsigned() && v.get<uint64_t>() > uint64_t(std::numeric_limits<int64_t>::max())
                              ? std::numeric_limits<int64_t>::max()
                              : v.get<int64_t>();
    if (value < r.min || value > r.max)
        fail(f, "value " + v.dump() + " does not fit the field");
    return value;
}

float floatFrom(const Field& f, const Json& v)
{
    if (v.is_number())
        return v.get<float>();
    if (v.is_object() && v.contains("bits") && v["bits"].is_string()) {
        const uint32_t bits = uint32_t(std::stoul(v["bits"].get<std::string>(), nullptr, 16));
        float out;
        std::memcpy(&out, &bits, 4);
        return out;
    }
    fail(f, "expected a number or {\"bits\": ...}, got " + v.dump());
}

std::vector<uint8_t> bytesFromHex(const Field& f, const std::string& hex)
{
    if (hex.size() % 2 != 0)
        fail(f, "hex text of odd length");
    std::vector<uint8_t> out;
    for (size_t i = 0; i < hex.size(); i += 2) {
        const std::string pair = hex.substr(i, 2);
        if (pair.find_first_not_of("0123456789abcdefABCDEF") != std::string::npos)
            fail(f, "not hexadecimal: " + pair);
        out.push_back(uint8_t(std::stoul(pair, nullptr, 16)));
    }
    return out;
}

void textFromJson(const Field& f, const Json& v, std::span<uint8_t> bytes)
{
    std::vector<uint8_t> text;
    if (v.is_object() && v.contains("text") && v["text"].is_string()) {
        const std::string s = v["text"].get<std::string>();
        text.assign(s.begin(), s.end());
    } else if (v.is_object() && v.contains("hex") && v["hex"].is_string()) {
        text = bytesFromHex(f, v["hex"].get<std::string>());
    } else {
        fail(f, "expected {\"text\": ...} or {\"hex\": ...}");
    }
    if (text.size() > f.count)
        fail(f, "longer than " + std::to_string(f.count) + " bytes");
    for (size_t i = 0; i < text.size(); ++i)
        bytes[f.offset + i] = text[i];
}

// The raw integer of a fixed-point element given as raw or as value.
int64_t fixedFrom(const Field& f, const Json* raw, const Json* value)
{
    if (raw)
        return integerFrom(f, *raw);
    if (!value || !value->is_number())
        fail(f, "expected \"raw\" or \"value\"");
    return integerFrom(f, Json(std::llround(value->get<double>() * f.divisor)));
}

const Json* member(const Json& v, const char* key) { return v.is_object() && v.contains(key) ? &v[key] : nullptr; }

void writeElement(const Field& f, std::span<uint8_t> bytes, size_t i, const Json* plain, const Json* raw,
                  const Json* value)
{
    const size_t at = f.offset + fieldTypeSize(f.type) * i;
    if (f.type == FieldType::F32)
        le::put<float>(bytes, at, floatFrom(f, *plain));
    else if (f.divisor != 0)
        writeInteger(f.type, bytes, at, fixedFrom(f, raw, value));
    else
        writeInteger(f.type, bytes, at, integerFrom(f, *plain));
}

// The element `i` of an array given in JSON, or null when the array is shorter.
const Json* elementOf(const Field& f, const Json* array, size_t i)
{
    if (!array)
        return nullptr;
    if (!array->is_array())
        fail(f, "expected an array");
    if (array->size() > f.count)
        fail(f, "more than " + std::to_string(f.count) + " elements");
    return i < array->size() ? &(*array)[i] : nullptr;
}

} // namespace

size_t fieldTypeSize(FieldType type)
{
    switch (type) {
    case FieldType::U16:
    case FieldType::I16:
        return 2;
    case FieldType::U32:
    case FieldType::I32:
    case FieldType::F32:
        return 4;
    default:
        return 1;
    }
}

// ---- Describer ------------------------------------------------------------------

Describer::Describer(std::span<const uint8_t> bytes)
    : state_(std::make_shared<State>(State{bytes, std::vector<bool>(bytes.size(), false), {}})), base_(0),
      length_(bytes.size())
{
}

Describer::Describer(std::shared_ptr<State> state, std::vector<PathStep> path, size_t base, size_t length)
    : state_(std::move(state)), path_(std::move(path)), base_(base), length_(length)
{
}

Describer Describer::object(const std::string& key, size_t base, size_t length) const
{
    std::vector<PathStep> path = path_;
    path.emplace_back(key);
    return Describer(state_, std::move(path), base_ + base, std::min(length, length_ > base ? length_ - base : 0));
}

Describer Describer::element(const std::string& key, size_t index, size_t base, size_t length) const
{
    Describer child = object(key, base, length);
    child.path_.emplace_back(index);
    return child;
}

void Describer::scalar(const std::string& name, size_t offset, FieldType type, double divisor) const
{
    add(name, offset, type, 1, true, divisor);
}

void Describer::array(const std::string& name, size_t offset, FieldType type, size_t count, double divisor) const
{
    add(name, offset, type, count, false, divisor);
}

bool Describer::inWindow(size_t offset, size_t size) const
{
    return le::fits(length_, offset, size) && le::fits(state_->bytes.size(), base_ + offset, size);
}

uint8_t Describer::u8(size_t offset) const
{
    return inWindow(offset, 1) ? le::get<uint8_t>(state_->bytes, base_ + offset) : 0;
}

uint16_t Describer::u16(size_t offset) const
{
    return inWindow(offset, 2) ? le::get<uint16_t>(state_->bytes, base_ + offset) : 0;
}

void Describer::add(const std::string& name, size_t offset, FieldType type, size_t count, bool scalar,
                    double divisor) const
{
    Field f{
        .path = path_, .offset = base_ + offset, .type = type, .count = count, .scalar = scalar, .divisor = divisor};
    f.path.emplace_back(name);
    if (count == 0 || !inWindow(offset, f.byteLength()))
        return;
    std::vector<bool>& covered = state_->covered;
    for (size_t i = f.offset; i < f.offset + f.byteLength(); ++i)
        if (covered[i])
            return;
    for (size_t i = f.offset; i < f.offset + f.byteLength(); ++i)
        covered[i] = true;
    state_->fields.push_back(std::move(f));
}

// ---- Field values ------------------------------------------------------------------

Json fieldToJson(const Field& f, std::span<const uint8_t> bytes)
{
    if (f.type == FieldType::Text)
        return textToJson(f, bytes);
    if (f.divisor == 0) {
        if (f.scalar)
            return elementToJson(f, bytes, 0);
        Json out = Json::array();
        for (size_t i = 0; i < f.count; ++i)
            out.push_back(elementToJson(f, bytes, i));
        return out;
    }
    auto converted = [&](size_t i) {
        return double(readInteger(f.type, bytes, f.offset + fieldTypeSize(f.type) * i)) / f.divisor;
    };
    if (f.scalar)
        return Json{{"raw", elementToJson(f, bytes, 0)}, {"value", converted(0)}};
    Json raw = Json::array();
    Json value = Json::array();
    for (size_t i = 0; i < f.count; ++i) {
        raw.push_back(elementToJson(f, bytes, i));
        value.push_back(converted(i));
    }
    return Json{{"raw", raw}, {"value", value}};
}

void fieldFromJson(const Field& f, const Json& v, std::span<uint8_t> bytes)
{
    if (!le::fits(bytes.size(), f.offset, f.byteLength()))
        fail(f, "outside the record");
    if (f.type == FieldType::Text)
        return textFromJson(f, v, bytes);
    const bool fixed = f.divisor != 0 && f.type != FieldType::F32;
    if (f.scalar) {
        if (fixed && !v.is_object())
            fail(f, "expected {\"raw\": ...} or {\"value\": ...}");
        return writeElement(f, bytes, 0, &v, member(v, "raw"), member(v, "value"));
    }
    const Json* plain = fixed ? nullptr : &v;
    const Json* raws = fixed ? member(v, "raw") : nullptr;
    const Json* values = fixed ? member(v, "value") : nullptr;
    if (fixed && !raws && !values)
        fail(f, "expected {\"raw\": [...]} or {\"value\": [...]}");
    for (size_t i = 0; i < f.count; ++i) {
        const Json* p = elementOf(f, plain, i);
        const Json* r = elementOf(f, raws, i);
        const Json* x = raws ? nullptr : elementOf(f, values, i);
        if (p || r || x)
            writeElement(f, bytes, i, p, r, x);
    }
}

// ---- Paths ----------------------------------------------------------------------------

const Json* findAtPath(const Json& root, const std::vector<PathStep>& path)
{
    const Json* node = &root;
    for (const PathStep& step : path) {
        if (const std::string* key = std::get_if<std::string>(&step)) {
            if (!node->is_object() || !node->contains(*key))
                return nullptr;
            node = &(*node)[*key];
        } else {
            const size_t index = std::get<size_t>(step);
            if (!node->is_array() || index >= node->size())
                return nullptr;
            node = &(*node)[index];
        }
    }
    return node->is_null() ? nullptr : node;
}

Json& makeAtPath(Json& root, const std::vector<PathStep>& path)
{
    Json* node = &root;
    for (const PathStep& step : path) {
        if (const std::string* key = std::get_if<std::string>(&step)) {
            if (!node->is_object())
                *node = Json::object();
            node = &(*node)[*key];
        } else {
            const size_t index = std::get<size_t>(step);
            if (!node->is_array())
                *node = Json::array();
            while (node->size() <= index)
                node->push_back(nullptr);
            node = &(*node)[index];
        }
    }
    return *node;
}

std::string pathText(const std::vector<PathStep>& path)
{
    std::string out;
    for (const PathStep& step : path) {
        if (const std::string* key = std::get_if<std::string>(&step))
            out += (out.empty() ? "" : ".") + *key;
        else
            out += "[" + std::to_string(std::get<size_t>(step)) + "]";
    }
    return out;
}

std::string hexOf(std::span<const uint8_t> bytes)
{
    static const char digits[] = "0123456789abcdef";
    std::string out;
    for (uint8_t b : bytes) {
        out += digits[b >> 4];
        out += digits[b & 15];
    }
    return out;
}

} // namespace recordcodec
