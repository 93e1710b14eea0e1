#pragma once

#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

struct _xmlDoc;
struct _xmlNode;

namespace qivo::runtime {

/// Bytes of a reply that is read.
inline constexpr std::size_t kLargestReply = 1U << 20U;
/// Bytes of a text or an attribute; a longer one reads as empty.
inline constexpr std::size_t kLongestXmlText = 1024;

/// An element of a reply, valid as long as the reply. Elements and attributes are known by their local names:
/// what devices do with namespaces and prefixes is too varied to be held against them.
class XmlElement {
  public:
    XmlElement() = default;
    explicit XmlElement(const _xmlNode* node) : m_node(node) {}

    explicit operator bool() const { return m_node != nullptr; }
    /// The local name; empty for no element.
    std::string name() const;
    /// The namespace; empty if it is in none.
    std::string space() const;
    /// The first child with that name; no element if there is none, or if this is none.
    XmlElement child(std::string_view name) const;
    /// The same, step by step.
    XmlElement at(std::initializer_list<std::string_view> path) const;
    /// Every child with that name, or every child element for an empty one.
    std::vector<XmlElement> children(std::string_view name = {}) const;
    /// Every element below with that name, in the order of the document.
    std::vector<XmlElement> all(std::string_view name) const;
    /// The text directly inside, without blanks around it.
    std::string text() const;
    std::string attribute(std::string_view name) const;
    /// The text as a number.
    std::optional<float> number() const;

  private:
    const _xmlNode* m_node = nullptr;
};

/// A SOAP document that arrived. Reading opens no file, asks no network and expands no entity: a document with a
/// document type, which SOAP forbids, is not read at all.
class SoapReply {
  public:
    /// Nothing if it is not an envelope with a body, or larger than kLargestReply.
    static std::optional<SoapReply> parse(std::string_view bytes);

    XmlElement body() const;
    /// The body's first element, normally the operation's response.
    XmlElement content() const;
    bool isFault() const { return content().name() == "Fault"; }
    /// Whether it is a fault that says that the login was not accepted.
    bool refusesLogin() const;
    /// Why it is a fault, in the device's words.
    std::string reason() const;

  private:
    struct Release {
        void operator()(_xmlDoc* document) const;
    };

    std::unique_ptr<_xmlDoc, Release> m_document;
};

} // namespace qivo::runtime
