// The registry of installed applications.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <utility>

namespace tavrel {

/// The bundle type of applications that the user installed.
inline constexpr std::string_view PWUserApplicationType = "User";
/// The bundle type of applications that came with the system.
inline constexpr std::string_view kSystemApplicationType = "System";

/// The bundle kind that stands for all installed applications.
inline constexpr std::uint32_t kInstalledApplications = 1;

class PWBundleProxy {
 public:
  PWBundleProxy(std::string identifier, std::string_view bundleType)
      : identifier_(std::move(identifier)), bundleType_(bundleType) {}
  const std::string& identifier() const { return identifier_; }
  std::string_view bundleType() const { return bundleType_; }

 private:
  std::string identifier_;
  std::string_view bundleType_;
};

class PWApplicationWorkspace {
 public:
  virtual ~PWApplicationWorkspace() = default;
  /// Calls `handler` once for each bundle of the kind.
  virtual void enumerateBundles(std::uint32_t kind,
                                const std::function<void(const PWBundleProxy&)>& handler) = 0;
};

}  // namespace tavrel
