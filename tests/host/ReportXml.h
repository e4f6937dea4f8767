// Reading an accuracy report back as XML (libxml2), for the report tests.
#pragma once

#include <libxml/parser.h>
#include <libxml/xpath.h>
#include <libxml/xpathInternals.h>

#include <memory>
#include <string>

namespace vt {

class ReportXml {
public:
    // Parses `text`; ok() tells whether it is well-formed XML.
    explicit ReportXml(const std::string& text)
        : doc_(xmlReadMemory(text.data(), int(text.size()), "report.html", "UTF-8", XML_PARSE_NONET), xmlFreeDoc)
    {
    }
    bool ok() const { return doc_ != nullptr; }

    // Nodes matching an XPath expression; the prefixes h (XHTML) and svg are bound.
    int count(const std::string& xpath) const
    {
        std::unique_ptr<xmlXPathContext, decltype(&xmlXPathFreeContext)> context(xmlXPathNewContext(doc_.get()),
                                                                                 xmlXPathFreeContext);
        xmlXPathRegisterNs(context.get(), BAD_CAST "h", BAD_CAST "http://www.w3.org/1999/xhtml");
        xmlXPathRegisterNs(context.get(), BAD_CAST "svg", BAD_CAST "http://www.w3.org/2000/svg");
        std::unique_ptr<xmlXPathObject, decltype(&xmlXPathFreeObject)> result(
            xmlXPathEvalExpression(BAD_CAST xpath.c_str(), context.get()), xmlXPathFreeObject);
        if (!result || !result->nodesetval)
            return 0;
        return result->nodesetval->nodeNr;
    }

private:
    std::unique_ptr<xmlDoc, decltype(&xmlFreeDoc)> doc_;
};

} // namespace vt
