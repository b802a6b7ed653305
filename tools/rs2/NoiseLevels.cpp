#include "tools/rs2/NoiseLevels.hpp"

#include "host/XmlUtil.hpp"

#include <xercesc/dom/DOM.hpp>
#include <xercesc/framework/MemBufInputSource.hpp>
#include <xercesc/parsers/XercesDOMParser.hpp>
#include <xercesc/util/SecurityManager.hpp>

#include <algorithm>
#include <cmath>
#include <cstdlib>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <strings.h>

namespace {

using xercesc::DOMElement;

// The annotation has been parsed once already by the driver; this parse
// still loads nothing from outside the text and expands no entity
// recursively.
std::unique_ptr<xercesc::XercesDOMParser>
ParseAnnotation(const std::string &annotation,
                xercesc::SecurityManager &security) {
    auto parser = std::make_unique<xercesc::XercesDOMParser>();
    parser->setDoNamespaces(true);
    parser->setValidationScheme(xercesc::XercesDOMParser::Val_Never);
    parser->setLoadExternalDTD(false);
    parser->setDisableDefaultEntityResolution(true);
    parser->setSecurityManager(&security);
    xercesc::MemBufInputSource source(
        reinterpret_cast<const XMLByte *>(annotation.data()), annotation.size(),
        "product.xml");
    try {
        parser->parse(source);
    } catch (const xercesc::XMLException &) {
        throw std::runtime_error("the product annotation cannot be read");
    } catch (const xercesc::DOMException &) {
        throw std::runtime_error("the product annotation cannot be read");
    }
    if (parser->getErrorCount() != 0 || parser->getDocument() == nullptr)
        throw std::runtime_error("the product annotation is not valid XML");
    return parser;
}

std::string LocalName(const xercesc::DOMNode *node) {
    const XMLCh *name = node->getLocalName();
    return XmlTranscode(name != nullptr ? name : node->getNodeName()).Narrow();
}

const DOMElement *ChildElement(const DOMElement *parent,
                               const std::string &name) {
    for (const DOMElement *child = parent->getFirstElementChild();
         child != nullptr; child = child->getNextElementSibling())
        if (LocalName(child) == name)
            return child;
    return nullptr;
}

std::string ChildText(const DOMElement *parent, const std::string &name) {
    const DOMElement *child = ChildElement(parent, name);
    if (child == nullptr)
        throw std::runtime_error("a noise level without " + name);
    return XmlTranscode(child->getTextContent()).Narrow();
}

int32_t ChildInteger(const DOMElement *parent, const std::string &name) {
    const std::string text = ChildText(parent, name);
    char *end = nullptr;
    const long value = std::strtol(text.c_str(), &end, 10);
    if (end == text.c_str() || value < INT32_MIN || value > INT32_MAX)
        throw std::runtime_error("the noise level's " + name + " \"" + text +
                                 "\" is not a number");
    return static_cast<int32_t>(value);
}

std::vector<double> Levels(const DOMElement *element) {
    std::istringstream text(ChildText(element, "noiseLevelValues"));
    text.imbue(std::locale::classic());
    std::vector<double> levels;
    std::string token;
    while (text >> token) {
        char *end = nullptr;
        const double level = std::strtod(token.c_str(), &end);
        if (*end != '\0' || !std::isfinite(level))
            throw std::runtime_error("the noise level value \"" + token +
                                     "\" is not a finite number");
        levels.push_back(level);
    }
    return levels;
}

NoiseLevels LevelsOf(const DOMElement *element) {
    NoiseLevels noise;
    noise.firstPixel = ChildInteger(element, "pixelFirstNoiseValue");
    noise.step = ChildInteger(element, "stepSize");
    const int32_t count = ChildInteger(element, "numberOfNoiseLevelValues");
    noise.levelsDb = Levels(element);
    if (noise.step < 1)
        throw std::runtime_error("the noise levels' step size " +
                                 std::to_string(noise.step) + " is below 1");
    if (noise.levelsDb.empty() ||
        noise.levelsDb.size() != static_cast<size_t>(count))
        throw std::runtime_error("the product states " + std::to_string(count) +
                                 " noise levels but gives " +
                                 std::to_string(noise.levelsDb.size()));
    return noise;
}

const DOMElement *FindReferenceNoiseLevel(const xercesc::DOMDocument *document,
                                          const std::string &calibration) {
    const XmlTranscode any("*");
    const XmlTranscode tag("referenceNoiseLevel");
    const XmlTranscode attribute("incidenceAngleCorrection");
    xercesc::DOMNodeList *elements = document->getElementsByTagNameNS(any, tag);
    for (XMLSize_t i = 0; i < elements->getLength(); ++i) {
        const auto *element =
            static_cast<const DOMElement *>(elements->item(i));
        const std::string kind =
            XmlTranscode(element->getAttribute(attribute)).Narrow();
        if (strcasecmp(kind.c_str(), calibration.c_str()) == 0)
            return element;
    }
    return nullptr;
}

} // namespace

double NoiseLevels::PowerAt(double column) const {
    const double last = static_cast<double>(levelsDb.size() - 1);
    const double position = std::clamp((column - firstPixel) / step, 0.0, last);
    const auto below = static_cast<size_t>(position);
    const size_t above = std::min(below + 1, levelsDb.size() - 1);
    const double fraction = position - static_cast<double>(below);
    const double db =
        levelsDb[below] + fraction * (levelsDb[above] - levelsDb[below]);
    return std::pow(10.0, db / 10.0);
}

NoiseLevels ReadNoiseLevels(const std::string &annotation,
                            const std::string &calibration) {
    const XmlPlatformHold platform;
    if (!platform.Held())
        throw std::runtime_error("the XML parser cannot be started");
    xercesc::SecurityManager security;
    security.setEntityExpansionLimit(100);
    const std::unique_ptr<xercesc::XercesDOMParser> parser =
        ParseAnnotation(annotation, security);
    const DOMElement *element =
        FindReferenceNoiseLevel(parser->getDocument(), calibration);
    if (element == nullptr)
        throw std::runtime_error("the product gives no noise level for " +
                                 calibration);
    return LevelsOf(element);
}
