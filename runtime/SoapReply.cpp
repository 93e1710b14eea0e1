#include "runtime/SoapReply.h"

#include <algorithm>
#include <cmath>
#include <glib.h>
#include <libxml/parser.h>
#include <libxml/parserInternals.h>
#include <libxml/tree.h>

namespace qivo::runtime {
namespace {

std::string_view viewOf(const xmlChar* text) {
    return text != nullptr ? std::string_view(reinterpret_cast<const char*>(text)) : std::string_view();
}

std::string trimmed(std::string_view text) {
    constexpr const char* kBlanks = " \t\r\n";
    const std::size_t begin = text.find_first_not_of(kBlanks);
    if (begin == std::string_view::npos) {
        return {};
    }
    text = text.substr(begin, text.find_last_not_of(kBlanks) + 1 - begin);
    return text.size() <= kLongestXmlText ? std::string(text) : std::string();
}

std::string textOf(const xmlNode* first) {
    std::string text;
    for (const xmlNode* node = first; node != nullptr; node = node->next) {
        if (node->type == XML_TEXT_NODE || node->type == XML_CDATA_SECTION_NODE) {
            text += viewOf(node->content);
        }
    }
    return trimmed(text);
}

bool isElement(const xmlNode* node, std::string_view name) {
    return node->type == XML_ELEMENT_NODE && (name.empty() || viewOf(node->name) == name);
}

void collect(const xmlNode* parent, std::string_view name, std::vector<XmlElement>& found) {
    for (const xmlNode* node = parent->children; node != nullptr; node = node->next) {
        if (isElement(node, name)) {
            found.emplace_back(node);
        }
        if (node->type == XML_ELEMENT_NODE) {
            collect(node, name, found); // as deep as the parser allows, which is 256 levels
        }
    }
}

void refuseDocumentType(void* context, const xmlChar*, const xmlChar*, const xmlChar*) {
    auto* parser = static_cast<xmlParserCtxt*>(context);
    xmlStopParser(parser);
    parser->wellFormed = 0;
}

struct ContextRelease {
    void operator()(xmlParserCtxt* context) const { xmlFreeParserCtxt(context); }
};

xmlDoc* read(std::string_view bytes) {
    [[maybe_unused]] static const bool initialized = (xmlInitParser(), true);
    const std::unique_ptr<xmlParserCtxt, ContextRelease> context(
        xmlCreateMemoryParserCtxt(bytes.data(), static_cast<int>(bytes.size())));
    if (!context) {
        return nullptr;
    }
    xmlCtxtUseOptions(context.get(), XML_PARSE_NONET | XML_PARSE_NOERROR | XML_PARSE_NOWARNING | XML_PARSE_NOCDATA);
    context->sax->internalSubset = refuseDocumentType;
    xmlParseDocument(context.get());
    xmlDoc* document = context->myDoc;
    if (document != nullptr && context->wellFormed == 0) {
        xmlFreeDoc(document);
        document = nullptr;
    }
    return document;
}

} // namespace

std::string XmlElement::name() const {
    return m_node != nullptr ? std::string(viewOf(m_node->name)) : std::string();
}

std::string XmlElement::space() const {
    return m_node != nullptr && m_node->ns != nullptr ? std::string(viewOf(m_node->ns->href)) : std::string();
}

XmlElement XmlElement::child(std::string_view name) const {
    for (const xmlNode* node = m_node != nullptr ? m_node->children : nullptr; node != nullptr; node = node->next) {
        if (isElement(node, name)) {
            return XmlElement(node);
        }
    }
    return {};
}

XmlElement XmlElement::at(std::initializer_list<std::string_view> path) const {
    XmlElement element = *this;
    for (const std::string_view name : path) {
        element = element.child(name);
    }
    return element;
}

std::vector<XmlElement> XmlElement::children(std::string_view name) const {
    std::vector<XmlElement> found;
    for (const xmlNode* node = m_node != nullptr ? m_node->children : nullptr; node != nullptr; node = node->next) {
        if (isElement(node, name)) {
            found.emplace_back(node);
        }
    }
    return found;
}

std::vector<XmlElement> XmlElement::all(std::string_view name) const {
    std::vector<XmlElement> found;
    if (m_node != nullptr) {
        collect(m_node, name, found);
    }
    return found;
}

std::string XmlElement::text() const {
    return m_node != nullptr ? textOf(m_node->children) : std::string();
}

std::string XmlElement::attribute(std::string_view name) const {
    const xmlAttr* attribute = m_node != nullptr ? m_node->properties : nullptr;
    while (attribute != nullptr && viewOf(attribute->name) != name) {
        attribute = attribute->next;
    }
    return attribute != nullptr ? textOf(attribute->children) : std::string();
}

std::optional<float> XmlElement::number() const {
    const std::string digits = text();
    char* end = nullptr;
    const auto value = static_cast<float>(g_ascii_strtod(digits.c_str(), &end));
    return !digits.empty() && *end == '\0' && std::isfinite(value) ? std::optional(value) : std::nullopt;
}

void SoapReply::Release::operator()(_xmlDoc* document) const {
    xmlFreeDoc(document);
}

std::optional<SoapReply> SoapReply::parse(std::string_view bytes) {
    SoapReply reply;
    if (!bytes.empty() && bytes.size() <= kLargestReply) {
        reply.m_document.reset(read(bytes));
    }
    return reply.body() ? std::optional(std::move(reply)) : std::nullopt;
}

XmlElement SoapReply::body() const {
    const XmlElement root(m_document ? xmlDocGetRootElement(m_document.get()) : nullptr);
    return root.name() == "Envelope" ? root.child("Body") : XmlElement();
}

XmlElement SoapReply::content() const {
    return body().child("");
}

/// By ONVIF's code or WS-Security's, wherever in the codes of SOAP 1.2 or 1.1 they stand.
bool SoapReply::refusesLogin() const {
    if (!isFault()) {
        return false;
    }
    std::vector<XmlElement> codes = content().child("Code").all("Value");
    codes.push_back(content().child("faultcode"));
    return std::any_of(codes.begin(), codes.end(), [](const XmlElement& code) {
        const std::string text = code.text();
        return text.find("NotAuthorized") != std::string::npos ||
               text.find("FailedAuthentication") != std::string::npos;
    });
}

std::string SoapReply::reason() const {
    const XmlElement fault = content();
    const std::string text = fault.at({"Reason", "Text"}).text();
    return text.empty() ? fault.child("faultstring").text() : text;
}

} // namespace qivo::runtime
