// A storage driver whose answers a test defines, and the buffers that it answers with.
#pragma once

#include <vector>

#include "platform/linux/recorded/recorded_registry.h"
#include "tests/fakes/fake_platform.h"
#include "tests/helpers/fingerprint.h"

namespace tavrel::fakes {

using plist::Array;
using plist::Data;
using plist::Dictionary;
using plist::Value;
using Bytes = std::vector<std::byte>;

struct Record {
  std::uint32_t key;
  std::vector<std::uint64_t> values;
};

inline void append64(Bytes& out, std::uint64_t value) {
  out.resize(out.size() + 8);
  storeLittle64(out, out.size() - 8, value);
}

inline Bytes statistics(const std::vector<Record>& records) {
  Bytes out;
  for (const auto& [key, values] : records) {
    append64(out, key | static_cast<std::uint64_t>(values.size()) << 32);
    for (const std::uint64_t value : values)
      append64(out, value);
  }
  return out;
}

inline Bytes words(const std::vector<std::uint32_t>& values) {
  Bytes out(values.size() * 4);
  for (std::size_t i = 0; i < values.size(); ++i)
    storeLittle32(out, i * 4, values[i]);
  return out;
}
inline Bytes little32(std::size_t value) {
  return words({static_cast<std::uint32_t>(value)});
}

inline Data request(std::uint8_t selector, std::uint8_t flags) {
  Bytes bytes(24);
  bytes[0] = std::byte{selector};
  bytes[4] = std::byte{flags};
  return Data(bytes);
}

inline Array answering(const Bytes& buffer, int method = 8) {
  const Data size(little32(buffer.size()));
  return {Dictionary{{"Method", method}, {"Request", request(13, 1)}, {"Output", size}},
          Dictionary{{"Method", method}, {"Request", request(13, 0)}, {"Output", Data(buffer)}}};
}

inline Dictionary driver(const Array& methods, const char* className = "ASPStorage") {
  return {{"Class", className}, {"Methods", methods}};
}

struct StoragePlatform : FakePlatform {
  explicit StoragePlatform(const Array& rows) : registry(Dictionary{{"Services", rows}}, log) {
    drivers.behind = &registry;
  }
  RecordedRegistry registry;
};

}  // namespace tavrel::fakes
