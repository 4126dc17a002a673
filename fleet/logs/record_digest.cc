// libcrypto's newer functions initialise all of the library, with allocations whose failure some
// versions do not survive. The deprecated functions need none.
#define OPENSSL_SUPPRESS_DEPRECATED

#include "fleet/logs/record_digest.h"

#include <bit>
#include <cstdint>
#include <openssl/sha.h>
#include <string>
#include <string_view>

#include "base/copy_little.h"

namespace tavrel::fleet {
namespace {

// The bytes that are hashed. Words are little-endian, and each text is preceded by its length, so
// that no two records have the same bytes.
class Form {
 public:
  explicit Form(std::size_t room) { bytes_.reserve(room); }

  void add(std::uint64_t word) {
    char raw[sizeof word];
    copyLittle(raw, &word, sizeof word);
    bytes_.append(raw, sizeof raw);
  }
  void add(std::int64_t word) { add(static_cast<std::uint64_t>(word)); }
  void add(double number) { add(std::bit_cast<std::uint64_t>(number)); }
  void add(std::string_view text) {
    add(std::uint64_t{text.size()});
    bytes_.append(text);
  }
  std::string_view bytes() const { return bytes_; }

 private:
  std::string bytes_;
};

}  // namespace

std::array<std::byte, 32> sha256Of(ByteSpan bytes) {
  std::array<std::byte, 32> digest{};
  SHA256_CTX state;
  SHA256_Init(&state);
  SHA256_Update(&state, bytes.data(), bytes.size());
  SHA256_Final(reinterpret_cast<unsigned char*>(digest.data()), &state);
  return digest;
}

std::array<std::byte, 32> digestOf(const LogRecord& record) {
  constexpr std::size_t kUsualRowBytes = 64;
  Form form(kUsualRowBytes * (8 + record.scalars.size() + 2 * record.distributions.size() +
                              record.cells.size() + 2 * record.applications.size()));
  form.add("tavrel log 1");
  form.add(std::int64_t{record.day});
  form.add(record.created);
  for (const std::string_view text : {record.whitelistDigest, record.taskID, record.language,
                                      record.preferredLanguage, record.region}) {
    form.add(text);
  }
  form.add(std::uint64_t{record.scalars.size()});
  for (const ScalarRow& row : record.scalars) {
    form.add(row.key);
    form.add(row.value);
  }
  form.add(std::uint64_t{record.distributions.size()});
  for (const DistributionRow& row : record.distributions) {
    form.add(row.key);
    form.add(row.numbers.minimum);
    form.add(row.numbers.maximum);
    form.add(row.numbers.mean);
    form.add(row.numbers.squaredDeviations);
    form.add(row.numbers.count);
  }
  form.add(std::uint64_t{record.cells.size()});
  const char* key = nullptr;
  for (const CellRow& row : record.cells) {
    // Cells of one key follow each other and share its text.
    form.add(row.key.data() == key ? std::string_view() : row.key);
    key = row.key.data();
    form.add(row.label);
    form.add(row.count);
  }
  form.add(std::uint64_t{record.applications.size()});
  for (const ApplicationRow& row : record.applications) {
    form.add(row.bundle);
    form.add(row.version);
    form.add(row.uuid);
    form.add(row.orboID);
    form.add(row.arch);
  }
  return sha256Of(std::as_bytes(std::span(form.bytes())));
}

}  // namespace tavrel::fleet
