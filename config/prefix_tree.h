// Finds the longest of many prefixes with which a key begins, in time that depends on the key's
// length and not on the number of prefixes.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tavrel {

/// A radix tree over a fixed set of prefixes, which it copies.
class PrefixTree {
 public:
  PrefixTree() = default;
  explicit PrefixTree(std::vector<std::string> prefixes);
  PrefixTree(PrefixTree&&) = default;
  PrefixTree& operator=(PrefixTree&&) = default;

  /// The longest prefix with which `key` begins, borrowed from the tree; nothing when there is
  /// none.
  std::optional<std::string_view> longestMatch(std::string_view key) const;

 private:
  static constexpr std::uint32_t kNone = 0xFFFF'FFFF;

  // A node stands for the text on the path from the root, with which all prefixes below it begin.
  // The children of a node are adjacent. Nodes are small: a walk steps from one to the next and
  // compares text only at its end.
  struct Node {
    std::uint32_t length;   // of the text
    std::uint32_t longest;  // the longest prefix of that text
    std::uint32_t firstChild;
    std::uint32_t childCount;
  };

  void build();
  std::size_t childFor(const Node& node, char next) const;

  std::vector<std::string> prefixes_;   // sorted, each once
  std::vector<std::uint32_t> shorter_;  // for each, its longest proper prefix among them
  std::vector<Node> nodes_;             // the root first
  std::vector<char> branches_;          // for each node, the byte that leads to it
};

}  // namespace tavrel
