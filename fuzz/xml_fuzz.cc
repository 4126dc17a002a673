// Reads hostile XML property lists. Any value that is read must survive both encodings unchanged.
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
  const auto value = plist::readXml(std::as_bytes(std::span(data, size)));
  if (!value) return 0;
  const auto xml = plist::writeXml(*value);
  if (!xml) std::abort();
  const auto fromXml = plist::readXml(asBytes(*xml));
  if (!fromXml || *fromXml != *value) std::abort();
  const auto binary = plist::writeBinary(*value);
  if (!binary) std::abort();
  const auto fromBinary = plist::readBinary(asBytes(*binary));
  if (!fromBinary || *fromBinary != *value) std::abort();
  return 0;
}
