#pragma once

#include <libxml/tree.h>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace qivo {

/** An element of a parsed document, or nothing; a view that must not outlive the document. Nothing has no name, no
 * text, no attributes and no children. */
class XmlElement {
  public:
    XmlElement() = default;
    explicit XmlElement(const xmlNode* node) : m_node(node) {}

    explicit operator bool() const { return m_node != nullptr; }

    /** Without its prefix. */
    [[nodiscard]] std::string_view name() const;

    /** The namespace's URI; empty if it has none. */
    [[nodiscard]] std::string_view space() const;

    /** The first child element; of that name, in whatever namespace, where one is given. */
    [[nodiscard]] XmlElement child(std::string_view name = {}) const;

    /** The next element beside it. */
    [[nodiscard]] XmlElement next() const;

    /** The text within, without blanks around it. */
    [[nodiscard]] std::string text() const;

    /** An attribute's value; empty optional if it has none of that name. */
    [[nodiscard]] std::optional<std::string> attribute(const char* name) const;

    /** The namespace's URI that a prefix stands for here; empty for one that stands for none. */
    [[nodiscard]] std::string_view spaceOf(const std::string& prefix) const;

  private:
    const xmlNode* m_node = nullptr;
};

/** A document that somebody sent: well-formed, of bounded size, without a document type, so that it holds no entities
 * but XML's own. Nothing outside of it is ever loaded. */
class XmlDocument {
  public:
    static constexpr std::size_t maximumBytes = 65536;

    /** Empty if the text is not such a document. */
    [[nodiscard]] static std::optional<XmlDocument> parse(const std::string& text);

    [[nodiscard]] XmlElement root() const;

  private:
    struct Free {
        void operator()(xmlDoc* document) const { xmlFreeDoc(document); }
    };

    explicit XmlDocument(xmlDoc* document) : m_document(document) {}

    std::unique_ptr<xmlDoc, Free> m_document;
};

/** Text as it stands between tags and in attributes; characters that XML cannot carry become question marks. */
[[nodiscard]] std::string xmlText(std::string_view text);

/** A number as XML Schema writes it, in any locale. */
[[nodiscard]] std::string xmlNumber(double number);

/** The number that a text is, also "NaN" and "INF"; empty if it is none. */
[[nodiscard]] std::optional<double> numberIn(std::string_view text);

} // namespace qivo
