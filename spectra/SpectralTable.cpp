#include "spectra/SpectralTable.h"

#include <lcms2.h>

#include <cmath>
#include <memory>
#include <stdexcept>

namespace spectra {

namespace {

struct It8Free {
    void operator()(void* handle) const { cmsIT8Free(handle); }
};
using It8Handle = std::unique_ptr<void, It8Free>;

double requiredNumber(cmsHANDLE it8, const char* key, const std::string& path)
{
    if (cmsIT8GetProperty(it8, key) == nullptr)
        throw std::runtime_error(path + ": missing " + key);
    return cmsIT8GetPropertyDbl(it8, key);
}

} // namespace

SpectralTable loadSpectralTable(const std::string& path)
{
    It8Handle it8(cmsIT8LoadFromFile(nullptr, path.c_str()));
    if (!it8)
        throw std::runtime_error(path + ": cannot read CGATS file");

    const double start = requiredNumber(it8.get(), "SPECTRAL_START_NM", path);
    const double end = requiredNumber(it8.get(), "SPECTRAL_END_NM", path);
    const double bandValue = requiredNumber(it8.get(), "SPECTRAL_BANDS", path);
    const double setValue = requiredNumber(it8.get(), "NUMBER_OF_SETS", path);
    const int bands = int(std::lround(bandValue));
    const int sets = int(std::lround(setValue));
    if (bands < 2 || sets < 1 || !(end > start))
        throw std::runtime_error(path + ": implausible spectral range");

    SpectralTable table;
    table.wavelengthsNm.resize(static_cast<size_t>(bands));
    for (int b = 0; b < bands; ++b)
        table.wavelengthsNm[size_t(b)] = start + (end - start) * b / (bands - 1);
    for (int row = 0; row < sets; ++row) {
        std::vector<double> values(static_cast<size_t>(bands));
        for (int b = 0; b < bands; ++b) {
            if (cmsIT8GetDataRowCol(it8.get(), row, b) == nullptr)
                throw std::runtime_error(path + ": data block shorter than SPECTRAL_BANDS x NUMBER_OF_SETS");
            values[size_t(b)] = cmsIT8GetDataRowColDbl(it8.get(), row, b);
        }
        table.sets.push_back(std::move(values));
    }
    return table;
}

} // namespace spectra
