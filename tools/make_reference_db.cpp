// Writes the reference light-source databases the plug-in ships
// (bzlight.sqlite, bzlight-02.sqlite) into a folder, or lists their sources.
//
//   make_reference_db OUTDIR      write both files into OUTDIR
//   make_reference_db --list      one line per source and file: ID, name,
//                                 family, x, y, CCT, Duv, near-infrared share

#include "spectra/Catalogue.h"
#include "spectra/Colorimetry.h"
#include "spectra/ReferenceDatabase.h"
#include "tools/ToolArguments.h"

#include <cstdio>
#include <exception>
#include <filesystem>
#include <map>

namespace {

using namespace spectra;

void list()
{
    for (const ReferenceFile& file : kReferenceFiles) {
        const std::vector<const Source*> sources = referenceSources(file.set);
        std::map<std::string, int> perFamily;
        for (size_t id = 0; id < sources.size(); ++id) {
            const Source& s = *sources[id];
            const Xy xy = chromaticity(tristimulus(s.spectrum));
            const std::optional<double> cct = correlatedColourTemperature(xy);
            const std::optional<double> duv = distanceFromLocus(xy);
            std::printf("%s %3zu %-36s %-17s x=%.4f y=%.4f cct=%6.0f duv=%+.4f nir=%.3f\n", file.fileName, id,
                        s.name.c_str(), s.family.c_str(), xy.x, xy.y, cct.value_or(0.0), duv.value_or(0.0),
                        integralFrom(s.spectrum, kNirTailStart) / integral(s.spectrum));
            ++perFamily[s.family];
        }
        for (const auto& [family, count] : perFamily)
            std::printf("%s family %-17s %d\n", file.fileName, family.c_str(), count);
        std::printf("%s total %zu\n", file.fileName, sources.size());
    }
}

void write(const std::filesystem::path& folder)
{
    std::filesystem::create_directories(folder);
    for (const ReferenceFile& file : kReferenceFiles)
        writeReferenceDatabase((folder / file.fileName).string(), file.version, referenceSources(file.set));
}

} // namespace

int main(int argc, char** argv)
{
    std::string folder;
    bool listOnly = false;
    if (const auto stop = parseToolArguments(argc, argv,
                                             {"Writes the reference light-source databases",
                                              "Folder that receives bzlight.sqlite and bzlight-02.sqlite", false,
                                              "--list", "List the sources of both files instead of writing them"},
                                             folder, listOnly))
        return *stop;

    try {
        if (listOnly) {
            list();
        } else if (folder.empty()) {
            std::fprintf(stderr, "make_reference_db: give an output folder or --list\n");
            return 2;
        } else {
            write(folder);
        }
    } catch (const std::exception& e) {
        std::fprintf(stderr, "make_reference_db: %s\n", e.what());
        return 1;
    }
    return 0;
}
