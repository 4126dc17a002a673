#include "platform/linux/recorded/recorded_driver_client.h"

#include <algorithm>
#include <optional>
#include <utility>

#include "platform/linux/recorded/typed_fields.h"

namespace tavrel {
namespace {

// True when the row has no condition on `key`, or the request meets it.
template <class Word>
bool hasField(const plist::Dictionary& row, std::string_view key, std::optional<Word> inRequest) {
  const plist::Value wanted = row.get(key);
  return !wanted || (inRequest && wordOf(wanted) == *inRequest);
}

bool fits(const plist::Dictionary& row, std::uint32_t method, ByteSpan request) {
  if (wordOf(row.get("Method")) != method) return false;
  const ByteSpan start = row.data("Request").bytes();
  return start.size() <= request.size() &&
         std::equal(start.begin(), start.end(), request.begin()) &&
         hasField(row, "Selector", loadLittle32(request, 0)) &&
         hasField(row, "Flags", loadLittle16(request, 4));
}

class RecordedDriverClient final : public UserClient {
 public:
  RecordedDriverClient(std::shared_ptr<const Recording> recording, const RecordedEntry& driver)
      : recording_(std::move(recording)), driver_(driver) {}

  KernelReturn callMethod(std::uint32_t selector, std::span<const std::uint64_t>,
                          ByteSpan structureInput, std::span<std::uint64_t> scalarOutput,
                          MutableByteSpan structureOutput,
                          std::size_t& structureOutputLength) override {
    if (isClosed_) return kKernelBadArgument;
    for (const plist::Dictionary& row : driver_.rows) {
      if (fits(row, selector, structureInput)) {
        return answer(row, scalarOutput, structureOutput, structureOutputLength);
      }
    }
    return kKernelBadArgument;
  }

  KernelReturn mapMemory(std::uint32_t, std::unique_ptr<MappedMemory>&) override {
    return kKernelBadArgument;
  }

  KernelReturn close() override {
    if (std::exchange(isClosed_, true)) return kKernelBadArgument;
    return returnCodeOf(driver_.record, "CloseError");
  }

 private:
  static KernelReturn answer(const plist::Dictionary& row, std::span<std::uint64_t> scalarOutput,
                             MutableByteSpan structureOutput, std::size_t& structureOutputLength) {
    if (const KernelReturn error = returnCodeOf(row, "Error"); error != kKernelSuccess) {
      return error;
    }
    const ByteSpan output = row.data("Output").bytes();
    const std::uint64_t length = wordOf(row.get("OutputLength")).value_or(output.size());
    const plist::Array scalars = row.array("Scalars");
    if (scalars.size() < scalarOutput.size()) return kKernelBadArgument;
    if (length > structureOutput.size()) return kKernelUnderrun;

    for (std::size_t i = 0; i < scalarOutput.size(); ++i)
      scalarOutput[i] = wordOf(scalars.at(i)).value_or(0);
    const auto room = structureOutput.first(static_cast<std::size_t>(length));
    const auto recorded = output.first(std::min(output.size(), room.size()));
    std::fill(std::copy(recorded.begin(), recorded.end(), room.begin()), room.end(), std::byte{0});
    structureOutputLength = room.size();
    return kKernelSuccess;
  }

  const std::shared_ptr<const Recording> recording_;
  const RecordedEntry& driver_;
  bool isClosed_ = false;
};

}  // namespace

std::unique_ptr<UserClient> connectToRecordedDriver(std::shared_ptr<const Recording> recording,
                                                    const RecordedEntry& driver) {
  return std::make_unique<RecordedDriverClient>(std::move(recording), driver);
}

}  // namespace tavrel
