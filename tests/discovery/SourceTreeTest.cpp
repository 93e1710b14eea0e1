#include "discovery/SourceTree.h"

#include <chrono>
#include <gmock/gmock.h>
#include <string>
#include <vector>

namespace qivo {
namespace {

/// Groups as "title{...}", leaves as "title=number", numbered depth first.
std::string describe(const SourceTree& tree, SourceTree::Node node, int& next) {
    std::string text;
    for (const SourceTree::Node child : tree.children(node)) {
        text += text.empty() ? "" : ", ";
        text += tree.title(child);
        text += tree.isLeaf(child) ? "=" + std::to_string(next++) : "{" + describe(tree, child, next) + "}";
    }
    return text;
}

std::string treeOf(const std::vector<std::string>& names) {
    SourceTree tree;
    for (const std::string& name : names) {
        tree.addName(name);
    }
    int next = 0;
    return describe(tree, SourceTree::kRoot, next);
}

TEST(SourceTree, SourcesOfOneMachineShareItsGroup) {
    EXPECT_EQ(treeOf({"STUDIO (Cam 1)", "STUDIO (Cam 2)"}), "STUDIO{Cam 1=0, Cam 2=1}");
}

TEST(SourceTree, MachineWhoseSourcesAreApartGetsTwoGroups) {
    EXPECT_EQ(treeOf({"A (x)", "B (y)", "A (z)"}), "A{x=0}, B{y=1}, A{z=2}");
}

TEST(SourceTree, NameWithoutMachineIsALeaf) {
    EXPECT_EQ(treeOf({"PLAIN"}), "PLAIN=0");
}

TEST(SourceTree, ParenthesisWithoutBlankIsPartOfTheName) {
    EXPECT_EQ(treeOf({"A(x)"}), "A(x)=0");
}

TEST(SourceTree, NameThatEndsWithTheOpeningIsALeaf) {
    EXPECT_EQ(treeOf({"A ("}), "A (=0");
}

TEST(SourceTree, NothingBetweenTheParenthesesIsALeaf) {
    EXPECT_EQ(treeOf({"A ()"}), "A ()=0");
}

TEST(SourceTree, MissingClosingParenthesisIsALeaf) {
    EXPECT_EQ(treeOf({"A (x"}), "A (x=0");
}

TEST(SourceTree, TextAfterTheLastParenthesisIsDropped) {
    EXPECT_EQ(treeOf({"A (x) extra"}), "A{x=0}");
}

TEST(SourceTree, NestedNameIsNestedGroups) {
    EXPECT_EQ(treeOf({"A (B (E))"}), "A{B{E=0}}");
}

TEST(SourceTree, InnerPartReachesToTheLastParenthesis) {
    EXPECT_EQ(treeOf({"A (x (y)) (z)"}), "A{x{y)=0}}");
}

TEST(SourceTree, SourceNamedLikeTheMachineBeforeItBecomesTheGroup) {
    EXPECT_EQ(treeOf({"A", "A (x)"}), "A{x=0}");
}

TEST(SourceTree, OnlyTheOpeningMakesAGroupWithoutTitle) {
    EXPECT_EQ(treeOf({" (x)"}), "{x=0}");
}

TEST(SourceTree, EmptyNameIsALeaf) {
    EXPECT_EQ(treeOf({"", "B"}), "=0, B=1");
}

TEST(SourceTree, TitlesAreComparedExactly) {
    EXPECT_EQ(treeOf({"A (x)", "a (y)", "a  (z)"}), "A{x=0}, a{y=1}, a {z=2}");
}

TEST(SourceTree, TextBeyondAsciiIsKept) {
    EXPECT_EQ(treeOf({"B\xc3\xbchne (K\xc3\xa4mera \xe4\xb8\x80)"}), "B\xc3\xbchne{K\xc3\xa4mera \xe4\xb8\x80=0}");
}

TEST(SourceTree, NestedGroupsOfNeighboursMerge) {
    EXPECT_EQ(treeOf({"A (B (1))", "A (B (2))", "A (C (3))"}), "A{B{1=0, 2=1}, C{3=2}}");
}

TEST(SourceTree, NumbersEqualPositionsInTheList) {
    std::vector<std::string> names;
    for (int i = 0; i < 300; ++i) {
        names.push_back("M" + std::to_string(i / 7 % 11) + " (" + (i % 3 == 0 ? "N (" : "") + std::to_string(i) +
                        (i % 3 == 0 ? "))" : ")"));
    }
    const std::string text = treeOf(names);
    for (int i = 0; i < 300; ++i) {
        EXPECT_THAT(text, testing::HasSubstr(std::to_string(i) + "=" + std::to_string(i)));
    }
}

int depthOf(const SourceTree& tree) {
    int depth = 0;
    for (SourceTree::Node node = SourceTree::kRoot; !tree.isLeaf(node); node = tree.children(node)[0]) {
        ++depth;
    }
    return depth;
}

std::string nested(int levels) {
    std::string name;
    for (int i = 0; i < levels; ++i) {
        name += "A (";
    }
    return name + "x" + std::string(static_cast<std::size_t>(levels), ')');
}

TEST(SourceTree, NestingUpToTheLimitIsKept) {
    SourceTree tree;
    tree.addName(nested(SourceTree::kMaximumDepth));
    EXPECT_EQ(depthOf(tree), SourceTree::kMaximumDepth + 1);
}

TEST(SourceTree, DeeperNestingEndsInALeafOfTheRest) {
    SourceTree tree;
    tree.addName(nested(SourceTree::kMaximumDepth + 1));
    EXPECT_EQ(depthOf(tree), SourceTree::kMaximumDepth + 1);
    int next = 0;
    EXPECT_THAT(describe(tree, SourceTree::kRoot, next), testing::HasSubstr("{A (x)=0}"));
}

TEST(SourceTree, HostileNameOfAMillionLevelsNeitherOverflowsNorTakesLong) {
    SourceTree tree;
    const std::string name = nested(1000000);
    const auto start = std::chrono::steady_clock::now();
    tree.addName(name);
    EXPECT_LT(std::chrono::steady_clock::now() - start, std::chrono::seconds(2));
    EXPECT_EQ(depthOf(tree), SourceTree::kMaximumDepth + 1);
}

TEST(SourceTree, OpeningsWithoutEndAreOneLeaf) {
    std::string name;
    for (int i = 0; i < 100000; ++i) {
        name += "A (";
    }
    EXPECT_EQ(treeOf({name}), name + "=0");
}

} // namespace
} // namespace qivo
