// Finds the longest of many prefixes that a key begins with, in time that depends on the key's
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

  /// The longest prefix that `key` begins with, borrowed from the tree; nothing when there is none.
  std::optional<std::string_view> longestMatch(std::string_view key) const;

 private:
  // A node stands for the text from the root to it, which is the beginning of all prefixes below
  // it and borrowed from one of them. The children of a node lie side by side.
  struct Node {
    std::string_view text;
    std::uint32_t firstChild;
    std::uint16_t childCount;
    bool isPrefix;  // the node's text is itself a prefix
  };

  void build();
  const Node* childFor(const Node& node, char next) const;

  std::vector<std::string> prefixes_;  // sorted, each once
  std::vector<Node> nodes_;            // the root first
  std::vector<char> branches_;         // for each node the byte that leads to it
};

}  // namespace tavrel
