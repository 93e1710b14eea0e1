#include "discovery/SourceTree.h"

#include <optional>

namespace qivo {
namespace {

constexpr std::string_view kOpening = " (";

struct Parts {
    std::string_view machine;
    std::string_view inner;
};

/// The two parts of *MACHINE (SOURCE)*; nothing if the name does not have that form.
std::optional<Parts> split(std::string_view name) {
    const std::size_t opening = name.find(kOpening);
    if (opening == std::string_view::npos || name.size() <= opening + kOpening.size()) {
        return std::nullopt;
    }
    const std::string_view rest = name.substr(opening + kOpening.size());
    const std::size_t closing = rest.rfind(')');
    if (closing == std::string_view::npos || closing == 0) {
        return std::nullopt;
    }
    return Parts{name.substr(0, opening), rest.substr(0, closing)};
}

} // namespace

SourceTree::SourceTree() : m_nodes(1) {}

void SourceTree::addName(std::string_view name, Node toParent) {
    for (int depth = 0; depth < kMaximumDepth; ++depth) {
        const std::optional<Parts> parts = split(name);
        if (!parts) {
            break;
        }
        toParent = machine(parts->machine, toParent);
        name = parts->inner;
    }
    append(name, toParent);
}

/// The parent's last child if it has that title, else a new one.
SourceTree::Node SourceTree::machine(std::string_view title, Node parent) {
    const std::vector<Node>& children = m_nodes[parent].children;
    if (!children.empty() && m_nodes[children.back()].title == title) {
        return children.back();
    }
    return append(title, parent);
}

SourceTree::Node SourceTree::append(std::string_view title, Node toParent) {
    const Node node = static_cast<Node>(m_nodes.size());
    m_nodes.push_back({std::string(title), {}});
    m_nodes[toParent].children.push_back(node);
    return node;
}

} // namespace qivo
