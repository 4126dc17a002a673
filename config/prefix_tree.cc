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
  nodes_.emplace_back();
  branches_.push_back(0);
  build();
}

// Ranges still to be built are kept on a list of their own: how deep prefixes nest is the file's
// choice and must not decide how deep the machine's stack goes.
void PrefixTree::build() {
  struct Range {
    std::size_t node, begin, end;
  };
  std::vector<Range> pending{{0, 0, prefixes_.size()}};
  while (!pending.empty()) {
    const Range range = pending.back();
    pending.pop_back();

    // In sorted order the first and the last share what all share.
    const std::size_t depth = commonLength(prefixes_[range.begin], prefixes_[range.end - 1]);
    const bool isPrefix = prefixes_[range.begin].size() == depth;
    const std::size_t firstChild = nodes_.size();
    for (std::size_t at = range.begin + (isPrefix ? 1 : 0); at < range.end;) {
      const char next = prefixes_[at][depth];
      std::size_t after = at + 1;
      while (after < range.end && prefixes_[after][depth] == next)
        ++after;
      pending.push_back({nodes_.size(), at, after});
      nodes_.emplace_back();
      branches_.push_back(next);
      at = after;
    }
    nodes_[range.node] = {std::string_view(prefixes_[range.begin]).substr(0, depth),
                          static_cast<std::uint32_t>(firstChild),
                          static_cast<std::uint16_t>(nodes_.size() - firstChild), isPrefix};
  }
}

const PrefixTree::Node* PrefixTree::childFor(const Node& node, char next) const {
  if (node.childCount == 0) return nullptr;
  const char* branches = branches_.data() + node.firstChild;
  const void* found = std::memchr(branches, static_cast<unsigned char>(next), node.childCount);
  if (!found) return nullptr;
  return &nodes_[node.firstChild +
                 static_cast<std::size_t>(static_cast<const char*>(found) - branches)];
}

std::optional<std::string_view> PrefixTree::longestMatch(std::string_view key) const {
  std::optional<std::string_view> longest;
  std::size_t compared = 0;
  for (const Node* node = nodes_.empty() ? nullptr : nodes_.data(); node;) {
    if (!key.substr(compared).starts_with(node->text.substr(compared))) break;
    if (node->isPrefix) longest = node->text;
    compared = node->text.size();
    if (key.size() == compared) break;
    node = childFor(*node, key[compared]);
  }
  return longest;
}

}  // namespace tavrel
