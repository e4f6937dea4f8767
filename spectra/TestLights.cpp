#include "spectra/TestLights.h"

#include "spectra/CieData.h"
#include "spectra/CieIlluminants.h"
#include "spectra/Colorimetry.h"
#include "spectra/Daylight.h"
#include "spectra/Discharge.h"
#include "spectra/Fluorescent.h"
#include "spectra/Led.h"
#include "spectra/Mixing.h"
#include "spectra/Planck.h"

#include <functional>
#include <optional>
#include <stdexcept>
#include <string>

namespace spectra {

namespace {

using Maker = std::function<std::optional<Spectrum>()>;

struct Recipe {
    const char* name;
    const char* family;
    Maker make;
};

Spectrum mix(const Spectrum& first, const Spectrum& second, double secondShare)
{
    const Share shares[] = {{&first, 1.0 - secondShare}, {&second, secondShare}};
    return mixByIlluminance(shares);
}

// A tabulated CIE illuminant carried into the near infrared like the daylight model.
Spectrum tabulatedDaylight(const char* file, double kelvin)
{
    const TabulatedIlluminant t = loadIlluminant(file);
    return withPlanckTail(t.values, sampleAtOrBelow(t.lastNm), kelvin);
}

Spectrum solved(const std::optional<Spectrum>& s, const char* what)
{
    if (!s)
        throw std::runtime_error(std::string("test light part has no solution: ") + what);
    return *s;
}

std::vector<Recipe> recipes()
{
    return {
        // White LEDs: pumps, phosphor peaks and widths, and temperatures off both grids.
        {"test-led-447-567-118-4200K", "led",
         [] {
             return whiteLed({447, 567, 118, 0, 0, 4200});
         }},
        {"test-led-453-563-122-5300K", "led",
         [] {
             return whiteLed({453, 563, 122, 0, 0, 5300});
         }},
        {"test-led-442-557-95-6200K", "led",
         [] {
             return whiteLed({442, 557, 95, 0, 0, 6200});
         }},
        {"test-led-442-573-118-3800K", "led",
         [] {
             return whiteLed({442, 573, 118, 0, 0, 3800});
         }},
        {"test-ledr-448-538-102-r622w70-3300K", "led-red",
         [] {
             return whiteLed({448, 538, 102, 622, 70, 3300});
         }},
        {"test-ledr-452-550-110-r640w20-2400K", "led-red",
         [] {
             return whiteLed({452, 550, 110, 640, 20, 2400});
         }},
        {"test-ledv-410-4500K", "led-violet", [] { return violetPumpedLed(410, 4500); }},
        // Daylight between the sampled temperatures, and tabulated CIE daylights.
        {"test-daylight-5450K", "daylight", [] { return cieDaylight(5450); }},
        {"test-daylight-6550K", "daylight", [] { return cieDaylight(6550); }},
        {"test-daylight-8125K", "daylight", [] { return cieDaylight(8125); }},
        {"test-daylight-11500K", "daylight", [] { return cieDaylight(11500); }},
        {"test-cie-d55", "cie", [] { return tabulatedDaylight("CIE-D55.sp", 5503); }},
        {"test-cie-d93", "cie", [] { return tabulatedDaylight("CIE-D93.sp", 9305); }},
        // Thermal: a dimmed incandescent lamp and a halogen lamp between the 100 K steps.
        {"test-incandescent-dimmed-2250K", "planck", [] { return planck(2250); }},
        {"test-halogen-3150K", "planck", [] { return planck(3150); }},
        // Discharge lamps off the grid.
        {"test-tri-4200K-duvp3-c10", "fluorescent",
         [] {
             return triPhosphorLamp({4200, 0.003, 0.10});
         }},
        {"test-tri-3300K-duvm3-c8", "fluorescent",
         [] {
             return triPhosphorLamp({3300, -0.003, 0.08});
         }},
        {"test-hps-b10.5-ir15", "sodium",
         [] {
             return highPressureSodium({10.5, 1.5});
         }},
        {"test-mh-ceramic-4200K", "metal-halide", [] { return metalHalide(BurnerKind::Ceramic, 4200); }},
        // Mixtures at other ratios and with other parts.
        {"test-mix-d55-ledr2700-35", "mix-led",
         [] {
             return mix(cieDaylight(5503), solved(whiteLed({450, 545, 105, 630, 90, 2700}), "ledr2700"), 0.35);
         }},
        {"test-mix-a-tri4000-50", "mix-incandescent",
         [] {
             return mix(cieA(), solved(triPhosphorLamp({4000, 0.0, 0.05}), "tri4000"), 0.50);
         }},
        {"test-mix-d65-halogen3150-45", "mix-incandescent", [] { return mix(cieD65(), planck(3150), 0.45); }},
        {"test-mix-led4000-ledr2700-50", "mix-led",
         [] {
             return mix(solved(whiteLed({450, 570, 115, 0, 0, 4000}), "led4000"),
                        solved(whiteLed({450, 545, 105, 630, 90, 2700}), "ledr2700"), 0.50);
         }},
    };
}

std::vector<Source> build()
{
    std::vector<Source> lights;
    for (const Recipe& r : recipes()) {
        const std::optional<Spectrum> s = r.make();
        if (!s)
            throw std::runtime_error(std::string("test light has no solution: ") + r.name);
        lights.push_back(Source{r.name, r.family, atIlluminance(*s, kReferenceLux)});
    }
    return lights;
}

} // namespace

const std::vector<Source>& testLights()
{
    static const std::vector<Source> lights = build();
    return lights;
}

const Source* findTestLight(std::string_view name)
{
    for (const Source& s : testLights())
        if (s.name == name)
            return &s;
    return nullptr;
}

} // namespace spectra
