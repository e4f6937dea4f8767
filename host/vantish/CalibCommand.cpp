// vantish calib decode|encode: calibration records (factory records, registry
// blobs, driver records) as readable JSON and back, byte for byte.
#include "host/vantish/Commands.h"

#include "host/recordcodec/RecordCodec.h"

#include <CLI/CLI.hpp>

#include <fstream>
#include <iostream>
#include <iterator>

namespace vantish {

namespace {

struct CalibOptions {
    std::string input;
    std::string output;
    std::string format;
};

std::string formatList()
{
    std::string list;
    for (recordcodec::Kind kind : recordcodec::allKinds())
        list += (list.empty() ? "" : ", ") + std::string(recordcodec::kindName(kind));
    return list;
}

bool readFile(const std::string& path, std::vector<uint8_t>& bytes)
{
    std::ifstream in(path, std::ios::binary);
    if (!in)
        return false;
    bytes.assign(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
    return true;
}

int decodeRecord(const CalibOptions& o)
{
    std::vector<uint8_t> bytes;
    if (!readFile(o.input, bytes)) {
        std::cerr << "vantish: cannot read " << o.input << "\n";
        return 2;
    }
    std::optional<recordcodec::Kind> kind;
    if (!o.format.empty()) {
        kind = recordcodec::kindNamed(o.format);
        if (!kind) {
            std::cerr << "vantish: unknown format '" << o.format << "' (one of " << formatList() << ")\n";
            return 2;
        }
    }
    auto decoded = recordcodec::decode(bytes, kind);
    if (!decoded) {
        std::cerr << "vantish: " << o.input << ": " << decoded.error << "\n";
        return 1;
    }
    const std::string text = decoded.value->dump(2) + "\n";
    if (o.output.empty() || o.output == "-") {
        std::cout << text;
    } else {
        std::ofstream out(o.output);
        out << text;
        if (!out) {
            std::cerr << "vantish: cannot write " << o.output << "\n";
            return 2;
        }
    }
    return 0;
}

int encodeRecord(const CalibOptions& o)
{
    std::ifstream in(o.input);
    if (!in) {
        std::cerr << "vantish: cannot read " << o.input << "\n";
        return 2;
    }
    recordcodec::Json json;
    try {
        json = recordcodec::Json::parse(in);
    } catch (const std::exception& e) {
        std::cerr << "vantish: " << o.input << ": not valid JSON: " << e.what() << "\n";
        return 1;
    }
    auto encoded = recordcodec::encode(json);
    if (!encoded) {
        std::cerr << "vantish: " << o.input << ": " << encoded.error << "\n";
        return 1;
    }
    std::ofstream out(o.output, std::ios::binary);
    out.write(reinterpret_cast<const char*>(encoded.value->data()), std::streamsize(encoded.value->size()));
    if (!out) {
        std::cerr << "vantish: cannot write " << o.output << "\n";
        return 2;
    }
    return 0;
}

} // namespace

Runner addCalibCommand(CLI::App& app, const CommonOptions&)
{
    app.require_subcommand(1, 1);
    auto decodeOptions = std::make_shared<CalibOptions>();
    CLI::App* decode = app.add_subcommand("decode", "Print a calibration record as JSON (every field named; "
                                                    "fixed-point values raw and converted)");
    decode->add_option("record", decodeOptions->input, "The binary record")->required();
    decode->add_option("-o,--output", decodeOptions->output, "Write the JSON here instead of standard output");
    decode->add_option("--format", decodeOptions->format,
                       "The record's layout; needed for registry blobs, otherwise told by the size.\nOne of: " +
                           formatList());

    auto encodeOptions = std::make_shared<CalibOptions>();
    CLI::App* encode = app.add_subcommand("encode", "Write the binary record a JSON record describes "
                                                    "(decode's output, possibly edited)");
    encode->add_option("json", encodeOptions->input, "The JSON record")->required();
    encode->add_option("-o,--output", encodeOptions->output, "The binary record to write")->required();

    return [decode, decodeOptions, encodeOptions] {
        return decode->parsed() ? decodeRecord(*decodeOptions) : encodeRecord(*encodeOptions);
    };
}

} // namespace vantish
