#include "platform/linux/files/digests.h"

#include <md5.h>
#include <sha2.h>

namespace tavrel {
namespace {

const std::uint8_t* octets(ByteSpan bytes) {
  return reinterpret_cast<const std::uint8_t*>(bytes.data());
}
template <std::size_t N>
std::uint8_t* octets(std::array<std::byte, N>& bytes) {
  return reinterpret_cast<std::uint8_t*>(bytes.data());
}

}  // namespace

std::array<std::byte, 16> LinuxDigest::md5(ByteSpan bytes) {
  std::array<std::byte, 16> digest;
  MD5_CTX context;
  MD5Init(&context);
  MD5Update(&context, octets(bytes), bytes.size());
  MD5Final(octets(digest), &context);
  return digest;
}

std::array<std::byte, 32> sha256(ByteSpan bytes) {
  std::array<std::byte, 32> digest;
  SHA2_CTX context;
  SHA256Init(&context);
  SHA256Update(&context, octets(bytes), bytes.size());
  SHA256Final(octets(digest), &context);
  return digest;
}

}  // namespace tavrel
