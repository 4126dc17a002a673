// Reads hostile binary property lists. Any value that is read must survive the binary encoding
// unchanged. XML cannot represent all of it, so there a second writing must give the same bytes.
#include <cstdint>
#include <cstdlib>

#include "platform/plist/binary.h"
#include "platform/plist/xml.h"
#include "plist_mutator.h"

using namespace tavrel;

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t most, unsigned seed) {
  return fuzz::mutatePropertyList(data, size, most, seed);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const auto value = plist::readBinary(std::as_bytes(std::span(data, size)));
  if (!value) return 0;

  const auto binary = plist::writeBinary(*value);
  // A shared value is written once for each of its places, which may exceed the limits.
  if (!binary) return 0;
  const auto fromBinary = plist::readBinary(asBytes(*binary));
  if (!fromBinary || *fromBinary != *value) std::abort();

  const auto xml = plist::writeXml(*value);
  if (!xml) return 0;
  const auto fromXml = plist::readXml(asBytes(*xml));
  if (!fromXml) std::abort();
  const auto again = plist::writeXml(*fromXml);
  if (!again || *again != *xml) std::abort();
  return 0;
}
