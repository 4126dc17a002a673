#include "platform/linux/locale/language_matching.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <optional>
#include <string_view>
#include <unordered_set>
#include <utility>

#include "base/keyed_hash.h"
#include "base/limits.h"
#include "platform/linux/locale/language_tables.h"
#include "platform/linux/locale/language_tag.h"

namespace tavrel {
namespace {

/// A preferred language, with the properties that comparisons need, computed once.
struct Wish {
  explicit Wish(LanguageTag wanted)
      : tag(std::move(wanted)),
        script(tag.effectiveScript()),
        homeRegion(language_tables::homeRegion(tag.language, script)),
        parents(language_tables::parentRegions(tag.language, script, tag.region)) {}

  /// How well `offer` suits, 0 for best; nothing when it does not suit.
  std::optional<int> rank(const LanguageTag& offer) const {
    if (offer.language != tag.language || offer.effectiveScript() != script) return std::nullopt;
    if (offer.region == tag.region && offer.variant == tag.variant) return 0;
    return regionRank(offer.region) + (offer.variant.empty() ? 0 : kForeignVariant);
  }

  LanguageTag tag;
  std::string script;
  std::string homeRegion;
  std::array<std::string_view, 2> parents;

 private:
  static constexpr int kForeignVariant = 10;  // after all regions without one

  int regionRank(const std::string& region) const {
    if (region == tag.region) return 1;
    if (region.empty()) return 4;
    if (region == parents[0]) return 2;
    if (region == parents[1]) return 3;
    return region == homeRegion ? 5 : 6;
  }
};

/// One entry per name; nothing for a name that is no language or has occurred before.
std::vector<std::optional<LanguageTag>> parseTags(const std::vector<std::string>& names) {
  std::vector<std::optional<LanguageTag>> tags;
  const std::size_t count = std::min(names.size(), limits::kLanguages);
  tags.reserve(count);
  std::unordered_set<std::string_view, KeyedHash> seen;
  for (std::size_t i = 0; i < count; ++i) {
    tags.push_back(seen.insert(names[i]).second ? parseLanguageTag(names[i]) : std::nullopt);
  }
  return tags;
}

}  // namespace

std::vector<std::string> matchLanguages(const std::vector<std::string>& available,
                                        const std::vector<std::string>& preferred) {
  std::vector<std::string> matches;
  if (available.empty() || preferred.empty()) return matches;

  auto offers = parseTags(available);
  for (auto& wanted : parseTags(preferred)) {
    if (!wanted) continue;
    const Wish wish(*std::move(wanted));
    std::vector<std::pair<int, std::size_t>> suiting;
    for (std::size_t i = 0; i < offers.size(); ++i) {
      if (!offers[i]) continue;
      if (const auto rank = wish.rank(*offers[i])) suiting.emplace_back(*rank, i);
    }
    std::sort(suiting.begin(), suiting.end());
    for (const auto& [rank, index] : suiting) {
      matches.push_back(available[index]);
      offers[index].reset();
    }
  }
  if (matches.empty()) matches.push_back(available.front());
  return matches;
}

}  // namespace tavrel
