#include "tools/log/log_faults.h"

#include <algorithm>
#include <iterator>
#include <string_view>

#include "base/format.h"
#include "platform/tallied_log.h"
#include "tools/console/value_text.h"
#include "tools/shared/distribution_view.h"

namespace tavrel {
namespace {

using plist::Kind;

struct Member {
  std::string_view key;
  Kind kind;  // null for any kind
  std::string_view kindText;
};

constexpr Member kMembers[] = {
    {kApplicationsMember, Kind::Array, "an array"},
    {kVersionMember, Kind::Number, "a number"},
    {kDistributionsMember, Kind::Dictionary, "a dictionary"},
    {kHistogramsMember, Kind::Dictionary, "a dictionary"},
    {kCreationDateMember, Kind::Date, "a date"},
    {kMetadataMember, Kind::Dictionary, "a dictionary"},
    {kScalarsMember, Kind::Dictionary, "a dictionary"},
    {kStartDateMember, Kind::Date, "a date"},
    {kTaskDigestMember, Kind::Null, ""},
    {kTaskIDMember, Kind::Null, ""},
    {kTaskingMember, Kind::Array, "an array"},
    {kWhitelistDigestMember, Kind::String, "a string"},
};

std::string notA(std::string_view path, const plist::Value& value, std::string_view wanted) {
  return format("%s: is %s, not %s", path, kindWithArticle(value), wanted);
}

void checkHistogram(const plist::Dictionary& summaries, const plist::Entry& histogram,
                    std::vector<std::string>& faults) {
  const std::string path = format("%s/%s", kHistogramsMember, histogram.key);
  if (!isSummary(summaries.get(histogram.key))) {
    faults.push_back(format("%s: has no summary in %s", path, kDistributionsMember));
  }
  const plist::Dictionary buckets = histogram.value.dictionary();
  if (!buckets) faults.push_back(notA(path, histogram.value, "a dictionary"));
  for (const plist::Entry& bucket : buckets) {
    const std::string place = format("%s/%s", path, bucket.key);
    const auto count = bucket.value.number();
    if (!count) faults.push_back(notA(place, bucket.value, "a number"));
    if (count && count->real() < 0) faults.push_back(place + ": is negative");
  }
}

}  // namespace

bool isTalliedLog(const plist::Value& document) {
  const plist::Dictionary log = document.dictionary();
  return log.get(kVersionMember) || log.get(kScalarsMember) || log.get(kDistributionsMember);
}

std::vector<std::string> faultsOf(const plist::Dictionary& log) {
  std::vector<std::string> faults;
  for (const plist::Entry& entry : log) {
    const auto* const member = std::find_if(std::begin(kMembers), std::end(kMembers),
                                            [&](const Member& m) { return m.key == entry.key; });
    if (member == std::end(kMembers)) {
      faults.push_back(format("%s: is not part of a tallied log", entry.key));
    } else if (member->kind != Kind::Null && member->kind != entry.value.kind()) {
      faults.push_back(notA(entry.key, entry.value, member->kindText));
    }
  }
  for (const plist::Entry& scalar : log.dictionary(kScalarsMember)) {
    if (scalar.value.number()) continue;
    faults.push_back(notA(format("%s/%s", kScalarsMember, scalar.key), scalar.value, "a number"));
  }
  const plist::Dictionary summaries = log.dictionary(kDistributionsMember);
  for (const plist::Entry& summary : summaries) {
    if (isSummary(summary.value)) continue;
    faults.push_back(
        format("%s/%s: is not a summary of five numbers", kDistributionsMember, summary.key));
  }
  for (const plist::Entry& histogram : log.dictionary(kHistogramsMember)) {
    checkHistogram(summaries, histogram, faults);
  }
  std::sort(faults.begin(), faults.end());
  return faults;
}

}  // namespace tavrel
