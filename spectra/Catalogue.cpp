#include "spectra/Catalogue.h"

#include "spectra/CieIlluminants.h"
#include "spectra/Colorimetry.h"
#include "spectra/Daylight.h"
#include "spectra/Discharge.h"
#include "spectra/Fluorescent.h"
#include "spectra/Led.h"
#include "spectra/Mixing.h"
#include "spectra/Planck.h"

#include <functional>
#include <map>
#include <optional>
#include <string>

namespace spectra {

namespace {

std::string str(int value) { return std::to_string(value); }
std::string kelvinName(int kelvin) { return str(kelvin) + "K"; }

// Ranges of integer parameters: first, last, step (inclusive).
std::vector<int> steps(int first, int last, int step)
{
    std::vector<int> values;
    for (int v = first; v <= last; v += step)
        values.push_back(v);
    return values;
}

std::vector<int> joined(std::initializer_list<std::vector<int>> parts)
{
    std::vector<int> all;
    for (const auto& part : parts)
        all.insert(all.end(), part.begin(), part.end());
    return all;
}

struct PhosphorBand {
    int peakNm;
    int fwhmNm;
};

// The daylight of a mixture, by its CIE name.
struct DaylightPart {
    const char* tag;
    double kelvin;
};
constexpr DaylightPart kD50{"d50", 5003.0};
constexpr DaylightPart kD65{"d65", 6504.0};

// The LEDs that mixtures use, by short tag.
struct LedPart {
    const char* tag;
    WhiteLed led;
};
constexpr LedPart kLed6500{"led6500", {450, 560, 115, 0, 0, 6500}};
constexpr LedPart kLed5000{"led5000", {450, 565, 115, 0, 0, 5000}};
constexpr LedPart kLed4000{"led4000", {450, 570, 115, 0, 0, 4000}};
constexpr LedPart kLedRed3000{"ledr3000", {450, 545, 105, 630, 90, 3000}};
constexpr LedPart kLedRed2700{"ledr2700", {450, 545, 105, 630, 90, 2700}};

// What a reference set contains, family by family.
struct SetRecipe {
    std::vector<int> planckKelvins;
    std::vector<int> daylightKelvins;
    std::vector<int> ledPumps;
    std::vector<PhosphorBand> ledPhosphors;
    std::vector<int> ledKelvins;
    std::vector<int> redLedPumps;
    std::vector<PhosphorBand> redLedPhosphors;
    std::vector<PhosphorBand> redLedReds;
    std::vector<int> redLedKelvins;
    std::vector<int> violetPumps;
    std::vector<int> violetKelvins;
    std::vector<int> triKelvins;
    std::vector<int> triDuvThousandths;
    std::vector<int> triContinuumPercent;
    std::vector<int> sodiumBroadenings;
    std::vector<int> sodiumInfraredTenths;
    std::vector<int> halideKelvins;
    std::vector<DaylightPart> mixDaylights;
    std::vector<int> incandescentPercents;
    std::vector<LedPart> mixLeds;
    std::vector<int> ledPercents;
    std::vector<LedPart> incandescentLedMixes;
    std::vector<int> incandescentLedPercents;
};

SetRecipe defaultRecipe()
{
    SetRecipe r;
    r.planckKelvins = joined({steps(1800, 2800, 100), {2856}, steps(2900, 4000, 100)});
    r.daylightKelvins = joined({steps(4000, 7000, 100), steps(7250, 10000, 250), steps(11000, 25000, 1000)});
    r.ledPumps = {440, 445, 450, 455, 460};
    r.ledPhosphors = {{555, 100}, {555, 130}, {560, 100}, {560, 115}, {560, 130}, {565, 100},
                      {565, 115}, {565, 130}, {570, 100}, {570, 115}, {570, 130}};
    r.ledKelvins = {4000, 4500, 5000, 5700, 6500};
    r.redLedPumps = {445, 450, 455};
    r.redLedPhosphors = {{530, 100}, {545, 105}};
    r.redLedReds = {{615, 80}, {630, 90}, {631, 16}};
    r.redLedKelvins = {2200, 2700, 3000, 3500, 4000};
    r.triKelvins = {2700, 3000, 3500, 4000, 5000, 6500};
    r.triDuvThousandths = {-6, 0, 6};
    r.triContinuumPercent = {5, 15};
    r.sodiumBroadenings = {6, 9, 12, 15, 18};
    r.sodiumInfraredTenths = {10, 20};
    r.halideKelvins = {3000, 3500, 4000, 4500, 5500};
    r.mixDaylights = {kD50, kD65};
    r.incandescentPercents = steps(10, 90, 10);
    r.mixLeds = {kLed6500, kLed5000, kLed4000, kLedRed3000};
    r.ledPercents = {20, 40, 60, 80};
    return r;
}

SetRecipe dense02Recipe()
{
    SetRecipe r = defaultRecipe();
    r.daylightKelvins = joined({steps(4000, 7000, 100), steps(7500, 10000, 500), steps(12000, 20000, 2000)});
    r.ledPumps = {440, 444, 448, 452, 456, 460};
    r.ledPhosphors = {{555, 100}, {555, 115}, {555, 130}, {558, 100}, {558, 115}, {558, 130},
                      {561, 100}, {561, 115}, {561, 130}, {564, 100}, {564, 115}, {564, 130},
                      {567, 100}, {567, 115}, {567, 130}, {570, 100}, {570, 115}, {570, 130}};
    r.ledKelvins = {4000, 4500, 5000, 5500, 6000, 6500};
    r.redLedPhosphors = {{525, 95}, {535, 100}, {545, 105}};
    r.redLedReds = {{610, 80}, {620, 85}, {630, 90}, {631, 16}};
    r.redLedKelvins = {2200, 2500, 2700, 3000, 3500, 4000};
    r.violetPumps = {405, 415};
    r.violetKelvins = {2700, 3000, 3500, 4000, 5000, 5700, 6500};
    r.mixLeds = {kLed6500, kLed5000, kLed4000, kLedRed3000, kLedRed2700};
    r.incandescentLedMixes = {kLed6500, kLed5000, kLed4000, kLedRed3000};
    r.incandescentLedPercents = {25, 50, 75};
    return r;
}

struct Catalogue {
    std::vector<Source> sources;
    std::map<std::string, size_t, std::less<>> index;
    std::vector<size_t> defaultSet;
    std::vector<size_t> dense02Set;
};

class Builder {
public:
    explicit Builder(Catalogue& catalogue) : c_(catalogue) {}

