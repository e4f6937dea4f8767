// The factory-store layouts, parsed directly: XwCA T2, XwCl (one or two
// entries), VD6287 version 1 (converted to version 3) and version 3, each
// into the driver record, and then the channel-spectrum extraction of the
// record that parsed.
//
// Input: byte 0 picks the layout (0 XwCA T2, 1 XwCl, 2 VD6287 v1, 3 VD6287
// v3; any other value hands the bytes as they are, of any length, to every
// parser); byte 1 the chip type the plug-in has (XwCl spectra fold channel 0
// for types 1 and 2); the rest is the record, zero-padded or cut to the
// layout's exact size (XwCl: two entries when longer than one).
#include "common/FuzzSupport.h"

#include "calibration/SpectrumExtraction.h"
#include "calibration/XwClFormat.h"
#include "formats/VD6287Layout.h"
#include "formats/XwCAT2Layout.h"
#include "support/CFOwned.h"

#include <cstdlib>
#include <vector>

namespace {

enum Layout : uint8_t { XwCAT2, XwCl, VD6287v1, VD6287v3 };

std::vector<uint8_t> fitted(std::span<const uint8_t> payload, size_t size)
{
    std::vector<uint8_t> bytes(payload.begin(), payload.begin() + std::min(payload.size(), size));
    bytes.resize(size, 0);
    return bytes;
}

// Channel columns as the per-chip build asks for them.
void prepareColumns(VantishPlugIn& p, Matrices& m)
{
    const uint32_t chipType = parts(p).unit().chipType.load();
    const uint32_t rows = parts(p).unit().dbChannelCount.load();
    m.nChannels = int32_t(chipType == 1 || chipType == 2 ? rows : parts(p).unit().numberOfChannels.load());
}

void checkExtracted(VantishPlugIn& p, const Matrices& m, bool extracted)
{
    if (!extracted)
        return;
    // What the reference scan relies on: whole spectra for every column and
    // a weight for every sensor channel.
    if (m.nChannels < 1 ||
        m.channelSpectra.size() != size_t(m.nChannels) * parts(p).unit().spectrumSampleCount.load() ||
        m.channelWeights.size() != parts(p).unit().numberOfChannels.load())
        std::abort();
}

void parseXwCAT2(VantishPlugIn& p, CFDataRef data)
{
    CFOwned<CFDataRef> record = parts(p).calibration().processQVTCalibrationXwCAT2(data);
    if (!record)
        return;
    Matrices m;
    prepareColumns(p, m);
    checkExtracted(p, m, parts(p).calibration().processQVTSpectrumXwCAT2(data, m));
}

void parseXwCl(VantishPlugIn& p, CFDataRef data)
{
    const std::span<const uint8_t> bytes(CFDataGetBytePtr(data), size_t(CFDataGetLength(data)));
    const calib::XwClParse parsed = calib::parseXwClRecord(parts(p).calibration(), bytes);
    if (parsed.outcome != calib::XwClParse::Outcome::Record)
        return;
    if (!parsed.record)
        std::abort();
    Matrices m;
    prepareColumns(p, m);
    checkExtracted(p, m, calib::extractXwClSpectrum(parts(p).calibration(), bytes, parsed.entryOffset, m));
}

void parseVD6287v3(VantishPlugIn& p, CFDataRef data)
{
    CFOwned<CFDataRef> record = parts(p).calibration().processQVTCalibrationVD6287_XwClv3(data);
    if (!record)
        return;
    Matrices m;
    prepareColumns(p, m);
    checkExtracted(p, m, parts(p).calibration().processQVTSpectrumVD6287_XwClv3(data, m));
}

void parseVD6287v1(VantishPlugIn& p, CFDataRef data)
{
    CFOwned<CFDataRef> converted(parts(p).calibration().convertSorvelXwClv1Tov3(data));
    if (!converted)
        return;
    if (CFDataGetLength(converted.get()) != CFIndex(stored::vd6287::kV3Size))
        std::abort();
    parseVD6287v3(p, converted.get());
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size)
{
    fz::Workspace::get();
    fz::Input input(data, size);
    const uint8_t layout = input.take<uint8_t>();
    const uint8_t chipType = input.take<uint8_t>();

    vt::PlugIn plugin(vt::PlugIn::AtRelease::RunQueuedWorkFirst);
    parts(*plugin).unit().chipId = fz::kChipId;
    parts(*plugin).unit().chipType = chipType % 4;

    std::vector<uint8_t> bytes;
    switch (layout) {
    case XwCAT2:
        bytes = fitted(input.rest(), stored::xwca::kSize);
        break;
    case XwCl:
        bytes = fitted(input.rest(), input.size() > stored::xwcl::kOneEntrySize ? stored::xwcl::kTwoEntrySize
                                                                                : stored::xwcl::kOneEntrySize);
        break;
    case VD6287v1:
        bytes = fitted(input.rest(), stored::vd6287::kV1Size);
        break;
    case VD6287v3:
        bytes = fitted(input.rest(), stored::vd6287::kV3Size);
        break;
    default:
        bytes.assign(input.rest().begin(), input.rest().end());
        break;
    }
    CFOwned<CFDataRef> record(fz::createData(bytes));

    switch (layout) {
    case XwCAT2:
        parseXwCAT2(*plugin, record.get());
        break;
    case XwCl:
        parseXwCl(*plugin, record.get());
        break;
    case VD6287v1:
        parseVD6287v1(*plugin, record.get());
        break;
    case VD6287v3:
        parseVD6287v3(*plugin, record.get());
        break;
    default:
        // Bytes of any length: every parser must refuse what is not its size.
        parseXwCAT2(*plugin, record.get());
        parseXwCl(*plugin, record.get());
        parseVD6287v1(*plugin, record.get());
        parseVD6287v3(*plugin, record.get());
        break;
    }
    return 0;
}
