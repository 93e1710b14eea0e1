#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace qivo {

/// Groups announced names by machine: *STUDIO (Cam 1)* and *STUDIO (Cam 2)* become a node STUDIO with two leaves.
///
/// A name joins the machine that was added last, never an earlier one of the same title. So leaves, counted depth
/// first, come in the order in which their names were added, and a leaf's running number is its source's index. The
/// exception is a plain name followed by one of the same machine: the leaf becomes the machine's node.
///
/// Text is UTF-8 and compared byte by byte. Thread: one at a time.
class SourceTree {
  public:
    using Node = std::uint32_t;

    /// The only node without a title.
    static constexpr Node kRoot = 0;

    /// Machines within machines beyond which the rest of a name is one leaf. It is the one exception from the rule of
    /// `addName`, which itself knows no limit, so that a hostile name cannot nest menus without end: the toolkit would
    /// run out of stack over them. An announced name has at most 63 bytes, too short to reach a third of it.
    static constexpr int kMaximumDepth = 64;

    SourceTree();

    /// Adds a name below a node, as machine and source where it has the form *MACHINE (SOURCE)*, and the source part
    /// in turn, kMaximumDepth times at most; else as a leaf. Text after the last ")" is dropped.
    void addName(std::string_view name, Node toParent = kRoot);

    const std::string& title(Node node) const { return m_nodes[node].title; }
    /// In the order in which they were added.
    const std::vector<Node>& children(Node node) const { return m_nodes[node].children; }
    bool isLeaf(Node node) const { return m_nodes[node].children.empty(); }

  private:
    struct Content {
        std::string title;
        std::vector<Node> children;
    };

    Node append(std::string_view title, Node toParent);
    Node machine(std::string_view title, Node parent);

    std::vector<Content> m_nodes;
};

} // namespace qivo