    // Adds the source to the catalogue (once per name) and to `set`; a model
    // without a solution adds nothing.
    void add(std::vector<size_t>& set, const std::string& name, const char* family,
             const std::function<std::optional<Spectrum>()>& make)
    {
        if (const auto found = c_.index.find(name); found != c_.index.end()) {
            set.push_back(found->second);
            return;
        }
        const std::optional<Spectrum> spectrum = make();
        if (!spectrum)
            return;
        c_.index.emplace(name, c_.sources.size());
        set.push_back(c_.sources.size());
        c_.sources.push_back(Source{name, family, atIlluminance(*spectrum, kReferenceLux)});
    }

    void addSet(std::vector<size_t>& set, const SetRecipe& r)
    {
        addThermal(set, r);
        addLeds(set, r);
        addDischarge(set, r);
        addMixtures(set, r);
    }

private:
    void addThermal(std::vector<size_t>& set, const SetRecipe& r);
    void addLeds(std::vector<size_t>& set, const SetRecipe& r);
    void addDischarge(std::vector<size_t>& set, const SetRecipe& r);
    void addMixtures(std::vector<size_t>& set, const SetRecipe& r);

    Catalogue& c_;
};

std::string ledName(const WhiteLed& l)
{
    std::string name = (l.redPeakNm > 0 ? "ledr-" : "led-") + str(int(l.pumpNm)) + "-" + str(int(l.phosphorPeakNm)) +
                       "-" + str(int(l.phosphorFwhmNm));
    if (l.redPeakNm > 0)
        name += "-r" + str(int(l.redPeakNm)) + "w" + str(int(l.redFwhmNm));
    return name + "-" + kelvinName(int(l.kelvin));
}

std::string duvTag(int thousandths)
{
    if (thousandths == 0)
        return "duv0";
    return (thousandths > 0 ? "duvp" : "duvm") + str(thousandths > 0 ? thousandths : -thousandths);
}

void Builder::addThermal(std::vector<size_t>& set, const SetRecipe& r)
{
    for (int k : r.planckKelvins)
        add(set, "planck-" + kelvinName(k), "planck", [k] { return planck(k); });
    for (int k : r.daylightKelvins)
        add(set, "daylight-" + kelvinName(k), "daylight", [k] { return cieDaylight(k); });
    add(set, "cie-a", "cie", [] { return cieA(); });
    add(set, "cie-b", "cie", [] { return cieB(); });
    add(set, "cie-c", "cie", [] { return cieC(); });
    add(set, "cie-d65", "cie", [] { return cieD65(); });
    for (int n = 1; n <= 12; ++n)
        add(set, "cie-f" + str(n), "cie", [n] { return cieF(n); });
}

void Builder::addLeds(std::vector<size_t>& set, const SetRecipe& r)
{
    for (int pump : r.ledPumps)
        for (PhosphorBand p : r.ledPhosphors)
            for (int k : r.ledKelvins) {
                const WhiteLed led{double(pump), double(p.peakNm), double(p.fwhmNm), 0, 0, double(k)};
                add(set, ledName(led), "led", [led] { return whiteLed(led); });
            }
    for (int pump : r.redLedPumps)
        for (PhosphorBand p : r.redLedPhosphors)
            for (PhosphorBand red : r.redLedReds)
                for (int k : r.redLedKelvins) {
                    const WhiteLed led{double(pump),       double(p.peakNm),   double(p.fwhmNm),
                                       double(red.peakNm), double(red.fwhmNm), double(k)};
                    add(set, ledName(led), "led-red", [led] { return whiteLed(led); });
                }
    for (int pump : r.violetPumps)
        for (int k : r.violetKelvins)
            add(set, "ledv-" + str(pump) + "-" + kelvinName(k), "led-violet",
                [pump, k] { return violetPumpedLed(pump, k); });
}

void Builder::addDischarge(std::vector<size_t>& set, const SetRecipe& r)
{
    for (int k : r.triKelvins)
        for (int duv : r.triDuvThousandths)
            for (int c : r.triContinuumPercent)
                add(set, "tri-" + kelvinName(k) + "-" + duvTag(duv) + "-c" + str(c), "fluorescent", [=] {
                    return triPhosphorLamp({double(k), duv / 1000.0, c / 100.0});
                });
    for (int b : r.sodiumBroadenings)
        for (int ir : r.sodiumInfraredTenths)
            add(set, "hps-b" + str(b) + "-ir" + str(ir), "sodium", [=] {
                return highPressureSodium({double(b), ir / 10.0});
            });
    add(set, "lps", "sodium", [] { return lowPressureSodium(); });
    for (BurnerKind kind : {BurnerKind::Quartz, BurnerKind::Ceramic})
        for (int k : r.halideKelvins)
            add(set, std::string(kind == BurnerKind::Quartz ? "mh-quartz-" : "mh-ceramic-") + kelvinName(k),
                "metal-halide", [=] { return metalHalide(kind, k); });
}

void Builder::addMixtures(std::vector<size_t>& set, const SetRecipe& r)
{
    // "mix-<first>-<second>-<p>": p % of the illuminance from the second part.
    const auto mix = [](const Spectrum& first, const Spectrum& second, int percent) -> std::optional<Spectrum> {
        const Share shares[] = {{&first, 1.0 - percent / 100.0}, {&second, percent / 100.0}};
        return mixByIlluminance(shares);
    };
    const Spectrum incandescent = cieA();
    for (DaylightPart day : r.mixDaylights) {
        const Spectrum sky = cieDaylight(day.kelvin);
        const std::string prefix = std::string("mix-") + day.tag + "-";
        for (int pct : r.incandescentPercents)
            add(set, prefix + "a-" + str(pct), "mix-incandescent", [&, pct] { return mix(sky, incandescent, pct); });
        for (const LedPart& part : r.mixLeds) {
            const Spectrum led = whiteLed(part.led).value();
            for (int pct : r.ledPercents)
                add(set, prefix + part.tag + "-" + str(pct), "mix-led", [&, pct] { return mix(sky, led, pct); });
        }
    }
    for (const LedPart& part : r.incandescentLedMixes) {
        const Spectrum led = whiteLed(part.led).value();
        for (int pct : r.incandescentLedPercents)
            add(set, std::string("mix-a-") + part.tag + "-" + str(pct), "mix-led",
                [&, pct] { return mix(incandescent, led, pct); });
    }
}

Catalogue build()
{
    Catalogue c;
    Builder builder(c);
    builder.addSet(c.defaultSet, defaultRecipe());
    builder.addSet(c.dense02Set, dense02Recipe());
    return c;
}

const Catalogue& instance()
{
    static const Catalogue c = build();
    return c;
}

} // namespace

const std::vector<Source>& catalogue() { return instance().sources; }

const Source* findSource(std::string_view name)
{
    const Catalogue& c = instance();
    const auto found = c.index.find(name);
    return found == c.index.end() ? nullptr : &c.sources[found->second];
}

std::vector<const Source*> referenceSources(ReferenceSet set)
{
    const Catalogue& c = instance();
    std::vector<const Source*> out;
    for (size_t i : set == ReferenceSet::Default ? c.defaultSet : c.dense02Set)
        out.push_back(&c.sources[i]);
    return out;
}

} // namespace spectra
