#include "host/evaluation/ChromaticityDiagram.h"

#include "host/evaluation/XmlEscape.h"
#include "spectra/CieData.h"

#include <algorithm>
#include <cmath>
#include <cstdio>
#include <sstream>

namespace host {

namespace {

constexpr double kMarginLeft = 56, kMarginRight = 16, kMarginTop = 34, kMarginBottom = 44;
constexpr const char* kPlugInColour = "#1f5fbf";
constexpr const char* kBaselineColour = "#d9661a";
constexpr const char* kTrueColour = "#111111";

std::string num(double v)
{
    char text[32];
    std::snprintf(text, sizeof text, "%.1f", v);
    return text;
}

std::string label(double v, double step)
{
    const int decimals = std::max(1, int(std::ceil(-std::log10(step) - 1e-9)));
    if (std::abs(v) < step / 2)
        v = 0.0; // not "-0.0"
    char text[32];
    std::snprintf(text, sizeof text, "%.*f", decimals, v);
    return text;
}

// The plot's mapping from chromaticity to pixels (equal scale on both axes).
struct Frame {
    DiagramView view;
    double scale = 1; // px per unit chromaticity
    double width = 0, height = 0;

    double px(double x) const { return kMarginLeft + (x - view.xMin) * scale; }
    double py(double y) const { return kMarginTop + (view.yMax - y) * scale; }
    std::string point(const spectra::Xy& xy) const { return num(px(xy.x)) + "," + num(py(xy.y)); }
    bool inside(const spectra::Xy& xy) const
    {
        return xy.x >= view.xMin && xy.x <= view.xMax && xy.y >= view.yMin && xy.y <= view.yMax;
    }
};

double tickStep(double range)
{
    for (double step : {0.001, 0.002, 0.005, 0.01, 0.02, 0.05, 0.1, 0.2})
        if (range / step <= 10.0)
            return step;
    return 0.5;
}

void axes(std::ostream& svg, const Frame& f)
{
    const DiagramView& v = f.view;
    svg << "<rect x=\"" << num(f.px(v.xMin)) << "\" y=\"" << num(f.py(v.yMax)) << "\" width=\""
        << num(f.px(v.xMax) - f.px(v.xMin)) << "\" height=\"" << num(f.py(v.yMin) - f.py(v.yMax))
        << "\" fill=\"#ffffff\" stroke=\"#444444\"/>\n";
    const double step = tickStep(std::max(v.xMax - v.xMin, v.yMax - v.yMin));
    svg << "<g font-size=\"11\" fill=\"#333333\" stroke=\"none\">\n";
    for (double t = std::ceil(v.xMin / step - 1e-9) * step; t <= v.xMax + 1e-9; t += step) {
        svg << "<line x1=\"" << num(f.px(t)) << "\" y1=\"" << num(f.py(v.yMin)) << "\" x2=\"" << num(f.px(t))
            << "\" y2=\"" << num(f.py(v.yMax)) << "\" stroke=\"#e4e4e4\"/>";
        svg << "<line x1=\"" << num(f.px(t)) << "\" y1=\"" << num(f.py(v.yMin)) << "\" x2=\"" << num(f.px(t))
            << "\" y2=\"" << num(f.py(v.yMin) + 5) << "\" stroke=\"#444444\"/>";
        svg << "<text x=\"" << num(f.px(t)) << "\" y=\"" << num(f.py(v.yMin) + 17) << "\" text-anchor=\"middle\">"
            << label(t, step) << "</text>\n";
    }
    for (double t = std::ceil(v.yMin / step - 1e-9) * step; t <= v.yMax + 1e-9; t += step) {
        svg << "<line x1=\"" << num(f.px(v.xMin)) << "\" y1=\"" << num(f.py(t)) << "\" x2=\"" << num(f.px(v.xMax))
            << "\" y2=\"" << num(f.py(t)) << "\" stroke=\"#e4e4e4\"/>";
        svg << "<line x1=\"" << num(f.px(v.xMin) - 5) << "\" y1=\"" << num(f.py(t)) << "\" x2=\"" << num(f.px(v.xMin))
            << "\" y2=\"" << num(f.py(t)) << "\" stroke=\"#444444\"/>";
        svg << "<text x=\"" << num(f.px(v.xMin) - 8) << "\" y=\"" << num(f.py(t) + 4) << "\" text-anchor=\"end\">"
            << label(t, step) << "</text>\n";
    }
    svg << "<text x=\"" << num((f.px(v.xMin) + f.px(v.xMax)) / 2) << "\" y=\"" << num(f.height - 6)
        << "\" text-anchor=\"middle\" font-style=\"italic\">x</text>\n";
    svg << "<text x=\"14\" y=\"" << num((f.py(v.yMin) + f.py(v.yMax)) / 2)
        << "\" text-anchor=\"middle\" font-style=\"italic\">y</text>\n";
    svg << "</g>\n";
}

// The chromaticities of the monochromatic stimuli, 380–700 nm (beyond, the
// locus barely moves while the colour-matching functions fade).
std::vector<spectra::Xy> spectralLocus()
{
    const spectra::CieData& cie = spectra::cieData();
    std::vector<spectra::Xy> points;
    for (int i = spectra::sampleAtOrBelow(380); i <= spectra::sampleAtOrBelow(700); ++i) {
        const size_t s = size_t(i);
        const double sum = cie.xBar[s] + cie.yBar[s] + cie.zBar[s];
        if (sum > 0)
            points.push_back({cie.xBar[s] / sum, cie.yBar[s] / sum});
    }
    return points;
}

std::vector<spectra::Xy> planckianLocus()
{
    std::vector<spectra::Xy> points;
    constexpr int kPoints = 120;
    for (int i = 0; i <= kPoints; ++i)
        points.push_back(spectra::planckianChromaticity(1000.0 * std::pow(25.0, double(i) / kPoints)));
    return points;
}

std::string polyline(const Frame& f, const std::vector<spectra::Xy>& points)
{
    std::string text;
    for (const auto& p : points)
        text += f.point(p) + " ";
    return text;
}

void loci(std::ostream& svg, const Frame& f, const std::string& clip)
{
    svg << "<g clip-path=\"url(#" << clip << ")\" fill=\"none\">\n";
    svg << "<polygon points=\"" << polyline(f, spectralLocus())
        << "\" stroke=\"#777777\" stroke-width=\"1.2\" fill=\"#f6f6f6\"/>\n";
    svg << "<polyline points=\"" << polyline(f, planckianLocus())
        << "\" stroke=\"#9a2a2a\" stroke-width=\"1\"><title>Planckian locus, 1000–25000 K</title></polyline>\n";
    for (double k : {1500.0, 2000.0, 3000.0, 4000.0, 5000.0, 6500.0, 10000.0}) {
        const spectra::Xy p = spectra::planckianChromaticity(k);
        if (!f.inside(p))
            continue;
        svg << "<circle cx=\"" << num(f.px(p.x)) << "\" cy=\"" << num(f.py(p.y))
            << "\" r=\"1.8\" fill=\"#9a2a2a\"/><text x=\"" << num(f.px(p.x) + 3) << "\" y=\"" << num(f.py(p.y) + 12)
            << "\" font-size=\"9\" fill=\"#9a2a2a\">" << int(k) << " K</text>\n";
    }
    svg << "</g>\n";
}

void lights(std::ostream& svg, const Frame& f, const std::vector<LightResult>& results, const std::string& clip)
{
    svg << "<g clip-path=\"url(#" << clip << ")\">\n";
    for (const LightResult& r : results) {
        const std::string name = xmlEscape(r.name);
        if (r.baseline.valid) {
            svg << "<line x1=\"" << num(f.px(r.trueXy.x)) << "\" y1=\"" << num(f.py(r.trueXy.y)) << "\" x2=\""
                << num(f.px(r.baseline.xy.x)) << "\" y2=\"" << num(f.py(r.baseline.xy.y)) << "\" stroke=\""
                << kBaselineColour << "\" stroke-width=\"0.8\" stroke-dasharray=\"2,2\"/>";
            const double x = f.px(r.baseline.xy.x), y = f.py(r.baseline.xy.y);
            svg << "<path d=\"M" << num(x - 3) << "," << num(y - 3) << " L" << num(x + 3) << "," << num(y + 3) << " M"
                << num(x - 3) << "," << num(y + 3) << " L" << num(x + 3) << "," << num(y - 3) << "\" stroke=\""
                << kBaselineColour << "\" stroke-width=\"1.6\"><title>" << name << ": global matrix</title></path>\n";
        }
        if (r.plugIn.valid) {
            svg << "<line x1=\"" << num(f.px(r.trueXy.x)) << "\" y1=\"" << num(f.py(r.trueXy.y)) << "\" x2=\""
                << num(f.px(r.plugIn.xy.x)) << "\" y2=\"" << num(f.py(r.plugIn.xy.y)) << "\" stroke=\"" << kPlugInColour
                << "\" stroke-width=\"1.4\"/>";
            svg << "<circle cx=\"" << num(f.px(r.plugIn.xy.x)) << "\" cy=\"" << num(f.py(r.plugIn.xy.y))
                << "\" r=\"2.6\" fill=\"" << kPlugInColour << "\"><title>" << name << ": plug-in</title></circle>\n";
        }
        svg << "<circle cx=\"" << num(f.px(r.trueXy.x)) << "\" cy=\"" << num(f.py(r.trueXy.y))
            << "\" r=\"3.6\" fill=\"none\" stroke=\"" << kTrueColour << "\" stroke-width=\"1.2\"><title>" << name
            << ": true</title></circle>\n";
    }
    svg << "</g>\n";
}

void legend(std::ostream& svg, const Frame& f)
{
    const double x = f.px(f.view.xMax) - 150, y = f.py(f.view.yMax) + 8;
    svg << "<g font-size=\"11\" fill=\"#222222\">\n";
    svg << "<rect x=\"" << num(x) << "\" y=\"" << num(y) << "\" width=\"142\" height=\"66\" fill=\"#ffffff\" "
        << "stroke=\"#999999\" fill-opacity=\"0.9\"/>\n";
    svg << "<circle cx=\"" << num(x + 12) << "\" cy=\"" << num(y + 14) << "\" r=\"3.6\" fill=\"none\" stroke=\""
        << kTrueColour << "\" stroke-width=\"1.2\"/><text x=\"" << num(x + 24) << "\" y=\"" << num(y + 18)
        << "\">true chromaticity</text>\n";
    svg << "<line x1=\"" << num(x + 4) << "\" y1=\"" << num(y + 32) << "\" x2=\"" << num(x + 12) << "\" y2=\""
        << num(y + 32) << "\" stroke=\"" << kPlugInColour << "\" stroke-width=\"1.4\"/><circle cx=\"" << num(x + 12)
        << "\" cy=\"" << num(y + 32) << "\" r=\"2.6\" fill=\"" << kPlugInColour << "\"/><text x=\"" << num(x + 24)
        << "\" y=\"" << num(y + 36) << "\">plug-in estimate</text>\n";
    svg << "<path d=\"M" << num(x + 9) << "," << num(y + 47) << " L" << num(x + 15) << "," << num(y + 53) << " M"
        << num(x + 9) << "," << num(y + 53) << " L" << num(x + 15) << "," << num(y + 47) << "\" stroke=\""
        << kBaselineColour << "\" stroke-width=\"1.6\"/><text x=\"" << num(x + 24) << "\" y=\"" << num(y + 54)
        << "\">global matrix</text>\n";
    svg << "</g>\n";
}

} // namespace

DiagramView fullDiagramView() { return DiagramView{}; }

DiagramView closeUpView(const std::vector<LightResult>& results)
{
    double xMin = 1, xMax = 0, yMin = 1, yMax = 0;
    auto include = [&](const spectra::Xy& p) {
        xMin = std::min(xMin, p.x);
        xMax = std::max(xMax, p.x);
        yMin = std::min(yMin, p.y);
        yMax = std::max(yMax, p.y);
    };
    for (const LightResult& r : results) {
        include(r.trueXy);
        if (r.plugIn.valid)
            include(r.plugIn.xy);
        if (r.baseline.valid)
            include(r.baseline.xy);
    }
    if (xMax < xMin)
        return fullDiagramView();
    // Square, with room for the legend, and clamped to the whole diagram.
    const double side = std::max({xMax - xMin, yMax - yMin, 0.02}) * 1.25;
    const double cx = (xMin + xMax) / 2, cy = (yMin + yMax) / 2;
    DiagramView v{cx - side / 2, cx + side / 2, cy - side / 2, cy + side / 2};
    v.xMin = std::max(v.xMin, 0.0);
    v.yMin = std::max(v.yMin, 0.0);
    v.xMax = std::min(v.xMax, 0.8);
    v.yMax = std::min(v.yMax, 0.9);
    return v;
}

std::string chromaticityDiagramSvg(const std::vector<LightResult>& results, const DiagramView& view, int widthPx,
                                   const std::string& title)
{
    static int serial = 0;
    const std::string clip = "plot-area-" + std::to_string(++serial);
    Frame f;
    f.view = view;
    f.scale = (widthPx - kMarginLeft - kMarginRight) / (view.xMax - view.xMin);
    f.width = widthPx;
    f.height = kMarginTop + kMarginBottom + f.scale * (view.yMax - view.yMin);

    std::ostringstream svg;
    svg << "<svg xmlns=\"http://www.w3.org/2000/svg\" width=\"" << num(f.width) << "\" height=\"" << num(f.height)
        << "\" viewBox=\"0 0 " << num(f.width) << " " << num(f.height) << "\" font-family=\"sans-serif\">\n";
    svg << "<title>" << xmlEscape(title) << "</title>\n";
    svg << "<defs><clipPath id=\"" << clip << "\"><rect x=\"" << num(f.px(view.xMin)) << "\" y=\""
        << num(f.py(view.yMax)) << "\" width=\"" << num(f.px(view.xMax) - f.px(view.xMin)) << "\" height=\""
        << num(f.py(view.yMin) - f.py(view.yMax)) << "\"/></clipPath></defs>\n";
    svg << "<text x=\"" << num(kMarginLeft) << "\" y=\"20\" font-size=\"13\" font-weight=\"bold\">" << xmlEscape(title)
        << "</text>\n";
    axes(svg, f);
    loci(svg, f, clip);
    lights(svg, f, results, clip);
    legend(svg, f);
    svg << "</svg>\n";
    return svg.str();
}

} // namespace host
