#include "tools/publish/onvif/Xml.h"

#include <array>
#include <charconv>
#include <libxml/parser.h>

namespace qivo {
namespace {

std::string_view viewOf(const xmlChar* text) {
    return text != nullptr ? reinterpret_cast<const char*>(text) : std::string_view();
}

const xmlNode* elementFrom(const xmlNode* node) {
    while (node != nullptr && node->type != XML_ELEMENT_NODE) {
        node = node->next;
    }
    return node;
}

struct FreeText {
    void operator()(xmlChar* text) const { xmlFree(text); }
};
using XmlText = std::unique_ptr<xmlChar, FreeText>;

std::string_view trimmed(std::string_view text) {
    constexpr const char* blanks = " \t\r\n";
    const std::size_t first = text.find_first_not_of(blanks);
    return first == std::string_view::npos ? std::string_view()
                                           : text.substr(first, text.find_last_not_of(blanks) - first + 1);
}

// Called at "<!DOCTYPE": nothing of it is read.
void refuseDocumentType(void* context, const xmlChar*, const xmlChar*, const xmlChar*) {
    auto* parser = static_cast<xmlParserCtxt*>(context);
    xmlStopParser(parser);
    parser->wellFormed = 0;
}

struct FreeParser {
    void operator()(xmlParserCtxt* parser) const { xmlFreeParserCtxt(parser); }
};

} // namespace

std::string_view XmlElement::name() const {
    return m_node != nullptr ? viewOf(m_node->name) : std::string_view();
}

std::string_view XmlElement::space() const {
    return m_node != nullptr && m_node->ns != nullptr ? viewOf(m_node->ns->href) : std::string_view();
}

XmlElement XmlElement::child(std::string_view name) const {
    XmlElement found(m_node != nullptr ? elementFrom(m_node->children) : nullptr);
    while (found && !name.empty() && found.name() != name) {
        found = found.next();
    }
    return found;
}

XmlElement XmlElement::next() const {
    return XmlElement(m_node != nullptr ? elementFrom(m_node->next) : nullptr);
}

std::string XmlElement::text() const {
    if (m_node == nullptr) {
        return {};
    }
    const XmlText content(xmlNodeGetContent(m_node));
    return std::string(trimmed(viewOf(content.get())));
}

std::optional<std::string> XmlElement::attribute(const char* name) const {
    if (m_node == nullptr) {
        return std::nullopt;
    }
    const XmlText value(xmlGetNoNsProp(m_node, reinterpret_cast<const xmlChar*>(name)));
    return value ? std::optional(std::string(viewOf(value.get()))) : std::nullopt;
}

std::string_view XmlElement::spaceOf(const std::string& prefix) const {
    for (const xmlNode* node = m_node; node != nullptr && node->type == XML_ELEMENT_NODE; node = node->parent) {
        for (const xmlNs* definition = node->nsDef; definition != nullptr; definition = definition->next) {
            if (viewOf(definition->prefix) == prefix) {
                return viewOf(definition->href);
            }
        }
    }
    return {};
}

std::optional<XmlDocument> XmlDocument::parse(const std::string& text) {
    if (text.empty() || text.size() > maximumBytes) {
        return std::nullopt;
    }
    const std::unique_ptr<xmlParserCtxt, FreeParser> parser(xmlNewParserCtxt());
    if (!parser) {
        return std::nullopt;
    }
    parser->sax->internalSubset = refuseDocumentType;
    constexpr int options = XML_PARSE_NONET | XML_PARSE_NOERROR | XML_PARSE_NOWARNING;
    XmlDocument document(
        xmlCtxtReadMemory(parser.get(), text.data(), static_cast<int>(text.size()), nullptr, nullptr, options));
    return document.root() ? std::optional(std::move(document)) : std::nullopt;
}

XmlElement XmlDocument::root() const {
    return XmlElement(m_document ? xmlDocGetRootElement(m_document.get()) : nullptr);
}

std::string xmlText(std::string_view text) {
    std::string result;
    for (const char character : text) {
        switch (character) {
        case '&':
            result += "&amp;";
            break;
        case '<':
            result += "&lt;";
            break;
        case '>':
            result += "&gt;";
            break;
        case '"':
            result += "&quot;";
            break;
        default:
            result += static_cast<unsigned char>(character) < ' ' ? '?' : character;
        }
    }
    return result;
}

std::string xmlNumber(double number) {
    std::array<char, 32> text{};
    const auto [end, error] = std::to_chars(text.data(), text.data() + text.size(), number);
    return error == std::errc{} ? std::string(text.data(), end) : "0";
}

std::optional<double> numberIn(std::string_view text) {
    text = trimmed(text);
    if (text.size() > 1 && text.front() == '+' && text[1] != '-') {
        text.remove_prefix(1);
    }
    double number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    const bool whole = !text.empty() && end == text.data() + text.size();
    return whole && error == std::errc{} ? std::optional(number) : std::nullopt;
}

} // namespace qivo
