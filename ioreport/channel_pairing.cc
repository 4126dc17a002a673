#include "ioreport/channel_pairing.h"

#include <algorithm>

#include "ioreport/channel.h"

namespace tavrel {

bool ChannelPairing::find(std::size_t index, const plist::Dictionary& channel,
                          plist::Dictionary& match) {
  match = {};
  const auto identity = identityOf(channel);
  if (!identity) return false;
  if (index < others_.size()) {
    const plist::Dictionary candidate = others_.at(index).dictionary();
    const auto candidateIdentity = identityOf(candidate);
    if (!candidateIdentity) return false;
    if (*candidateIdentity == *identity) {
      match = candidate;
      return true;
    }
  }
  if (!sorted_) sortOthers();
  const Position earliest{*identity, searchStart_.value_or(index + 1)};
  const auto found = std::ranges::lower_bound(*sorted_, earliest);
  if (found != sorted_->end() && found->identity == *identity) {
    match = others_.at(found->index).dictionary();
    searchStart_ = found->index + 1;
  }
  return true;
}

std::optional<ChannelPairing::Identity> ChannelPairing::identityOf(
    const plist::Dictionary& channel) {
  std::uint64_t type = 0;
  if (getChannelType(channel, type) != kKernelSuccess) return std::nullopt;
  return Identity{IOReportChannelGetDriverID(channel), IOReportChannelGetChannelID(channel), type};
}

void ChannelPairing::sortOthers() {
  sorted_.emplace().reserve(others_.size());
  for (std::size_t i = 0; i < others_.size(); ++i) {
    if (const auto identity = identityOf(others_.at(i).dictionary())) {
      sorted_->push_back({*identity, i});
    }
  }
  std::ranges::sort(*sorted_);
}

}  // namespace tavrel
