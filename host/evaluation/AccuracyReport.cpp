#include "host/evaluation/AccuracyReport.h"

#include "host/evaluation/ChromaticityDiagram.h"
#include "host/evaluation/XmlEscape.h"

#include <cstdio>
#include <ostream>

namespace host {

namespace {

std::string fixed(double v, int decimals)
{
    char text[48];
    std::snprintf(text, sizeof text, "%.*f", decimals, v);
    return text;
}

std::string cct(const std::optional<double>& k) { return k ? fixed(*k, 0) : "–"; }
std::string signedCct(const std::optional<double>& k) { return k ? (*k > 0 ? "+" : "") + fixed(*k, 0) : "–"; }

constexpr const char* kStyle = R"(
body { font-family: sans-serif; margin: 24px; color: #222222; }
h1 { font-size: 20px; }
h2 { font-size: 16px; margin-top: 28px; }
table { border-collapse: collapse; font-size: 13px; }
th, td { border: 1px solid #cccccc; padding: 3px 7px; text-align: right; }
th { background: #f0f0f0; }
td.name { text-align: left; font-family: monospace; }
td.missing { color: #999999; }
.figures svg { margin: 8px 16px 8px 0; vertical-align: top; }
p.note { font-size: 13px; color: #555555; max-width: 60em; }
)";

void summaryTable(std::ostream& out, const std::vector<LightResult>& results)
{
    out << "<table id=\"summary\">\n<tr><th>estimate</th><th>lights</th><th>median Δu′v′</th>"
           "<th>95th percentile</th><th>maximum</th></tr>\n";
    const std::pair<const char*, Estimate LightResult::*> rows[] = {{"plug-in", &LightResult::plugIn},
                                                                    {"global matrix", &LightResult::baseline}};
    for (const auto& [label, which] : rows) {
        const ErrorSummary s = summarise(results, which);
        out << "<tr><td class=\"name\">" << label << "</td><td>" << s.count;
        if (s.missing)
            out << " (" << s.missing << " without colour)";
        out << "</td><td>" << fixed(s.median, 4) << "</td><td>" << fixed(s.p95, 4) << "</td><td>" << fixed(s.max, 4)
            << "</td></tr>\n";
    }
    out << "</table>\n";
}

void estimateCells(std::ostream& out, const Estimate& e)
{
    if (!e.valid) {
        out << "<td class=\"missing\" colspan=\"4\">no colour</td>";
        return;
    }
    out << "<td>" << fixed(e.xy.x, 4) << "</td><td>" << fixed(e.xy.y, 4) << "</td><td>" << fixed(e.deltaUv, 4)
        << "</td><td>" << signedCct(e.deltaCct) << "</td>";
}

void lightTable(std::ostream& out, const std::vector<LightResult>& results)
{
    out << "<table id=\"lights\">\n"
           "<tr><th rowspan=\"2\">light</th><th colspan=\"3\">true</th><th colspan=\"4\">plug-in</th>"
           "<th colspan=\"4\">global matrix</th></tr>\n"
           "<tr><th>x</th><th>y</th><th>CCT (K)</th><th>x</th><th>y</th><th>Δu′v′</th><th>ΔCCT (K)</th>"
           "<th>x</th><th>y</th><th>Δu′v′</th><th>ΔCCT (K)</th></tr>\n";
    for (const LightResult& r : results) {
        out << "<tr><td class=\"name\">" << xmlEscape(r.name) << "</td><td>" << fixed(r.trueXy.x, 4) << "</td><td>"
            << fixed(r.trueXy.y, 4) << "</td><td>" << cct(r.trueCct) << "</td>";
        estimateCells(out, r.plugIn);
        estimateCells(out, r.baseline);
        out << "</tr>\n";
    }
    out << "</table>\n";
}

} // namespace

void writeAccuracyReport(std::ostream& out, const ReportContext& c, const std::vector<LightResult>& results)
{
    const std::string unit = xmlEscape(c.unitName);
    out << "<!DOCTYPE html>\n"
        << "<html xmlns=\"http://www.w3.org/1999/xhtml\" lang=\"en\">\n<head>\n<meta charset=\"utf-8\"/>\n"
        << "<title>Colour accuracy of " << unit << "</title>\n<style>" << kStyle << "</style>\n</head>\n<body>\n";
    out << "<h1>Colour accuracy of " << unit << "</h1>\n";
    if (!c.unitSummary.empty())
        out << "<p>" << xmlEscape(c.unitSummary) << "</p>\n";
    out << "<p class=\"note\">Device description " << xmlEscape(c.deviceFile) << ". Channel spectra from "
        << xmlEscape(c.spectraOrigin) << ". Lights: " << xmlEscape(c.lightsName) << ", each read once at "
        << fixed(c.lux, 0) << " lux without noise. The plug-in's estimate went through the filter of the "
        << "loaded bundle; the global matrix is one least-squares channel-to-XYZ matrix fitted over the "
        << "reference sources of " << xmlEscape(c.referenceSet) << ", applied to the same readings. True values "
        << "are CIE 1931 2° colorimetry of the spectra; CCT from lcms2.</p>\n";

    out << "<h2>Summary</h2>\n";
    summaryTable(out, results);
    out << "<h2>CIE 1931 chromaticity</h2>\n<div class=\"figures\">\n";
    out << chromaticityDiagramSvg(results, fullDiagramView(), 520, "CIE 1931 xy diagram");
    out << chromaticityDiagramSvg(results, closeUpView(results), 520, "Close-up of the lights");
    out << "</div>\n<h2>Lights</h2>\n";
    lightTable(out, results);
    out << "</body>\n</html>\n";
}

} // namespace host
