// Tasking payloads with any content. One run must apply what the payload says and nothing else, a
// second run must change nothing, and a run with another tasking must revert the settings and leave
// the rest. Each domain is synchronised once, the daemon's own last.
#include <map>
#include <set>
#include <string>

#include "daemon/tasking.h"
#include "platform/persisted_state.h"
#include "platform/plist/coding.h"
#include "plist_mutator.h"
#include "require.h"
#include "tests/fakes/fake_platform.h"

using namespace tavrel;
using fuzz::require;

namespace {

using Domains = std::map<std::string, std::map<std::string, plist::Value>>;

constexpr std::string_view kBystander = "a key that stays";
constexpr std::string_view kSynchronize = "synchronize ";

void schedule(fakes::FakePlatform& fake, const plist::Dictionary& tasking) {
  fake.preferences.domain(kScheduleDomain).set(kScheduledTaskingKey, tasking);
}

/// The preferences outside the domains of the daemon and of the scheduler of taskings.
Domains others(const fakes::FakePlatform& fake) {
  Domains domains;
  for (const auto& [name, dictionary] : fake.preferences.domains) {
    if (name == kTavrelDomain || name == kScheduleDomain) continue;
    for (const plist::Entry& entry : dictionary)
      domains[name][std::string(entry.key)] = entry.value;
  }
  return domains;
}

/// Performs one run. Returns the domains that it synchronised.
std::set<std::string> track(fakes::FakePlatform& fake) {
  fake.journal.clear();
  trackOSChangeAndTasking(fake.platform);
  std::set<std::string> synchronized;
  std::string last;
  for (const std::string& call : fake.journal) {
    if (!call.starts_with(kSynchronize)) continue;
    last = call.substr(kSynchronize.size());
    require(synchronized.insert(last).second);
  }
  if (synchronized.contains(std::string(kTavrelDomain))) require(last == kTavrelDomain);
  return synchronized;
}

}  // namespace

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t most, unsigned seed) {
  return fuzz::mutatePropertyList(data, size, most, seed);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const auto payload = plist::read(std::as_bytes(std::span(data, size)));
  if (!payload) return 0;

  fakes::FakePlatform fake;
  Domains applied;
  std::set<std::string> touched;
  bool touchesState = false;
  const plist::Array settings = payload->array();
  for (const plist::Value& element : settings) {
    const auto domain = element.dictionary().string("Domain");
    const auto key = element.dictionary().string("Key");
    if (!domain || !key) continue;
    touchesState = touchesState || *domain == kTavrelDomain || *domain == kScheduleDomain;
    touched.emplace(*domain);
    fake.preferences.domain(*domain).set(kBystander, "here before");
    applied[std::string(*domain)][std::string(*key)] = element.dictionary().get("Value");
  }
  Domains before = others(fake);
  Domains expected = before;
  for (const auto& [domain, keys] : applied) {
    for (const auto& [key, value] : keys) {
      before[domain].erase(key);
      expected[domain].insert_or_assign(key, value);
    }
    std::erase_if(expected[domain], [](const auto& entry) { return entry.second.isNull(); });
  }
  const auto dropEmpty = [](Domains& domains) {
    std::erase_if(domains, [](const auto& domain) { return domain.second.empty(); });
  };
  dropEmpty(before);
  dropEmpty(expected);

  schedule(fake, {{kTaskingIDKey, "one"}, {kTaskingPayloadKey, *payload}});
  if (settings) touched.emplace(kTavrelDomain);
  require(track(fake) == touched);
  if (touchesState) {
    track(fake);  // a tasking that sets the daemon's own state decides what follows
    return 0;
  }
  require(others(fake) == expected);

  // Without settings nothing is remembered, so the tasking counts as new each time.
  require(track(fake).empty() && fake.journal.size() == (settings ? 0 : 1));

  schedule(fake, {{kTaskingIDKey, "two"}});
  require(track(fake) == touched);
  require(others(fake) == before);
  require(!fake.preferences.domain(kTavrelDomain).get(kTaskingPayloadKey));
  return 0;
}
