#include <gtest/gtest.h>

#include "recorded_driver.h"
#include "storage/asp_connection.h"
#include "storage/device_buffer.h"
#include "storage/fetch_statistics.h"
#include "storage/selector_request.h"

namespace tavrel {
namespace {

using namespace fakes;

constexpr const char* kNVMe = "NorvaneEmbeddedNVMeController";
constexpr const char* kCloseFailed = "Could not close connection to service\n";

Dictionary with(const Dictionary& dictionary, const char* key, const Value& value) {
  auto copy = plist::mutableCopy(dictionary);
  copy.set(key, value);
  return copy;
}

// A driver that answers a query of the size, and then each row of `fetch`.
Dictionary sized(const Bytes& size, const Dictionary& fetch) {
  return driver({Dictionary{{"Method", 8}, {"Request", request(13, 1)}, {"Output", Data(size)}},
                 with(fetch, "Method", 8)});
}

TEST(ConnectionTest, FetchesStatistics) {
  const Bytes buffer = statistics({{53, {0x20003}}, {4, {77}}});
  const auto size = little32(buffer.size());
  const Dictionary whole{{"Request", request(13, 0)}, {"Output", Data(buffer)}};
  const Dictionary failing{{"Error", kKernelError}};
  const Dictionary good = driver(answering(buffer));
  const Dictionary nvme = driver(answering(statistics({{4, {99}}}), 9), kNVMe);
  const Dictionary refusing = with(good, "OpenError", kKernelError);
  const auto fetch = [](const Array& services, bool result, const std::string& error,
                        std::uint64_t hostWrites = 0) {
    StoragePlatform platform(services);
    const NandExporter* exporter = nullptr;
    ASPContext context;
    EXPECT_EQ(fetchStatistics(platform.drivers, platform.streams, exporter, context), result);
    EXPECT_EQ(platform.streams.error, error);
    EXPECT_EQ(platform.streams.output, "");
    EXPECT_EQ(context.hostWrites, hostWrites) << error;
    EXPECT_EQ(exporter->release == nullptr, services.empty());
    EXPECT_EQ(exporter->className, services.empty() ? "" : hostWrites == 99 ? kNVMe : "ASPStorage");
  };
  fetch({}, false, "Could not get matching Kernkit service for exporting classes\n");
  fetch({good}, true, "", 77);
  fetch({nvme, good}, true, "", 77);
  fetch({nvme}, true, "", 99);
  fetch({refusing, nvme}, false, "Could not get connection to service\n");
  fetch({with(good, "CloseError", kKernelError)}, true, kCloseFailed, 77);
  fetch({driver({with(failing, "Method", 8)})}, false, "IOConnectCallStructMethod: -536870212");
  fetch({with(sized(little32(~0U), whole), "CloseError", 1)}, false,
        std::string("Could not valloc 4294967295 bytes") + kCloseFailed);
  fetch({sized(little32(0), {{"Output", Data(Bytes())}})}, false, "");
  fetch({sized(little32(3), {{"Output", Data(Bytes(3))}})}, false, "");
  fetch({sized(size, failing)}, false, "Could not retrieve data from driver for selector d\n");
  // The answer may be shorter than announced; the missing part is not read.
  fetch({sized(little32(4096), whole)}, true, "", 77);
  fetch({sized(size, with(whole, "OutputLength", 16))}, true, "", 0);
  fetch({sized(size, with(whole, "OutputLength", 24))}, false, "", 0);
}

TEST(ConnectionTest, EncodesRequests) {
  const auto size = SelectorRequest::sizeQuery({0x01020304, 9}, true, 255);
  const auto fetch = SelectorRequest::fetch({9, 0x01020304}, false, 2);
  EXPECT_EQ(size.bytes().size(), 24U);
  EXPECT_EQ(loadLittle64(size.bytes(), 0), 0x03FF01020304U);
  EXPECT_EQ(loadLittle64(fetch.bytes(), 0), 0x000801020304U);

  const auto buffer = DeviceBuffer::allocate(limits::kDeviceAllocationBytes);
  EXPECT_EQ(buffer.bytes().size(), limits::kDeviceAllocationBytes);
  EXPECT_EQ(reinterpret_cast<std::uintptr_t>(buffer.bytes().data()) % 65536, 0U);
  EXPECT_TRUE(DeviceBuffer::allocate(0));
  EXPECT_FALSE(DeviceBuffer::allocate(limits::kDeviceAllocationBytes + 1));
}

TEST(ConnectionTest, OpensConnections) {
  const std::string noService = "Can't get ASP Connection, no matching service!\n";
  const Dictionary good = driver({});
  const std::string failed =
      "IOServiceOpen failed for class 'ASPStorage', result 0xe00002bc\nCan't get ASP Connection!\n";
  using Case = std::pair<Array, std::string>;
  for (const auto& [services, error] : {Case({}, noService), Case({good}, ""),
                                        Case({with(good, "OpenError", kKernelError)}, failed)}) {
    StoragePlatform platform(services);
    ASPConnection connection;
    closeASPConnection(connection);
    EXPECT_EQ(openASPConnection(platform.drivers, platform.streams, connection), error.empty());
    EXPECT_EQ(connection.service != nullptr, error.empty());
    for (int i = 0; i < 2; ++i) {
      closeASPConnection(connection);
      EXPECT_TRUE(!connection.service && !connection.connection);
    }
    EXPECT_EQ(platform.streams.error, error);
  }

  StoragePlatform none({}), stuck({with(good, "CloseError", kKernelError)});
  const NandExporter* exporter = nullptr;
  EXPECT_EQ(ANDConnect(none.drivers, none.streams, exporter), nullptr);
  EXPECT_EQ(none.streams.error, "No class found");
  ANDDisconnect(stuck.streams, ANDConnect(stuck.drivers, stuck.streams, exporter));
  EXPECT_EQ(stuck.streams.error, "closing connection to service failed\n");
}

TEST(ConnectionTest, AsksForContentDeletion) {
  const auto answer = [](const Dictionary& row) { return driver({with(row, "Method", 5)}); };
  const Dictionary yes = answer({{"Output", Data(little32(0x01000000))}});
  const std::tuple<Array, bool, std::string> kCases[] = {
      {{yes}, true, ""},
      {{answer({{"Output", Data(little32(0))}})}, false, ""},
      {{answer({{"Output", Data(little32(1))}, {"OutputLength", 3}})}, false, ""},
      {{answer({{"Error", kKernelError}})}, false, ""},
      {{with(driver({}, kNVMe), "OpenError", kKernelError)}, false, ""},
      {{}, false, "_load_nand_infoCould not get matching Kernkit service for exporting classes\n"},
      {{with(yes, "OpenError", 1)}, false, "Could not get connection to service\n"},
      {{with(answer({{"Output", Data(little32(2))}}), "CloseError", 1)}, true, kCloseFailed}};
  for (const auto& [services, recommends, error] : kCases) {
    StoragePlatform platform(services);
    EXPECT_EQ(NandRecommendsContentDeletion(platform.drivers, platform.streams), recommends);
    EXPECT_EQ(platform.streams.error, error);
  }
}

}  // namespace
}  // namespace tavrel
