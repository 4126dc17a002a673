#include "upload/network.h"

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <fnmatch.h>
#include <optional>
#include <string_view>
#include <vector>

#include "base/format.h"
#include "base/limits.h"

namespace tavrel::upload {
namespace {

// flags of both tables, from linux/route.h
constexpr std::uint32_t kIsUp = 0x0001;
constexpr std::uint32_t kRejects = 0x0200;

/// The columns of a routing table, which white space separates, that have the needed data.
struct Table {
  const char* path;
  std::size_t columns;
  std::size_t interface, destination, prefix, flags, metric;
  int metricBase;
};
// Not below /proc/net, which a service that sees only processes (ProcSubset=pid) does not have.
constexpr Table kTables[] = {{"/proc/self/net/route", 11, 0, 1, 7, 3, 6, 10},
                             {"/proc/self/net/ipv6_route", 10, 9, 0, 1, 8, 5, 16}};

std::vector<std::string_view> columnsOf(std::string_view line) {
  std::vector<std::string_view> columns;
  constexpr std::string_view kSpace = " \t";
  for (std::size_t at = line.find_first_not_of(kSpace); at != line.npos;
       at = line.find_first_not_of(kSpace, at)) {
    const std::size_t end = std::min(line.find_first_of(kSpace, at), line.size());
    columns.push_back(line.substr(at, end - at));
    at = end;
  }
  return columns;
}

std::optional<std::uint32_t> number(std::string_view text, int base) {
  std::uint32_t value = 0;
  const auto [stop, error] = std::from_chars(text.data(), text.data() + text.size(), value, base);
  if (error != std::errc() || stop != text.data() + text.size()) return std::nullopt;
  return value;
}

/// The interface of the default route that the kernel prefers; empty without one.
std::string preferredInterface(const Table& table, std::string_view text) {
  std::string preferred;
  std::uint32_t lowest = 0;
  while (!text.empty()) {
    const std::size_t end = std::min(text.find('\n'), text.size());
    const auto columns = columnsOf(text.substr(0, end));
    text.remove_prefix(std::min(end + 1, text.size()));
    if (columns.size() < table.columns) continue;
    const auto isZero = [&](std::size_t column) {
      return columns[column].find_first_not_of('0') == std::string_view::npos;
    };
    const auto flags = number(columns[table.flags], 16);
    const auto metric = number(columns[table.metric], table.metricBase);
    if (!isZero(table.destination) || !isZero(table.prefix) || !flags || !metric ||
        (*flags & (kIsUp | kRejects)) != kIsUp) {
      continue;
    }
    if (preferred.empty() || *metric < lowest) {
      preferred = columns[table.interface];
      lowest = *metric;
    }
  }
  return preferred;
}

bool isThisMachine(std::string_view host) {
  return host == "localhost" || host.ends_with(".localhost") || host == "::1" ||
         (host.starts_with("127.") &&
          host.find_first_not_of("0123456789.") == std::string_view::npos);
}

}  // namespace

Expected<std::string> reasonToWait(const DeviceRoot& root, FileSystem& files,
                                   const Configuration& configuration) {
  const bool mayBeMetered = !configuration.meteredInterfaces.empty();
  if (isThisMachine(configuration.host) || !(configuration.needsDefaultRoute || mayBeMetered)) {
    return std::string();
  }
  bool hasTable = false;
  bool isRouted = false;
  for (const Table& table : kTables) {
    const auto text = files.readIfPresent(root.pathOrMachine(table.path), limits::kLiveFileBytes);
    if (!text) return text.error();
    // A kernel without IPv6 has no such table.
    if (!*text) continue;
    hasTable = true;
    const std::string interface = preferredInterface(table, **text);
    if (interface.empty()) continue;
    isRouted = true;
    for (const std::string& pattern : configuration.meteredInterfaces) {
      if (fnmatch(pattern.c_str(), interface.c_str(), 0) == 0)
        return format("the network is metered (%s)", interface);
    }
  }
  if (!hasTable) {
    return Error{format("cannot find a route: neither %s nor %s exists; mount /proc",
                        kTables[0].path, kTables[1].path)};
  }
  if (!isRouted && configuration.needsDefaultRoute) return std::string("there is no default route");
  return std::string();
}

}  // namespace tavrel::upload
