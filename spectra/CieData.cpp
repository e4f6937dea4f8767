#include "spectra/CieData.h"

#include "spectra/SpectralTable.h"

#include <stdexcept>

#ifndef VANTISH_COLORD_DIR
#define VANTISH_COLORD_DIR "/usr/share/colord"
#endif

namespace spectra {

namespace {

Spectrum onGrid(const SpectralTable& table, size_t set) { return resample(table.wavelengthsNm, table.sets.at(set)); }

CieData loadCieData()
{
    const SpectralTable cmf = loadSpectralTable(colordPath("cmf/CIE1931-2deg-XYZ.cmf"));
    const SpectralTable daylight = loadSpectralTable(colordPath("ref/CIE-1986-daylight-SPD.cmf"));
    if (cmf.sets.size() != 3 || daylight.sets.size() != 3)
        throw std::runtime_error("CIE tables: expected three sets in the CMF and daylight files");
    return CieData{onGrid(cmf, 0),      onGrid(cmf, 1),      onGrid(cmf, 2),
                   onGrid(daylight, 0), onGrid(daylight, 1), onGrid(daylight, 2)};
}

} // namespace

std::string colordPath(const std::string& relative) { return std::string(VANTISH_COLORD_DIR) + "/" + relative; }

const CieData& cieData()
{
    static const CieData data = loadCieData();
    return data;
}

TabulatedIlluminant loadIlluminant(const std::string& fileName)
{
    const SpectralTable table = loadSpectralTable(colordPath("illuminant/" + fileName));
    return TabulatedIlluminant{onGrid(table, 0), table.wavelengthsNm.front(), table.wavelengthsNm.back()};
}

} // namespace spectra
