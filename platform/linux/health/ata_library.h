// libatasmart, loaded only when a SATA disk is read: most devices have none, and a program linked
// with the library would load it and libudev at every start.
#pragma once

// The library's header uses size_t and does not declare it.
// clang-format off
#include <cstddef>
#include <atasmart.h>
// clang-format on

#include "base/expected.h"

namespace tavrel::health {

/// The functions of the library, under their names without "sk_disk_".
struct AtaLibrary {
  decltype(&sk_disk_open) open = nullptr;
  decltype(&sk_disk_free) free = nullptr;
  decltype(&sk_disk_check_sleep_mode) check_sleep_mode = nullptr;
  decltype(&sk_disk_smart_read_data) smart_read_data = nullptr;
  decltype(&sk_disk_smart_status) smart_status = nullptr;
  decltype(&sk_disk_get_blob) get_blob = nullptr;
  decltype(&sk_disk_set_blob) set_blob = nullptr;
  decltype(&sk_disk_smart_parse_attributes) smart_parse_attributes = nullptr;
  decltype(&sk_disk_smart_get_temperature) smart_get_temperature = nullptr;
  decltype(&sk_disk_smart_get_power_on) smart_get_power_on = nullptr;
  decltype(&sk_disk_smart_get_power_cycle) smart_get_power_cycle = nullptr;
  decltype(&sk_disk_smart_get_bad) smart_get_bad = nullptr;
};

/// Valid until the process ends. Later calls do not load the library again.
Expected<const AtaLibrary*> ataLibrary();

}  // namespace tavrel::health
