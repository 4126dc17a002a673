#include "config/prefix_tree.h"

#include <algorithm>
#include <cstring>

namespace tavrel {
namespace {

std::size_t commonLength(std::string_view a, std::string_view b) {
  const std::size_t shorter = std::min(a.size(), b.size());
  return static_cast<std::size_t>(std::mismatch(a.begin(), a.begin() + shorter, b.begin()).first -
                                  a.begin());
}

}  // namespace

PrefixTree::PrefixTree(std::vector<std::string> prefixes) : prefixes_(std::move(prefixes)) {
  std::sort(prefixes_.begin(), prefixes_.end());
  prefixes_.erase(std::unique(prefixes_.begin(), prefixes_.end()), prefixes_.end());
  if (prefixes_.empty()) return;
  shorter_.resize(prefixes_.size(), kNone);
  nodes_.emplace_back();
  branches_.push_back(0);
  build();
}

// Ranges still to be built wait in a list, not on the call stack, whose depth must not depend on
// how deeply the prefixes in the file nest.
void PrefixTree::build() {
  struct Range {
    std::size_t node, begin, end;
    std::uint32_t longest;  // the longest prefix above
  };
  std::vector<Range> pending{{0, 0, prefixes_.size(), kNone}};
  while (!pending.empty()) {
    Range range = pending.back();
    pending.pop_back();

    // In sorted order, the common beginning of the first and the last is common to all.
    const std::size_t depth = commonLength(prefixes_[range.begin], prefixes_[range.end - 1]);
    if (prefixes_[range.begin].size() == depth) {
      shorter_[range.begin] = range.longest;
      range.longest = static_cast<std::uint32_t>(range.begin++);
    }
    const std::size_t firstChild = nodes_.size();
    for (std::size_t at = range.begin; at < range.end;) {
      const char next = prefixes_[at][depth];
      std::size_t after = at + 1;
      while (after < range.end && prefixes_[after][depth] == next)
        ++after;
      pending.push_back({nodes_.size(), at, after, range.longest});
      nodes_.emplace_back();
      branches_.push_back(next);
      at = after;
    }
    nodes_[range.node] = {static_cast<std::uint32_t>(depth), range.longest,
                          static_cast<std::uint32_t>(firstChild),
                          static_cast<std::uint32_t>(nodes_.size() - firstChild)};
  }
}

// Returns 0, the root's number, for no child: the root is never a child.
std::size_t PrefixTree::childFor(const Node& node, char next) const {
  if (node.childCount == 0) return 0;
  const char* branches = branches_.data() + node.firstChild;
  const void* found = std::memchr(branches, static_cast<unsigned char>(next), node.childCount);
  if (!found) return 0;
  return node.firstChild + static_cast<std::size_t>(static_cast<const char*>(found) - branches);
}

std::optional<std::string_view> PrefixTree::longestMatch(std::string_view key) const {
  if (nodes_.empty()) return std::nullopt;
  // Following the branches alone leads to the node that shares the longest beginning with the key.
  const Node* node = nodes_.data();
  while (node->length < key.size()) {
    const std::size_t child = childFor(*node, key[node->length]);
    if (child == 0) break;
    node = &nodes_[child];
  }
  std::uint32_t longest = node->longest;
  if (longest == kNone) return std::nullopt;
  // Usually the key begins with the whole prefix.
  if (key.starts_with(prefixes_[longest])) return prefixes_[longest];
  const std::size_t common = commonLength(key, prefixes_[longest]);
  while (longest != kNone && prefixes_[longest].size() > common)
    longest = shorter_[longest];
  if (longest == kNone) return std::nullopt;
  return prefixes_[longest];
}

}  // namespace tavrel
