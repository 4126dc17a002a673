#include "tools/overlay/overlay_drivers.h"

#include "base/format.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"

namespace tavrel {
namespace {

using Kind = OverlayEvent::Kind;

std::string outcomeOf(KernelReturn result, std::string_view success) {
  return result == kKernelSuccess ? std::string(success) : format("failed with 0x%x", result);
}

std::string outcomeOf(KernelReturn result, std::size_t bytes) {
  return outcomeOf(result, counted(bytes, "byte"));
}

class ToldClient final : public UserClient {
 public:
  ToldClient(std::unique_ptr<UserClient> below, std::string name, const OverlayEvents& events)
      : below_(std::move(below)), name_(std::move(name)), events_(events) {}

  KernelReturn callMethod(std::uint32_t selector, std::span<const std::uint64_t> scalarInput,
                          ByteSpan structureInput, std::span<std::uint64_t> scalarOutput,
                          MutableByteSpan structureOutput,
                          std::size_t& structureOutputLength) override {
    const KernelReturn result =
        below_->callMethod(selector, scalarInput, structureInput, scalarOutput, structureOutput,
                           structureOutputLength);
    events_.deliver(Kind::DriverCall, format("%s method %u", name_, selector),
                    outcomeOf(result, structureOutputLength));
    return result;
  }
  KernelReturn mapMemory(std::uint32_t memoryType, std::unique_ptr<MappedMemory>& mapped) override {
    const KernelReturn result = below_->mapMemory(memoryType, mapped);
    events_.deliver(Kind::DriverCall, format("%s memory %u", name_, memoryType),
                    outcomeOf(result, mapped ? mapped->bytes().size() : 0));
    return result;
  }
  KernelReturn close() override { return below_->close(); }

 private:
  std::unique_ptr<UserClient> below_;
  std::string name_;
  const OverlayEvents& events_;
};

class ToldService final : public DriverService {
 public:
  ToldService(std::shared_ptr<DriverService> below, std::string name, const OverlayEvents& events)
      : below_(std::move(below)), name_(std::move(name)), events_(events) {}

  KernelReturn entryID(std::uint64_t& id) override { return below_->entryID(id); }
  KernelReturn name(std::string& name) override { return below_->name(name); }
  std::uint32_t userRetainCount() override { return below_->userRetainCount(); }
  plist::Value property(std::string_view key) override {
    return delivered(key, below_->property(key));
  }
  plist::Value searchProperty(std::string_view plane, std::string_view key) override {
    return delivered(key, below_->searchProperty(plane, key));
  }
  KernelReturn open(std::uint32_t type, std::unique_ptr<UserClient>& client) override {
    const KernelReturn result = below_->open(type, client);
    events_.deliver(Kind::DriverCall, name_ + " open", outcomeOf(result, "opened"));
    if (client) client = std::make_unique<ToldClient>(std::move(client), name_, events_);
    return result;
  }

 private:
  plist::Value delivered(std::string_view key, plist::Value value) {
    const bool isContainer = value.array() || value.dictionary();
    events_.deliver(Kind::DriverProperty, format("%s %s", name_, key),
                    isContainer ? plist::Value(kindWithArticle(value)) : value);
    return value;
  }

  std::shared_ptr<DriverService> below_;
  std::string name_;
  const OverlayEvents& events_;
};

class ToldWalk final : public ServiceIterator {
 public:
  ToldWalk(std::unique_ptr<ServiceIterator> below, const OverlayEvents& events)
      : below_(std::move(below)), events_(events) {}

  bool isValid() override { return below_->isValid(); }
  std::shared_ptr<DriverService> next() override {
    auto service = below_->next();
    if (!service) return nullptr;
    std::string name;
    if (service->name(name) != kKernelSuccess) name = "(no name)";
    events_.deliver(Kind::Driver, name, "found");
    return std::make_shared<ToldService>(std::move(service), std::move(name), events_);
  }

 private:
  std::unique_ptr<ServiceIterator> below_;
  const OverlayEvents& events_;
};

}  // namespace

std::shared_ptr<DriverService> OverlayDrivers::firstService(std::string_view className) {
  auto service = below_.firstService(className);
  events_.deliver(Kind::Driver, std::string(className), service ? "found" : "not found");
  if (!service) return nullptr;
  return std::make_shared<ToldService>(std::move(service), std::string(className), events_);
}

KernelReturn OverlayDrivers::matchingServices(const plist::Dictionary& matching,
                                              std::unique_ptr<ServiceIterator>& services) {
  const KernelReturn result = below_.matchingServices(matching, services);
  events_.deliver(Kind::Drivers, inlineText(matching), outcomeOf(result, "answered"));
  if (services) services = std::make_unique<ToldWalk>(std::move(services), events_);
  return result;
}

}  // namespace tavrel
