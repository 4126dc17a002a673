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

  // A node stands for the text from the root to it, which is the beginning of all prefixes below
  // it. The children of a node are adjacent. Nodes are small, because a walk goes from one to the
  // next and looks at texts only at its end.
  struct Node {
    std::uint32_t length;   // of the text
    std::uint32_t longest;  // the longest prefix with which it begins
    std::uint32_t firstChild;
    std::uint32_t childCount;
  };

  void build();
  std::size_t childFor(const Node& node, char next) const;

  std::vector<std::string> prefixes_;   // sorted, each once
  std::vector<std::uint32_t> shorter_;  // for each, the longest other one that begins it
  std::vector<Node> nodes_;             // the root first
  std::vector<char> branches_;          // for each node, the byte that leads to it
};

}  // namespace tavrel
