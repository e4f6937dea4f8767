// The named fields of a byte layout, found by walking the bytes themselves
// (counts and sizes inside a record decide where later parts lie). The same
// walk serves decoding (bytes to JSON) and encoding (JSON to bytes).
#pragma once

#include <nlohmann/json.hpp>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <variant>
#include <vector>

namespace recordcodec {

using Json = nlohmann::ordered_json;

enum class FieldType { U8, I8, U16, I16, U32, I32, F32, Text };

size_t fieldTypeSize(FieldType type);

// One step of a field's place in the JSON tree: an object key or an array index.
using PathStep = std::variant<std::string, size_t>;

struct Field {
    std::vector<PathStep> path;
    size_t offset = 0;
    FieldType type = FieldType::U8;
    size_t count = 1;   // elements (characters for Text)
    bool scalar = true; // one value rather than an array
    double divisor = 0; // fixed point: shown raw and as raw / divisor; 0 = plain
    size_t byteLength() const { return fieldTypeSize(type) * count; }
    bool operator==(const Field&) const = default;
};

// Collects the fields of a layout. Fields are placed relative to a base
// offset and must lie inside a window (a record, an entry); a field that
// falls outside its window or the bytes, or that overlaps a field already
// described, is left out, so the bytes it would cover stay unnamed.
class Describer {
public:
    explicit Describer(std::span<const uint8_t> bytes);

    // A nested object `key` (or element `index` of the array `key`) whose
    // fields start at `base` (relative to this one) and lie within `length` bytes.
    Describer object(const std::string& key, size_t base, size_t length) const;
    Describer element(const std::string& key, size_t index, size_t base, size_t length) const;

    void scalar(const std::string& name, size_t offset, FieldType type, double divisor = 0) const;
    void array(const std::string& name, size_t offset, FieldType type, size_t count, double divisor = 0) const;

    // Structural values (counts, sizes) read from the bytes; 0 when outside the window.
    uint8_t u8(size_t offset) const;
    uint16_t u16(size_t offset) const;
    size_t windowLength() const { return length_; }

    std::vector<Field> fields() const { return state_->fields; }

private:
    struct State {
        std::span<const uint8_t> bytes;
        std::vector<bool> covered;
        std::vector<Field> fields;
    };
    Describer(std::shared_ptr<State> state, std::vector<PathStep> path, size_t base, size_t length);
    void add(const std::string& name, size_t offset, FieldType type, size_t count, bool scalar, double divisor) const;
    bool inWindow(size_t offset, size_t size) const;

    std::shared_ptr<State> state_;
    std::vector<PathStep> path_;
    size_t base_ = 0;
    size_t length_ = 0;
};

// The field's value in `bytes` as JSON.
Json fieldToJson(const Field& field, std::span<const uint8_t> bytes);
// Writes the JSON value of `field` into `bytes`; throws std::runtime_error
// (naming the field) when the value has the wrong form or does not fit the type.
void fieldFromJson(const Field& field, const Json& value, std::span<uint8_t> bytes);

// The JSON node at a field's path, or null when absent.
const Json* findAtPath(const Json& root, const std::vector<PathStep>& path);
// The node at `path`, created (objects and arrays as needed).
Json& makeAtPath(Json& root, const std::vector<PathStep>& path);
std::string pathText(const std::vector<PathStep>& path);
// Bytes as lower-case hex digits, two per byte.
std::string hexOf(std::span<const uint8_t> bytes);

} // namespace recordcodec
