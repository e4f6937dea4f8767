#include "host/inputs/SpectrumFile.h"

#include "spectra/Colorimetry.h"
#include "spectra/SpectralTable.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <fstream>
#include <optional>
#include <sstream>

namespace fs = std::filesystem;

namespace host {

namespace {

struct Table {
    std::vector<double> nm;
    std::vector<double> values;
};

std::string trim(const std::string& s)
{
    const auto begin = s.find_first_not_of(" \t\r");
    if (begin == std::string::npos)
        return "";
    return s.substr(begin, s.find_last_not_of(" \t\r") - begin + 1);
}

std::optional<double> parseNumber(const std::string& text)
{
    double value = 0;
    const auto [end, ec] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (ec != std::errc() || end != text.data() + text.size() || !std::isfinite(value))
        return std::nullopt;
    return value;
}

[[noreturn]] void fail(const fs::path& file, const std::string& message)
{
    throw SpectrumFileError(file.string() + ": " + message);
}

[[noreturn]] void failAt(const fs::path& file, size_t line, const std::string& message)
{
    throw SpectrumFileError(file.string() + ":" + std::to_string(line) + ": " + message);
}

// Cells split on commas (or semicolons); a line without either splits on white space.
std::vector<std::string> cells(const std::string& line)
{
    std::vector<std::string> out;
    std::string cell;
    const bool delimited = line.find_first_of(",;") != std::string::npos;
    std::istringstream in(line);
    if (delimited) {
        while (std::getline(in, cell, line.find(',') != std::string::npos ? ',' : ';'))
            out.push_back(trim(cell));
    } else {
        while (in >> cell)
            out.push_back(cell);
    }
    return out;
}

Table readCsv(const fs::path& file)
{
    std::ifstream in(file);
    Table table;
    std::string text;
    size_t line = 0;
    bool headerAllowed = true;
    while (std::getline(in, text)) {
        ++line;
        const std::string trimmed = trim(text);
        if (trimmed.empty() || trimmed[0] == '#')
            continue;
        const auto row = cells(trimmed);
        if (row.size() != 2)
            failAt(file, line, "expected two values (nm, value), found " + std::to_string(row.size()));
        const auto nm = parseNumber(row[0]);
        const auto value = parseNumber(row[1]);
        if (headerAllowed && !nm && !value) {
            headerAllowed = false; // a header naming the columns
            continue;
        }
        headerAllowed = false;
        if (!nm)
            failAt(file, line, "'" + row[0] + "' is not a wavelength");
        if (!value)
            failAt(file, line, "'" + row[1] + "' is not a number");
        if (!table.nm.empty() && *nm <= table.nm.back())
            failAt(file, line,
                   "wavelengths must ascend (" + row[0] + " nm after " + std::to_string(table.nm.back()) + " nm)");
        table.nm.push_back(*nm);
        table.values.push_back(*value);
    }
    if (table.nm.empty())
        fail(file, "no spectrum: the file has no (nm, value) rows");
    return table;
}

Table readCgats(const fs::path& file)
{
    spectra::SpectralTable cgats;
    try {
        cgats = spectra::loadSpectralTable(file.string());
    } catch (const std::exception& e) {
        // lcms2 says no more than that it could not parse the file.
        throw SpectrumFileError(std::string(e.what()) +
                                " (expected a spectral CGATS file, or a two-column nm,value table named *.csv)");
    }
    return {cgats.wavelengthsNm, cgats.sets.front()};
}

} // namespace

spectra::Source loadSpectrumFile(const fs::path& file)
{
    std::error_code ec;
    if (!fs::is_regular_file(file, ec))
        fail(file, fs::exists(file, ec) ? "not a file" : "no such file");
    if (fs::file_size(file, ec) == 0)
        fail(file, "empty file, no spectrum");
    std::ifstream probe(file);
    if (!probe)
        fail(file, "cannot be read");

    std::string extension = file.extension().string();
    std::transform(extension.begin(), extension.end(), extension.begin(),
                   [](unsigned char c) { return std::tolower(c); });
    const Table table = extension == ".csv" ? readCsv(file) : readCgats(file);

    for (double v : table.values)
        if (!std::isfinite(v))
            fail(file, "holds a value that is not a finite number");
    std::ostringstream range;
    range << table.nm.front() << "–" << table.nm.back() << " nm";
    if (table.nm.size() < 2 || table.nm.front() > kVisibleFirstNm || table.nm.back() < kVisibleLastNm)
        fail(file, "the spectrum covers " + range.str() + "; it must cover the visible range 400–700 nm");

    const spectra::Spectrum spectrum = spectra::resample(table.nm, table.values);
    if (!(spectra::tristimulus(spectrum).Y > 0))
        fail(file, "the spectrum has no light in the visible range");
    return {file.stem().string(), "file", spectra::atIlluminance(spectrum, spectra::kReferenceLux)};
}

std::vector<spectra::Source> loadSpectrumFiles(const std::vector<fs::path>& paths, std::vector<std::string>& errors)
{
    std::vector<fs::path> files;
    for (const fs::path& path : paths) {
        std::error_code ec;
        if (!fs::is_directory(path, ec)) {
            files.push_back(path);
            continue;
        }
        std::vector<fs::path> found;
        for (const auto& entry : fs::directory_iterator(path, ec)) {
            const std::string ext = entry.path().extension().string();
            if (entry.is_regular_file() && (ext == ".csv" || ext == ".sp"))
                found.push_back(entry.path());
        }
        if (found.empty())
            errors.push_back(path.string() + ": no *.csv or *.sp spectrum files in this folder");
        std::sort(found.begin(), found.end());
        files.insert(files.end(), found.begin(), found.end());
    }
    std::vector<spectra::Source> out;
    for (const fs::path& file : files) {
        try {
            out.push_back(loadSpectrumFile(file));
        } catch (const SpectrumFileError& e) {
            errors.push_back(e.what());
        }
    }
    return out;
}

} // namespace host
